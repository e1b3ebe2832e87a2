// Host calls on the paths where the host waits for the add-in: enabling the
// class menu when the user right-clicks one class, and activation. In the
// real host every call is a round trip through automation, so the count per
// member is the number to watch; the time measured here is mostly the
// simulated host's own bookkeeping.
#include <benchmark/benchmark.h>

#include <atomic>
#include <cstdint>
#include <filesystem>
#include <string>

#include "platform/posix/posix_platform.h"
#include "sim/json_source.h"
#include "sim/model_file.h"
#include "sim/simulation.h"

namespace kpx::sim {
namespace {

// One plain class assigned to a VC++ component that passes the component
// check: the longest way through the class menu's rules (components, then
// stereotype, then class kind). The IDE add-in is registered already and
// logging is off, as on a user's machine after the first start.
constexpr const char* kModel = R"({
  "registry": {
    "HKLM\\SOFTWARE\\Tolvek Software\\Quarn\\AddIns\\VisualStudio": {"Debug": 0},
    "HKLM\\SOFTWARE\\Microsoft\\VisualStudio\\6.0\\Setup\\Microsoft Visual C++": {"ProductDir": "C:\\VC98"},
    "HKCU\\Software\\Microsoft\\DevStudio\\6.0\\AddIns\\kpxIDEAddin.DSAddIn": {
      "@": "1", "Filename": "C:\\Program Files\\Quarn\\vc\\dlls\\kpxideaddin.dll"}
  },
  "files": {"C:\\Program Files\\Quarn\\vc\\dlls\\kpxideaddin.dll": ""},
  "addins": [{"name": "VC++", "settings": {"Events": {"OnUser1": "C|Generate docs|Tools.DocGen"}}},
             {"name": "VisualStudio"}],
  "companions": [{"clsid": "{CFD996E3-1393-11D3-B9F3-006008BF3ACB}",
                  "operations": ["Init", "Terminate", "ShowComponentOptions", "CheckComponent"],
                  "members": {"Terminate": {}, "CheckComponent": {"returns": true}}}],
  "model": {
    "elements": [{"kind": "Module", "name": "Shapes", "language": "VC++"},
                 {"kind": "Class", "name": "CShape", "language": "VC++", "components": ["Shapes"]}],
    "selection": ["CShape"]
  }
})";

// A throw-away sandbox for the simulated drives.
class Sandbox {
 public:
  Sandbox() {
    static std::atomic<int> counter{0};
    path_ = std::filesystem::temp_directory_path() /
            ("kpx-bench-host-calls-" + std::to_string(reinterpret_cast<uintptr_t>(this)) + "-" +
             std::to_string(counter++));
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

// The model loaded through the library, the add-in object made and
// activated once, as the host does at start-up.
class ActivatedHost {
 public:
  ActivatedHost()
      : source_("bench-model.json", kModel),
        model_(LoadModel(source_)),
        files_(sandbox_.path()),
        seeder_([this](std::string_view p) { return files_.HostPath(p); }),
        sim_(model_, Environment{registry_, files_, seeder_}) {
    sim_.Prepare();
    sim_.Create();
    app_ = sim_.world().application();
    sim_.api()->OnActivate(app_);
  }

  API& api() { return *sim_.api(); }
  ObjectPtr& app() { return app_; }
  uint64_t hostCalls() const { return sim_.log().hostCalls(); }
  // The events are not read; keep memory flat over millions of calls.
  void DropEvents() {
    if (sim_.log().events().size() > 4096) sim_.log().Clear();
  }

 private:
  Sandbox sandbox_;
  JsonSource source_;
  ModelDef model_;
  posix::FileRegistry registry_;  // in memory: no file behind it
  posix::SandboxFileSystem files_;
  FileSeeder seeder_;
  Simulation sim_;
  ObjectPtr app_;
};

void BM_EnableClassMenuOneClass(benchmark::State& state) {
  ActivatedHost host;
  int16_t itemType = 4;
  // The first enabling after activation also looks up "MenuState" on each
  // class entry; report it apart from the steady state.
  uint64_t before = host.hostCalls();
  host.api().OnEnableContextMenuItems(host.app(), itemType);
  state.counters["hostCallsFirst"] = static_cast<double>(host.hostCalls() - before);

  before = host.hostCalls();
  for (auto _ : state) {
    host.api().OnEnableContextMenuItems(host.app(), itemType);
    host.DropEvents();
  }
  state.counters["hostCalls"] =
      benchmark::Counter(static_cast<double>(host.hostCalls() - before), benchmark::Counter::kAvgIterations);
}
BENCHMARK(BM_EnableClassMenuOneClass);

void BM_Activate(benchmark::State& state) {
  ActivatedHost host;
  const uint64_t before = host.hostCalls();
  for (auto _ : state) {
    host.api().OnActivate(host.app());
    host.DropEvents();
  }
  state.counters["hostCalls"] =
      benchmark::Counter(static_cast<double>(host.hostCalls() - before), benchmark::Counter::kAvgIterations);
}
BENCHMARK(BM_Activate);

}  // namespace
}  // namespace kpx::sim
