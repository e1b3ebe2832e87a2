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

// The registry view of the other build (32-bit for a 64-bit process and the
// other way round), and whether this machine has one: 64-bit Windows.
REGSAM OtherBuildsView();
bool HasOtherBuildsView();

// A key's default string value, creating the key, in the given view; and a
// key without subkeys removed from that view.
bool WriteDefault(HKEY root, const std::wstring& key, REGSAM view, const std::wstring& value);
bool DeleteLeafKey(HKEY root, const std::wstring& key, REGSAM view);

// Writes a value with the ANSI registry functions, creating the key.
bool WriteAnsiString(HKEY root, const char* key, const char* name, const char* value);
bool WriteAnsiDword(HKEY root, const char* key, const char* name, DWORD value);

// A whole file's bytes; empty when it cannot be read.
std::string ReadFileBytes(const std::wstring& path);

std::string Narrow(const std::wstring& wide);
std::wstring Widen(const std::string& utf8);

}  // namespace wintest
