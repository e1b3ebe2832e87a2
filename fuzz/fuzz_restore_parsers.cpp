// The texts Restore Source reads: backup records and list-file lines split
// at "|", list files split into lines, the comparison tool's setting and
// command line, and the layout tags of the Restore dialog. The first byte
// picks the parser, the rest is its input.
#include <cmath>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <string>
#include <string_view>

#include "automation/automation_error.h"
#include "restore/difference_tool.h"
#include "restore/min_window_size.h"
#include "restore/restore_source.h"

namespace {

void Require(bool condition, int line = __builtin_LINE()) {
  if (condition) return;
  std::fprintf(stderr, "%s:%d: check failed\n", __FILE__, line);
  std::abort();
}

bool Blank(char c) { return c == ' '; }
bool Trimmed(std::string_view s) { return s.empty() || (!Blank(s.front()) && !Blank(s.back())); }

void Records(std::string_view text) {
  // The fields put back together with "|" give the record again.
  std::string rest(text), joined;
  size_t fields = 0;
  do {
    const std::string field = kpx::SplitField(rest);
    Require(field.find('|') == std::string::npos);
    joined += (fields++ ? "|" : "") + field;
  } while (!rest.empty());
  Require(joined == text || (text.back() == '|' && joined + "|" == text));
  Require(kpx::FieldOf(text, static_cast<int>(fields) + 1).empty() || text.back() == '|');
}

void Lines(std::string_view text) {
  // No line holds a line break; with every break made LF, the lines joined
  // by LF give the text without a last break.
  std::string normal;
  for (size_t i = 0; i < text.size(); ++i) {
    if (text[i] == '\r') {
      normal += '\n';
      if (i + 1 < text.size() && text[i + 1] == '\n') ++i;
    } else {
      normal += text[i];
    }
  }
  std::string joined;
  const auto lines = kpx::ListFileLines(std::string(text));
  for (size_t i = 0; i < lines.size(); ++i) {
    Require(lines[i].find_first_of("\r\n") == std::string::npos);
    joined += (i ? "\n" : "") + lines[i];
  }
  if (!normal.empty() && normal.back() == '\n') normal.pop_back();
  Require(joined == normal);
}

void Setting(std::string_view text) {
  const kpx::DifferenceSetting s = kpx::ParseDifferenceSetting(text);
  Require(!s.caption.empty());
  Require(Trimmed(s.command) && Trimmed(s.caption));
  Require(text.empty() || s.command.find('|') == std::string::npos);
}

void Shell(std::string_view text) {
  // Paths without placeholders leave none behind.
  const kpx::ShellCommand c = kpx::ParseShellCommand(text, "B", "S");
  Require(c.arguments.find("%1") == std::string::npos && c.arguments.find("%2") == std::string::npos);
  Require(Trimmed(c.arguments));
  // A quoted program may hold blanks but no quote; an unquoted one no blank.
  const std::string work = std::string(text) + " ";
  const size_t rest = work.find_first_not_of(' ', work.find(' '));
  const bool quoted = rest != std::string::npos && work[rest] == '"';
  Require(c.program.find(quoted ? '"' : ' ') == std::string::npos);
}

void Tags(std::string_view text) {
  for (char letter : {'W', 'H', 'R', 'B'}) {
    kpx::LayoutEntry e;
    try {
      e = kpx::ParseLayoutTag(text, letter);
    } catch (const kpx::AutomationError& error) {
      Require(error.number() == kpx::vberr::kOverflow);
      return;
    }
    const bool present = text.find(std::string{letter, '('}) != std::string_view::npos;
    Require(present == (e.count > 0) && e.count <= 2);
    Require(e.count == 2 || e.second == 0);
    Require(!std::isnan(e.first) && !std::isnan(e.second));
  }
  const kpx::MinimumSize m = kpx::MinimumSizeOf(text);  // parses the same entries: cannot raise now
  Require(m.present == (kpx::ParseLayoutTag(text, 'W').count > 0 && kpx::ParseLayoutTag(text, 'H').count > 0));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  if (size == 0) return 0;
  const std::string_view text(reinterpret_cast<const char*>(data) + 1, size - 1);
  switch (data[0] % 5) {
    case 0: if (!text.empty()) Records(text); break;
    case 1: Lines(text); break;
    case 2: Setting(text); break;
    case 3: Shell(text); break;
    default: Tags(text); break;
  }
  return 0;
}
