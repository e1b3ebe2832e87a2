#include "platform/posix/posix_platform.h"

#include <fcntl.h>
#include <signal.h>
#include <stdio.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

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

SandboxFileSystem::SandboxFileSystem(fs::path sandbox, Zone zone) : sandbox_(std::move(sandbox)), zone_(zone) {}

SandboxFileSystem::~SandboxFileSystem() {
  for (auto& [handle, file] : open_) ::close(file.fd);
}

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



namespace {

// 1601-01-01 to 1970-01-01, in seconds: where file times and Unix times meet.
constexpr int64_t kFileTimeEpochSeconds = 11644473600LL;
constexpr int64_t kTicksPerSecond = 10000000;

platform::FileTime ToFileTime(const struct timespec& t) {
  return static_cast<platform::FileTime>((static_cast<int64_t>(t.tv_sec) + kFileTimeEpochSeconds) * kTicksPerSecond +
                                         t.tv_nsec / 100);
}

struct timespec FromFileTime(platform::FileTime f) {
  struct timespec t{};
  const int64_t ticks = static_cast<int64_t>(f);
  t.tv_sec = static_cast<time_t>(ticks / kTicksPerSecond - kFileTimeEpochSeconds);
  t.tv_nsec = static_cast<long>(ticks % kTicksPerSecond) * 100;
  return t;
}

bool ReadOnlyMode(mode_t mode) { return (mode & S_IWUSR) == 0; }

mode_t CurrentUmask() {
  const mode_t mask = ::umask(0);
  ::umask(mask);
  return mask;
}

}  // namespace

std::optional<platform::FileTime> SystemClock::SystemFileTime() {
  struct timespec now{};
  if (clock_gettime(CLOCK_REALTIME, &now) != 0) return std::nullopt;
  return ToFileTime(now);
}

// ------------------------------------------------------- restore file calls

bool SandboxFileSystem::Fail(int32_t number) {
  lastError_ = {number, VbErrorDescription(number)};
  return false;
}

// What Windows reports for the same failure, as VB numbers it: a missing
// name is a missing file when its folder is there and a missing path when
// it is not.
bool SandboxFileSystem::FailErrno(int err, const fs::path& host) {
  std::error_code ec;
  switch (err) {
    case ENOENT:
      return Fail(fs::is_directory(host.parent_path(), ec) ? vberr::kFileNotFound : vberr::kPathNotFound);
    case ENOTDIR:
      return Fail(vberr::kPathNotFound);
    case EEXIST:
    case ENOTEMPTY:
      return Fail(vberr::kFileAlreadyExists);
    case EACCES:
    case EPERM:
    case EROFS:
    case ETXTBSY:
    case EBUSY:
      return Fail(vberr::kPermissionDenied);
    default:
      return Fail(vberr::kPathFileAccess);
  }
}

std::optional<SandboxFileSystem::Existing> SandboxFileSystem::ExistingFile(std::string_view path) {
  path = Win32Path(path);
  if (path.empty()) {
    Fail(vberr::kPathNotFound);
    return std::nullopt;
  }
  Existing file{HostPath(path), {}};
  if (::stat(file.host.c_str(), &file.st) != 0) {
    FailErrno(errno, file.host);
    return std::nullopt;
  }
  if (EndsWithSeparator(path) && !S_ISDIR(file.st.st_mode)) {
    Fail(vberr::kPathNotFound);
    return std::nullopt;
  }
  return file;
}

void SandboxFileSystem::Remember(const fs::path& host) {
  auto listing = listings_.find(host.parent_path().string());
  if (listing == listings_.end()) return;  // listed when first needed
  const std::string name = host.filename().string();
  std::vector<std::string>& spellings = listing->second[Folded(name)];
  if (std::find(spellings.begin(), spellings.end(), name) == spellings.end()) spellings.push_back(name);
}

std::optional<uint32_t> SandboxFileSystem::GetAttributes(std::string_view path) {
  const std::optional<Existing> file = ExistingFile(path);
  if (!file) return std::nullopt;
  const struct stat& st = file->st;
  const fs::path& host = file->host;
  constexpr uint32_t kDirectory = 0x10;
  uint32_t attributes = 0;
  if (S_ISDIR(st.st_mode)) {
    attributes = kDirectory;
  } else {
    auto kept = attributes_.find(host.string());
    attributes = kept == attributes_.end() ? platform::kAttributeArchive : kept->second;
  }
  if (ReadOnlyMode(st.st_mode)) attributes |= platform::kAttributeReadOnly;
  return attributes == 0 ? platform::kAttributeNormal : attributes;
}

