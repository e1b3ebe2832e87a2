// Costs of the shared services on the paths where the host waits.
#include <benchmark/benchmark.h>

#include <filesystem>

#include "fakes.h"
#include "shared/host_ids.h"
#include "shared/shared_debug_logger.h"
#include "shared/shared_registryapi2.h"
#include "shared/token_scanner.h"

namespace kpx {
namespace {

struct LoggerFixture {
  explicit LoggerFixture(int32_t mask) {
    world.registry.CreateKey(RootKey::LocalMachine, kDebugSettingsKey);
    RegistrySetValue(world.registry, RootKey::LocalMachine, kDebugSettingsKey, "Debug", Variant(mask),
                     platform::kRegDword);
  }
  test::World world;
  platform::Platform platform = world.platform();
  DebugLogger logger{platform};
};

// Logging switched off for the add-in's id: two bit tests, no formatting.
void BM_DebugLogFilteredOut(benchmark::State& state) {
  LoggerFixture f(0x7F000000);  // every level, no log id
  f.logger.DebugMask();
  for (auto _ : state) benchmark::DoNotOptimize(f.logger.DebugLog("kpxAddin.OnActivate(QuarnApp)", logid::ADDIN, loglevel::TRACE));
}
BENCHMARK(BM_DebugLogFilteredOut);

// One line written to a real file: open, append, close, as the log does.
void BM_DebugLogWrittenLine(benchmark::State& state) {
  const std::filesystem::path sandbox = std::filesystem::temp_directory_path() / "kpx-bench-log";
  std::filesystem::create_directories(sandbox / "C");
  posix::SandboxFileSystem files(sandbox);
  test::World world;
  world.registry.CreateKey(RootKey::LocalMachine, kDebugSettingsKey);
  RegistrySetValue(world.registry, RootKey::LocalMachine, kDebugSettingsKey, "Debug", Variant(0x7F000080),
                   platform::kRegDword);
  platform::Platform platform{world.registry, files, world.clock, world.factory, world.ui, world.processes};
  DebugLogger logger{platform};
  for (auto _ : state) logger.DebugLog("kpxAddin.OnActivate(QuarnApp)", logid::ADDIN, loglevel::TRACE);
  std::filesystem::remove_all(sandbox);
}
BENCHMARK(BM_DebugLogWrittenLine);

// A stereotype test against a long stereotype text whose match is last.
void BM_HasStereotypeLongText(benchmark::State& state) {
  std::string text;
  for (int i = 0; i < state.range(0); ++i) text += "stereo" + std::to_string(i) + ", ";
  text += "ATLObject";
  auto element = std::make_shared<test::FakeObject>("e", nullptr);
  element->On(hostid::kStereotype, "Stereotype", [&](std::span<Variant>) -> Variant { return text; });
  for (auto _ : state) benchmark::DoNotOptimize(HasStereotype("atlobject", element));
  state.SetComplexityN(state.range(0));
}
BENCHMARK(BM_HasStereotypeLongText)->Arg(10)->Arg(1000)->Complexity();

// Replacing every token of a text of `range` tokens ("abc," each): one pass,
// so the cost per token stays flat from a small text to ten megabytes.
void BM_ReplaceEveryToken(benchmark::State& state) {
  std::string text;
  for (int64_t i = 0; i < state.range(0); ++i) text += "abc,";
  for (auto _ : state) {
    TokenScanner s;
    s.Init(text, "|,");
    for (std::string t = s.NextToken(); !t.empty(); t = s.NextToken()) s.ReplaceCurrentToken("z");
    benchmark::DoNotOptimize(s.ScanString().size());
  }
  state.SetComplexityN(state.range(0));
  state.SetBytesProcessed(state.iterations() * static_cast<int64_t>(text.size()));
}
BENCHMARK(BM_ReplaceEveryToken)->Arg(25'000)->Arg(250'000)->Arg(2'500'000)->Unit(benchmark::kMillisecond)->Complexity();

}  // namespace
}  // namespace kpx
