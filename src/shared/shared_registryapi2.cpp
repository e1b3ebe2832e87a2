#include "shared/shared_registryapi2.h"

#include <cstring>
#include <string>

#include "automation/error_styles.h"

namespace kpx {

Variant RegistryQueryValue(platform::Registry& registry, RootKey root, std::string_view keyPath,
                           std::string_view valueName) {
  std::optional<platform::RegistryValue> v = registry.QueryValue(root, keyPath, valueName);
  if (!v) return {};
  switch (v->type) {
    case platform::kRegSz:
      // The reported size counts the terminating NUL: below 2 there is no text.
      if (v->data.size() < 2) return std::string();
      return registry.FromAnsi(std::string_view(v->data).substr(0, v->data.size() - 1));
    case platform::kRegDword: {
      if (v->data.size() != 4) return {};
      uint32_t u = 0;
      for (int i = 3; i >= 0; --i) u = (u << 8) | static_cast<unsigned char>(v->data[i]);
      return static_cast<int32_t>(u);
    }
    default:
      return {};
  }
}

void RegistrySetValue(platform::Registry& registry, RootKey root, std::string_view keyPath,
                      std::string_view valueName, const Variant& value, uint32_t valueType) {
  ResumeNext onError;
  platform::RegistryValue raw{valueType, {}};
  bool converted = false;
  switch (valueType) {
    case platform::kRegSz:
      converted = onError([&] {
        raw.data = registry.ToAnsi(value.toString());
        raw.data.push_back('\0');
      });
      break;
    case platform::kRegDword:
      converted = onError([&] {
        uint32_t u = static_cast<uint32_t>(value.toInt32());
        for (int i = 0; i < 4; ++i) raw.data.push_back(static_cast<char>((u >> (8 * i)) & 0xFF));
      });
      break;
    default:
      return;
  }
  if (converted) registry.SetValue(root, keyPath, valueName, raw);
}

}  // namespace kpx
