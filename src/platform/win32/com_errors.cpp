#include "platform/win32/com_errors.h"

#include <cstdio>

#include "platform/win32/win32_strings.h"

namespace kpx::win32 {

std::string SystemErrorText(HRESULT hr) {
  wchar_t* text = nullptr;
  DWORD n = FormatMessageW(FORMAT_MESSAGE_ALLOCATE_BUFFER | FORMAT_MESSAGE_FROM_SYSTEM | FORMAT_MESSAGE_IGNORE_INSERTS,
                           nullptr, static_cast<DWORD>(hr), 0, reinterpret_cast<wchar_t*>(&text), 0, nullptr);
  std::wstring wide;
  if (n && text) wide.assign(text, n);
  if (text) LocalFree(text);
  while (!wide.empty() && (wide.back() == L'\r' || wide.back() == L'\n' || wide.back() == L' ')) wide.pop_back();
  return WideToUtf8(wide);
}

int32_t VbNumberFromHResult(HRESULT hr) {
  if (HRESULT_FACILITY(hr) == FACILITY_CONTROL && FAILED(hr)) return static_cast<int32_t>(hr & 0xFFFF);
  switch (hr) {
    case DISP_E_MEMBERNOTFOUND:
    case DISP_E_UNKNOWNNAME: return vberr::kNoSuchMember;
    case DISP_E_TYPEMISMATCH: return vberr::kTypeMismatch;
    case DISP_E_BADPARAMCOUNT: return vberr::kWrongArgCount;
    case DISP_E_PARAMNOTOPTIONAL: return vberr::kArgNotOptional;
    case DISP_E_OVERFLOW: return vberr::kOverflow;
    case DISP_E_BADINDEX: return vberr::kSubscript;
    case E_OUTOFMEMORY: return 7;  // Out of memory
    default: return static_cast<int32_t>(hr);
  }
}

HRESULT HResultFromVbNumber(int32_t number) {
  if (number > 0 && number <= 0xFFFF) return MAKE_HRESULT(SEVERITY_ERROR, FACILITY_CONTROL, number);
  return static_cast<HRESULT>(number);
}

namespace {

std::string DescriptionFor(int32_t number, HRESULT hr) {
  std::string text = VbErrorDescription(number);
  if (text.empty()) text = SystemErrorText(hr);
  if (text.empty()) {
    char buf[48];
    std::snprintf(buf, sizeof buf, "Automation error 0x%08lX", static_cast<unsigned long>(hr));
    text = buf;
  }
  return text;
}

}  // namespace

AutomationError ErrorFromHResult(HRESULT hr, IUnknown* errorSource, REFIID iid) {
  const int32_t number = VbNumberFromHResult(hr);
  std::string description;
  std::string source;
  ISupportErrorInfo* support = nullptr;
  if (errorSource && SUCCEEDED(errorSource->QueryInterface(IID_ISupportErrorInfo, reinterpret_cast<void**>(&support)))) {
    if (support->InterfaceSupportsErrorInfo(iid) == S_OK) {
      IErrorInfo* info = nullptr;
      if (GetErrorInfo(0, &info) == S_OK && info) {
        BSTR text = nullptr;
        if (SUCCEEDED(info->GetDescription(&text))) description = BstrToUtf8(text);
        SysFreeString(text);
        text = nullptr;
        if (SUCCEEDED(info->GetSource(&text))) source = BstrToUtf8(text);
        SysFreeString(text);
        info->Release();
      }
    }
    support->Release();
  }
  if (description.empty()) description = DescriptionFor(number, hr);
  return AutomationError(number, description, source);
}

AutomationError ErrorFromExcepInfo(EXCEPINFO& info) {
  if (info.pfnDeferredFillIn) info.pfnDeferredFillIn(&info);
  const HRESULT scode = info.scode;
  const int32_t number = info.wCode ? static_cast<int32_t>(info.wCode) : VbNumberFromHResult(scode);
  std::string description = BstrToUtf8(info.bstrDescription);
  std::string source = BstrToUtf8(info.bstrSource);
  SysFreeString(info.bstrDescription);
  SysFreeString(info.bstrSource);
  SysFreeString(info.bstrHelpFile);
  info.bstrDescription = info.bstrSource = info.bstrHelpFile = nullptr;
  if (description.empty()) description = DescriptionFor(number, info.wCode ? HResultFromVbNumber(number) : scode);
  return AutomationError(number, description, source);
}

void FillExcepInfo(const AutomationError& error, const char* source, EXCEPINFO* info) {
  if (!info) return;
  *info = EXCEPINFO{};
  info->scode = HResultFromVbNumber(error.number());
  info->bstrDescription = Utf8ToBstr(error.description());
  info->bstrSource = Utf8ToBstr(error.source().empty() ? source : error.source());
}

void SetThreadErrorInfo(const AutomationError& error, const char* source, REFIID iid) {
  ICreateErrorInfo* create = nullptr;
  if (FAILED(CreateErrorInfo(&create))) return;
  std::wstring description = Utf8ToWide(error.description());
  std::wstring src = Utf8ToWide(error.source().empty() ? source : error.source());
  create->SetGUID(iid);
  create->SetDescription(description.data());
  create->SetSource(src.data());
  IErrorInfo* info = nullptr;
  if (SUCCEEDED(create->QueryInterface(IID_IErrorInfo, reinterpret_cast<void**>(&info)))) {
    SetErrorInfo(0, info);
    info->Release();
  }
  create->Release();
}

}  // namespace kpx::win32
