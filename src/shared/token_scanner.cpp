#include "shared/token_scanner.h"

#include <algorithm>

#include "shared/host_ids.h"
#include "automation/vb_strings.h"

namespace kpx {

bool TokenScanner::IsDelimiter(std::string_view s) const {
  if (externalTest_) return externalTest_(s);
  if (s.size() == 1) return singleChar_[static_cast<unsigned char>(s[0])];
  return std::find(delimitors_.begin(), delimitors_.end(), s) != delimitors_.end();
}

bool TokenScanner::IsDelimiterChar(char c) const {
  if (externalTest_) return externalTest_(std::string_view(&c, 1));
  return singleChar_[static_cast<unsigned char>(c)];
}

void TokenScanner::AddDelimiter(std::string_view d) {
  if (d.empty() || std::find(delimitors_.begin(), delimitors_.end(), d) != delimitors_.end()) return;
  delimitors_.emplace_back(d);
  if (d.size() == 1) singleChar_.set(static_cast<unsigned char>(d[0]));
}

void TokenScanner::SetDelimitors(std::vector<std::string> delimitors) {
  delimitors_.clear();
  singleChar_.reset();
  externalTest_ = nullptr;
  for (const std::string& d : delimitors) AddDelimiter(d);
}

const std::string& TokenScanner::ScanString() {
  if (sourceOffset_ < source_.size()) head_.append(source_, sourceOffset_, std::string::npos);
  source_.clear();
  sourceOffset_ = 0;
  return head_;
}

void TokenScanner::SetScanString(std::string s) {
  head_.clear();
  source_ = std::move(s);
  sourceOffset_ = 0;
}

std::string TokenScanner::Slice(size_t from, size_t count) const {
  if (from >= head_.size()) return source_.substr(sourceOffset_ + (from - head_.size()), count);
  if (from + count <= head_.size()) return head_.substr(from, count);
  std::string out = head_.substr(from);
  out.append(source_, sourceOffset_, count - out.size());
  return out;
}

bool TokenScanner::Init(std::string_view theScanString, std::string_view theDelimitors) {
  SetScanString(std::string(theScanString));
  position_ = 0;
  tokenStart_ = 0;
  currentToken_.clear();
  if (theDelimitors.empty()) return false;

  const char separator = theDelimitors[0];
  std::string_view list = theDelimitors.substr(1);
  SetDelimitors({});
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
  const int32_t length = static_cast<int32_t>(Length());
  // Empty tokens and tokens that are delimiters themselves are skipped by
  // looping rather than recursing: a long run of delimiters is one call.
  for (;;) {
    currentToken_.clear();
    tokenStart_ = position_;
    do {
      ++position_;
    } while (position_ <= length && !IsDelimiterChar(At(static_cast<size_t>(position_ - 1))));
    if (position_ - tokenStart_ > 1) {
      currentToken_ = Slice(static_cast<size_t>(tokenStart_), static_cast<size_t>(position_ - tokenStart_ - 1));
      if (!IsDelimiter(currentToken_)) return currentToken_;
    } else if (position_ >= length) {
      return currentToken_;
    }
  }
}

bool TokenScanner::ReplaceCurrentToken(std::string_view aString) {
  if (currentToken_.empty()) return false;
  const size_t oldLength = Length();
  const size_t start = static_cast<size_t>(tokenStart_);
  // Where the kept rest begins: the delimiter that ended the token.
  const size_t rest = static_cast<size_t>(position_) <= oldLength ? static_cast<size_t>(position_ - 1) : oldLength;
  const size_t headSize = head_.size();
  if (rest >= headSize) {
    // The usual case: the token lies at or past the end of the finished
    // head. The text before it joins the head, the rest stays where it is.
    const size_t restInSource = sourceOffset_ + (rest - headSize);
    if (start >= headSize)
      head_.append(source_, sourceOffset_, start - headSize);
    else
      head_.resize(start);  // the same token replaced again
    head_.append(aString);
    sourceOffset_ = restInSource;
  } else {
    head_.replace(start, rest - start, aString);
  }
  position_ += static_cast<int32_t>(Length()) - static_cast<int32_t>(oldLength);
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
