#include "calls.h"

namespace wintest {

Outcome Call(IDispatch* target, DISPID id, Flags flags, std::vector<Var*> args, bool excepInfo) {
  std::vector<VARIANT> reversed;
  for (auto it = args.rbegin(); it != args.rend(); ++it) reversed.push_back((*it)->v);  // shallow: args own them
  DISPID put = DISPID_PROPERTYPUT;
  DISPPARAMS params{reversed.data(), nullptr, static_cast<UINT>(reversed.size()), 0};
  const bool isPut = flags == Flags::Put || flags == Flags::PutRef;
  if (isPut) {
    params.rgdispidNamedArgs = &put;
    params.cNamedArgs = 1;
  }
  Outcome out;
  UINT argErr = 0;
  out.hr = target->Invoke(id, IID_NULL, LOCALE_USER_DEFAULT, static_cast<WORD>(flags), &params,
                          isPut ? nullptr : &out.result.v, excepInfo ? &out.info : nullptr, &argErr);
  // A callee may have replaced what a by-value slot held only in its copy;
  // write-back goes through references, which point at the caller's storage.
  return out;
}

DISPID IdOf(IDispatch* target, const wchar_t* name) {
  DISPID id = DISPID_UNKNOWN;
  LPOLESTR names[] = {const_cast<LPOLESTR>(name)};
  if (FAILED(target->GetIDsOfNames(IID_NULL, names, 1, LOCALE_USER_DEFAULT, &id))) return DISPID_UNKNOWN;
  return id;
}

}  // namespace wintest
