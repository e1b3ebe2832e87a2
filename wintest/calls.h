// Raw IDispatch calls as a host makes them: VARIANTs built by hand, last
// argument first in DISPPARAMS, the put value as the named argument.
#pragma once

#include "platform/win32/win32_api.h"

#include <string>
#include <vector>

namespace wintest {

// A VARIANT that frees what it holds (a reference frees nothing).
class Var {
 public:
  Var() { VariantInit(&v); }
  Var(const Var&) = delete;
  Var& operator=(const Var&) = delete;
  Var(Var&& o) noexcept : v(o.v) { VariantInit(&o.v); }
  Var& operator=(Var&& o) noexcept {
    if (this != &o) {
      VariantClear(&v);
      v = o.v;
      VariantInit(&o.v);
    }
    return *this;
  }
  ~Var() { VariantClear(&v); }

  static Var I2(short n) { Var x; x.v.vt = VT_I2; x.v.iVal = n; return x; }
  static Var I4(long n) { Var x; x.v.vt = VT_I4; x.v.lVal = n; return x; }
  static Var Bool(bool b) { Var x; x.v.vt = VT_BOOL; x.v.boolVal = b ? VARIANT_TRUE : VARIANT_FALSE; return x; }
  static Var Str(const wchar_t* s) { Var x; x.v.vt = VT_BSTR; x.v.bstrVal = SysAllocString(s); return x; }
  static Var Disp(IDispatch* d) { Var x; x.v.vt = VT_DISPATCH; x.v.pdispVal = d; if (d) d->AddRef(); return x; }
  static Var Missing() { Var x; x.v.vt = VT_ERROR; x.v.scode = DISP_E_PARAMNOTFOUND; return x; }
  static Var RefVariant(VARIANT* target) { Var x; x.v.vt = VT_BYREF | VT_VARIANT; x.v.pvarVal = target; return x; }
  static Var RefDisp(IDispatch** target) { Var x; x.v.vt = VT_BYREF | VT_DISPATCH; x.v.ppdispVal = target; return x; }
  static Var RefI2(short* target) { Var x; x.v.vt = VT_BYREF | VT_I2; x.v.piVal = target; return x; }
  static Var RefBool(VARIANT_BOOL* target) { Var x; x.v.vt = VT_BYREF | VT_BOOL; x.v.pboolVal = target; return x; }
  static Var RefStr(BSTR* target) { Var x; x.v.vt = VT_BYREF | VT_BSTR; x.v.pbstrVal = target; return x; }

  std::wstring Text() const { return v.vt == VT_BSTR && v.bstrVal ? std::wstring(v.bstrVal, SysStringLen(v.bstrVal)) : L""; }

  VARIANT v;
};

struct Outcome {
  HRESULT hr = E_FAIL;
  Var result;
  EXCEPINFO info{};
  Outcome() = default;
  Outcome(Outcome&& o) noexcept : hr(o.hr), result(std::move(o.result)), info(o.info) { o.info = EXCEPINFO{}; }
  ~Outcome() {
    SysFreeString(info.bstrDescription);
    SysFreeString(info.bstrSource);
    SysFreeString(info.bstrHelpFile);
  }
  std::wstring Description() const { return info.bstrDescription ? info.bstrDescription : L""; }
  std::wstring Source() const { return info.bstrSource ? info.bstrSource : L""; }
};

enum class Flags : WORD {
  Method = DISPATCH_METHOD,
  Get = DISPATCH_PROPERTYGET,
  MethodOrGet = DISPATCH_METHOD | DISPATCH_PROPERTYGET,
  Put = DISPATCH_PROPERTYPUT,
  PutRef = DISPATCH_PROPERTYPUTREF,
};

// `args` in natural order. With `excepInfo` false the call passes no
// EXCEPINFO, as some hosts do.
Outcome Call(IDispatch* target, DISPID id, Flags flags, std::vector<Var*> args = {}, bool excepInfo = true);

// GetIDsOfNames of one name; DISPID_UNKNOWN when unknown.
DISPID IdOf(IDispatch* target, const wchar_t* name);

}  // namespace wintest
