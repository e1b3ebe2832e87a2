// Anything callable by dispatch id or by name: host objects, companions, the
// add-in's own classes. Arguments are in natural order (first argument first);
// a by-reference argument is a Variant::Ref the callee may write through.
#pragma once

#include <cstdint>
#include <initializer_list>
#include <memory>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "automation/variant.h"

namespace kpx {

using DispId = int32_t;

enum class CallKind : uint8_t {
  Method = 1,
  PropertyGet = 2,
  PropertyPut = 4,
  PropertyPutRef = 8,
};

class Object {
 public:
  virtual ~Object() = default;

  // The dispatch id of a member name (case-insensitive, as automation
  // names are). Raises 438 when the object has no such member.
  virtual DispId IdOfName(std::string_view name) = 0;

  // The dispatch id of the n-th (1-based) operation of the object's own
  // interface, after the standard dispatch operations. Companions are
  // sometimes addressed this way. Raises 438 when there is no such operation.
  virtual DispId IdOfOwnOperation(int position);

  // The object seen through another of its interfaces (an id in registry
  // form, "{XXXXXXXX-...}"), as a variable declared with that interface
  // holds it: its names and own operations are that interface's. Raises 13
  // (type mismatch) when the object does not offer the interface.
  virtual ObjectPtr QueryInterface(std::string_view iid);

  // Calls a member. For a property put, the value is the last argument.
  virtual Variant Invoke(DispId id, CallKind kind, std::span<Variant> args) = 0;

  // What tells one object from another, as VB's `Is` does: the object
  // itself by default. A wrapper of an object reached through COM answers
  // the object's IUnknown, the one pointer COM keeps for an object however
  // often and through whichever interface it is handed out, so two wrappers
  // of one host object are the same object.
  virtual const void* Identity() { return this; }
};

// VB's `a Is b`: both Nothing, or the same object (by Identity()).
bool SameObject(const ObjectPtr& a, const ObjectPtr& b);

// Late-bound calls. All raise 91 on Nothing.
Variant Invoke(const ObjectPtr& obj, DispId id, CallKind kind, std::span<Variant> args);
Variant CallMethod(const ObjectPtr& obj, DispId id, std::initializer_list<Variant> args = {});
Variant GetProperty(const ObjectPtr& obj, DispId id, std::initializer_list<Variant> args = {});
void PutProperty(const ObjectPtr& obj, DispId id, Variant value);
void PutPropertyRef(const ObjectPtr& obj, DispId id, Variant value);

Variant CallByName(const ObjectPtr& obj, std::string_view name, CallKind kind,
                   std::initializer_list<Variant> args = {});
Variant CallOwnOperation(const ObjectPtr& obj, int position, CallKind kind,
                         std::initializer_list<Variant> args = {});

// Fetches a property that must be an object (Nothing allowed).
ObjectPtr GetObject(const ObjectPtr& obj, DispId id, std::initializer_list<Variant> args = {});

}  // namespace kpx
