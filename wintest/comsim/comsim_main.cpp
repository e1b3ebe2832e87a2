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
//    doevents, help, process): in the DLL they go straight to Win32, past
//    any host object, so no COM host can record them. WinHelpA hands its
//    arguments to the help viewer, another process; a message box or a
//    prompt, though, is seen on the screen: its texts, buttons and answer
//    are compared. So is the Restore dialog, but for what its closing
//    button left in the form behind it, which no window shows. The
//    programs the DLL started are compared apart: each start the child
//    program recorded (its program and command line) against the native
//    run's started processes, in order;
//  - the kind of a companion's call when it is a get or a method: a call
//    through IDispatch asks for both at once;
//  - the debug log events: compared instead with the real log file the DLL
//    wrote, line by line, without the time stamps (a real clock, not the
//    model's) and without the "Init time=" line (it says how long the real
//    activation took).
//
// The model's faults reach the DLL where they lie in the simulated world:
// host calls and resource texts fail inside the sim's objects, which the DLL
// calls through COM. Registry and file faults must be made real, as the DLL
// uses the registry and the files itself (see MakeRegistryFaults,
// FileFaults); so must the programs the model lists, which the DLL really
// starts (see ProgramsUnmade). A scenario whose faults or programs cannot be
// made real is reported as skipped, with the reason.
//
// The Restore dialog is the real window too, played step by step by the
// watcher through the simulator's own player (see restore_player.h).
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
#include "shared/shared_utilities.h"
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

// A file fault made real: the file held open without leave to delete it,
// for the run. Only a failing delete with "Permission denied" (70) can be
// had so: the DLL takes the sharing violation for that error.
class FileFaults {
 public:
  FileFaults() = default;
  FileFaults(const FileFaults&) = delete;
  FileFaults& operator=(const FileFaults&) = delete;
  ~FileFaults() { Release(); }

  // Why the model's file faults cannot be made real; "" when they can.
  static std::string Unmade(const ModelDef& model) {
    for (const auto& [path, f] : model.faults.files) {
      if (f.move || f.replace || f.times)
        return "the model makes moving, replacing or stamping " + path +
               " fail, which a real file cannot be made to do without failing its delete first";
      if (f.remove && f.remove->number != vberr::kPermissionDenied)
        return "the model makes deleting " + path + " fail with error " + std::to_string(f.remove->number) +
               ", and a real file held open fails it with Permission denied (70)";
    }
    return "";
  }

  // Once the model's files are in place. "" when done, else why not.
  std::string Hold(const ModelDef& model) {
    for (const auto& [path, f] : model.faults.files) {
      if (!f.remove) continue;
      const std::wstring wide = win32::Utf8ToWide(path);
      HANDLE file = CreateFileW(wide.c_str(), GENERIC_READ, FILE_SHARE_READ | FILE_SHARE_WRITE, nullptr, OPEN_EXISTING,
                                FILE_ATTRIBUTE_NORMAL, nullptr);
      if (file == INVALID_HANDLE_VALUE) return "cannot open " + path + " to keep it from being deleted";
      held_.push_back(file);
      // A delete must now be refused.
      HANDLE probe = CreateFileW(wide.c_str(), DELETE, FILE_SHARE_READ | FILE_SHARE_WRITE | FILE_SHARE_DELETE, nullptr,
                                 OPEN_EXISTING, FILE_ATTRIBUTE_NORMAL, nullptr);
      if (probe != INVALID_HANDLE_VALUE) {
        CloseHandle(probe);
        return "this system lets a file held open be deleted, so deleting " + path + " cannot be made to fail";
      }
    }
    return "";
  }

  void Release() {
    for (HANDLE file : held_) CloseHandle(file);
    held_.clear();
  }

 private:
  std::vector<HANDLE> held_;
};

// The model's programs made real, as far as real programs can be. One that
// ends with an exit code is the test's child program (wintest/child.cpp),
// copied to the program's path and told its exit code; the files for that
// go into `paths` first, so that they are journaled and removed. One that
// cannot be started must be missing here, where a real start fails with
// error 2 (file not found). "" when all can be, else why not.
std::string ProgramsUnmade(const ModelDef& model, std::vector<std::string>& paths) {
  for (const auto& [program, def] : model.processes) {
    switch (def.kind) {
      case ProcessDef::Kind::Exits:
        if (program.size() < 3 || program[1] != ':' || program[2] != '\\')
          return "the model's program " + program + " has no full path to put a real program at";
        if (fs::exists(fs::path(win32::Utf8ToWide(program))))
          return "the model's program " + program + " is a real one on this system, not to be replaced";
        paths.push_back(program);
        paths.push_back(program + ".exit");
        break;
      case ProcessDef::Kind::StartFails:
        if (def.error != 2)
          return "the model's program " + program + " fails to start with error " + std::to_string(def.error) +
                 ", and a real start fails with 2 (file not found) only";
        if (SearchPathW(nullptr, win32::Utf8ToWide(program).c_str(), L".exe", 0, nullptr, nullptr) != 0)
          return "the model's program " + program + " fails to start, and this system has it";
        break;
      case ProcessDef::Kind::TimesOut:
        return "the model's program " + program +
               " never ends, and a real one would hold the add-in, which waits for it up to 24 days";
      case ProcessDef::Kind::WaitFails:
        return "waiting for the model's program " + program + " fails, which a real wait cannot be made to do";
    }
  }
  return "";
}

