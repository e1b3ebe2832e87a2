// CodeIconsHolder: the icons the host shows beside code-related model items
// (classes, interfaces, coclasses, ATL objects, components, operations,
// attributes), in a small and a large size. The holder keeps two image
// lists, each image an icon resource of the add-in under a key, and hands
// each list to the host as a keyed collection of pictures: the host finds
// an icon by exactly the key stored here.
#pragma once

#include <cstdint>
#include <span>
#include <string>
#include <vector>

#include "automation/object.h"
#include "platform/platform.h"

namespace kpx {

inline constexpr int32_t kSmallCodeIconPixels = 16;
inline constexpr int32_t kLargeCodeIconPixels = 32;

// The product's code icons: a key and the icon resources of its small and
// large picture, in the order of the image lists. The Windows build's
// resource script carries an icon of each id.
struct CodeIconArt {
  const char* key;
  int32_t smallResource;
  int32_t largeResource;
};
std::span<const CodeIconArt> CodeIconArtwork();

// One image of an image list.
struct CodeIconImage {
  std::string key;
  int32_t resourceId;
};
using CodeIconList = std::vector<CodeIconImage>;

class CodeIconsHolder {
 public:
  // With the product's image lists.
  explicit CodeIconsHolder(platform::UserInterface& ui);
  CodeIconsHolder(platform::UserInterface& ui, CodeIconList small, CodeIconList large)
      : ui_(ui), small_(std::move(small)), large_(std::move(large)) {}

  // A new keyed collection of the small (large) list's icons, in list
  // order. An image whose picture cannot be had, or whose key is taken
  // already, is left out; nothing fails. Never Nothing: an empty collection
  // when no image made it.
  ObjectPtr GetCodeIcons() { return IconsOf(small_, kSmallCodeIconPixels); }
  ObjectPtr GetLargeCodeIcons() { return IconsOf(large_, kLargeCodeIconPixels); }

 private:
  ObjectPtr IconsOf(const CodeIconList& list, int32_t pixels);

  platform::UserInterface& ui_;
  CodeIconList small_;
  CodeIconList large_;
};

}  // namespace kpx
