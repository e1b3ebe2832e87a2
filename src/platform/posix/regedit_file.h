// Reading and writing the REGEDIT4 text format.
#pragma once

#include <map>
#include <string>
#include <string_view>

#include "automation/vb_strings.h"
#include "platform/platform.h"

namespace kpx::posix {

// Key paths are full ("HKEY_CURRENT_USER\Software\..."); keys compare
// without regard to letter case, as Windows does. Value names too; "" is the
// default value ("@" in the file).
using RegeditValues = std::map<std::string, platform::RegistryValue, NoCaseLess>;
using RegeditData = std::map<std::string, RegeditValues, NoCaseLess>;

// The full name of a root key ("HKEY_LOCAL_MACHINE"); accepts the short
// forms HKLM and HKCU when parsing.
std::string RootKeyName(platform::RootKey root);

// Parses REGEDIT4 text. Raises std::runtime_error naming the line and the
// fault for text that is not REGEDIT4.
RegeditData ParseRegedit(std::string_view text);
std::string WriteRegedit(const RegeditData& data);

}  // namespace kpx::posix
