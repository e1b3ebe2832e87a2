// The file operations the restore routines use, each one system call as
// VB's file statements make it, with the reason of a failure kept as the
// VB error those statements would raise.
#include "platform/win32/win32_platform.h"

#include <string>

#include "automation/automation_error.h"
#include "platform/win32/win32_strings.h"

namespace kpx::win32 {

namespace {

platform::FileTime FromFileTime(const FILETIME& t) {
  return (static_cast<uint64_t>(t.dwHighDateTime) << 32) | t.dwLowDateTime;
}

FILETIME ToFileTime(platform::FileTime t) {
  return {static_cast<DWORD>(t & 0xFFFFFFFFu), static_cast<DWORD>(t >> 32)};
}

// File and process handles cross the platform interface as 64-bit numbers.
HANDLE AsHandle(int64_t handle) { return reinterpret_cast<HANDLE>(static_cast<intptr_t>(handle)); }
int64_t FromHandle(HANDLE handle) { return static_cast<int64_t>(reinterpret_cast<intptr_t>(handle)); }

}  // namespace

platform::FileError Win32FileSystem::ErrorFromSystem(DWORD code) {
  int32_t number = vberr::kPathFileAccess;
  switch (code) {
    case ERROR_FILE_NOT_FOUND: number = vberr::kFileNotFound; break;
    case ERROR_PATH_NOT_FOUND: number = vberr::kPathNotFound; break;
    case ERROR_ACCESS_DENIED:
    case ERROR_SHARING_VIOLATION:
    case ERROR_LOCK_VIOLATION: number = vberr::kPermissionDenied; break;
    case ERROR_FILE_EXISTS:
    case ERROR_ALREADY_EXISTS: number = vberr::kFileAlreadyExists; break;
    case ERROR_HANDLE_DISK_FULL:
    case ERROR_DISK_FULL: number = vberr::kDiskFull; break;
    default: break;
  }
  return {number, VbErrorDescription(number)};
}

bool Win32FileSystem::Failed() {
  lastError_ = ErrorFromSystem(GetLastError());
  return false;
}

std::optional<uint32_t> Win32FileSystem::GetAttributes(std::string_view path) {
  const DWORD attributes = GetFileAttributesA(Utf8ToAnsi(path).c_str());
  if (attributes == INVALID_FILE_ATTRIBUTES) {
    Failed();
    return std::nullopt;
  }
  return attributes;
}

bool Win32FileSystem::SetAttributes(std::string_view path, uint32_t attributes) {
  return SetFileAttributesA(Utf8ToAnsi(path).c_str(), attributes) || Failed();
}

bool Win32FileSystem::RemoveFile(std::string_view path) { return DeleteFileA(Utf8ToAnsi(path).c_str()) || Failed(); }

bool Win32FileSystem::MoveFile(std::string_view from, std::string_view to) {
  // MoveFileA never replaces: an existing `to` is refused, as Name refuses it.
  return MoveFileA(Utf8ToAnsi(from).c_str(), Utf8ToAnsi(to).c_str()) || Failed();
}

std::optional<platform::DateTime> Win32FileSystem::FileDateTime(std::string_view path) {
  // By name, without opening the file: an editor may hold it open.
  WIN32_FILE_ATTRIBUTE_DATA data;
  FILETIME local;
  SYSTEMTIME t;
  if (!GetFileAttributesExA(Utf8ToAnsi(path).c_str(), GetFileExInfoStandard, &data) ||
      !FileTimeToLocalFileTime(&data.ftLastWriteTime, &local) || !FileTimeToSystemTime(&local, &t)) {
    Failed();
    return std::nullopt;
  }
  return platform::DateTime{t.wYear, t.wMonth, t.wDay, t.wHour, t.wMinute, t.wSecond};
}

bool Win32FileSystem::ReplaceText(std::string_view path, std::string_view text) {
  const std::string target = Utf8ToAnsi(path);
  const std::string ansi = Utf8ToAnsi(text);
  // A read-only file is refused, as writing it in place would be; not every
  // system's replacing move checks that itself.
  const DWORD attributes = GetFileAttributesA(target.c_str());
  if (attributes != INVALID_FILE_ATTRIBUTES && (attributes & FILE_ATTRIBUTE_READONLY)) {
    SetLastError(ERROR_ACCESS_DENIED);
    return Failed();
  }
  // A new file beside the old one (same folder, same volume), so that the
  // move that puts it in place is one rename, never a copy. Its name is new:
  // nothing of anyone else's is overwritten.
  std::string temporary;
  HANDLE file = INVALID_HANDLE_VALUE;
  for (int attempt = 0; attempt < 100 && file == INVALID_HANDLE_VALUE; ++attempt) {
    temporary = target + ".~kpx" + std::to_string(GetCurrentProcessId()) + "-" + std::to_string(attempt);
    file = CreateFileA(temporary.c_str(), GENERIC_WRITE, 0, nullptr, CREATE_NEW, FILE_ATTRIBUTE_NORMAL, nullptr);
    if (file == INVALID_HANDLE_VALUE && GetLastError() != ERROR_FILE_EXISTS) break;
  }
  if (file == INVALID_HANDLE_VALUE) return Failed();
  DWORD written = 0;
  bool ok = WriteFile(file, ansi.data(), static_cast<DWORD>(ansi.size()), &written, nullptr) && written == ansi.size();
  // On the disk before it takes the old file's name: a crash in between
  // must not leave an empty file where the old text was.
  ok = ok && FlushFileBuffers(file);
  if (!ok) Failed();
  if (!::CloseHandle(file) && ok) ok = Failed();
  if (ok && !MoveFileExA(temporary.c_str(), target.c_str(), MOVEFILE_REPLACE_EXISTING | MOVEFILE_WRITE_THROUGH))
    ok = Failed();
  if (!ok) DeleteFileA(temporary.c_str());  // the reason recorded stays the failure's
  return ok;
}

platform::FileHandle Win32FileSystem::OpenForTimes(std::string_view path) {
  HANDLE file = CreateFileA(Utf8ToAnsi(path).c_str(), GENERIC_READ | GENERIC_WRITE, FILE_SHARE_READ, nullptr,
                            OPEN_EXISTING, FILE_ATTRIBUTE_NORMAL, nullptr);
  if (file == INVALID_HANDLE_VALUE) {
    Failed();
    return platform::kNoFile;
  }
  return FromHandle(file);
}

bool Win32FileSystem::GetFileTimes(platform::FileHandle file, platform::FileTimes& times) {
  FILETIME creation, access, write;
  if (!GetFileTime(AsHandle(file), &creation, &access, &write)) return Failed();
  times = {FromFileTime(creation), FromFileTime(access), FromFileTime(write)};
  return true;
}

bool Win32FileSystem::SetFileTimes(platform::FileHandle file, const platform::FileTimes& times) {
  const FILETIME creation = ToFileTime(times.creation), access = ToFileTime(times.lastAccess),
                 write = ToFileTime(times.lastWrite);
  return SetFileTime(AsHandle(file), &creation, &access, &write) || Failed();
}

void Win32FileSystem::CloseFile(platform::FileHandle file) {
  if (file != platform::kNoFile) ::CloseHandle(AsHandle(file));
}

std::optional<platform::FileTime> Win32Clock::SystemFileTime() {
  SYSTEMTIME now;
  GetSystemTime(&now);
  FILETIME t;
  if (!SystemTimeToFileTime(&now, &t)) return std::nullopt;
  return FromFileTime(t);
}

// ---------------------------------------------------------- child processes

#ifndef _WIN64
// The start-up record callers and tools of the 32-bit host know.
static_assert(sizeof(STARTUPINFOA) == 68, "STARTUPINFOA is 68 bytes on x86");
#endif

bool Win32Processes::CreateProcess(std::string_view applicationName, std::string_view commandLine,
                                   platform::ProcessRecord& record) {
  const std::string application = Utf8ToAnsi(applicationName);
  // CreateProcessA may write into the command line: a copy of our own.
  std::string command = Utf8ToAnsi(commandLine);
  command.push_back('\0');
  STARTUPINFOA startup = {};
  startup.cb = sizeof startup;
  PROCESS_INFORMATION info = {};
  const BOOL ok = CreateProcessA(application.empty() ? nullptr : application.c_str(), command.data(), nullptr,
                                 nullptr, TRUE, NORMAL_PRIORITY_CLASS, nullptr, nullptr, &startup, &info);
  // What failed stays the thread's last error past the strings' release.
  const DWORD error = GetLastError();
  if (ok) record = {FromHandle(info.hProcess), FromHandle(info.hThread), info.dwProcessId, info.dwThreadId};
  SetLastError(error);
  return ok != 0;
}

uint32_t Win32Processes::WaitForInputIdle(int64_t process, uint32_t milliseconds) {
  return ::WaitForInputIdle(AsHandle(process), milliseconds);
}

uint32_t Win32Processes::WaitForSingleObject(int64_t handle, uint32_t milliseconds) {
  return ::WaitForSingleObject(AsHandle(handle), milliseconds);
}

bool Win32Processes::GetExitCodeProcess(int64_t process, uint32_t& exitCode) {
  DWORD code = 0;
  if (!::GetExitCodeProcess(AsHandle(process), &code)) return false;
  exitCode = code;
  return true;
}

bool Win32Processes::CloseHandle(int64_t handle) { return ::CloseHandle(AsHandle(handle)) != 0; }

uint32_t Win32Processes::LastError() { return GetLastError(); }

}  // namespace kpx::win32
