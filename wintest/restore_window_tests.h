// The add-in's Restore and module dependency windows, shown through the
// Win32 platform from the templates in the loaded kpxaddin.dll, read and
// played as a user would.
#pragma once

#include "platform/win32/win32_api.h"

#include <string>

namespace wintest {

// `scratch`: a folder for the backups the add-in's own form lists.
void RestoreWindowTests(HMODULE addin, const std::string& scratch);

}  // namespace wintest
