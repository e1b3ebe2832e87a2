// kpxPrompt: the add-in's own message box, used where a warning offers a
// help topic and a "do not show this again" choice. The form keeps what its
// caller gives it and what the user did; the window itself is the
// platform's.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

#include "platform/platform.h"
#include "shared/resource_strings.h"

namespace kpx {

class KpxPrompt final : private platform::PromptHelp {
 public:
  // Message-box style values that pick the icon.
  static constexpr int32_t kCritical = 16;
  static constexpr int32_t kQuestion = 32;
  static constexpr int32_t kInformation = 64;

  KpxPrompt(platform::UserInterface& ui, ResourceStrings& resources) : ui_(ui), resources_(resources) {}

  // Fills the form and shows it modally; returns when the user closed it.
  void Initialize(std::string_view message, std::string_view title, int32_t kind, bool optionFlag,
                  int32_t helpContext, std::string_view helpFile, bool secondOptionFlag);

  // After it closed.
  bool cancelled() const { return cancelled_; }
  // The check box: 1 ticked, 0 not.
  int16_t dontShowValue() const { return dontShow_ ? 1 : 0; }
  bool helpAvailable() const { return helpAvailable_; }
  bool optionFlag() const { return optionFlag_; }
  bool secondOptionFlag() const { return secondOptionFlag_; }
  // What the window showed.
  const platform::PromptView& view() const { return view_; }

  static platform::PromptIcon IconOf(int32_t kind);

 private:
  void ShowHelp(int64_t window) override;

  platform::UserInterface& ui_;
  ResourceStrings& resources_;
  platform::PromptView view_;
  bool cancelled_ = false;
  bool dontShow_ = false;
  bool optionFlag_ = false;
  bool secondOptionFlag_ = false;
  bool helpAvailable_ = false;
  int32_t helpContext_ = 0;
  std::string helpFile_;
};

}  // namespace kpx