bool SandboxFileSystem::SetAttributes(std::string_view path, uint32_t attributes) {
  const std::optional<Existing> file = ExistingFile(path);
  if (!file) return false;
  const struct stat& st = file->st;
  const fs::path& host = file->host;
  mode_t mode = st.st_mode & 07777;
  if (attributes & platform::kAttributeReadOnly)
    mode &= static_cast<mode_t>(~(S_IWUSR | S_IWGRP | S_IWOTH));
  else
    mode |= S_IWUSR;
  if (::chmod(host.c_str(), mode) != 0) return FailErrno(errno, host);
  // Normal stands for none; a folder's kind is not the caller's to set.
  if (!S_ISDIR(st.st_mode))
    attributes_[host.string()] = attributes & ~(platform::kAttributeReadOnly | platform::kAttributeNormal | 0x10u);
  return true;
}

bool SandboxFileSystem::RemoveFile(std::string_view path) {
  const std::optional<Existing> file = ExistingFile(path);
  if (!file) return false;
  const fs::path& host = file->host;
  struct stat st{};
  if (::lstat(host.c_str(), &st) != 0) return FailErrno(errno, host);
  if (S_ISDIR(st.st_mode)) return Fail(vberr::kPathFileAccess);
  // Checked here, not left to the system: root may delete anything.
  if (ReadOnlyMode(st.st_mode)) return Fail(vberr::kPermissionDenied);
  if (::unlink(host.c_str()) != 0) return FailErrno(errno, host);
  creation_.erase(host.string());
  attributes_.erase(host.string());
  return true;
}

bool SandboxFileSystem::MoveFile(std::string_view from, std::string_view to) {
  const std::optional<Existing> file = ExistingFile(from);
  if (!file) return false;
  const fs::path& source = file->host;
  to = Win32Path(to);
  if (to.empty() || EndsWithSeparator(to)) return Fail(vberr::kPathNotFound);
  fs::path target = HostPath(to);
  std::error_code ec;
  if (!fs::is_directory(target.parent_path(), ec)) return Fail(vberr::kPathNotFound);
  const bool sameFile = target == source;
  if (sameFile) {
    // Only the letter case changes: the name is spelt as `to` spells it.
    const std::string spelt = WindowsComponents(to).back();
    if (spelt == source.filename().string()) return Fail(vberr::kFileAlreadyExists);
    target = source.parent_path() / spelt;
    if (::rename(source.c_str(), target.c_str()) != 0) return FailErrno(errno, source);
  } else if (::renameat2(AT_FDCWD, source.c_str(), AT_FDCWD, target.c_str(), RENAME_NOREPLACE) != 0) {
    if (errno != EINVAL && errno != ENOSYS) return FailErrno(errno, target);
    // A file system without renameat2: a link refuses an existing name too.
    if (::link(source.c_str(), target.c_str()) != 0) return FailErrno(errno, target);
    ::unlink(source.c_str());
  }
  Remember(target);
  // What the sandbox keeps beside the file goes with it.
  auto carry = [&](auto& kept) {
    if (auto entry = kept.extract(source.string())) kept.insert_or_assign(target.string(), entry.mapped());
  };
  carry(creation_);
  carry(attributes_);
  return true;
}

std::optional<platform::DateTime> SandboxFileSystem::FileDateTime(std::string_view path) {
  const std::optional<Existing> file = ExistingFile(path);
  if (!file) return std::nullopt;
  std::tm tm{};
  const std::time_t t = file->st.st_mtim.tv_sec;
  if ((zone_ == Zone::Utc ? gmtime_r(&t, &tm) : localtime_r(&t, &tm)) == nullptr) {
    Fail(vberr::kPathFileAccess);
    return std::nullopt;
  }
  platform::DateTime d;
  d.year = tm.tm_year + 1900;
  d.month = tm.tm_mon + 1;
  d.day = tm.tm_mday;
  d.hour = tm.tm_hour;
  d.minute = tm.tm_min;
  d.second = std::min(tm.tm_sec, 59);
  return d;
}

