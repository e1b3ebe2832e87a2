// The outside world for the native build: a registry kept in a REGEDIT4
// text file, and Windows paths mapped into a sandbox folder.
#pragma once

#include <filesystem>
#include <functional>
#include <map>
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
class SandboxFileSystem final : public platform::FileSystem {
 public:
  explicit SandboxFileSystem(std::filesystem::path sandbox);

  bool Exists(std::string_view path) override;
  bool DeleteFile(std::string_view path) override;
  bool AppendComposed(std::string_view path, const std::function<std::string()>& compose) override;
  // The native code page is UTF-8: the bytes come back as they are.
  std::string ReadText(std::string_view path) override;

  std::filesystem::path HostPath(std::string_view windowsPath) const;
  const std::filesystem::path& sandbox() const { return sandbox_; }

 private:
  std::filesystem::path Resolve(const std::filesystem::path& folder, const std::string& name) const;

  std::filesystem::path sandbox_;
  // A folder's names by their lower-case form: a name that is not there as
  // written is looked up here rather than by listing the folder each time.
  // Each folder is listed once, when first needed; every name handed out
  // for a place that does not exist yet is added, since it may be made
  // next. The sandbox changes only through such names, so a listing stays
  // complete; names since deleted are checked for on the disk.
  using Spellings = std::unordered_map<std::string, std::vector<std::string>>;
  mutable std::unordered_map<std::string, Spellings> listings_;
  std::optional<uint32_t> GetAttributes(std::string_view path) override;
  bool SetAttributes(std::string_view path, uint32_t attributes) override;
  bool RemoveFile(std::string_view path) override;
  bool MoveFile(std::string_view from, std::string_view to) override;
  std::optional<platform::DateTime> FileDateTime(std::string_view path) override;
  bool ReplaceText(std::string_view path, std::string_view text) override;
  platform::FileHandle OpenForTimes(std::string_view path) override;
  bool GetFileTimes(platform::FileHandle file, platform::FileTimes& times) override;
  bool SetFileTimes(platform::FileHandle file, const platform::FileTimes& times) override;
  void CloseFile(platform::FileHandle file) override;
  const platform::FileError& LastError() override;
};

// Child processes of this machine.
class PosixProcesses final : public platform::Processes {
 public:
  bool CreateProcess(std::string_view applicationName, std::string_view commandLine,
                     platform::ProcessRecord& record) override;
  uint32_t WaitForInputIdle(int64_t process, uint32_t milliseconds) override;
  uint32_t WaitForSingleObject(int64_t handle, uint32_t milliseconds) override;
  bool GetExitCodeProcess(int64_t process, uint32_t& exitCode) override;
  bool CloseHandle(int64_t handle) override;
  uint32_t LastError() override;
};

// The machine's clock in local time.
class SystemClock final : public platform::Clock {
 public:
  float Timer() override;
  platform::DateTime Now() override;
  void Sleep(uint32_t milliseconds) override;
  std::optional<platform::FileTime> SystemFileTime() override;
};

}  // namespace kpx::posix
