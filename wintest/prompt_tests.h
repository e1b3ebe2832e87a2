// The add-in's prompt window, shown through the Win32 platform from the
// template in the loaded kpxaddin.dll, read and pressed as a user would.
#pragma once

#include "platform/win32/win32_api.h"

namespace wintest {

void PromptWindowTests(HMODULE addin);

}  // namespace wintest
