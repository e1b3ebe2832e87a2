// Help for the Visual C++ add-in: one how-to topic of its help file, and a
// FAQ that the user may route to an automation object or a script.
#include <string>

#include "addin/api.h"
#include "addin/app_calls.h"
#include "addin/find_addin.h"
#include "automation/error_styles.h"
#include "automation/vb_strings.h"
#include "restore/file_utilities.h"
#include "shared/host_ids.h"

namespace kpx {

namespace {

constexpr uint64_t kHowToTopic = 615;

int64_t MainWindow(const ObjectPtr& QuarnApp) {
  return static_cast<int64_t>(CallByName(QuarnApp, hostid::kGetMainWnd, CallKind::Method).toDouble());
}

}  // namespace

int32_t API::OnHowTo(ObjectPtr& QuarnApp) {
  module_.DebugLog("kpxAddin.OnHowTo(QuarnApp)", logid::ADDIN, loglevel::TRACE);
  ObjectPtr addIn = FindAddIn(QuarnApp, "VC++");
  const int64_t window = MainWindow(QuarnApp);
  const std::string helpFile = GetProperty(addIn, hostid::kHelpFile).toString();
  module_.platform().ui.WinHelp(window, helpFile, platform::kHelpContext, kHowToTopic);
  return 0;
}

int32_t API::OnFAQ(ObjectPtr& QuarnApp) {
  module_.DebugLog("kpxAddin.OnFAQ(QuarnApp)", logid::ADDIN, loglevel::TRACE);
  ResumeNext onError;
  ObjectPtr addIn = FindAddIn(QuarnApp, "VC++");
  if (!addIn) return 0;

  std::string setting;
  onError([&] {
    setting = Trim(CallMethod(addIn, hostid::kReadSetting, {Variant("Events"), Variant("OnFAQ"), Variant("")}).toString());
  });
  bool handled = false;
  if (!setting.empty()) {
    if (!EqualsNoCase(Right(setting, 4), ".ebs")) {
      handled = onError([&] { CallWithApp(module_.platform().objects.CreateObject(setting), "OnFAQ", QuarnApp); });
    } else {
      handled = onError([&] { CallMethod(QuarnApp, hostid::kExecuteScript, {Variant(setting)}); });
    }
  }
  if (handled) return 0;

  std::string helpFile;
  onError([&] { helpFile = GetProperty(addIn, hostid::kHelpFile).toString(); });
  const std::string faqFile = DirectoryOf(helpFile) + "faq-vc.hlp";
  if (!FileExists(module_.platform().files, faqFile)) return 0;
  // The main window is asked for only when there is a help window to own.
  int64_t window = 0;
  onError([&] { window = MainWindow(QuarnApp); });
  onError([&] { module_.platform().ui.WinHelp(window, faqFile, platform::kHelpFinder, 0); });
  return 0;
}

}  // namespace kpx
