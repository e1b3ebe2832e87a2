// Self-registration of an in-process server: its classes under HKCR\CLSID,
// their ProgIDs, and its embedded type library. Unregistering removes all
// of it again, so that regsvr32 /u leaves the registry as it found it; on
// 64-bit Windows, where the x86 and the x64 build may be registered side by
// side, it leaves what the other build shares with it (the ProgIDs, the
// type library's version key) while that build is registered.
#pragma once

#include "platform/win32/win32_api.h"

#include <span>
#include <string>

namespace kpx::com {

struct ClassRegistration {
  const CLSID* clsid;
  const wchar_t* progId;
  const wchar_t* description;
};

// The full path of a loaded module.
std::wstring ModulePath(HINSTANCE module);

// Loads the type library embedded in the module (TYPELIB resource 1).
HRESULT LoadEmbeddedTypeLib(HINSTANCE module, ITypeLib** lib);

// Every class apartment-threaded, with ProgID and TypeLib entries; then the
// type library (its TypeLib and Interface keys).
HRESULT RegisterServer(HINSTANCE module, std::span<const ClassRegistration> classes);
HRESULT UnregisterServer(HINSTANCE module, std::span<const ClassRegistration> classes);

}  // namespace kpx::com
