// Where Developer Studio's partner of the add-in lies and how Developer
// Studio is told of it: the add-in checks and writes these at activation,
// kpxdoctor checks them from outside.
#pragma once

#include <string>
#include <string_view>

namespace kpx {

inline constexpr std::string_view kVisualCppSetupKey =
    "SOFTWARE\\Microsoft\\VisualStudio\\6.0\\Setup\\Microsoft Visual C++";
inline constexpr std::string_view kIdeAddInKey = "Software\\Microsoft\\DevStudio\\6.0\\AddIns\\kpxIDEAddin.DSAddIn";
// Beneath the add-in's location.
inline constexpr std::string_view kIdeAddInFile = "\\vc\\dlls\\kpxideaddin.dll";
// The folder the host is installed in, when the host cannot say.
inline constexpr std::string_view kDefaultLocation = "C:\\Program Files\\Tolvek Software\\Quarn";

// The language add-in's files lie beneath the host's own installation
// folder, so the location is that folder, without blanks around it or
// trailing "\" (callers append "\..."). An empty path gives the default
// installation folder when `useDefault` is set, else "".
std::string AddInLocation(std::string_view path, bool useDefault);

}  // namespace kpx
