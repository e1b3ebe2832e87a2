// Whether a host add-in is switched on, as the host records it.
#pragma once

#include <string_view>

#include "automation/object.h"
#include "platform/platform.h"

namespace kpx {

// False only when the add-in's "Active" value is exactly "No". The host
// application is accepted for the caller's convenience and not used.
bool IsAddInActive(platform::Registry& registry, const ObjectPtr& QuarnApp, std::string_view addInName);

}  // namespace kpx
