#include "addin/find_addin.h"

#include "automation/error_styles.h"
#include "shared/host_ids.h"

namespace kpx {

ObjectPtr FindAddIn(const ObjectPtr& QuarnApp, std::string_view name) {
  return CatchAll(
      [&]() -> ObjectPtr {
        ObjectPtr addIns = GetObject(GetObject(QuarnApp, hostid::kAddInManager), hostid::kAddIns);
        const int16_t count = GetProperty(addIns, hostid::kCount).toInt16();
        for (int16_t i = 1; i <= count; ++i) {
          ObjectPtr addIn = CallMethod(addIns, hostid::kGetAt, {Variant(i)}).toObject();
          if (GetProperty(addIn, hostid::kAddInName).toString() == name) return addIn;
        }
        return nullptr;
      },
      [](const AutomationError&) -> ObjectPtr { return nullptr; });
}

}  // namespace kpx