bool SandboxFileSystem::ReplaceText(std::string_view path, std::string_view text) {
  path = Win32Path(path);
  if (path.empty() || EndsWithSeparator(path)) return Fail(vberr::kPathNotFound);
  const fs::path host = HostPath(path);
  std::error_code ec;
  if (!fs::is_directory(host.parent_path(), ec)) return Fail(vberr::kPathNotFound);
  struct stat old{};
  const bool existed = ::stat(host.c_str(), &old) == 0;
  if (existed && S_ISDIR(old.st_mode)) return Fail(vberr::kPathFileAccess);
  // A read-only file cannot be replaced on Windows, by anyone.
  if (existed && ReadOnlyMode(old.st_mode)) return Fail(vberr::kPermissionDenied);
  // The creation time the file had, before the new file takes its place.
  std::optional<platform::FileTime> created;
  if (existed) {
    const platform::FileHandle h = OpenForTimes(path);
    platform::FileTimes times;
    if (h != platform::kNoFile && GetFileTimes(h, times)) created = times.creation;
    if (h != platform::kNoFile) CloseFile(h);
  }

  // Hidden beside the file; built by appending, which GCC 12's optimiser
  // does not mistake for an overlapping copy as it does "." + name.
  std::string name(1, '.');
  name.append(host.filename().string()).append(".kpx~XXXXXX");
  std::string temp = (host.parent_path() / name).string();
  if (!Step(ReplaceStep::CreateTemp)) return Fail(vberr::kPathFileAccess);
  const int fd = ::mkstemp(temp.data());
  if (fd < 0) return FailErrno(errno, host);
  auto abandon = [&](int32_t number) {
    ::close(fd);
    ::unlink(temp.c_str());
    return Fail(number);
  };
  const mode_t mode = existed ? (old.st_mode & 07777) : static_cast<mode_t>(0666 & ~CurrentUmask());
  if (::fchmod(fd, mode) != 0) return abandon(vberr::kPathFileAccess);
  size_t written = 0;
  auto writeUpTo = [&](size_t end) {
    while (written < end) {
      const ssize_t n = ::write(fd, text.data() + written, end - written);
      if (n < 0 && errno == EINTR) continue;
      if (n <= 0) return false;
      written += static_cast<size_t>(n);
    }
    return true;
  };
  if (!writeUpTo(text.size() / 2) || !Step(ReplaceStep::Write) || !writeUpTo(text.size()))
    return abandon(vberr::kPathFileAccess);
  if (!Step(ReplaceStep::Close) || ::fsync(fd) != 0) return abandon(vberr::kPathFileAccess);
  if (::close(fd) != 0) {
    ::unlink(temp.c_str());
    return Fail(vberr::kPathFileAccess);
  }
  if (!Step(ReplaceStep::Rename)) {
    ::unlink(temp.c_str());
    return Fail(vberr::kPathFileAccess);
  }
  if (::rename(temp.c_str(), host.c_str()) != 0) {
    const int err = errno;
    ::unlink(temp.c_str());
    return FailErrno(err, host);
  }
  Remember(host);
  if (created) creation_[host.string()] = *created;
  return true;
}

platform::FileHandle SandboxFileSystem::OpenForTimes(std::string_view path) {
  const std::optional<Existing> file = ExistingFile(path);
  if (!file) return platform::kNoFile;
  const struct stat& st = file->st;
  const fs::path& host = file->host;
  if (S_ISDIR(st.st_mode)) {
    Fail(vberr::kPathFileAccess);
    return platform::kNoFile;
  }
  // Write access to a read-only file is refused, whoever asks.
  if (ReadOnlyMode(st.st_mode)) {
    Fail(vberr::kPermissionDenied);
    return platform::kNoFile;
  }
  const int fd = ::open(host.c_str(), O_RDWR | O_CLOEXEC);
  if (fd < 0) {
    FailErrno(errno, host);
    return platform::kNoFile;
  }
  const platform::FileHandle handle = nextHandle_++;
  open_[handle] = {fd, host.string()};
  return handle;
}

bool SandboxFileSystem::GetFileTimes(platform::FileHandle file, platform::FileTimes& times) {
  auto it = open_.find(file);
  if (it == open_.end()) return Fail(vberr::kPathFileAccess);
  struct statx sx{};
  if (::statx(it->second.fd, "", AT_EMPTY_PATH, STATX_BASIC_STATS | STATX_BTIME, &sx) != 0)
    return Fail(vberr::kPathFileAccess);
  auto fileTime = [](const struct statx_timestamp& t) {
    struct timespec ts{};
    ts.tv_sec = static_cast<time_t>(t.tv_sec);
    ts.tv_nsec = static_cast<long>(t.tv_nsec);
    return ToFileTime(ts);
  };
  times.lastAccess = fileTime(sx.stx_atime);
  times.lastWrite = fileTime(sx.stx_mtime);
  if (auto c = creation_.find(it->second.host); c != creation_.end())
    times.creation = c->second;
  else if (sx.stx_mask & STATX_BTIME)
    times.creation = fileTime(sx.stx_btime);
  else  // no birth time on this file system: the earliest time it keeps
    times.creation = std::min(fileTime(sx.stx_mtime), fileTime(sx.stx_ctime));
  return true;
}

