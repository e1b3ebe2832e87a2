// kpx-sim: runs the add-in inside the simulated Quarn host.
//   kpx-sim [MODEL.json] SCENARIO.json [--jsonl] [--out FILE] [--sandbox DIR]
// Exit codes: 0 the run completed (whatever the add-in did), 2 bad input
// (the message names the file and line), 1 anything else. The output is
// written as the run goes: a run that fails halfway leaves what happened
// so far, followed by the failure. A run stopped by SIGINT, SIGTERM or
// SIGHUP removes its temporary sandbox first.
#include <pthread.h>
#include <signal.h>
#include <unistd.h>

#include <chrono>
#include <fstream>
#include <iostream>
#include <memory>
#include <mutex>
#include <optional>
#include <random>
#include <sstream>
#include <string>
#include <thread>
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

// Takes SIGINT, SIGTERM and SIGHUP on a thread of its own, so that it may
// do what a signal handler may not: remove the temporary sandbox. Then it
// ends the process by the same signal, as if it had not been caught. The
// state lives as long as the thread, which the process's end stops.
class SignalGuard {
 public:
  SignalGuard() : state_(std::make_shared<State>()) {
    sigemptyset(&state_->signals);
    for (int s : {SIGINT, SIGTERM, SIGHUP}) sigaddset(&state_->signals, s);
    // Blocked before any other thread starts, so only the guard takes them.
    pthread_sigmask(SIG_BLOCK, &state_->signals, nullptr);
    std::thread([state = state_] { Guard(*state); }).detach();
  }
  SignalGuard(const SignalGuard&) = delete;
  SignalGuard& operator=(const SignalGuard&) = delete;

  // The folder to remove when a signal comes; none when unset.
  void Protect(std::optional<fs::path> folder) {
    std::lock_guard<std::mutex> lock(state_->mutex);
    state_->folder = std::move(folder);
  }

 private:
  struct State {
    sigset_t signals;
    std::mutex mutex;
    std::optional<fs::path> folder;
  };

  static void Guard(State& state) {
    int signal = 0;
    if (sigwait(&state.signals, &signal) != 0) return;
    {
      std::lock_guard<std::mutex> lock(state.mutex);
      // The run goes on meanwhile and may still be writing into it.
      std::error_code ignored;
      for (int tries = 0; state.folder && tries < 20 && fs::exists(*state.folder, ignored); ++tries)
        fs::remove_all(*state.folder, ignored);
    }
    ::signal(signal, SIG_DFL);
    sigset_t one;
    sigemptyset(&one);
    sigaddset(&one, signal);
    pthread_sigmask(SIG_UNBLOCK, &one, nullptr);
    raise(signal);
    _exit(128 + signal);
  }

  std::shared_ptr<State> state_;
};

class Sandbox {
 public:
  Sandbox(const std::optional<fs::path>& given, SignalGuard& guard) : guard_(guard) {
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
      guard_.Protect(dir_);
    }
    fs::create_directories(dir_);
    std::ofstream(dir_ / kMarker) << "A kpx-sim sandbox: kpx-sim empties this folder before each run.\n";
  }
  ~Sandbox() {
    std::error_code ignored;
    if (!keep_) fs::remove_all(dir_, ignored);
    guard_.Protect(std::nullopt);
  }
  Sandbox(const Sandbox&) = delete;
  Sandbox& operator=(const Sandbox&) = delete;
  const fs::path& dir() const { return dir_; }

 private:
  SignalGuard& guard_;
  fs::path dir_;
  bool keep_ = false;
};

// The JSONL log, a line per event as it happens.
class JsonlWriter final : public EventSink {
 public:
  explicit JsonlWriter(std::ostream& out) : out_(out) {}
  void Write(const EventJson& event) override { out_ << JsonlLine(event); }
  void Flush() override { out_.flush(); }
  bool broken() const override { return !out_; }

