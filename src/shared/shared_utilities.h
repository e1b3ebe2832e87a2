// Running a child program and waiting for it, with every way that can fail
// turned into the module's pending error and a false result rather than a
// raised error: its one caller, the difference tool, reports a failure by
// its result and leaves the reason for whoever looks next.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

#include "platform/platform.h"
#include "shared/module.h"

namespace kpx {

// Records the pair; true exactly when `number` is 0.
bool SetError(Module& module, int32_t number, std::string description);
// The system's last error code when it has one, else `defaultNumber`; the
// description already recorded when there is one, else `defaultDescription`.
bool SetErrorFromSystem(Module& module, int32_t defaultNumber, std::string defaultDescription);
// Records the pair only when nothing is recorded yet; false when something
// was (and it stays).
bool ResultFromError(Module& module, int32_t number, std::string description);

// The program a command line starts when no application name is given, as
// Windows reads it: its first word, in double quotes or up to the first
// blank or tab.
std::string CommandLineProgram(std::string_view commandLine);

// Starts `commandLine` with `applicationName` and waits up to `timeout`
// milliseconds for it to end. True when it ran and exited with code 0.
bool RunChildProcess(Module& module, std::string_view applicationName, std::string_view commandLine,
                     uint32_t timeoutMilliseconds);
// The wait half of RunChildProcess, after a successful start.
bool WaitForChild(Module& module, std::string_view applicationName, const platform::ProcessRecord& record,
                  uint32_t timeoutMilliseconds);

}  // namespace kpx
