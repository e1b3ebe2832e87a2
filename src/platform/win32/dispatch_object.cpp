#include "platform/win32/dispatch_object.h"

#include <vector>

#include "automation/automation_error.h"
#include "platform/win32/com_errors.h"
#include "platform/win32/win32_strings.h"

namespace kpx::win32 {

namespace {

// Member ids type libraries give IUnknown's and IDispatch's functions when
// a dispinterface lists them.
bool IsStandardDispatchMember(MEMBERID id) {
  return (id >= 0x60000000 && id <= 0x60000002) || (id >= 0x60010000 && id <= 0x60010003);
}

// Releases what the type-information walk holds, on every path.
struct TypeInfoRef {
  ITypeInfo* info = nullptr;
  TYPEATTR* attr = nullptr;
  ~TypeInfoRef() { Reset(); }
  void Reset() {
    if (info && attr) info->ReleaseTypeAttr(attr);
    if (info) info->Release();
    info = nullptr;
    attr = nullptr;
  }
  bool Load(ITypeInfo* ti) {
    Reset();
    info = ti;
    return SUCCEEDED(info->GetTypeAttr(&attr));
  }
};

// VARIANTs of one call, cleared whatever happens.
struct VariantArray {
  std::vector<VARIANT> items;
  explicit VariantArray(size_t n) : items(n) {
    for (VARIANT& v : items) VariantInit(&v);
  }
  ~VariantArray() {
    for (VARIANT& v : items) VariantClear(&v);
  }
};

}  // namespace

DispatchObject::DispatchObject(ComBridge& bridge, IDispatch* dispatch) : bridge_(bridge), dispatch_(dispatch) {
  dispatch_->AddRef();
}

DispatchObject::~DispatchObject() {
  if (identity_) identity_->Release();
  dispatch_->Release();
}

const void* DispatchObject::Identity() {
  if (!identity_) {
    IUnknown* unknown = nullptr;
    // Every COM object answers IUnknown; one that does not is told apart
    // by the pointer it was handed out as.
    if (FAILED(dispatch_->QueryInterface(IID_IUnknown, reinterpret_cast<void**>(&unknown))) || !unknown)
      return dispatch_;
    identity_ = unknown;
  }
  return identity_;
}

DispId DispatchObject::IdOfName(std::string_view name) {
  std::wstring wide = Utf8ToWide(name);
  LPOLESTR names[] = {wide.data()};
  DISPID id = DISPID_UNKNOWN;
  HRESULT hr = dispatch_->GetIDsOfNames(IID_NULL, names, 1, LOCALE_USER_DEFAULT, &id);
  if (FAILED(hr)) throw ErrorFromHResult(hr);
  return id;
}

DispId DispatchObject::IdOfOwnOperation(int position) {
  if (position < 1) throw AutomationError(vberr::kNoSuchMember);
  ITypeInfo* ti = nullptr;
  if (FAILED(dispatch_->GetTypeInfo(0, LOCALE_USER_DEFAULT, &ti)) || !ti) throw AutomationError(vberr::kNoSuchMember);
  TypeInfoRef type;
  if (!type.Load(ti)) throw AutomationError(vberr::kNoSuchMember);

  // A dual interface's dispatch view lists IDispatch's functions too; its
  // vtable view tells the slots.
  if (type.attr->typekind == TKIND_DISPATCH && (type.attr->wTypeFlags & TYPEFLAG_FDUAL)) {
    HREFTYPE ref = 0;
    ITypeInfo* vtableInfo = nullptr;
    if (SUCCEEDED(type.info->GetRefTypeOfImplType(static_cast<UINT>(-1), &ref)) &&
        SUCCEEDED(type.info->GetRefTypeInfo(ref, &vtableInfo)) && vtableInfo) {
      if (!type.Load(vtableInfo)) throw AutomationError(vberr::kNoSuchMember);
    }
  }

  if (type.attr->typekind == TKIND_INTERFACE) {
    const SHORT slot = static_cast<SHORT>((7 + position - 1) * static_cast<int>(sizeof(void*)));
    for (UINT i = 0; i < type.attr->cFuncs; ++i) {
      FUNCDESC* f = nullptr;
      if (FAILED(type.info->GetFuncDesc(i, &f))) continue;
      const bool match = f->oVft == slot;
      const MEMBERID id = f->memid;
      type.info->ReleaseFuncDesc(f);
      if (match) return id;
    }
  } else if (type.attr->typekind == TKIND_DISPATCH) {
    int seen = 0;
    for (UINT i = 0; i < type.attr->cFuncs; ++i) {
      FUNCDESC* f = nullptr;
      if (FAILED(type.info->GetFuncDesc(i, &f))) continue;
      const MEMBERID id = f->memid;
      type.info->ReleaseFuncDesc(f);
      if (IsStandardDispatchMember(id)) continue;
      if (++seen == position) return id;
    }
  }
  throw AutomationError(vberr::kNoSuchMember);
}

Variant DispatchObject::Invoke(DispId id, CallKind kind, std::span<Variant> args) {
  const size_t n = args.size();
  VariantArray slots(n);    // DISPPARAMS order: last argument first
  VariantArray targets(n);  // what by-reference slots point at
  for (size_t i = 0; i < n; ++i) {
    VARIANT& slot = slots.items[n - 1 - i];
    if (args[i].isByRef()) {
      bridge_.ToCom(args[i].deref(), &targets.items[i]);
      slot.vt = VT_BYREF | VT_VARIANT;
      slot.pvarVal = &targets.items[i];
    } else {
      bridge_.ToCom(args[i], &slot);
    }
  }

  DISPID putId = DISPID_PROPERTYPUT;
  DISPPARAMS params{slots.items.data(), nullptr, static_cast<UINT>(n), 0};
  WORD flags = DISPATCH_METHOD | DISPATCH_PROPERTYGET;
  if (kind == CallKind::PropertyPut || kind == CallKind::PropertyPutRef) {
    flags = kind == CallKind::PropertyPut ? DISPATCH_PROPERTYPUT : DISPATCH_PROPERTYPUTREF;
    params.rgdispidNamedArgs = &putId;
    params.cNamedArgs = 1;
  }

  VARIANT result;
  VariantInit(&result);
  EXCEPINFO info{};
  UINT argErr = 0;
  const bool put = params.cNamedArgs != 0;
  HRESULT hr = dispatch_->Invoke(id, IID_NULL, LOCALE_USER_DEFAULT, flags, &params, put ? nullptr : &result, &info,
                                 &argErr);

  for (size_t i = 0; i < n; ++i) {
    if (!args[i].isByRef()) continue;
    if (SUCCEEDED(hr)) {
      args[i].assign(bridge_.FromCom(targets.items[i]));
    } else {
      try {
        args[i].assign(bridge_.FromCom(targets.items[i]));
      } catch (const AutomationError&) {
        // The call's own failure is the one to report.
      }
    }
  }

  if (FAILED(hr)) {
    VariantClear(&result);
    if (hr == DISP_E_EXCEPTION) throw ErrorFromExcepInfo(info);
    throw ErrorFromHResult(hr, dispatch_, IID_IDispatch);  // the callee may have left its text
  }
  Variant out;
  try {
    out = bridge_.FromCom(result);
  } catch (...) {
    VariantClear(&result);
    throw;
  }
  VariantClear(&result);
  return out;
}

ObjectPtr DispatchObject::QueryInterface(std::string_view iid) {
  std::wstring wide = Utf8ToWide(iid);
  IID id;
  if (FAILED(IIDFromString(wide.c_str(), &id))) throw AutomationError(vberr::kTypeMismatch);
  IDispatch* other = nullptr;
  HRESULT hr = dispatch_->QueryInterface(id, reinterpret_cast<void**>(&other));
  if (hr == E_NOINTERFACE || (SUCCEEDED(hr) && !other)) throw AutomationError(vberr::kTypeMismatch);
  if (FAILED(hr)) throw ErrorFromHResult(hr);
  // Every interface the add-in asks for this way is dual, so the pointer is
  // an IDispatch of its own.
  auto object = std::make_shared<InterfaceObject>(bridge_, other);
  other->Release();
  return object;
}

DispId InterfaceObject::IdOfName(std::string_view name) {
  ITypeInfo* ti = nullptr;
  if (FAILED(dispatch()->GetTypeInfo(0, LOCALE_USER_DEFAULT, &ti)) || !ti) return DispatchObject::IdOfName(name);
  std::wstring wide = Utf8ToWide(name);
  LPOLESTR names[] = {wide.data()};
  MEMBERID id = MEMBERID_NIL;
  HRESULT hr = ti->GetIDsOfNames(names, 1, &id);
  ti->Release();
  if (FAILED(hr)) throw ErrorFromHResult(hr == DISP_E_UNKNOWNNAME ? DISP_E_MEMBERNOTFOUND : hr);
  return id;
}

// ------------------------------------------------------------- resources

EarlyBoundResourceObject::EarlyBoundResourceObject(ComBridge& bridge, IFirstOperationStringById* object,
                                                   const IID& iid)
    : DispatchObject(bridge, object), object_(object), iid_(iid) {}

DispId EarlyBoundResourceObject::IdOfOwnOperation(int position) {
  if (position == 1) return kFirstOperation;
  return DispatchObject::IdOfOwnOperation(position);
}

Variant EarlyBoundResourceObject::Invoke(DispId id, CallKind kind, std::span<Variant> args) {
  if (id != kFirstOperation) return DispatchObject::Invoke(id, kind, args);
  if (args.size() != 1) throw AutomationError(vberr::kWrongArgCount);
  const LONG stringId = args[0].toInt32();
  BSTR text = nullptr;
  HRESULT hr = object_->FirstOperation(stringId, &text);
  if (FAILED(hr)) {
    SysFreeString(text);
    throw ErrorFromHResult(hr, object_, iid_);
  }
  std::string value = BstrToUtf8(text);
  SysFreeString(text);
  return value;
}

}  // namespace kpx::win32
