// The stereotypes the add-in offers the host for components and classes.
// They are not built in: the host add-in "VC++" ships a stereotype
// configuration file, named by the registry value "StereotypeCfgFile" under
// the add-in's registry key and lying in its install directory. The file is
// read line by line; three line forms matter:
//   Item=...        starts a section ("Item=Component", "Item=Class", or
//                   one that is neither)
//   Stereotype=...  one stereotype of the current section: the text after
//                   the first "=", blanks around it removed
// Patterns match whole lines, case-sensitively; a line with blanks before
// "Item" or "Stereotype" matches neither. Every other line is skipped, and
// lines before the first "Item=" belong to no section.
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "automation/object.h"
#include "platform/platform.h"

namespace kpx {

inline constexpr std::string_view kComponentSection = "Item=Component";
inline constexpr std::string_view kClassSection = "Item=Class";

// The lines of a text: LF ends a line, a CR right before it is dropped
// with it (CR LF and LF files read alike); a CR anywhere else stays in the
// line. A last line without a line end counts; a text ending in a line end
// has no empty line after it.
std::vector<std::string_view> TextLines(std::string_view text);

// The stereotypes of the section that `sectionLine` starts, in file order,
// every section of that name contributing and duplicates kept.
std::vector<std::string> SectionStereotypes(std::string_view text, std::string_view sectionLine);

// Where the stereotype file of a host add-in lies: its InstallDirectory,
// "\" and the registry value "StereotypeCfgFile" under its RegistryRoot in
// HKEY_LOCAL_MACHINE, joined as they stand. "" when the directory or the
// value is empty (the value is then not read). Host failures are raised.
std::string StereotypeFilePath(platform::Registry& registry, const ObjectPtr& addIn);

// The section's stereotypes for the host add-in named `tool`, as a new
// collection of strings (empty when the file has none). Nothing when there
// is no such add-in or its file cannot be located; raises the file
// system's error (53, 75, 76) when the file cannot be opened.
ObjectPtr StereotypeList(const platform::Platform& platform, const ObjectPtr& QuarnApp, std::string_view tool,
                         std::string_view sectionLine);

}  // namespace kpx
