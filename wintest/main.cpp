// The Windows test host: registers the add-in, creates kpxAddIn.API with
// CoCreateInstance and drives it through IDispatch the way the Quarn host
// does, with host objects of its own. It also checks the Win32 platform
// layer and the COM bridge directly against those host objects.
//
// Usage: kpx-wintest <kpxaddin.dll> <kpxres.dll> <scratch folder>
// (Windows paths). Prints "N checks, M failed"; exits 1 on any failure.

#include "platform/win32/win32_api.h"

#include <initguid.h>

#include <cstdio>
#include <cstring>
#include <set>
#include <span>
#include <string>
#include <utility>
#include <vector>

#include "api_h.h"
#include "kpxres_h.h"

#include "addin/api_members.h"
#include "automation/automation_error.h"
#include "automation/object.h"
#include "calls.h"
#include "check.h"
#include "dialogs/code_icons.h"
#include "host_object.h"
#include "prompt_tests.h"
#include "platform/win32/com_bridge.h"
#include "platform/win32/dispatch_object.h"
#include "platform/win32/object_dispatch.h"
#include "platform/win32/win32_platform.h"
#include "platform/win32/win32_strings.h"
#include "shared/resource_strings.h"
#include "shared/resource_texts.h"
#include "platform_tests.h"
#include "render.h"
#include "restore_window_tests.h"
#include "shared/shared_registryapi2.h"
#include "system.h"

namespace wintest {

Tally& tally() {
  static Tally t;
  return t;
}

namespace {

constexpr HRESULT VbError(int number) { return static_cast<HRESULT>(0x800A0000u | static_cast<unsigned>(number)); }

struct Paths {
  std::wstring addin;
  std::wstring res;
  std::wstring scratch;
  std::wstring Log() const { return scratch + L"\\addin.log"; }
};

std::wstring Text(int32_t id) {
  const char* text = kpx::FindResourceText(id);
  return text ? Widen(text) : L"";
}

std::wstring Guid(const GUID& g) { return kpx::win32::GuidToWide(g); }

// The folder this program was started from (the child program of the process tests lies there).
std::string ProgramFolder() {
  wchar_t path[MAX_PATH] = {};
  GetModuleFileNameW(nullptr, path, MAX_PATH);
  std::wstring folder(path);
  return Narrow(folder.substr(0, folder.find_last_of(L'\\')));
}

std::vector<std::wstring> AddInKeys() {
  return {L"CLSID\\" + Guid(CLSID_API),           L"CLSID\\" + Guid(CLSID_TokenScanner),
          L"kpxAddIn.API",                        L"kpxAddIn.TokenScanner",
          L"TypeLib\\" + Guid(LIBID_kpxAddIn),    L"Interface\\" + Guid(DIID__API),
          L"Interface\\" + Guid(DIID__TokenScanner)};
}

std::vector<std::wstring> ResourceKeys() {
  return {L"CLSID\\" + Guid(CLSID_KPXResourceInterface), L"kpxres.KPXResourceInterface",
          L"TypeLib\\" + Guid(LIBID_kpxres), L"Interface\\" + Guid(IID__KPXResourceInterface)};
}

bool Contains(const std::set<std::wstring>& set, const std::wstring& line) { return set.count(line) != 0; }

Ref<IDispatch> Create(const wchar_t* progId, HRESULT* hr = nullptr) {
  CLSID clsid;
  Ref<IDispatch> out;
  HRESULT result = CLSIDFromProgID(progId, &clsid);
  if (SUCCEEDED(result))
    result = CoCreateInstance(clsid, nullptr, CLSCTX_INPROC_SERVER, IID_IDispatch, reinterpret_cast<void**>(out.out()));
  if (hr) *hr = result;
  return out;
}

IUnknown* Identity(IUnknown* p) {
  IUnknown* u = nullptr;
  p->QueryInterface(IID_IUnknown, reinterpret_cast<void**>(&u));
  if (u) u->Release();
  return u;
}

// ------------------------------------------------------------ registration

void RegistrationRoundTrip(const Paths& paths) {
  Group("regsvr32 writes the classes, ProgIDs and type library, and /u removes every key it wrote");
  for (int pass = 0; pass < 2; ++pass) {
    const bool addin = pass == 0;
    const std::wstring& dll = addin ? paths.addin : paths.res;
    const std::vector<std::wstring> keys = addin ? AddInKeys() : ResourceKeys();

    CHECK_EQ(Regsvr32(dll, true), 0ul);
    const std::set<std::wstring> before = SnapshotClassesRoot(keys);
    CHECK(before.empty());

    CHECK_EQ(Regsvr32(dll, false), 0ul);
    const std::set<std::wstring> registered = SnapshotClassesRoot(keys);
    const CLSID& clsid = addin ? CLSID_API : CLSID_KPXResourceInterface;
    const std::wstring progId = addin ? L"kpxAddIn.API" : L"kpxres.KPXResourceInterface";
    const std::wstring classKey = L"CLSID\\" + Guid(clsid);
    const std::wstring libid = Guid(addin ? LIBID_kpxAddIn : LIBID_kpxres);
    CHECK(Contains(registered, classKey + L"\\InprocServer32|=1:" + dll));
    CHECK(Contains(registered, classKey + L"\\InprocServer32|ThreadingModel=1:Apartment"));
    CHECK(Contains(registered, classKey + L"\\ProgID|=1:" + progId));
    CHECK(Contains(registered, classKey + L"\\TypeLib|=1:" + libid));
    CHECK(Contains(registered, progId + L"\\CLSID|=1:" + Guid(clsid)));
    const wchar_t* platform = sizeof(void*) == 8 ? L"win64" : L"win32";
    CHECK(Contains(registered, L"TypeLib\\" + libid + L"\\1.0\\0\\" + platform + L"|=1:" + dll));
    const std::wstring interfaceKey = L"Interface\\" + Guid(addin ? DIID__API : IID__KPXResourceInterface);
    CHECK(Contains(registered, interfaceKey));
    if (addin) {
      CHECK(Contains(registered, L"CLSID\\" + Guid(CLSID_TokenScanner) + L"\\InprocServer32|=1:" + dll));
      CHECK(Contains(registered, L"kpxAddIn.TokenScanner\\CLSID|=1:" + Guid(CLSID_TokenScanner)));
    }

    CHECK_EQ(Regsvr32(dll, true), 0ul);
    const std::set<std::wstring> after = SnapshotClassesRoot(keys);
    CHECK(after == before);
    for (const std::wstring& left : after) std::printf("  left behind: %s\n", Narrow(left).c_str());

    CHECK_EQ(Regsvr32(dll, false), 0ul);  // registered again for what follows
  }
}

// On 64-bit Windows a 32-bit and a 64-bit build of one library can be
// registered side by side: each in its own view of CLSID and Interface, both
// under one ProgID and one TypeLib key. The other build is written here as
// its regsvr32 writes it, in the other view; this build's /u must leave it
// working, and the last /u must still leave nothing.
void SideBySideRegistration(const Paths& paths) {
  Group("regsvr32 /u leaves the other build's ProgIDs and type library platform; the last /u leaves nothing");
  if (!HasOtherBuildsView()) {
    std::printf("  not run: 32-bit Windows has one registry view\n");
    return;
  }
  const REGSAM other = OtherBuildsView();
  const bool is64 = sizeof(void*) == 8;
  const std::wstring ownPlatform = is64 ? L"win64" : L"win32";
  const std::wstring otherPlatform = is64 ? L"win32" : L"win64";
  for (int pass = 0; pass < 2; ++pass) {
    const bool addin = pass == 0;
    const std::wstring& dll = addin ? paths.addin : paths.res;
    const std::vector<std::wstring> keys = addin ? AddInKeys() : ResourceKeys();
    std::vector<std::pair<std::wstring, std::wstring>> classes;  // class id, ProgID
    if (addin) {
      classes = {{Guid(CLSID_API), L"kpxAddIn.API"}, {Guid(CLSID_TokenScanner), L"kpxAddIn.TokenScanner"}};
    } else {
      classes = {{Guid(CLSID_KPXResourceInterface), L"kpxres.KPXResourceInterface"}};
    }
    const std::wstring versionKey = L"TypeLib\\" + Guid(addin ? LIBID_kpxAddIn : LIBID_kpxres) + L"\\1.0";
    const std::wstring otherDll = L"C:\\other build\\" + dll.substr(dll.find_last_of(L'\\') + 1);

    bool otherAlready = false;
    for (const auto& [clsid, progId] : classes) {
      HKEY probe = nullptr;
      if (RegOpenKeyExW(HKEY_CLASSES_ROOT, (L"CLSID\\" + clsid).c_str(), 0, KEY_READ | other, &probe) == ERROR_SUCCESS) {
        RegCloseKey(probe);
        otherAlready = true;
      }
    }
    if (!CHECK(!otherAlready)) {
      std::printf("  the other build is registered in this registry: unregister it before the test\n");
      continue;
    }
    for (const auto& [clsid, progId] : classes)
      CHECK(WriteDefault(HKEY_CLASSES_ROOT, L"CLSID\\" + clsid + L"\\InprocServer32", other, otherDll));
    CHECK(WriteDefault(HKEY_CLASSES_ROOT, versionKey + L"\\0\\" + otherPlatform, 0, otherDll));

    CHECK_EQ(Regsvr32(dll, true), 0ul);
    const std::set<std::wstring> left = SnapshotClassesRoot(keys);
    for (const auto& [clsid, progId] : classes) {
      CHECK(Contains(left, progId + L"\\CLSID|=1:" + clsid));
      CHECK(!Contains(left, L"CLSID\\" + clsid));
    }
    CHECK(Contains(left, versionKey + L"\\0\\" + otherPlatform + L"|=1:" + otherDll));
    CHECK(Contains(left, versionKey + L"\\FLAGS"));
    CHECK(!Contains(left, versionKey + L"\\0\\" + ownPlatform));

    // The other build gone too, this build's /u takes what was shared.
    for (const auto& [clsid, progId] : classes) {
      CHECK(DeleteLeafKey(HKEY_CLASSES_ROOT, L"CLSID\\" + clsid + L"\\InprocServer32", other));
      CHECK(DeleteLeafKey(HKEY_CLASSES_ROOT, L"CLSID\\" + clsid, other));
    }
    CHECK(DeleteLeafKey(HKEY_CLASSES_ROOT, versionKey + L"\\0\\" + otherPlatform, 0));
    CHECK_EQ(Regsvr32(dll, true), 0ul);
    const std::set<std::wstring> after = SnapshotClassesRoot(keys);
    CHECK(after.empty());
    for (const std::wstring& line : after) std::printf("  left behind: %s\n", Narrow(line).c_str());

    CHECK_EQ(Regsvr32(dll, false), 0ul);  // registered again for what follows
  }
}

// ---------------------------------------------------------------- host

constexpr const char* kHostKey = "SOFTWARE\\Tolvek Software\\Quarn\\AddIns\\VisualStudio";

// The host application with its add-in manager, collection and two add-ins.
struct Host {
  Ref<HostObject> app = HostObject::Make(L"app");
  Ref<HostObject> manager = HostObject::Make(L"manager");
  Ref<HostObject> addIns = HostObject::Make(L"addins");
  Ref<HostObject> ownAddIn = HostObject::Make(L"vc");
  Ref<HostObject> visualStudio = HostObject::Make(L"vs");
  Ref<HostObject> menuEntry = HostObject::Make(L"entry");

