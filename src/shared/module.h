// The state one loaded copy of the add-in shares across all its objects:
// the outside world, the logger's settings, the resource objects. The
// library owns one; each test builds its own, so nothing leaks between them.
#pragma once

#include "platform/platform.h"
#include "shared/resource_strings.h"
#include "shared/shared_debug_logger.h"

namespace kpx {

class Module {
 public:
  explicit Module(const platform::Platform& platform)
      : platform_(platform), logger_(platform_), resources_(platform_.objects) {}
  Module(const Module&) = delete;
  Module& operator=(const Module&) = delete;

  const platform::Platform& platform() const { return platform_; }
  DebugLogger& logger() { return logger_; }
  ResourceStrings& resources() { return resources_; }

  // Shorthand for the add-in's own trace lines.
  bool DebugLog(std::string_view message, int32_t logId, int32_t level) {
    return logger_.DebugLog(message, logId, level);
  }

 private:
  platform::Platform platform_;
  DebugLogger logger_;
  ResourceStrings resources_;
};

}  // namespace kpx
