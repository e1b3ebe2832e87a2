#include "restore/min_window_size.h"

#include <algorithm>
#include <cmath>
#include <optional>
#include <string>

#include "automation/vb_strings.h"
#include "shared/shared_debug_logger.h"

namespace kpx {

namespace {
// The height traces go to a log id and level of their own, below every
// named level, so that only a mask asking for them shows them.
constexpr int32_t kLayoutLogId = 4;
constexpr int32_t kLayoutLevel = 7;
}  // namespace

LayoutEntry ParseLayoutTag(std::string_view tag, char letter) {
  LayoutEntry entry;
  const std::string open{letter, '('};
  const size_t p = tag.find(open);
  if (p == std::string_view::npos) return entry;
  const size_t c = tag.find(',', p);
  // A tag cut short of its ")" ends its last number at the tag's end.
  const size_t e = std::min(tag.find(')', p), tag.size());
  size_t end = e;
  entry.count = 1;
  if (c != std::string_view::npos && c < e) {
    entry.second = static_cast<float>(Val(tag.substr(c + 1, e - c - 1)));
    entry.count = 2;
    end = c;
  }
  entry.first = static_cast<float>(Val(tag.substr(p + 2, end - (p + 2))));
  return entry;
}

void ApplyLayoutTag(Module& module, LayoutControl& control, double innerWidth, double innerHeight) {
  const std::string_view tag = control.tag;
  float bound = 0;
  // Each letter: the new value, assigned only when it is at least the bound
  // and differs from the current one.
  auto take = [&](char letter, bool resetBound) -> std::optional<double> {
    if (resetBound) bound = 0;
    const LayoutEntry e = ParseLayoutTag(tag, letter);
    if (e.count == 0) return std::nullopt;
    if (e.count == 2) bound = e.second;
    return e.first;
  };
  if (auto margin = take('W', true)) {
    const double size = innerWidth - *margin - control.left;
    if (size >= bound && size != control.width) control.width = size;
  }
  if (auto margin = take('H', false)) {
    const double size = innerHeight - *margin - control.top;
    module.DebugLog("\r\nBEGIN Height", kLayoutLogId, kLayoutLevel);
    module.DebugLog("Height IFTEST: rNewSize=" + FormatSingle(static_cast<float>(size)) +
                        "  rMin=" + FormatSingle(bound) +
                        "  Ctrl.Height=" + FormatSingle(static_cast<float>(control.height)),
                    kLayoutLogId, kLayoutLevel);
    if (size >= bound && size != control.height) control.height = size;
    else module.DebugLog("FAIL", kLayoutLogId, kLayoutLevel);
  }
  if (auto margin = take('R', true)) {
    const double left = innerWidth - *margin - control.width;
    if (left >= bound && left != control.left) control.left = left;
  }
  if (auto margin = take('B', false)) {
    const double top = innerHeight - *margin - control.height;
    if (top >= bound && top != control.top) control.top = top;
  }
}

MinimumSize MinimumSizeOf(std::string_view formTag) {
  const LayoutEntry w = ParseLayoutTag(formTag, 'W');
  const LayoutEntry h = ParseLayoutTag(formTag, 'H');
  if (w.count == 0 || h.count == 0) return {};
  return {true, w.second, h.second};
}

int32_t TwipsToPixels(double twips, double twipsPerPixel) {
  return static_cast<int32_t>(std::lround(twips / twipsPerPixel));
}

}  // namespace kpx
