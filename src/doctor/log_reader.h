// Reading the debug log back: each line's level and log id, so that a
// modeller can ask for the errors only, or the add-in's lines only.
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace kpx::doctor {

struct LogLine {
  std::string stamp;  // "" when time stamps are suppressed
  int level = 0;      // as written: "9LEVEL" reads as 9
  int logId = 0;      // as written: "20LOGID" reads as 20
  std::string message;
};

// One line as the logger writes it: stamp, blank, level name padded to 8,
// blank, log id name padded to 8, two blanks, message. Nothing for a line
// of another form (a line some other program appended, say).
std::optional<LogLine> ParseLogLine(std::string_view line);

struct LogFilter {
  std::vector<int> levels;  // empty: every level
  std::vector<int> ids;     // empty: every log id
};

// The lines of `text` (CR LF or LF) that pass the filter, as they stand.
// Lines of another form pass only an empty filter.
std::vector<std::string> FilterLog(std::string_view text, const LogFilter& filter);

}  // namespace kpx::doctor
