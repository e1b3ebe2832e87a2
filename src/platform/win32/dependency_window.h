// The module dependency dialog's window: a modal dialog from the template
// KPX_DEPENDENCY_DIALOG (dependency_window.rc, built into kpxaddin.dll) in
// which the modeller edits one text.
#pragma once

#include "platform/win32/win32_api.h"

#include "platform/platform.h"

namespace kpx::win32 {

// Shows the view modally, owned by `owner` (may be null), until OK, Cancel
// or the close box. Raises when the window cannot be made.
platform::DependencyOutcome ShowDependencyWindow(HINSTANCE resources, HWND owner, const platform::DependencyView& view);

}  // namespace kpx::win32
