// A walk over a collection's items, what a collection hands out as its
// _NewEnum for For Each. It walks the items as they were when it was made,
// so adding to or clearing the collection meanwhile changes nothing of a
// walk under way. The operations are IEnumVARIANT's, in plain C++; the
// Windows bridge serves an IEnumVARIANT over one. It has no automation
// members of its own.
#pragma once

#include <cstddef>
#include <memory>
#include <span>
#include <vector>

#include "automation/object.h"

namespace kpx {

class Enumerator final : public Object {
 public:
  explicit Enumerator(std::vector<Variant> items)
      : items_(std::make_shared<const std::vector<Variant>>(std::move(items))) {}

  // Up to `count` items from the current place, without moving on; fewer
  // (none) near the end.
  std::span<const Variant> Peek(size_t count) const;
  // Those items, moving past them.
  std::vector<Variant> Next(size_t count);
  // Moves past up to `count` items; false when fewer were left (the walk is
  // then at the end).
  bool Skip(size_t count);
  void Reset() { position_ = 0; }
  // A second walk over the same items, at the same place, moving on its own.
  std::shared_ptr<Enumerator> Clone() const;

  size_t position() const { return position_; }
  size_t size() const { return items_->size(); }

  DispId IdOfName(std::string_view name) override;
  Variant Invoke(DispId id, CallKind kind, std::span<Variant> args) override;

 private:
  Enumerator(std::shared_ptr<const std::vector<Variant>> items, size_t position)
      : items_(std::move(items)), position_(position) {}

  std::shared_ptr<const std::vector<Variant>> items_;
  size_t position_ = 0;
};

}  // namespace kpx
