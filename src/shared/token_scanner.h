// Cuts a text into tokens at one-character delimiters and can replace the
// token just read in place. Also offered to companion components.
#pragma once

#include <bitset>
#include <cstdint>
#include <functional>
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

  const std::string& ScanString();
  void SetScanString(std::string s);
  const std::string& CurrentToken() const { return currentToken_; }
  // The scanner's own delimiters, in the order they were added; compared
  // case-sensitively.
  const std::vector<std::string>& Delimitors() const { return delimitors_; }
  void SetDelimitors(std::vector<std::string> delimitors);
  // Delimiters held outside the scanner (a set its caller may change at any
  // time): asked about every character. An empty test goes back to the
  // scanner's own set.
  void UseDelimiterTest(std::function<bool(std::string_view)> test) { externalTest_ = std::move(test); }

 private:
  bool IsDelimiter(std::string_view s) const;
  bool IsDelimiterChar(char c) const;
  void AddDelimiter(std::string_view d);
  // The text is kept as a finished head and the rest of the text it was
  // given, so that replacing token after token copies each character once.
  size_t Length() const { return head_.size() + (source_.size() - sourceOffset_); }
  char At(size_t index) const {
    return index < head_.size() ? head_[index] : source_[sourceOffset_ + (index - head_.size())];
  }
  std::string Slice(size_t from, size_t count) const;

  std::string head_;
  std::string source_;
  size_t sourceOffset_ = 0;
  std::string currentToken_;
  int32_t position_ = 0;    // delimiter that ended the last token (1-based)
  int32_t tokenStart_ = 0;  // position when the last NextToken began
  std::vector<std::string> delimitors_;
  std::bitset<256> singleChar_;  // the one-character delimiters, for the scan
  std::function<bool(std::string_view)> externalTest_;
};

// Whether the element's stereotype text holds `stereotype` as one of its
// ",", ";" or blank separated tokens, ignoring case. Host failures propagate.
bool HasStereotype(std::string_view stereotype, const ObjectPtr& element);

}  // namespace kpx
