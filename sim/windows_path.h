// Windows paths as the files of a simulation name them ("C:\Temp\a.log").
// Files and folders are made before the run and by scenario steps; their
// paths are checked when the files are read, so that a path Windows could
// not make, or one that is a file in one place and a folder in another,
// is a fault of the file at its line rather than a failure halfway through
// a run.
#pragma once

#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

namespace kpx::sim {

// The folders a path walks through, drive first ("c"; "unc", server and
// share for \\server\share), each part in lower case: two spellings of one
// place give the same parts. Empty and "." parts are dropped; ".." climbs,
// never above the drive or share. A path without a drive lies on drive C.
// This is how the sandbox of the native build maps a path, too.
std::vector<std::string> FoldedPathParts(std::string_view path);

// What keeps a file or folder from being made at `path`; empty when
// nothing does. `file` says it is to be a file.
std::string PathFault(std::string_view path, bool file);

// The files and folders the model and the scenario make and delete, in
// the order they do it. Each step answers what is wrong with it, or "".
class PathPlan {
 public:
  std::string MakeFolder(std::string_view path);
  std::string WriteFile(std::string_view path);
  std::string RemoveFile(std::string_view path);

 private:
  enum class Kind { Folder, File };
  struct Place {
    Kind kind;
    std::string spelling;  // as first written
  };
  // The folders leading to the last part; a fault when one is a file.
  std::string MakeParents(const std::vector<std::string>& parts, size_t count, std::string_view path);
  std::unordered_map<std::string, Place> places_;  // by the parts joined with '\'
};

}  // namespace kpx::sim
