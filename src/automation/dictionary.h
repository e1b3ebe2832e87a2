// A keyed collection shaped like the Scripting Runtime's dictionary, for the
// builds that have no Scripting Runtime: keys are texts, each with an item;
// keys keep the order they were added in.
#pragma once

#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "automation/object.h"

namespace kpx {

class Dictionary final : public Object {
 public:
  // The Scripting Runtime's dispatch ids.
  enum : DispId { kItem = 0, kAdd = 1, kCount = 2, kExists = 3, kRemove = 7, kRemoveAll = 8, kCompareMode = 9 };
  static constexpr int32_t kBinaryCompare = 0;
  static constexpr int32_t kTextCompare = 1;

  DispId IdOfName(std::string_view name) override;
  Variant Invoke(DispId id, CallKind kind, std::span<Variant> args) override;

  bool Exists(std::string_view key) const { return Find(key) != entries_.end(); }
  const std::vector<std::pair<std::string, Variant>>& entries() const { return entries_; }

 private:
  std::vector<std::pair<std::string, Variant>>::const_iterator Find(std::string_view key) const;

  std::vector<std::pair<std::string, Variant>> entries_;
  int32_t compareMode_ = kBinaryCompare;
};

}  // namespace kpx
