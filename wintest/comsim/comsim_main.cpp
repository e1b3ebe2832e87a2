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
// the native run's scripted user answers; the help viewer the add-in starts
// is ended after the run. Such scenarios need a display (run.sh gives them
// one with xvfb-run); without one they are reported as skipped.
//
// Its event log is then held against the native run's golden log, leaving
// out what only the native run can see or what depends on the real machine:
//  - the add-in's own calls to its platform (registry-*, file-*, sleep,
//    doevents, help): in the DLL they go straight to Win32, past any host
//    object, so no COM host can record them. WinHelpA hands its arguments
//    to the help viewer, another process; a message box, though, is seen
//    on the screen: its text, title, buttons and answer are compared;
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

#include <initguid.h>

#include <cstdio>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <cctype>
#include <set>
#include <sstream>
#include <string>
#include <vector>

#include "kpxres_h.h"

#include "automation/error_styles.h"
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

namespace {

constexpr const char* kResourceClsid = "{87694CC1-5110-11D3-B9F8-006008BF3ACB}";
constexpr const char* kResourceProgId = "kpxres.KPXResourceInterface";

// ------------------------------------------------------------ the machine

// Registry trees a run may leave behind: the model's keys and what the
// add-in writes. Removed before and after each run, so runs do not meet.
std::vector<std::pair<HKEY, std::string>> TreesOf(const ModelDef& model, const Scenario& scenario) {
  std::vector<std::pair<HKEY, std::string>> trees = {
      {HKEY_LOCAL_MACHINE, "SOFTWARE\\Tolvek Software"},
      {HKEY_CURRENT_USER, "SOFTWARE\\Tolvek Software"},
      {HKEY_CURRENT_USER, "Software\\Microsoft\\DevStudio"},
      {HKEY_LOCAL_MACHINE, "SOFTWARE\\Microsoft\\VisualStudio"},
      {HKEY_LOCAL_MACHINE, "SOFTWARE\\Microsoft\\DevStudio"},
      {HKEY_CURRENT_USER, "Software\\Microsoft\\VisualStudio"}};
  auto add = [&](const RegistryEntry& e) {
    // The first two levels, three below a vendor's "Microsoft".
    std::vector<std::string> parts;
    std::stringstream in(e.key);
    for (std::string p; std::getline(in, p, '\\');) parts.push_back(p);
    size_t depth = parts.size() > 1 && _stricmp(parts[1].c_str(), "Microsoft") == 0 ? 3 : 2;
    std::string tree;
    for (size_t i = 0; i < parts.size() && i < depth; ++i) tree += (i ? "\\" : "") + parts[i];
    trees.emplace_back(e.root == platform::RootKey::CurrentUser ? HKEY_CURRENT_USER : HKEY_LOCAL_MACHINE, tree);
  };
  for (const RegistryEntry& e : model.registry) add(e);
  for (const Action& a : scenario.actions)
    for (const RegistryEntry& e : a.registry) add(e);
  for (const RegistryFaultDef& f : model.faults.registry) add(RegistryEntry{f.root, f.key, std::nullopt, {}});
  return trees;
}

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

void RemoveTrees(const std::vector<std::pair<HKEY, std::string>>& trees) {
  for (const auto& [root, key] : trees) {
    RegDeleteTreeA(root, key.c_str());
    RegDeleteKeyA(root, key.c_str());
  }
}

// The paths a run may create on drive C: the model's files and folders, the
// scenario's files and the debug log. For each, the outermost part that does
// not exist yet is what the run adds, and what is removed after it; nothing
// that was there before is touched.
std::vector<fs::path> NewPaths(const std::vector<std::string>& windowsPaths) {
  std::vector<fs::path> out;
  for (const std::string& w : windowsPaths) {
    if (w.size() < 3 || (w[0] != 'C' && w[0] != 'c') || w[1] != ':' || w[2] != '\\') continue;
    fs::path p(win32::Utf8ToWide(w));
    std::error_code ec;
    if (fs::exists(p, ec)) continue;
    fs::path outermost = p;
    for (fs::path up = p.parent_path(); up != up.root_path() && !fs::exists(up, ec); up = up.parent_path())
      outermost = up;
    out.push_back(outermost);
  }
  return out;
}

void RemovePaths(const std::vector<fs::path>& paths) {
  for (const fs::path& p : paths) {
    std::error_code ignored;
    fs::remove_all(p, ignored);
  }
}

// What a run is about to add is noted on drive C first, so that the next
// run removes it even when this one is stopped before it cleans up.
const fs::path kJournal = L"C:\\kpx-comsim.journal";

void RemoveJournaled() {
  std::ifstream in(kJournal, std::ios::binary);
  std::vector<fs::path> paths;
  for (std::string line; std::getline(in, line);)
    if (!line.empty()) paths.push_back(fs::path(win32::Utf8ToWide(line)));
  in.close();
  RemovePaths(paths);
  std::error_code ignored;
  fs::remove(kJournal, ignored);
}

void Journal(const std::vector<fs::path>& paths) {
  std::ofstream out(kJournal, std::ios::binary | std::ios::trunc);
  for (const fs::path& p : paths) out << win32::WideToUtf8(p.wstring()) << "\n";
}

// ---------------------------------------------------- the resource component

// The resource component must be a real vtable: the add-in calls its first
// own method early-bound. Everything else goes to the simulated object.
class ResourceServer final : public _KPXResourceInterface, public ISupportErrorInfo {
 public:
  ResourceServer(win32::ComBridge& bridge, ObjectPtr object) : object_(std::move(object)), inner_(bridge.Expose(object_)) {}

