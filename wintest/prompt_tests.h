// The add-in's prompt window, shown through the Win32 platform from the
// template in the loaded kpxaddin.dll, read and pressed as a user would.
#pragma once

#include "platform/win32/win32_api.h"

#include <string>
#include <vector>

namespace kpx::sim {
class EventLog;
}

namespace wintest {

void PromptWindowTests(HMODULE addin);

#if KPX_WINTEST_SCRIPTED_USER
// The events of one kind a log holds, as their JSON text.
std::vector<std::string> EventsOf(const kpx::sim::EventLog& log, const char* kind);
#endif

}  // namespace wintest
