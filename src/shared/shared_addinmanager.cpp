#include "shared/shared_addinmanager.h"

#include <string>

#include "shared/shared_registryapi2.h"

namespace kpx {

bool IsAddInActive(platform::Registry& registry, const ObjectPtr&, std::string_view addInName) {
  std::string key = "SOFTWARE\\Tolvek Software\\Quarn\\AddIns\\";
  key += addInName;
  Variant active = RegistryQueryValue(registry, RootKey::CurrentUser, key, "Active");
  return !(active.isString() && active.stringRef() == "No");
}

}  // namespace kpx
