#include "doctor/log_reader.h"

#include <algorithm>
#include <charconv>

#include "model/stereotype_config.h"
#include "shared/shared_debug_logger.h"

namespace kpx::doctor {

namespace {

constexpr size_t kNameWidth = 8;

// A name of the logger's tables at `at`, or a number followed by `suffix`
// ("9LEVEL"): its value and where its padded field ends.
std::optional<std::pair<int, size_t>> ReadName(std::string_view line, size_t at, int first, int last,
                                               std::string (*name)(int32_t), std::string_view suffix) {
  std::optional<std::pair<int, size_t>> found;
  for (int v = first; v <= last && !found; ++v) {
    const std::string n = name(v);
    if (line.substr(at, n.size()) == n) found = {{v, n.size()}};
  }
  if (!found) {
    int number = 0;
    const char* begin = line.data() + at;
    auto [end, ec] = std::from_chars(begin, line.data() + line.size(), number);
    size_t length = static_cast<size_t>(end - begin);
    if (ec != std::errc() || line.substr(at + length, suffix.size()) != suffix) return std::nullopt;
    // Only as the logger writes it: "9LEVEL", never "09LEVEL" or "3LEVEL"
    // (level 3 is written INFO).
    if (line.substr(at, length + suffix.size()) != name(number)) return std::nullopt;
    found = {{number, length + suffix.size()}};
  }
  const size_t length = found->second;
  const size_t padding = length < kNameWidth ? kNameWidth - length : 0;
  const size_t end = at + length + padding;
  if (end > line.size() || line.substr(at + length, padding).find_first_not_of(' ') != std::string_view::npos)
    return std::nullopt;
  return std::pair<int, size_t>{found->first, end};
}

bool Wanted(const std::vector<int>& wanted, int value) {
  return wanted.empty() || std::find(wanted.begin(), wanted.end(), value) != wanted.end();
}

}  // namespace

std::optional<LogLine> ParseLogLine(std::string_view line) {
  // The stamp is either empty or ends in ") "; the level follows one blank.
  for (size_t blank = line.find(' '); blank != std::string_view::npos; blank = line.find(' ', blank + 1)) {
    if (blank != 0 && line.substr(0, blank).size() < 2) continue;
    if (blank != 0 && line.substr(blank - 2, 2) != ") ") continue;
    auto level = ReadName(line, blank + 1, 0, 6, &DebugLogger::LogLevelName, "LEVEL");
    if (!level || line.substr(level->second, 1) != " ") continue;
    auto id = ReadName(line, level->second + 1, 0, 14, &DebugLogger::LogIdName, "LOGID");
    if (!id || line.substr(id->second, 2) != "  ") continue;
    LogLine out;
    out.stamp = std::string(line.substr(0, blank));
    out.level = level->first;
    out.logId = id->first;
    out.message = std::string(line.substr(id->second + 2));
    return out;
  }
  return std::nullopt;
}

std::vector<std::string> FilterLog(std::string_view text, const LogFilter& filter) {
  std::vector<std::string> out;
  const bool everything = filter.levels.empty() && filter.ids.empty();
  for (std::string_view line : TextLines(text)) {
    if (everything) {
      out.emplace_back(line);
      continue;
    }
    std::optional<LogLine> parsed = ParseLogLine(line);
    if (parsed && Wanted(filter.levels, parsed->level) && Wanted(filter.ids, parsed->logId)) out.emplace_back(line);
  }
  return out;
}

}  // namespace kpx::doctor