void PlacePrograms(const ModelDef& model, const fs::path& child) {
  for (const auto& [program, def] : model.processes) {
    if (def.kind != ProcessDef::Kind::Exits) continue;
    const fs::path at(win32::Utf8ToWide(program));
    fs::create_directories(at.parent_path());
    fs::copy_file(child, at, fs::copy_options::overwrite_existing);
    std::ofstream(fs::path(at.wstring() + L".exit")) << def.exitCode;
  }
}

// ------------------------------------------------------------ comparing

std::string Lower(std::string s) {
  for (char& c : s) c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
  return s;
}

bool PlatformEvent(const std::string& ev) {
  static const std::set<std::string> kinds = {
      "registry-read", "registry-write",  "registry-create", "file-exists", "file-delete", "file-append",
      "file-read",     "file-attributes", "file-remove",     "file-move",   "file-times",  "file-replace",
      "file-date",     "sleep",           "doevents",        "help",        "process",     "debuglog"};
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
  if (kind == "restore-dialog" && !ev.at("steps").empty()) {
    EventJson& last = ev["steps"].back();
    if (last.at("step") == "ok" || last.at("step") == "cancel") {
      EventJson closing{{"step", last.at("step")}};
      if (last.contains("failed")) closing["failed"] = last["failed"];
      last = std::move(closing);
    }
  }
  return ev.dump();
}

// A started program as the child program records it: the program, a tab,
// its command line. The native run's process events name the program as
// the add-in did: its application name, else its command line's first word.
std::string StartOf(const EventJson& process) {
  std::string program = process.value("application", "");
  const std::string line = process.at("commandLine");
  if (program.empty()) program = kpx::CommandLineProgram(line);
  return Lower(program) + "\t" + line;
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

// `served`: the ProgIDs and class ids this host serves (lower case). A
// creation by any other name fails inside COM on Windows, before any host
// code runs: the native run's record of that failure has no counterpart.
// `starts`: the child program's record of the programs started.
int Compare(const std::string& golden, const std::string& ours, const std::string& debugText,
            const std::string& logPath, const std::set<std::string>& served, const std::string& starts) {
  std::vector<std::string> want, got, wantDebug, gotDebug, wantStarts, gotStarts;
  for (const std::string& l : Lines(golden)) {
    EventJson ev = EventJson::parse(l);
    const std::string kind = ev.at("ev");
    if (kind == "process") {
      if (ev.at("started").get<bool>()) wantStarts.push_back(StartOf(ev));
    } else if (kind == "debuglog") {
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
  for (const std::string& l : Lines(starts)) {
    const size_t tab = std::min(l.find('\t'), l.size());
    gotStarts.push_back(Lower(l.substr(0, tab)) + l.substr(tab));
  }

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
  diff("program started", wantStarts, gotStarts);
  std::printf("  %zu events, %zu debug lines, %zu program starts compared\n", want.size(), wantDebug.size(),
              wantStarts.size());
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

  const auto trees = TreesOf(model, scenario);
  RemoveTrees(trees);
  RemoveJournaled();
  std::vector<std::string> touched = model.folders;
  std::string unmade = FileFaults::Unmade(model);
  if (unmade.empty()) unmade = ProgramsUnmade(model, touched);
  if (!unmade.empty()) {
    std::printf("  skipped: %s\n", unmade.c_str());
    return 3;
  }
  unmade = MakeRegistryFaults(model, scenario);
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

  for (const auto& [path, content] : model.files) touched.push_back(path);
  for (const Action& a : scenario.actions)
    for (const auto& [path, content] : a.files) touched.push_back(path);
  if (!logPath.empty()) touched.push_back(logPath);
  const std::vector<fs::path> added = NewPaths(touched);
  Journal(added);

  // The child program, beside this one, stands in for the model's
  // programs; each start it records goes to a file beside the log.
  wchar_t self[MAX_PATH] = {};
  GetModuleFileNameW(nullptr, self, MAX_PATH);
  PlacePrograms(model, fs::path(self).parent_path() / L"kpx-child.exe");
  const fs::path startsFile = fs::path(argv[3]).wstring() + L".starts";
  fs::remove(startsFile);
  SetEnvironmentVariableW(L"KPX_CHILD_CALLS", startsFile.wstring().c_str());

  std::string jsonl, debugText;
  FileFaults fileFaults;
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
    // The model's files are in place before the run: a file fault holds one.
    sim.Prepare();
    unmade = fileFaults.Hold(model);
    if (unmade.empty()) {
      wintest::ScriptedUser user(sim.platform().ui);
      const ApplicationDef& app = model.application;
      user.PlaceHost({app.mainWindow, app.top, app.left, app.height, app.width});
      sim.Run(scenario);
    }
    fileFaults.Release();
    if (int ended = wintest::ScriptedUser::EndChildren()) std::printf("  ended %d process(es) the add-in left running\n", ended);
    CoFreeUnusedLibraries();
    host->RevokeAll();
    jsonl = sim.log().Jsonl();
  }
  if (!logPath.empty()) debugText = ReadAll(fs::path(win32::Utf8ToWide(logPath)));

  RemoveTrees(trees);
  RemoveJournaled();
  if (!unmade.empty()) {
    std::printf("  skipped: %s\n", unmade.c_str());
    return 3;
  }

  std::ofstream(argv[3], std::ios::binary) << jsonl;
  std::set<std::string> served = {Lower(wintest::kResourceProgId), Lower(wintest::kResourceClsid)};
  for (const auto& c : model.companions) {
    if (!c->progid.empty()) served.insert(Lower(c->progid));
    if (!c->clsid.empty()) served.insert(Lower(c->clsid));
  }
  return Compare(golden, jsonl, debugText, logPath, served, ReadAll(startsFile));
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
