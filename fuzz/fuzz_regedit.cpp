// REGEDIT4 text: parsing either fails with a message or gives data that
// writes out and parses back to the same data.
#include <cstdint>
#include <cstdlib>
#include <stdexcept>
#include <string_view>

#include "platform/posix/regedit_file.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  std::string_view text(reinterpret_cast<const char*>(data), size);
  kpx::posix::RegeditData parsed;
  try {
    parsed = kpx::posix::ParseRegedit(text);
  } catch (const std::runtime_error&) {
    return 0;
  }
  std::string written;
  try {
    written = kpx::posix::WriteRegedit(parsed);
  } catch (const std::runtime_error&) {
    return 0;  // names that cannot be written (line breaks) are refused, not mangled
  }
  const kpx::posix::RegeditData again = kpx::posix::ParseRegedit(written);
  if (again.size() != parsed.size()) std::abort();
  for (const auto& [key, values] : parsed) {
    auto it = again.find(key);
    if (it == again.end() || it->second.size() != values.size()) std::abort();
    for (const auto& [name, value] : values) {
      auto v = it->second.find(name);
      if (v == it->second.end() || v->second.type != value.type || v->second.data != value.data) std::abort();
    }
  }
  return 0;
}
