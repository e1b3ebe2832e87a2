// kpxdoctor on Windows: the checks on the machine it runs on, for the
// bitness it was built for (the x86 one sees what the 32-bit host sees).
#include <iostream>

#include "doctor/doctor.h"
#include "platform/win32/win32_machine.h"

int main(int argc, char** argv) {
  std::vector<std::string> args(argv + 1, argv + argc);
  std::unique_ptr<kpx::doctor::Machine> machine = kpx::win32::MakeWin32Machine();
  return kpx::doctor::RunDoctor(args, *machine, std::cout, std::cerr);
}
