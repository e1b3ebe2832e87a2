// What the test host does to the machine around the add-in: registration
// through regsvr32, registry snapshots and settings, files.
#pragma once

#include "platform/win32/win32_api.h"

#include <set>
#include <string>
#include <vector>

namespace wintest {

// Runs regsvr32 /s (and /u) on a DLL; its exit code.
DWORD Regsvr32(const std::wstring& dll, bool unregister);

// Every key and value below the given HKCR keys, one line each
// ("key" and "key|name=type:data"); missing keys add nothing.
std::set<std::wstring> SnapshotClassesRoot(const std::vector<std::wstring>& keys);

// Writes a value with the ANSI registry functions, creating the key.
bool WriteAnsiString(HKEY root, const char* key, const char* name, const char* value);
bool WriteAnsiDword(HKEY root, const char* key, const char* name, DWORD value);

// A whole file's bytes; empty when it cannot be read.
std::string ReadFileBytes(const std::wstring& path);

std::string Narrow(const std::wstring& wide);
std::wstring Widen(const std::string& utf8);

}  // namespace wintest
