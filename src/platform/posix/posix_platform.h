// The outside world for the native build: a registry kept in a REGEDIT4
// text file, and Windows paths mapped into a sandbox folder.
#pragma once

#include <filesystem>
#include <sys/stat.h>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "platform/platform.h"
#include "platform/posix/regedit_file.h"

namespace kpx::posix {

// A registry backed by a REGEDIT4 file that a user can read and edit. The
// file is read when the object is made and written back after every change,
// or once after a batch of changes (WriteOnce). With an empty path the
// registry lives in memory only.
class FileRegistry final : public platform::Registry {
 public:
  explicit FileRegistry(std::filesystem::path file = {});

  std::optional<platform::RegistryValue> QueryValue(platform::RootKey root, std::string_view key,
                                                    std::string_view name) override;
  bool SetValue(platform::RootKey root, std::string_view key, std::string_view name,
                const platform::RegistryValue& value) override;
  platform::KeyDisposition CreateKey(platform::RootKey root, std::string_view key) override;
  // The native build's code page is UTF-8: text passes unchanged.
  std::string ToAnsi(std::string_view utf8) override { return std::string(utf8); }
  std::string FromAnsi(std::string_view ansi) override { return std::string(ansi); }

  RegeditData& data() { return data_; }
  // Writes the file (nothing to do without one); raises std::runtime_error
  // when it cannot be written, leaving the previous file as it was.
  void Save();
  // Makes `changes` and writes the file once, after them, rather than after
  // each: seeding thousands of values would otherwise write the whole file
  // thousands of times. When the file cannot be written the changes are
  // taken back, so memory and file still agree, and std::runtime_error is
  // raised.
  void WriteOnce(const std::function<void()>& changes);

 private:
  // "HKEY_...\key"; nothing for a root this registry does not hold.
  static std::optional<std::string> FullKey(platform::RootKey root, std::string_view key);
  bool KeyExists(const std::string& fullKey) const;

  std::filesystem::path file_;
  RegeditData data_;
  bool holding_ = false;  // inside WriteOnce
};

// Windows paths ("C:\dir\f.txt") map to <sandbox>/C/dir/f.txt; a path
// without a drive letter is taken relative to the sandbox's "C" drive. As
// for the Windows API, a path ends at its first NUL.
//
// What Windows keeps of a file that a Linux file system cannot hold is kept
// here, by the file's place in the sandbox: its creation time (Linux cannot
// set one) and its attribute bits other than read-only. Read-only is the
// owner's write bit, so that it survives in the sandbox itself; the file
// system refuses what Windows refuses of a read-only file even when the
// process could write it (as root).
class SandboxFileSystem final : public platform::FileSystem {
 public:
  // The time zone FileDateTime reads last-write times in: the machine's, or
  // UTC for runs that must not depend on where they run.
  enum class Zone { Local, Utc };
  explicit SandboxFileSystem(std::filesystem::path sandbox, Zone zone = Zone::Local);
  ~SandboxFileSystem() override;
  SandboxFileSystem(const SandboxFileSystem&) = delete;
  SandboxFileSystem& operator=(const SandboxFileSystem&) = delete;

  bool Exists(std::string_view path) override;
  bool DeleteFile(std::string_view path) override;
  bool AppendComposed(std::string_view path, const std::function<std::string()>& compose) override;
  // The native code page is UTF-8: the bytes come back as they are.
  std::string ReadText(std::string_view path) override;

  std::optional<uint32_t> GetAttributes(std::string_view path) override;
  bool SetAttributes(std::string_view path, uint32_t attributes) override;
  bool RemoveFile(std::string_view path) override;
  bool MoveFile(std::string_view from, std::string_view to) override;
  std::optional<platform::DateTime> FileDateTime(std::string_view path) override;
  // The new text goes to a temporary file beside the old one, is flushed to
  // the disk and closed, and then renamed over the old file. The file keeps
  // its creation time and attributes: to its user it is the same file.
  bool ReplaceText(std::string_view path, std::string_view text) override;
  platform::FileHandle OpenForTimes(std::string_view path) override;
  bool GetFileTimes(platform::FileHandle file, platform::FileTimes& times) override;
  // A time of 0 leaves that time as it is, as SetFileTime does.
  bool SetFileTimes(platform::FileHandle file, const platform::FileTimes& times) override;
  void CloseFile(platform::FileHandle file) override;
  const platform::FileError& LastError() override { return lastError_; }

