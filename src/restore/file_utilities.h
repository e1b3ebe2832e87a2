// Path helpers shared by the help commands and the restore routines.
#pragma once

#include <string>
#include <string_view>

#include "platform/platform.h"

namespace kpx {

// Whether a file or folder exists. Blanks around the path and trailing "\"
// are ignored; a bare drive ("C:") is tested as its root folder.
bool FileExists(platform::FileSystem& files, std::string_view path);

// The folder part of a path, up to and including its last "\" ("" when the
// path has none), so that a file name can be appended directly.
std::string DirectoryOf(std::string_view path);

}  // namespace kpx
