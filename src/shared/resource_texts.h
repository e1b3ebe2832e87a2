// The English texts of the resource component, by string id. The simulated
// host serves them through its resource objects, and the Windows resource
// library is built from the same table, so both speak with one voice.
//
// Messages that take arguments carry "%1".."%6", numbered from "%1" in the
// order their callers pass the arguments. Texts that open a submenu are
// plain: the add-in puts "Submenu " in front of them itself.
#pragma once

#include <cstdint>
#include <span>

namespace kpx {

struct ResourceText {
  int32_t id;
  const char* text;
};

// Every text of the resource component, ordered by id.
std::span<const ResourceText> ResourceTexts();

// The text of one id, or nullptr when the component has none.
const char* FindResourceText(int32_t id);

}  // namespace kpx
