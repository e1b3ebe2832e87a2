#include "com_host.h"

#include <initguid.h>

#include <fstream>
#include <sstream>

#include "kpxres_h.h"

#include "automation/error_styles.h"
#include "own_operations.h"
#include "platform/win32/com_errors.h"
#include "platform/win32/win32_strings.h"
#include "sim/companions.h"

namespace fs = std::filesystem;
using namespace kpx;
using namespace kpx::sim;

namespace wintest {

const char* const kResourceClsid = "{87694CC1-5110-11D3-B9F8-006008BF3ACB}";
const char* const kResourceProgId = "kpxres.KPXResourceInterface";

// ------------------------------------------------------------ the machine

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

void RemoveTrees(const std::vector<std::pair<HKEY, std::string>>& trees) {
  for (const auto& [root, key] : trees) {
    RegDeleteTreeA(root, key.c_str());
    RegDeleteKeyA(root, key.c_str());
  }
}

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

namespace {
const fs::path kJournal = L"C:\\kpx-comsim.journal";
}  // namespace

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

namespace {

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

}  // namespace

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

namespace {

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

}  // namespace

Host::Host(const ModelDef& m, platform::ObjectFactory& o)
    : model(m), objects(o), bridge(locks, [this](const Object& obj) { return Describe(obj); }) {}

Host::~Host() = default;

const win32::ExposedType* Host::Describe(const Object& o) {
  if (!dynamic_cast<const CompanionObject*>(&o)) {
    auto it = requested.find(&o);
    if (it == requested.end()) return nullptr;
  }
  auto t = std::make_unique<win32::ExposedType>();
  auto it = requested.find(&o);
  t->iid = it == requested.end() ? IID_NULL : it->second;
  if (dynamic_cast<const CompanionObject*>(&o)) t->typeInfo = new OwnOperationsTypeInfo(const_cast<Object&>(o));
  t->anyMember = true;
  return (types[&o] = std::move(t)).get();
}

void Host::Register(const std::string& progId, const std::string& clsidText, bool resource) {
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

void Host::RegisterAll() {
  Register(kResourceProgId, kResourceClsid, true);
  for (const auto& c : model.companions) Register(c->progid, c->clsid, false);
}

void Host::RevokeAll() {
  for (DWORD c : cookies) CoRevokeClassObject(c);
  cookies.clear();
  for (const std::string& p : progIdKeys) RegDeleteTreeA(HKEY_CLASSES_ROOT, p.c_str()), RegDeleteKeyA(HKEY_CLASSES_ROOT, p.c_str());
}

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

// ------------------------------------------------------------- creation

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

namespace {

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

}  // namespace

IDispatch* CreateDispatchByProgId(const wchar_t* progId) {
  CLSID clsid;
  IDispatch* d = nullptr;
  HRESULT hr = CLSIDFromProgID(progId, &clsid);
  if (SUCCEEDED(hr)) hr = CoCreateInstance(clsid, nullptr, CLSCTX_INPROC_SERVER, IID_IDispatch, reinterpret_cast<void**>(&d));
  if (FAILED(hr)) throw ErrorOfCreation(hr);
  return d;
}

ObjectPtr CreateByProgId(win32::ComBridge& bridge, const wchar_t* progId) {
  IDispatch* d = CreateDispatchByProgId(progId);
  ObjectPtr object = bridge.Adopt(d);
  d->Release();
  return object;
}

ObjectPtr AddInView(win32::ComBridge& bridge, IDispatch* addIn) { return std::make_shared<HostView>(bridge.Adopt(addIn)); }

ObjectPtr CreateAddIn(win32::ComBridge& bridge) {
  IDispatch* d = CreateDispatchByProgId(L"kpxAddIn.API");
  ObjectPtr view = AddInView(bridge, d);
  d->Release();
  return view;
}

}  // namespace wintest
