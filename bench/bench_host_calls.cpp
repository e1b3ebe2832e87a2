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
#include "sim_host.h"
#include "host_meter.h"
#include "platform/posix/posix_platform.h"
#include "sim/json_source.h"
#include "sim/model_file.h"
#include "sim/simulation.h"

namespace kpx::sim {
namespace {

// The model loaded through the library, the add-in object made and
// activated once, as the host does at start-up.
class ActivatedHost : public bench::SimHost {
 public:
  ActivatedHost() : SimHost(bench::kHostCallsModel) { api().OnActivate(app_); }
  ObjectPtr& app() { return app_; }

 private:
  ObjectPtr app_ = SimHost::app();
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
