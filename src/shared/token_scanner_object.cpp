#include "shared/token_scanner_object.h"

#include <string>

#include "automation/automation_error.h"
#include "automation/dictionary.h"
#include "automation/error_styles.h"
#include "automation/vb_strings.h"

namespace kpx {

namespace {

// Exactly `count` arguments.
void Expect(std::span<Variant> args, size_t count) {
  if (args.size() > count) throw AutomationError(vberr::kWrongArgCount);
  if (args.size() < count) throw AutomationError(vberr::kArgNotOptional);
}

bool IsPut(CallKind kind) { return kind == CallKind::PropertyPut || kind == CallKind::PropertyPutRef; }

// Reading members accept method and property-get calls alike, as automation
// clients mix them; writing one that cannot be written is 438.
void ReadOnly(CallKind kind) {
  if (IsPut(kind)) throw AutomationError(vberr::kNoSuchMember);
}

}  // namespace

DispId TokenScannerObject::IdOfName(std::string_view name) {
  static constexpr std::pair<const char*, DispId> kNames[] = {{"Init", kInit},
                                                              {"NextToken", kNextToken},
                                                              {"ReplaceCurrentToken", kReplaceCurrentToken},
                                                              {"ScanString", kScanString},
                                                              {"CurrentToken", kCurrentToken},
                                                              {"Delimitors", kDelimitors}};
  for (const auto& [n, id] : kNames)
    if (EqualsNoCase(n, name)) return id;
  throw AutomationError(vberr::kNoSuchMember);
}

Variant TokenScannerObject::Invoke(DispId id, CallKind kind, std::span<Variant> args) {
  switch (id) {
    case kInit: {
      ReadOnly(kind);
      Expect(args, 2);
      const std::string list = args[1].toString();
      const bool initialised = scanner_.Init(args[0].toString(), list);
      if (initialised) {
        // A new set of its own: a dictionary handed out before is no longer it.
        dictionary_ = nullptr;
        hasDelimiters_ = true;
      }
      return initialised;
    }
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
        SetDelimitors(args[0].toObject());
        return {};
      }
      Expect(args, 0);
      return Delimitors();
    default:
      throw AutomationError(vberr::kNoSuchMember);
  }
}

ObjectPtr TokenScannerObject::Delimitors() {
  if (!hasDelimiters_) return nullptr;
  if (!dictionary_) {
    ObjectPtr dictionary = objects_.CreateDictionary();
    CallByName(dictionary, "CompareMode", CallKind::PropertyPut, {Variant(Dictionary::kBinaryCompare)});
    const DispId add = dictionary->IdOfName("Add");
    for (const std::string& d : scanner_.Delimitors()) CallMethod(dictionary, add, {Variant(d), Variant("")});
    const DispId exists = dictionary->IdOfName("Exists");
    Attach(std::move(dictionary), exists);
  }
  return dictionary_;
}

void TokenScannerObject::SetDelimitors(ObjectPtr dictionary) {
  if (!dictionary) {
    dictionary_ = nullptr;
    hasDelimiters_ = false;
    scanner_.SetDelimitors({});
    return;
  }
  // Only a dictionary will do: anything else is refused before the
  // scanner's set changes.
  DispId exists = 0;
  try {
    exists = dictionary->IdOfName("Exists");
  } catch (const AutomationError&) {
    throw AutomationError(vberr::kTypeMismatch);
  }
  // Delimiters compare case-sensitively. A dictionary that already holds
  // keys cannot change how it compares them, and keeps its own way.
  ResumeNext onError;
  onError([&] { CallByName(dictionary, "CompareMode", CallKind::PropertyPut, {Variant(Dictionary::kBinaryCompare)}); });
  hasDelimiters_ = true;
  Attach(std::move(dictionary), exists);
}

void TokenScannerObject::Attach(ObjectPtr dictionary, DispId exists) {
  dictionary_ = std::move(dictionary);
  if (auto* own = dynamic_cast<Dictionary*>(dictionary_.get())) {
    // The add-in's own dictionary is asked directly; the test keeps it alive.
    scanner_.UseDelimiterTest([own, keep = dictionary_](std::string_view key) { return own->Exists(key); });
    return;
  }
  scanner_.UseDelimiterTest([d = dictionary_, exists](std::string_view key) {
    return CallMethod(d, exists, {Variant(std::string(key))}).toBool();
  });
}

}  // namespace kpx
