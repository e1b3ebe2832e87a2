// kpxaddin.dll's entry points. The library's one object is made when the
// DLL is loaded and holds everything else.
#include "platform/win32/win32_api.h"

#include <new>

#include "com/addin_library.h"

namespace {
kpx::com::AddInLibrary* library = nullptr;
}  // namespace

extern "C" BOOL WINAPI DllMain(HINSTANCE instance, DWORD reason, LPVOID reserved) {
  switch (reason) {
    case DLL_PROCESS_ATTACH:
      DisableThreadLibraryCalls(instance);
      library = new (std::nothrow) kpx::com::AddInLibrary(instance);
      return library != nullptr;
    case DLL_PROCESS_DETACH:
      // At process exit (reserved != null) nothing needs freeing.
      if (!reserved) delete library;
      library = nullptr;
      return TRUE;
    default:
      return TRUE;
  }
}

STDAPI DllGetClassObject(REFCLSID clsid, REFIID iid, LPVOID* out) { return library->GetClassObject(clsid, iid, out); }
STDAPI DllCanUnloadNow() { return library->CanUnloadNow(); }
STDAPI DllRegisterServer() { return library->Register(); }
STDAPI DllUnregisterServer() { return library->Unregister(); }
