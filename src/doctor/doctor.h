// kpxdoctor's command line, the same on Windows and natively: the checks
// (as text or JSON), the debug mask calculator and the debug log reader.
#pragma once

#include <iosfwd>
#include <string>
#include <vector>

#include "doctor/machine.h"

namespace kpx::doctor {

// Runs the command `args` (without the program's name) on `machine`.
// Exit codes: 0 all well, 1 something stops the add-in (the checks) or the
// command failed, 2 a bad command line.
int RunDoctor(const std::vector<std::string>& args, Machine& machine, std::ostream& out, std::ostream& err);

// The usage text, with `prefix` (natively "--sandbox DIR ") before each command.
std::string Usage(const std::string& prefix);

}  // namespace kpx::doctor
