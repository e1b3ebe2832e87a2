// The add-in's prompt window seen from outside, as a user (or a test) sees
// it: found among the process's windows, read control by control, and
// pressed with real clicks.
#pragma once

#include "platform/win32/win32_api.h"

#include <initializer_list>
#include <string>
#include <vector>

#include "platform/platform.h"

namespace wintest {

std::string WindowText(HWND window);

// A dialog (#32770) that has a control of each of the ids.
bool IsDialogWith(HWND window, std::initializer_list<int> ids);
// The visible top-level windows of this process that pass `test`.
std::vector<HWND> ShownWindows(bool (*test)(HWND));

// A dialog (#32770) holding the prompt's own controls; a message box or
// another dialog has none of them.
bool IsPromptWindow(HWND window);
// The prompt windows of this process now shown.
std::vector<HWND> ShownPrompts();

struct PromptSeen {
  kpx::platform::PromptView view;  // icon: the one icon control shown
  int iconsShown = 0;              // how many icon controls are shown
};
// Reads the window's texts, its shown icon and whether Help is enabled.
// From any thread of the process.
PromptSeen ReadPrompt(HWND prompt);

// A click on the control `id` (BM_CLICK), handled when this returns.
void Click(HWND prompt, int id);

}  // namespace wintest
