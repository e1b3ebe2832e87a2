#include "automation/dictionary.h"

#include <algorithm>

#include "automation/automation_error.h"
#include "automation/vb_strings.h"
#include "platform/platform.h"

namespace kpx {

namespace {

constexpr int32_t kElementNotFound = 32811;  // the dictionary's "Element not found"

void Expect(std::span<Variant> args, size_t count) {
  if (args.size() != count) throw AutomationError(vberr::kWrongArgCount);
}

}  // namespace

DispId Dictionary::IdOfName(std::string_view name) {
  static constexpr std::pair<const char*, DispId> kNames[] = {{"Item", kItem},     {"Add", kAdd},
                                                              {"Count", kCount},   {"Exists", kExists},
                                                              {"Remove", kRemove}, {"RemoveAll", kRemoveAll},
                                                              {"CompareMode", kCompareMode}};
  for (const auto& [n, id] : kNames)
    if (EqualsNoCase(n, name)) return id;
  throw AutomationError(vberr::kNoSuchMember);
}

std::vector<std::pair<std::string, Variant>>::const_iterator Dictionary::Find(std::string_view key) const {
  return std::find_if(entries_.begin(), entries_.end(), [&](const auto& e) {
    return compareMode_ == kBinaryCompare ? e.first == key : EqualsNoCase(e.first, key);
  });
}

Variant Dictionary::Invoke(DispId id, CallKind kind, std::span<Variant> args) {
  const bool put = kind == CallKind::PropertyPut || kind == CallKind::PropertyPutRef;
  switch (id) {
    case kItem: {
      if (put) {
        Expect(args, 2);
        const std::string key = args[0].toString();
        auto it = Find(key);
        if (it == entries_.end())
          entries_.emplace_back(key, args[1].deref());
        else
          entries_[static_cast<size_t>(it - entries_.begin())].second = args[1].deref();
        return {};
      }
      Expect(args, 1);
      const std::string key = args[0].toString();
      auto it = Find(key);
      if (it != entries_.end()) return it->second;
      entries_.emplace_back(key, Variant());  // reading a missing key adds it, as the Scripting Runtime does
      return {};
    }
    case kAdd: {
      Expect(args, 2);
      const std::string key = args[0].toString();
      if (Exists(key)) throw AutomationError(vberr::kDuplicateKey);
      entries_.emplace_back(key, args[1].deref());
      return {};
    }
    case kCount:
      Expect(args, 0);
      return static_cast<int32_t>(entries_.size());
    case kExists:
      Expect(args, 1);
      return Exists(args[0].toString());
    case kRemove: {
      Expect(args, 1);
      auto it = Find(args[0].toString());
      if (it == entries_.end()) throw AutomationError(kElementNotFound, "Element not found");
      entries_.erase(it);
      return {};
    }
    case kRemoveAll:
      Expect(args, 0);
      entries_.clear();
      return {};
    case kCompareMode:
      if (put) {
        Expect(args, 1);
        // The mode decides how keys compare, so it is fixed once keys are in.
        if (!entries_.empty()) throw AutomationError(vberr::kInvalidCall);
        compareMode_ = args[0].toInt32();
        return {};
      }
      Expect(args, 0);
      return compareMode_;
    default:
      throw AutomationError(vberr::kNoSuchMember);
  }
}

}  // namespace kpx

namespace kpx::platform {

ObjectPtr ObjectFactory::CreateDictionary() { return std::make_shared<Dictionary>(); }

}  // namespace kpx::platform
