// Which property page opens when the user asks for an item's language
// properties: the component options for a module, the model assistant for
// a class and for what belongs to a class (an operation, an attribute, a
// role, a has-relation), the language property pages when the host names
// no item at all.
#include <string>

#include "addin/api.h"
#include "automation/error_styles.h"
#include "shared/host_ids.h"

namespace kpx {

namespace {

// The component-properties companion's ShowComponentOptions(module).
constexpr int kShowComponentOptions = 3;

// `aContext < 3` as VB reads it: an omitted context (Empty) is 0, Null is
// never less than anything, text is read as a number.
bool BelowThree(const Variant& context) {
  if (context.isNull()) return false;
  if (context.isEmpty()) return true;
  return context.toDouble() < 3;
}

}  // namespace

Variant API::CallNamed(const ObjectPtr& object, std::string_view name, std::optional<DispId>& id, CallKind kind,
                       std::initializer_list<Variant> args) {
  if (!object) throw AutomationError(vberr::kObjectNotSet);
  if (!id) id = object->IdOfName(name);
  std::vector<Variant> list(args);
  return object->Invoke(*id, kind, list);
}

ObjectPtr API::ClassAcross(const ObjectPtr& role) {
  HostNameIds& ids = hostNameIds_;
  const ObjectPtr association = CallNamed(role, "Association", ids.association, CallKind::PropertyGet).toObject();
  const ObjectPtr first = CallNamed(association, "Role1", ids.role1, CallKind::PropertyGet).toObject();
  // Both ends of an association of a class with itself hold that class, so
  // the role is told from the other by identity, not by its class.
  const ObjectPtr other =
      SameObject(first, role) ? CallNamed(association, "Role2", ids.role2, CallKind::PropertyGet).toObject() : first;
  return CallMethod(other, hostid::kGetSupplier).toObject();
}

// No trap: a failing host member or model assistant goes back to the host.
bool API::OnProperties(const Variant& anItem, const Variant& aContext) {
  module_.DebugLog("kpxAddin.OnProperties(anItem, Optional aContext)", logid::ADDIN, loglevel::TRACE);
  if (!anItem.isObject()) {
    // The language's general properties; the pages the host may ask for
    // are 0 to 2, anything beyond opens the first.
    ObjectPtr app = QuarnApp();
    const Variant page = BelowThree(aContext) ? Variant(aContext.isEmpty() ? 0 : aContext.toInt32()) : Variant(0);
    return OnLangProperties(app, page).toBool();
  }

  const ObjectPtr item = anItem.toObject();
  const std::string kind = CallMethod(item, hostid::kIdentifyClass).toString();
  ObjectPtr shownClass;
  ObjectPtr shownItem;  // what of the class the assistant shows; Nothing: the class itself
  if (kind == "Module") {
    return CallOwnOperation(CompPropertiesAPI(), kShowComponentOptions, CallKind::Method, {Variant(item)}).toBool();
  } else if (kind == "Class") {
    shownClass = item;
  } else if (kind == "Operation" || kind == "Attribute") {
    shownItem = item;
    shownClass = GetObject(item, kind == "Operation" ? hostid::kOperationParentClass : hostid::kAttributeParentClass);
  } else if (kind == "Role") {
    shownItem = item;
    shownClass = ClassAcross(item);
  } else if (kind == "HasRelation") {
    shownItem = item;
    shownClass = CallMethod(item, hostid::kGetClient).toObject();
  } else {
    module_.DebugLog("kpxAddin.OnProperties: Unknown type '" + kind + "'. ", logid::ADDIN, loglevel::ERROR);
    return false;
  }

  std::string failure;
  const ObjectPtr assistant = ModelAssistantAPI(&failure);
  if (!assistant) {
    module_.DebugLog("kpxAddin.OnProperties: Call failed. " + failure, logid::ADDIN, loglevel::ERROR);
    return false;
  }
  module_.DebugLog("kpxAddin.OnProperties: Calling ModelAssistant.", logid::ADDIN, loglevel::TRACE);
  // All three by reference; the assistant may hand back the application.
  Variant app(theQuarnApp_), cls(shownClass), shown(shownItem);
  std::vector<Variant> args = {Variant::Ref(&app), Variant::Ref(&cls), Variant::Ref(&shown)};
  const Variant answer = assistant->Invoke(assistant->IdOfName("StartModelAssistant"), CallKind::Method, args);
  theQuarnApp_ = app.toObject();
  return answer.toBool();
}

}  // namespace kpx
