#include "restore/difference_tool.h"

#include "automation/error_styles.h"
#include "automation/vb_strings.h"
#include "shared/host_ids.h"
#include "shared/shared_registryapi2.h"
#include "shared/shared_utilities.h"

namespace kpx {

std::string SplitField(std::string& rest) {
  const size_t bar = rest.find('|');
  std::string field;
  if (bar == std::string::npos) {
    field = std::move(rest);
    rest.clear();
  } else {
    field = rest.substr(0, bar);
    rest.erase(0, bar + 1);
  }
  return field;
}

std::string FieldOf(std::string_view record, int index) {
  std::string rest(record), field;
  for (int i = 0; i < index; ++i) field = SplitField(rest);
  return field;
}

DifferenceSetting ParseDifferenceSetting(std::string_view setting) {
  DifferenceSetting parsed;
  if (setting.empty()) return parsed;
  parsed.caption.clear();
  parsed.command = Trim(setting);
  if (const size_t bar = parsed.command.find('|'); bar != std::string::npos) {
    parsed.caption = Trim(parsed.command.substr(bar + 1));
    parsed.command = Trim(parsed.command.substr(0, bar));
  }
  if (parsed.caption.empty()) parsed.caption = EqualsNoCase(parsed.command, "windiff") ? "WinDiff" : "Differences";
  return parsed;
}

bool DifferenceTool::InitDifferenceTool(const ObjectPtr& QuarnApp, const ObjectPtr& VCAddin) {
  QuarnApp_ = QuarnApp;
  VCAddin_ = VCAddin;
  command_ = "windiff";
  toolName_ = "WinDiff";
  const DifferenceSetting setting = ParseDifferenceSetting(
      CallMethod(VCAddin, hostid::kReadSetting, {Variant("Events"), Variant("OnDifference"), Variant("")}).toString());
  command_ = setting.command;
  toolName_ = setting.caption;
  return true;
}

namespace {

// Fills "%1" with the backup and "%2" with the source in one pass from the
// left, going on after each inserted path, so that a path holding "%1" or
// "%2" itself is never filled in again.
std::string FillPlaceholders(std::string_view arguments, std::string_view backup, std::string_view source) {
  std::string out;
  for (size_t i = 0; i < arguments.size(); ++i) {
    if (arguments[i] == '%' && i + 1 < arguments.size() && (arguments[i + 1] == '1' || arguments[i + 1] == '2')) {
      out += arguments[i + 1] == '1' ? backup : source;
      ++i;
    } else {
      out += arguments[i];
    }
  }
  return out;
}

}  // namespace

std::string WindiffCommand(std::string_view productDir) {
  return "Shell \"" + std::string(productDir) + "\\Common\\Tools\\windiff.exe\" windiff \"%1\" \"%2\"";
}

bool IsShellCommand(std::string_view command) {
  const std::string work = std::string(command) + " ";
  const std::string verb = work.substr(0, work.find(' '));
  // "shellexecute " keeps its blank, so no verb ever equals it and a
  // command beginning with that word is taken as a ProgID.
  return EqualsNoCase(verb, "shell") || EqualsNoCase(verb, "shellexecute ");
}

ShellCommand ParseShellCommand(std::string_view command, std::string_view backup, std::string_view source) {
  const std::string work = std::string(command) + " ";
  const size_t verbEnd = work.find(' ');
  const std::string rest = Trim(work.substr(verbEnd)) + " ";
  ShellCommand shell;
  size_t end;
  if (rest.front() == '"') {
    end = rest.find('"', 1);
    if (end == std::string::npos) end = rest.find(' ');
    shell.program = rest.substr(1, end - 1);
  } else {
    end = rest.find(' ');
    shell.program = rest.substr(0, end);
  }
  shell.arguments = FillPlaceholders(Trim(rest.substr(end + 1)), backup, source);
  return shell;
}

bool DifferenceTool::RunDifference(std::string_view restoreItem) {
  const std::string source = FieldOf(restoreItem, 3);
  const std::string backup = FieldOf(restoreItem, 4);
  if (source.empty() || backup.empty()) return false;
  module_.error().Clear();
  return CatchAll(
      [&] {
        if (EqualsNoCase(command_, "windiff")) {
          // Found once; the command then names the program for every later
          // comparison of this dialog. Without Visual C++ 6 it stays empty
          // and fails below as a ProgID.
          command_.clear();
          const std::string productDir =
              RegistryQueryValue(module_.platform().registry, RootKey::LocalMachine, kWindiffKey, "ProductDir")
                  .toString();
          if (!productDir.empty()) command_ = WindiffCommand(productDir);
        }
        if (!IsShellCommand(command_)) {
          ObjectPtr tool = module_.platform().objects.CreateObject(command_);
          CallByName(tool, "OnDifference", CallKind::Method, {Variant(backup), Variant(source)});
          return module_.error().number == 0;
        }
        const ShellCommand shell = ParseShellCommand(command_, backup, source);
        return RunChildProcess(module_, shell.program, shell.arguments, kTimeout) && module_.error().number == 0;
      },
      [&](const AutomationError& e) {
        SetError(module_, e.number(), e.description());
        return false;
      });
}

bool DifferenceTool::ProjectClicked() {
  if (!toolName_.empty()) return false;
  if (timerRunning_) {
    ++clicks_;
    return false;
  }
  clicks_ = 1;
  timerRunning_ = true;
  return true;
}

void DifferenceTool::TimerFired() {
  if (clicks_ == 3) {
    toolName_ = "WinDiff";
    command_ = "windiff";
    CatchAll([&] { CallMethod(VCAddin_, hostid::kWriteSetting, {Variant("Events"), Variant("OnDifference"), Variant("windiff")}); },
             [](const AutomationError&) {});
  }
  clicks_ = 0;
  timerRunning_ = false;
}

}  // namespace kpx
