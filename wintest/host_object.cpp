#include "host_object.h"

#include <cwchar>
#include <memory>

namespace wintest {

std::wstring Describe(const VARIANT& v) {
  wchar_t buf[64];
  if (v.vt == (VT_BYREF | VT_VARIANT)) return L"ref-variant>" + (v.pvarVal ? Describe(*v.pvarVal) : L"null");
  std::wstring prefix = (v.vt & VT_BYREF) ? L"ref-" : L"";
  VARIANT value;
  VariantInit(&value);
  if (FAILED(VariantCopyInd(&value, const_cast<VARIANT*>(&v)))) return prefix + L"?";
  std::wstring out;
  switch (value.vt) {
    case VT_EMPTY: out = L"empty"; break;
    case VT_NULL: out = L"null"; break;
    case VT_I2: swprintf(buf, 64, L"i2:%d", value.iVal); out = buf; break;
    case VT_I4: swprintf(buf, 64, L"i4:%ld", static_cast<long>(value.lVal)); out = buf; break;
    case VT_R4: swprintf(buf, 64, L"r4:%g", static_cast<double>(value.fltVal)); out = buf; break;
    case VT_R8: swprintf(buf, 64, L"r8:%g", value.dblVal); out = buf; break;
    case VT_DATE: swprintf(buf, 64, L"date:%g", value.date); out = buf; break;
    case VT_BOOL: swprintf(buf, 64, L"bool:%d", value.boolVal); out = buf; break;
    case VT_BSTR: out = L"bstr:" + std::wstring(value.bstrVal ? value.bstrVal : L"", SysStringLen(value.bstrVal)); break;
    case VT_DISPATCH: out = value.pdispVal ? L"disp" : L"disp:null"; break;
    case VT_ERROR: swprintf(buf, 64, L"error:%08lX", static_cast<unsigned long>(value.scode)); out = buf; break;
    default: swprintf(buf, 64, L"vt:%d", value.vt); out = buf; break;
  }
  VariantClear(&value);
  return prefix + out;
}

HostObject::~HostObject() = default;

HostObject& HostObject::On(DISPID id, std::wstring name, Handler handler) {
  members_.push_back({id, std::move(name), std::move(handler)});
  return *this;
}

HostObject& HostObject::Value(DISPID id, std::wstring name, const VARIANT& value) {
  VARIANT copy;
  VariantInit(&copy);
  VariantCopy(&copy, const_cast<VARIANT*>(&value));
  // The copy lives as long as the handler; a shared holder frees it once.
  struct Holder {
    VARIANT v;
    ~Holder() { VariantClear(&v); }
  };
  auto holder = std::make_shared<Holder>();
  holder->v = copy;
  return On(id, std::move(name), [holder](DISPPARAMS&, VARIANT* result, EXCEPINFO*) {
    if (result) VariantCopy(result, &holder->v);
    return S_OK;
  });
}

HostObject& HostObject::Text(DISPID id, std::wstring name, const wchar_t* text) {
  VARIANT v;
  v.vt = VT_BSTR;
  v.bstrVal = SysAllocString(text);
  Value(id, std::move(name), v);
  VariantClear(&v);
  return *this;
}

HostObject& HostObject::Object(DISPID id, std::wstring name, IDispatch* object) {
  VARIANT v;
  v.vt = VT_DISPATCH;
  v.pdispVal = object;
  return Value(id, std::move(name), v);  // Value copies, adding its own reference
}

HostObject& HostObject::Method(DISPID id, std::wstring name) {
  return On(id, std::move(name), [](DISPPARAMS&, VARIANT*, EXCEPINFO*) { return S_OK; });
}

HRESULT HostObject::QueryInterface(REFIID iid, void** out) {
  if (!out) return E_POINTER;
  if (IsEqualIID(iid, IID_IUnknown) || IsEqualIID(iid, IID_IDispatch)) {
    *out = static_cast<IDispatch*>(this);
    AddRef();
    return S_OK;
  }
  *out = nullptr;
  return E_NOINTERFACE;
}

ULONG HostObject::Release() {
  LONG n = --refs_;
  if (n == 0) delete this;
  return static_cast<ULONG>(n);
}

HRESULT HostObject::GetTypeInfoCount(UINT* count) {
  *count = 0;
  return S_OK;
}

HRESULT HostObject::GetTypeInfo(UINT, LCID, ITypeInfo** info) {
  *info = nullptr;
  return DISP_E_BADINDEX;
}

HRESULT HostObject::GetIDsOfNames(REFIID, LPOLESTR* names, UINT count, LCID, DISPID* ids) {
  for (UINT i = 0; i < count; ++i) ids[i] = DISPID_UNKNOWN;
  for (const Member& m : members_) {
    if (_wcsicmp(m.name.c_str(), names[0]) == 0) {
      ids[0] = m.id;
      return count == 1 ? S_OK : DISP_E_UNKNOWNNAME;
    }
  }
  return DISP_E_UNKNOWNNAME;
}

HRESULT HostObject::Invoke(DISPID id, REFIID, LCID, WORD flags, DISPPARAMS* params, VARIANT* result, EXCEPINFO* info,
                           UINT*) {
  for (const Member& m : members_) {
    if (m.id != id) continue;
    Seen call;
    call.member = m.name;
    call.flags = flags;
    for (UINT i = 0; i < params->cArgs; ++i) call.args.push_back(Describe(Arg(*params, i)));
    for (UINT i = 0; i < params->cNamedArgs; ++i) call.named.push_back(params->rgdispidNamedArgs[i]);
    calls_.push_back(std::move(call));
    if (result) VariantInit(result);
    Handler handler = m.handler;  // the handler may change the members
    return handler(*params, result, info);
  }
  return DISP_E_MEMBERNOTFOUND;
}

std::vector<Seen> HostObject::CallsOf(const std::wstring& member) const {
  std::vector<Seen> out;
  for (const Seen& c : calls_)
    if (c.member == member) out.push_back(c);
  return out;
}

}  // namespace wintest
