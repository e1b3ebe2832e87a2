#include "dialogs/kpx_prompt.h"

namespace kpx {

namespace {

// The check box has no text in the resource component; it is this form's own.
constexpr const char* kDontShowCaption = "&Do not show this message again";

}  // namespace

platform::PromptIcon KpxPrompt::IconOf(int32_t kind) {
  switch (kind) {
    case kCritical:
      return platform::PromptIcon::Critical;
    case kQuestion:
      return platform::PromptIcon::Question;
    case kInformation:
      return platform::PromptIcon::Information;
    default:
      return platform::PromptIcon::None;
  }
}

void KpxPrompt::Initialize(std::string_view message, std::string_view title, int32_t kind, bool optionFlag,
                           int32_t helpContext, std::string_view helpFile, bool secondOptionFlag) {
  view_ = {};
  view_.message = message;
  view_.title = title;
  view_.icon = IconOf(kind);
  optionFlag_ = optionFlag;
  helpContext_ = helpContext;
  helpFile_ = helpFile;
  secondOptionFlag_ = secondOptionFlag;
  helpAvailable_ = helpContext > 0 && !helpFile.empty();

  // The form's load step: its captions. The caller's title wins; the
  // form's own caption stands in for an empty one.
  if (view_.title.empty()) view_.title = resources_.GetResourceString(5045);
  view_.okCaption = resources_.GetResourceString(30013);
  view_.cancelCaption = resources_.GetResourceString(30003);
  view_.helpCaption = resources_.GetResourceString(30000);
  view_.dontShowCaption = kDontShowCaption;
  view_.helpAvailable = helpAvailable_;

  const platform::PromptOutcome outcome = ui_.ShowPrompt(view_, *this);
  cancelled_ = outcome.cancelled;
  dontShow_ = outcome.dontShow;
}

void KpxPrompt::ShowHelp(int64_t window) {
  if (!helpAvailable_) return;  // the button is disabled then
  ui_.WinHelp(window, helpFile_, platform::kHelpContext, static_cast<uint64_t>(helpContext_));
}

}  // namespace kpx