  HRESULT STDMETHODCALLTYPE QueryInterface(REFIID iid, void** out) override {
    if (!out) return E_POINTER;
    *out = nullptr;
    if (IsEqualIID(iid, IID_IUnknown) || IsEqualIID(iid, IID_IDispatch) || IsEqualIID(iid, IID__KPXResourceInterface))
      *out = static_cast<_KPXResourceInterface*>(this);
    else if (IsEqualIID(iid, IID_ISupportErrorInfo))
      *out = static_cast<ISupportErrorInfo*>(this);
    else
      return E_NOINTERFACE;
    AddRef();
    return S_OK;
  }
  ULONG STDMETHODCALLTYPE AddRef() override { return static_cast<ULONG>(++refs_); }
  ULONG STDMETHODCALLTYPE Release() override {
    LONG n = --refs_;
    if (n == 0) delete this;
    return static_cast<ULONG>(n);
  }
  HRESULT STDMETHODCALLTYPE GetTypeInfoCount(UINT* n) override { return inner_->GetTypeInfoCount(n); }
  HRESULT STDMETHODCALLTYPE GetTypeInfo(UINT i, LCID l, ITypeInfo** t) override { return inner_->GetTypeInfo(i, l, t); }
  HRESULT STDMETHODCALLTYPE GetIDsOfNames(REFIID r, LPOLESTR* n, UINT c, LCID l, DISPID* d) override {
    return inner_->GetIDsOfNames(r, n, c, l, d);
  }
  HRESULT STDMETHODCALLTYPE Invoke(DISPID id, REFIID r, LCID l, WORD f, DISPPARAMS* p, VARIANT* v, EXCEPINFO* e,
                                   UINT* a) override {
    return inner_->Invoke(id, r, l, f, p, v, e, a);
  }
  HRESULT STDMETHODCALLTYPE LoadResString(LONG id, BSTR* text) override {
    return Text(text, [&] { return CallOwnOperation(object_, 1, CallKind::Method, {Variant(int32_t{id})}); });
  }
  HRESULT STDMETHODCALLTYPE GetString(LONG* id, BSTR* text) override {
    Variant v(int32_t{*id});
    HRESULT hr = Text(text, [&] { return CallByName(object_, "GetString", CallKind::Method, {Variant::Ref(&v)}); });
    *id = v.toInt32();
    return hr;
  }
  HRESULT STDMETHODCALLTYPE InterfaceSupportsErrorInfo(REFIID) override { return S_OK; }

 private:
  ~ResourceServer() { inner_->Release(); }
  template <class F>
  HRESULT Text(BSTR* text, F call) {
    *text = nullptr;
    try {
      *text = win32::Utf8ToBstr(call().toString());
      return S_OK;
    } catch (...) {
      AutomationError e = CurrentError();
      win32::SetThreadErrorInfo(e, "kpxres", IID__KPXResourceInterface);
      return win32::HResultFromVbNumber(e.number());
    }
  }
  LONG refs_ = 1;
  ObjectPtr object_;
  IDispatch* inner_;
};

// --------------------------------------------------------------- the host

struct Host;

// One COM class of the simulated world: a companion (by ProgID and/or
// class id) or the resource component.
class SimClass final : public IClassFactory {
 public:
  SimClass(Host& host, std::string progId, std::string clsid, bool resource)
      : host_(host), progId_(std::move(progId)), clsid_(std::move(clsid)), resource_(resource) {}
  HRESULT STDMETHODCALLTYPE QueryInterface(REFIID iid, void** out) override {
    if (IsEqualIID(iid, IID_IUnknown) || IsEqualIID(iid, IID_IClassFactory)) {
      *out = static_cast<IClassFactory*>(this);
      return S_OK;
    }
    *out = nullptr;
    return E_NOINTERFACE;
  }
  ULONG STDMETHODCALLTYPE AddRef() override { return 2; }
  ULONG STDMETHODCALLTYPE Release() override { return 1; }
  HRESULT STDMETHODCALLTYPE CreateInstance(IUnknown* outer, REFIID iid, void** out) override;
  HRESULT STDMETHODCALLTYPE LockServer(BOOL) override { return S_OK; }

