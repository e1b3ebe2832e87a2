// kpxdoctor's parsers: log lines read back, name lists and mask values.
// A parsed log line must be one the logger could have written: rebuilding
// it from its parts gives the line again. A name list that parses encodes
// to a mask that decodes to the same ids and levels.
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <string>
#include <string_view>

#include "doctor/debug_mask.h"
#include "doctor/log_reader.h"
#include "shared/shared_debug_logger.h"

namespace {

void Require(bool condition, int line = __builtin_LINE()) {
  if (condition) return;
  std::fprintf(stderr, "%s:%d: check failed\n", __FILE__, line);
  std::abort();
}

std::string Padded(std::string name) {
  if (name.size() < 8) name.resize(8, ' ');
  return name;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  const std::string_view text(reinterpret_cast<const char*>(data), size);

  if (auto line = kpx::doctor::ParseLogLine(text)) {
    const std::string rebuilt = line->stamp + " " + Padded(kpx::DebugLogger::LogLevelName(line->level)) + " " +
                                Padded(kpx::DebugLogger::LogIdName(line->logId)) + "  " + line->message;
    Require(rebuilt == text);
  }
  kpx::doctor::FilterLog(text, {{1}, {7}});

  std::string error;
  auto ids = kpx::doctor::ParseLogIds(text, error);
  auto levels = kpx::doctor::ParseLevels(text, error);
  if (ids && levels) {
    const kpx::doctor::MaskParts parts = kpx::doctor::DecodeMask(kpx::doctor::EncodeMask(*ids, *levels));
    Require(parts.ids == *ids && parts.levels == *levels && parts.unusedBits == 0);
  }
  if (auto mask = kpx::doctor::ParseMaskValue(text)) {
    char hex[16];
    std::snprintf(hex, sizeof hex, "0x%X", *mask);
    Require(kpx::doctor::ParseMaskValue(hex) == mask);
  }
  return 0;
}
