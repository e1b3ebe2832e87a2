// The VARIANT kinds the add-in meets, with VB's conversion rules.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <variant>

namespace kpx {

class Object;
using ObjectPtr = std::shared_ptr<Object>;

enum class VarType : uint8_t {
  Empty,
  Null,
  Boolean,
  Integer,  // 16-bit
  Long,     // 32-bit
  Single,
  Double,
  String,   // UTF-8 text; converted to and from BSTR at the COM boundary
  Date,     // days since 30 Dec 1899, fraction = time of day
  Object,   // an object or Nothing
  ByRef,    // refers to a Variant the caller owns
};

// VB's True is -1.
inline constexpr int16_t kVbTrue = -1;
inline constexpr int16_t kVbFalse = 0;

class Variant {
 public:
  Variant() = default;
  Variant(bool v) : value_(v) {}
  Variant(int16_t v) : value_(v) {}
  Variant(int32_t v) : value_(v) {}
  Variant(float v) : value_(v) {}
  Variant(double v) : value_(v) {}
  Variant(std::string v) : value_(std::move(v)) {}
  Variant(const char* v) : value_(std::string(v)) {}
  Variant(ObjectPtr v) : value_(std::move(v)) {}

  static Variant Null() { Variant v; v.value_ = NullTag{}; return v; }
  static Variant Nothing() { return Variant(ObjectPtr{}); }
  static Variant Date(double days) { Variant v; v.value_ = DateTag{days}; return v; }
  // A by-reference argument: the callee reads and writes `*target`.
  static Variant Ref(Variant* target) { Variant v; v.value_ = target; return v; }

  // The kind of this variant itself (ByRef for a reference).
  VarType type() const noexcept { return static_cast<VarType>(value_.index()); }
  // The kind of the value, looking through a reference.
  VarType valueType() const noexcept { return deref().type(); }

  const Variant& deref() const noexcept;
  Variant& deref() noexcept;
  bool isByRef() const noexcept { return type() == VarType::ByRef; }

  bool isEmpty() const noexcept { return valueType() == VarType::Empty; }
  bool isNull() const noexcept { return valueType() == VarType::Null; }
  bool isObject() const noexcept { return valueType() == VarType::Object; }
  bool isString() const noexcept { return valueType() == VarType::String; }
  bool isNumeric() const noexcept;
  // Nothing, or an object-typed variant holding no object.
  bool isNothing() const noexcept { return isObject() && !deref().objectOrNull(); }

  // VB's CBool, CInt, CLng, CSng, CDbl, CStr. Raise 13 (type mismatch),
  // 6 (overflow) or 94 (invalid use of Null) as VB does.
  bool toBool() const;
  int16_t toInt16() const;
  int32_t toInt32() const;
  float toSingle() const;
  double toDouble() const;
  std::string toString() const;
  double toDate() const;
  // The object (possibly Nothing); raises 424 for a non-object value.
  ObjectPtr toObject() const;

  // Raw access for code that has checked the type.
  ObjectPtr objectOrNull() const noexcept;
  const std::string& stringRef() const;

  // Stores `v` where this variant refers (through a reference), else here.
  void assign(Variant v);

  // Identity of kind and value; objects compare by pointer. Not VB's "=".
  friend bool operator==(const Variant& a, const Variant& b);

 private:
  struct NullTag { bool operator==(const NullTag&) const = default; };
  struct DateTag { double days; bool operator==(const DateTag&) const = default; };
  std::variant<std::monostate, NullTag, bool, int16_t, int32_t, float, double, std::string, DateTag,
               ObjectPtr, Variant*>
      value_;
};

const char* VarTypeName(VarType t);

}  // namespace kpx
