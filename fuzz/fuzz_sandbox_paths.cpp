// Windows paths mapped into the sandbox, over a small sandbox holding a few
// folders and files in mixed case. Whatever the path, the result lies inside
// the sandbox, below a drive letter or "UNC", with no "." or ".." left. The
// mapping ignores case where the sandbox has the entry and keeps the case
// given otherwise, treats "/" as "\", stops ".." at the drive or share,
// ends the path at a NUL, and maps its own result, written back as a Windows
// path, to itself.
#include <unistd.h>

#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>
#include <string_view>
#include <vector>

#include "platform/posix/posix_platform.h"

namespace fs = std::filesystem;

namespace {

// Names the failed check before stopping, so a finding reads at once.
void Require(bool condition, int line = __builtin_LINE()) {
  if (condition) return;
  std::fprintf(stderr, "%s:%d: check failed\n", __FILE__, line);
  std::abort();
}

// Made once per process and removed at its end; the target only reads it.
class Sandbox {
 public:
  Sandbox() : root_(fs::temp_directory_path() / ("kpx-fuzz-sandbox-" + std::to_string(getpid()))) {
    fs::remove_all(root_);
    for (const char* dir : {"C/Program Files/Quarn/vc/dlls", "C/Logs", "D/Data", "UNC/Server/Share"})
      fs::create_directories(root_ / dir);
    for (const char* file : {"C/Logs/TznDebugLog.txt", "C/Program Files/Quarn/vc/dlls/kpxideaddin.dll",
                             "UNC/Server/Share/Notes.TXT"})
      std::ofstream(root_ / file) << "x";
  }
  ~Sandbox() {
    std::error_code ignored;
    fs::remove_all(root_, ignored);
  }
  const fs::path& root() const { return root_; }

 private:
  fs::path root_;
};

char Lower(char c) { return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c; }
char SwapCase(char c) {
  if (c >= 'a' && c <= 'z') return static_cast<char>(c - 'a' + 'A');
  return Lower(c);
}
bool IsSeparator(char c) { return c == '\\' || c == '/'; }

bool EqualNoCase(const std::string& a, const std::string& b) {
  if (a.size() != b.size()) return false;
  for (size_t i = 0; i < a.size(); ++i)
    if (Lower(a[i]) != Lower(b[i])) return false;
  return true;
}

// The components of `host` below the sandbox; aborts when it is not below it.
std::vector<std::string> Below(const fs::path& root, const fs::path& host) {
  auto r = root.begin();
  auto h = host.begin();
  for (; r != root.end(); ++r, ++h) Require(h != host.end() && *h == *r);
  std::vector<std::string> parts;
  for (; h != host.end(); ++h) parts.push_back(h->string());
  return parts;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  static const Sandbox sandbox;
  const fs::path& root = sandbox.root();
  kpx::posix::SandboxFileSystem files(root);
  const std::string input(reinterpret_cast<const char*>(data), size);

  // As for the Windows API, the path ends at its first NUL.
  const std::string path = input.substr(0, input.find('\0'));
  const fs::path host = files.HostPath(input);
  Require(files.HostPath(path) == host && files.Exists(input) == files.Exists(path));
  const std::vector<std::string> parts = Below(root, host);
  Require(!parts.empty());
  const bool unc = parts[0] == "UNC";
  Require(unc || (parts[0].size() == 1 && parts[0][0] >= 'A' && parts[0][0] <= 'Z'));
  for (const std::string& part : parts) {
    Require(!part.empty() && part != "." && part != "..");
    for (char c : part) Require(!IsSeparator(c));
  }

  // Case: the same place, spelled as the sandbox spells what it has.
  std::string swapped = path;
  for (char& c : swapped) c = SwapCase(c);
  const fs::path swappedHost = files.HostPath(swapped);
  Require(EqualNoCase(swappedHost.string(), host.string()));
  const bool exists = files.Exists(path);
  Require(files.Exists(swapped) == exists);
  if (exists) Require(swappedHost == host);

  // Either separator.
  std::string slashes = path;
  for (char& c : slashes)
    if (c == '\\') c = '/';
  Require(files.HostPath(slashes) == host);

  // Written back as a Windows path, the result maps to itself.
  std::string windows = unc ? "\\\\" : parts[0] + ":\\";
  for (size_t i = 1; i < parts.size(); ++i) windows += (i > 1 ? "\\" : "") + parts[i];
  Require(files.HostPath(windows) == host);

  // ".." climbs one folder, never above the drive or the share. A single
  // separator doubled would start a UNC path instead.
  if (!(path.size() == 1 && IsSeparator(path[0]))) {
    const size_t fixed = unc ? 3 : 1;
    Require(files.HostPath(path + "\\..") == (parts.size() > fixed ? host.parent_path() : host));
  }
  return 0;
}
