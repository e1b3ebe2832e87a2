#include "system.h"

#include <cwchar>

namespace wintest {

DWORD Regsvr32(const std::wstring& dll, bool unregister) {
  std::wstring command = L"regsvr32.exe /s ";
  if (unregister) command += L"/u ";
  command += L"\"" + dll + L"\"";
  STARTUPINFOW startup{};
  startup.cb = sizeof startup;
  PROCESS_INFORMATION process{};
  if (!CreateProcessW(nullptr, command.data(), nullptr, nullptr, FALSE, 0, nullptr, nullptr, &startup, &process))
    return static_cast<DWORD>(-1);
  WaitForSingleObject(process.hProcess, 60000);
  DWORD code = static_cast<DWORD>(-1);
  GetExitCodeProcess(process.hProcess, &code);
  CloseHandle(process.hThread);
  CloseHandle(process.hProcess);
  return code;
}

namespace {

void Walk(HKEY parent, const std::wstring& path, const std::wstring& name, std::set<std::wstring>& out) {
  HKEY key = nullptr;
  if (RegOpenKeyExW(parent, name.c_str(), 0, KEY_READ, &key) != ERROR_SUCCESS) return;
  out.insert(path);
  for (DWORD i = 0;; ++i) {
    wchar_t valueName[512];
    DWORD nameLength = 512;
    BYTE data[2048];
    DWORD dataSize = sizeof data;
    DWORD type = 0;
    if (RegEnumValueW(key, i, valueName, &nameLength, nullptr, &type, data, &dataSize) != ERROR_SUCCESS) break;
    std::wstring line = path + L"|" + valueName + L"=";
    wchar_t buf[32];
    swprintf(buf, 32, L"%lu:", static_cast<unsigned long>(type));
    line += buf;
    if (type == REG_SZ || type == REG_EXPAND_SZ)
      line += std::wstring(reinterpret_cast<wchar_t*>(data), dataSize / sizeof(wchar_t)).c_str();
    else if (type == REG_DWORD && dataSize == 4)
      line += std::to_wstring(*reinterpret_cast<DWORD*>(data));
    out.insert(line);
  }
  std::vector<std::wstring> children;
  for (DWORD i = 0;; ++i) {
    wchar_t child[512];
    DWORD length = 512;
    if (RegEnumKeyExW(key, i, child, &length, nullptr, nullptr, nullptr, nullptr) != ERROR_SUCCESS) break;
    children.emplace_back(child, length);
  }
  for (const std::wstring& child : children) Walk(key, path + L"\\" + child, child, out);
  RegCloseKey(key);
}

}  // namespace

std::set<std::wstring> SnapshotClassesRoot(const std::vector<std::wstring>& keys) {
  std::set<std::wstring> out;
  for (const std::wstring& k : keys) Walk(HKEY_CLASSES_ROOT, k, k, out);
  return out;
}

REGSAM OtherBuildsView() { return sizeof(void*) == 8 ? KEY_WOW64_32KEY : KEY_WOW64_64KEY; }

bool HasOtherBuildsView() {
  if (sizeof(void*) == 8) return true;
  BOOL wow64 = FALSE;
  return IsWow64Process(GetCurrentProcess(), &wow64) && wow64;
}

bool WriteDefault(HKEY root, const std::wstring& key, REGSAM view, const std::wstring& value) {
  HKEY handle = nullptr;
  if (RegCreateKeyExW(root, key.c_str(), 0, nullptr, REG_OPTION_NON_VOLATILE, KEY_ALL_ACCESS | view, nullptr, &handle,
                      nullptr) != ERROR_SUCCESS)
    return false;
  LONG rc = RegSetValueExW(handle, nullptr, 0, REG_SZ, reinterpret_cast<const BYTE*>(value.c_str()),
                           static_cast<DWORD>((value.size() + 1) * sizeof(wchar_t)));
  RegCloseKey(handle);
  return rc == ERROR_SUCCESS;
}

bool DeleteLeafKey(HKEY root, const std::wstring& key, REGSAM view) {
  return RegDeleteKeyExW(root, key.c_str(), view, 0) == ERROR_SUCCESS;
}

bool WriteAnsiString(HKEY root, const char* key, const char* name, const char* value) {
  HKEY handle = nullptr;
  if (RegCreateKeyExA(root, key, 0, nullptr, REG_OPTION_NON_VOLATILE, KEY_ALL_ACCESS, nullptr, &handle, nullptr) !=
      ERROR_SUCCESS)
    return false;
  LONG rc = RegSetValueExA(handle, name, 0, REG_SZ, reinterpret_cast<const BYTE*>(value),
                           static_cast<DWORD>(strlen(value) + 1));
  RegCloseKey(handle);
  return rc == ERROR_SUCCESS;
}

bool WriteAnsiDword(HKEY root, const char* key, const char* name, DWORD value) {
  HKEY handle = nullptr;
  if (RegCreateKeyExA(root, key, 0, nullptr, REG_OPTION_NON_VOLATILE, KEY_ALL_ACCESS, nullptr, &handle, nullptr) !=
      ERROR_SUCCESS)
    return false;
  LONG rc = RegSetValueExA(handle, name, 0, REG_DWORD, reinterpret_cast<const BYTE*>(&value), sizeof value);
  RegCloseKey(handle);
  return rc == ERROR_SUCCESS;
}

std::string ReadFileBytes(const std::wstring& path) {
  HANDLE file = CreateFileW(path.c_str(), GENERIC_READ, FILE_SHARE_READ | FILE_SHARE_WRITE, nullptr, OPEN_EXISTING,
                            FILE_ATTRIBUTE_NORMAL, nullptr);
  if (file == INVALID_HANDLE_VALUE) return {};
  std::string out;
  char buf[4096];
  DWORD got = 0;
  while (ReadFile(file, buf, sizeof buf, &got, nullptr) && got > 0) out.append(buf, got);
  CloseHandle(file);
  return out;
}

std::string Narrow(const std::wstring& wide) {
  if (wide.empty()) return {};
  int n = WideCharToMultiByte(CP_UTF8, 0, wide.data(), static_cast<int>(wide.size()), nullptr, 0, nullptr, nullptr);
  std::string out(static_cast<size_t>(n), '\0');
  WideCharToMultiByte(CP_UTF8, 0, wide.data(), static_cast<int>(wide.size()), out.data(), n, nullptr, nullptr);
  return out;
}

std::wstring Widen(const std::string& utf8) {
  if (utf8.empty()) return {};
  int n = MultiByteToWideChar(CP_UTF8, 0, utf8.data(), static_cast<int>(utf8.size()), nullptr, 0);
  std::wstring out(static_cast<size_t>(n), L'\0');
  MultiByteToWideChar(CP_UTF8, 0, utf8.data(), static_cast<int>(utf8.size()), out.data(), n);
  return out;
}

}  // namespace wintest
