// kpxdoctor's view of the real Windows machine it runs on.
#pragma once

#include <memory>

#include "doctor/machine.h"

namespace kpx::win32 {

std::unique_ptr<doctor::Machine> MakeWin32Machine();

}  // namespace kpx::win32
