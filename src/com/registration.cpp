#include "com/registration.h"

#include <vector>

#include "platform/win32/win32_strings.h"

namespace kpx::com {

namespace {

bool SetString(HKEY root, const std::wstring& key, const wchar_t* name, const std::wstring& value) {
  HKEY handle = nullptr;
  if (RegCreateKeyExW(root, key.c_str(), 0, nullptr, REG_OPTION_NON_VOLATILE, KEY_WRITE, nullptr, &handle, nullptr) !=
      ERROR_SUCCESS)
    return false;
  LONG rc = RegSetValueExW(handle, name, 0, REG_SZ, reinterpret_cast<const BYTE*>(value.c_str()),
                           static_cast<DWORD>((value.size() + 1) * sizeof(wchar_t)));
  RegCloseKey(handle);
  return rc == ERROR_SUCCESS;
}

void DeleteTree(HKEY root, const std::wstring& key) { RegDeleteTreeW(root, key.c_str()); RegDeleteKeyW(root, key.c_str()); }

std::vector<std::wstring> Subkeys(HKEY root, const std::wstring& key) {
  std::vector<std::wstring> out;
  HKEY handle = nullptr;
  if (RegOpenKeyExW(root, key.c_str(), 0, KEY_READ, &handle) != ERROR_SUCCESS) return out;
  for (DWORD i = 0;; ++i) {
    wchar_t name[256];
    DWORD length = 256;
    if (RegEnumKeyExW(handle, i, name, &length, nullptr, nullptr, nullptr, nullptr) != ERROR_SUCCESS) break;
    out.emplace_back(name, length);
  }
  RegCloseKey(handle);
  return out;
}

// On 64-bit Windows the 32-bit and the 64-bit build each register in their
// own view of HKCR\CLSID and HKCR\Interface, while ProgIDs and TypeLib are
// one key for both views. This flag opens the other build's view (on 32-bit
// Windows it is ignored, and the view is our own).
constexpr REGSAM kOtherBuildsView = sizeof(void*) == 8 ? KEY_WOW64_32KEY : KEY_WOW64_64KEY;

bool RegisteredInOtherView(const std::wstring& clsidKey) {
  HKEY handle = nullptr;
  if (RegOpenKeyExW(HKEY_CLASSES_ROOT, (clsidKey + L"\\InprocServer32").c_str(), 0, KEY_READ | kOtherBuildsView,
                    &handle) != ERROR_SUCCESS)
    return false;
  RegCloseKey(handle);
  return true;
}

const wchar_t* PlatformKey(SYSKIND kind) {
  switch (kind) {
    case SYS_WIN16: return L"win16";
    case SYS_MAC: return L"mac";
    case SYS_WIN64: return L"win64";
    default: return L"win32";
  }
}

std::wstring Hex(unsigned long value) {
  wchar_t buf[16];
  swprintf(buf, 16, L"%lx", value);
  return buf;
}

std::wstring VersionKey(const TLIBATTR& attr) {
  wchar_t buf[32];
  swprintf(buf, 32, L"%x.%x", attr.wMajorVerNum, attr.wMinorVerNum);
  return buf;
}

}  // namespace

std::wstring ModulePath(HINSTANCE module) {
  std::vector<wchar_t> buf(MAX_PATH);
  for (;;) {
    DWORD n = GetModuleFileNameW(module, buf.data(), static_cast<DWORD>(buf.size()));
    if (n == 0) return {};
    if (n < buf.size()) return std::wstring(buf.data(), n);
    buf.resize(buf.size() * 2);
  }
}

HRESULT LoadEmbeddedTypeLib(HINSTANCE module, ITypeLib** lib) {
  std::wstring path = ModulePath(module);
  if (path.empty()) return HRESULT_FROM_WIN32(GetLastError());
  return LoadTypeLibEx(path.c_str(), REGKIND_NONE, lib);
}

HRESULT RegisterServer(HINSTANCE module, std::span<const ClassRegistration> classes) {
  const std::wstring path = ModulePath(module);
  ITypeLib* lib = nullptr;
  HRESULT hr = LoadEmbeddedTypeLib(module, &lib);
  if (FAILED(hr)) return SELFREG_E_TYPELIB;
  TLIBATTR* attr = nullptr;
  if (FAILED(lib->GetLibAttr(&attr))) {
    lib->Release();
    return SELFREG_E_TYPELIB;
  }
  const std::wstring libid = win32::GuidToWide(attr->guid);
  lib->ReleaseTLibAttr(attr);

  bool ok = true;
  for (const ClassRegistration& c : classes) {
    const std::wstring clsid = win32::GuidToWide(*c.clsid);
    const std::wstring key = L"CLSID\\" + clsid;
    ok = ok && SetString(HKEY_CLASSES_ROOT, key, nullptr, c.description);
    ok = ok && SetString(HKEY_CLASSES_ROOT, key + L"\\InprocServer32", nullptr, path);
    ok = ok && SetString(HKEY_CLASSES_ROOT, key + L"\\InprocServer32", L"ThreadingModel", L"Apartment");
    ok = ok && SetString(HKEY_CLASSES_ROOT, key + L"\\ProgID", nullptr, c.progId);
    ok = ok && SetString(HKEY_CLASSES_ROOT, key + L"\\TypeLib", nullptr, libid);
    ok = ok && SetString(HKEY_CLASSES_ROOT, c.progId, nullptr, c.description);
    ok = ok && SetString(HKEY_CLASSES_ROOT, std::wstring(c.progId) + L"\\CLSID", nullptr, clsid);
  }
  if (!ok) {
    lib->Release();
    UnregisterServer(module, classes);
    return SELFREG_E_CLASS;
  }
  std::wstring libPath = path;
  hr = RegisterTypeLib(lib, libPath.data(), nullptr);
  lib->Release();
  if (FAILED(hr)) {
    UnregisterServer(module, classes);
    return SELFREG_E_TYPELIB;
  }
  return S_OK;
}

HRESULT UnregisterServer(HINSTANCE module, std::span<const ClassRegistration> classes) {
  for (const ClassRegistration& c : classes) {
    const std::wstring clsidKey = L"CLSID\\" + win32::GuidToWide(*c.clsid);
    DeleteTree(HKEY_CLASSES_ROOT, clsidKey);
    // The other build, still registered, creates its object by this ProgID.
    if (!RegisteredInOtherView(clsidKey)) DeleteTree(HKEY_CLASSES_ROOT, c.progId);
  }

  ITypeLib* lib = nullptr;
  if (FAILED(LoadEmbeddedTypeLib(module, &lib))) return SELFREG_E_TYPELIB;
  TLIBATTR* attr = nullptr;
  if (SUCCEEDED(lib->GetLibAttr(&attr))) {
    // The system's own removal first; then whatever it leaves of the keys
    // only this library writes: its interfaces (in our view), and its
    // platform under TypeLib. The version's other keys go only when no
    // other platform (the other build) is registered under it, and the
    // library key only when no other version remains.
    UnRegisterTypeLib(attr->guid, attr->wMajorVerNum, attr->wMinorVerNum, attr->lcid, attr->syskind);
    const UINT count = lib->GetTypeInfoCount();
    for (UINT i = 0; i < count; ++i) {
      TYPEKIND kind;
      if (FAILED(lib->GetTypeInfoType(i, &kind)) || (kind != TKIND_DISPATCH && kind != TKIND_INTERFACE)) continue;
      ITypeInfo* info = nullptr;
      if (FAILED(lib->GetTypeInfo(i, &info))) continue;
      TYPEATTR* type = nullptr;
      if (SUCCEEDED(info->GetTypeAttr(&type))) {
        DeleteTree(HKEY_CLASSES_ROOT, L"Interface\\" + win32::GuidToWide(type->guid));
        info->ReleaseTypeAttr(type);
      }
      info->Release();
    }
    const std::wstring libKey = L"TypeLib\\" + win32::GuidToWide(attr->guid);
    const std::wstring versionKey = libKey + L"\\" + VersionKey(*attr);
    const std::wstring localeKey = versionKey + L"\\" + Hex(attr->lcid);
    DeleteTree(HKEY_CLASSES_ROOT, localeKey + L"\\" + PlatformKey(attr->syskind));
    if (Subkeys(HKEY_CLASSES_ROOT, localeKey).empty()) DeleteTree(HKEY_CLASSES_ROOT, localeKey);
    bool versionInUse = false;
    for (const std::wstring& sub : Subkeys(HKEY_CLASSES_ROOT, versionKey))
      versionInUse = versionInUse || (_wcsicmp(sub.c_str(), L"FLAGS") != 0 && _wcsicmp(sub.c_str(), L"HELPDIR") != 0);
    if (!versionInUse) DeleteTree(HKEY_CLASSES_ROOT, versionKey);
    if (Subkeys(HKEY_CLASSES_ROOT, libKey).empty()) DeleteTree(HKEY_CLASSES_ROOT, libKey);
    lib->ReleaseTLibAttr(attr);
  }
  lib->Release();
  return S_OK;
}

}  // namespace kpx::com
