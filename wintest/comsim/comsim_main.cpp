// kpx-comsim: the simulated Quarn host of the native build, run as a COM
// test host under Wine. It plays a scenario like kpx-sim, but the add-in is
// the real kpxaddin.dll, created with CoCreateInstance("kpxAddIn.API") and
// called through IDispatch. The simulated host objects go to it as IDispatch
// servers; companions and the resource component are served as COM classes
// (registered in this process, ProgIDs in the Wine registry); the model's
// registry goes into the Wine registry and its files into the prefix's
// drive C.
//
// The add-in's message boxes are real ones: a watcher (ScriptedUser)
// presses on each the button the scenario queued, OK when none is left, as
// the native run's scripted user answers. Its prompts are real windows too:
// the watcher reads each off the screen into the simulator's view of it,
// which logs it and picks the answer, and plays that answer on the window
// (Help, the tick, OK or Cancel). The help viewer the add-in starts is
// ended after the run. Such scenarios need a display (run.sh gives them
// one with xvfb-run); without one they are reported as skipped.
//
// Its event log is then held against the native run's golden log, leaving
// out what only the native run can see or what depends on the real machine:
//  - the add-in's own calls to its platform (registry-*, file-*, sleep,
//    doevents, help): in the DLL they go straight to Win32, past any host
//    object, so no COM host can record them. WinHelpA hands its arguments
//    to the help viewer, another process; a message box or a prompt,
//    though, is seen on the screen: its texts, buttons and answer are
//    compared;
//  - the kind of a companion's call when it is a get or a method: a call
//    through IDispatch asks for both at once;
//  - the debug log events: compared instead with the real log file the DLL
//    wrote, line by line, without the time stamps (a real clock, not the
//    model's) and without the "Init time=" line (it says how long the real
//    activation took).
//
// The model's faults reach the DLL where they lie in the simulated world:
// host calls and resource texts fail inside the sim's objects, which the DLL
// calls through COM. Registry faults must be made real, as the DLL uses the
// registry itself (see MakeRegistryFaults); a scenario whose faults cannot
// be is reported as skipped, with the reason.
//
// Usage: kpx-comsim <scenario.json> <golden.jsonl> <out.jsonl>
// Exit: 0 same, 1 different, 2 bad input or failure, 3 skipped.

#include "platform/win32/win32_api.h"

#include <cstdio>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <cctype>
#include <set>
#include <sstream>
#include <string>
#include <vector>

#include "automation/error_styles.h"
#include "com_host.h"
#include "own_operations.h"
#include "scripted_user.h"
#include "platform/win32/com_bridge.h"
#include "platform/win32/com_errors.h"
#include "platform/win32/object_dispatch.h"
#include "platform/win32/win32_platform.h"
#include "platform/win32/win32_strings.h"
#include "shared/shared_debug_logger.h"
#include "sim/companions.h"
#include "sim/event_log.h"
#include "sim/json_source.h"
#include "sim/model_file.h"
#include "sim/scenario_file.h"
#include "sim/sim_platform.h"
#include "sim/simulation.h"

namespace fs = std::filesystem;
using namespace kpx;
using namespace kpx::sim;
using namespace wintest;

