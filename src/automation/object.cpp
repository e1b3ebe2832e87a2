#include "automation/object.h"

#include "automation/automation_error.h"

namespace kpx {

DispId Object::IdOfOwnOperation(int) { throw AutomationError(vberr::kNoSuchMember); }

ObjectPtr Object::QueryInterface(std::string_view) { throw AutomationError(vberr::kTypeMismatch); }

bool SameObject(const ObjectPtr& a, const ObjectPtr& b) {
  if (!a || !b) return !a && !b;
  return a == b || a->Identity() == b->Identity();
}

Variant Invoke(const ObjectPtr& obj, DispId id, CallKind kind, std::span<Variant> args) {
  if (!obj) throw AutomationError(vberr::kObjectNotSet);
  return obj->Invoke(id, kind, args);
}

namespace {
Variant InvokeList(const ObjectPtr& obj, DispId id, CallKind kind, std::initializer_list<Variant> args) {
  // By-reference arguments stay references to the caller's variants when copied.
  std::vector<Variant> list(args);
  return Invoke(obj, id, kind, list);
}
}  // namespace

Variant CallMethod(const ObjectPtr& obj, DispId id, std::initializer_list<Variant> args) {
  return InvokeList(obj, id, CallKind::Method, args);
}

Variant GetProperty(const ObjectPtr& obj, DispId id, std::initializer_list<Variant> args) {
  return InvokeList(obj, id, CallKind::PropertyGet, args);
}

void PutProperty(const ObjectPtr& obj, DispId id, Variant value) {
  InvokeList(obj, id, CallKind::PropertyPut, {std::move(value)});
}

void PutPropertyRef(const ObjectPtr& obj, DispId id, Variant value) {
  InvokeList(obj, id, CallKind::PropertyPutRef, {std::move(value)});
}

Variant CallByName(const ObjectPtr& obj, std::string_view name, CallKind kind,
                   std::initializer_list<Variant> args) {
  if (!obj) throw AutomationError(vberr::kObjectNotSet);
  return InvokeList(obj, obj->IdOfName(name), kind, args);
}

Variant CallOwnOperation(const ObjectPtr& obj, int position, CallKind kind,
                         std::initializer_list<Variant> args) {
  if (!obj) throw AutomationError(vberr::kObjectNotSet);
  return InvokeList(obj, obj->IdOfOwnOperation(position), kind, args);
}

ObjectPtr GetObject(const ObjectPtr& obj, DispId id, std::initializer_list<Variant> args) {
  return InvokeList(obj, id, CallKind::PropertyGet, args).toObject();
}

}  // namespace kpx
