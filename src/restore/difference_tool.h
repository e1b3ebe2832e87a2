// Comparing a backup with its source before restoring it: windiff of
// Visual C++ 6 by default, or the tool the user set in the "VC++" add-in's
// "Events"/"OnDifference" setting, a command line ("shell" and a program)
// or the ProgID of a component with an OnDifference(backup, source) method,
// optionally followed by "|" and the caption of the menu command.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

#include "automation/object.h"
#include "shared/module.h"

namespace kpx {

// Splits off the first "|"-separated field of `rest`: the text before the
// first "|" is returned and `rest` keeps the text after it; without a "|"
// the whole text is the field and `rest` becomes empty.
std::string SplitField(std::string& rest);
// The `index`-th field (1-based) of a record; "" beyond its last.
std::string FieldOf(std::string_view record, int index);

// The "OnDifference" setting read: the command and the menu caption.
struct DifferenceSetting {
  std::string command = "windiff";
  std::string caption = "WinDiff";
};
DifferenceSetting ParseDifferenceSetting(std::string_view setting);

// The command that starts windiff of the Visual Studio installed in
// `productDir` (the word windiff after the path becomes the child's first
// command-line token, as the command line does not repeat the program).
std::string WindiffCommand(std::string_view productDir);
// Whether a command starts a program ("shell ..."); any other is a ProgID.
bool IsShellCommand(std::string_view command);

// A "shell" command taken apart: the program, and the arguments with "%1"
// filled with the backup and "%2" with the source.
struct ShellCommand {
  std::string program, arguments;
};
ShellCommand ParseShellCommand(std::string_view command, std::string_view backup, std::string_view source);

class DifferenceTool {
 public:
  explicit DifferenceTool(Module& module) : module_(module) {}

  // Reads the setting; always true.
  bool InitDifferenceTool(const ObjectPtr& QuarnApp, const ObjectPtr& VCAddin);
  // Compares the files of a restore item (field 3 the source, field 4 the
  // backup). True when the tool ran and nothing was recorded as an error.
  bool RunDifference(std::string_view restoreItem);

  // The reset gesture: three clicks on a project row within the timer's
  // second, while no caption is set, bring windiff back. True when the
  // click asks for the one-second timer to start.
  bool ProjectClicked();
  void TimerFired();

  const std::string& command() const { return command_; }
  const std::string& toolName() const { return toolName_; }
  bool timerRunning() const { return timerRunning_; }

  static constexpr uint32_t kTimeout = 0x7FFFFFFF;
  static constexpr std::string_view kWindiffKey =
      "SOFTWARE\\Microsoft\\VisualStudio\\6.0\\Setup\\Microsoft Visual Studio";

 private:
  Module& module_;
  ObjectPtr QuarnApp_, VCAddin_;
  std::string command_ = "windiff";
  std::string toolName_ = "WinDiff";
  int32_t clicks_ = 0;
  bool timerRunning_ = false;
};

}  // namespace kpx
