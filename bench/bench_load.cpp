// Loading large worlds through the simulator library: model files of many
// elements, registry keys or files, parsed, checked, laid out in a sandbox
// and played for a few steps. Each should cost in proportion to its size;
// the element cases report how the time grows (Complexity) from 10,000 to
// 1,000,000 elements.
#include <benchmark/benchmark.h>

#include <atomic>
#include <cstdint>
#include <filesystem>
#include <map>
#include <memory>
#include <string>

#include "platform/posix/posix_platform.h"
#include "sim/json_source.h"
#include "sim/model_file.h"
#include "sim/scenario_file.h"
#include "sim/simulation.h"

namespace kpx::sim {
namespace {

// What every generated model has: the add-ins, an IDE add-in already
// registered, and a component check that passes.
void AppendBase(std::string& out) {
  out += R"("addins": [{"name": "VC++"}, {"name": "VisualStudio"}],
  "companions": [{"clsid": "{CFD996E3-1393-11D3-B9F3-006008BF3ACB}",
                  "operations": ["Init", "Terminate", "ShowComponentOptions", "CheckComponent"],
                  "members": {"Terminate": {}, "CheckComponent": {"returns": true}}}],
)";
}

void AppendNumbered(std::string& out, const char* text, int64_t n) {
  out += text;
  out += std::to_string(n);
}

// One module per ten elements; classes assigned to them, every seventh
// nested in the class before, every fifth with an attribute, and an
// inherit relation for every fourth.
std::string ElementsModel(int64_t count) {
  std::string out = "{\n";
  AppendBase(out);
  out += "\"model\": {\"selection\": [\"C1\"], \"elements\": [\n";
  const int64_t modules = std::max<int64_t>(1, count / 10);
  int64_t made = 0;
  for (int64_t i = 0; i < modules; ++i, ++made) {
    if (made) out += ",\n";
    AppendNumbered(out, "{\"kind\": \"Module\", \"language\": \"VC++\", \"name\": \"M", i);
    out += "\"}";
  }
  for (int64_t k = 0; made < count; ++k) {
    AppendNumbered(out, ",\n{\"kind\": \"Class\", \"language\": \"VC++\", \"name\": \"C", k);
    AppendNumbered(out, "\", \"components\": [\"M", k % modules);
    out += "\"]";
    if (k % 7 == 3) {
      AppendNumbered(out, ", \"nestedIn\": \"C", k - 1);
      out += '"';
    }
    if (k % 5 == 0) out += ", \"attributes\": [{\"name\": \"m_a\"}]";
    out += '}';
    ++made;
    if (k > 0 && k % 4 == 0 && made < count) {
      AppendNumbered(out, ",\n{\"kind\": \"InheritRelation\", \"name\": \"I", k);
      AppendNumbered(out, "\", \"client\": \"C", k);
      AppendNumbered(out, "\", \"supplier\": \"C", k - 1);
      out += "\"}";
      ++made;
    }
  }
  out += "]}}\n";
  return out;
}

// A few classes, and `count` registry keys of two values each.
std::string RegistryModel(int64_t count) {
  std::string out = "{\n";
  AppendBase(out);
  out += R"("model": {"elements": [{"kind": "Class", "name": "C1"}, {"kind": "Class", "name": "C3"}]},)";
  out += "\n\"registry\": {\n";
  for (int64_t i = 0; i < count; ++i) {
    if (i) out += ",\n";
    AppendNumbered(out, "\"HKCU\\\\Software\\\\Bulk\\\\K", i);
    AppendNumbered(out, "\": {\"V\": \"value ", i);
    AppendNumbered(out, "\", \"N\": ", i);
    out += '}';
  }
  out += "}}\n";
  return out;
}

// A few classes, and `count` files in one folder.
std::string FilesModel(int64_t count) {
  std::string out = "{\n";
  AppendBase(out);
  out += R"("model": {"elements": [{"kind": "Class", "name": "C1"}, {"kind": "Class", "name": "C3"}]},)";
  out += "\n\"files\": {\n";
  for (int64_t i = 0; i < count; ++i) {
    if (i) out += ",\n";
    AppendNumbered(out, "\"C:\\\\Bulk\\\\F", i);
    out += ".txt\": \"x\"";
  }
  out += "}}\n";
  return out;
}

constexpr const char* kShortRun = R"({"actions": [
  {"call": "OnActivate", "args": ["$app"]},
  {"call": "OnEnableContextMenuItems", "args": [{"byref": "$app"}, {"byref": {"i2": 4}}]},
  {"select": ["C3"]},
  {"call": "OnEnableContextMenuItems", "args": [{"byref": "$app"}, {"byref": {"i2": 4}}]}
]})";

