#include "platform/win32/win32_machine.h"

#include <cstdio>
#include <vector>

#include "automation/vb_strings.h"
#include "platform/win32/win32_api.h"
#include "platform/win32/win32_strings.h"

namespace kpx::win32 {

namespace {

using doctor::Hive;
using doctor::PathKind;
using doctor::View;

HKEY Root(Hive hive) {
  switch (hive) {
    case Hive::ClassesRoot: return HKEY_CLASSES_ROOT;
    case Hive::LocalMachine: return HKEY_LOCAL_MACHINE;
    case Hive::CurrentUser: return HKEY_CURRENT_USER;
  }
  return HKEY_LOCAL_MACHINE;
}

// The view flag opens the same key a program of that bitness would see; on
// 32-bit Windows both flags are ignored.
REGSAM ViewFlag(View view) { return view == View::Bits32 ? KEY_WOW64_32KEY : KEY_WOW64_64KEY; }

bool Redirected(std::string_view classesKey) {
  for (std::string_view top : {"CLSID", "Interface"}) {
    if (classesKey.size() >= top.size() && EqualsNoCase(classesKey.substr(0, top.size()), top) &&
        (classesKey.size() == top.size() || classesKey[top.size()] == '\\'))
      return true;
  }
  return false;
}

class Key {
 public:
  // HKEY_CLASSES_ROOT is read as what it merges, the user's classes over the
  // machine's: opened directly, a 64-bit program's view flags are not
  // honoured everywhere (Wine ignores them there).
  Key(View view, Hive hive, std::string_view path, REGSAM access) {
    const std::wstring wide = Utf8ToWide(path);
    if (hive != Hive::ClassesRoot) {
      Open(Root(hive), wide, access | ViewFlag(view));
      return;
    }
    for (REGSAM flag : {ViewFlag(view), REGSAM(0)}) {
      Open(HKEY_CURRENT_USER, L"Software\\Classes\\" + wide, access | flag);
      if (!handle_) Open(HKEY_LOCAL_MACHINE, L"Software\\Classes\\" + wide, access | flag);
      // Only class ids and interfaces are kept apart per view; ProgIDs and
      // type libraries are one key for both, which Wine does not find
      // through the other view's flag.
      if (handle_ || Redirected(path)) break;
    }
  }
  ~Key() {
    if (handle_) RegCloseKey(handle_);
  }
  Key(const Key&) = delete;
  Key& operator=(const Key&) = delete;
  HKEY get() const { return handle_; }

 private:
  void Open(HKEY root, const std::wstring& path, REGSAM access) {
    if (RegOpenKeyExW(root, path.c_str(), 0, access, &handle_) != ERROR_SUCCESS) handle_ = nullptr;
  }
  HKEY handle_ = nullptr;
};

std::string HResultText(HRESULT hr) {
  char code[16];
  std::snprintf(code, sizeof code, "0x%08lX", static_cast<unsigned long>(hr));
  wchar_t* text = nullptr;
  DWORD n = FormatMessageW(FORMAT_MESSAGE_ALLOCATE_BUFFER | FORMAT_MESSAGE_FROM_SYSTEM | FORMAT_MESSAGE_IGNORE_INSERTS,
                           nullptr, static_cast<DWORD>(hr), 0, reinterpret_cast<wchar_t*>(&text), 0, nullptr);
  std::string out = code;
  if (n && text) {
    std::wstring message(text, n);
    while (!message.empty() && (message.back() == L'\n' || message.back() == L'\r' || message.back() == L' '))
      message.pop_back();
    out += " (" + WideToUtf8(message) + ")";
  }
  if (text) LocalFree(text);
  return out;
}

class Win32Machine final : public doctor::Machine {
 public:
  Win32Machine() { comReady_ = SUCCEEDED(CoInitializeEx(nullptr, COINIT_APARTMENTTHREADED)); }
  ~Win32Machine() override {
    if (comReady_) CoUninitialize();
  }

  int ProcessBits() override { return sizeof(void*) == 8 ? 64 : 32; }

  std::vector<View> Views() override {
    BOOL wow64 = FALSE;
    if (sizeof(void*) == 8 || (IsWow64Process(GetCurrentProcess(), &wow64) && wow64))
      return {View::Bits32, View::Bits64};
    return {View::Bits32};
  }

  std::optional<std::string> ReadString(View view, Hive hive, std::string_view key, std::string_view name) override {
    Key k(view, hive, key, KEY_QUERY_VALUE);
    if (!k.get()) return std::nullopt;
    const std::wstring wide = Utf8ToWide(name);
    DWORD type = 0, size = 0;
    if (RegQueryValueExW(k.get(), wide.c_str(), nullptr, &type, nullptr, &size) != ERROR_SUCCESS) return std::nullopt;
    if (type != REG_SZ && type != REG_EXPAND_SZ) return std::nullopt;
    std::vector<wchar_t> buffer(size / sizeof(wchar_t) + 1, L'\0');
    if (RegQueryValueExW(k.get(), wide.c_str(), nullptr, &type, reinterpret_cast<BYTE*>(buffer.data()), &size) !=
        ERROR_SUCCESS)
      return std::nullopt;
    return WideToUtf8(std::wstring(buffer.data()));
  }

