#include "platform/win32/object_dispatch.h"

#include <vector>

#include "automation/error_styles.h"
#include "platform/win32/com_errors.h"
#include "platform/win32/win32_strings.h"

namespace kpx::win32 {

// {5D05F7E9-753A-4E63-9DC9-5612FE2996A0}
const IID IID_IKpxExposedObject = {0x5d05f7e9, 0x753a, 0x4e63, {0x9d, 0xc9, 0x56, 0x12, 0xfe, 0x29, 0x96, 0xa0}};

ObjectDispatch::ObjectDispatch(ComBridge& bridge, ObjectPtr object, const ExposedType* type)
    : bridge_(bridge), object_(std::move(object)), type_(type) {
  InterlockedIncrement(&bridge_.locks().objects);
}

ObjectDispatch::~ObjectDispatch() {
  bridge_.Forget(object_.get(), this);
  // The object's own teardown (an API object logs and releases the host)
  // runs before the module stops counting this server.
  object_.reset();
  InterlockedDecrement(&bridge_.locks().objects);
}

HRESULT ObjectDispatch::QueryInterface(REFIID iid, void** out) {
  if (!out) return E_POINTER;
  *out = nullptr;
  if (IsEqualIID(iid, IID_IUnknown) || IsEqualIID(iid, IID_IDispatch) ||
      (type_ && !IsEqualIID(type_->iid, IID_NULL) && IsEqualIID(iid, type_->iid))) {
    *out = static_cast<IDispatch*>(this);
  } else if (IsEqualIID(iid, IID_ISupportErrorInfo)) {
    *out = static_cast<ISupportErrorInfo*>(this);
  } else if (IsEqualIID(iid, IID_IKpxExposedObject)) {
    *out = static_cast<IKpxExposedObject*>(this);
  } else {
    // Another interface of the object, if it offers one: served as an
    // IDispatch of its own.
    wchar_t text[40];
    if (!StringFromGUID2(iid, text, 40)) return E_NOINTERFACE;
    ObjectPtr view;
    try {
      view = object_->QueryInterface(WideToUtf8(text));
    } catch (...) {
      return E_NOINTERFACE;
    }
    if (!view) return E_NOINTERFACE;
    *out = bridge_.Expose(view);
    return S_OK;
  }
  AddRef();
  return S_OK;
}

ULONG ObjectDispatch::AddRef() { return static_cast<ULONG>(InterlockedIncrement(&refs_)); }

ULONG ObjectDispatch::Release() {
  LONG n = InterlockedDecrement(&refs_);
  if (n == 0) delete this;
  return static_cast<ULONG>(n);
}

HRESULT ObjectDispatch::GetTypeInfoCount(UINT* count) {
  if (!count) return E_POINTER;
  *count = (type_ && type_->typeInfo) ? 1 : 0;
  return S_OK;
}

HRESULT ObjectDispatch::GetTypeInfo(UINT index, LCID, ITypeInfo** info) {
  if (!info) return E_POINTER;
  *info = nullptr;
  if (index != 0 || !type_ || !type_->typeInfo) return DISP_E_BADINDEX;
  type_->typeInfo->AddRef();
  *info = type_->typeInfo;
  return S_OK;
}

HRESULT ObjectDispatch::GetIDsOfNames(REFIID iid, LPOLESTR* names, UINT count, LCID, DISPID* ids) {
  ObservedCall call(bridge_.observer());
  if (!IsEqualIID(iid, IID_NULL)) return DISP_E_UNKNOWNINTERFACE;
  if (!names || !ids || count == 0) return E_INVALIDARG;
  for (UINT i = 0; i < count; ++i) ids[i] = DISPID_UNKNOWN;
  try {
    ids[0] = object_->IdOfName(WideToUtf8(names[0] ? names[0] : L""));
  } catch (...) {
    return DISP_E_UNKNOWNNAME;
  }
  // Arguments are taken by position only.
  return count > 1 ? DISP_E_UNKNOWNNAME : S_OK;
}

namespace {

bool IsMissing(const VARIANT& v) { return v.vt == VT_ERROR && v.scode == DISP_E_PARAMNOTFOUND; }

// Stores a by-reference argument's new value where the caller's reference
// points, in the caller's type (a typed reference cannot change its type).
void WriteBack(ComBridge& bridge, const Variant& value, VARIANT* arg) {
  const VARTYPE target = static_cast<VARTYPE>(arg->vt & ~VT_BYREF);
  VARIANT fresh;
  bridge.ToCom(value, &fresh);
  if (target == VT_VARIANT) {
    if (!arg->pvarVal) {
      VariantClear(&fresh);
      return;
    }
    VariantClear(arg->pvarVal);
    *arg->pvarVal = fresh;
    return;
  }
  if (fresh.vt != target && FAILED(VariantChangeType(&fresh, &fresh, 0, target))) {
    VariantClear(&fresh);
    return;  // the caller keeps its value; nothing the core wrote fits it
  }
  switch (target) {
    case VT_BSTR: SysFreeString(*arg->pbstrVal); *arg->pbstrVal = fresh.bstrVal; return;
    case VT_DISPATCH:
      if (*arg->ppdispVal) (*arg->ppdispVal)->Release();
      *arg->ppdispVal = fresh.pdispVal;
      return;
    case VT_UNKNOWN:
      if (*arg->ppunkVal) (*arg->ppunkVal)->Release();
      *arg->ppunkVal = fresh.punkVal;
      return;
    case VT_I2: *arg->piVal = fresh.iVal; return;
    case VT_I4: *arg->plVal = fresh.lVal; return;
    case VT_R4: *arg->pfltVal = fresh.fltVal; return;
    case VT_R8: *arg->pdblVal = fresh.dblVal; return;
    case VT_DATE: *arg->pdate = fresh.date; return;
    case VT_BOOL: *arg->pboolVal = fresh.boolVal; return;
    case VT_UI1: *arg->pbVal = fresh.bVal; return;
    case VT_I1: *arg->pcVal = fresh.cVal; return;
    case VT_UI2: *arg->puiVal = fresh.uiVal; return;
    case VT_UI4: *arg->pulVal = fresh.ulVal; return;
    case VT_INT: *arg->pintVal = fresh.intVal; return;
    case VT_UINT: *arg->puintVal = fresh.uintVal; return;
    default: VariantClear(&fresh); return;
  }
}

bool IsScalarResult(VARTYPE vt) {
  switch (vt) {
    case VT_I2: case VT_I4: case VT_R4: case VT_R8: case VT_BOOL: case VT_BSTR: case VT_DATE:
      return true;
    default:
      return false;
  }
}

}  // namespace

HRESULT ObjectDispatch::Invoke(DISPID id, REFIID iid, LCID, WORD flags, DISPPARAMS* params, VARIANT* result,
                               EXCEPINFO* excepInfo, UINT* argErr) {
  ObservedCall call(bridge_.observer());
  if (!IsEqualIID(iid, IID_NULL)) return DISP_E_UNKNOWNINTERFACE;
  if (!params || (params->cArgs && !params->rgvarg)) return E_INVALIDARG;
  const ExposedType::Member* member = type_ ? type_->Find(id) : nullptr;
  if (type_ && !member && !type_->anyMember) return DISP_E_MEMBERNOTFOUND;

  const bool put = (flags & (DISPATCH_PROPERTYPUT | DISPATCH_PROPERTYPUTREF)) != 0;
  if (put) {
    if (params->cArgs == 0) return DISP_E_BADPARAMCOUNT;
    if (params->cNamedArgs > 1 || (params->cNamedArgs == 1 && params->rgdispidNamedArgs[0] != DISPID_PROPERTYPUT))
      return DISP_E_NONAMEDARGS;
  } else if (params->cNamedArgs != 0) {
    return DISP_E_NONAMEDARGS;
  }

  const UINT n = params->cArgs;
  VARIANT* raw = params->rgvarg;  // last argument first
  CallKind kind = CallKind::Method;
  if (put) {
    const VARTYPE valueType = static_cast<VARTYPE>(raw[0].vt & ~VT_BYREF);
    const bool objectValue = valueType == VT_DISPATCH || valueType == VT_UNKNOWN;
    kind = (flags & DISPATCH_PROPERTYPUTREF) && (objectValue || !(flags & DISPATCH_PROPERTYPUT))
               ? CallKind::PropertyPutRef
               : CallKind::PropertyPut;
  } else if (!(flags & DISPATCH_METHOD) && (flags & DISPATCH_PROPERTYGET)) {
    kind = CallKind::PropertyGet;
  }

  // Arguments the caller left out at the end are not passed at all, so the
  // member sees how many it was given.
  UINT count = n;
  if (!put)
    while (count > 0 && IsMissing(raw[n - count])) --count;

  std::vector<Variant> values(count);
  std::vector<Variant> args(count);
  for (UINT i = 0; i < count; ++i) {
    VARIANT& v = raw[n - 1 - i];
    if (IsMissing(v)) continue;
    try {
      values[i] = bridge_.FromCom(v);
    } catch (...) {
      if (argErr) *argErr = n - 1 - i;
      return DISP_E_TYPEMISMATCH;
    }
    args[i] = (v.vt & VT_BYREF) ? Variant::Ref(&values[i]) : values[i];
  }

  AddRef();  // a member may drop the caller's last reference while it runs
  HRESULT hr = S_OK;
  Variant out;
  try {
    out = object_->Invoke(id, kind, args);
  } catch (...) {
    AutomationError error = CurrentError();
    if (error.number() == vberr::kNotImplemented) {
      SetThreadErrorInfo(error, kErrorSource, type_ ? type_->iid : IID_IDispatch);
      hr = E_NOTIMPL;
    } else if (excepInfo) {
      FillExcepInfo(error, kErrorSource, excepInfo);
      hr = DISP_E_EXCEPTION;
    } else {
      SetThreadErrorInfo(error, kErrorSource, type_ ? type_->iid : IID_IDispatch);
      hr = HResultFromVbNumber(error.number());
    }
  }

  for (UINT i = 0; i < count; ++i) {
    VARIANT& v = raw[n - 1 - i];
    if ((v.vt & VT_BYREF) && !IsMissing(v)) WriteBack(bridge_, values[i], &v);
  }

  if (SUCCEEDED(hr) && result) {
    try {
      bridge_.ToCom(out, result);
      if (member && member->result == VT_VOID) {
        VariantClear(result);
      } else if (member && IsScalarResult(member->result) && result->vt != member->result) {
        HRESULT changed = VariantChangeType(result, result, 0, member->result);
        if (FAILED(changed)) {
          VariantClear(result);
          throw AutomationError(vberr::kTypeMismatch);
        }
      }
    } catch (...) {
      AutomationError error = CurrentError();
      if (excepInfo) {
        FillExcepInfo(error, kErrorSource, excepInfo);
        hr = DISP_E_EXCEPTION;
      } else {
        hr = HResultFromVbNumber(error.number());
      }
    }
  }
  Release();
  return hr;
}

HRESULT ObjectDispatch::InterfaceSupportsErrorInfo(REFIID iid) {
  if (IsEqualIID(iid, IID_IDispatch) || (type_ && IsEqualIID(iid, type_->iid))) return S_OK;
  return S_FALSE;
}

}  // namespace kpx::win32

