#include "shared/shared_debug_logger.h"

#include <cstdio>

#include "automation/error_styles.h"
#include "automation/vb_strings.h"
#include "shared/shared_registryapi2.h"

namespace kpx {

namespace {

constexpr int kWriteAttempts = 5;
constexpr uint32_t kRetryWaitMs = 100;

std::string PadRight8(std::string s) {
  if (s.size() < 8) s.append(8 - s.size(), ' ');
  return s;
}

}  // namespace

std::string FormatShortDateTime(const platform::DateTime& t) {
  int hour12 = t.hour % 12 == 0 ? 12 : t.hour % 12;
  char buf[64];
  std::snprintf(buf, sizeof buf, "%d/%d/%d %d:%02d:%02d %s", t.month, t.day, t.year, hour12, t.minute,
                t.second, t.hour < 12 ? "AM" : "PM");
  return buf;
}

void DebugLogger::LoadDebugSettings() {
  loaded_ = true;
  platform::Registry& reg = platform_.registry;
  ResumeNext onError;
  onError([&] {
    Variant debug = RegistryQueryValue(reg, RootKey::LocalMachine, kDebugSettingsKey, "Debug");
    mask_ = debug.toInt32();  // text holding a number converts; other text leaves 0
  });
  onError([&] {
    std::string path = RegistryQueryValue(reg, RootKey::LocalMachine, kDebugSettingsKey, "DebugOutputFile").toString();
    // "InstallDir" is taken as it stands: a folder name then makes every write fail.
    if (path.empty())
      path = RegistryQueryValue(reg, RootKey::LocalMachine, kDebugSettingsKey, "InstallDir").toString();
    if (path.empty()) path = kDefaultDebugLogPath;
    path_ = path;
  });
  onError([&] {
    suppressStamps_ =
        LCase(RegistryQueryValue(reg, RootKey::LocalMachine, kDebugSettingsKey, "SuppressTimeStamps").toString());
  });
  // The last "\" found from the second character on.
  size_t slash = path_.size() > 1 ? path_.rfind('\\') : std::string::npos;
  directory_ = (slash == std::string::npos || slash == 0) ? std::string() : path_.substr(0, slash);
}

int32_t DebugLogger::DebugMask() {
  if (!loaded_) LoadDebugSettings();
  return mask_;
}

const std::string& DebugLogger::DebugOutputPath() {
  if (!loaded_) LoadDebugSettings();
  return path_;
}

std::string DebugLogger::LogIdName(int32_t logId) {
  static constexpr const char* kNames[] = {"UNKNOWN", "CAT", "CUT", "MERGE", "MAT",  "MUT",  "IM",      "ADDIN",
                                           "APPSTART", "MCHECK", "SGEN", "CODEVIEW", "IDE", "RES", "KPXADDIN"};
  if (logId >= 0 && logId <= 14) return kNames[logId];
  return std::to_string(logId) + "LOGID";
}

std::string DebugLogger::LogLevelName(int32_t level) {
  static constexpr const char* kNames[] = {"CRITICAL", "ERROR", "WARNING", "INFO", "TRACE", "TIMING", "DEBUG"};
  if (level >= 0 && level <= 6) return kNames[level];
  return std::to_string(level) + "LEVEL";
}

std::string DebugLogger::TimeStamp() {
  if (suppressStamps_ == "true") return {};
  std::string stamp = FormatShortDateTime(platform_.clock.Now());
  stamp += " (";
  stamp += FormatSingle(platform_.clock.Timer() - startTime_);
  stamp += ") ";
  return stamp;
}

bool DebugLogger::WriteLine(std::string_view message, int32_t logId, int32_t level) {
  if (path_.empty()) {  // cannot happen after loading; kept as a guard
    std::string text = FormatShortDateTime(platform_.clock.Now()) + " " + std::string(message);
    platform_.ui.MessageBox(text, "", platform::kMbOk);
    return true;
  }
  const std::string idName = PadRight8(LogIdName(logId));
  const std::string levelName = PadRight8(LogLevelName(level));
  // The stamp is taken once the file is open: an attempt that cannot open
  // it never reads the clock.
  const auto compose = [&] {
    std::string line = TimeStamp();
    line += ' ';
    line += levelName;
    line += ' ';
    line += idName;
    line += "  ";
    line += message;
    line += "\r\n";
    return line;
  };
  for (int attempt = 0; attempt < kWriteAttempts; ++attempt) {
    if (platform_.files.AppendComposed(path_, compose)) return true;
    platform_.clock.Sleep(kRetryWaitMs);
  }
  return true;
}

}  // namespace kpx
