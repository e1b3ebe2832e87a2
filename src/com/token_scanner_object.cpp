#include "com/token_scanner_object.h"

#include <algorithm>
#include <string>
#include <vector>

#include "automation/automation_error.h"
#include "automation/vb_strings.h"

namespace kpx::com {

namespace {

constexpr int32_t kElementNotFound = 32811;  // the keyed collection's "Element not found"

struct Name {
  const char* name;
  DispId id;
};

DispId Find(std::span<const Name> names, std::string_view name) {
  for (const Name& n : names)
    if (EqualsNoCase(n.name, name)) return n.id;
  throw AutomationError(vberr::kNoSuchMember);
}

// Exactly `count` arguments, or `count - optional` and more.
void Expect(std::span<Variant> args, size_t count, size_t optional = 0) {
  if (args.size() > count) throw AutomationError(vberr::kWrongArgCount);
  if (args.size() + optional < count) throw AutomationError(vberr::kArgNotOptional);
}

bool IsPut(CallKind kind) { return kind == CallKind::PropertyPut || kind == CallKind::PropertyPutRef; }

// Reading members accept method and property-get calls alike, as automation
// clients mix them; writing one that cannot be written is 438.
void ReadOnly(CallKind kind) {
  if (IsPut(kind)) throw AutomationError(vberr::kNoSuchMember);
}

}  // namespace

// ----------------------------------------------------------- TokenScanner

DispId TokenScannerObject::IdOfName(std::string_view name) {
  static constexpr Name kNames[] = {{"Init", kInit},
                                    {"NextToken", kNextToken},
                                    {"ReplaceCurrentToken", kReplaceCurrentToken},
                                    {"ScanString", kScanString},
                                    {"CurrentToken", kCurrentToken},
                                    {"Delimitors", kDelimitors}};
  return Find(kNames, name);
}

Variant TokenScannerObject::Invoke(DispId id, CallKind kind, std::span<Variant> args) {
  switch (id) {
    case kInit:
      ReadOnly(kind);
      Expect(args, 2);
      return scanner_.Init(args[0].toString(), args[1].toString());
    case kNextToken:
      ReadOnly(kind);
      Expect(args, 0);
      return scanner_.NextToken();
    case kReplaceCurrentToken:
      ReadOnly(kind);
      Expect(args, 1);
      return scanner_.ReplaceCurrentToken(args[0].toString());
    case kScanString:
      if (IsPut(kind)) {
        Expect(args, 1);
        scanner_.SetScanString(args[0].toString());
        return {};
      }
      Expect(args, 0);
      return scanner_.ScanString();
    case kCurrentToken:
      ReadOnly(kind);
      Expect(args, 0);
      return scanner_.CurrentToken();
    case kDelimitors:
      if (IsPut(kind)) {
        Expect(args, 1);
        ObjectPtr given = args[0].toObject();
        if (!given) {
          scanner_.SetDelimitors({});
          return {};
        }
        auto* set = dynamic_cast<DelimitersObject*>(given.get());
        if (!set) throw AutomationError(vberr::kTypeMismatch);
        // Copied first: the set may be this scanner's own.
        std::vector<std::string> copy = set->owner().scanner_.Delimitors();
        scanner_.SetDelimitors(std::move(copy));
        return {};
      }
      Expect(args, 0);
      return Variant(ObjectPtr(std::make_shared<DelimitersObject>(shared_from_this())));
    default:
      throw AutomationError(vberr::kNoSuchMember);
  }
}

// -------------------------------------------------------------- Delimiters

DispId DelimitersObject::IdOfName(std::string_view name) {
  static constexpr Name kNames[] = {{"Count", kCount},   {"Exists", kExists},       {"Add", kAdd},
                                    {"Remove", kRemove}, {"RemoveAll", kRemoveAll}, {"CompareMode", kCompareMode}};
  return Find(kNames, name);
}

Variant DelimitersObject::Invoke(DispId id, CallKind kind, std::span<Variant> args) {
  ReadOnly(kind);
  TokenScanner& scanner = owner_->scanner();
  const std::vector<std::string>& keys = scanner.Delimitors();
  switch (id) {
    case kCount:
      Expect(args, 0);
      return static_cast<int32_t>(keys.size());
    case kExists: {
      Expect(args, 1);
      const std::string key = args[0].toString();
      return std::find(keys.begin(), keys.end(), key) != keys.end();
    }
    case kAdd: {
      Expect(args, 2, 1);
      const std::string key = args[0].toString();
      if (std::find(keys.begin(), keys.end(), key) != keys.end()) throw AutomationError(vberr::kDuplicateKey);
      std::vector<std::string> next = keys;
      next.push_back(key);
      scanner.SetDelimitors(std::move(next));
      return {};
    }
    case kRemove: {
      Expect(args, 1);
      const std::string key = args[0].toString();
      std::vector<std::string> next = keys;
      auto it = std::find(next.begin(), next.end(), key);
      if (it == next.end()) throw AutomationError(kElementNotFound, "Element not found");
      next.erase(it);
      scanner.SetDelimitors(std::move(next));
      return {};
    }
    case kRemoveAll:
      Expect(args, 0);
      scanner.SetDelimitors({});
      return {};
    case kCompareMode:
      Expect(args, 0);
      return int32_t{0};  // binary: delimiters compare case-sensitively
    default:
      throw AutomationError(vberr::kNoSuchMember);
  }
}

}  // namespace kpx::com
