// Resizable forms: each control's tag says which edges it follows, the
// form's own tag its smallest size. A tag is a run of entries, a capital
// letter and two numbers in parentheses, "W(0,8610)H(0,5895)"; numbers are
// twips. W and H stretch the control to a right or bottom margin, R and B
// move it to one; the second number is the bound below which the control
// stops following the edge.
#pragma once

#include <cstdint>
#include <string_view>

#include "shared/module.h"

namespace kpx {

struct LayoutEntry {
  float first = 0;
  float second = 0;
  int count = 0;  // numbers found: 0 when the letter is absent
};

// The entry of `letter` (letter case counts) in `tag`.
LayoutEntry ParseLayoutTag(std::string_view tag, char letter);

// A control as layout sees it, in twips.
struct LayoutControl {
  std::string_view tag;
  double left = 0, top = 0, width = 0, height = 0;
};

// Applies the W, H, R and B entries of the control's tag, in that order,
// for a container whose inner size is `innerWidth` by `innerHeight`. The
// bound is set back to 0 only before W and before R: an H without a bound
// takes W's, a B without one takes R's. Height decisions are traced at log
// id 4, level 7.
void ApplyLayoutTag(Module& module, LayoutControl& control, double innerWidth, double innerHeight);

// The form's smallest size from its own tag, in twips; nothing unless both
// W and H are there.
struct MinimumSize {
  bool present = false;
  double width = 0, height = 0;
};
MinimumSize MinimumSizeOf(std::string_view formTag);

// Twips as whole pixels at `twipsPerPixel`, rounded.
int32_t TwipsToPixels(double twips, double twipsPerPixel);

}  // namespace kpx