  // The steps of ReplaceText. A hook set here is asked before each step
  // (for Write, once half the text is written); false makes the step fail
  // as the system would. Tests stop the process there to see what a crash
  // leaves behind.
  enum class ReplaceStep { CreateTemp, Write, Close, Rename };
  void SetReplaceHook(std::function<bool(ReplaceStep)> hook) { replaceHook_ = std::move(hook); }

  std::filesystem::path HostPath(std::string_view windowsPath) const;
  const std::filesystem::path& sandbox() const { return sandbox_; }

 private:
  std::filesystem::path Resolve(const std::filesystem::path& folder, const std::string& name) const;
  bool Fail(int32_t number);
  // Records why a call on `host` failed with `err` (an errno value).
  bool FailErrno(int err, const std::filesystem::path& host);
  // An existing file or folder: its host path and what stat says of it; or
  // nothing, with the error recorded.
  struct Existing {
    std::filesystem::path host;
    struct stat st;
  };
  std::optional<Existing> ExistingFile(std::string_view path);
  bool Step(ReplaceStep step) { return !replaceHook_ || replaceHook_(step); }
  // Remembers a new spelling of a name in its folder's listing.
  void Remember(const std::filesystem::path& host);

  std::filesystem::path sandbox_;
  Zone zone_;
  // A folder's names by their lower-case form: a name that is not there as
  // written is looked up here rather than by listing the folder each time.
  // Each folder is listed once, when first needed; every name handed out
  // for a place that does not exist yet is added, since it may be made
  // next. The sandbox changes only through such names, so a listing stays
  // complete; names since deleted are checked for on the disk.
  using Spellings = std::unordered_map<std::string, std::vector<std::string>>;
  mutable std::unordered_map<std::string, Spellings> listings_;

  // By host path: what Windows would keep with the file.
  std::map<std::string, platform::FileTime> creation_;
  std::map<std::string, uint32_t> attributes_;  // bits but read-only; none kept: archive
  struct OpenFile {
    int fd = -1;
    std::string host;
  };
  std::map<platform::FileHandle, OpenFile> open_;
  platform::FileHandle nextHandle_ = 0x100;
  platform::FileError lastError_;
  std::function<bool(ReplaceStep)> replaceHook_;
};

// Child processes of this machine. The application name is the program's
// path on this machine, run as it is; the command line is split as a
// Windows program's start-up code splits it, and is the child's whole
// argument list (so its first word is the child's argv[0]). Process and
// thread handles both stand for the child: a Linux child has no thread of
// its own to wait for.
class PosixProcesses final : public platform::Processes {
 public:
  PosixProcesses() = default;
  ~PosixProcesses() override;
  PosixProcesses(const PosixProcesses&) = delete;
  PosixProcesses& operator=(const PosixProcesses&) = delete;

  bool CreateProcess(std::string_view applicationName, std::string_view commandLine,
                     platform::ProcessRecord& record) override;
  uint32_t WaitForInputIdle(int64_t process, uint32_t milliseconds) override;
  uint32_t WaitForSingleObject(int64_t handle, uint32_t milliseconds) override;
  bool GetExitCodeProcess(int64_t process, uint32_t& exitCode) override;
  bool CloseHandle(int64_t handle) override;
  uint32_t LastError() override { return lastError_; }

  // The exit code a child killed by `signal` reads as: a crash status,
  // with the top bit set.
  static uint32_t SignalExitCode(int signal);
  static constexpr uint32_t kStillActive = 259;

 private:
  struct Child {
    int pid = 0;
    bool ended = false;
    uint32_t exitCode = kStillActive;
  };
  struct Handle {
    std::shared_ptr<Child> child;
    bool thread = false;
  };
  Handle* Find(int64_t handle);
  // Collects the child's status when it has ended; true once it has.
  static bool Reap(Child& child, bool block);

  std::map<int64_t, Handle> handles_;
  std::vector<std::shared_ptr<Child>> orphans_;  // no handle left, not ended yet
  int64_t nextHandle_ = 0x200;
  uint32_t lastError_ = 0;
};

// A command line split into words as Windows programs split theirs: blanks
// and tabs separate words, double quotes group them, a backslash before a
// double quote escapes it.
std::vector<std::string> SplitCommandLine(std::string_view commandLine);

// The machine's clock in local time.
class SystemClock final : public platform::Clock {
 public:
  float Timer() override;
  platform::DateTime Now() override;
  void Sleep(uint32_t milliseconds) override;
  std::optional<platform::FileTime> SystemFileTime() override;
};

}  // namespace kpx::posix
