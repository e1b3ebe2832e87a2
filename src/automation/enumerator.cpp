#include "automation/enumerator.h"

#include <algorithm>

#include "automation/automation_error.h"

namespace kpx {

std::span<const Variant> Enumerator::Peek(size_t count) const {
  const size_t left = items_->size() - position_;
  return std::span<const Variant>(*items_).subspan(position_, std::min(count, left));
}

std::vector<Variant> Enumerator::Next(size_t count) {
  std::span<const Variant> taken = Peek(count);
  position_ += taken.size();
  return {taken.begin(), taken.end()};
}

bool Enumerator::Skip(size_t count) {
  const size_t left = items_->size() - position_;
  position_ += std::min(count, left);
  return count <= left;
}

std::shared_ptr<Enumerator> Enumerator::Clone() const {
  return std::shared_ptr<Enumerator>(new Enumerator(items_, position_));
}

DispId Enumerator::IdOfName(std::string_view) { throw AutomationError(vberr::kNoSuchMember); }

Variant Enumerator::Invoke(DispId, CallKind, std::span<Variant>) { throw AutomationError(vberr::kNoSuchMember); }

}  // namespace kpx
