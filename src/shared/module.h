// The state one loaded copy of the add-in shares across all its objects:
// the outside world, the logger's settings, the resource objects. The
// library owns one; each test builds its own, so nothing leaks between them.
#pragma once

#include <cstdint>
#include <string>

#include "platform/platform.h"
#include "shared/resource_strings.h"
#include "shared/shared_debug_logger.h"

namespace kpx {

// The pending error: number and description of the last failure a routine
// chose to remember rather than raise. Routines that report through it set
// it; the host's code-update events start it afresh.
struct ErrorState {
  int32_t number = 0;
  std::string description;
  void Clear() { number = 0; description.clear(); }
};

class Module {
 public:
  explicit Module(const platform::Platform& platform)
      : platform_(platform), logger_(platform_), resources_(platform_.objects) {}
  Module(const Module&) = delete;
  Module& operator=(const Module&) = delete;

  const platform::Platform& platform() const { return platform_; }
  DebugLogger& logger() { return logger_; }
  ResourceStrings& resources() { return resources_; }
  ErrorState& error() { return error_; }

  // Shorthand for the add-in's own trace lines.
  bool DebugLog(std::string_view message, int32_t logId, int32_t level) {
    return logger_.DebugLog(message, logId, level);
  }

 private:
  platform::Platform platform_;
  DebugLogger logger_;
  ResourceStrings resources_;
  ErrorState error_;
};

}  // namespace kpx
