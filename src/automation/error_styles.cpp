#include "automation/error_styles.h"

#include <new>

namespace kpx {

AutomationError CurrentError() {
  try {
    throw;
  } catch (const AutomationError& e) {
    return e;
  } catch (const std::bad_alloc&) {
    return AutomationError(7, "Out of memory");
  } catch (const std::exception& e) {
    return AutomationError(vberr::kInternal, e.what());
  } catch (...) {
    return AutomationError(vberr::kInternal);
  }
}

}  // namespace kpx
