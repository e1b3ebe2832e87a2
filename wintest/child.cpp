// A child process for the process tests: "exit N" ends at once with exit
// code N (decimal or 0x hex, all 32 bits), "sleep MS" waits that long and
// ends with 0.
#include <windows.h>

#include <cstdlib>
#include <cstring>

int main(int argc, char** argv) {
  if (argc == 3 && std::strcmp(argv[1], "exit") == 0) ExitProcess(static_cast<UINT>(std::strtoul(argv[2], nullptr, 0)));
  if (argc == 3 && std::strcmp(argv[1], "sleep") == 0) {
    Sleep(static_cast<DWORD>(std::strtoul(argv[2], nullptr, 0)));
    return 0;
  }
  return 100;
}
