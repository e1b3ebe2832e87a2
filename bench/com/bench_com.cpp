// The members of bench/bench_host_calls.cpp on the real DLL, called through
// IDispatch as the Quarn host calls them, under Wine: the add-in's name,
// enabling the class menu for one selected class, and activation. The world
// is the same model through the same simulator library; the host's objects
// and the companions are served from this process as COM objects (the host
// of kpx-comsim), so the add-in's calls out cross the COM boundary too.
//
// Each member runs plain and metered ("metered:1"); metered, the counter
// host_ns is the time spent serving the add-in's calls into the host's
// objects and the companions, conversions of the host's side included. The
// DLL's own share is the rest. kpxaddin.dll must be registered
// (scripts/bench-com.sh does it).
#include "platform/win32/win32_api.h"

#include <benchmark/benchmark.h>

#include <cstdio>
#include <filesystem>
#include <memory>
#include <stdexcept>
#include <string>
#include <vector>

#include "bench_model.h"
#include "com_host.h"
#include "host_meter.h"
#include "platform/win32/win32_platform.h"
#include "platform/win32/win32_strings.h"
#include "sim/json_source.h"
#include "sim/model_file.h"
#include "sim/sim_platform.h"
#include "sim/simulation.h"

namespace kpx::bench {
namespace {

using namespace kpx::sim;

// The add-in's dispatch ids, as its type library has them.
constexpr DISPID kOnEnableContextMenuItems = 2;
constexpr DISPID kName = 18;
constexpr DISPID kOnActivate = 20;

// The model's world on the machine, the DLL's add-in object made through
// COM and activated once, as the host does at start-up.
class ComHost {
 public:
  ComHost()
      : source_("bench-model.json", kHostCallsModel),
        model_(LoadModel(source_)),
        trees_(wintest::TreesOf(model_, Scenario{})),
        seeder_([](std::string_view path) { return std::filesystem::path(win32::Utf8ToWide(path)); }) {
    wintest::RemoveTrees(trees_);
    wintest::RemoveJournaled();
    std::vector<std::string> touched = model_.folders;
    for (const auto& [path, content] : model_.files) touched.push_back(path);
    added_ = wintest::NewPaths(touched);
    wintest::Journal(added_);

    sim_ = std::make_unique<Simulation>(model_, Environment{registry_, files_, seeder_}, [this] {
      api_ = wintest::CreateDispatchByProgId(L"kpxAddIn.API");
      return wintest::AddInView(host_->bridge, api_);
    });
    host_ = std::make_unique<wintest::Host>(model_, sim_->platform().objects);
    host_->RegisterAll();
    sim_->Prepare();
    sim_->Create();
    app_ = host_->bridge.Expose(sim_->world().application());
    if (FAILED(CallWithApp(kOnActivate))) throw std::runtime_error("OnActivate failed");
  }
  ~ComHost() {
    // The add-in object goes while the world it holds on to is still there.
    if (api_) api_->Release();
    if (app_) app_->Release();
    sim_.reset();
    CoFreeUnusedLibraries();
    host_->RevokeAll();
    host_.reset();
    wintest::RemoveTrees(trees_);
    wintest::RemoveJournaled();
  }
  ComHost(const ComHost&) = delete;
  ComHost& operator=(const ComHost&) = delete;

  // A member taking the host application by reference, and an item type
  // by reference when one is given.
  HRESULT CallWithApp(DISPID id, short* itemType = nullptr) {
    IDispatch* app = app_;
    app->AddRef();
    VARIANTARG args[2];
    UINT count = 0;
    if (itemType) {
      args[count].vt = VT_BYREF | VT_I2;
      args[count++].piVal = itemType;
    }
    args[count].vt = VT_BYREF | VT_DISPATCH;
    args[count++].ppdispVal = &app;
    HRESULT hr = Invoke(id, DISPATCH_METHOD, args, count);
    if (app) app->Release();
    return hr;
  }

  HRESULT GetName() { return Invoke(kName, DISPATCH_PROPERTYGET, nullptr, 0); }

  void Observe(CallObserver* observer) { host_->bridge.Observe(observer); }
  uint64_t hostCalls() const { return sim_->log().hostCalls(); }
  void DropEvents() {
    if (sim_->log().events().size() > 4096) sim_->log().Clear();
  }

 private:
  HRESULT Invoke(DISPID id, WORD flags, VARIANTARG* args, UINT count) {
    DISPPARAMS params{args, nullptr, count, 0};
    VARIANT result;
    VariantInit(&result);
    EXCEPINFO info{};
    HRESULT hr = api_->Invoke(id, IID_NULL, LOCALE_USER_DEFAULT, flags, &params, &result, &info, nullptr);
    // Freeing what came back is the host's work.
    ObservedCall freeing(host_->bridge.observer());
    VariantClear(&result);
    SysFreeString(info.bstrDescription);
    SysFreeString(info.bstrSource);
    SysFreeString(info.bstrHelpFile);
    return hr;
  }