// Each model text is made once per process, outside the timing.
const std::string& ModelText(std::string (*make)(int64_t), int64_t count) {
  static std::map<std::pair<std::string (*)(int64_t), int64_t>, std::string> made;
  auto [it, fresh] = made.try_emplace({make, count});
  if (fresh) it->second = make(count);
  return it->second;
}

class Sandbox {
 public:
  Sandbox() {
    static std::atomic<int> counter{0};
    path_ = std::filesystem::temp_directory_path() /
            ("kpx-bench-load-" + std::to_string(reinterpret_cast<uintptr_t>(this)) + "-" + std::to_string(counter++));
    std::filesystem::create_directories(path_);
  }
  ~Sandbox() {
    std::error_code ignored;
    std::filesystem::remove_all(path_, ignored);
  }
  Sandbox(const Sandbox&) = delete;
  Sandbox& operator=(const Sandbox&) = delete;
  const std::filesystem::path& path() const { return path_; }

 private:
  std::filesystem::path path_;
};

class Discard final : public EventSink {
 public:
  void Write(const EventJson&) override { ++events; }
  uint64_t events = 0;
};

// Parsing and checking the model file only.
void BM_LoadElements(benchmark::State& state) {
  const std::string& text = ModelText(ElementsModel, state.range(0));
  for (auto _ : state) {
    const JsonSource source("model.json", text);
    benchmark::DoNotOptimize(LoadModel(source).elements.size());
  }
  state.SetComplexityN(state.range(0));
  state.counters["bytes"] = static_cast<double>(text.size());
}
BENCHMARK(BM_LoadElements)->Arg(10000)->Arg(100000)->Arg(1000000)->Unit(benchmark::kMillisecond)->Complexity();

// The whole of a kpx-sim run: the model read and checked, its registry and
// files laid out in a fresh sandbox, the host's world built, four steps
// played with the log streamed away, and everything taken down again. Only
// making and removing the sandbox folder is left out.
void Play(benchmark::State& state, const std::string& text) {
  const JsonSource scenarioSource("scenario.json", kShortRun);
  uint64_t events = 0;
  for (auto _ : state) {
    state.PauseTiming();
    auto sandbox = std::make_unique<Sandbox>();
    state.ResumeTiming();
    {
      const JsonSource source("model.json", text);
      const ModelDef model = LoadModel(source);
      const Scenario scenario = LoadScenario(scenarioSource, model);
      posix::FileRegistry registry(sandbox->path() / "registry.reg");
      posix::SandboxFileSystem files(sandbox->path());
      FileSeeder seeder([&files](std::string_view p) { return files.HostPath(p); });
      Discard log;
      Simulation sim(model, Environment{registry, files, seeder, [&registry](const std::function<void()>& seed) {
                                          registry.WriteOnce(seed);
                                        }});
      sim.log().StreamTo(&log);
      sim.Run(scenario);
      events = log.events;
    }
    state.PauseTiming();
    sandbox.reset();
    state.ResumeTiming();
  }
  state.counters["events"] = static_cast<double>(events);
}

void BM_PlayElements(benchmark::State& state) {
  Play(state, ModelText(ElementsModel, state.range(0)));
  state.SetComplexityN(state.range(0));
}
BENCHMARK(BM_PlayElements)->Arg(10000)->Arg(100000)->Arg(1000000)->Unit(benchmark::kMillisecond)->Complexity();

void BM_PlayRegistryKeys(benchmark::State& state) { Play(state, ModelText(RegistryModel, state.range(0))); }
BENCHMARK(BM_PlayRegistryKeys)->Arg(10000)->Arg(30000)->Unit(benchmark::kMillisecond);

void BM_PlayFiles(benchmark::State& state) { Play(state, ModelText(FilesModel, state.range(0))); }
BENCHMARK(BM_PlayFiles)->Arg(10000)->Arg(30000)->Unit(benchmark::kMillisecond);

}  // namespace
}  // namespace kpx::sim
