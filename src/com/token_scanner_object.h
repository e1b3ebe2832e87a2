// kpxAddIn.TokenScanner: the core's TokenScanner as an automation object,
// with its delimiter set offered as a small keyed collection.
#pragma once

#include <memory>
#include <string_view>

#include "automation/object.h"
#include "shared/token_scanner.h"

namespace kpx::com {

class TokenScannerObject final : public Object, public std::enable_shared_from_this<TokenScannerObject> {
 public:
  // Dispatch ids, as the type library declares them.
  enum : DispId { kInit = 1, kNextToken, kReplaceCurrentToken, kScanString, kCurrentToken, kDelimitors };

  DispId IdOfName(std::string_view name) override;
  Variant Invoke(DispId id, CallKind kind, std::span<Variant> args) override;

  TokenScanner& scanner() { return scanner_; }

 private:
  TokenScanner scanner_;
};

// The delimiters of one scanner; a live view, not a copy.
class DelimitersObject final : public Object {
 public:
  enum : DispId { kCount = 1, kExists, kAdd, kRemove, kRemoveAll, kCompareMode };

  explicit DelimitersObject(std::shared_ptr<TokenScannerObject> owner) : owner_(std::move(owner)) {}

  DispId IdOfName(std::string_view name) override;
  Variant Invoke(DispId id, CallKind kind, std::span<Variant> args) override;

  const TokenScannerObject& owner() const { return *owner_; }

 private:
  std::shared_ptr<TokenScannerObject> owner_;
};

}  // namespace kpx::com
