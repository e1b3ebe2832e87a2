#include "shared/shared_utilities.h"

#include <utility>

namespace kpx {

bool SetError(Module& module, int32_t number, std::string description) {
  module.error().number = number;
  module.error().description = std::move(description);
  return number == 0;
}

bool SetErrorFromSystem(Module& module, int32_t defaultNumber, std::string defaultDescription) {
  const uint32_t system = module.platform().processes.LastError();
  const int32_t number = system != 0 ? static_cast<int32_t>(system) : defaultNumber;
  std::string description = module.error().description.empty() ? std::move(defaultDescription)
                                                                : module.error().description;
  return SetError(module, number, std::move(description));
}

bool ResultFromError(Module& module, int32_t number, std::string description) {
  if (module.error().number != 0) return false;
  return SetError(module, number, std::move(description));
}

bool RunChildProcess(Module& module, std::string_view applicationName, std::string_view commandLine,
                     uint32_t timeoutMilliseconds) {
  module.error().Clear();
  platform::ProcessRecord record;
  if (!module.platform().processes.CreateProcess(applicationName, commandLine, record)) {
    SetErrorFromSystem(module, 1,
                       "Error creating process for: " + std::string(applicationName) + " " + std::string(commandLine));
    return false;
  }
  return WaitForChild(module, applicationName, record, timeoutMilliseconds);
}

bool WaitForChild(Module& module, std::string_view applicationName, const platform::ProcessRecord& record,
                  uint32_t timeoutMilliseconds) {
  platform::Processes& processes = module.platform().processes;
  // A program without a message loop lets the idle wait return at once; its
  // answer says nothing the process wait below does not.
  processes.WaitForInputIdle(record.process, platform::kInfinite);
  processes.CloseHandle(record.thread);
  module.error().Clear();

  const uint32_t waited = processes.WaitForSingleObject(record.process, timeoutMilliseconds);
  if (waited == platform::kWaitObject0) {
    uint32_t exitCode = 0;
    processes.GetExitCodeProcess(record.process, exitCode);
    // A crash status has its top bit set and reads as a negative Long: it
    // is an error like any other code but 0.
    const auto code = static_cast<int32_t>(exitCode);
    if (code != 0)
      SetError(module, code, "Error exit from " + std::string(applicationName) + ": " + std::to_string(code));
  } else if (waited == platform::kWaitTimeout) {
    // The child is left running: the user may still be looking at it.
    SetErrorFromSystem(module, 2, "Timeout on child process");
  } else {
    SetErrorFromSystem(module, 1, "");
  }

  const int32_t number = module.error().number;
  std::string description = module.error().description;
  processes.CloseHandle(record.process);
  return ResultFromError(module, number, std::move(description));
}

std::string CommandLineProgram(std::string_view line) {
  while (!line.empty() && (line.front() == ' ' || line.front() == '\t')) line.remove_prefix(1);
  if (!line.empty() && line.front() == '"') {
    line.remove_prefix(1);
    return std::string(line.substr(0, line.find('"')));
  }
  return std::string(line.substr(0, line.find_first_of(" \t")));
}

}  // namespace kpx
