#include "automation/collection.h"

#include "automation/automation_error.h"
#include "automation/enumerator.h"
#include "automation/vb_strings.h"

namespace kpx {

namespace {

void Expect(std::span<Variant> args, size_t least, size_t most) {
  if (args.size() < least || args.size() > most) throw AutomationError(vberr::kWrongArgCount);
}

}  // namespace

DispId Collection::IdOfName(std::string_view name) {
  static constexpr std::pair<const char*, DispId> kNames[] = {{"Item", kItem},   {"_NewEnum", kNewEnum},
                                                              {"Count", kCount}, {"GetAt", kGetAt},
                                                              {"Add", kAdd},     {"RemoveAll", kRemoveAll}};
  for (const auto& [n, id] : kNames)
    if (EqualsNoCase(n, name)) return id;
  throw AutomationError(vberr::kNoSuchMember);
}

const Collection::Entry* Collection::Find(std::string_view key) const {
  for (const Entry& e : items_)
    if (e.key && EqualsNoCase(*e.key, key)) return &e;
  return nullptr;
}

void Collection::Add(Variant item, std::optional<std::string> key) {
  if (key && Find(*key)) throw AutomationError(vberr::kDuplicateKey);
  items_.push_back({std::move(item), std::move(key)});
}

const Variant& Collection::At(int64_t index) const {
  if (index < 1 || index > static_cast<int64_t>(items_.size())) throw AutomationError(vberr::kSubscript);
  return items_[static_cast<size_t>(index - 1)].item;
}

const Variant& Collection::ByKey(std::string_view key) const {
  const Entry* e = Find(key);
  if (!e) throw AutomationError(vberr::kInvalidCall);
  return e->item;
}

Variant Collection::Invoke(DispId id, CallKind kind, std::span<Variant> args) {
  if (kind == CallKind::PropertyPut || kind == CallKind::PropertyPutRef) throw AutomationError(vberr::kNoSuchMember);
  switch (id) {
    case kItem:
    case kGetAt: {
      Expect(args, 1, 1);
      const Variant& which = args[0].deref();
      // Item takes a key or a position, as Visual Basic's collections do.
      if (id == kItem && which.isString()) return ByKey(which.toString());
      return At(which.toInt32());
    }
    case kCount:
      Expect(args, 0, 0);
      return static_cast<int32_t>(items_.size());
    case kAdd: {
      Expect(args, 1, 2);
      std::optional<std::string> key;
      if (args.size() == 2 && !args[1].deref().isEmpty()) key = args[1].toString();
      Add(args[0].deref(), std::move(key));
      return {};
    }
    case kRemoveAll:
      Expect(args, 0, 0);
      items_.clear();
      return {};
    case kNewEnum: {
      // For Each walks the items as they are now.
      Expect(args, 0, 0);
      std::vector<Variant> items;
      items.reserve(items_.size());
      for (const Entry& e : items_) items.push_back(e.item);
      return ObjectPtr(std::make_shared<Enumerator>(std::move(items)));
    }
    default:
      throw AutomationError(vberr::kNoSuchMember);
  }
}

}  // namespace kpx
