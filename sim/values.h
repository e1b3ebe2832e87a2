// Values as the model and scenario files write them:
//   null = Empty, true/false = Boolean, 12 = Long, 1.5 = Double, "text" = String,
//   {"string": "$app"}, {"i2": 4}, {"i4": 4}, {"r4": 0.5}, {"r8": 0.5},
//   {"date": 46341.13}, {"bool": true}, {"null": true}, {"nothing": true},
// and references to the world, resolved when the value is used:
//   "$app", "$model", {"element": "CFoo"}, {"addin": "VC++"},
//   {"object": "browse"} (a companion's own sub-object).
// The event log writes values in the same forms where it can.
#pragma once

#include <optional>

#include "automation/variant.h"
#include "sim/json_source.h"

namespace kpx::sim {

// The value, when it is not a reference to the world. Checked input only.
std::optional<Variant> PlainValue(const InputJson& value);

}  // namespace kpx::sim
