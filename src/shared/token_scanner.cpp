#include "shared/token_scanner.h"

#include <algorithm>

#include "shared/host_ids.h"
#include "automation/vb_strings.h"

namespace kpx {

bool TokenScanner::IsDelimiter(std::string_view s) const {
  if (s.size() == 1) return singleChar_[static_cast<unsigned char>(s[0])];
  return std::find(delimitors_.begin(), delimitors_.end(), s) != delimitors_.end();
}

void TokenScanner::AddDelimiter(std::string_view d) {
  if (d.empty() || IsDelimiter(d)) return;
  delimitors_.emplace_back(d);
  if (d.size() == 1) singleChar_.set(static_cast<unsigned char>(d[0]));
}

void TokenScanner::SetDelimitors(std::vector<std::string> delimitors) {
  delimitors_.clear();
  singleChar_.reset();
  for (const std::string& d : delimitors) AddDelimiter(d);
}

bool TokenScanner::Init(std::string_view theScanString, std::string_view theDelimitors) {
  scanString_ = theScanString;
  position_ = 0;
  tokenStart_ = 0;
  currentToken_.clear();
  if (theDelimitors.empty()) return false;

  const char separator = theDelimitors[0];
  std::string_view list = theDelimitors.substr(1);
  delimitors_.clear();
  singleChar_.reset();
  size_t from = 0;
  for (size_t at = list.find(separator); at != std::string_view::npos; at = list.find(separator, from)) {
    AddDelimiter(list.substr(from, at - from));
    from = at + 1;
  }
  AddDelimiter(list.substr(from));
  const char doubled[] = {separator, separator, '\0'};
  if (theDelimitors.find(doubled) != std::string_view::npos) AddDelimiter(std::string_view(&separator, 1));
  return true;
}

std::string TokenScanner::NextToken() {
  const int32_t length = static_cast<int32_t>(scanString_.size());
  // Empty tokens and tokens that are delimiters themselves are skipped by
  // looping rather than recursing: a long run of delimiters is one call.
  for (;;) {
    currentToken_.clear();
    tokenStart_ = position_;
    do {
      ++position_;
    } while (position_ <= length &&
             !singleChar_[static_cast<unsigned char>(scanString_[static_cast<size_t>(position_ - 1)])]);
    if (position_ - tokenStart_ > 1) {
      currentToken_ = scanString_.substr(static_cast<size_t>(tokenStart_), static_cast<size_t>(position_ - tokenStart_ - 1));
      if (!IsDelimiter(currentToken_)) return currentToken_;
    } else if (position_ >= length) {
      return currentToken_;
    }
  }
}

bool TokenScanner::ReplaceCurrentToken(std::string_view aString) {
  if (currentToken_.empty()) return false;
  const int32_t oldLength = static_cast<int32_t>(scanString_.size());
  std::string tail = position_ <= oldLength ? scanString_.substr(static_cast<size_t>(position_ - 1)) : std::string();
  scanString_ = scanString_.substr(0, static_cast<size_t>(tokenStart_)) + std::string(aString) + tail;
  position_ += static_cast<int32_t>(scanString_.size()) - oldLength;
  return true;
}

bool HasStereotype(std::string_view stereotype, const ObjectPtr& element) {
  std::string text = LCase(GetProperty(element, hostid::kStereotype).toString());
  if (text.empty()) return false;
  std::string wanted = LCase(stereotype);
  TokenScanner scanner;
  scanner.Init(text, "|,|;| |");
  for (std::string token = scanner.NextToken(); !token.empty(); token = scanner.NextToken())
    if (token == wanted) return true;
  return false;
}

}  // namespace kpx
