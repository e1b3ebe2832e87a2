// The host's share of an add-in member: the time the call spends inside the
// host's objects (and the companions, which are not the add-in's either),
// told by the objects themselves through a CallObserver. Only the outermost
// span counts, so objects calling each other count once.
//
// The clock is the processor's time-stamp counter: on these machines it
// reads in a fraction of the time a clock call takes (a system call under
// Wine), and its rate is measured against the steady clock once.
#pragma once

#include <benchmark/benchmark.h>
#include <x86intrin.h>

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <vector>

#include "automation/call_observer.h"

namespace kpx::bench {

class HostMeter final : public CallObserver {
 public:
  void Enter() override {
    if (depth_++ == 0) start_ = __rdtsc();
  }
  void Leave() override {
    if (--depth_ == 0) {
      ticks_ += __rdtsc() - start_;
      ++spans_;
    }
  }
  void Reset() {
    ticks_ = 0;
    spans_ = 0;
  }
  uint64_t ticks() const { return ticks_; }
  uint64_t spans() const { return spans_; }

 private:
  int depth_ = 0;
  uint64_t start_ = 0;
  uint64_t ticks_ = 0;
  uint64_t spans_ = 0;
};

// Counter ticks per nanosecond, and the ticks an empty span reads (the cost
// of reading the counter, which every span carries).
struct TickScale {
  double perNs = 1.0;
  double emptySpan = 0.0;

  static TickScale Measure() {
    using Clock = std::chrono::steady_clock;
    TickScale scale;
    const Clock::time_point t0 = Clock::now();
    const uint64_t c0 = __rdtsc();
    while (Clock::now() - t0 < std::chrono::milliseconds(50)) {
    }
    const uint64_t c1 = __rdtsc();
    const Clock::time_point t1 = Clock::now();
    scale.perNs = static_cast<double>(c1 - c0) / static_cast<double>(std::chrono::nanoseconds(t1 - t0).count());
    std::vector<uint64_t> empty(10001);
    for (uint64_t& e : empty) {
      const uint64_t a = __rdtsc();
      e = __rdtsc() - a;
    }
    std::nth_element(empty.begin(), empty.begin() + 5000, empty.end());
    scale.emptySpan = static_cast<double>(empty[5000]);
    return scale;
  }

  // Nanoseconds inside the host, per iteration, without the meter's own
  // cost.
  double HostNs(const HostMeter& meter, double iterations) const {
    const double ticks = static_cast<double>(meter.ticks()) - emptySpan * static_cast<double>(meter.spans());
    return std::max(0.0, ticks) / perNs / iterations;
  }
};

// The loop of one member, natively or through COM. `host` says where the
// meter listens (Observe), how many host calls were made (hostCalls) and
// keeps the simulated host's event log short (DropEvents). Run with
// range(0) = 1 ("metered:1"), the host's share of the time is counter
// host_ns; the meter is not there at all in the plain run.
template <class Host, class Call>
void MeasureMember(benchmark::State& state, Host& host, Call call) {
  static const TickScale scale = TickScale::Measure();
  const bool metered = state.range(0) != 0;
  HostMeter meter;
  if (metered) host.Observe(&meter);
  const uint64_t before = host.hostCalls();
  for (auto _ : state) {
    call();
    host.DropEvents();
  }
  host.Observe(nullptr);
  state.counters["hostCalls"] =
      benchmark::Counter(static_cast<double>(host.hostCalls() - before), benchmark::Counter::kAvgIterations);
  if (metered) state.counters["host_ns"] = scale.HostNs(meter, static_cast<double>(state.iterations()));
}

}  // namespace kpx::bench
