// kpxres.dll: the resource component. One class, KPXResourceInterface, whose
// dual interface hands out the add-in's English texts by string id, early-
// bound (LoadResString, the first own method) or late-bound (GetString).
#include "platform/win32/win32_api.h"

#include <initguid.h>

#include <new>
#include <string>

#include "kpxres_h.h"

#include "automation/automation_error.h"
#include "com/registration.h"
#include "platform/win32/com_errors.h"
#include "platform/win32/win32_strings.h"
#include "shared/resource_texts.h"

namespace {

constexpr const char* kSource = "kpxres";
constexpr int32_t kResourceNotFound = 326;  // VB's "Resource with identifier ... not found"
constexpr DISPID kLoadResString = 1;
constexpr DISPID kGetString = 2;

constexpr kpx::com::ClassRegistration kClasses[] = {
    {&CLSID_KPXResourceInterface, L"kpxres.KPXResourceInterface", L"kpxres.KPXResourceInterface"},
};

// The library's state: its module, its live objects and locks.
struct ResourceLibrary {
  HINSTANCE module = nullptr;
  LONG objects = 0;
  LONG locks = 0;
  ITypeInfo* typeInfo = nullptr;  // of the interface, loaded on first request

  ITypeInfo* TypeInfo() {
    if (typeInfo) return typeInfo;
    ITypeLib* lib = nullptr;
    if (FAILED(kpx::com::LoadEmbeddedTypeLib(module, &lib))) return nullptr;
    lib->GetTypeInfoOfGuid(IID__KPXResourceInterface, &typeInfo);
    lib->Release();
    return typeInfo;
  }
};

ResourceLibrary* library = nullptr;

HRESULT TextOf(LONG id, BSTR* text) {
  if (!text) return E_POINTER;
  *text = nullptr;
  const char* found = kpx::FindResourceText(id);
  if (!found) {
    kpx::AutomationError error(kResourceNotFound, "Resource with identifier '" + std::to_string(id) + "' not found",
                               kSource);
    kpx::win32::SetThreadErrorInfo(error, kSource, IID__KPXResourceInterface);
    return kpx::win32::HResultFromVbNumber(error.number());
  }
  *text = kpx::win32::Utf8ToBstr(found);
  return *text ? S_OK : E_OUTOFMEMORY;
}

class ResourceComponent final : public _KPXResourceInterface, public ISupportErrorInfo {
 public:
  ResourceComponent() { InterlockedIncrement(&library->objects); }

  // IUnknown
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
  ULONG STDMETHODCALLTYPE AddRef() override { return static_cast<ULONG>(InterlockedIncrement(&refs_)); }
  ULONG STDMETHODCALLTYPE Release() override {
    LONG n = InterlockedDecrement(&refs_);
    if (n == 0) delete this;
    return static_cast<ULONG>(n);
  }

  // IDispatch
  HRESULT STDMETHODCALLTYPE GetTypeInfoCount(UINT* count) override {
    if (!count) return E_POINTER;
    *count = library->TypeInfo() ? 1 : 0;
    return S_OK;
  }
  HRESULT STDMETHODCALLTYPE GetTypeInfo(UINT index, LCID, ITypeInfo** info) override {
    if (!info) return E_POINTER;
    *info = nullptr;
    ITypeInfo* ti = index == 0 ? library->TypeInfo() : nullptr;
    if (!ti) return DISP_E_BADINDEX;
    ti->AddRef();
    *info = ti;
    return S_OK;
  }
  HRESULT STDMETHODCALLTYPE GetIDsOfNames(REFIID iid, LPOLESTR* names, UINT count, LCID, DISPID* ids) override {
    if (!IsEqualIID(iid, IID_NULL)) return DISP_E_UNKNOWNINTERFACE;
    if (!names || !ids || count == 0) return E_INVALIDARG;
    for (UINT i = 0; i < count; ++i) ids[i] = DISPID_UNKNOWN;
    if (names[0] && lstrcmpiW(names[0], L"LoadResString") == 0)
      ids[0] = kLoadResString;
    else if (names[0] && lstrcmpiW(names[0], L"GetString") == 0)
      ids[0] = kGetString;
    else
      return DISP_E_UNKNOWNNAME;
    return count > 1 ? DISP_E_UNKNOWNNAME : S_OK;
  }
  // Written out rather than left to the type information's Invoke, so that
  // the id is accepted however it comes: by value, in a typed reference, or
  // in a VARIANT reference (as the add-in passes it).
  HRESULT STDMETHODCALLTYPE Invoke(DISPID id, REFIID iid, LCID, WORD flags, DISPPARAMS* params, VARIANT* result,
                                   EXCEPINFO* excepInfo, UINT* argErr) override {
    if (!IsEqualIID(iid, IID_NULL)) return DISP_E_UNKNOWNINTERFACE;
    if (id != kLoadResString && id != kGetString) return DISP_E_MEMBERNOTFOUND;
    if (!(flags & (DISPATCH_METHOD | DISPATCH_PROPERTYGET))) return DISP_E_MEMBERNOTFOUND;
    if (!params) return E_INVALIDARG;
    if (params->cNamedArgs) return DISP_E_NONAMEDARGS;
    if (params->cArgs != 1) return params->cArgs ? DISP_E_BADPARAMCOUNT : DISP_E_PARAMNOTOPTIONAL;
    VARIANT value;
    VariantInit(&value);
    HRESULT hr = VariantCopyInd(&value, &params->rgvarg[0]);
    if (SUCCEEDED(hr)) hr = VariantChangeType(&value, &value, 0, VT_I4);
    if (FAILED(hr)) {
      VariantClear(&value);
      if (argErr) *argErr = 0;
      return DISP_E_TYPEMISMATCH;
    }
    BSTR text = nullptr;
    hr = TextOf(value.lVal, &text);
    if (FAILED(hr)) {
      if (!excepInfo) return hr;
      *excepInfo = EXCEPINFO{};
      excepInfo->scode = hr;
      IErrorInfo* info = nullptr;
      if (GetErrorInfo(0, &info) == S_OK && info) {
        info->GetDescription(&excepInfo->bstrDescription);
        info->GetSource(&excepInfo->bstrSource);
        info->Release();
      }
      return DISP_E_EXCEPTION;
    }
    if (result) {
      VariantInit(result);
      result->vt = VT_BSTR;
      result->bstrVal = text;
    } else {
      SysFreeString(text);
    }
    return S_OK;
  }

