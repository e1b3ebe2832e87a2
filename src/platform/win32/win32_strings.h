// Text at the Windows boundary: the core speaks UTF-8, COM speaks UTF-16
// (BSTR), and the ANSI functions speak the system code page.
#pragma once

#include "platform/win32/win32_api.h"

#include <string>
#include <string_view>

namespace kpx::win32 {

std::wstring Utf8ToWide(std::string_view utf8);
std::string WideToUtf8(std::wstring_view wide);

// UTF-8 <-> the system's ANSI code page (CP_ACP), through UTF-16.
std::string Utf8ToAnsi(std::string_view utf8);
std::string AnsiToUtf8(std::string_view ansi);

// A new BSTR (the caller frees it); nullptr only when memory runs out.
BSTR Utf8ToBstr(std::string_view utf8);
// A BSTR's text; a null BSTR is the empty string, as automation treats it.
std::string BstrToUtf8(BSTR bstr);

// "{XXXXXXXX-XXXX-XXXX-XXXX-XXXXXXXXXXXX}" in upper case.
std::wstring GuidToWide(const GUID& guid);
std::string GuidToString(const GUID& guid);
// False when the text is not a GUID in registry form.
bool GuidFromString(std::string_view text, GUID* guid);

}  // namespace kpx::win32