  JsonSource source_;
  ModelDef model_;
  std::vector<std::pair<HKEY, std::string>> trees_;
  std::vector<std::filesystem::path> added_;
  win32::Win32Registry registry_;
  win32::Win32FileSystem files_;
  FileSeeder seeder_;
  // The host's bridge outlives the simulation: the add-in object the
  // simulation holds came through it.
  std::unique_ptr<wintest::Host> host_;
  std::unique_ptr<Simulation> sim_;
  IDispatch* api_ = nullptr;
  IDispatch* app_ = nullptr;
};

// A failed call ends the benchmark with its HRESULT rather than timing
// an error path.
template <class Call>
auto Checked(benchmark::State& state, Call call) {
  return [&state, call] {
    const HRESULT hr = call();
    if (FAILED(hr) && !state.error_occurred()) {
      char text[64];
      snprintf(text, sizeof text, "the call failed: 0x%08lX", static_cast<unsigned long>(hr));
      state.SkipWithError(text);
    }
  };
}

void BM_Name(benchmark::State& state) {
  ComHost host;
  MeasureMember(state, host, Checked(state, [&] { return host.GetName(); }));
}
BENCHMARK(BM_Name)->ArgName("metered")->Arg(0)->Arg(1);

void BM_EnableClassMenuOneClass(benchmark::State& state) {
  ComHost host;
  short itemType = 4;
  // The first enabling after activation also looks up "MenuState" on each
  // class entry; report it apart from the steady state.
  uint64_t before = host.hostCalls();
  host.CallWithApp(kOnEnableContextMenuItems, &itemType);
  state.counters["hostCallsFirst"] = static_cast<double>(host.hostCalls() - before);
  MeasureMember(state, host, Checked(state, [&] { return host.CallWithApp(kOnEnableContextMenuItems, &itemType); }));
}
BENCHMARK(BM_EnableClassMenuOneClass)->ArgName("metered")->Arg(0)->Arg(1);

void BM_Activate(benchmark::State& state) {
  ComHost host;
  MeasureMember(state, host, Checked(state, [&] { return host.CallWithApp(kOnActivate); }));
}
BENCHMARK(BM_Activate)->ArgName("metered")->Arg(0)->Arg(1);

// The Win32 calls of the add-in's platform layer that activation makes
// (natively they reach the simulator's in-memory registry and sandbox):
// under Wine each is a round trip to the Wine server, which is a large part
// of the DLL's own share of OnActivate. Same code as in the DLL.
struct Machine {
  win32::ServerLocks locks;
  win32::ComBridge bridge{locks};
  win32::Win32Platform win32{bridge};
  platform::Platform platform = win32.platform();
  static constexpr const char* kKey = "Software\\kpx-combench";
  Machine() {
    platform.registry.CreateKey(platform::RootKey::CurrentUser, kKey);
    platform.registry.SetValue(platform::RootKey::CurrentUser, kKey, "Filename",
                               {platform::kRegSz, std::string("C:\\Program Files\\Quarn\\vc\\dlls\\kpxideaddin.dll") + '\0'});
  }
  ~Machine() { RegDeleteKeyA(HKEY_CURRENT_USER, kKey); }
};

void BM_PlatformRegistryRead(benchmark::State& state) {
  Machine m;
  for (auto _ : state) benchmark::DoNotOptimize(m.platform.registry.QueryValue(platform::RootKey::CurrentUser, Machine::kKey, "Filename"));
}
BENCHMARK(BM_PlatformRegistryRead);

void BM_PlatformCreateKey(benchmark::State& state) {
  Machine m;
  for (auto _ : state) benchmark::DoNotOptimize(m.platform.registry.CreateKey(platform::RootKey::CurrentUser, Machine::kKey));
}
BENCHMARK(BM_PlatformCreateKey);

void BM_PlatformFileExists(benchmark::State& state) {
  Machine m;
  for (auto _ : state) benchmark::DoNotOptimize(m.platform.files.Exists("C:\\windows\\system32\\kernel32.dll"));
}
BENCHMARK(BM_PlatformFileExists);

void BM_PlatformDoEvents(benchmark::State& state) {
  Machine m;
  for (auto _ : state) m.platform.ui.DoEvents();
}
BENCHMARK(BM_PlatformDoEvents);

}  // namespace
}  // namespace kpx::bench

int main(int argc, char** argv) {
  CoInitialize(nullptr);
  benchmark::Initialize(&argc, argv);
  int rc = 0;
  if (benchmark::ReportUnrecognizedArguments(argc, argv)) {
    rc = 1;
  } else {
    benchmark::RunSpecifiedBenchmarks();
  }
  benchmark::Shutdown();
  CoUninitialize();
  return rc;
}