  // _KPXResourceInterface
  HRESULT STDMETHODCALLTYPE LoadResString(LONG id, BSTR* text) override { return TextOf(id, text); }
  HRESULT STDMETHODCALLTYPE GetString(LONG* id, BSTR* text) override {
    if (!id) return E_POINTER;
    return TextOf(*id, text);
  }

  // ISupportErrorInfo
  HRESULT STDMETHODCALLTYPE InterfaceSupportsErrorInfo(REFIID iid) override {
    return IsEqualIID(iid, IID__KPXResourceInterface) || IsEqualIID(iid, IID_IDispatch) ? S_OK : S_FALSE;
  }

 private:
  ~ResourceComponent() { InterlockedDecrement(&library->objects); }
  LONG refs_ = 1;
};

class Factory final : public IClassFactory {
 public:
  HRESULT STDMETHODCALLTYPE QueryInterface(REFIID iid, void** out) override {
    if (!out) return E_POINTER;
    if (IsEqualIID(iid, IID_IUnknown) || IsEqualIID(iid, IID_IClassFactory)) {
      *out = static_cast<IClassFactory*>(this);
      return S_OK;
    }
    *out = nullptr;
    return E_NOINTERFACE;
  }
  ULONG STDMETHODCALLTYPE AddRef() override { return 2; }  // lives as long as the library
  ULONG STDMETHODCALLTYPE Release() override { return 1; }
  HRESULT STDMETHODCALLTYPE CreateInstance(IUnknown* outer, REFIID iid, void** out) override {
    if (!out) return E_POINTER;
    *out = nullptr;
    if (outer) return CLASS_E_NOAGGREGATION;
    auto* object = new (std::nothrow) ResourceComponent();
    if (!object) return E_OUTOFMEMORY;
    HRESULT hr = object->QueryInterface(iid, out);
    object->Release();
    return hr;
  }
  HRESULT STDMETHODCALLTYPE LockServer(BOOL lock) override {
    if (lock)
      InterlockedIncrement(&library->locks);
    else
      InterlockedDecrement(&library->locks);
    return S_OK;
  }
};

Factory factory;

}  // namespace

extern "C" BOOL WINAPI DllMain(HINSTANCE instance, DWORD reason, LPVOID reserved) {
  switch (reason) {
    case DLL_PROCESS_ATTACH:
      DisableThreadLibraryCalls(instance);
      library = new (std::nothrow) ResourceLibrary();
      if (!library) return FALSE;
      library->module = instance;
      return TRUE;
    case DLL_PROCESS_DETACH:
      if (!reserved && library) {
        if (library->typeInfo) library->typeInfo->Release();
        delete library;
      }
      library = nullptr;
      return TRUE;
    default:
      return TRUE;
  }
}

STDAPI DllGetClassObject(REFCLSID clsid, REFIID iid, LPVOID* out) {
  if (!out) return E_POINTER;
  *out = nullptr;
  if (!IsEqualCLSID(clsid, CLSID_KPXResourceInterface)) return CLASS_E_CLASSNOTAVAILABLE;
  return factory.QueryInterface(iid, out);
}

STDAPI DllCanUnloadNow() { return library->objects == 0 && library->locks == 0 ? S_OK : S_FALSE; }
STDAPI DllRegisterServer() { return kpx::com::RegisterServer(library->module, kClasses); }
STDAPI DllUnregisterServer() { return kpx::com::UnregisterServer(library->module, kClasses); }
