// Cuts a text into tokens at one-character delimiters and can replace the
// token just read in place. Also offered to companion components.
#pragma once

#include <bitset>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "automation/object.h"

namespace kpx {

class TokenScanner {
 public:
  // Sets up a scan. The delimiter list's first character separates the
  // delimiters that follow ("|,|;| |" means ",", ";" and " "); that
  // character doubled anywhere makes it a delimiter too. False, with the old
  // delimiters kept, when the list is empty.
  bool Init(std::string_view theScanString, std::string_view theDelimitors);
  // The next non-empty token, "" when the text is used up.
  std::string NextToken();
  // Replaces the token last returned, keeping the delimiters around it.
  bool ReplaceCurrentToken(std::string_view aString);

  const std::string& ScanString() const { return scanString_; }
  void SetScanString(std::string s) { scanString_ = std::move(s); }
  const std::string& CurrentToken() const { return currentToken_; }
  // The delimiters, in the order they were added; compared case-sensitively.
  const std::vector<std::string>& Delimitors() const { return delimitors_; }
  void SetDelimitors(std::vector<std::string> delimitors);

 private:
  bool IsDelimiter(std::string_view s) const;
  void AddDelimiter(std::string_view d);

  std::string scanString_;
  std::string currentToken_;
  int32_t position_ = 0;    // delimiter that ended the last token (1-based)
  int32_t tokenStart_ = 0;  // position when the last NextToken began
  std::vector<std::string> delimitors_;
  std::bitset<256> singleChar_;  // the one-character delimiters, for the scan
};

// Whether the element's stereotype text holds `stereotype` as one of its
// ",", ";" or blank separated tokens, ignoring case. Host failures propagate.
bool HasStereotype(std::string_view stereotype, const ObjectPtr& element);

}  // namespace kpx
