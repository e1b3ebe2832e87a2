// Exposes an Object of the core as an IDispatch server: the host calls the
// add-in's API through it, and the test host serves its own objects with it.
#pragma once

#include "platform/win32/win32_api.h"

#include <memory>

#include "automation/enumerator.h"
#include "automation/object.h"
#include "platform/win32/com_bridge.h"

namespace kpx::win32 {

// Answered only by ObjectDispatch, so that a bridge recognises the objects
// it exposed when they come back (and only its own: another module's bridge
// sees a foreign IDispatch).
extern const IID IID_IKpxExposedObject;

struct IKpxExposedObject : public IUnknown {
  virtual ComBridge* STDMETHODCALLTYPE Bridge() = 0;
  virtual const ObjectPtr* STDMETHODCALLTYPE Target() = 0;
};

class ObjectDispatch final : public IDispatch, public ISupportErrorInfo, public IKpxExposedObject {
 public:
  // Starts with one reference, owned by the caller. `type` may be null.
  ObjectDispatch(ComBridge& bridge, ObjectPtr object, const ExposedType* type);

  // IUnknown
  HRESULT STDMETHODCALLTYPE QueryInterface(REFIID iid, void** out) override;
  ULONG STDMETHODCALLTYPE AddRef() override;
  ULONG STDMETHODCALLTYPE Release() override;

  // IDispatch
  HRESULT STDMETHODCALLTYPE GetTypeInfoCount(UINT* count) override;
  HRESULT STDMETHODCALLTYPE GetTypeInfo(UINT index, LCID lcid, ITypeInfo** info) override;
  HRESULT STDMETHODCALLTYPE GetIDsOfNames(REFIID iid, LPOLESTR* names, UINT count, LCID lcid, DISPID* ids) override;
  HRESULT STDMETHODCALLTYPE Invoke(DISPID id, REFIID iid, LCID lcid, WORD flags, DISPPARAMS* params,
                                   VARIANT* result, EXCEPINFO* excepInfo, UINT* argErr) override;

  // ISupportErrorInfo
  HRESULT STDMETHODCALLTYPE InterfaceSupportsErrorInfo(REFIID iid) override;

  // IKpxExposedObject
  ComBridge* STDMETHODCALLTYPE Bridge() override { return &bridge_; }
  const ObjectPtr* STDMETHODCALLTYPE Target() override { return &object_; }

  // The source named in the errors this server reports.
  static constexpr const char* kErrorSource = "kpxAddIn";

 private:
  ~ObjectDispatch();

  LONG refs_ = 1;
  ComBridge& bridge_;
  ObjectPtr object_;
  const ExposedType* type_;
};

// Serves a walk of the core (what a collection's _NewEnum hands out) as the
// IEnumVARIANT a For Each asks for. Items leave through the bridge as any
// value does.
class EnumVariantServer final : public IEnumVARIANT {
 public:
  // Starts with one reference, owned by the caller.
  EnumVariantServer(ComBridge& bridge, std::shared_ptr<Enumerator> walk);

  HRESULT STDMETHODCALLTYPE QueryInterface(REFIID iid, void** out) override;
  ULONG STDMETHODCALLTYPE AddRef() override;
  ULONG STDMETHODCALLTYPE Release() override;

  HRESULT STDMETHODCALLTYPE Next(ULONG count, VARIANT* items, ULONG* fetched) override;
  HRESULT STDMETHODCALLTYPE Skip(ULONG count) override;
  HRESULT STDMETHODCALLTYPE Reset() override;
  HRESULT STDMETHODCALLTYPE Clone(IEnumVARIANT** out) override;

 private:
  ~EnumVariantServer();

  LONG refs_ = 1;
  ComBridge& bridge_;
  std::shared_ptr<Enumerator> walk_;
};

}  // namespace kpx::win32