 private:
  std::ostream& out_;
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

struct Input {
  fs::path modelFile;
  ModelDef model;
  Scenario scenario;
};

// Everything read and checked before the run; the files' texts and parsed
// documents are let go once their contents are taken.
std::unique_ptr<Input> Read(const Options& o) {
  auto input = std::make_unique<Input>();
  const std::string scenarioFile = o.files.back();
  const JsonSource scenarioSource = JsonSource::Load(scenarioFile);
  const bool named = o.files.size() == 1;
  if (!named) {
    input->modelFile = o.files.front();  // the command line wins over the scenario
  } else if (std::optional<fs::path> path = ScenarioModelPath(scenarioSource)) {
    input->modelFile = *path;
  } else {
    throw InputError(scenarioFile, 1, "the scenario names no \"model\": give MODEL.json on the command line");
  }
  {
    std::optional<JsonSource> modelSource;
    try {
      modelSource.emplace(JsonSource::Load(input->modelFile));
    } catch (const InputError& e) {
      // A model the scenario names but that cannot be read is the
      // scenario's fault, at its "model" line.
      if (!named || e.line() != 0) throw;
      throw InputError(scenarioFile, scenarioSource.LineOf("/model"),
                       "the model " + input->modelFile.string() + ": " + e.message());
    }
    input->model = LoadModel(*modelSource);
  }
  input->scenario = LoadScenario(scenarioSource, input->model);
  return input;
}

int Run(const Options& o, SignalGuard& guard) {
  const std::unique_ptr<Input> input = Read(o);
  const std::string scenarioFile = o.files.back();
  Sandbox sandbox(o.sandbox, guard);

  // Opened only now: bad input, or a sandbox that cannot be made, leaves an
  // earlier output as it was.
  std::ofstream file;
  if (o.out) {
    std::error_code ec;
    if (fs::is_directory(*o.out, ec)) throw InputError(*o.out, 0, "a folder: the output cannot be written there");
    file.open(*o.out, std::ios::binary | std::ios::trunc);
    if (!file) throw InputError(*o.out, 0, "the output cannot be written there");
  }
  std::ostream& out = o.out ? static_cast<std::ostream&>(file) : std::cout;
  std::unique_ptr<EventSink> sink;
  TranscriptWriter* transcript = nullptr;
  if (o.jsonl) {
    sink = std::make_unique<JsonlWriter>(out);
  } else {
    auto writer = std::make_unique<TranscriptWriter>(
        out, "kpx-sim: model " + input->modelFile.string() + ", scenario " + scenarioFile +
                 (o.sandbox ? ", sandbox " + o.sandbox->string() : ""));
    transcript = writer.get();
    sink = std::move(writer);
  }
  auto finish = [&] {
    if (transcript) transcript->Finish();
    sink->Flush();
  };

  kpx::posix::FileRegistry registry(sandbox.dir() / "registry.reg");
  kpx::posix::SandboxFileSystem files(sandbox.dir(), kpx::posix::SandboxFileSystem::Zone::Utc);
  FileSeeder seeder([&files](std::string_view path) { return files.HostPath(path); });
  const RegistryBatch batch = [&registry](const std::function<void()>& seed) {
    try {
      registry.WriteOnce(seed);
    } catch (const WorldError&) {
      throw;
    } catch (const std::runtime_error& e) {
      throw WorldError(e.what());
    }
  };
  try {
    Simulation simulation(input->model, Environment{registry, files, seeder, batch});
    simulation.log().StreamTo(sink.get());
    simulation.Run(input->scenario);
  } catch (const std::exception& e) {
    // What was logged is in the output already; the failure follows it.
    sink->Write({{"ev", "aborted"}, {"reason", e.what()}});
    finish();
    throw;
  }
  finish();
  if (!out) throw std::runtime_error(o.out ? "cannot write " + *o.out : "cannot write the output");
  return 0;
}

}  // namespace

int main(int argc, char** argv) {
  std::optional<Options> options = ParseOptions(argc, argv);
  if (!options) {
    std::cerr << kUsage;
    return 2;
  }
  // A closed pipe is a write that fails, not a death without cleaning up.
  signal(SIGPIPE, SIG_IGN);
  SignalGuard guard;
  try {
    return Run(*options, guard);
  } catch (const InputError& e) {
    std::cerr << e.what() << '\n';
    return 2;
  } catch (const std::exception& e) {
    std::cerr << "kpx-sim: " << e.what() << '\n';
    return 1;
  }
}
