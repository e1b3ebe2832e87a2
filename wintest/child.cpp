// A child process for the process tests: "exit N" ends at once with exit
// code N (decimal or 0x hex, all 32 bits), "sleep MS" waits that long and
// ends with 0.
//
// kpx-comsim also puts it where a scenario's model has a program, as that
// program: "<its path>.exit" beside it then holds the exit code it ends
// with whatever its arguments, and each start appends a line to the file
// the environment's KPX_CHILD_CALLS names: its own path, a tab, and its
// command line as it was handed over (UTF-8).
#include <windows.h>

#include <cstdlib>
#include <cstring>
#include <string>

namespace {

std::string Utf8(const wchar_t* text) {
  const int n = WideCharToMultiByte(CP_UTF8, 0, text, -1, nullptr, 0, nullptr, nullptr);
  std::string out(static_cast<size_t>(n > 0 ? n : 1), '\0');
  WideCharToMultiByte(CP_UTF8, 0, text, -1, out.data(), n, nullptr, nullptr);
  out.resize(std::strlen(out.c_str()));
  return out;
}

// The exit code kpx-comsim gave this program, when it put it in place.
bool PlacedExitCode(const std::wstring& self, UINT& code) {
  HANDLE file = CreateFileW((self + L".exit").c_str(), GENERIC_READ, FILE_SHARE_READ, nullptr, OPEN_EXISTING, 0, nullptr);
  if (file == INVALID_HANDLE_VALUE) return false;
  char text[32] = {};
  DWORD read = 0;
  ReadFile(file, text, sizeof text - 1, &read, nullptr);
  CloseHandle(file);
  code = static_cast<UINT>(std::strtoul(text, nullptr, 0));
  return true;
}

void RecordStart(const std::wstring& self) {
  wchar_t calls[MAX_PATH] = {};
  if (!GetEnvironmentVariableW(L"KPX_CHILD_CALLS", calls, MAX_PATH)) return;
  HANDLE file = CreateFileW(calls, FILE_APPEND_DATA, FILE_SHARE_READ | FILE_SHARE_WRITE, nullptr, OPEN_ALWAYS, 0, nullptr);
  if (file == INVALID_HANDLE_VALUE) return;
  const std::string line = Utf8(self.c_str()) + "\t" + Utf8(GetCommandLineW()) + "\n";
  DWORD written = 0;
  WriteFile(file, line.data(), static_cast<DWORD>(line.size()), &written, nullptr);
  CloseHandle(file);
}

}  // namespace

int main(int argc, char** argv) {
  wchar_t self[MAX_PATH] = {};
  GetModuleFileNameW(nullptr, self, MAX_PATH);
  UINT placed = 0;
  if (PlacedExitCode(self, placed)) {
    RecordStart(self);
    ExitProcess(placed);
  }
  if (argc == 3 && std::strcmp(argv[1], "exit") == 0) ExitProcess(static_cast<UINT>(std::strtoul(argv[2], nullptr, 0)));
  if (argc == 3 && std::strcmp(argv[1], "sleep") == 0) {
    Sleep(static_cast<DWORD>(std::strtoul(argv[2], nullptr, 0)));
    return 0;
  }
  return 100;
}
