// Host objects written directly against IDispatch, independent of the
// add-in's own COM bridge: whatever the add-in gets wrong about DISPPARAMS
// (argument order, references, named arguments, flags) shows up here
// instead of being mirrored by a server built from the same code.
#pragma once

#include "platform/win32/win32_api.h"

#include <functional>
#include <string>
#include <vector>

namespace wintest {

// An owning COM pointer.
template <class T>
class Ref {
 public:
  Ref() = default;
  explicit Ref(T* p) : p_(p) {}  // takes over a reference
  Ref(const Ref& o) : p_(o.p_) { if (p_) p_->AddRef(); }
  Ref& operator=(Ref o) { std::swap(p_, o.p_); return *this; }
  ~Ref() { if (p_) p_->Release(); }
  T* get() const { return p_; }
  T* operator->() const { return p_; }
  T** out() { reset(); return &p_; }
  void reset() { if (p_) p_->Release(); p_ = nullptr; }
  explicit operator bool() const { return p_ != nullptr; }

 private:
  T* p_ = nullptr;
};

// One call as the host object saw it.
struct Seen {
  std::wstring member;
  WORD flags = 0;
  std::vector<std::wstring> args;  // natural order, described by Describe()
  std::vector<DISPID> named;
};

// "i2:4", "bstr:text", "bool:-1", "disp", "ref-variant>i4:5" ...
std::wstring Describe(const VARIANT& v);

class HostObject final : public IDispatch {
 public:
  using Handler = std::function<HRESULT(DISPPARAMS& params, VARIANT* result, EXCEPINFO* info)>;

  static Ref<HostObject> Make(std::wstring label) { return Ref<HostObject>(new HostObject(std::move(label))); }

  HostObject& On(DISPID id, std::wstring name, Handler handler);
  // A member that answers a copy of `value`.
  HostObject& Value(DISPID id, std::wstring name, const VARIANT& value);
  HostObject& Text(DISPID id, std::wstring name, const wchar_t* text);
  HostObject& Object(DISPID id, std::wstring name, IDispatch* object);
  // A member that only records the call.
  HostObject& Method(DISPID id, std::wstring name);

  HRESULT STDMETHODCALLTYPE QueryInterface(REFIID iid, void** out) override;
  ULONG STDMETHODCALLTYPE AddRef() override { return static_cast<ULONG>(++refs_); }
  ULONG STDMETHODCALLTYPE Release() override;
  HRESULT STDMETHODCALLTYPE GetTypeInfoCount(UINT* count) override;
  HRESULT STDMETHODCALLTYPE GetTypeInfo(UINT, LCID, ITypeInfo** info) override;
  HRESULT STDMETHODCALLTYPE GetIDsOfNames(REFIID, LPOLESTR* names, UINT count, LCID, DISPID* ids) override;
  HRESULT STDMETHODCALLTYPE Invoke(DISPID id, REFIID, LCID, WORD flags, DISPPARAMS* params, VARIANT* result,
                                   EXCEPINFO* info, UINT* argErr) override;

  LONG refs() const { return refs_; }
  const std::vector<Seen>& calls() const { return calls_; }
  // The calls of one member, in order.
  std::vector<Seen> CallsOf(const std::wstring& member) const;
  // Drops the members (and the objects they hand out), breaking cycles.
  void Clear() { members_.clear(); }

 private:
  explicit HostObject(std::wstring label) : label_(std::move(label)) {}
  ~HostObject();

  struct Member {
    DISPID id;
    std::wstring name;
    Handler handler;
  };
  std::wstring label_;
  LONG refs_ = 1;
  std::vector<Member> members_;
  std::vector<Seen> calls_;
};

// The argument at natural position i (0 = first).
inline VARIANT& Arg(DISPPARAMS& params, UINT i) { return params.rgvarg[params.cArgs - 1 - i]; }

}  // namespace wintest