 private:
  Host& host_;
  std::string progId_, clsid_;
  bool resource_;
};

// Whether `progIdKey` (HKCR\\<ProgID>\\CLSID) names a class some server
// is registered for; a ProgID key a stopped run left names none.
bool Registered(const std::string& progIdKey) {
  char clsid[64] = {};
  LONG size = sizeof(clsid);
  if (RegQueryValueA(HKEY_CLASSES_ROOT, progIdKey.c_str(), clsid, &size) != ERROR_SUCCESS) return false;
  HKEY server = nullptr;
  const std::string key = std::string("CLSID\\") + clsid + "\\InprocServer32";
  if (RegOpenKeyExA(HKEY_CLASSES_ROOT, key.c_str(), 0, KEY_READ, &server) != ERROR_SUCCESS) return false;
  RegCloseKey(server);
  return true;
}

struct Host {
  const ModelDef& model;
  platform::ObjectFactory& objects;  // the simulation's, recording each creation
  win32::ServerLocks locks;
  std::map<const Object*, std::unique_ptr<win32::ExposedType>> types;
  std::map<const Object*, IID> requested;  // the interface a creation asked for
  win32::ComBridge bridge;
  std::vector<std::unique_ptr<SimClass>> classes;
  std::vector<DWORD> cookies;
  std::vector<std::string> progIdKeys;  // ProgID keys this run wrote

  Host(const ModelDef& m, platform::ObjectFactory& o)
      : model(m), objects(o), bridge(locks, [this](const Object& obj) { return Describe(obj); }) {}

  // Companions describe their own operations; host objects need nothing.
  const win32::ExposedType* Describe(const Object& o) {
    if (!dynamic_cast<const CompanionObject*>(&o)) {
      auto it = requested.find(&o);
      if (it == requested.end()) return nullptr;
    }
    auto t = std::make_unique<win32::ExposedType>();
    auto it = requested.find(&o);
    t->iid = it == requested.end() ? IID_NULL : it->second;
    if (dynamic_cast<const CompanionObject*>(&o))
      t->typeInfo = new wintest::OwnOperationsTypeInfo(const_cast<Object&>(o));
    t->anyMember = true;
    return (types[&o] = std::move(t)).get();
  }

  void Register(const std::string& progId, const std::string& clsidText, bool resource) {
    CLSID clsid;
    if (!clsidText.empty()) {
      win32::GuidFromString(clsidText, &clsid);
    } else {
      CoCreateGuid(&clsid);  // a ProgID alone: any class id will do for this run
    }
    if (!progId.empty()) {
      const std::string key = progId + "\\CLSID";
      if (Registered(key)) {
        // A real registration (kpxres): its class id is ours too.
      } else {
        // Not there, or left by a run that was stopped before it cleaned up.
        const std::wstring value = win32::GuidToWide(clsid);
        RegSetKeyValueW(HKEY_CLASSES_ROOT, win32::Utf8ToWide(key).c_str(), nullptr, REG_SZ, value.c_str(),
                        static_cast<DWORD>((value.size() + 1) * sizeof(wchar_t)));
        progIdKeys.push_back(progId);
      }
    }
    classes.push_back(std::make_unique<SimClass>(*this, progId, win32::GuidToString(clsid), resource));
    DWORD cookie = 0;
    if (SUCCEEDED(CoRegisterClassObject(clsid, classes.back().get(), CLSCTX_INPROC_SERVER, REGCLS_MULTIPLEUSE,
                                        &cookie)))
      cookies.push_back(cookie);
  }

  void RegisterAll() {
    Register(kResourceProgId, kResourceClsid, true);
    for (const auto& c : model.companions) Register(c->progid, c->clsid, false);
  }