  Host() {
    app->Object(12544, L"AddInManager", manager.get()).Method(213, L"WriteErrorLog");
    manager->Object(12529, L"AddIns", addIns.get());
    VARIANT count;
    count.vt = VT_I2;
    count.iVal = 2;
    addIns->Value(202, L"Count", count);
    HostObject* vc = ownAddIn.get();
    HostObject* vs = visualStudio.get();
    addIns->On(203, L"GetAt", [vc, vs](DISPPARAMS& p, VARIANT* result, EXCEPINFO*) {
      VARIANT index;
      VariantInit(&index);
      if (p.cArgs != 1 || FAILED(VariantChangeType(&index, &Arg(p, 0), 0, VT_I2))) return DISP_E_TYPEMISMATCH;
      HostObject* item = index.iVal == 1 ? vc : index.iVal == 2 ? vs : nullptr;
      if (!item) return DISP_E_BADINDEX;
      result->vt = VT_DISPATCH;
      result->pdispVal = item;
      item->AddRef();
      return S_OK;
    });
    ownAddIn->Text(12540, L"Name", L"VC++").Method(12542, L"Deactivate").Method(12543, L"Activate");
    visualStudio->Text(12540, L"Name", L"VisualStudio").Method(12542, L"Deactivate").Method(12543, L"Activate");
    menuEntry->Method(1, L"MenuState");
    ownAddIn->Object(12684, L"AddContextMenuItem", menuEntry.get());
  }
  ~Host() {
    // The objects hand each other out; drop those links so all are freed.
    for (HostObject* o : {app.get(), manager.get(), addIns.get(), ownAddIn.get(), visualStudio.get(), menuEntry.get()})
      o->Clear();
  }
};

// ------------------------------------------------------- creation, type info

void CreationAndTypeInformation() {
  Group("kpxAddIn.API is created by ProgID and describes itself from its type library");
  HRESULT hr = E_FAIL;
  Ref<IDispatch> api = Create(L"kpxAddIn.API", &hr);
  CHECK_HR(hr, S_OK);
  if (!api) return;

  UINT count = 0;
  CHECK_HR(api->GetTypeInfoCount(&count), S_OK);
  CHECK_EQ(count, 1u);
  Ref<ITypeInfo> info;
  CHECK_HR(api->GetTypeInfo(0, LOCALE_USER_DEFAULT, info.out()), S_OK);
  if (info) {
    TYPEATTR* attr = nullptr;
    info->GetTypeAttr(&attr);
    CHECK(IsEqualIID(attr->guid, DIID__API));
    CHECK_EQ(attr->typekind, TKIND_DISPATCH);
    CHECK_EQ(static_cast<int>(attr->cFuncs), kpx::kApiMemberCount);
    info->ReleaseTypeAttr(attr);
  }

  CHECK_EQ(IdOf(api.get(), L"Name"), 18L);
  CHECK_EQ(IdOf(api.get(), L"onactivate"), 20L);  // names are case-blind
  CHECK_EQ(IdOf(api.get(), L"OnDeletedModelElement"), 69L);
  CHECK_EQ(IdOf(api.get(), L"NoSuchMember"), static_cast<long>(DISPID_UNKNOWN));

  Outcome name = Call(api.get(), 18, Flags::Get);
  CHECK_HR(name.hr, S_OK);
  CHECK_EQ(name.result.v.vt, VT_BSTR);
  CHECK(name.result.Text() == L"VC++");
  // A property read as a method, as some clients do.
  CHECK(Call(api.get(), 18, Flags::MethodOrGet).result.Text() == L"VC++");

  CHECK_HR(Call(api.get(), 70, Flags::Method).hr, DISP_E_MEMBERNOTFOUND);
  CHECK_HR(Call(api.get(), 0, Flags::Get).hr, DISP_E_MEMBERNOTFOUND);

  // Arguments go by position only; the interface argument must be IID_NULL.
  Var app = Var::Disp(nullptr);
  VARIANT args[1] = {app.v};
  DISPID named = 1;
  DISPPARAMS withNames{args, &named, 1, 1};
  VARIANT result;
  VariantInit(&result);
  CHECK_HR(api->Invoke(22, IID_NULL, LOCALE_USER_DEFAULT, DISPATCH_METHOD, &withNames, &result, nullptr, nullptr),
           DISP_E_NONAMEDARGS);
  DISPPARAMS none{nullptr, nullptr, 0, 0};
  CHECK_HR(api->Invoke(18, IID_IDispatch, LOCALE_USER_DEFAULT, DISPATCH_PROPERTYGET, &none, &result, nullptr, nullptr),
           DISP_E_UNKNOWNINTERFACE);
  LPOLESTR names[] = {const_cast<LPOLESTR>(L"OnActivate"), const_cast<LPOLESTR>(L"QuarnApp")};
  DISPID ids[2] = {0, 0};
  CHECK_HR(api->GetIDsOfNames(IID_NULL, names, 2, LOCALE_USER_DEFAULT, ids), DISP_E_UNKNOWNNAME);
  CHECK_EQ(ids[0], 20L);
  CHECK_EQ(ids[1], static_cast<long>(DISPID_UNKNOWN));
  // A left-out optional argument is a missing argument, not a value.
  Host host;
  Var hostApp = Var::Disp(host.app.get()), missing = Var::Missing();
  Outcome leftOut = Call(api.get(), 22, Flags::Method, {&hostApp, &missing});
  CHECK_HR(leftOut.hr, S_OK);  // OnAppInit(QuarnApp) and a trailing left-out argument

  Ref<IUnknown> typed;
  CHECK_HR(api->QueryInterface(DIID__API, reinterpret_cast<void**>(typed.out())), S_OK);
  if (typed) CHECK(Identity(typed.get()) == Identity(api.get()));
  Ref<ISupportErrorInfo> support;
  CHECK_HR(api->QueryInterface(IID_ISupportErrorInfo, reinterpret_cast<void**>(support.out())), S_OK);
  if (support) CHECK_HR(support->InterfaceSupportsErrorInfo(DIID__API), S_OK);
}

// ---------------------------------------------------------------- activation

void Activation(const Paths& paths) {
  Group("OnActivate with the host application: by-reference object, host calls, debug log");
  Host host;
  HRESULT hr = E_FAIL;
  Ref<IDispatch> api = Create(L"kpxAddIn.API", &hr);
  CHECK_HR(hr, S_OK);
  if (!api) return;

  // QuarnApp is Nothing before activation.
  Outcome before = Call(api.get(), 19, Flags::Get);
  CHECK_EQ(before.result.v.vt, VT_DISPATCH);
  CHECK(before.result.v.pdispVal == nullptr);

  // VB passes the host application by reference.
  IDispatch* app = host.app.get();
  app->AddRef();
  const LONG appRefs = host.app->refs();
  Var byRef = Var::RefDisp(&app);
  Outcome activated = Call(api.get(), 20, Flags::Method, {&byRef});
  CHECK_HR(activated.hr, S_OK);
  CHECK_EQ(activated.result.v.vt, VT_I4);
  CHECK_EQ(activated.result.v.lVal, 0L);
  CHECK(app == host.app.get());  // written back unchanged

  // The add-in walked the add-ins by DISPID and found both.
  // The add-ins are walked by DISPID from index 1 with 16-bit indexes: "VC++"
  // is the first, "VisualStudio" the second.
  std::vector<std::wstring> indexes;
  for (const Seen& c : host.addIns->CallsOf(L"GetAt")) indexes.push_back(c.args.empty() ? L"" : c.args[0]);
  CHECK(indexes == (std::vector<std::wstring>{L"i2:1", L"i2:1", L"i2:2"}));
  // "VisualStudio" is switched off in the registry: text 5030 goes to the
  // host's log (after the note that Developer Studio is missing) and the
  // add-in is activated.
  std::vector<Seen> logged = host.app->CallsOf(L"WriteErrorLog");
  CHECK(!logged.empty());
  if (!logged.empty()) CHECK(logged.back().args == std::vector<std::wstring>{L"bstr:" + Text(5030)});
  CHECK_EQ(host.visualStudio->CallsOf(L"Activate").size(), 1u);
  // Menu entries: item type, caption, internal name, in that order.
  bool modelAssistant = false;
  for (const Seen& c : host.ownAddIn->CallsOf(L"AddContextMenuItem"))
    if (c.args == std::vector<std::wstring>{L"i2:4", L"bstr:" + Text(5001), L"bstr:CClass_ModelAssistant"})
      modelAssistant = true;
  CHECK(modelAssistant);

  // QuarnApp hands back the very object the host gave.
  Outcome quarnApp = Call(api.get(), 19, Flags::Get);
  CHECK_EQ(quarnApp.result.v.vt, VT_DISPATCH);
  CHECK(quarnApp.result.v.pdispVal == static_cast<IDispatch*>(host.app.get()));
  quarnApp.result = Var();

  // The debug log, switched on in the registry before the add-in loaded.
  std::string log = ReadFileBytes(paths.Log());
  CHECK(log.rfind(" TRACE    ADDIN     kpxAddin.OnActivate(QuarnApp)\r\n", 0) == 0);
  if (log.rfind(" TRACE", 0) != 0) std::printf("  log: %s\n", log.substr(0, 200).c_str());

  // By value works as well, and OnDeactivate lets the host go.
  Var byValue = Var::Disp(host.app.get());
  CHECK_HR(Call(api.get(), 21, Flags::Method, {&byValue}).hr, S_OK);
  Outcome after = Call(api.get(), 19, Flags::Get);
  CHECK(after.result.v.vt == VT_DISPATCH && after.result.v.pdispVal == nullptr);
  app->Release();
  byValue = Var();
  CHECK_EQ(host.app->refs(), appRefs - 1);
  CHECK(log.find("kpxAddin.OnDeactivate") == std::string::npos);  // read before it happened
  CHECK(ReadFileBytes(paths.Log()).find(" TRACE    ADDIN     kpxAddin.OnDeactivate(QuarnApp)\r\n") != std::string::npos);

  api.reset();
  // The add-in holds nothing of the host once it is gone.
  CHECK_EQ(host.app->refs(), 1L);
  CHECK_EQ(host.menuEntry->refs(), 2L);  // the test's and the add-in's own member table
}

// ---------------------------------------------------------- errors to the host

void ErrorsToTheHost() {
  Group("a member's failure reaches the host as DISP_E_EXCEPTION with VB's number");
  Host host;
  Ref<IDispatch> api = Create(L"kpxAddIn.API");
  CHECK(api);
  if (!api) return;

  Outcome none = Call(api.get(), 22, Flags::Method);  // OnAppInit()
  CHECK_HR(none.hr, DISP_E_EXCEPTION);
  CHECK_HR(none.info.scode, VbError(449));
  CHECK_EQ(none.info.wCode, 0);
  CHECK(none.Description() == L"Argument not optional");
  CHECK(none.Source() == L"kpxAddIn");

  Var app1 = Var::Disp(host.app.get()), app2 = Var::Disp(host.app.get());
  Outcome two = Call(api.get(), 22, Flags::Method, {&app1, &app2});
  CHECK_HR(two.hr, DISP_E_EXCEPTION);
  CHECK_HR(two.info.scode, VbError(450));

  Var text = Var::Str(L"not an object");
  Outcome notObject = Call(api.get(), 22, Flags::Method, {&text});
  CHECK_HR(notObject.hr, DISP_E_EXCEPTION);
  CHECK_HR(notObject.info.scode, VbError(424));
  CHECK(notObject.Description() == L"Object required");

  // Without an EXCEPINFO the number comes back as the HRESULT, the text
  // through IErrorInfo.
  Outcome bare = Call(api.get(), 22, Flags::Method, {&text}, false);
  CHECK_HR(bare.hr, VbError(424));
  Ref<IErrorInfo> errorInfo;
  CHECK_HR(GetErrorInfo(0, errorInfo.out()), S_OK);
  if (errorInfo) {
    BSTR description = nullptr;
    errorInfo->GetDescription(&description);
    CHECK(description && std::wstring(description) == L"Object required");
    SysFreeString(description);
  }

  // A member without a trap lets the host's own 438 through: the host
  // application here has no CurrentModel.
  Var appRef = Var::Disp(host.app.get());
  short itemType = 4;
  Var type = Var::RefI2(&itemType);
  Outcome menus = Call(api.get(), 2, Flags::Method, {&appRef, &type});
  CHECK_HR(menus.hr, DISP_E_EXCEPTION);
  CHECK_HR(menus.info.scode, VbError(438));
  CHECK(menus.Description() == L"Object doesn't support this property or method");

  Group("by-reference arguments are written back into the caller's typed references");
  Ref<HostObject> module = HostObject::Make(L"module");
  module->Text(12668, L"IdentifyClass", L"Module").Text(12566, L"Language", L"Java");
  IDispatch* item = module.get();
  item->AddRef();
  short count = 99;
  VARIANT_BOOL hasVC = VARIANT_TRUE;
  VARIANT_BOOL failed = VARIANT_TRUE;
  Var itemArg = Var::RefDisp(&item), countArg = Var::RefI2(&count), hasArg = Var::RefBool(&hasVC),
      failedArg = Var::RefBool(&failed);
  Outcome validated = Call(api.get(), 3, Flags::Method, {&itemArg, &countArg, &hasArg, &failedArg});
  CHECK_HR(validated.hr, S_OK);
  CHECK_EQ(count, 1);  // one component, judged by itself
  CHECK_EQ(hasVC, VARIANT_FALSE);
  CHECK_EQ(failed, VARIANT_FALSE);
  CHECK(item == module.get());
  CHECK_EQ(countArg.v.vt, VT_BYREF | VT_I2);  // the caller's reference keeps its type
  item->Release();

  // Through a VARIANT reference the member's own type comes back.
  VARIANT countVariant;
  VariantInit(&countVariant);
  countVariant.vt = VT_I4;
  countVariant.lVal = 7;
  Var item2 = Var::Disp(module.get()), countRef = Var::RefVariant(&countVariant), has2 = Var::Bool(true),
      failed2 = Var::Bool(true);
  CHECK_HR(Call(api.get(), 3, Flags::Method, {&item2, &countRef, &has2, &failed2}).hr, S_OK);
  CHECK_EQ(countVariant.vt, VT_I2);
  CHECK_EQ(countVariant.iVal, 1);
  module->Clear();
}

// ------------------------------------------------------------ TokenScanner

void TokenScannerThroughIDispatch() {
  Group("kpxAddIn.TokenScanner through IDispatch: argument order, strings, properties, delimiters");
  HRESULT hr = E_FAIL;
  Ref<IDispatch> scanner = Create(L"kpxAddIn.TokenScanner", &hr);
  CHECK_HR(hr, S_OK);
  if (!scanner) return;
  const DISPID init = IdOf(scanner.get(), L"Init");
  const DISPID next = IdOf(scanner.get(), L"NextToken");
  CHECK(init != DISPID_UNKNOWN && next != DISPID_UNKNOWN);

  Var text = Var::Str(L"a,,b"), delimiters = Var::Str(L"|,");
  Outcome ok = Call(scanner.get(), init, Flags::Method, {&text, &delimiters});
  CHECK_EQ(ok.result.v.vt, VT_BOOL);
  CHECK_EQ(ok.result.v.boolVal, VARIANT_TRUE);
  CHECK(Call(scanner.get(), next, Flags::Method).result.Text() == L"a");
  CHECK(Call(scanner.get(), next, Flags::Method).result.Text() == L"b");
  Outcome end = Call(scanner.get(), next, Flags::Method);
  CHECK(end.result.v.vt == VT_BSTR && end.result.Text().empty());

  // Text beyond ASCII survives the round trip.
  Var wide = Var::Str(L"\u00e4\u00f6;\u20ac"), semicolon = Var::Str(L"|;");
  Call(scanner.get(), init, Flags::Method, {&wide, &semicolon});
  CHECK(Call(scanner.get(), next, Flags::Method).result.Text() == L"\u00e4\u00f6");
  CHECK(Call(scanner.get(), next, Flags::Method).result.Text() == L"\u20ac");

  // An empty delimiter list is refused.
  Var empty = Var::Str(L"");
  CHECK_EQ(Call(scanner.get(), init, Flags::Method, {&text, &empty}).result.v.boolVal, VARIANT_FALSE);

  // ScanString is written with the named put argument, and replacing a token
  // keeps the delimiters around it.
  const DISPID scan = IdOf(scanner.get(), L"ScanString");
  Var abc = Var::Str(L"a,b,c");
  CHECK_HR(Call(scanner.get(), scan, Flags::Put, {&abc}).hr, S_OK);
  CHECK(Call(scanner.get(), scan, Flags::Get).result.Text() == L"a,b,c");
  Var comma = Var::Str(L"|,");
  Call(scanner.get(), init, Flags::Method, {&abc, &comma});
  Call(scanner.get(), next, Flags::Method);
  CHECK(Call(scanner.get(), next, Flags::Method).result.Text() == L"b");
  Var xx = Var::Str(L"xx");
  CHECK_EQ(Call(scanner.get(), IdOf(scanner.get(), L"ReplaceCurrentToken"), Flags::Method, {&xx}).result.v.boolVal,
           VARIANT_TRUE);
  CHECK(Call(scanner.get(), scan, Flags::Get).result.Text() == L"a,xx,c");
  CHECK(Call(scanner.get(), IdOf(scanner.get(), L"CurrentToken"), Flags::Get).result.Text() == L"b");
  CHECK(Call(scanner.get(), next, Flags::Method).result.Text() == L"c");

  // The delimiter set is a Scripting Runtime dictionary, live both ways.
  const DISPID delimitors = IdOf(scanner.get(), L"Delimitors");
  Outcome set = Call(scanner.get(), delimitors, Flags::Get);
  CHECK_EQ(set.result.v.vt, VT_DISPATCH);
  if (set.result.v.vt != VT_DISPATCH || !set.result.v.pdispVal) return;
  IDispatch* keys = set.result.v.pdispVal;
  CHECK_EQ(Call(keys, IdOf(keys, L"Count"), Flags::Get).result.v.lVal, 1L);
  CHECK_EQ(Call(keys, IdOf(keys, L"CompareMode"), Flags::Get).result.v.lVal, 0L);  // binary
  Var commaKey = Var::Str(L","), semiKey = Var::Str(L";"), nothing = Var::Str(L"");
  CHECK_EQ(Call(keys, IdOf(keys, L"Exists"), Flags::Method, {&commaKey}).result.v.boolVal, VARIANT_TRUE);
  CHECK_HR(Call(keys, IdOf(keys, L"Add"), Flags::Method, {&semiKey, &nothing}).hr, S_OK);
  Var mixed = Var::Str(L"p;q,r"), scanComma = Var::Str(L"|,");
  Call(scanner.get(), init, Flags::Method, {&mixed, &scanComma});  // a fresh set of its own
  CHECK(Call(scanner.get(), next, Flags::Method).result.Text() == L"p;q");

  // A dictionary the caller made: the scanner asks it about every
  // character, so what the caller changes afterwards counts at once.
  Ref<IDispatch> dictionary = Create(L"Scripting.Dictionary");
  CHECK(dictionary);
  if (dictionary) {
    Var lowerX = Var::Str(L"x");
    CHECK_HR(Call(dictionary.get(), IdOf(dictionary.get(), L"Add"), Flags::Method, {&semiKey, &nothing}).hr, S_OK);
    CHECK_HR(Call(dictionary.get(), IdOf(dictionary.get(), L"Add"), Flags::Method, {&lowerX, &nothing}).hr, S_OK);
    Var setArg = Var::Disp(dictionary.get());
    CHECK_HR(Call(scanner.get(), delimitors, Flags::PutRef, {&setArg}).hr, S_OK);
    // Init would replace the set: a fresh scanner is given the text instead.
    Var scanText = Var::Str(L"p;qXr,sxt,u");
    Ref<IDispatch> other = Create(L"kpxAddIn.TokenScanner");
    CHECK(other);
    if (other) {
      CHECK_HR(Call(other.get(), delimitors, Flags::PutRef, {&setArg}).hr, S_OK);
      CHECK_HR(Call(other.get(), scan, Flags::Put, {&scanText}).hr, S_OK);
      CHECK(Call(other.get(), next, Flags::Method).result.Text() == L"p");
      CHECK(Call(other.get(), next, Flags::Method).result.Text() == L"qXr,s");  // keys compare case-sensitively
      Var xKey = Var::Str(L"x"), commaArg = Var::Str(L",");
      CHECK_HR(Call(dictionary.get(), IdOf(dictionary.get(), L"Remove"), Flags::Method, {&xKey}).hr, S_OK);
      CHECK_HR(Call(dictionary.get(), IdOf(dictionary.get(), L"Add"), Flags::Method, {&commaArg, &nothing}).hr, S_OK);
      CHECK_HR(Call(other.get(), scan, Flags::Put, {&scanText}).hr, S_OK);
      CHECK(Call(other.get(), next, Flags::Method).result.Text() == L"t");  // "," is a delimiter now
      CHECK(Call(other.get(), next, Flags::Method).result.Text() == L"u");
      Outcome given = Call(other.get(), delimitors, Flags::Get);
      CHECK(given.result.v.vt == VT_DISPATCH && given.result.v.pdispVal == dictionary.get());
      // An object that is no dictionary is refused, and the set stays.
      Ref<HostObject> foreign = HostObject::Make(L"dictionary");
      Var foreignArg = Var::Disp(foreign.get());
      Outcome refused = Call(other.get(), delimitors, Flags::PutRef, {&foreignArg});
      CHECK_HR(refused.hr, DISP_E_EXCEPTION);
      CHECK_HR(refused.info.scode, VbError(13));
    }
  }
}

// --------------------------------------------------- the bridge, directly

// An object of the test host's own, to send out and get back.
class Echo final : public kpx::Object {
 public:
  kpx::DispId IdOfName(std::string_view) override { throw kpx::AutomationError(kpx::vberr::kNoSuchMember); }
  kpx::Variant Invoke(kpx::DispId, kpx::CallKind, std::span<kpx::Variant> args) override {
    return args.empty() ? kpx::Variant() : args[0];
  }
};

int32_t ErrorNumber(const std::function<void()>& f, std::string* description = nullptr) {
  try {
    f();
  } catch (const kpx::AutomationError& e) {
    if (description) *description = e.description();
    return e.number();
  }
  return 0;
}

void BridgeAgainstHostObjects() {
  Group("host objects through the adapter: argument order, references, put, errors, value kinds");
  kpx::win32::ServerLocks locks;
  {
    kpx::win32::ComBridge bridge(locks);
    Ref<HostObject> host = HostObject::Make(L"host");
    host->Method(10, L"Three");
    host->On(11, L"Bump", [](DISPPARAMS& p, VARIANT*, EXCEPINFO*) {
      VARIANT& a = Arg(p, 0);
      if (a.vt != (VT_BYREF | VT_VARIANT)) return DISP_E_TYPEMISMATCH;
      VariantClear(a.pvarVal);
      a.pvarVal->vt = VT_I4;
      a.pvarVal->lVal = 42;
      return S_OK;
    });
    host->On(12, L"FailWCode", [](DISPPARAMS&, VARIANT*, EXCEPINFO* info) {
      info->wCode = 1234;
      info->bstrDescription = SysAllocString(L"Custom failure");
      info->bstrSource = SysAllocString(L"host");
      return DISP_E_EXCEPTION;
    });
    host->On(13, L"FailScode", [](DISPPARAMS&, VARIANT*, EXCEPINFO* info) {
      info->scode = VbError(5);
      return DISP_E_EXCEPTION;
    });
    host->On(14, L"FailPlain", [](DISPPARAMS&, VARIANT*, EXCEPINFO*) { return E_INVALIDARG; });
    host->Method(15, L"Prop");
    host->On(16, L"Echo", [](DISPPARAMS& p, VARIANT* result, EXCEPINFO*) {
      return p.cArgs == 1 ? VariantCopyInd(result, &Arg(p, 0)) : DISP_E_BADPARAMCOUNT;
    });

    kpx::ObjectPtr object = bridge.Adopt(host.get());
    kpx::CallMethod(object, 10, {kpx::Variant(int16_t{7}), kpx::Variant("x"), kpx::Variant(true)});
    CHECK(host->CallsOf(L"Three").at(0).args == (std::vector<std::wstring>{L"i2:7", L"bstr:x", L"bool:-1"}));
    CHECK_EQ(host->CallsOf(L"Three").at(0).flags, DISPATCH_METHOD | DISPATCH_PROPERTYGET);

    kpx::Variant bumped(int16_t{1});
    kpx::CallMethod(object, 11, {kpx::Variant::Ref(&bumped)});
    CHECK(bumped == kpx::Variant(int32_t{42}));

    CHECK_EQ(ErrorNumber([&] { kpx::CallMethod(object, 999); }), kpx::vberr::kNoSuchMember);
    CHECK_EQ(ErrorNumber([&] { kpx::CallByName(object, "Nope", kpx::CallKind::Method); }), kpx::vberr::kNoSuchMember);
    CHECK_EQ(object->IdOfName("bump"), 11);
    std::string description;
    CHECK_EQ(ErrorNumber([&] { kpx::CallMethod(object, 12); }, &description), 1234);
    CHECK_EQ(description, std::string("Custom failure"));
    CHECK_EQ(ErrorNumber([&] { kpx::CallMethod(object, 13); }, &description), 5);
    CHECK_EQ(description, std::string("Invalid procedure call or argument"));
    CHECK_EQ(ErrorNumber([&] { kpx::CallMethod(object, 14); }, &description), static_cast<int32_t>(E_INVALIDARG));
    CHECK(!description.empty());

    kpx::PutProperty(object, 15, kpx::Variant("v"));
    Seen put = host->CallsOf(L"Prop").at(0);
    CHECK_EQ(put.flags, DISPATCH_PROPERTYPUT);
    CHECK(put.named == std::vector<DISPID>{DISPID_PROPERTYPUT});
    CHECK(put.args == std::vector<std::wstring>{L"bstr:v"});

    const kpx::Variant kinds[] = {kpx::Variant(),
                                  kpx::Variant::Null(),
                                  kpx::Variant(false),
                                  kpx::Variant(true),
                                  kpx::Variant(int16_t{-2}),
                                  kpx::Variant(int32_t{70000}),
                                  kpx::Variant(1.5f),
                                  kpx::Variant(2.25),
                                  kpx::Variant::Date(45000.5),
                                  kpx::Variant("Gr\xC3\xBC\xC3\x9F" "e \xE2\x82\xAC \xF0\x9F\x98\x80"),
                                  kpx::Variant(""),
                                  kpx::Variant::Nothing()};
    for (const kpx::Variant& v : kinds) {
      kpx::Variant back = kpx::CallMethod(object, 16, {v});
      CHECK(back == v);
      if (!(back == v)) std::printf("  kind %s came back as %s\n", kpx::VarTypeName(v.type()), kpx::VarTypeName(back.type()));
    }
    // An object of ours goes out as IDispatch and comes back as itself.
    auto echo = std::make_shared<Echo>();
    kpx::Variant back = kpx::CallMethod(object, 16, {kpx::Variant(kpx::ObjectPtr(echo))});
    CHECK(back.objectOrNull().get() == echo.get());
    // A foreign object goes back out as its own pointer.
    kpx::CallMethod(object, 10, {kpx::Variant(object)});
    CHECK(host->CallsOf(L"Three").back().args == std::vector<std::wstring>{L"disp"});
    // Each adoption is a wrapper of its own; the object's IUnknown tells
    // that two of them are one object, as VB's Is does.
    kpx::ObjectPtr again = bridge.Adopt(host.get());
    CHECK(again != object);
    CHECK(kpx::SameObject(again, object));
    Ref<HostObject> other = HostObject::Make(L"other");
    CHECK(!kpx::SameObject(bridge.Adopt(other.get()), object));
    CHECK(!kpx::SameObject(kpx::ObjectPtr(), object));
    host->Clear();
  }
  CHECK_EQ(locks.objects, 0L);
}

// Answers "Echo" (1) with its first argument; any other id raises 5.
class Served final : public kpx::Object {
 public:
  kpx::DispId IdOfName(std::string_view name) override {
    if (name == "Echo") return 1;
    throw kpx::AutomationError(kpx::vberr::kNoSuchMember);
  }
  kpx::Variant Invoke(kpx::DispId id, kpx::CallKind, std::span<kpx::Variant> args) override {
    if (id != 1) throw kpx::AutomationError(5);
    return args.empty() ? kpx::Variant() : args[0];
  }
};

// Counts the calls it is told of and how deep they nest.
struct Spans final : kpx::CallObserver {
  int entered = 0, left = 0, depth = 0, deepest = 0;
  void Enter() override {
    ++entered;
    if (++depth > deepest) deepest = depth;
  }
  void Leave() override {
    ++left;
    --depth;
  }
};

void ObservedServing() {
  Group("a bridge tells its observer of every call into an object it serves, answered, failed or refused");
  kpx::win32::ServerLocks locks;
  Spans spans;
  {
    kpx::win32::ComBridge bridge(locks);
    bridge.Observe(&spans);
    Ref<IDispatch> served(bridge.Expose(std::make_shared<Served>()));
    DISPID id = 0;
    LPOLESTR echo = const_cast<LPOLESTR>(L"Echo");
    LPOLESTR other = const_cast<LPOLESTR>(L"Other");
    CHECK_HR(served->GetIDsOfNames(IID_NULL, &echo, 1, 0, &id), S_OK);
    CHECK_HR(served->GetIDsOfNames(IID_NULL, &other, 1, 0, &id), DISP_E_UNKNOWNNAME);
    Var arg = Var::I4(7);
    DISPPARAMS params{&arg.v, nullptr, 1, 0};
    VARIANT result;
    VariantInit(&result);
    CHECK_HR(served->Invoke(1, IID_NULL, 0, DISPATCH_METHOD, &params, &result, nullptr, nullptr), S_OK);
    CHECK(result.vt == VT_I4 && result.lVal == 7);
    VariantClear(&result);
    EXCEPINFO info{};
    CHECK_HR(served->Invoke(2, IID_NULL, 0, DISPATCH_METHOD, &params, &result, &info, nullptr), DISP_E_EXCEPTION);
    SysFreeString(info.bstrDescription);
    SysFreeString(info.bstrSource);
    CHECK_HR(served->Invoke(1, IID_IDispatch, 0, DISPATCH_METHOD, &params, &result, nullptr, nullptr),
             DISP_E_UNKNOWNINTERFACE);
    CHECK_EQ(spans.entered, 5);
    CHECK_EQ(spans.left, 5);
    CHECK_EQ(spans.deepest, 1);
    bridge.Observe(nullptr);
    CHECK_HR(served->Invoke(1, IID_NULL, 0, DISPATCH_METHOD, &params, &result, nullptr, nullptr), S_OK);
    VariantClear(&result);
    CHECK_EQ(spans.entered, 5);
  }
  CHECK_EQ(locks.objects, 0L);
}

void PlatformOverWin32(const Paths& paths, HMODULE addin) {
  Group("the Win32 platform: resource component early- and late-bound, object creation, registry, files, icons");
  kpx::win32::ServerLocks locks;
  kpx::win32::ComBridge bridge(locks);
  kpx::win32::Win32Platform win32(bridge, addin);
  kpx::platform::Platform world = win32.platform();

  // Icons from the add-in's module, as pictures wrapped for the core.
  for (const kpx::CodeIconArt& art : kpx::CodeIconArtwork()) {
    kpx::ObjectPtr icon = world.ui.LoadIconPicture(art.largeResource, kpx::kLargeCodeIconPixels);
    CHECK(dynamic_cast<kpx::win32::DispatchObject*>(icon.get()) != nullptr);
    CHECK_EQ(kpx::GetProperty(icon, kpx::platform::kPictureType).toInt32(), int32_t{kpx::platform::kPictureTypeIcon});
    CHECK_EQ(kpx::platform::HimetricToPixels(kpx::GetProperty(icon, kpx::platform::kPictureHeight).toInt32()),
             kpx::kLargeCodeIconPixels);
  }
  std::string iconError;
  CHECK_EQ(ErrorNumber([&] { world.ui.LoadIconPicture(999, 16); }, &iconError), 326);
  CHECK_EQ(iconError, std::string("Resource with identifier '999' not found"));
  kpx::win32::Win32Platform program(bridge);  // the test host has no icons of its own
  CHECK_EQ(ErrorNumber([&] { program.platform().ui.LoadIconPicture(101, 16); }), 326);

  kpx::ObjectPtr resource = world.objects.CreateInstance(kpx::kResourceClassId, kpx::kResourceInterfaceId);
  CHECK(dynamic_cast<kpx::win32::EarlyBoundResourceObject*>(resource.get()) != nullptr);
  CHECK_EQ(kpx::CallOwnOperation(resource, 1, kpx::CallKind::Method, {kpx::Variant(int32_t{5001})}).toString(),
           std::string(kpx::FindResourceText(5001)));
  std::string description;
  CHECK_EQ(ErrorNumber([&] { kpx::CallOwnOperation(resource, 1, kpx::CallKind::Method, {kpx::Variant(int32_t{4242})}); },
                       &description),
           326);
  CHECK(description.find("4242") != std::string::npos);

  kpx::ObjectPtr late = world.objects.CreateObject(kpx::kResourceProgId);
  kpx::Variant id(int32_t{5002});
  CHECK_EQ(kpx::CallByName(late, "GetString", kpx::CallKind::Method, {kpx::Variant::Ref(&id)}).toString(),
           std::string(kpx::FindResourceText(5002)));
  CHECK(id == kpx::Variant(int32_t{5002}));
  kpx::Variant missing(int32_t{4243});
  CHECK_EQ(ErrorNumber([&] { kpx::CallByName(late, "GetString", kpx::CallKind::Method, {kpx::Variant::Ref(&missing)}); },
                       &description),
           326);
  // Own operations by position, found through the dual interface's vtable.
  CHECK_EQ(late->IdOfOwnOperation(1), 1);
  CHECK_EQ(late->IdOfOwnOperation(2), 2);
  CHECK_EQ(ErrorNumber([&] { late->IdOfOwnOperation(3); }), kpx::vberr::kNoSuchMember);

  // A plain dispinterface counts its own operations in declaration order.
  kpx::ObjectPtr api = world.objects.CreateObject("kpxAddIn.API");
  CHECK_EQ(api->IdOfOwnOperation(1), 1);
  CHECK_EQ(api->IdOfOwnOperation(20), 20);
  CHECK_EQ(ErrorNumber([&] { api->IdOfOwnOperation(70); }), kpx::vberr::kNoSuchMember);
  CHECK_EQ(kpx::CallOwnOperation(api, 18, kpx::CallKind::PropertyGet).toString(), std::string("VC++"));
  api.reset();
  // By class id and interface id, as the add-in makes its companions.
  kpx::ObjectPtr scanner =
      world.objects.CreateInstance(kpx::win32::GuidToString(CLSID_TokenScanner), kpx::win32::GuidToString(DIID__TokenScanner));
  CHECK(kpx::CallByName(scanner, "Init", kpx::CallKind::Method, {kpx::Variant("x y"), kpx::Variant("| ")}).toBool());
  CHECK_EQ(kpx::CallByName(scanner, "NextToken", kpx::CallKind::Method).toString(), std::string("x"));
  scanner.reset();

  CHECK_EQ(ErrorNumber([&] { world.objects.CreateObject("kpx.NoSuchComponent"); }, &description),
           kpx::vberr::kCantCreateObject);
  CHECK(!description.empty());
  CHECK_EQ(ErrorNumber([&] { world.objects.CreateInstance("{00000000-0000-0000-0000-00000000ABCD}",
                                                         kpx::kResourceInterfaceId); }),
           kpx::vberr::kCantCreateObject);

  // Registry, through the core's own routines over the ANSI functions.
  const char* key = "Software\\kpxtest";
  CHECK(world.registry.CreateKey(kpx::platform::RootKey::CurrentUser, key) != kpx::platform::KeyDisposition::Failed);
  kpx::RegistrySetValue(world.registry, kpx::platform::RootKey::CurrentUser, key, "text", kpx::Variant("Gr\xC3\xBC\xC3\x9F" "e"),
                        kpx::platform::kRegSz);
  CHECK(kpx::RegistryQueryValue(world.registry, kpx::platform::RootKey::CurrentUser, key, "text") ==
        kpx::Variant("Gr\xC3\xBC\xC3\x9F" "e"));
  std::optional<kpx::platform::RegistryValue> raw =
      world.registry.QueryValue(kpx::platform::RootKey::CurrentUser, key, "text");
  CHECK(raw && raw->type == kpx::platform::kRegSz && raw->data.size() == 6 && raw->data.back() == '\0');
  kpx::RegistrySetValue(world.registry, kpx::platform::RootKey::CurrentUser, key, "number", kpx::Variant(int32_t{-5}),
                        kpx::platform::kRegDword);
  CHECK(kpx::RegistryQueryValue(world.registry, kpx::platform::RootKey::CurrentUser, key, "number") ==
        kpx::Variant(int32_t{-5}));
  // Values around the size read in one query, and past it, come back whole.
  for (size_t length : {size_t{0}, size_t{255}, size_t{256}, size_t{4000}}) {
    std::string text(length, 'x');
    for (size_t i = 0; i < length; ++i) text[i] = static_cast<char>('a' + i % 26);
    kpx::RegistrySetValue(world.registry, kpx::platform::RootKey::CurrentUser, key, "long", kpx::Variant(text),
                          kpx::platform::kRegSz);
    raw = world.registry.QueryValue(kpx::platform::RootKey::CurrentUser, key, "long");
    CHECK(raw && raw->type == kpx::platform::kRegSz && raw->data == text + '\0');
    if (!raw || raw->data != text + '\0') std::printf("  a value of %zu characters came back wrong\n", length);
  }
  CHECK(!world.registry.QueryValue(kpx::platform::RootKey::CurrentUser, key, "absent"));
  // Writing under a missing key creates nothing.
  CHECK(!world.registry.SetValue(kpx::platform::RootKey::CurrentUser, "Software\\kpxtest\\missing", "x",
                                 {kpx::platform::kRegSz, std::string("y\0", 2)}));
  CHECK(kpx::RegistryQueryValue(world.registry, kpx::platform::RootKey::CurrentUser, "Software\\kpxtest\\missing", "x")
            .isEmpty());
  RegDeleteTreeA(HKEY_CURRENT_USER, key);
  RegDeleteKeyA(HKEY_CURRENT_USER, key);

  // Files: appended in the ANSI code page, created when missing.
  const std::string file = Narrow(paths.scratch) + "\\append.txt";
  world.files.DeleteFile(file);
  CHECK(!world.files.Exists(file));
  CHECK(world.files.AppendText(file, "one\r\n"));
  CHECK(world.files.AppendText(file, "t\xC3\xA9st\r\n"));
  CHECK(world.files.Exists(file));
  CHECK_EQ(ReadFileBytes(Widen(file)), std::string("one\r\nt\xE9st\r\n"));
  // Read back whole, from the ANSI code page; what cannot be opened raises
  // what VB's Open raises.
  CHECK_EQ(world.files.ReadText(file), std::string("one\r\nt\xC3\xA9st\r\n"));
  CHECK_EQ(ErrorNumber([&] { world.files.ReadText(Narrow(paths.scratch) + "\\absent.txt"); }),
           kpx::vberr::kFileNotFound);
  CHECK_EQ(ErrorNumber([&] { world.files.ReadText(Narrow(paths.scratch) + "\\no such folder\\x.txt"); }),
           kpx::vberr::kPathNotFound);
  CHECK_EQ(ErrorNumber([&] { world.files.ReadText(Narrow(paths.scratch)); }), kpx::vberr::kPathFileAccess);
  CHECK(world.files.DeleteFile(file));
  CHECK(!world.files.DeleteFile(file));
  CHECK(!world.files.AppendText(Narrow(paths.scratch) + "\\no such folder\\x.txt", "x"));

  const float timer = world.clock.Timer();
  CHECK(timer >= 0.0f && timer < 86400.0f);
  CHECK(world.clock.Now().year >= 2000);
}


// ----------------------------------------------------------------- code icons

// An item of a code-icon collection: the picture, or null (the failure
// checked).
Ref<IPicture> PictureOf(const Outcome& item) {
  Ref<IPicture> picture;
  if (!CHECK_HR(item.hr, S_OK) || !CHECK_EQ(item.result.v.vt, VT_DISPATCH) || !item.result.v.pdispVal) return picture;
  CHECK_HR(item.result.v.pdispVal->QueryInterface(IID_IPicture, reinterpret_cast<void**>(picture.out())), S_OK);
  return picture;
}

void CodeIcons() {
  Group("CodeIcons and LargeCodeIcons: real icon pictures under every key, walked with For Each");
  Ref<IDispatch> api = Create(L"kpxAddIn.API");
  CHECK(api);
  if (!api) return;
  const std::span<const kpx::CodeIconArt> artwork = kpx::CodeIconArtwork();
  const long expected = static_cast<long>(artwork.size());
  for (const bool large : {false, true}) {
    const int pixels = large ? kpx::kLargeCodeIconPixels : kpx::kSmallCodeIconPixels;
    Outcome got = Call(api.get(), IdOf(api.get(), large ? L"LargeCodeIcons" : L"CodeIcons"), Flags::Get);
    CHECK_HR(got.hr, S_OK);
    if (!CHECK_EQ(got.result.v.vt, VT_DISPATCH) || !got.result.v.pdispVal) continue;
    IDispatch* icons = got.result.v.pdispVal;
    Outcome count = Call(icons, IdOf(icons, L"Count"), Flags::Get);
    CHECK(count.result.v.vt == VT_I4 && count.result.v.lVal == expected);

    std::vector<IUnknown*> byKey;  // identities, in artwork order
    bool rendered = false;
    for (const kpx::CodeIconArt& art : artwork) {
      Var key = Var::Str(Widen(art.key).c_str());
      Outcome item = Call(icons, DISPID_VALUE, Flags::MethodOrGet, {&key});
      Ref<IPicture> picture = PictureOf(item);
      if (!picture) {
        std::printf("  no picture under \"%s\"\n", art.key);
        continue;
      }
      // The real picture, handed on as itself: not one of the bridge's own
      // servers wrapped around it.
      Ref<IUnknown> ours;
      CHECK_HR(item.result.v.pdispVal->QueryInterface(kpx::win32::IID_IKpxExposedObject,
                                                      reinterpret_cast<void**>(ours.out())),
               E_NOINTERFACE);
      byKey.push_back(Identity(picture.get()));
      SHORT type = 0;
      CHECK_HR(picture->get_Type(&type), S_OK);
      CHECK_EQ(type, static_cast<SHORT>(PICTYPE_ICON));
      OLE_XSIZE_HIMETRIC width = 0;
      OLE_YSIZE_HIMETRIC height = 0;
      picture->get_Width(&width);
      picture->get_Height(&height);
      CHECK_EQ(MulDiv(width, 96, 2540), pixels);
      CHECK_EQ(MulDiv(height, 96, 2540), pixels);
      // A late-bound host reads the same through the picture's IDispatch.
      Outcome lateWidth = Call(item.result.v.pdispVal, DISPID_PICT_WIDTH, Flags::Get);
      CHECK(lateWidth.result.v.vt == VT_I4 && lateWidth.result.v.lVal == width);
      OLE_HANDLE handle = 0;
      CHECK(SUCCEEDED(picture->get_Handle(&handle)) && handle != 0);
      if (!rendered) {
        rendered = true;
        const int inked = InkedPixelsAfterRender(picture.get(), pixels);
        CHECK(inked > pixels * pixels / 8);
        std::printf("  %s %dx%d drew %d of %d pixels\n", art.key, pixels, pixels, inked, pixels * pixels);
      }
    }
    CHECK_EQ(static_cast<long>(std::set<IUnknown*>(byKey.begin(), byKey.end()).size()), expected);
    // By position the same pictures, in the artwork's order.
    Var first = Var::I4(1), last = Var::I4(expected);
    Ref<IPicture> firstPicture = PictureOf(Call(icons, DISPID_VALUE, Flags::MethodOrGet, {&first}));
    Ref<IPicture> lastPicture = PictureOf(Call(icons, DISPID_VALUE, Flags::MethodOrGet, {&last}));
    if (firstPicture && lastPicture && !byKey.empty()) {
      CHECK(Identity(firstPicture.get()) == byKey.front());
      CHECK(Identity(lastPicture.get()) == byKey.back());
    }
    Var unknown = Var::Str(L"NoSuchKind");
    Outcome missing = Call(icons, DISPID_VALUE, Flags::MethodOrGet, {&unknown});
    CHECK_HR(missing.hr, DISP_E_EXCEPTION);
    CHECK_HR(missing.info.scode, VbError(5));

    // For Each: _NewEnum answers an IEnumVARIANT over the same pictures.
    Outcome newEnum = Call(icons, DISPID_NEWENUM, Flags::MethodOrGet);
    CHECK_HR(newEnum.hr, S_OK);
    Ref<IEnumVARIANT> walk;
    if (!CHECK(newEnum.result.v.vt == VT_UNKNOWN && newEnum.result.v.punkVal)) continue;
    CHECK_HR(newEnum.result.v.punkVal->QueryInterface(IID_IEnumVARIANT, reinterpret_cast<void**>(walk.out())), S_OK);
    if (!walk) continue;
    std::vector<IUnknown*> walked;
    for (;;) {
      VARIANT batch[3];
      ULONG fetched = 99;
      HRESULT hr = walk->Next(3, batch, &fetched);
      CHECK(hr == (fetched == 3 ? S_OK : S_FALSE));
      for (ULONG i = 0; i < fetched && i < 3; ++i) {
        if (CHECK_EQ(batch[i].vt, VT_DISPATCH)) walked.push_back(Identity(batch[i].pdispVal));
        VariantClear(&batch[i]);
      }
      if (hr != S_OK) break;
    }
    CHECK(walked == byKey);
    CHECK_HR(walk->Reset(), S_OK);
    CHECK_HR(walk->Skip(static_cast<ULONG>(expected)), S_OK);
    VARIANT none;
    VariantInit(&none);
    ULONG fetched = 99;
    CHECK_HR(walk->Next(1, &none, &fetched), S_FALSE);
    CHECK_EQ(fetched, 0ul);
    CHECK_HR(walk->Reset(), S_OK);
    CHECK_HR(walk->Skip(static_cast<ULONG>(expected) + 1), S_FALSE);
    // A clone goes on from where its walk was, on its own.
    walk->Reset();
    walk->Skip(1);
    Ref<IEnumVARIANT> clone;
    CHECK_HR(walk->Clone(clone.out()), S_OK);
    VARIANT second;
    if (clone && CHECK_HR(clone->Next(1, &second, nullptr), S_OK)) {
      CHECK(second.vt == VT_DISPATCH && byKey.size() > 1 && Identity(second.pdispVal) == byKey[1]);
      VariantClear(&second);
      CHECK_HR(walk->Next(1, &second, nullptr), S_OK);
      CHECK(second.vt == VT_DISPATCH && byKey.size() > 1 && Identity(second.pdispVal) == byKey[1]);
      VariantClear(&second);
    }
  }
}

// --------------------------------------------------------- unloading

using CanUnloadNow = HRESULT(STDAPICALLTYPE*)();

void ReferencesAndUnloading(HMODULE addin) {
  Group("no leaked references: DllCanUnloadNow answers S_OK once everything is released");
  auto canUnload = reinterpret_cast<CanUnloadNow>(reinterpret_cast<void*>(GetProcAddress(addin, "DllCanUnloadNow")));
  CHECK(canUnload != nullptr);
  if (!canUnload) return;
  {
    Ref<IDispatch> api = Create(L"kpxAddIn.API");
    Ref<IDispatch> scanner = Create(L"kpxAddIn.TokenScanner");
    CHECK(api && scanner);
    CHECK_HR(canUnload(), S_FALSE);
    Outcome set = Call(scanner.get(), IdOf(scanner.get(), L"Delimitors"), Flags::Get);
    CHECK_EQ(set.result.v.vt, VT_DISPATCH);
    // A walk over the code icons outlives its collection and the add-in
    // object: it is the library's own, and holds it.
    Outcome icons = Call(api.get(), IdOf(api.get(), L"CodeIcons"), Flags::Get);
    Ref<IUnknown> walk;
    if (CHECK(icons.result.v.vt == VT_DISPATCH && icons.result.v.pdispVal)) {
      Outcome newEnum = Call(icons.result.v.pdispVal, DISPID_NEWENUM, Flags::MethodOrGet);
      if (CHECK_EQ(newEnum.result.v.vt, VT_UNKNOWN) && newEnum.result.v.punkVal) {
        newEnum.result.v.punkVal->AddRef();
        walk = Ref<IUnknown>(newEnum.result.v.punkVal);
      }
    }
    icons.result = Var();
    api.reset();
    scanner.reset();
    CHECK_HR(canUnload(), S_FALSE);
    walk.reset();
    // The delimiter set still held is the Scripting Runtime's, not the add-in's.
    CHECK_HR(canUnload(), S_OK);
  }
  CoFreeUnusedLibraries();
  CHECK_HR(canUnload(), S_OK);

  Ref<IClassFactory> factory;
  CHECK_HR(CoGetClassObject(CLSID_API, CLSCTX_INPROC_SERVER, nullptr, IID_IClassFactory,
                            reinterpret_cast<void**>(factory.out())),
           S_OK);
  if (factory) {
    factory->LockServer(TRUE);
    CHECK_HR(canUnload(), S_FALSE);
    factory->LockServer(FALSE);
    CHECK_HR(canUnload(), S_OK);
  }
}

void ResourceComponentMissing(const Paths& paths) {
  Group("without kpxres registered the add-in cannot be created, cleanly; registered again it can");
  CHECK_EQ(Regsvr32(paths.res, true), 0ul);
  HRESULT hr = S_OK;
  Ref<IDispatch> api = Create(L"kpxAddIn.API", &hr);
  CHECK(!api);
  CHECK_HR(hr, VbError(429));
  Ref<IErrorInfo> info;
  if (GetErrorInfo(0, info.out()) == S_OK && info) {
    BSTR text = nullptr;
    info->GetDescription(&text);
    CHECK(text && SysStringLen(text) > 0);
    SysFreeString(text);
  }
  // The token scanner needs no resources.
  CHECK(Create(L"kpxAddIn.TokenScanner"));
  CHECK_EQ(Regsvr32(paths.res, false), 0ul);
  api = Create(L"kpxAddIn.API", &hr);
  CHECK_HR(hr, S_OK);
}

}  // namespace
}  // namespace wintest

