// The VB string and number rules the add-in relies on, in one place.
// Positions are 1-based as in VB; text is UTF-8 and positions count bytes.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

namespace kpx {

class Variant;

// Trim, LTrim, RTrim strip blanks (" ") only, never tabs or line breaks.
std::string Trim(std::string_view s);
std::string LTrim(std::string_view s);
std::string RTrim(std::string_view s);

// ASCII case mapping, as VB does for the texts the add-in compares.
std::string LCase(std::string_view s);
std::string UCase(std::string_view s);

// InStr(start, s, find): 1-based position of `find` in `s` at or after
// `start`, 0 when absent. An empty `find` is found at `start` (when start <= Len + 1).
size_t InStr(size_t start, std::string_view s, std::string_view find);
inline size_t InStr(std::string_view s, std::string_view find) { return InStr(1, s, find); }
// InStrRev(s, find): 1-based position of the last occurrence, 0 when absent.
size_t InStrRev(std::string_view s, std::string_view find);

// Mid(s, start[, length]), Left, Right, clamped as VB clamps them.
std::string Mid(std::string_view s, size_t start, size_t length = std::string_view::npos);
std::string Left(std::string_view s, size_t length);
std::string Right(std::string_view s, size_t length);

// Case-insensitive equality (StrComp with vbTextCompare == 0) for ASCII text.
bool EqualsNoCase(std::string_view a, std::string_view b);

// Orders keys without regard to case, as VB's keyed collections compare them.
struct NoCaseLess {
  bool operator()(std::string_view a, std::string_view b) const;
  using is_transparent = void;
};

// Val: the leading number of a text (blanks skipped, stops at the first
// character that cannot continue it), 0 when there is none. "&H" hex is read.
// A number beyond a Double's range raises 6 (overflow).
double Val(std::string_view s);

// How VB writes a decimal number: an optional sign, digits with at most one
// decimal point, an optional exponent ("e" or "E", a sign, digits). The
// length of the longest leading part of `s` written so, 0 when none is.
size_t DecimalNumberLength(std::string_view s);
// The value of such a number; raises 6 (overflow) beyond a Double's range.
double DecimalNumberValue(std::string_view number);

// Rounding to a whole number with ties to even (VB's CInt, CLng, Round).
double RoundHalfEven(double d);

// CStr of a Single (7 significant digits) and of a Double (15).
std::string FormatSingle(float f);
std::string FormatDouble(double d);

// VB's "=" between a variant and a Boolean: Empty equals False, a number
// equals True only when it is -1 after conversion. Used where VB code reads
// `If x = False`.
bool EqualsBool(const Variant& v, bool b);

}  // namespace kpx