  void RevokeAll() {
    for (DWORD c : cookies) CoRevokeClassObject(c);
    cookies.clear();
    for (const std::string& p : progIdKeys) RegDeleteTreeA(HKEY_CLASSES_ROOT, p.c_str()), RegDeleteKeyA(HKEY_CLASSES_ROOT, p.c_str());
  }
};

HRESULT SimClass::CreateInstance(IUnknown* outer, REFIID iid, void** out) {
  *out = nullptr;
  if (outer) return CLASS_E_NOAGGREGATION;
  ObjectPtr object;
  try {
    // A creation by ProgID asks for IDispatch; one by class id for its interface.
    if (IsEqualIID(iid, IID_IDispatch) && !progId_.empty())
      object = host_.objects.CreateObject(progId_);
    else
      object = host_.objects.CreateInstance(clsid_, win32::GuidToString(iid));
  } catch (...) {
    AutomationError e = CurrentError();
    win32::SetThreadErrorInfo(e, "kpx-comsim", iid);
    return win32::HResultFromVbNumber(e.number());
  }
  if (resource_) {
    auto* server = new ResourceServer(host_.bridge, object);
    HRESULT hr = server->QueryInterface(iid, out);
    server->Release();
    return hr;
  }
  host_.requested[object.get()] = iid;
  IDispatch* d = host_.bridge.Expose(object);
  HRESULT hr = d->QueryInterface(iid, out);
  d->Release();
  return hr;
}

// --------------------------------------------------------------- the run

// The description a failed call left in the thread's IErrorInfo (taken
// from it), or "".
std::string PendingErrorDescription() {
  std::string description;
  IErrorInfo* info = nullptr;
  if (GetErrorInfo(0, &info) == S_OK && info) {
    BSTR text = nullptr;
    info->GetDescription(&text);
    description = win32::BstrToUtf8(text);
    SysFreeString(text);
    info->Release();
  }
  return description;
}

AutomationError ErrorOfCreation(HRESULT hr) {
  const std::string description = PendingErrorDescription();
  return description.empty() ? win32::ErrorFromHResult(hr)
                             : AutomationError(win32::VbNumberFromHResult(hr), description);
}

// The add-in's object as the Quarn host calls it: a failure the DLL
// answers with a bare HRESULT (E_NOTIMPL) and describes through IErrorInfo
// is read with that description, as the host reads it.
class HostView final : public Object {
 public:
  explicit HostView(ObjectPtr inner) : inner_(std::move(inner)) {}
  DispId IdOfName(std::string_view name) override { return inner_->IdOfName(name); }
  Variant Invoke(DispId id, CallKind kind, std::span<Variant> args) override {
    SetErrorInfo(0, nullptr);  // nothing left over from an earlier failure
    try {
      return inner_->Invoke(id, kind, args);
    } catch (const AutomationError& e) {
      // Only an error made from the HRESULT alone has its text elsewhere.
      if (e.description() != win32::ErrorFromHResult(win32::HResultFromVbNumber(e.number())).description()) throw;
      const std::string description = PendingErrorDescription();
      if (description.empty()) throw;
      throw AutomationError(e.number(), description);
    }
  }

 private:
  ObjectPtr inner_;
};

// The add-in as the Quarn host makes it: by its ProgID, through COM.
// An in-process object by ProgID, as an Object of this host.
ObjectPtr CreateByProgId(win32::ComBridge& bridge, const wchar_t* progId) {
  CLSID clsid;
  IDispatch* d = nullptr;
  HRESULT hr = CLSIDFromProgID(progId, &clsid);
  if (SUCCEEDED(hr)) hr = CoCreateInstance(clsid, nullptr, CLSCTX_INPROC_SERVER, IID_IDispatch, reinterpret_cast<void**>(&d));
  if (FAILED(hr)) throw ErrorOfCreation(hr);
  ObjectPtr object = bridge.Adopt(d);
  d->Release();
  return object;
}

ObjectPtr CreateAddIn(win32::ComBridge& bridge) {
  return std::make_shared<HostView>(CreateByProgId(bridge, L"kpxAddIn.API"));
}

// ------------------------------------------------------------ comparing

bool PlatformEvent(const std::string& ev) {
  static const std::set<std::string> kinds = {"registry-read", "registry-write", "registry-create", "file-exists",
                                              "file-delete",   "file-append",    "sleep",           "doevents",
                                              "help",          "debuglog"};
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
                       golden.find("\"ev\":\"help\"") != std::string::npos;
  for (const Action& a : scenario.actions) userInterface = userInterface || a.type == Action::Type::Answer;
  if (userInterface && GetEnvironmentVariableW(L"DISPLAY", nullptr, 0) == 0) {
    std::printf("  skipped: the add-in shows a message box or help, and there is no display (DISPLAY)\n");
    return 3;
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
  std::set<std::string> served = {Lower(kResourceProgId), Lower(kResourceClsid)};
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
