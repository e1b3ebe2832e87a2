// Token scanner against arbitrary texts and delimiter lists: every token is
// non-empty, holds no delimiter character and is not a delimiter itself;
// replacing every token and scanning again yields only the replacements.
#include <cstdint>
#include <cstdlib>
#include <string>
#include <string_view>

#include "shared/token_scanner.h"

namespace {

void Require(bool condition) {
  if (!condition) std::abort();
}

bool IsDelimiter(const kpx::TokenScanner& s, std::string_view text) {
  for (const std::string& d : s.Delimitors())
    if (d == text) return true;
  return false;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  std::string_view input(reinterpret_cast<const char*>(data), size);
  const size_t split = input.find('\n');
  if (split == std::string_view::npos) return 0;
  const std::string_view delimiters = input.substr(0, split);
  const std::string_view text = input.substr(split + 1);

  kpx::TokenScanner scanner;
  if (!scanner.Init(text, delimiters)) return 0;
  size_t tokens = 0;
  for (std::string t = scanner.NextToken(); !t.empty(); t = scanner.NextToken()) {
    Require(!IsDelimiter(scanner, t));
    for (char c : t) Require(!IsDelimiter(scanner, std::string_view(&c, 1)));
    Require(++tokens <= text.size());
  }

  // "#" stands in for every token, unless it is a delimiter itself.
  if (IsDelimiter(scanner, "#")) return 0;
  for (const std::string& d : scanner.Delimitors())
    if (d.find('#') != std::string::npos) return 0;
  scanner.Init(text, delimiters);
  for (std::string t = scanner.NextToken(); !t.empty(); t = scanner.NextToken()) Require(scanner.ReplaceCurrentToken("#"));
  const std::string replaced = scanner.ScanString();
  scanner.Init(replaced, delimiters);
  size_t again = 0;
  for (std::string t = scanner.NextToken(); !t.empty(); t = scanner.NextToken(), ++again) Require(t == "#");
  Require(again == tokens);
  return 0;
}
