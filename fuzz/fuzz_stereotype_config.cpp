// The stereotype file's reader: lines end at LF (a CR before it dropped),
// "Item=" lines start sections, "Stereotype=" lines of the wanted section
// give one trimmed stereotype each; every other line is skipped.
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <string>
#include <string_view>
#include <vector>

#include "model/stereotype_config.h"

namespace {

// Names the failed check before stopping, so a finding reads at once.
void Require(bool condition, int line = __builtin_LINE()) {
  if (condition) return;
  std::fprintf(stderr, "%s:%d: check failed\n", __FILE__, line);
  std::abort();
}

bool StartsWith(std::string_view s, std::string_view prefix) { return s.substr(0, prefix.size()) == prefix; }

std::string ReplaceAll(std::string_view text, std::string_view from, std::string_view to) {
  std::string out;
  for (size_t at = 0;;) {
    const size_t next = text.find(from, at);
    out.append(text.substr(at, next - at));
    if (next == std::string_view::npos) return out;
    out.append(to);
    at = next + from.size();
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  const std::string_view text(reinterpret_cast<const char*>(data), size);

  // The lines put back together give the text, CR LF read as LF and the
  // last line end left out.
  const std::vector<std::string_view> lines = kpx::TextLines(text);
  std::string joined;
  size_t stereotypeLines = 0;
  std::string relevant;  // the text without the lines that do not matter
  for (size_t i = 0; i < lines.size(); ++i) {
    Require(lines[i].find('\n') == std::string_view::npos);
    joined += (i ? "\n" : "") + std::string(lines[i]);
    if (StartsWith(lines[i], "Stereotype=")) ++stereotypeLines;
    if (StartsWith(lines[i], "Item=") || StartsWith(lines[i], "Stereotype="))
      relevant += std::string(lines[i]) + "\r\n";
  }
  std::string expected = ReplaceAll(text, "\r\n", "\n");
  if (!expected.empty() && expected.back() == '\n') expected.pop_back();
  Require(joined == expected);

  const std::vector<std::string> classes = kpx::SectionStereotypes(text, kpx::kClassSection);
  const std::vector<std::string> components = kpx::SectionStereotypes(text, kpx::kComponentSection);
  // Each stereotype line counts for one section at most.
  Require(classes.size() + components.size() <= stereotypeLines);
  for (const std::vector<std::string>* list : {&classes, &components})
    for (const std::string& s : *list) {
      Require(s.find('\n') == std::string::npos);
      Require(s.empty() || (s.front() != ' ' && s.back() != ' '));
    }
  // Skipped lines change nothing.
  Require(kpx::SectionStereotypes(relevant, kpx::kClassSection) == classes);
  Require(kpx::SectionStereotypes(relevant, kpx::kComponentSection) == components);
  // A class section added at the end adds its stereotype last.
  const std::vector<std::string> more =
      kpx::SectionStereotypes(std::string(text) + "\nItem=Class\nStereotype= last one \n", kpx::kClassSection);
  Require(!more.empty() && more.back() == "last one");
  return 0;
}
