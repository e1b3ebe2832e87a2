#include "own_operations.h"

#include "automation/automation_error.h"

namespace wintest {

HRESULT OwnOperationsTypeInfo::QueryInterface(REFIID iid, void** out) {
  if (!out) return E_POINTER;
  if (IsEqualIID(iid, IID_IUnknown) || IsEqualIID(iid, IID_ITypeInfo)) {
    *out = static_cast<ITypeInfo*>(this);
    AddRef();
    return S_OK;
  }
  *out = nullptr;
  return E_NOINTERFACE;
}

ULONG OwnOperationsTypeInfo::Release() {
  LONG n = InterlockedDecrement(&refs_);
  if (n == 0) delete this;
  return static_cast<ULONG>(n);
}

HRESULT OwnOperationsTypeInfo::GetTypeAttr(TYPEATTR** attr) {
  auto* a = new TYPEATTR{};
  a->typekind = TKIND_DISPATCH;
  a->cFuncs = 0xFFFF;  // as many as the companion has; asked one by one
  a->cbSizeVft = 7 * sizeof(void*);
  *attr = a;
  return S_OK;
}

HRESULT OwnOperationsTypeInfo::GetFuncDesc(UINT index, FUNCDESC** desc) {
  *desc = nullptr;
  if (index >= firstMissing_) return TYPE_E_ELEMENTNOTFOUND;
  auto it = known_.find(index);
  if (it == known_.end()) {
    try {
      it = known_.emplace(index, object_.IdOfOwnOperation(static_cast<int>(index) + 1)).first;
    } catch (const kpx::AutomationError&) {
      firstMissing_ = index;
      return TYPE_E_ELEMENTNOTFOUND;
    }
  }
  auto* f = new FUNCDESC{};
  f->memid = it->second;
  f->funckind = FUNC_DISPATCH;
  f->invkind = INVOKE_FUNC;
  f->callconv = CC_STDCALL;
  f->elemdescFunc.tdesc.vt = VT_VARIANT;
  *desc = f;
  return S_OK;
}

}  // namespace wintest
