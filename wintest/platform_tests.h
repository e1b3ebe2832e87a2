// The Win32 platform's file, clock and child-process members on the real
// system: files in the scratch folder, children started from kpx-child.exe.
#pragma once

#include <string>

namespace wintest {

void FileMembersTests(const std::string& scratch);
// `child`: the full path of kpx-child.exe.
void ProcessMembersTests(const std::string& child);

}  // namespace wintest
