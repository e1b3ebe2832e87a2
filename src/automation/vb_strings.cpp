#include "automation/vb_strings.h"

#include <cctype>
#include <cerrno>
#include <cmath>
#include <cstdio>
#include <cstdlib>

#include "automation/automation_error.h"
#include "automation/variant.h"

namespace kpx {

std::string LTrim(std::string_view s) {
  size_t b = s.find_first_not_of(' ');
  return b == std::string_view::npos ? std::string() : std::string(s.substr(b));
}

std::string RTrim(std::string_view s) {
  size_t e = s.find_last_not_of(' ');
  return e == std::string_view::npos ? std::string() : std::string(s.substr(0, e + 1));
}

std::string Trim(std::string_view s) { return LTrim(RTrim(s)); }

std::string LCase(std::string_view s) {
  std::string r(s);
  for (char& c : r) c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
  return r;
}

std::string UCase(std::string_view s) {
  std::string r(s);
  for (char& c : r) c = static_cast<char>(std::toupper(static_cast<unsigned char>(c)));
  return r;
}

size_t InStr(size_t start, std::string_view s, std::string_view find) {
  if (start < 1 || start > s.size() + 1) return 0;
  size_t p = s.find(find, start - 1);
  return p == std::string_view::npos ? 0 : p + 1;
}

size_t InStrRev(std::string_view s, std::string_view find) {
  size_t p = s.rfind(find);
  return p == std::string_view::npos ? 0 : p + 1;
}

std::string Mid(std::string_view s, size_t start, size_t length) {
  if (start < 1 || start > s.size()) return {};
  return std::string(s.substr(start - 1, length));
}

std::string Left(std::string_view s, size_t length) { return std::string(s.substr(0, length)); }

std::string Right(std::string_view s, size_t length) {
  return length >= s.size() ? std::string(s) : std::string(s.substr(s.size() - length));
}

namespace {

// ASCII letters folded in place: what std::tolower does in the "C" locale,
// without a library call per character (keyed maps compare long keys
// often).
inline int FoldAscii(char c) {
  const auto u = static_cast<unsigned char>(c);
  return u >= 'A' && u <= 'Z' ? u + ('a' - 'A') : u;
}

}  // namespace

bool EqualsNoCase(std::string_view a, std::string_view b) {
  if (a.size() != b.size()) return false;
  for (size_t i = 0; i < a.size(); ++i)
    if (FoldAscii(a[i]) != FoldAscii(b[i])) return false;
  return true;
}

bool NoCaseLess::operator()(std::string_view a, std::string_view b) const {
  const size_t n = a.size() < b.size() ? a.size() : b.size();
  for (size_t i = 0; i < n; ++i) {
    const int x = FoldAscii(a[i]), y = FoldAscii(b[i]);
    if (x != y) return x < y;
  }
  return a.size() < b.size();
}

size_t DecimalNumberLength(std::string_view s) {
  auto isDigit = [&](size_t at) { return at < s.size() && std::isdigit(static_cast<unsigned char>(s[at])); };
  size_t i = 0;
  if (i < s.size() && (s[i] == '+' || s[i] == '-')) ++i;
  size_t digits = 0;
  while (isDigit(i)) ++i, ++digits;
  if (i < s.size() && s[i] == '.') {
    ++i;
    while (isDigit(i)) ++i, ++digits;
  }
  if (digits == 0) return 0;
  if (i < s.size() && (s[i] == 'e' || s[i] == 'E')) {
    size_t j = i + 1;
    if (j < s.size() && (s[j] == '+' || s[j] == '-')) ++j;
    if (isDigit(j)) {
      while (isDigit(j)) ++j;
      i = j;
    }
  }
  return i;
}

double DecimalNumberValue(std::string_view number) {
  const std::string text(number);
  errno = 0;
  const double d = std::strtod(text.c_str(), nullptr);
  // strtod saturates to infinity beyond the largest Double; below the
  // smallest it gives 0 or a denormal, which is what VB reads there too.
  if (errno == ERANGE && std::isinf(d)) throw AutomationError(vberr::kOverflow);
  return d;
}

double Val(std::string_view s) {
  std::string t;
  for (char c : s)
    if (c != ' ' && c != '\t' && c != '\n' && c != '\r') t += c;  // Val skips white space everywhere
  if (t.size() > 2 && t[0] == '&' && (t[1] == 'H' || t[1] == 'h'))
    return static_cast<double>(static_cast<int32_t>(std::strtoul(t.c_str() + 2, nullptr, 16)));
  const size_t length = DecimalNumberLength(t);
  return length == 0 ? 0 : DecimalNumberValue(std::string_view(t).substr(0, length));
}

double RoundHalfEven(double d) { return std::nearbyint(d); }  // the default rounding mode is to-even

namespace {
std::string FormatG(double d, int digits) {
  char buf[64];
  std::snprintf(buf, sizeof buf, "%.*G", digits, d);
  std::string s = buf;
  return s;
}
}  // namespace

std::string FormatSingle(float f) { return FormatG(f, 7); }
std::string FormatDouble(double d) { return FormatG(d, 15); }

bool EqualsBool(const Variant& v, bool b) {
  if (v.isEmpty()) return !b;
  if (!v.isNumeric() && !v.isString()) return false;
  try {
    return v.toDouble() == (b ? -1.0 : 0.0);
  } catch (...) {
    return false;
  }
}

}  // namespace kpx
