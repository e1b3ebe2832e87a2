// Companions and the sibling add-in receive the host application by
// reference and may hand back another one; callers keep whatever comes back.
#pragma once

#include <initializer_list>

#include "automation/object.h"

namespace kpx {

// Calls `member` by name with `leading` arguments, the host application by
// reference and `trailing` arguments, and stores the application the callee
// left.
Variant CallWithApp(const ObjectPtr& object, std::string_view member, ObjectPtr& QuarnApp,
                    std::initializer_list<Variant> leading = {}, std::initializer_list<Variant> trailing = {});

}  // namespace kpx
