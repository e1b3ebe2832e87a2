// Restoring many backups at once on real files: 100 projects of N files
// each, every file ticked, in a sandbox folder. Reported per run, with the
// files per second, so that growth in N shows whether the cost stays linear.
#include <benchmark/benchmark.h>

#include <filesystem>
#include <fstream>
#include <optional>

#include "fakes.h"
#include "platform/posix/posix_platform.h"
#include "restore/restore_source.h"
#include "shared/host_ids.h"

namespace kpx {
namespace {

using Args = std::span<Variant>;

struct RestoreWorld {
  explicit RestoreWorld(int filesPerProject) : sandbox(std::filesystem::temp_directory_path() / "kpx-bench-restore") {
    std::filesystem::remove_all(sandbox);
    for (int p = 0; p < kProjects; ++p) {
      const std::string name = "P" + std::to_string(p);
      const std::filesystem::path folder = sandbox / "C" / name;
      std::filesystem::create_directories(folder / "Backup");
      std::ofstream list(folder / "Backup" / (name + ".lst"), std::ios::binary);
      for (int f = 0; f < filesPerProject; ++f) {
        const std::string file = "f" + std::to_string(f) + ".cpp";
        std::ofstream(folder / file) << "generated\r\n";
        std::ofstream(folder / "Backup" / file) << "written by hand\r\n";
        list << "C:\\" << name << "\\" << file << "|C:\\" << name << "\\Backup\\" << file << "\r\n";
      }
      settings[std::to_string(p + 1)] = "C:\\" + name + "\\" + name + ".dsp|" + name + "|C:\\" + name + "\\Backup\\" + name + ".lst";
    }
    files = std::make_unique<posix::SandboxFileSystem>(sandbox);
    platform = std::make_unique<platform::Platform>(
        platform::Platform{world.registry, *files, world.clock, world.factory, world.ui, world.processes});
    module = std::make_unique<Module>(*platform);
    world.texts[5028] = "Backups";
    world.texts[5029] = "Backup";
    module->resources().InitResourceStrings();
    world.ui.defaultAnswer = 6;  // Yes
    world.ui.playRestore = [](platform::RestoreForm& form) {
      for (int32_t i = 0; i < static_cast<int32_t>(form.rows().size()); ++i)
        if (form.rows()[i].project) form.SetCheck(i, true);
      form.Ok();
    };
    app = std::make_shared<test::FakeObject>("app", nullptr);
    vc = std::make_shared<test::FakeObject>("vc", nullptr);
    auto manager = std::make_shared<test::FakeObject>("manager", nullptr);
    auto addIns = std::make_shared<test::FakeObject>("addins", nullptr);
    addIns->On(hostid::kCount, "Count", [](Args) -> Variant { return int16_t(1); })
        .On(hostid::kGetAt, "GetAt", [this](Args) -> Variant { return ObjectPtr(vc); });
    manager->On(hostid::kAddIns, "AddIns", [addIns](Args) -> Variant { return ObjectPtr(addIns); });
    app->On(hostid::kAddInManager, "AddInManager", [manager](Args) -> Variant { return ObjectPtr(manager); })
        .On(hostid::kWriteErrorLog, "WriteErrorLog", nullptr);
    vc->On(hostid::kAddInName, "Name", [](Args) -> Variant { return "VC++"; })
        .On(hostid::kReadSetting, "ReadSetting", [this](Args a) -> Variant {
          auto it = settings.find(a[1].toString());
          return a[0].toString() == "Backups" && it != settings.end() ? Variant(it->second) : a[2].deref();
        })
        .On(hostid::kWriteSetting, "WriteSetting", nullptr);
  }
  ~RestoreWorld() { std::filesystem::remove_all(sandbox); }

  static constexpr int kProjects = 100;
  std::filesystem::path sandbox;
  test::World world;
  std::unique_ptr<posix::SandboxFileSystem> files;
  std::unique_ptr<platform::Platform> platform;
  std::unique_ptr<Module> module;
  std::shared_ptr<test::FakeObject> app, vc;
  std::map<std::string, std::string> settings;
};

void BM_RestoreEverything(benchmark::State& state) {
  const int perProject = static_cast<int>(state.range(0));
  std::optional<RestoreWorld> world;
  for (auto _ : state) {
    state.PauseTiming();
    world.reset();
    world.emplace(perProject);
    state.ResumeTiming();
    RestoreSource(*world->module).RestoreSourceFiles(world->app);
  }
  if (std::filesystem::exists(world->sandbox / "C" / "P0" / "Backup" / "P0.lst")) state.SkipWithError("not restored");
  state.counters["files"] = RestoreWorld::kProjects * perProject;
  state.counters["files/s"] =
      benchmark::Counter(RestoreWorld::kProjects * perProject, benchmark::Counter::kIsIterationInvariantRate);
}
BENCHMARK(BM_RestoreEverything)->Arg(10)->Arg(100)->Unit(benchmark::kMillisecond)->Iterations(1);

}  // namespace
}  // namespace kpx
