// Failures crossing the COM boundary, both ways: HRESULTs and EXCEPINFOs
// turned into the core's AutomationError, and back.
#pragma once

#include "platform/win32/win32_api.h"

#include <cstdint>
#include <string>

#include "automation/automation_error.h"

namespace kpx::win32 {

// The system's text for an HRESULT (FormatMessage), without the trailing
// line break; "" when the system has none.
std::string SystemErrorText(HRESULT hr);

// The VB error number an HRESULT stands for, as VB's runtime maps it: a
// FACILITY_CONTROL code (0x800A....) carries the number in its low word,
// the standard dispatch failures have VB numbers of their own, and any other
// HRESULT is its own number.
int32_t VbNumberFromHResult(HRESULT hr);

// The HRESULT that carries a VB error number: FACILITY_CONTROL for VB's
// numbers (1..65535), the number itself when it already is an HRESULT.
HRESULT HResultFromVbNumber(int32_t number);

// The error a failed call reports. `errorSource` (may be null) is asked for
// its IErrorInfo when it says, through ISupportErrorInfo, that `iid` sets one.
AutomationError ErrorFromHResult(HRESULT hr, IUnknown* errorSource = nullptr, REFIID iid = IID_NULL);

// The error described by an EXCEPINFO (filled in first if deferred). Frees
// the EXCEPINFO's strings.
AutomationError ErrorFromExcepInfo(EXCEPINFO& info);

// Fills an EXCEPINFO the way a VB server does: scode holds the number as an
// HRESULT, wCode stays 0, plus description and source.
void FillExcepInfo(const AutomationError& error, const char* source, EXCEPINFO* info);

// Publishes the error through SetErrorInfo for callers that ask with
// GetErrorInfo (early-bound callers, CoCreateInstance's callers).
void SetThreadErrorInfo(const AutomationError& error, const char* source, REFIID iid);

}  // namespace kpx::win32
