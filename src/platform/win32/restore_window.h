// The Restore dialog's window: a modal, resizable dialog from the template
// KPX_RESTORE_DIALOG (restore_window.rc, built into kpxaddin.dll) that
// shows a platform::RestoreForm and hands it every user action.
#pragma once

#include "platform/win32/win32_api.h"

#include "platform/platform.h"

namespace kpx::win32 {

// Shows the form modally until OK, Cancel or the close box; owned by
// `placement.ownerWindow` (which is disabled meanwhile) and placed over the
// host's window. Raises when the window cannot be made, and passes on what
// the form raised, once the window is gone.
void ShowRestoreWindow(HINSTANCE resources, platform::RestoreForm& form, const platform::HostPlacement& placement);

}  // namespace kpx::win32
