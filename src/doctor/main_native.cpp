// kpxdoctor on Linux: the checks on a kpx-sim sandbox, so that they can be
// tried and tested without Windows.
#include <iostream>
#include <stdexcept>

#include "doctor/doctor.h"
#include "platform/posix/sandbox_machine.h"

int main(int argc, char** argv) {
  std::vector<std::string> args(argv + 1, argv + argc);
  if (args.size() < 2 || args[0] != "--sandbox") {
    std::cerr << "kpxdoctor: natively it reads a kpx-sim sandbox: kpxdoctor --sandbox DIR ...\n"
              << kpx::doctor::Usage("--sandbox DIR ");
    return 2;
  }
  try {
    kpx::posix::SandboxMachine machine(args[1]);
    args.erase(args.begin(), args.begin() + 2);
    return kpx::doctor::RunDoctor(args, machine, std::cout, std::cerr);
  } catch (const std::runtime_error& e) {
    std::cerr << "kpxdoctor: " << e.what() << "\n";
    return 2;
  }
}
