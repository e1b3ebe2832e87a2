#include "automation/variant.h"

#include <cctype>
#include <charconv>
#include <cmath>
#include <limits>
#include <string_view>

#include "automation/automation_error.h"
#include "automation/vb_strings.h"

namespace kpx {

const Variant& Variant::deref() const noexcept {
  const Variant* v = this;
  while (v->type() == VarType::ByRef) v = std::get<Variant*>(v->value_);
  return *v;
}

Variant& Variant::deref() noexcept {
  Variant* v = this;
  while (v->type() == VarType::ByRef) v = std::get<Variant*>(v->value_);
  return *v;
}

bool Variant::isNumeric() const noexcept {
  switch (valueType()) {
    case VarType::Boolean: case VarType::Integer: case VarType::Long:
    case VarType::Single: case VarType::Double:
      return true;
    default:
      return false;
  }
}

namespace {

[[noreturn]] void TypeMismatch() { throw AutomationError(vberr::kTypeMismatch); }

// A string converts to a number only when all of it is a number
// (CDbl("12x") fails): a decimal number as VB writes it, or "&H" and up to
// 32 bits of hex digits. C's own readers would also take "inf", "nan", hex
// floats ("0x1p4") and signs inside the hex digits, which VB does not.
double StringToDouble(const std::string& s) {
  const std::string trimmed = Trim(s);
  std::string_view t = trimmed;
  // Leading white space of any kind is skipped; trailing only blanks.
  while (!t.empty() && std::isspace(static_cast<unsigned char>(t.front()))) t.remove_prefix(1);
  if (t.empty()) TypeMismatch();
  if (EqualsNoCase(t, "true")) return -1;
  if (EqualsNoCase(t, "false")) return 0;
  if (t.size() > 2 && t[0] == '&' && (t[1] == 'H' || t[1] == 'h')) {
    uint64_t u = 0;
    const char* end = t.data() + t.size();
    const auto [stop, error] = std::from_chars(t.data() + 2, end, u, 16);
    if (stop != end) TypeMismatch();
    if (error == std::errc::result_out_of_range || u > 0xFFFFFFFFu) throw AutomationError(vberr::kOverflow);
    return static_cast<int32_t>(static_cast<uint32_t>(u));
  }
  if (DecimalNumberLength(t) != t.size()) TypeMismatch();
  return DecimalNumberValue(t);
}

}  // namespace

double Variant::toDouble() const {
  const Variant& v = deref();
  switch (v.type()) {
    case VarType::Empty: return 0;
    case VarType::Null: throw AutomationError(vberr::kInvalidUseOfNull);
    case VarType::Boolean: return std::get<bool>(v.value_) ? -1 : 0;
    case VarType::Integer: return std::get<int16_t>(v.value_);
    case VarType::Long: return std::get<int32_t>(v.value_);
    case VarType::Single: return std::get<float>(v.value_);
    case VarType::Double: return std::get<double>(v.value_);
    case VarType::String: return StringToDouble(std::get<std::string>(v.value_));
    case VarType::Date: return std::get<DateTag>(v.value_).days;
    default: TypeMismatch();
  }
}

float Variant::toSingle() const {
  double d = toDouble();
  if (std::isfinite(d) && std::fabs(d) > std::numeric_limits<float>::max())
    throw AutomationError(vberr::kOverflow);
  return static_cast<float>(d);
}

int32_t Variant::toInt32() const {
  const Variant& v = deref();
  if (v.type() == VarType::Long) return std::get<int32_t>(v.value_);
  double r = RoundHalfEven(toDouble());
  if (!(r >= -2147483648.0 && r <= 2147483647.0)) throw AutomationError(vberr::kOverflow);
  return static_cast<int32_t>(r);
}

int16_t Variant::toInt16() const {
  double r = RoundHalfEven(toDouble());
  if (!(r >= -32768.0 && r <= 32767.0)) throw AutomationError(vberr::kOverflow);
  return static_cast<int16_t>(r);
}

bool Variant::toBool() const {
  const Variant& v = deref();
  if (v.type() == VarType::Boolean) return std::get<bool>(v.value_);
  return toDouble() != 0;
}

std::string Variant::toString() const {
  const Variant& v = deref();
  switch (v.type()) {
    case VarType::Empty: return {};
    case VarType::Null: throw AutomationError(vberr::kInvalidUseOfNull);
    case VarType::Boolean: return std::get<bool>(v.value_) ? "True" : "False";
    case VarType::Integer: return std::to_string(std::get<int16_t>(v.value_));
    case VarType::Long: return std::to_string(std::get<int32_t>(v.value_));
    case VarType::Single: return FormatSingle(std::get<float>(v.value_));
    case VarType::Double: return FormatDouble(std::get<double>(v.value_));
    case VarType::String: return std::get<std::string>(v.value_);
    case VarType::Date: return FormatDouble(std::get<DateTag>(v.value_).days);
    default: TypeMismatch();
  }
}

double Variant::toDate() const {
  const Variant& v = deref();
  if (v.type() == VarType::Date) return std::get<DateTag>(v.value_).days;
  return toDouble();
}

ObjectPtr Variant::toObject() const {
  const Variant& v = deref();
  if (v.type() != VarType::Object) throw AutomationError(vberr::kObjectRequired);
  return std::get<ObjectPtr>(v.value_);
}

ObjectPtr Variant::objectOrNull() const noexcept {
  const Variant& v = deref();
  if (v.type() != VarType::Object) return {};
  return std::get<ObjectPtr>(v.value_);
}

const std::string& Variant::stringRef() const {
  const Variant& v = deref();
  if (v.type() != VarType::String) TypeMismatch();
  return std::get<std::string>(v.value_);
}

void Variant::assign(Variant v) { deref() = std::move(v); }

bool operator==(const Variant& a, const Variant& b) { return a.value_ == b.value_; }

const char* VarTypeName(VarType t) {
  switch (t) {
    case VarType::Empty: return "empty";
    case VarType::Null: return "null";
    case VarType::Boolean: return "bool";
    case VarType::Integer: return "i2";
    case VarType::Long: return "i4";
    case VarType::Single: return "r4";
    case VarType::Double: return "r8";
    case VarType::String: return "string";
    case VarType::Date: return "date";
    case VarType::Object: return "object";
    case VarType::ByRef: return "byref";
  }
  return "?";
}

}  // namespace kpx