namespace kpx::win32 {

// ------------------------------------------------------------ EnumVariantServer

EnumVariantServer::EnumVariantServer(ComBridge& bridge, std::shared_ptr<Enumerator> walk)
    : bridge_(bridge), walk_(std::move(walk)) {
  InterlockedIncrement(&bridge_.locks().objects);
}

EnumVariantServer::~EnumVariantServer() {
  walk_.reset();
  InterlockedDecrement(&bridge_.locks().objects);
}

HRESULT EnumVariantServer::QueryInterface(REFIID iid, void** out) {
  if (!out) return E_POINTER;
  if (IsEqualIID(iid, IID_IUnknown) || IsEqualIID(iid, IID_IEnumVARIANT)) {
    *out = static_cast<IEnumVARIANT*>(this);
    AddRef();
    return S_OK;
  }
  *out = nullptr;
  return E_NOINTERFACE;
}

ULONG EnumVariantServer::AddRef() { return static_cast<ULONG>(InterlockedIncrement(&refs_)); }

ULONG EnumVariantServer::Release() {
  LONG n = InterlockedDecrement(&refs_);
  if (n == 0) delete this;
  return static_cast<ULONG>(n);
}

HRESULT EnumVariantServer::Next(ULONG count, VARIANT* items, ULONG* fetched) {
  if (fetched) *fetched = 0;
  if (!items) return E_POINTER;
  // The walk moves on only once every item has crossed: a failure leaves it
  // where it was and the caller's array empty.
  std::span<const Variant> next = walk_->Peek(count);
  ULONG done = 0;
  try {
    for (; done < next.size(); ++done) bridge_.ToCom(next[done], &items[done]);
  } catch (...) {
    for (ULONG i = 0; i < done; ++i) VariantClear(&items[i]);
    return HResultFromVbNumber(CurrentError().number());
  }
  walk_->Skip(done);
  if (fetched) *fetched = done;
  return done == count ? S_OK : S_FALSE;
}

HRESULT EnumVariantServer::Skip(ULONG count) { return walk_->Skip(count) ? S_OK : S_FALSE; }

HRESULT EnumVariantServer::Reset() {
  walk_->Reset();
  return S_OK;
}

HRESULT EnumVariantServer::Clone(IEnumVARIANT** out) {
  if (!out) return E_POINTER;
  *out = new EnumVariantServer(bridge_, walk_->Clone());
  return S_OK;
}

}  // namespace kpx::win32
