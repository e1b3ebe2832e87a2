// Finding the host's add-in objects by name.
#pragma once

#include <string_view>

#include "automation/object.h"

namespace kpx {

// The first add-in (lowest index) whose Name equals `name` exactly, or
// Nothing. Any failure on the way also gives Nothing.
ObjectPtr FindAddIn(const ObjectPtr& QuarnApp, std::string_view name);

// The sibling add-in that does code generation and model update.
inline ObjectPtr GetVisualStudioAddIn(const ObjectPtr& QuarnApp) { return FindAddIn(QuarnApp, "VisualStudio"); }

}  // namespace kpx
