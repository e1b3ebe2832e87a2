#include "dialogs/code_icons.h"

#include <memory>

#include "automation/collection.h"
#include "automation/error_styles.h"

namespace kpx {

namespace {

// Small icons are 1xx, large ones 2xx, the same kind at the same place.
constexpr CodeIconArt kArtwork[] = {
    {"Class", 101, 201},     {"Interface", 102, 202}, {"CoClass", 103, 203},   {"ATLObject", 104, 204},
    {"Component", 105, 205}, {"Operation", 106, 206}, {"Attribute", 107, 207},
};

CodeIconList ListOf(bool large) {
  CodeIconList list;
  for (const CodeIconArt& art : kArtwork) list.push_back({art.key, large ? art.largeResource : art.smallResource});
  return list;
}

}  // namespace

std::span<const CodeIconArt> CodeIconArtwork() { return kArtwork; }

CodeIconsHolder::CodeIconsHolder(platform::UserInterface& ui)
    : CodeIconsHolder(ui, ListOf(false), ListOf(true)) {}

ObjectPtr CodeIconsHolder::IconsOf(const CodeIconList& list, int32_t pixels) {
  ResumeNext onError;
  std::shared_ptr<Collection> icons;
  const size_t count = list.size();
  for (size_t i = 0; i < count; ++i) {
    onError.Clear();
    ObjectPtr picture;
    onError([&] { picture = ui_.LoadIconPicture(list[i].resourceId, pixels); });
    if (onError.failed()) continue;
    if (!icons) icons = std::make_shared<Collection>();
    // A key the collection holds already fails here, and the image is left out.
    onError([&] { icons->Add(Variant(picture), list[i].key); });
  }
  if (!icons) icons = std::make_shared<Collection>();
  return icons;
}

}  // namespace kpx
