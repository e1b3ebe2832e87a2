// kpxAddIn.TokenScanner: the token scanner as an automation object. Its
// delimiters are a dictionary (the Scripting Runtime's where there is one):
// a caller may take it, change it, or give the scanner one of its own.
#pragma once

#include <optional>
#include <string_view>

#include "automation/object.h"
#include "platform/platform.h"
#include "shared/token_scanner.h"

namespace kpx {

class TokenScannerObject final : public Object {
 public:
  // Dispatch ids, as the type library declares them.
  enum : DispId { kInit = 1, kNextToken, kReplaceCurrentToken, kScanString, kCurrentToken, kDelimitors };

  explicit TokenScannerObject(platform::ObjectFactory& objects) : objects_(objects) {}

  DispId IdOfName(std::string_view name) override;
  Variant Invoke(DispId id, CallKind kind, std::span<Variant> args) override;

  TokenScanner& scanner() { return scanner_; }

 private:
  ObjectPtr Delimitors();
  void SetDelimitors(ObjectPtr dictionary);
  // From now on the scanner asks the dictionary, which others may change.
  void Attach(ObjectPtr dictionary, DispId exists);

  platform::ObjectFactory& objects_;
  TokenScanner scanner_;
  // The delimiters as a dictionary, once someone has seen or given one; until
  // then the scanner's own set is the whole truth and no dictionary exists.
  ObjectPtr dictionary_;
  // Whether there are delimiters at all: none before the first Init with a
  // list, or after Nothing was given.
  bool hasDelimiters_ = false;
};

}  // namespace kpx
