// The split of a user-command definition, "types|caption|ProgID": the type
// field is the text before the first "|", untouched; the caption lies
// between the first and the second, trimmed; the object's name is the rest,
// trimmed, further "|" included. Without "|" the caption is the slot's name
// and there is no object; with a caption but no object's name the
// placeholder stands in.
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <string>
#include <string_view>

#include "addin/user_commands.h"
#include "automation/vb_strings.h"

namespace {

// Names the failed check before stopping, so a finding reads at once.
void Require(bool condition, int line = __builtin_LINE()) {
  if (condition) return;
  std::fprintf(stderr, "%s:%d: check failed\n", __FILE__, line);
  std::abort();
}

bool HasOuterBlank(std::string_view s) { return !s.empty() && (s.front() == ' ' || s.back() == ' '); }

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  if (size == 0) return 0;
  const std::string slot = "OnUser" + std::to_string(1 + data[0] % 5);
  const std::string_view text(reinterpret_cast<const char*>(data) + 1, size - 1);
  const kpx::UserCommandDefinition d = kpx::SplitUserCommandDefinition(slot, text);

  const size_t first = text.find('|');
  if (first == std::string_view::npos) {
    Require(d.types == text && d.caption == slot && d.progId.empty());
    return 0;
  }
  Require(d.types == text.substr(0, first));
  Require(d.types.find('|') == std::string::npos);
  Require(d.caption.find('|') == std::string::npos && !HasOuterBlank(d.caption));
  Require(!d.progId.empty() && !HasOuterBlank(d.progId));

  const std::string_view rest = text.substr(first + 1);
  const size_t second = rest.find('|');
  if (second == std::string_view::npos) {
    Require(d.caption == kpx::Trim(rest) && d.progId == kpx::kPlaceholderProgId);
    return 0;
  }
  Require(d.caption == kpx::Trim(rest.substr(0, second)));
  const std::string third = kpx::Trim(rest.substr(second + 1));
  Require(d.progId == (third.empty() ? std::string(kpx::kPlaceholderProgId) : third));
  // A third "|" and whatever follows it stay in the object's name.
  if (rest.find('|', second + 1) != std::string_view::npos) Require(d.progId.find('|') != std::string::npos);
  return 0;
}
