#include "platform/win32/com_bridge.h"

#include <limits>

#include "automation/automation_error.h"
#include "automation/enumerator.h"
#include "platform/win32/com_errors.h"
#include "platform/win32/dispatch_object.h"
#include "platform/win32/object_dispatch.h"
#include "platform/win32/win32_strings.h"

namespace kpx::win32 {

// --------------------------------------------------------------- ExposedType

const ExposedType::Member* ExposedType::Find(DISPID id) const {
  for (const Member& m : members)
    if (m.id == id) return &m;
  return nullptr;
}

ExposedType ExposedType::FromTypeInfo(ITypeInfo* typeInfo) {
  ExposedType type;
  type.typeInfo = typeInfo;
  TYPEATTR* attr = nullptr;
  if (!typeInfo || FAILED(typeInfo->GetTypeAttr(&attr))) return type;
  type.iid = attr->guid;
  for (UINT i = 0; i < attr->cFuncs; ++i) {
    FUNCDESC* f = nullptr;
    if (FAILED(typeInfo->GetFuncDesc(i, &f))) continue;
    VARTYPE vt = f->elemdescFunc.tdesc.vt;
    // A property's get and put share one id; the get tells the result.
    Member* known = nullptr;
    for (Member& m : type.members)
      if (m.id == f->memid) known = &m;
    if (!known) {
      type.members.push_back({f->memid, vt});
    } else if (f->invkind == INVOKE_PROPERTYGET) {
      known->result = vt;
    }
    typeInfo->ReleaseFuncDesc(f);
  }
  typeInfo->ReleaseTypeAttr(attr);
  return type;
}

// ----------------------------------------------------------------- ComBridge

ComBridge::ComBridge(ServerLocks& locks, Describe describe) : locks_(locks), describe_(std::move(describe)) {}

namespace {

[[noreturn]] void TypeMismatch() { throw AutomationError(vberr::kTypeMismatch); }

Variant FromUnsigned(unsigned long long u) {
  if (u <= static_cast<unsigned long long>(std::numeric_limits<int32_t>::max())) return static_cast<int32_t>(u);
  return static_cast<double>(u);
}

Variant FromSigned(long long s) {
  if (s >= std::numeric_limits<int32_t>::min() && s <= std::numeric_limits<int32_t>::max())
    return static_cast<int32_t>(s);
  return static_cast<double>(s);
}

}  // namespace

Variant ComBridge::FromCom(const VARIANT& in) {
  // Read through references: the core sees values.
  if (in.vt & VT_BYREF) {
    if (in.vt == (VT_BYREF | VT_VARIANT)) {
      if (!in.pvarVal) TypeMismatch();
      return FromCom(*in.pvarVal);
    }
    VARIANT value;
    VariantInit(&value);
    if (FAILED(VariantCopyInd(&value, const_cast<VARIANT*>(&in)))) TypeMismatch();
    try {
      Variant out = FromCom(value);
      VariantClear(&value);
      return out;
    } catch (...) {
      VariantClear(&value);
      throw;
    }
  }
  switch (in.vt) {
    case VT_EMPTY: return {};
    case VT_NULL: return Variant::Null();
    case VT_BOOL: return in.boolVal != VARIANT_FALSE;
    case VT_I2: return static_cast<int16_t>(in.iVal);
    case VT_I4: return static_cast<int32_t>(in.lVal);
    case VT_R4: return in.fltVal;
    case VT_R8: return in.dblVal;
    case VT_DATE: return Variant::Date(in.date);
    case VT_BSTR: return BstrToUtf8(in.bstrVal);
    case VT_DISPATCH: return Adopt(in.pdispVal);
    case VT_UNKNOWN: {
      if (!in.punkVal) return Variant::Nothing();
      IDispatch* d = nullptr;
      if (FAILED(in.punkVal->QueryInterface(IID_IDispatch, reinterpret_cast<void**>(&d))) || !d) TypeMismatch();
      Variant out = Adopt(d);
      d->Release();
      return out;
    }
    // Smaller and unsigned integers as the core's nearest kind.
    case VT_I1: return static_cast<int16_t>(in.cVal);
    case VT_UI1: return static_cast<int16_t>(in.bVal);
    case VT_UI2: return static_cast<int32_t>(in.uiVal);
    case VT_UI4: return FromUnsigned(in.ulVal);
    case VT_UINT: return FromUnsigned(in.uintVal);
    case VT_INT: return static_cast<int32_t>(in.intVal);
    case VT_I8: return FromSigned(in.llVal);
    case VT_UI8: return FromUnsigned(in.ullVal);
    case VT_CY:
    case VT_DECIMAL: {
      VARIANT d;
      VariantInit(&d);
      if (FAILED(VariantChangeType(&d, const_cast<VARIANT*>(&in), 0, VT_R8))) TypeMismatch();
      return d.dblVal;
    }
    case VT_ERROR:
      // A left-out optional argument reads as Empty; other error values have no
      // counterpart in the core.
      if (in.scode == DISP_E_PARAMNOTFOUND) return {};
      TypeMismatch();
    default:
      TypeMismatch();
  }
}

void ComBridge::ToCom(const Variant& value, VARIANT* out) {
  VariantInit(out);
  const Variant& v = value.deref();
  switch (v.type()) {
    case VarType::Empty:
    case VarType::ByRef:
      return;
    case VarType::Null: out->vt = VT_NULL; return;
    case VarType::Boolean: out->vt = VT_BOOL; out->boolVal = v.toBool() ? VARIANT_TRUE : VARIANT_FALSE; return;
    case VarType::Integer: out->vt = VT_I2; out->iVal = v.toInt16(); return;
    case VarType::Long: out->vt = VT_I4; out->lVal = v.toInt32(); return;
    case VarType::Single: out->vt = VT_R4; out->fltVal = v.toSingle(); return;
    case VarType::Double: out->vt = VT_R8; out->dblVal = v.toDouble(); return;
    case VarType::Date: out->vt = VT_DATE; out->date = v.toDate(); return;
    case VarType::String: {
      BSTR text = Utf8ToBstr(v.stringRef());
      if (!text && !v.stringRef().empty()) throw AutomationError(7);  // Out of memory
      out->vt = VT_BSTR;
      out->bstrVal = text;
      return;
    }
    case VarType::Object:
      // A walk leaves as the IEnumVARIANT For Each asks _NewEnum for.
      if (auto walk = std::dynamic_pointer_cast<Enumerator>(v.objectOrNull())) {
        out->vt = VT_UNKNOWN;
        out->punkVal = new EnumVariantServer(*this, std::move(walk));
        return;
      }
      out->vt = VT_DISPATCH;
      out->pdispVal = Expose(v.objectOrNull());
      return;
  }
}

ObjectPtr ComBridge::Adopt(IDispatch* dispatch) {
  if (!dispatch) return {};
  IKpxExposedObject* ours = nullptr;
  if (SUCCEEDED(dispatch->QueryInterface(IID_IKpxExposedObject, reinterpret_cast<void**>(&ours))) && ours) {
    ObjectPtr object;
    if (ours->Bridge() == this) object = *ours->Target();
    ours->Release();
    if (object) return object;
  }
  return std::make_shared<DispatchObject>(*this, dispatch);
}

IDispatch* ComBridge::Expose(const ObjectPtr& object) {
  if (!object) return nullptr;
  if (auto* foreign = dynamic_cast<DispatchObject*>(object.get())) {
    foreign->dispatch()->AddRef();
    return foreign->dispatch();
  }
  auto it = exposed_.find(object.get());
  if (it != exposed_.end()) {
    it->second->AddRef();
    return it->second;
  }
  const ExposedType* type = describe_ ? describe_(*object) : nullptr;
  auto* server = new ObjectDispatch(*this, object, type);
  exposed_[object.get()] = server;
  return server;
}

void ComBridge::Forget(const Object* object, ObjectDispatch* server) {
  auto it = exposed_.find(object);
  if (it != exposed_.end() && it->second == server) exposed_.erase(it);
}

}  // namespace kpx::win32
