// The debug log: one text file, one line per call, filtered by a mask of
// subsystem (log id) and severity (level) bits read once from the registry.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

#include "platform/platform.h"

namespace kpx {

namespace logid {
inline constexpr int32_t UNKNOWN = 0;
inline constexpr int32_t ADDIN = 7;
inline constexpr int32_t KPXADDIN = 14;
}  // namespace logid

namespace loglevel {
inline constexpr int32_t CRITICAL = 0;
inline constexpr int32_t ERROR = 1;
inline constexpr int32_t WARNING = 2;
inline constexpr int32_t INFO = 3;
inline constexpr int32_t TRACE = 4;
inline constexpr int32_t TIMING = 5;
inline constexpr int32_t DEBUG = 6;
}  // namespace loglevel

// The settings live with the sibling "VisualStudio" add-in, which shares them.
inline constexpr std::string_view kDebugSettingsKey = "SOFTWARE\\Tolvek Software\\Quarn\\AddIns\\VisualStudio";
inline constexpr std::string_view kDefaultDebugLogPath = "C:\\tzndebuglog.txt";

class DebugLogger {
 public:
  explicit DebugLogger(const platform::Platform& platform) : platform_(platform) {}

  // Writes one line when the mask lets it through. True when the line passed
  // the filter, whether or not the file could be written.
  bool DebugLog(std::string_view message, int32_t logId, int32_t level) {
    if (!DebugLogEnabled(logId, level)) return false;
    return WriteLine(message, logId, level);
  }

  bool DebugLogEnabled(int32_t logId, int32_t level) {
    if (!loaded_) LoadDebugSettings();
    if (logId < 0 || logId > 14) logId = 0;
    if (logId == 0 || !(static_cast<uint32_t>(mask_) & (1u << logId))) return false;
    return IsLevelEnabled(level);
  }

  bool IsLevelEnabled(int32_t level) {
    if (!loaded_) LoadDebugSettings();
    if (level < 0 || level > 6) level = loglevel::DEBUG;
    return (static_cast<uint32_t>(mask_) & (1u << (24 + level))) != 0;
  }

  int32_t DebugMask();
  const std::string& DebugOutputPath();
  static std::string LogIdName(int32_t logId);
  static std::string LogLevelName(int32_t level);

  // Reads the settings. Runs once per process: a failure is not retried.
  void LoadDebugSettings();

 private:
  bool WriteLine(std::string_view message, int32_t logId, int32_t level);
  std::string TimeStamp();

  const platform::Platform& platform_;
  bool loaded_ = false;
  int32_t mask_ = 0;
  std::string path_{kDefaultDebugLogPath};
  std::string directory_;        // kept for sibling components; the logger itself never reads it
  std::string suppressStamps_;   // lower case
  float startTime_ = 0;          // never assigned: stamps show plain seconds since midnight
};

// The date and time in the short form the log and message boxes use,
// e.g. "11/15/2026 3:07:12 AM".
std::string FormatShortDateTime(const platform::DateTime& t);

}  // namespace kpx
