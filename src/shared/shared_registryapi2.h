// Reading and writing single registry values as variants.
#pragma once

#include <cstdint>
#include <string_view>

#include "automation/variant.h"
#include "platform/platform.h"

namespace kpx {

using platform::RootKey;

// The value as a variant: a REG_SZ as a string (its NUL dropped), a
// REG_DWORD as a 32-bit integer; anything else, and any failure, as Empty.
Variant RegistryQueryValue(platform::Registry& registry, RootKey root, std::string_view keyPath,
                           std::string_view valueName);

// Writes a REG_SZ (the value as text, NUL appended) or a REG_DWORD (the
// value as a 32-bit integer) under an existing key. Other types, a missing
// key and a value that does not convert write nothing; nothing is reported.
void RegistrySetValue(platform::Registry& registry, RootKey root, std::string_view keyPath,
                      std::string_view valueName, const Variant& value, uint32_t valueType);

}  // namespace kpx
