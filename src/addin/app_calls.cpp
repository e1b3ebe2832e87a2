#include "addin/app_calls.h"

#include <vector>

#include "automation/automation_error.h"

namespace kpx {

Variant CallWithApp(const ObjectPtr& object, std::string_view member, ObjectPtr& QuarnApp,
                    std::initializer_list<Variant> leading, std::initializer_list<Variant> trailing) {
  if (!object) throw AutomationError(vberr::kObjectNotSet);
  Variant app(QuarnApp);
  std::vector<Variant> args(leading);
  args.push_back(Variant::Ref(&app));
  args.insert(args.end(), trailing);
  Variant result = object->Invoke(object->IdOfName(member), CallKind::Method, args);
  QuarnApp = app.toObject();
  return result;
}

}  // namespace kpx
