// The add-in's own automation collection: what it makes where the host
// offers no way to make one (class collections it fills for itself, the
// stereotype lists, the code icons). Items are 1-based, may carry a text
// key (compared without regard to case, as Visual Basic's collections do),
// and keep the order they were added in. The dispatch ids of the members
// the host's class collections share are the host's, so code that fills a
// host collection fills this one the same way. _NewEnum hands out an
// Enumerator over the items, which COM clients walk with For Each.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "automation/object.h"

namespace kpx {

class Collection final : public Object {
 public:
  enum : DispId { kItem = 0, kNewEnum = -4, kCount = 202, kGetAt = 203, kAdd = 208, kRemoveAll = 211 };

  DispId IdOfName(std::string_view name) override;
  Variant Invoke(DispId id, CallKind kind, std::span<Variant> args) override;

  // Raises 457 when the key is taken.
  void Add(Variant item, std::optional<std::string> key = std::nullopt);
  size_t size() const { return items_.size(); }
  // 1-based; raises 9 outside 1..Count.
  const Variant& At(int64_t index) const;
  // Raises 5 for a key no item has.
  const Variant& ByKey(std::string_view key) const;
  const std::optional<std::string>& KeyAt(size_t zeroBased) const { return items_[zeroBased].key; }
  void Clear() { items_.clear(); }

 private:
  struct Entry {
    Variant item;
    std::optional<std::string> key;
  };
  const Entry* Find(std::string_view key) const;

  std::vector<Entry> items_;
};

}  // namespace kpx
