// The prompt's window: a modal dialog from the template KPX_PROMPT_DIALOG
// (prompt_window.rc, built into kpxaddin.dll).
#pragma once

#include "platform/win32/win32_api.h"

#include "platform/platform.h"

namespace kpx::win32 {

// Shows the prompt modally, owned by `owner` (may be null), until OK, Cancel
// or the close box. `resources` is the module that holds the template: the
// add-in's DLL, also when the code runs in a test host that loaded it.
// Raises when the window cannot be made, and passes on what Help raised.
platform::PromptOutcome ShowPromptWindow(HINSTANCE resources, HWND owner, const platform::PromptView& view,
                                         platform::PromptHelp& help);

}  // namespace kpx::win32