  std::optional<uint32_t> ReadDword(View view, Hive hive, std::string_view key, std::string_view name) override {
    Key k(view, hive, key, KEY_QUERY_VALUE);
    if (!k.get()) return std::nullopt;
    DWORD type = 0, value = 0, size = sizeof value;
    if (RegQueryValueExW(k.get(), Utf8ToWide(name).c_str(), nullptr, &type, reinterpret_cast<BYTE*>(&value), &size) !=
            ERROR_SUCCESS ||
        type != REG_DWORD)
      return std::nullopt;
    return value;
  }

  bool KeyExists(View view, Hive hive, std::string_view key) override {
    return Key(view, hive, key, KEY_QUERY_VALUE).get() != nullptr;
  }

  bool WriteDword(View view, Hive hive, std::string_view key, std::string_view name, uint32_t value) override {
    HKEY handle = nullptr;
    if (RegCreateKeyExW(Root(hive), Utf8ToWide(key).c_str(), 0, nullptr, REG_OPTION_NON_VOLATILE,
                        KEY_SET_VALUE | ViewFlag(view), nullptr, &handle, nullptr) != ERROR_SUCCESS)
      return false;
    const DWORD v = value;
    const LONG rc =
        RegSetValueExW(handle, Utf8ToWide(name).c_str(), 0, REG_DWORD, reinterpret_cast<const BYTE*>(&v), sizeof v);
    RegCloseKey(handle);
    return rc == ERROR_SUCCESS;
  }

  PathKind Kind(std::string_view path) override {
    const DWORD attributes = GetFileAttributesW(Utf8ToWide(path).c_str());
    if (attributes == INVALID_FILE_ATTRIBUTES) return PathKind::Missing;
    return (attributes & FILE_ATTRIBUTE_DIRECTORY) ? PathKind::Folder : PathKind::File;
  }

  std::string ReadHead(std::string_view path, size_t bytes) override { return Read(path, bytes).value_or(""); }

  std::optional<std::string> ReadAll(std::string_view path) override { return Read(path, SIZE_MAX); }

  bool CanAppend(std::string_view path) override {
    const std::wstring wide = Utf8ToWide(path);
    HANDLE file = CreateFileW(wide.c_str(), FILE_APPEND_DATA, FILE_SHARE_READ | FILE_SHARE_WRITE, nullptr,
                              OPEN_EXISTING, FILE_ATTRIBUTE_NORMAL, nullptr);
    if (file == INVALID_HANDLE_VALUE && GetLastError() == ERROR_FILE_NOT_FOUND) {
      // Made only to find out, and gone again when closed.
      file = CreateFileW(wide.c_str(), FILE_APPEND_DATA | DELETE, 0, nullptr, CREATE_NEW,
                         FILE_ATTRIBUTE_NORMAL | FILE_FLAG_DELETE_ON_CLOSE, nullptr);
    }
    if (file == INVALID_HANDLE_VALUE) return false;
    CloseHandle(file);
    return true;
  }

  doctor::Creation CreateInProcess(std::string_view progId) override {
    using Outcome = doctor::Creation::Outcome;
    if (!comReady_) return {Outcome::Unavailable, "COM could not be started in this program"};
    CLSID clsid;
    HRESULT hr = CLSIDFromProgID(Utf8ToWide(progId).c_str(), &clsid);
    if (FAILED(hr)) return {Outcome::Failed, "the ProgID is not known: " + HResultText(hr)};
    IUnknown* object = nullptr;
    hr = CoCreateInstance(clsid, nullptr, CLSCTX_INPROC_SERVER, IID_IUnknown, reinterpret_cast<void**>(&object));
    if (FAILED(hr)) return {Outcome::Failed, "creation failed: " + HResultText(hr)};
    object->Release();
    return {Outcome::Created, {}};
  }

 private:
  std::optional<std::string> Read(std::string_view path, size_t limit) {
    HANDLE file = CreateFileW(Utf8ToWide(path).c_str(), GENERIC_READ, FILE_SHARE_READ | FILE_SHARE_WRITE, nullptr,
                              OPEN_EXISTING, FILE_ATTRIBUTE_NORMAL, nullptr);
    if (file == INVALID_HANDLE_VALUE) return std::nullopt;
    std::string out;
    char buffer[65536];
    DWORD got = 0;
    while (out.size() < limit && ReadFile(file, buffer, sizeof buffer, &got, nullptr) && got > 0)
      out.append(buffer, got);
    CloseHandle(file);
    if (out.size() > limit) out.resize(limit);
    return out;
  }

  bool comReady_ = false;
};

}  // namespace

std::unique_ptr<doctor::Machine> MakeWin32Machine() { return std::make_unique<Win32Machine>(); }

}  // namespace kpx::win32