bool SandboxFileSystem::SetFileTimes(platform::FileHandle file, const platform::FileTimes& times) {
  auto it = open_.find(file);
  if (it == open_.end()) return Fail(vberr::kPathFileAccess);
  struct timespec both[2]{};
  both[0] = FromFileTime(times.lastAccess);
  both[1] = FromFileTime(times.lastWrite);
  if (times.lastAccess == 0) both[0].tv_nsec = UTIME_OMIT;
  if (times.lastWrite == 0) both[1].tv_nsec = UTIME_OMIT;
  if (::futimens(it->second.fd, both) != 0) return FailErrno(errno, it->second.host);
  if (times.creation != 0) creation_[it->second.host] = times.creation;
  return true;
}

void SandboxFileSystem::CloseFile(platform::FileHandle file) {
  auto it = open_.find(file);
  if (it == open_.end()) return;
  ::close(it->second.fd);
  open_.erase(it);
}

// --------------------------------------------------------------- processes

std::vector<std::string> SplitCommandLine(std::string_view line) {
  std::vector<std::string> words;
  size_t i = 0;
  const size_t n = line.size();
  for (;;) {
    while (i < n && (line[i] == ' ' || line[i] == '\t')) ++i;
    if (i >= n) break;
    std::string word;
    bool quoted = false;
    while (i < n && (quoted || (line[i] != ' ' && line[i] != '\t'))) {
      if (line[i] == '\\') {
        size_t slashes = 0;
        while (i < n && line[i] == '\\') ++slashes, ++i;
        if (i < n && line[i] == '"') {
          // 2n backslashes and a quote: n backslashes, and the quote
          // opens or closes; 2n+1: n backslashes and a quote.
          word.append(slashes / 2, '\\');
          if (slashes % 2) {
            word += '"';
            ++i;
          }
        } else {
          word.append(slashes, '\\');
        }
      } else if (line[i] == '"') {
        // Two quotes inside quotes stand for one.
        if (quoted && i + 1 < n && line[i + 1] == '"') {
          word += '"';
          i += 2;
        } else {
          quoted = !quoted;
          ++i;
        }
      } else {
        word += line[i++];
      }
    }
    words.push_back(std::move(word));
  }
  return words;
}

namespace {

// The Windows error a failed exec stands for.
uint32_t WindowsError(int err) {
  switch (err) {
    case ENOENT:
    case ENOTDIR:
    case ENAMETOOLONG:
    case ELOOP:
      return 2;  // ERROR_FILE_NOT_FOUND
    case EACCES:
    case EPERM:
    case EISDIR:
      return 5;  // ERROR_ACCESS_DENIED
    case ENOEXEC:
      return 193;  // ERROR_BAD_EXE_FORMAT
    case ENOMEM:
    case E2BIG:
      return 8;  // ERROR_NOT_ENOUGH_MEMORY
    default:
      return 31;  // ERROR_GEN_FAILURE
  }
}

constexpr uint32_t kErrorInvalidHandle = 6;

}  // namespace

PosixProcesses::~PosixProcesses() {
  // Children outlive the handles to them, as on Windows; only the ones that
  // have ended are collected, so none is left a zombie by us.
  for (auto& [id, handle] : handles_) Reap(*handle.child, false);
  for (auto& child : orphans_) Reap(*child, false);
}

uint32_t PosixProcesses::SignalExitCode(int signal) {
  switch (signal) {
    case SIGSEGV:
    case SIGBUS:
      return 0xC0000005u;  // access violation
    case SIGILL:
      return 0xC000001Du;  // illegal instruction
    case SIGFPE:
      return 0xC0000094u;  // integer division by zero
    default:
      return 0xC0000000u | static_cast<uint32_t>(signal);
  }
}

bool PosixProcesses::Reap(Child& child, bool block) {
  if (child.ended) return true;
  int status = 0;
  pid_t got = 0;
  do got = ::waitpid(child.pid, &status, block ? 0 : WNOHANG);
  while (got < 0 && errno == EINTR);
  if (got != child.pid) return false;
  child.ended = true;
  if (WIFEXITED(status))
    child.exitCode = static_cast<uint32_t>(WEXITSTATUS(status));
  else if (WIFSIGNALED(status))
    child.exitCode = SignalExitCode(WTERMSIG(status));
  return true;
}

