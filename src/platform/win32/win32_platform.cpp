#include "platform/win32/win32_platform.h"

#include "automation/automation_error.h"
#include "platform/win32/com_errors.h"
#include "platform/win32/dispatch_object.h"
#include "platform/win32/dependency_window.h"
#include "platform/win32/prompt_window.h"
#include "platform/win32/restore_window.h"
#include "platform/win32/win32_strings.h"
#include "shared/resource_strings.h"

namespace kpx::win32 {

namespace {

HKEY RootHandle(platform::RootKey root) {
  return reinterpret_cast<HKEY>(static_cast<ULONG_PTR>(static_cast<LONG>(static_cast<uint32_t>(root))));
}

constexpr REGSAM kReadAccess = 0x20009;   // READ_CONTROL | KEY_QUERY_VALUE | KEY_ENUMERATE_SUB_KEYS
constexpr REGSAM kWriteAccess = 0x20006;  // KEY_WRITE

}  // namespace

// ---------------------------------------------------------------- registry

std::optional<platform::RegistryValue> Win32Registry::QueryValue(platform::RootKey root, std::string_view key,
                                                                 std::string_view name) {
  const std::string ansiKey = ToAnsi(key);
  const std::string ansiName = ToAnsi(name);
  HKEY handle = nullptr;
  if (RegOpenKeyExA(RootHandle(root), ansiKey.c_str(), 0, kReadAccess, &handle) != ERROR_SUCCESS) return std::nullopt;
  std::optional<platform::RegistryValue> result;
  // Most values fit a small buffer: one query then, where asking for the
  // size first would take two (each a round trip to the registry's keeper).
  // A larger value is read again into a buffer of its size.
  DWORD type = 0;
  std::string data(256, '\0');
  DWORD size = static_cast<DWORD>(data.size());
  LONG rc = RegQueryValueExA(handle, ansiName.c_str(), nullptr, &type, reinterpret_cast<BYTE*>(data.data()), &size);
  if (rc == ERROR_MORE_DATA) {
    data.assign(size, '\0');
    rc = RegQueryValueExA(handle, ansiName.c_str(), nullptr, &type, reinterpret_cast<BYTE*>(data.data()), &size);
  }
  if (rc == ERROR_SUCCESS) {
    data.resize(size);
    result = platform::RegistryValue{type, std::move(data)};
  }
  RegCloseKey(handle);
  return result;
}

bool Win32Registry::SetValue(platform::RootKey root, std::string_view key, std::string_view name,
                             const platform::RegistryValue& value) {
  const std::string ansiKey = ToAnsi(key);
  const std::string ansiName = ToAnsi(name);
  HKEY handle = nullptr;
  if (RegOpenKeyExA(RootHandle(root), ansiKey.c_str(), 0, kWriteAccess, &handle) != ERROR_SUCCESS) return false;
  LONG rc = RegSetValueExA(handle, ansiName.c_str(), 0, value.type, reinterpret_cast<const BYTE*>(value.data.data()),
                           static_cast<DWORD>(value.data.size()));
  RegCloseKey(handle);
  return rc == ERROR_SUCCESS;
}

platform::KeyDisposition Win32Registry::CreateKey(platform::RootKey root, std::string_view key) {
  const std::string ansiKey = ToAnsi(key);
  HKEY handle = nullptr;
  DWORD disposition = 0;
  if (RegCreateKeyExA(RootHandle(root), ansiKey.c_str(), 0, nullptr, REG_OPTION_NON_VOLATILE, KEY_ALL_ACCESS, nullptr,
                      &handle, &disposition) != ERROR_SUCCESS)
    return platform::KeyDisposition::Failed;
  RegCloseKey(handle);
  return disposition == REG_CREATED_NEW_KEY ? platform::KeyDisposition::Created : platform::KeyDisposition::Opened;
}

std::string Win32Registry::ToAnsi(std::string_view utf8) { return Utf8ToAnsi(utf8); }
std::string Win32Registry::FromAnsi(std::string_view ansi) { return AnsiToUtf8(ansi); }

// ------------------------------------------------------------------- files

bool Win32FileSystem::Exists(std::string_view path) {
  return GetFileAttributesA(Utf8ToAnsi(path).c_str()) != INVALID_FILE_ATTRIBUTES;
}

bool Win32FileSystem::DeleteFile(std::string_view path) { return DeleteFileA(Utf8ToAnsi(path).c_str()) != 0; }

bool Win32FileSystem::AppendComposed(std::string_view path, const std::function<std::string()>& compose) {
  // Others (the sibling add-ins, a viewer) may have the log open too.
  HANDLE file = CreateFileA(Utf8ToAnsi(path).c_str(), FILE_APPEND_DATA, FILE_SHARE_READ | FILE_SHARE_WRITE, nullptr,
                            OPEN_ALWAYS, FILE_ATTRIBUTE_NORMAL, nullptr);
  if (file == INVALID_HANDLE_VALUE) return false;
  const std::string ansi = Utf8ToAnsi(compose());
  DWORD written = 0;
  const BOOL ok = WriteFile(file, ansi.data(), static_cast<DWORD>(ansi.size()), &written, nullptr);
  const BOOL closed = CloseHandle(file);
  return ok && closed && written == ansi.size();
}

std::string Win32FileSystem::ReadText(std::string_view path) {
  // Others may have the file open, even for writing, as an editor does.
  HANDLE file = CreateFileA(Utf8ToAnsi(path).c_str(), GENERIC_READ, FILE_SHARE_READ | FILE_SHARE_WRITE, nullptr,
                            OPEN_EXISTING, FILE_ATTRIBUTE_NORMAL, nullptr);
  if (file == INVALID_HANDLE_VALUE) {
    // What VB's Open raises for each: a folder, a locked file and the like
    // are all "Path/File access error".
    switch (GetLastError()) {
      case ERROR_FILE_NOT_FOUND: throw AutomationError(vberr::kFileNotFound);
      case ERROR_PATH_NOT_FOUND: throw AutomationError(vberr::kPathNotFound);
      default: throw AutomationError(vberr::kPathFileAccess);
    }
  }
  std::string ansi;
  char buffer[16384];
  DWORD got = 0;
  BOOL ok = TRUE;
  while ((ok = ReadFile(file, buffer, sizeof buffer, &got, nullptr)) && got > 0) ansi.append(buffer, got);
  CloseHandle(file);
  if (!ok) throw AutomationError(vberr::kPathFileAccess);
  return AnsiToUtf8(ansi);
}

// ------------------------------------------------------------------- clock

float Win32Clock::Timer() {
  SYSTEMTIME t;
  GetLocalTime(&t);
  return static_cast<float>(t.wHour * 3600 + t.wMinute * 60 + t.wSecond) + static_cast<float>(t.wMilliseconds) / 1000.0f;
}

platform::DateTime Win32Clock::Now() {
  SYSTEMTIME t;
  GetLocalTime(&t);
  return {t.wYear, t.wMonth, t.wDay, t.wHour, t.wMinute, t.wSecond};
}

void Win32Clock::Sleep(uint32_t milliseconds) { ::Sleep(milliseconds); }

// ----------------------------------------------------------------- objects

namespace {

constexpr DWORD kCreateContext = CLSCTX_INPROC_SERVER | CLSCTX_LOCAL_SERVER;

[[noreturn]] void CannotCreate(HRESULT hr) {
  std::string text = SystemErrorText(hr);
  throw AutomationError(vberr::kCantCreateObject, text);
}

// The IDispatch through which to call the interface `iid` of `object`: the
// interface pointer itself when the object's type information says `iid` is
// dispatchable (a dual interface), so that calls reach that interface and
// not the object's default one; otherwise the object's IDispatch.
IDispatch* DispatchFor(IUnknown* object, const IID& iid) {
  IDispatch* fallback = nullptr;
  if (FAILED(object->QueryInterface(IID_IDispatch, reinterpret_cast<void**>(&fallback))) || !fallback)
    return nullptr;
  if (IsEqualIID(iid, IID_IDispatch) || IsEqualIID(iid, IID_IUnknown)) return fallback;
  bool dispatchable = false;
  ITypeInfo* info = nullptr;
  ITypeLib* lib = nullptr;
  UINT index = 0;
  if (SUCCEEDED(fallback->GetTypeInfo(0, LOCALE_USER_DEFAULT, &info)) && info) {
    if (SUCCEEDED(info->GetContainingTypeLib(&lib, &index)) && lib) {
      ITypeInfo* wanted = nullptr;
      if (SUCCEEDED(lib->GetTypeInfoOfGuid(iid, &wanted)) && wanted) {
        TYPEATTR* attr = nullptr;
        if (SUCCEEDED(wanted->GetTypeAttr(&attr))) {
          dispatchable = attr->typekind == TKIND_DISPATCH || (attr->wTypeFlags & TYPEFLAG_FDUAL) ||
                         (attr->wTypeFlags & TYPEFLAG_FDISPATCHABLE);
          wanted->ReleaseTypeAttr(attr);
        }
        wanted->Release();
      }
      lib->Release();
    }
    info->Release();
  }
  if (!dispatchable) return fallback;
  fallback->Release();
  object->AddRef();
  return static_cast<IDispatch*>(object);
}

}  // namespace

ObjectPtr Win32ObjectFactory::CreateObject(std::string_view progId) {
  const std::wstring wide = Utf8ToWide(progId);
  CLSID clsid;
  HRESULT hr = CLSIDFromProgID(wide.c_str(), &clsid);
  if (FAILED(hr)) CannotCreate(hr);
  IDispatch* dispatch = nullptr;
  hr = CoCreateInstance(clsid, nullptr, kCreateContext, IID_IDispatch, reinterpret_cast<void**>(&dispatch));
  if (FAILED(hr) || !dispatch) CannotCreate(FAILED(hr) ? hr : E_NOINTERFACE);
  ObjectPtr object = bridge_.Adopt(dispatch);
  dispatch->Release();
  return object;
}

ObjectPtr Win32ObjectFactory::CreateInstance(std::string_view clsidText, std::string_view iidText) {
  CLSID clsid;
  IID iid;
  if (!GuidFromString(clsidText, &clsid) || !GuidFromString(iidText, &iid)) CannotCreate(CO_E_CLASSSTRING);
  IUnknown* object = nullptr;
  HRESULT hr = CoCreateInstance(clsid, nullptr, kCreateContext, iid, reinterpret_cast<void**>(&object));
  if (FAILED(hr) || !object) CannotCreate(FAILED(hr) ? hr : E_NOINTERFACE);

  IID resourceIid;
  if (GuidFromString(kResourceInterfaceId, &resourceIid) && IsEqualIID(iid, resourceIid)) {
    // Its interface is dual: the pointer is an IDispatch whose next slot is
    // the string-by-id operation.
    auto resource = std::make_shared<EarlyBoundResourceObject>(
        bridge_, static_cast<IFirstOperationStringById*>(object), iid);
    object->Release();
    return resource;
  }

  IDispatch* dispatch = DispatchFor(object, iid);
  object->Release();
  if (!dispatch) CannotCreate(E_NOINTERFACE);
  ObjectPtr result = bridge_.Adopt(dispatch);
  dispatch->Release();
  return result;
}

// ---------------------------------------------------------- user interface

int Win32UserInterface::MessageBox(std::string_view text, std::string_view title, uint32_t style) {
  // VB's MsgBox without a title shows the project's name.
  const std::string caption = Utf8ToAnsi(title.empty() ? std::string_view("kpxAddIn") : title);
  return MessageBoxA(GetActiveWindow(), Utf8ToAnsi(text).c_str(), caption.c_str(), style);
}

platform::PromptOutcome Win32UserInterface::ShowPrompt(const platform::PromptView& view, platform::PromptHelp& help) {
  return ShowPromptWindow(resources_, GetActiveWindow(), view, help);
}

bool Win32UserInterface::WinHelp(int64_t window, std::string_view helpFile, uint32_t command, uint64_t data) {
  return WinHelpA(reinterpret_cast<HWND>(static_cast<INT_PTR>(window)), Utf8ToAnsi(helpFile).c_str(), command,
                  static_cast<ULONG_PTR>(data)) != 0;
}

ObjectPtr Win32UserInterface::LoadIconPicture(int32_t resourceId, int32_t pixels) {
  HINSTANCE module = resources_ ? resources_ : GetModuleHandleW(nullptr);
  // Not shared: the picture owns the icon and destroys it when it goes.
  HICON icon = static_cast<HICON>(
      LoadImageW(module, MAKEINTRESOURCEW(resourceId), IMAGE_ICON, pixels, pixels, LR_DEFAULTCOLOR));
  if (!icon) throw AutomationError(326, "Resource with identifier '" + std::to_string(resourceId) + "' not found");
  PICTDESC desc = {};
  desc.cbSizeofstruct = sizeof desc;
  desc.picType = PICTYPE_ICON;
  desc.icon.hicon = icon;
  IDispatch* picture = nullptr;
  HRESULT hr = OleCreatePictureIndirect(&desc, IID_IPictureDisp, TRUE, reinterpret_cast<void**>(&picture));
  if (FAILED(hr) || !picture) {
    DestroyIcon(icon);
    throw ErrorFromHResult(FAILED(hr) ? hr : E_NOINTERFACE);
  }
  // Wrapped, so that it leaves through the bridge as the picture itself.
  ObjectPtr object = bridge_.Adopt(picture);
  picture->Release();
  return object;
}

void Win32UserInterface::DoEvents() {
  // One pass over what is waiting now; a quit request is left for the
  // host's own loop.
  MSG msg;
  while (PeekMessageA(&msg, nullptr, 0, 0, PM_REMOVE)) {
    if (msg.message == WM_QUIT) {
      PostQuitMessage(static_cast<int>(msg.wParam));
      break;
    }
    TranslateMessage(&msg);
    DispatchMessageA(&msg);
  }
}


void Win32UserInterface::ShowRestoreDialog(platform::RestoreForm& form, const platform::HostPlacement& placement) {
  ShowRestoreWindow(resources_, form, placement);
}

platform::DependencyOutcome Win32UserInterface::ShowDependencyDialog(const platform::DependencyView& view) {
  return ShowDependencyWindow(resources_, GetActiveWindow(), view);
}

}  // namespace kpx::win32
