// How one user-command definition, "types|caption|ProgID", splits into its
// fields. Kept apart from the menu building so the rules can be checked on
// any text.
#pragma once

#include <string>
#include <string_view>

namespace kpx {

// Named when a definition has a caption but no object; creating it fails and
// the failure is reported like any other.
inline constexpr std::string_view kPlaceholderProgId = "KORVA";

struct UserCommandDefinition {
  std::string types;  // item-type letters, not trimmed
  std::string caption;
  std::string progId;
};

// Splits the definition `text` of the slot named `slot` ("OnUser1" ..).
// Without "|" the whole text is the type field, the caption is the slot's
// name and there is no object. With one "|" the object is the placeholder.
// Text after a third "|" still belongs to the object's name.
UserCommandDefinition SplitUserCommandDefinition(std::string_view slot, std::string_view text);

}  // namespace kpx