PosixProcesses::Handle* PosixProcesses::Find(int64_t handle) {
  auto it = handles_.find(handle);
  if (it != handles_.end()) return &it->second;
  lastError_ = kErrorInvalidHandle;
  return nullptr;
}

bool PosixProcesses::CreateProcess(std::string_view applicationName, std::string_view commandLine,
                                   platform::ProcessRecord& record) {
  std::erase_if(orphans_, [](const std::shared_ptr<Child>& c) { return Reap(*c, false); });
  std::vector<std::string> args = SplitCommandLine(commandLine);
  const std::string program(applicationName.empty() ? (args.empty() ? "" : args.front()) : applicationName);
  if (program.empty()) {
    lastError_ = 2;
    return false;
  }
  if (args.empty()) args.push_back(program);
  std::vector<char*> argv;
  for (std::string& a : args) argv.push_back(a.data());
  argv.push_back(nullptr);

  // The child reports a failed exec through a pipe that closes on a
  // successful one.
  int report[2];
  if (::pipe2(report, O_CLOEXEC) != 0) {
    lastError_ = WindowsError(errno);
    return false;
  }
  const pid_t pid = ::fork();
  if (pid < 0) {
    lastError_ = WindowsError(errno);
    ::close(report[0]);
    ::close(report[1]);
    return false;
  }
  if (pid == 0) {
    ::close(report[0]);
    // Without an application name the program is looked for as Windows
    // looks for it, on the search path.
    if (applicationName.empty())
      ::execvp(program.c_str(), argv.data());
    else
      ::execv(program.c_str(), argv.data());
    const int err = errno;
    ssize_t ignored = ::write(report[1], &err, sizeof err);
    (void)ignored;
    ::_exit(127);
  }
  ::close(report[1]);
  int err = 0;
  ssize_t got = 0;
  do got = ::read(report[0], &err, sizeof err);
  while (got < 0 && errno == EINTR);
  ::close(report[0]);
  auto child = std::make_shared<Child>();
  child->pid = pid;
  if (got == static_cast<ssize_t>(sizeof err)) {
    Reap(*child, true);
    lastError_ = WindowsError(err);
    return false;
  }
  record.process = nextHandle_++;
  record.thread = nextHandle_++;
  record.processId = static_cast<uint32_t>(pid);
  record.threadId = static_cast<uint32_t>(pid);
  handles_[record.process] = {child, false};
  handles_[record.thread] = {child, true};
  return true;
}

// A Linux program has no message loop to wait for: it is ready at once.
uint32_t PosixProcesses::WaitForInputIdle(int64_t process, uint32_t) {
  const Handle* h = Find(process);
  if (!h || h->thread) {
    lastError_ = kErrorInvalidHandle;
    return platform::kWaitFailed;
  }
  return 0;
}

uint32_t PosixProcesses::WaitForSingleObject(int64_t handle, uint32_t milliseconds) {
  Handle* h = Find(handle);
  if (!h) return platform::kWaitFailed;
  Child& child = *h->child;
  if (milliseconds == platform::kInfinite) return Reap(child, true) ? platform::kWaitObject0 : platform::kWaitFailed;
  using namespace std::chrono;
  const auto deadline = steady_clock::now() + std::chrono::milliseconds(milliseconds);
  auto pause = std::chrono::microseconds(200);
  for (;;) {
    if (Reap(child, false)) return platform::kWaitObject0;
    const auto now = steady_clock::now();
    if (now >= deadline) return platform::kWaitTimeout;
    std::this_thread::sleep_for(std::min<steady_clock::duration>(pause, deadline - now));
    pause = std::min(pause * 2, duration_cast<std::chrono::microseconds>(std::chrono::milliseconds(20)));
  }
}

bool PosixProcesses::GetExitCodeProcess(int64_t process, uint32_t& exitCode) {
  Handle* h = Find(process);
  if (!h || h->thread) {
    lastError_ = kErrorInvalidHandle;
    return false;
  }
  Reap(*h->child, false);
  exitCode = h->child->exitCode;
  return true;
}

bool PosixProcesses::CloseHandle(int64_t handle) {
  Handle* h = Find(handle);
  if (!h) return false;
  std::shared_ptr<Child> child = h->child;
  handles_.erase(handle);
  // A child still running when its last handle goes is collected later,
  // once it has ended.
  if (child.use_count() == 1 && !Reap(*child, false)) orphans_.push_back(std::move(child));
  return true;
}

}  // namespace kpx::posix
