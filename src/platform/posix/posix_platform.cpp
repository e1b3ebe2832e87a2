#include "platform/posix/posix_platform.h"

#include <algorithm>
#include <chrono>
#include <ctime>
#include <fstream>
#include <iterator>
#include <stdexcept>
#include <system_error>
#include <thread>
#include <vector>

#include "automation/automation_error.h"

namespace kpx::posix {

namespace fs = std::filesystem;

namespace {

char Lower(char c) { return (c >= 'A' && c <= 'Z') ? static_cast<char>(c - 'A' + 'a') : c; }
char Upper(char c) { return (c >= 'a' && c <= 'z') ? static_cast<char>(c - 'a' + 'A') : c; }

bool EqualNoCase(std::string_view a, std::string_view b) {
  return a.size() == b.size() &&
         std::equal(a.begin(), a.end(), b.begin(), [](char x, char y) { return Lower(x) == Lower(y); });
}

bool IsSeparator(char c) { return c == '\\' || c == '/'; }

}  // namespace

// ---------------------------------------------------------------- registry

FileRegistry::FileRegistry(fs::path file) : file_(std::move(file)) {
  if (file_.empty()) return;
  std::error_code ec;
  if (!fs::exists(file_, ec)) return;
  std::ifstream in(file_, std::ios::binary);
  if (!in) throw std::runtime_error(file_.string() + ": cannot be read");
  std::string text((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
  try {
    data_ = ParseRegedit(text);
  } catch (const std::runtime_error& e) {
    throw std::runtime_error(file_.string() + ": " + e.what());
  }
}

// Written beside the target and renamed over it, so that a failed write
// leaves the previous file whole.
void FileRegistry::Save() {
  if (file_.empty()) return;
  const std::string text = WriteRegedit(data_);
  fs::path temp = file_;
  temp += ".tmp";
  {
    std::ofstream out(temp, std::ios::binary | std::ios::trunc);
    out << text;
    out.close();
    if (!out) {
      std::error_code ignored;
      fs::remove(temp, ignored);
      throw std::runtime_error(file_.string() + ": cannot be written");
    }
  }
  std::error_code ec;
  fs::rename(temp, file_, ec);
  if (ec) {
    std::error_code ignored;
    fs::remove(temp, ignored);
    throw std::runtime_error(file_.string() + ": cannot be replaced: " + ec.message());
  }
}

std::optional<std::string> FileRegistry::FullKey(platform::RootKey root, std::string_view key) {
  std::string full = RootKeyName(root);
  if (full.empty()) return std::nullopt;
  if (!key.empty()) {
    full += '\\';
    full += key;
  }
  return full;
}

// A key exists when the file names it, when it is a root, or when the file
// names a key below it: Windows cannot hold a key without its parents.
bool FileRegistry::KeyExists(const std::string& full) const {
  if (full.find('\\') == std::string::npos) return true;
  if (data_.count(full)) return true;
  const std::string prefix = full + "\\";
  auto it = data_.lower_bound(prefix);
  return it != data_.end() && it->first.size() > prefix.size() &&
         EqualNoCase(std::string_view(it->first).substr(0, prefix.size()), prefix);
}

std::optional<platform::RegistryValue> FileRegistry::QueryValue(platform::RootKey root, std::string_view key,
                                                                std::string_view name) {
  std::optional<std::string> full = FullKey(root, key);
  if (!full) return std::nullopt;
  auto k = data_.find(*full);
  if (k == data_.end()) return std::nullopt;
  auto v = k->second.find(std::string(name));
  if (v == k->second.end()) return std::nullopt;
  return v->second;
}

void FileRegistry::WriteOnce(const std::function<void()>& changes) {
  if (holding_ || file_.empty()) {
    changes();
    return;
  }
  const RegeditData before = data_;
  holding_ = true;
  auto write = [&] {
    holding_ = false;
    try {
      Save();
    } catch (const std::exception&) {
      data_ = before;
      throw;
    }
  };
  try {
    changes();
  } catch (...) {
    write();  // what was changed before the fault stays, written
    throw;
  }
  write();
}

// The registry call either takes effect or does not: a change that cannot
// reach the file is taken back, so memory and file never disagree.
bool FileRegistry::SetValue(platform::RootKey root, std::string_view key, std::string_view name,
                            const platform::RegistryValue& value) {
  std::optional<std::string> full = FullKey(root, key);
  if (!full || !KeyExists(*full)) return false;
  RegeditValues& values = data_[*full];
  const std::string valueName(name);
  auto old = values.find(valueName);
  std::optional<platform::RegistryValue> previous;
  if (old != values.end()) previous = old->second;
  values[valueName] = value;
  if (holding_) return true;
  try {
    Save();
  } catch (const std::exception&) {
    if (previous)
      values[valueName] = *previous;
    else
      values.erase(valueName);
    return false;
  }
  return true;
}

platform::KeyDisposition FileRegistry::CreateKey(platform::RootKey root, std::string_view key) {
  std::optional<std::string> full = FullKey(root, key);
  if (!full) return platform::KeyDisposition::Failed;
  if (KeyExists(*full)) return platform::KeyDisposition::Opened;
  data_.emplace(*full, RegeditValues{});
  if (holding_) return platform::KeyDisposition::Created;
  try {
    Save();
  } catch (const std::exception&) {
    data_.erase(*full);
    return platform::KeyDisposition::Failed;
  }
  return platform::KeyDisposition::Created;
}

// ------------------------------------------------------------------- files

SandboxFileSystem::SandboxFileSystem(fs::path sandbox) : sandbox_(std::move(sandbox)) {}

namespace {

// The sandbox folders a Windows path walks through, drive or UNC first.
// Empty and "." components are dropped (a trailing backslash names the same
// folder); ".." climbs but never above the drive or share, so no path
// leaves the sandbox.
std::vector<std::string> WindowsComponents(std::string_view path) {
  std::vector<std::string> parts;
  size_t fixed = 1;
  if (path.size() >= 2 && IsSeparator(path[0]) && IsSeparator(path[1])) {
    parts.push_back("UNC");
    path.remove_prefix(2);
    fixed = 3;  // UNC, server, share
  } else if (path.size() >= 2 && path[1] == ':' &&
             ((path[0] >= 'A' && path[0] <= 'Z') || (path[0] >= 'a' && path[0] <= 'z'))) {
    parts.push_back(std::string(1, Upper(path[0])));
    path.remove_prefix(2);
  } else {
    parts.push_back("C");
  }
  while (!path.empty()) {
    size_t sep = 0;
    while (sep < path.size() && !IsSeparator(path[sep])) ++sep;
    std::string_view part = path.substr(0, sep);
    path.remove_prefix(std::min(sep + 1, path.size()));
    if (part.empty() || part == ".") continue;
    if (part == "..") {
      if (parts.size() > fixed) parts.pop_back();
      continue;
    }
    parts.emplace_back(part);
  }
  return parts;
}

std::string Folded(std::string_view name) {
  std::string out(name);
  std::transform(out.begin(), out.end(), out.begin(), Lower);
  return out;
}

bool EndsWithSeparator(std::string_view path) { return !path.empty() && IsSeparator(path.back()); }

// The Windows API reads a path up to its first NUL, and so must the sandbox:
// the host system would cut the mapped path there too, but only after the
// case-blind lookup had kept what follows, so a file could be made beside
// an existing one that differs only in case.
std::string_view Win32Path(std::string_view path) { return path.substr(0, path.find('\0')); }

}  // namespace

// The entry of `folder` that matches `name`: the exact spelling when
// present, otherwise the first (by byte order) that differs only in case.
fs::path SandboxFileSystem::Resolve(const fs::path& folder, const std::string& name) const {
  std::error_code ec;
  fs::path exact = folder / name;
  if (fs::exists(fs::symlink_status(exact, ec))) return exact;
  auto [listing, first] = listings_.try_emplace(folder.string());
  Spellings& byFolded = listing->second;
  if (first)
    for (fs::directory_iterator it(folder, ec), end; !ec && it != end; it.increment(ec)) {
      std::string entry = it->path().filename().string();
      byFolded[Folded(entry)].push_back(std::move(entry));
    }
  std::vector<std::string>& spellings = byFolded[Folded(name)];
  // Names never made, or deleted since, are dropped as they are met.
  std::erase_if(spellings, [&](const std::string& s) {
    return s != name && !fs::exists(fs::symlink_status(folder / s, ec));
  });
  const std::string* best = nullptr;
  for (const std::string& s : spellings)
    if (s != name && (!best || s < *best)) best = &s;
  if (best) return folder / *best;
  if (std::find(spellings.begin(), spellings.end(), name) == spellings.end()) spellings.push_back(name);
  return exact;
}

fs::path SandboxFileSystem::HostPath(std::string_view windowsPath) const {
  windowsPath = Win32Path(windowsPath);
  fs::path host = sandbox_;
  bool resolving = true;  // once a component is missing, nothing below it exists either
  for (const std::string& part : WindowsComponents(windowsPath)) {
    if (resolving) {
      host = Resolve(host, part);
      std::error_code ec;
      resolving = fs::is_directory(host, ec);
    } else {
      host /= part;
    }
  }
  return host;
}

bool SandboxFileSystem::Exists(std::string_view path) {
  path = Win32Path(path);
  if (path.empty()) return false;
  std::error_code ec;
  return fs::exists(HostPath(path), ec);
}

bool SandboxFileSystem::DeleteFile(std::string_view path) {
  path = Win32Path(path);
  if (path.empty() || EndsWithSeparator(path)) return false;
  const fs::path host = HostPath(path);
  std::error_code ec;
  if (!fs::is_regular_file(host, ec)) return false;
  return fs::remove(host, ec) && !ec;
}

bool SandboxFileSystem::AppendComposed(std::string_view path, const std::function<std::string()>& compose) {
  path = Win32Path(path);
  // "C:\logs\" names a folder, never a file to append to.
  if (path.empty() || EndsWithSeparator(path)) return false;
  const fs::path host = HostPath(path);
  std::error_code ec;
  // Like CreateFile, never make a missing folder on the way.
  if (!fs::is_directory(host.parent_path(), ec)) return false;
  if (fs::is_directory(host, ec)) return false;
  std::ofstream out(host, std::ios::binary | std::ios::app);
  if (!out) return false;
  const std::string text = compose();
  out.write(text.data(), static_cast<std::streamsize>(text.size()));
  out.close();
  return static_cast<bool>(out);
}

std::string SandboxFileSystem::ReadText(std::string_view path) {
  path = Win32Path(path);
  if (path.empty()) throw AutomationError(vberr::kPathNotFound);
  const fs::path host = HostPath(path);
  std::error_code ec;
  // The order in which Windows finds fault with a path: a folder cannot be
  // opened as a file, a missing folder is a missing path, and only then is
  // the file itself missing.
  if (fs::is_directory(host, ec)) throw AutomationError(vberr::kPathFileAccess);
  if (!fs::is_directory(host.parent_path(), ec)) throw AutomationError(vberr::kPathNotFound);
  if (!fs::exists(host, ec)) throw AutomationError(vberr::kFileNotFound);
  std::ifstream in(host, std::ios::binary);
  if (!in) throw AutomationError(vberr::kPathFileAccess);
  std::string text((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
  if (in.bad()) throw AutomationError(vberr::kPathFileAccess);
  return text;
}

// ------------------------------------------------------------------- clock

namespace {

struct LocalNow {
  std::tm tm{};
  double fraction = 0;  // of the current second
};

LocalNow ReadLocalNow() {
  using namespace std::chrono;
  const auto now = system_clock::now();
  const std::time_t t = system_clock::to_time_t(now);
  LocalNow local;
  localtime_r(&t, &local.tm);
  const auto sinceSecond = now - system_clock::from_time_t(t);
  local.fraction = duration<double>(sinceSecond).count();
  // to_time_t may round rather than truncate; keep the fraction in [0, 1).
  if (local.fraction < 0) local.fraction = 0;
  if (local.fraction >= 1) local.fraction = 0.999999;
  return local;
}

}  // namespace

float SystemClock::Timer() {
  const LocalNow now = ReadLocalNow();
  const int second = std::min(now.tm.tm_sec, 59);  // a leap second counts as the one before
  const double seconds = now.tm.tm_hour * 3600.0 + now.tm.tm_min * 60.0 + second + now.fraction;
  return static_cast<float>(seconds);
}

platform::DateTime SystemClock::Now() {
  const LocalNow now = ReadLocalNow();
  platform::DateTime d;
  d.year = now.tm.tm_year + 1900;
  d.month = now.tm.tm_mon + 1;
  d.day = now.tm.tm_mday;
  d.hour = now.tm.tm_hour;
  d.minute = now.tm.tm_min;
  d.second = std::min(now.tm.tm_sec, 59);
  return d;
}

void SystemClock::Sleep(uint32_t milliseconds) {
  std::this_thread::sleep_for(std::chrono::milliseconds(milliseconds));
}


// Not there yet on this platform.
std::optional<uint32_t> SandboxFileSystem::GetAttributes(std::string_view) { RaiseNotImplemented("GetAttributes"); }
bool SandboxFileSystem::SetAttributes(std::string_view, uint32_t) { RaiseNotImplemented("SetAttributes"); }
bool SandboxFileSystem::RemoveFile(std::string_view) { RaiseNotImplemented("RemoveFile"); }
bool SandboxFileSystem::MoveFile(std::string_view, std::string_view) { RaiseNotImplemented("MoveFile"); }
std::optional<platform::DateTime> SandboxFileSystem::FileDateTime(std::string_view) { RaiseNotImplemented("FileDateTime"); }
bool SandboxFileSystem::ReplaceText(std::string_view, std::string_view) { RaiseNotImplemented("ReplaceText"); }
platform::FileHandle SandboxFileSystem::OpenForTimes(std::string_view) { RaiseNotImplemented("OpenForTimes"); }
bool SandboxFileSystem::GetFileTimes(platform::FileHandle, platform::FileTimes&) { RaiseNotImplemented("GetFileTimes"); }
bool SandboxFileSystem::SetFileTimes(platform::FileHandle, const platform::FileTimes&) { RaiseNotImplemented("SetFileTimes"); }
void SandboxFileSystem::CloseFile(platform::FileHandle) { RaiseNotImplemented("CloseFile"); }
const platform::FileError& SandboxFileSystem::LastError() { RaiseNotImplemented("LastError"); }
std::optional<platform::FileTime> SystemClock::SystemFileTime() { RaiseNotImplemented("SystemFileTime"); }


bool PosixProcesses::CreateProcess(std::string_view, std::string_view, platform::ProcessRecord&) {
  RaiseNotImplemented("CreateProcess");
}
uint32_t PosixProcesses::WaitForInputIdle(int64_t, uint32_t) { RaiseNotImplemented("WaitForInputIdle"); }
uint32_t PosixProcesses::WaitForSingleObject(int64_t, uint32_t) { RaiseNotImplemented("WaitForSingleObject"); }
bool PosixProcesses::GetExitCodeProcess(int64_t, uint32_t&) { RaiseNotImplemented("GetExitCodeProcess"); }
bool PosixProcesses::CloseHandle(int64_t) { RaiseNotImplemented("CloseHandle"); }
uint32_t PosixProcesses::LastError() { RaiseNotImplemented("LastError"); }

}  // namespace kpx::posix
