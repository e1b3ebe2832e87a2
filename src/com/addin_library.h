// Everything one loaded copy of kpxaddin.dll holds: its class factories, the
// count of live objects and LockServer calls, and the add-in's module-wide
// state (platform, logger settings, resource objects), which is made with
// the first object and dropped when DllCanUnloadNow finds nothing alive, so
// that each load of the library starts afresh, as the add-in always has.
#pragma once

#include "platform/win32/win32_api.h"

#include <memory>

#include "platform/win32/com_bridge.h"

namespace kpx::com {

class AddInLibrary;

// A factory for one class. It lives as long as the library, so its own
// reference count is not kept; LockServer counts towards unloading.
class ClassFactory final : public IClassFactory {
 public:
  using Create = HRESULT (AddInLibrary::*)(REFIID iid, void** out);
  ClassFactory(AddInLibrary& library, Create create) : library_(library), create_(create) {}

  HRESULT STDMETHODCALLTYPE QueryInterface(REFIID iid, void** out) override;
  ULONG STDMETHODCALLTYPE AddRef() override { return 2; }
  ULONG STDMETHODCALLTYPE Release() override { return 1; }
  HRESULT STDMETHODCALLTYPE CreateInstance(IUnknown* outer, REFIID iid, void** out) override;
  HRESULT STDMETHODCALLTYPE LockServer(BOOL lock) override;

 private:
  AddInLibrary& library_;
  Create create_;
};

class AddInLibrary {
 public:
  explicit AddInLibrary(HINSTANCE module);
  ~AddInLibrary();
  AddInLibrary(const AddInLibrary&) = delete;
  AddInLibrary& operator=(const AddInLibrary&) = delete;

  HRESULT GetClassObject(REFCLSID clsid, REFIID iid, void** out);
  // S_OK when no object is alive and no lock is held; the add-in's state is
  // released then, while COM is still there to release what it holds.
  HRESULT CanUnloadNow();
  HRESULT Register();
  HRESULT Unregister();

  HRESULT CreateApi(REFIID iid, void** out);
  HRESULT CreateTokenScanner(REFIID iid, void** out);
  win32::ServerLocks& locks() { return locks_; }

 private:
  struct State;
  State& EnsureState();
  HRESULT Expose(const ObjectPtr& object, REFIID iid, void** out);

  HINSTANCE module_;
  win32::ServerLocks locks_;
  std::unique_ptr<State> state_;
  ClassFactory apiFactory_;
  ClassFactory scannerFactory_;
};

}  // namespace kpx::com
