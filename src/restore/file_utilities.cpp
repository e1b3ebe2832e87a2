#include "restore/file_utilities.h"

#include "automation/vb_strings.h"

namespace kpx {

bool FileExists(platform::FileSystem& files, std::string_view path) {
  std::string p = Trim(path);
  while (!p.empty() && p.back() == '\\') p.pop_back();
  if (p.empty()) return false;
  if (p.size() == 2 && p[1] == ':') return files.Exists(p + "\\");
  return files.Exists(p);
}

std::string DirectoryOf(std::string_view path) {
  size_t last = InStrRev(path, "\\");
  return last == 0 ? std::string() : std::string(path.substr(0, last));
}

}  // namespace kpx
