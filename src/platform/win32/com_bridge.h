// The meeting point of the core's automation vocabulary and COM: Variant <->
// VARIANT, Object <-> IDispatch. Objects of the core leave as IDispatch
// servers (ObjectDispatch) and come back as themselves; foreign IDispatch
// pointers come in as DispatchObject and leave as the same pointer.
//
// One bridge serves one loaded module (the add-in DLL, or a test host); the
// objects it exposes count towards that module's DllCanUnloadNow.
#pragma once

#include "platform/win32/win32_api.h"

#include <functional>
#include <unordered_map>
#include <vector>

#include "automation/call_observer.h"
#include "automation/object.h"
#include "automation/variant.h"

namespace kpx::win32 {

class ObjectDispatch;

// What the outside may learn about an exposed object from a type library:
// the interface it answers to, its type information, and the members that
// exist (anything else is DISP_E_MEMBERNOTFOUND rather than an error raised
// by a member).
struct ExposedType {
  IID iid = IID_NULL;
  ITypeInfo* typeInfo = nullptr;  // owned by whoever filled this in
  struct Member {
    DISPID id;
    VARTYPE result;  // VT_VOID for a Sub, VT_VARIANT when any value goes
  };
  std::vector<Member> members;
  // True when the object answers members the type information does not
  // list (an object described only for its own operations).
  bool anyMember = false;

  const Member* Find(DISPID id) const;
  // Reads iid, members and result types from a dispinterface's type info.
  static ExposedType FromTypeInfo(ITypeInfo* typeInfo);
};

// Live objects and LockServer calls of one module.
struct ServerLocks {
  LONG objects = 0;
  LONG locks = 0;
  bool Idle() const { return objects == 0 && locks == 0; }
};

class ComBridge {
 public:
  // `describe` tells, for an object of the core about to be exposed, which
  // type it shows (nullptr: a plain IDispatch without type information).
  using Describe = std::function<const ExposedType*(const Object&)>;

  explicit ComBridge(ServerLocks& locks, Describe describe = {});
  ComBridge(const ComBridge&) = delete;
  ComBridge& operator=(const ComBridge&) = delete;

  ServerLocks& locks() { return locks_; }

  // Told of every call into an object this bridge serves (nullptr: none).
  void Observe(CallObserver* observer) { observer_ = observer; }
  CallObserver* observer() const { return observer_; }

  // Converts a value that came from COM (a by-reference VARIANT is read
  // through). Raises 13 for kinds the core does not know (arrays, ...).
  Variant FromCom(const VARIANT& in);
  // Writes `value` into `out` (which holds nothing that needs freeing). A
  // by-reference Variant is written as the value it refers to; an
  // Enumerator of the core as a VT_UNKNOWN IEnumVARIANT over it.
  void ToCom(const Variant& value, VARIANT* out);

  // A foreign IDispatch as an Object; one of ours comes back as itself.
  // nullptr stays Nothing.
  ObjectPtr Adopt(IDispatch* dispatch);
  // An Object as an IDispatch (AddRef'd; nullptr for Nothing). A wrapped
  // foreign object leaves as its own pointer; an object of the core keeps
  // one identity for as long as the outside holds it.
  IDispatch* Expose(const ObjectPtr& object);

  // Used by ObjectDispatch to keep the identity table.
  void Forget(const Object* object, ObjectDispatch* server);

 private:
  ServerLocks& locks_;
  Describe describe_;
  CallObserver* observer_ = nullptr;
  std::unordered_map<const Object*, ObjectDispatch*> exposed_;
};

}  // namespace kpx::win32
