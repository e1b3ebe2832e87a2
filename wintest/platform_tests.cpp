#include "platform_tests.h"

#include <cstdio>
#include <cstdlib>
#include <string>

#include "automation/automation_error.h"
#include "check.h"
#include "platform/win32/win32_platform.h"
#include "system.h"

namespace wintest {

namespace {

using kpx::platform::FileTimes;
using kpx::win32::Win32FileSystem;

bool WriteBytes(const std::string& path, const std::string& bytes) {
  HANDLE file = CreateFileA(path.c_str(), GENERIC_WRITE, 0, nullptr, CREATE_ALWAYS, FILE_ATTRIBUTE_NORMAL, nullptr);
  if (file == INVALID_HANDLE_VALUE) return false;
  DWORD written = 0;
  const BOOL ok = WriteFile(file, bytes.data(), static_cast<DWORD>(bytes.size()), &written, nullptr);
  CloseHandle(file);
  return ok && written == bytes.size();
}

// How many entries the folder holds besides "." and "..".
int FilesIn(const std::string& folder) {
  WIN32_FIND_DATAA found;
  HANDLE search = FindFirstFileA((folder + "\\*").c_str(), &found);
  if (search == INVALID_HANDLE_VALUE) return 0;
  int n = 0;
  do {
    if (std::string(found.cFileName) != "." && std::string(found.cFileName) != "..") ++n;
  } while (FindNextFileA(search, &found));
  FindClose(search);
  return n;
}

void ClearFolder(const std::string& folder) {
  WIN32_FIND_DATAA found;
  HANDLE search = FindFirstFileA((folder + "\\*").c_str(), &found);
  if (search == INVALID_HANDLE_VALUE) return;
  do {
    const std::string path = folder + "\\" + found.cFileName;
    SetFileAttributesA(path.c_str(), FILE_ATTRIBUTE_NORMAL);
    DeleteFileA(path.c_str());
  } while (FindNextFileA(search, &found));
  FindClose(search);
}

bool ErrorIs(Win32FileSystem& files, int32_t number) {
  return files.LastError().number == number && files.LastError().description == kpx::VbErrorDescription(number) &&
         !files.LastError().description.empty();
}

std::optional<FileTimes> TimesOf(Win32FileSystem& files, const std::string& path) {
  const kpx::platform::FileHandle h = files.OpenForTimes(path);
  if (h == kpx::platform::kNoFile) return std::nullopt;
  FileTimes times;
  const bool ok = files.GetFileTimes(h, times);
  files.CloseFile(h);
  if (!ok) return std::nullopt;
  return times;
}

// A local time as the file time (UTC) that shows it.
kpx::platform::FileTime FileTimeOfLocal(WORD year, WORD month, WORD day, WORD hour, WORD minute, WORD second) {
  SYSTEMTIME local = {};
  local.wYear = year, local.wMonth = month, local.wDay = day, local.wHour = hour, local.wMinute = minute,
  local.wSecond = second;
  FILETIME localFile, utc;
  SystemTimeToFileTime(&local, &localFile);
  LocalFileTimeToFileTime(&localFile, &utc);
  return (static_cast<uint64_t>(utc.dwHighDateTime) << 32) | utc.dwLowDateTime;
}

}  // namespace

void FileMembersTests(const std::string& scratch) {
  Group("Win32 files: attributes, removal, moves, dates, atomic replace and file times, failures as VB's errors");
  const std::string folder = scratch + "\\files";
  CreateDirectoryA(folder.c_str(), nullptr);
  ClearFolder(folder);
  Win32FileSystem files;
  const std::string a = folder + "\\a.cpp", b = folder + "\\b.cpp";

  // Missing files and folders say which.
  CHECK(!files.GetAttributes(a));
  CHECK(ErrorIs(files, kpx::vberr::kFileNotFound));
  CHECK(!files.GetAttributes(folder + "\\no such folder\\a.cpp"));
  CHECK(ErrorIs(files, kpx::vberr::kPathNotFound));
  CHECK(!files.RemoveFile(a));
  CHECK(ErrorIs(files, kpx::vberr::kFileNotFound));
  CHECK(!files.FileDateTime(a));
  CHECK(ErrorIs(files, kpx::vberr::kFileNotFound));
  CHECK_EQ(files.OpenForTimes(a), kpx::platform::kNoFile);
  CHECK(ErrorIs(files, kpx::vberr::kFileNotFound));

  // A read-only file is refused by Kill until its bit is cleared.
  CHECK(WriteBytes(a, "a"));
  CHECK(files.SetAttributes(a, kpx::platform::kAttributeReadOnly | kpx::platform::kAttributeArchive));
  std::optional<uint32_t> attributes = files.GetAttributes(a);
  CHECK(attributes && (*attributes & kpx::platform::kAttributeReadOnly));
  CHECK(!files.RemoveFile(a));
  CHECK(ErrorIs(files, kpx::vberr::kPermissionDenied));
  CHECK(GetFileAttributesA(a.c_str()) != INVALID_FILE_ATTRIBUTES);

  // A move keeps attributes and times, and never replaces its target.
  const kpx::platform::FileTime written = FileTimeOfLocal(2021, 3, 4, 5, 6, 7);
  CHECK(files.SetAttributes(a, kpx::platform::kAttributeNormal));
  kpx::platform::FileHandle h = files.OpenForTimes(a);
  CHECK(h != kpx::platform::kNoFile);
  FileTimes before;
  CHECK(files.GetFileTimes(h, before));
  CHECK(files.SetFileTimes(h, {before.creation, written, written}));
  files.CloseFile(h);
  CHECK(files.SetAttributes(a, kpx::platform::kAttributeReadOnly));
  CHECK(WriteBytes(b, "b"));
  CHECK(!files.MoveFile(a, b));
  CHECK(ErrorIs(files, kpx::vberr::kFileAlreadyExists));
  CHECK_EQ(ReadFileBytes(Widen(b)), std::string("b"));
  CHECK_EQ(ReadFileBytes(Widen(a)), std::string("a"));
  CHECK(files.RemoveFile(b));
  CHECK(files.MoveFile(a, b));
  CHECK(!files.GetAttributes(a));
  attributes = files.GetAttributes(b);
  CHECK(attributes && (*attributes & kpx::platform::kAttributeReadOnly));
  CHECK(!files.MoveFile(a, b));
  CHECK(ErrorIs(files, kpx::vberr::kFileNotFound));
  // FileDateTime: the last write, in local time, to the second.
  std::optional<kpx::platform::DateTime> date = files.FileDateTime(b);
  CHECK(date && date->year == 2021 && date->month == 3 && date->day == 4 && date->hour == 5 && date->minute == 6 &&
        date->second == 7);

  // Replacing the text of a read-only file fails and leaves it as it was,
  // with no temporary left beside it.
  CHECK_EQ(FilesIn(folder), 1);
  CHECK(!files.ReplaceText(b, "new"));
  CHECK(ErrorIs(files, kpx::vberr::kPermissionDenied));
  CHECK_EQ(ReadFileBytes(Widen(b)), std::string("a"));
  CHECK_EQ(FilesIn(folder), 1);
  CHECK(files.SetAttributes(b, kpx::platform::kAttributeNormal));
  // Replaced whole, in the ANSI code page, shorter than before too.
  CHECK(files.ReplaceText(b, "Gr\xC3\xBC\xC3\x9F" "e\r\nline two\r\n"));
  CHECK_EQ(ReadFileBytes(Widen(b)), std::string("Gr\xFC\xDF" "e\r\nline two\r\n"));
  CHECK(files.ReplaceText(b, "x"));
  CHECK_EQ(ReadFileBytes(Widen(b)), std::string("x"));
  CHECK(files.ReplaceText(b, ""));
  CHECK_EQ(ReadFileBytes(Widen(b)), std::string());
  CHECK_EQ(FilesIn(folder), 1);
  CHECK(!files.ReplaceText(folder + "\\no such folder\\b.cpp", "x"));
  if (!CHECK(ErrorIs(files, kpx::vberr::kPathNotFound))) std::printf("  error %d\n", files.LastError().number);
  // A file open elsewhere without sharing its writing cannot be replaced.
  HANDLE held = CreateFileA(b.c_str(), GENERIC_READ, FILE_SHARE_READ, nullptr, OPEN_EXISTING, 0, nullptr);
  CHECK(held != INVALID_HANDLE_VALUE);
  CHECK(!files.ReplaceText(b, "while held"));
  CHECK(ErrorIs(files, kpx::vberr::kPermissionDenied));
  CloseHandle(held);
  CHECK_EQ(ReadFileBytes(Widen(b)), std::string());
  CHECK_EQ(FilesIn(folder), 1);

  // Whether the file system keeps a creation time apart from the others
  // (Wine's Unix file systems derive it from them).
  h = files.OpenForTimes(b);
  FileTimes set;
  CHECK(files.GetFileTimes(h, set));
  const kpx::platform::FileTime y2001 = FileTimeOfLocal(2001, 1, 2, 3, 4, 5), y2002 = FileTimeOfLocal(2002, 1, 2, 3, 4, 5);
  CHECK(files.SetFileTimes(h, {y2001, y2002, y2002}));
  files.CloseFile(h);
  std::optional<FileTimes> probe = TimesOf(files, b);
  CHECK(probe && probe->lastWrite == y2002);
  const bool keepsCreation = probe && probe->creation == y2001;

  // Touched as a restore touches it: the creation time stays, the last
  // write and access become now. The file is shared for reading only
  // while open for its times.
  std::optional<FileTimes> old = TimesOf(files, b);
  CHECK(old.has_value());
  h = files.OpenForTimes(b);
  CHECK(h != kpx::platform::kNoFile);
  CHECK_EQ(files.OpenForTimes(b), kpx::platform::kNoFile);
  CHECK(ErrorIs(files, kpx::vberr::kPermissionDenied));
  HANDLE reader = CreateFileA(b.c_str(), GENERIC_READ, FILE_SHARE_READ | FILE_SHARE_WRITE, nullptr, OPEN_EXISTING, 0,
                              nullptr);
  CHECK(reader != INVALID_HANDLE_VALUE);
  CloseHandle(reader);
  FileTimes times;
  CHECK(files.GetFileTimes(h, times));
  std::optional<kpx::platform::FileTime> now = kpx::win32::Win32Clock().SystemFileTime();
  CHECK(now.has_value());
  FILETIME system;
  GetSystemTimeAsFileTime(&system);
  const uint64_t systemNow = (static_cast<uint64_t>(system.dwHighDateTime) << 32) | system.dwLowDateTime;
  CHECK(now && *now <= systemNow && systemNow - *now < 20000000u);  // within two seconds
  const kpx::platform::FileTime touched = now.value_or(0);
  CHECK(files.SetFileTimes(h, {times.creation, touched, touched}));
  files.CloseFile(h);
  std::optional<FileTimes> after = TimesOf(files, b);
  if (keepsCreation)
    CHECK(after && old && after->creation == old->creation);
  else
    std::printf("  this file system keeps no creation time of its own: the touch's creation time not checked\n");
  // The system keeps times to its own grain (100 ns on NTFS, coarser elsewhere).
  const auto within = [](uint64_t x, uint64_t y) { return (x > y ? x - y : y - x) < 10000000u; };
  CHECK(after && within(after->lastWrite, touched) && within(after->lastAccess, touched));
  CHECK(after && old && after->lastWrite > old->lastWrite);
  // A closed handle's times are a failure, not a crash.
  CHECK(!files.GetFileTimes(h, times));
  CHECK(files.RemoveFile(b));
  RemoveDirectoryA(folder.c_str());
}

void ProcessMembersTests(const std::string& child) {
  Group("Win32 child processes: exit codes, a program that cannot start, a time-out that leaves the child running");
  kpx::win32::Win32Processes processes;
  using kpx::platform::ProcessRecord;

  // Runs the child with `arguments` and waits up to `wait` ms; the wait's
  // result and the exit code.
  const auto run = [&](const std::string& arguments, uint32_t wait, uint32_t* exitCode) {
    ProcessRecord record;
    if (!processes.CreateProcess(child, "\"" + child + "\" " + arguments, record)) return uint32_t{0xDEAD};
    CHECK(record.process != 0 && record.thread != 0 && record.processId != 0 && record.threadId != 0);
    processes.WaitForInputIdle(record.process, kpx::platform::kInfinite);
    CHECK(processes.CloseHandle(record.thread));
    const uint32_t result = processes.WaitForSingleObject(record.process, wait);
    if (result == kpx::platform::kWaitObject0) CHECK(processes.GetExitCodeProcess(record.process, *exitCode));
    if (result == kpx::platform::kWaitTimeout) {
      // Still running: the child is ended here, not by the members.
      uint32_t code = 0;
      CHECK(processes.GetExitCodeProcess(record.process, code));
      CHECK_EQ(code, uint32_t{STILL_ACTIVE});
      TerminateProcess(reinterpret_cast<HANDLE>(static_cast<intptr_t>(record.process)), 9);
      ::WaitForSingleObject(reinterpret_cast<HANDLE>(static_cast<intptr_t>(record.process)), 5000);
    }
    CHECK(processes.CloseHandle(record.process));
    return result;
  };
  uint32_t code = 77;
  CHECK_EQ(run("exit 0", 30000, &code), kpx::platform::kWaitObject0);
  CHECK_EQ(code, 0u);
  CHECK_EQ(run("exit 3", 30000, &code), kpx::platform::kWaitObject0);
  CHECK_EQ(code, 3u);
  CHECK_EQ(run("exit 0xC0000005", 30000, &code), kpx::platform::kWaitObject0);
  CHECK_EQ(code, 0xC0000005u);
  CHECK_EQ(run("sleep 60000", 300, &code), kpx::platform::kWaitTimeout);
  // The command line alone names the program when the application name is empty.
  ProcessRecord record;
  CHECK(processes.CreateProcess("", "\"" + child + "\" exit 5", record));
  CHECK_EQ(processes.WaitForSingleObject(record.process, 30000), kpx::platform::kWaitObject0);
  CHECK(processes.GetExitCodeProcess(record.process, code));
  CHECK_EQ(code, 5u);
  CHECK(processes.CloseHandle(record.thread));
  CHECK(processes.CloseHandle(record.process));

  // A program that is not there: the system's own reason, nothing filled in.
  ProcessRecord none;
  CHECK(!processes.CreateProcess("C:\\no such folder\\missing.exe", "missing.exe 1", none));
  const uint32_t error = processes.LastError();
  CHECK(error == ERROR_FILE_NOT_FOUND || error == ERROR_PATH_NOT_FOUND);
  CHECK(none.process == 0 && none.thread == 0 && none.processId == 0);
  // A wait on no handle fails, and says why.
  CHECK_EQ(processes.WaitForSingleObject(0, 0), kpx::platform::kWaitFailed);
  CHECK_EQ(processes.LastError(), uint32_t{ERROR_INVALID_HANDLE});
  CHECK(!processes.CloseHandle(0));
}

}  // namespace wintest
