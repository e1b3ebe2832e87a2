// The installation checks: one finding per check, each saying which feature
// of the add-in it guards and, when something is wrong, what that means for
// the modeller and the one thing to do about it.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "doctor/machine.h"

namespace kpx::doctor {

enum class Verdict { Ok, Warn, Fail, Skip };
const char* VerdictName(Verdict v);  // "OK", "WARN", "FAIL", "SKIP"

struct Finding {
  std::string id;       // stable, for scripts: "addin-registered-32"
  std::string title;    // what was checked
  std::string guards;   // the feature that needs it
  Verdict verdict = Verdict::Ok;
  std::string detail;   // what was found
  std::string meaning;  // WARN and FAIL: what the modeller sees
  std::string fix;      // WARN and FAIL: the one thing to do
};

struct Options {
  // The Quarn installation folder, under which "vc\dlls\kpxideaddin.dll"
  // lies; empty: taken from Developer Studio's add-in key, else Quarn's
  // default folder.
  std::string hostFolder;
};

std::vector<Finding> RunChecks(Machine& machine, const Options& options);

// Non-zero when a finding stops the add-in from being created or activated.
int ExitCode(const std::vector<Finding>& findings);

// The debug log's settings, read as the add-in reads them.
struct DebugSettings {
  uint32_t mask = 0;
  std::string path;
  std::string from;  // which setting gave the path
  bool timeStamps = true;
};
DebugSettings ReadDebugSettings(Machine& machine);

// Registry places the checks read that the add-in's own code does not name.
inline constexpr const char* kVcAddInKey = "SOFTWARE\\Tolvek Software\\Quarn\\AddIns\\VC++";
inline constexpr const char* kVcAddInEventsKey = "SOFTWARE\\Tolvek Software\\Quarn\\AddIns\\VC++\\Events";

}  // namespace kpx::doctor
