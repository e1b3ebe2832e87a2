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

bool DifferenceTool::InitDifferenceTool(const ObjectPtr& QuarnApp, const ObjectPtr& VCAddin) {
  QuarnApp_ = QuarnApp;
  VCAddin_ = VCAddin;
  command_ = "windiff";
  toolName_ = "WinDiff";
  const std::string setting =
      CallMethod(VCAddin, hostid::kReadSetting, {Variant("Events"), Variant("OnDifference"), Variant("")})
          .toString();
  if (setting.empty()) return true;
  toolName_.clear();
  command_ = Trim(setting);
  if (const size_t bar = command_.find('|'); bar != std::string::npos) {
    toolName_ = Trim(command_.substr(bar + 1));
    command_ = Trim(command_.substr(0, bar));
  }
  if (toolName_.empty()) toolName_ = EqualsNoCase(command_, "windiff") ? "WinDiff" : "Differences";
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
          if (!productDir.empty())
            command_ = "Shell \"" + productDir + "\\Common\\Tools\\windiff.exe\" windiff \"%1\" \"%2\"";
        }
        const std::string work = command_ + " ";
        const std::string verb = work.substr(0, work.find(' '));
        // "shellexecute " keeps its blank, so no verb ever equals it and a
        // command beginning with that word is taken as a ProgID.
        if (!EqualsNoCase(verb, "shell") && !EqualsNoCase(verb, "shellexecute ")) {
          ObjectPtr tool = module_.platform().objects.CreateObject(command_);
          CallByName(tool, "OnDifference", CallKind::Method, {Variant(backup), Variant(source)});
          return module_.error().number == 0;
        }
        const std::string rest = Trim(work.substr(verb.size())) + " ";
        std::string program;
        size_t end;
        if (rest.front() == '"') {
          end = rest.find('"', 1);
          if (end == std::string::npos) end = rest.find(' ');
          program = rest.substr(1, end - 1);
        } else {
          end = rest.find(' ');
          program = rest.substr(0, end);
        }
        const std::string arguments = FillPlaceholders(Trim(rest.substr(end + 1)), backup, source);
        return RunChildProcess(module_, program, arguments, kTimeout) && module_.error().number == 0;
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