int main(int argc, char** argv) {
  using namespace wintest;
  if (argc != 4) {
    std::fprintf(stderr, "usage: kpx-wintest <kpxaddin.dll> <kpxres.dll> <scratch folder>\n");
    return 2;
  }
  Paths paths{Widen(argv[1]), Widen(argv[2]), Widen(argv[3])};
  CreateDirectoryW(paths.scratch.c_str(), nullptr);
  DeleteFileW(paths.Log().c_str());
  std::printf("kpx-wintest: %s build\n", sizeof(void*) == 8 ? "x64" : "x86");

  RegistrationRoundTrip(paths);
  SideBySideRegistration(paths);

  // Logging on for everything of the add-in, without time stamps, and the
  // "VisualStudio" add-in switched off; read once, when the add-in loads.
  CHECK(WriteAnsiDword(HKEY_LOCAL_MACHINE, kHostKey, "Debug", 0x7F000080));
  CHECK(WriteAnsiString(HKEY_LOCAL_MACHINE, kHostKey, "DebugOutputFile", Narrow(paths.Log()).c_str()));
  CHECK(WriteAnsiString(HKEY_LOCAL_MACHINE, kHostKey, "SuppressTimeStamps", "true"));
  CHECK(WriteAnsiString(HKEY_CURRENT_USER, kHostKey, "Active", "No"));

  CoInitialize(nullptr);
  HMODULE addin = LoadLibraryW(paths.addin.c_str());  // kept mapped to ask DllCanUnloadNow
  CHECK(addin != nullptr);

  CreationAndTypeInformation();
  Activation(paths);
  ErrorsToTheHost();
  TokenScannerThroughIDispatch();
  BridgeAgainstHostObjects();
  ObservedServing();
  PlatformOverWin32(paths, addin);
  FileMembersTests(Narrow(paths.scratch));
  ProcessMembersTests(ProgramFolder() + "\\kpx-child.exe");
  CodeIcons();
  // A window needs a screen (run.sh gives the run one).
  if (!addin)
    std::printf("prompt window: not tested, kpxaddin.dll did not load\n");
  else if (GetEnvironmentVariableW(L"DISPLAY", nullptr, 0) == 0)
    std::printf("prompt window: not tested, there is no display (DISPLAY)\n");
  else {
    PromptWindowTests(addin);
    RestoreWindowTests(addin, Narrow(paths.scratch));
  }
  if (addin) ReferencesAndUnloading(addin);
  ResourceComponentMissing(paths);

  CoFreeUnusedLibraries();
  CoUninitialize();
  if (addin) FreeLibrary(addin);

  const Tally& t = tally();
  std::printf("%d checks, %d failed\n", t.checks, t.failed);
  return t.failed == 0 ? 0 : 1;
}
