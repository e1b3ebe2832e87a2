#include "sim/values.h"

namespace kpx::sim {

std::optional<Variant> PlainValue(const InputJson& j) {
  if (j.is_null()) return Variant();
  if (j.is_boolean()) return Variant(j.get<bool>());
  if (j.is_number_float()) return Variant(j.get<double>());
  if (j.is_number()) return Variant(j.get<int32_t>());
  if (j.is_string()) {
    const std::string& s = j.get_ref<const std::string&>();
    if (s == "$app" || s == "$model") return std::nullopt;
    return Variant(s);
  }
  if (!j.is_object() || j.size() != 1) return std::nullopt;
  const std::string& form = j.begin().key();
  const InputJson& v = j.begin().value();
  if (form == "string") return Variant(v.get<std::string>());
  if (form == "i2") return Variant(static_cast<int16_t>(v.get<int>()));
  if (form == "i4") return Variant(v.get<int32_t>());
  if (form == "r4") return Variant(v.get<float>());
  if (form == "r8") return Variant(v.get<double>());
  if (form == "date") return Variant::Date(v.get<double>());
  if (form == "bool") return Variant(v.get<bool>());
  if (form == "null") return Variant::Null();
  if (form == "nothing") return Variant::Nothing();
  return std::nullopt;
}

}  // namespace kpx::sim