namespace {

// ------------------------------------------------------------ the machine

HKEY RootHandle(platform::RootKey root) {
  return root == platform::RootKey::CurrentUser ? HKEY_CURRENT_USER : HKEY_LOCAL_MACHINE;
}

std::string Joined(const std::vector<std::string>& parts, size_t count) {
  std::string key;
  for (size_t i = 0; i < count && i < parts.size(); ++i) key += (i ? "\\" : "") + parts[i];
  return key;
}

// Whether `inner` is the key `outer` or lies below it.
bool AtOrBelow(const std::string& inner, const std::string& outer) {
  return inner.size() >= outer.size() && _strnicmp(inner.c_str(), outer.c_str(), outer.size()) == 0 &&
         (inner.size() == outer.size() || inner[outer.size()] == '\\');
}

// The model's registry faults made real, as far as the real registry can
// have them; "" when done, else why not. The DLL reaches the registry
// straight through Win32, past the simulation:
//  - a key that cannot be created: Windows lets no lasting key be made
//    beneath a volatile one (ERROR_CHILD_MUST_BE_VOLATILE), so the missing
//    keys above it are made volatile. That needs its parent missing before
//    the run, and no key of the run beneath the volatile ones;
//  - a value that reads back other than written: the real registry gives
//    back what was written, so this cannot be had.
std::string MakeRegistryFaults(const ModelDef& model, const Scenario& scenario) {
  for (const RegistryFaultDef& f : model.faults.registry)
    if (!f.reads.empty())
      return "the model makes values of " + RootName(f.root) + "\\" + f.key +
             " read back other than written, and the real registry the DLL reads gives back what was written";
  for (const RegistryFaultDef& f : model.faults.registry) {
    if (!f.cannotCreate) continue;
    const std::string where = RootName(f.root) + "\\" + f.key;
    std::vector<std::string> parts;
    std::stringstream in(f.key);
    for (std::string p; std::getline(in, p, '\\');) parts.push_back(p);
    const HKEY root = RootHandle(f.root);
    size_t missing = 0;  // keys from parts[0 .. missing) exist
    for (; missing < parts.size(); ++missing) {
      HKEY key = nullptr;
      if (RegOpenKeyExA(root, Joined(parts, missing + 1).c_str(), 0, KEY_READ, &key) != ERROR_SUCCESS) break;
      RegCloseKey(key);
    }
    if (missing + 1 >= parts.size())
      return "the parent of " + where + " exists before the run, so it cannot be made volatile to keep the key out";
    const std::string top = Joined(parts, missing + 1);
    std::vector<const RegistryEntry*> entries;
    for (const RegistryEntry& e : model.registry) entries.push_back(&e);
    for (const Action& a : scenario.actions)
      for (const RegistryEntry& e : a.registry) entries.push_back(&e);
    for (const RegistryEntry* e : entries)
      if (e->root == f.root && AtOrBelow(e->key, top))
        return "the run puts " + RootName(e->root) + "\\" + e->key + " beneath " + RootName(f.root) + "\\" + top +
               ", which must be volatile to keep " + where + " out";
    for (size_t n = missing + 1; n < parts.size(); ++n) {
      HKEY key = nullptr;
      if (RegCreateKeyExA(root, Joined(parts, n).c_str(), 0, nullptr, REG_OPTION_VOLATILE, KEY_ALL_ACCESS, nullptr,
                          &key, nullptr) != ERROR_SUCCESS)
        return "cannot create the volatile key " + Joined(parts, n);
      RegCloseKey(key);
    }
    // The add-in's own way of creating it must now fail.
    HKEY key = nullptr;
    if (RegCreateKeyExA(root, f.key.c_str(), 0, nullptr, REG_OPTION_NON_VOLATILE, KEY_ALL_ACCESS, nullptr, &key,
                        nullptr) == ERROR_SUCCESS) {
      RegCloseKey(key);
      RegDeleteKeyA(root, f.key.c_str());
      return "this system lets a lasting key be created beneath a volatile one, so " + where + " can be created";
    }
  }
  return "";
}

// ------------------------------------------------------------ comparing

bool PlatformEvent(const std::string& ev) {
  static const std::set<std::string> kinds = {"registry-read", "registry-write", "registry-create", "file-exists",
                                              "file-delete",   "file-append",    "file-read",       "sleep",
                                              "doevents",      "help",           "debuglog"};
  return kinds.count(ev) != 0;
}

// An event as both runs can see it. A late-bound call through IDispatch
// asks for a method and a property get at once (as the Quarn host's own
// calls do), so a companion cannot tell the two apart: its calls' "get" and
// "method" kinds are one here. A message box is held by what the user sees
// of it: its text, title, buttons and the button pressed (the icon and
// default button bits of its style do not show on the box's buttons).
std::string AsBothSeeIt(const std::string& line) {
  EventJson ev = EventJson::parse(line);
  const std::string kind = ev.at("ev");
  if (kind == "companion-call" && ev.contains("kind") && (ev["kind"] == "get" || ev["kind"] == "method"))
    ev.erase("kind");
  if (kind == "messagebox") ev["style"] = ev.at("style").get<uint32_t>() & 0xFu;
  return ev.dump();
}

// A debug line from its level on: the stamp before it is the clock's.
std::string WithoutStamp(const std::string& line) {
  static const char* kLevels[] = {"CRITICAL ", "ERROR    ", "WARNING  ", "INFO     ", "TRACE    ", "TIMING   ", "DEBUG    "};
  size_t best = std::string::npos;
  for (const char* level : kLevels) best = std::min(best, line.find(std::string(" ") + level));
  return best == std::string::npos ? line : line.substr(best + 1);
}

bool Comparable(const std::string& line) { return line.find("kpxAddin.OnActivate: Init time=") == std::string::npos; }

std::vector<std::string> Lines(const std::string& text) {
  std::vector<std::string> out;
  std::stringstream in(text);
  for (std::string l; std::getline(in, l);) {
    if (!l.empty() && l.back() == '\r') l.pop_back();
    if (!l.empty()) out.push_back(l);
  }
  return out;
}

std::string Lower(std::string s) {
  for (char& c : s) c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
  return s;
}

// `served`: the ProgIDs and class ids this host serves (lower case). A
// creation by any other name fails inside COM on Windows, before any host
// code runs: the native run's record of that failure has no counterpart.
int Compare(const std::string& golden, const std::string& ours, const std::string& debugText,
            const std::string& logPath, const std::set<std::string>& served) {
  std::vector<std::string> want, got, wantDebug, gotDebug;
  for (const std::string& l : Lines(golden)) {
    EventJson ev = EventJson::parse(l);
    const std::string kind = ev.at("ev");
    if (kind == "debuglog") {
      if (ev.at("ok").get<bool>() && Comparable(ev.at("line"))) wantDebug.push_back(WithoutStamp(ev.at("line")));
    } else if (kind == "file-delete") {
      // The file on disk holds what was written since it was last deleted.
      if (ev.at("ok").get<bool>() && Lower(ev.at("path")) == Lower(logPath)) wantDebug.clear();
    } else if (kind == "object-create" && !ev.at("ok").get<bool>() &&
               !served.count(Lower(ev.value("progid", ev.value("clsid", ""))))) {
      continue;
    } else if (!PlatformEvent(kind)) {
      want.push_back(AsBothSeeIt(l));
    }
  }
  for (const std::string& l : Lines(ours))
    if (!PlatformEvent(EventJson::parse(l).at("ev"))) got.push_back(AsBothSeeIt(l));
  for (const std::string& l : Lines(debugText))
    if (Comparable(l)) gotDebug.push_back(WithoutStamp(l));

  int differences = 0;
  auto diff = [&](const char* what, const std::vector<std::string>& a, const std::vector<std::string>& b) {
    const size_t n = std::max(a.size(), b.size());
    for (size_t i = 0; i < n; ++i) {
      const std::string x = i < a.size() ? a[i] : "(nothing)";
      const std::string y = i < b.size() ? b[i] : "(nothing)";
      if (x == y) continue;
      std::printf("  %s %zu:\n    native: %s\n    com:    %s\n", what, i + 1, x.c_str(), y.c_str());
      if (++differences >= 6) return;
    }
  };
  diff("event", want, got);
  diff("debug line", wantDebug, gotDebug);
  std::printf("  %zu events, %zu debug lines compared\n", want.size(), wantDebug.size());
  return differences == 0 ? 0 : 1;
}

std::string ReadAll(const fs::path& p) {
  std::ifstream in(p, std::ios::binary);
  std::stringstream s;
  s << in.rdbuf();
  return s.str();
}

int Main(int argc, char** argv) {
  if (argc != 4) {
    std::fprintf(stderr, "usage: kpx-comsim <scenario.json> <golden.jsonl> <out.jsonl>\n");
    return 2;
  }
  const std::string scenarioFile = argv[1];
  const JsonSource scenarioSource = JsonSource::Load(scenarioFile);
  std::optional<fs::path> modelFile = ScenarioModelPath(scenarioSource);
  if (!modelFile) throw InputError(scenarioFile, 1, "the scenario names no model");
  const JsonSource modelSource = JsonSource::Load(modelFile->string());
  const ModelDef model = LoadModel(modelSource);
  const Scenario scenario = LoadScenario(scenarioSource, model);
  const std::string golden = ReadAll(argv[2]);
  // A real message box needs a screen to be shown on.
  bool userInterface = golden.find("\"ev\":\"messagebox\"") != std::string::npos ||
                       golden.find("\"ev\":\"prompt\"") != std::string::npos ||
                       golden.find("\"ev\":\"help\"") != std::string::npos;
  for (const Action& a : scenario.actions) userInterface = userInterface || a.type == Action::Type::Answer;
  if (userInterface && GetEnvironmentVariableW(L"DISPLAY", nullptr, 0) == 0) {
    std::printf("  skipped: the add-in shows a message box, a prompt or help, and there is no display (DISPLAY)\n");
    return 3;
  }

  // The Restore dialog's steps (clicks, the comparison menu, the timer) are
  // not played on the real window yet.
  for (const Action& a : scenario.actions) {
    if (a.type == Action::Type::Answer && a.restore) {
      std::printf("  skipped: the scenario works the Restore dialog, which is not played on the real window yet\n");
      return 3;
    }
  }

  const auto trees = TreesOf(model, scenario);
  RemoveTrees(trees);
  RemoveJournaled();
  const std::string unmade = MakeRegistryFaults(model, scenario);
  if (!unmade.empty()) {
    RemoveTrees(trees);
    std::printf("  skipped: %s\n", unmade.c_str());
    return 3;
  }

  win32::Win32Registry registry;
  win32::Win32FileSystem files;
  FileSeeder seeder([](std::string_view path) { return fs::path(win32::Utf8ToWide(path)); });
  // The model's registry now, ahead of the simulation (which puts it in
  // place again): it says where the debug log goes.
  SeedRegistry(registry, model.registry);

  // Where the DLL writes its debug log, found as it finds it.
  win32::ServerLocks unusedLocks;
  win32::ComBridge unusedBridge(unusedLocks);
  win32::Win32Platform machine(unusedBridge);
  DebugLogger settings(machine.platform());
  const std::string logPath = settings.DebugMask() ? settings.DebugOutputPath() : std::string();

  std::vector<std::string> touched = model.folders;
  for (const auto& [path, content] : model.files) touched.push_back(path);
  for (const Action& a : scenario.actions)
    for (const auto& [path, content] : a.files) touched.push_back(path);
  if (!logPath.empty()) touched.push_back(logPath);
  const std::vector<fs::path> added = NewPaths(touched);
  Journal(added);

  std::string jsonl, debugText;
  {
    // The host's bridge outlives the simulation: the add-in object the
    // simulation holds came through it.
    std::unique_ptr<Host> host;
    // The scenario's token scanner is the DLL's, its dictionary the
    // Scripting Runtime's.
    ScenarioObjectFactories objects{[&host] { return CreateByProgId(host->bridge, L"kpxAddIn.TokenScanner"); },
                                    [&host] { return CreateByProgId(host->bridge, L"Scripting.Dictionary"); }};
    Simulation sim(model, {registry, files, seeder}, [&host] { return CreateAddIn(host->bridge); }, objects);
    host = std::make_unique<Host>(model, sim.platform().objects);
    host->RegisterAll();
    {
      wintest::ScriptedUser user(sim.platform().ui);
      sim.Run(scenario);
    }
    if (int ended = wintest::ScriptedUser::EndChildren()) std::printf("  ended %d process(es) the add-in left running\n", ended);
    CoFreeUnusedLibraries();
    host->RevokeAll();
    jsonl = sim.log().Jsonl();
  }
  if (!logPath.empty()) debugText = ReadAll(fs::path(win32::Utf8ToWide(logPath)));

  RemoveTrees(trees);
  RemoveJournaled();

  std::ofstream(argv[3], std::ios::binary) << jsonl;
  std::set<std::string> served = {Lower(wintest::kResourceProgId), Lower(wintest::kResourceClsid)};
  for (const auto& c : model.companions) {
    if (!c->progid.empty()) served.insert(Lower(c->progid));
    if (!c->clsid.empty()) served.insert(Lower(c->clsid));
  }
  return Compare(golden, jsonl, debugText, logPath, served);
}

}  // namespace

int main(int argc, char** argv) {
  CoInitialize(nullptr);
  int rc = 2;
  try {
    rc = Main(argc, argv);
  } catch (const std::exception& e) {
    std::printf("  kpx-comsim: %s\n", e.what());
  }
  CoUninitialize();
  return rc;
}
