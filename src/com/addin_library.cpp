#include "com/addin_library.h"

#include <initguid.h>

#include "api_h.h"

#include "addin/api.h"
#include "automation/error_styles.h"
#include "com/registration.h"
#include "platform/win32/com_errors.h"
#include "platform/win32/object_dispatch.h"
#include "platform/win32/win32_platform.h"
#include "shared/module.h"
#include "shared/token_scanner_object.h"

namespace kpx::com {

namespace {

constexpr ClassRegistration kClasses[] = {
    {&CLSID_API, L"kpxAddIn.API", L"kpxAddIn.API"},
    {&CLSID_TokenScanner, L"kpxAddIn.TokenScanner", L"kpxAddIn.TokenScanner"},
};

// The type information of the library's dispinterfaces, held while the
// add-in's state lives.
struct TypeInfos {
  ITypeLib* lib = nullptr;
  win32::ExposedType api, scanner;

  explicit TypeInfos(HINSTANCE module) {
    if (FAILED(LoadEmbeddedTypeLib(module, &lib))) {
      lib = nullptr;
      return;
    }
    api = Load(DIID__API);
    scanner = Load(DIID__TokenScanner);
  }
  ~TypeInfos() {
    for (win32::ExposedType* t : {&api, &scanner})
      if (t->typeInfo) t->typeInfo->Release();
    if (lib) lib->Release();
  }
  TypeInfos(const TypeInfos&) = delete;
  TypeInfos& operator=(const TypeInfos&) = delete;

  win32::ExposedType Load(const IID& iid) {
    ITypeInfo* info = nullptr;
    if (FAILED(lib->GetTypeInfoOfGuid(iid, &info))) return {};
    return win32::ExposedType::FromTypeInfo(info);
  }
  // Without its type library an object still works; it only cannot tell
  // its members apart from errors, nor describe itself.
  static const win32::ExposedType* OrNull(const win32::ExposedType& t) { return t.typeInfo ? &t : nullptr; }
};

}  // namespace

// Declared in the order it is built; torn down in reverse, so the add-in's
// module goes (releasing host and companion objects) before the bridge.
struct AddInLibrary::State {
  TypeInfos types;
  win32::ComBridge bridge;
  win32::Win32Platform platform;
  Module module;

  State(HINSTANCE instance, win32::ServerLocks& locks)
      : types(instance),
        bridge(locks, [this](const Object& o) -> const win32::ExposedType* {
          if (dynamic_cast<const API*>(&o)) return TypeInfos::OrNull(types.api);
          if (dynamic_cast<const TokenScannerObject*>(&o)) return TypeInfos::OrNull(types.scanner);
          return nullptr;
        }),
        platform(bridge, instance),
        module(platform.platform()) {}
};

// ------------------------------------------------------------ ClassFactory

HRESULT ClassFactory::QueryInterface(REFIID iid, void** out) {
  if (!out) return E_POINTER;
  if (IsEqualIID(iid, IID_IUnknown) || IsEqualIID(iid, IID_IClassFactory)) {
    *out = static_cast<IClassFactory*>(this);
    return S_OK;
  }
  *out = nullptr;
  return E_NOINTERFACE;
}

HRESULT ClassFactory::CreateInstance(IUnknown* outer, REFIID iid, void** out) {
  if (!out) return E_POINTER;
  *out = nullptr;
  if (outer) return CLASS_E_NOAGGREGATION;
  return (library_.*create_)(iid, out);
}

HRESULT ClassFactory::LockServer(BOOL lock) {
  if (lock)
    InterlockedIncrement(&library_.locks().locks);
  else
    InterlockedDecrement(&library_.locks().locks);
  return S_OK;
}

// ------------------------------------------------------------ AddInLibrary

AddInLibrary::AddInLibrary(HINSTANCE module)
    : module_(module),
      apiFactory_(*this, &AddInLibrary::CreateApi),
      scannerFactory_(*this, &AddInLibrary::CreateTokenScanner) {}

AddInLibrary::~AddInLibrary() {
  // Reached only when the library is unloaded without DllCanUnloadNow having
  // said yes (CoUninitialize unloads everything, in no set order). The state
  // may hold objects of libraries already gone: it is left, not released.
  if (state_) static_cast<void>(state_.release());
}

AddInLibrary::State& AddInLibrary::EnsureState() {
  if (!state_) state_ = std::make_unique<State>(module_, locks_);
  return *state_;
}

HRESULT AddInLibrary::GetClassObject(REFCLSID clsid, REFIID iid, void** out) {
  if (!out) return E_POINTER;
  *out = nullptr;
  if (IsEqualCLSID(clsid, CLSID_API)) return apiFactory_.QueryInterface(iid, out);
  if (IsEqualCLSID(clsid, CLSID_TokenScanner)) return scannerFactory_.QueryInterface(iid, out);
  return CLASS_E_CLASSNOTAVAILABLE;
}

HRESULT AddInLibrary::CanUnloadNow() {
  if (!locks_.Idle()) return S_FALSE;
  state_.reset();
  // Releasing the state's objects cannot create new ones, but check anyway.
  return locks_.Idle() ? S_OK : S_FALSE;
}

HRESULT AddInLibrary::Register() { return RegisterServer(module_, kClasses); }
HRESULT AddInLibrary::Unregister() { return UnregisterServer(module_, kClasses); }

HRESULT AddInLibrary::Expose(const ObjectPtr& object, REFIID iid, void** out) {
  IDispatch* dispatch = state_->bridge.Expose(object);
  HRESULT hr = dispatch->QueryInterface(iid, out);
  dispatch->Release();
  return hr;
}

HRESULT AddInLibrary::CreateApi(REFIID iid, void** out) {
  try {
    State& state = EnsureState();
    // The construction loads the resource texts; when the resource
    // component is missing it fails, and so does the host's creation.
    return Expose(kpx::CreateApi(state.module), iid, out);
  } catch (...) {
    AutomationError error = CurrentError();
    win32::SetThreadErrorInfo(error, win32::ObjectDispatch::kErrorSource, IID_IDispatch);
    return win32::HResultFromVbNumber(error.number());
  }
}

HRESULT AddInLibrary::CreateTokenScanner(REFIID iid, void** out) {
  try {
    State& state = EnsureState();
    return Expose(std::make_shared<TokenScannerObject>(state.module.platform().objects), iid, out);
  } catch (...) {
    AutomationError error = CurrentError();
    win32::SetThreadErrorInfo(error, win32::ObjectDispatch::kErrorSource, IID_IDispatch);
    return win32::HResultFromVbNumber(error.number());
  }
}

}  // namespace kpx::com
