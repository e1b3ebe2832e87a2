// A foreign IDispatch (a host object, a companion) as an Object of the core.
#pragma once

#include "platform/win32/win32_api.h"

#include <string_view>

#include "automation/object.h"
#include "platform/win32/com_bridge.h"

namespace kpx::win32 {

class DispatchObject : public Object {
 public:
  // Holds its own reference to `dispatch`.
  DispatchObject(ComBridge& bridge, IDispatch* dispatch);
  ~DispatchObject() override;
  DispatchObject(const DispatchObject&) = delete;
  DispatchObject& operator=(const DispatchObject&) = delete;

  // GetIDsOfNames; an unknown name is error 438.
  DispId IdOfName(std::string_view name) override;
  // The member id of the n-th operation of the object's own interface,
  // found in its type information: for a dual interface, the n-th vtable
  // slot after IUnknown's and IDispatch's seven; for a plain dispinterface,
  // the n-th function it declares.
  DispId IdOfOwnOperation(int position) override;
  // IDispatch::Invoke. By-reference arguments travel as VT_BYREF|VT_VARIANT
  // pointing at temporaries, which are copied back into the caller's
  // Variants afterwards (also when the call failed: a callee may have
  // written them before it failed).
  Variant Invoke(DispId id, CallKind kind, std::span<Variant> args) override;
  // QueryInterface for the interface; the result finds names in that
  // interface's own type information.
  ObjectPtr QueryInterface(std::string_view iid) override;
  // The object's IUnknown, asked for once and held while this wrapper
  // lives: a host hands out a new IDispatch wrapper for every call that
  // returns an object, but its IUnknown stays the same.
  const void* Identity() override;

  IDispatch* dispatch() const { return dispatch_; }

 protected:
  ComBridge& bridge_;

 private:
  IDispatch* dispatch_;
  IUnknown* identity_ = nullptr;
};

// One interface of an object, reached by QueryInterface: names are looked up
// in the interface's own type information, so a member of that interface is
// found even where the object's default interface has one of the same name
// (or none). Without type information it asks the interface pointer itself.
class InterfaceObject final : public DispatchObject {
 public:
  using DispatchObject::DispatchObject;
  DispId IdOfName(std::string_view name) override;
};

// The first own operation of an early-bound interface: HRESULT (long, BSTR*)
// in the vtable slot right after IDispatch's.
struct IFirstOperationStringById : public IDispatch {
  virtual HRESULT STDMETHODCALLTYPE FirstOperation(LONG id, BSTR* text) = 0;
};

// The resource component as the add-in uses it: its interface's first own
// operation (string by id) is called early-bound through the vtable, as a
// compiled client of that interface does; everything else goes through
// IDispatch like any other object.
class EarlyBoundResourceObject final : public DispatchObject {
 public:
  // `object` is the interface pointer for `iid`, which must be dual.
  EarlyBoundResourceObject(ComBridge& bridge, IFirstOperationStringById* object, const IID& iid);

  DispId IdOfOwnOperation(int position) override;
  Variant Invoke(DispId id, CallKind kind, std::span<Variant> args) override;

  // The id IdOfOwnOperation(1) hands out: it names the vtable call, not a
  // dispatch member, and lies far from the ids type libraries assign.
  static constexpr DispId kFirstOperation = 0x7EB00001;

 private:
  IFirstOperationStringById* object_;  // same object as dispatch(); no own reference
  IID iid_;
};

}  // namespace kpx::win32
