// The two commands that open the add-in's own restore-side dialogs. Neither
// lets a failure reach the host: it goes to the debug log.
#include "addin/api.h"
#include "automation/error_styles.h"
#include "dialogs/kpx_property_spec.h"
#include "restore/restore_source.h"

namespace kpx {

int32_t API::OnRestoreSource(ObjectPtr& QuarnApp) {
  TraceEntry("OnRestoreSource");
  return CatchAll(
      [&] {
        RestoreSource(module_).RestoreSourceFiles(QuarnApp);
        return 0;
      },
      [&](const AutomationError& e) {
        module_.DebugLog("kpxAddin.OnRestoreSource(QuarnApp) failed: " + e.description(), logid::ADDIN,
                         loglevel::ERROR);
        return 0;
      });
}

int32_t API::OnModuleDependencyProperties(ObjectPtr& QuarnApp) {
  TraceEntry("OnModuleDependencyProperties");
  return CatchAll(
      [&] {
        kpx::OnModuleDependencyProperties(module_, QuarnApp);
        return 0;
      },
      [&](const AutomationError& e) {
        module_.DebugLog("kpxAddin.OnModuleDependencyProperties(QuarnApp) failed: " + e.description(),
                         logid::ADDIN, loglevel::ERROR);
        return 0;
      });
}

}  // namespace kpx
