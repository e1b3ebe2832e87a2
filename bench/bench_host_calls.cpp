// Host calls on the paths where the host waits for the add-in: enabling the
// class menu when the user right-clicks one class, activation, and the
// add-in's name. In the real host every call is a round trip through
// automation, so the count per member is the number to watch.
//
// Each member runs twice: plain, for its time, and metered ("metered:1"),
// whose counter host_ns is the share of that time spent inside the
// simulated host's objects and the companions. The add-in's own share is
// the one less the other; bench/com/ measures the same members of the real
// DLL through COM under Wine, and scripts/bench-com.sh sets them side by
// side.
#include <benchmark/benchmark.h>

#include <atomic>
#include <cstdint>
#include <filesystem>
#include <string>

#include "bench_model.h"
#include "host_meter.h"
#include "platform/posix/posix_platform.h"
#include "sim/json_source.h"
#include "sim/model_file.h"
#include "sim/simulation.h"

namespace kpx::sim {
namespace {

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
      : source_("bench-model.json", bench::kHostCallsModel),
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
  void Observe(CallObserver* observer) { sim_.log().Observe(observer); }
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

void BM_Name(benchmark::State& state) {
  ActivatedHost host;
  bench::MeasureMember(state, host, [&] { benchmark::DoNotOptimize(host.api().Name()); });
}
BENCHMARK(BM_Name)->ArgName("metered")->Arg(0)->Arg(1);

void BM_EnableClassMenuOneClass(benchmark::State& state) {
  ActivatedHost host;
  int16_t itemType = 4;
  // The first enabling after activation also looks up "MenuState" on each
  // class entry; report it apart from the steady state.
  uint64_t before = host.hostCalls();
  host.api().OnEnableContextMenuItems(host.app(), itemType);
  state.counters["hostCallsFirst"] = static_cast<double>(host.hostCalls() - before);
  bench::MeasureMember(state, host, [&] { host.api().OnEnableContextMenuItems(host.app(), itemType); });
}
BENCHMARK(BM_EnableClassMenuOneClass)->ArgName("metered")->Arg(0)->Arg(1);

void BM_Activate(benchmark::State& state) {
  ActivatedHost host;
  bench::MeasureMember(state, host, [&] { host.api().OnActivate(host.app()); });
}
BENCHMARK(BM_Activate)->ArgName("metered")->Arg(0)->Arg(1);

}  // namespace
}  // namespace kpx::sim
