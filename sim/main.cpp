// kpx-sim: runs the add-in inside the simulated Quarn host.
//   kpx-sim [MODEL.json] SCENARIO.json [--jsonl] [--out FILE] [--sandbox DIR]
// Exit codes: 0 the run completed (whatever the add-in did), 2 bad input
// (the message names the file and line), 1 anything else.
#include <chrono>
#include <fstream>
#include <iostream>
#include <optional>
#include <random>
#include <sstream>
#include <string>
#include <vector>

#include "platform/posix/posix_platform.h"
#include "sim/json_source.h"
#include "sim/model_file.h"
#include "sim/scenario_file.h"
#include "sim/simulation.h"
#include "sim/transcript.h"

namespace fs = std::filesystem;
using namespace kpx::sim;

namespace {

constexpr const char* kUsage =
    "usage: kpx-sim [MODEL.json] SCENARIO.json [--jsonl] [--out FILE] [--sandbox DIR]\n"
    "  MODEL.json    the world; may be left out when the scenario names its model\n"
    "  --jsonl       print the JSONL event log instead of the transcript\n"
    "  --out FILE    write the output to FILE instead of standard output\n"
    "  --sandbox DIR map the drive letters into DIR (emptied first) and keep it;\n"
    "                by default a temporary folder is used and removed\n";

// Marks a folder as ours, so that --sandbox never empties anything else.
constexpr const char* kMarker = ".kpx-sim-sandbox";

class Sandbox {
 public:
  explicit Sandbox(const std::optional<fs::path>& given) {
    if (given) {
      dir_ = *given;
      if (fs::exists(dir_)) {
        if (!fs::is_directory(dir_)) throw std::runtime_error(dir_.string() + " is not a folder");
        if (!fs::is_empty(dir_) && !fs::exists(dir_ / kMarker))
          throw std::runtime_error("refusing to empty " + dir_.string() +
                                   ": it holds files and is not a kpx-sim sandbox");
        for (const fs::directory_entry& entry : fs::directory_iterator(dir_)) fs::remove_all(entry.path());
      }
      keep_ = true;
    } else {
      std::random_device random;
      const auto stamp = std::chrono::steady_clock::now().time_since_epoch().count();
      std::ostringstream name;
      name << "kpx-sim-" << std::hex << (static_cast<unsigned long long>(stamp) ^ random()) << random();
      dir_ = fs::temp_directory_path() / name.str();
    }
    fs::create_directories(dir_);
    std::ofstream(dir_ / kMarker) << "A kpx-sim sandbox: kpx-sim empties this folder before each run.\n";
  }
  ~Sandbox() {
    std::error_code ignored;
    if (!keep_) fs::remove_all(dir_, ignored);
  }
  Sandbox(const Sandbox&) = delete;
  Sandbox& operator=(const Sandbox&) = delete;
  const fs::path& dir() const { return dir_; }

 private:
  fs::path dir_;
  bool keep_ = false;
};

struct Options {
  std::vector<std::string> files;
  bool jsonl = false;
  std::optional<std::string> out;
  std::optional<fs::path> sandbox;
};

std::optional<Options> ParseOptions(int argc, char** argv) {
  Options o;
  for (int i = 1; i < argc; ++i) {
    const std::string arg = argv[i];
    if (arg == "--jsonl")
      o.jsonl = true;
    else if (arg == "--out" && i + 1 < argc)
      o.out = argv[++i];
    else if (arg == "--sandbox" && i + 1 < argc)
      o.sandbox = fs::path(argv[++i]);
    else if (arg.rfind("--", 0) == 0)
      return std::nullopt;
    else
      o.files.push_back(arg);
  }
  if (o.files.empty() || o.files.size() > 2) return std::nullopt;
  return o;
}

int Run(const Options& o) {
  const std::string scenarioFile = o.files.back();
  const JsonSource scenarioSource = JsonSource::Load(scenarioFile);
  fs::path modelFile;
  if (o.files.size() == 2) {
    modelFile = o.files.front();  // the command line wins over the scenario
  } else if (std::optional<fs::path> named = ScenarioModelPath(scenarioSource)) {
    modelFile = *named;
  } else {
    throw InputError(scenarioFile, 1, "the scenario names no \"model\": give MODEL.json on the command line");
  }
  const JsonSource modelSource = JsonSource::Load(modelFile);
  const ModelDef model = LoadModel(modelSource);
  const Scenario scenario = LoadScenario(scenarioSource, model);

  Sandbox sandbox(o.sandbox);
  kpx::posix::FileRegistry registry(sandbox.dir() / "registry.reg");
  kpx::posix::SandboxFileSystem files(sandbox.dir());
  FileSeeder seeder([&files](std::string_view path) { return files.HostPath(path); });
  std::string output;
  {
    Simulation simulation(model, Environment{registry, files, seeder});
    simulation.Run(scenario);
    output = o.jsonl ? simulation.log().Jsonl()
                     : Transcript(simulation.log().events(), "kpx-sim: model " + modelFile.string() + ", scenario " +
                                                                 scenarioFile +
                                                                 (o.sandbox ? ", sandbox " + o.sandbox->string() : ""));
  }
  if (o.out) {
    std::ofstream out(*o.out, std::ios::binary | std::ios::trunc);
    out << output;
    if (!out) throw std::runtime_error("cannot write " + *o.out);
  } else {
    std::cout << output;
  }
  return 0;
}

}  // namespace

int main(int argc, char** argv) {
  std::optional<Options> options = ParseOptions(argc, argv);
  if (!options) {
    std::cerr << kUsage;
    return 2;
  }
  try {
    return Run(*options);
  } catch (const InputError& e) {
    std::cerr << e.what() << '\n';
    return 2;
  } catch (const std::exception& e) {
    std::cerr << "kpx-sim: " << e.what() << '\n';
    return 1;
  }
}
