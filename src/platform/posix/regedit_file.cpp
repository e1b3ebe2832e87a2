#include "platform/posix/regedit_file.h"

#include <algorithm>
#include <cstddef>
#include <optional>
#include <stdexcept>
#include <string>
#include <vector>

namespace kpx::posix {

namespace {

char Lower(char c) { return (c >= 'A' && c <= 'Z') ? static_cast<char>(c - 'A' + 'a') : c; }

bool EqualNoCase(std::string_view a, std::string_view b) {
  return a.size() == b.size() &&
         std::equal(a.begin(), a.end(), b.begin(), [](char x, char y) { return Lower(x) == Lower(y); });
}

bool IsSpace(char c) { return c == ' ' || c == '\t' || c == '\r' || c == '\n'; }

std::string_view Trim(std::string_view s) {
  while (!s.empty() && IsSpace(s.front())) s.remove_prefix(1);
  while (!s.empty() && IsSpace(s.back())) s.remove_suffix(1);
  return s;
}

int HexDigit(char c) {
  if (c >= '0' && c <= '9') return c - '0';
  if (c >= 'a' && c <= 'f') return c - 'a' + 10;
  if (c >= 'A' && c <= 'F') return c - 'A' + 10;
  return -1;
}

// Parses 1..maxDigits hex digits; nullopt for anything else.
std::optional<uint32_t> ParseHex(std::string_view s, size_t maxDigits) {
  if (s.empty() || s.size() > maxDigits) return std::nullopt;
  uint32_t v = 0;
  for (char c : s) {
    int d = HexDigit(c);
    if (d < 0) return std::nullopt;
    v = (v << 4) | static_cast<uint32_t>(d);
  }
  return v;
}

struct RootName {
  std::string_view shortName;
  std::string_view fullName;
};

// Every root a .reg file may name. Only the first two are reachable through
// the platform interface, but a file exported elsewhere may mention others.
constexpr RootName kRoots[] = {
    {"HKLM", "HKEY_LOCAL_MACHINE"}, {"HKCU", "HKEY_CURRENT_USER"}, {"HKCR", "HKEY_CLASSES_ROOT"},
    {"HKU", "HKEY_USERS"},          {"HKCC", "HKEY_CURRENT_CONFIG"},
};

// The key path with its root spelled in full and upper case; nullopt when
// the root is not one Windows knows.
std::optional<std::string> NormaliseKeyPath(std::string_view path) {
  size_t slash = path.find('\\');
  std::string_view root = path.substr(0, slash);
  for (const RootName& r : kRoots) {
    if (EqualNoCase(root, r.shortName) || EqualNoCase(root, r.fullName)) {
      std::string out(r.fullName);
      if (slash != std::string_view::npos) out += path.substr(slash);
      return out;
    }
  }
  return std::nullopt;
}

[[noreturn]] void Fail(size_t lineNumber, const std::string& what) {
  throw std::runtime_error("line " + std::to_string(lineNumber) + ": " + what);
}

// Reads a quoted string starting at s[0] == '"', undoing the \\ and \"
// escapes. On return `s` holds what follows the closing quote.
std::string ReadQuoted(std::string_view& s, size_t lineNumber) {
  std::string out;
  size_t i = 1;
  for (;; ++i) {
    if (i >= s.size()) Fail(lineNumber, "unterminated string");
    char c = s[i];
    if (c == '"') break;
    if (c == '\\') {
      if (i + 1 >= s.size()) Fail(lineNumber, "unterminated string");
      char next = s[++i];
      if (next != '\\' && next != '"') Fail(lineNumber, std::string("unknown escape \\") + next + " in string");
      out += next;
    } else {
      out += c;
    }
  }
  s.remove_prefix(i + 1);
  return out;
}

// One physical line's share of hex data: "01,02,ff". `continued` says the
// line ended in a backslash (already removed), where a trailing comma is
// how regedit leaves it.
void ReadHexBytes(std::string_view chunk, bool continued, size_t lineNumber, std::string& out) {
  chunk = Trim(chunk);
  if (continued && !chunk.empty() && chunk.back() == ',') chunk.remove_suffix(1);
  if (chunk.empty()) return;
  for (;;) {
    size_t comma = chunk.find(',');
    std::string_view token = Trim(chunk.substr(0, comma));
    if (token.empty()) Fail(lineNumber, "missing byte in hex data");
    std::optional<uint32_t> b = ParseHex(token, 2);
    if (!b) Fail(lineNumber, "bad byte \"" + std::string(token) + "\" in hex data");
    out += static_cast<char>(*b);
    if (comma == std::string_view::npos) break;
    chunk.remove_prefix(comma + 1);
  }
}

std::vector<std::string_view> SplitLines(std::string_view text) {
  std::vector<std::string_view> lines;
  while (!text.empty()) {
    size_t nl = text.find('\n');
    std::string_view line = text.substr(0, nl);
    if (!line.empty() && line.back() == '\r') line.remove_suffix(1);
    lines.push_back(line);
    if (nl == std::string_view::npos) break;
    text.remove_prefix(nl + 1);
  }
  return lines;
}

// Removes the key and every key below it.
void DeleteTree(RegeditData& data, const std::string& key) {
  data.erase(key);
  const std::string prefix = key + "\\";
  auto it = data.lower_bound(prefix);
  while (it != data.end() && it->first.size() >= prefix.size() &&
         EqualNoCase(std::string_view(it->first).substr(0, prefix.size()), prefix)) {
    it = data.erase(it);
  }
}

// ---------------------------------------------------------------- writing

void AppendQuoted(std::string& out, std::string_view s) {
  out += '"';
  for (char c : s) {
    if (c == '\\' || c == '"') out += '\\';
    out += c;
  }
  out += '"';
}

// A REG_SZ goes out as "text" only when it reads back byte for byte: one
// terminating NUL, none inside, and no line breaks to split the line.
bool WritableAsText(const std::string& data) {
  if (data.empty() || data.back() != '\0') return false;
  return std::none_of(data.begin(), data.end() - 1, [](char c) { return c == '\0' || c == '\r' || c == '\n'; });
}

// Lines stay under 80 columns as regedit's do; continued lines start
// with two spaces.
void AppendHex(std::string& out, size_t lineStart, std::string_view bytes) {
  static const char kDigits[] = "0123456789abcdef";
  constexpr size_t kWidth = 76;
  for (size_t i = 0; i < bytes.size(); ++i) {
    if (i > 0) {
      out += ',';
      if (out.size() - lineStart + 3 > kWidth) {
        out += "\\\n";
        lineStart = out.size();
        out += "  ";
      }
    }
    auto b = static_cast<unsigned char>(bytes[i]);
    out += kDigits[b >> 4];
    out += kDigits[b & 0xF];
  }
}

void CheckWritableName(std::string_view name, const char* what) {
  if (name.find_first_of("\r\n") != std::string_view::npos)
    throw std::runtime_error(std::string(what) + " \"" + std::string(name) +
                             "\" holds a line break, which REGEDIT4 cannot express");
}

}  // namespace

std::string RootKeyName(platform::RootKey root) {
  switch (root) {
    case platform::RootKey::LocalMachine:
      return "HKEY_LOCAL_MACHINE";
    case platform::RootKey::CurrentUser:
      return "HKEY_CURRENT_USER";
  }
  return {};
}

RegeditData ParseRegedit(std::string_view text) {
  constexpr std::string_view kBom = "\xEF\xBB\xBF";
  if (text.substr(0, kBom.size()) == kBom) text.remove_prefix(kBom.size());
  const std::vector<std::string_view> lines = SplitLines(text);
  if (lines.empty() || Trim(lines[0]) != "REGEDIT4") Fail(1, "the file does not start with REGEDIT4");

  RegeditData data;
  RegeditValues* current = nullptr;
  for (size_t i = 1; i < lines.size(); ++i) {
    const size_t lineNumber = i + 1;
    std::string_view line = Trim(lines[i]);
    if (line.empty() || line.front() == ';') continue;

    if (line.front() == '[') {
      if (line.back() != ']') Fail(lineNumber, "key section without closing ]");
      std::string_view name = line.substr(1, line.size() - 2);
      const bool deletion = !name.empty() && name.front() == '-';
      if (deletion) name.remove_prefix(1);
      if (name.empty()) Fail(lineNumber, "empty key name");
      std::optional<std::string> key = NormaliseKeyPath(name);
      if (!key) Fail(lineNumber, "unknown root key in \"" + std::string(name) + "\"");
      if (deletion) {
        DeleteTree(data, *key);
        current = nullptr;  // values after a deletion belong to no key
      } else {
        current = &data[*key];
      }
      continue;
    }

    std::string name;
    std::string_view rest = line;
    if (rest.front() == '@') {
      rest.remove_prefix(1);
    } else if (rest.front() == '"') {
      name = ReadQuoted(rest, lineNumber);
    } else {
      Fail(lineNumber, "expected a key section, a value or a comment");
    }
    if (!current) Fail(lineNumber, "value outside a key section");
    rest = Trim(rest);
    if (rest.empty() || rest.front() != '=') Fail(lineNumber, "expected = after the value name");
    rest = Trim(rest.substr(1));

    if (rest == "-") {
      current->erase(name);
      continue;
    }
    platform::RegistryValue value;
    if (!rest.empty() && rest.front() == '"') {
      value.type = platform::kRegSz;
      value.data = ReadQuoted(rest, lineNumber);
      value.data.push_back('\0');
      if (!Trim(rest).empty()) Fail(lineNumber, "text after the closing quote");
    } else if (rest.substr(0, 6) == "dword:") {
      std::optional<uint32_t> v = ParseHex(Trim(rest.substr(6)), 8);
      if (!v) Fail(lineNumber, "dword needs 1 to 8 hex digits");
      value.type = platform::kRegDword;
      for (int b = 0; b < 4; ++b) value.data.push_back(static_cast<char>((*v >> (8 * b)) & 0xFF));
    } else if (rest.substr(0, 3) == "hex") {
      rest.remove_prefix(3);
      value.type = platform::kRegBinary;
      if (!rest.empty() && rest.front() == '(') {
        size_t close = rest.find(')');
        std::optional<uint32_t> type =
            close == std::string_view::npos ? std::nullopt : ParseHex(rest.substr(1, close - 1), 8);
        if (!type) Fail(lineNumber, "bad type code in hex(...)");
        value.type = *type;
        rest.remove_prefix(close + 1);
      }
      if (rest.empty() || rest.front() != ':') Fail(lineNumber, "expected : after hex");
      rest.remove_prefix(1);
      // A trailing backslash carries the data on to the next line.
      for (;;) {
        const bool continued = !rest.empty() && rest.back() == '\\';
        if (continued) rest.remove_suffix(1);
        ReadHexBytes(rest, continued, i + 1, value.data);
        if (!continued) break;
        if (++i >= lines.size()) Fail(i, "hex data continues past the end of the file");
        rest = Trim(lines[i]);
      }
    } else {
      Fail(lineNumber, "unknown value data \"" + std::string(rest) + "\"");
    }
    (*current)[name] = std::move(value);
  }
  return data;
}

std::string WriteRegedit(const RegeditData& data) {
  std::string out = "REGEDIT4\n";
  for (const auto& [key, values] : data) {
    CheckWritableName(key, "key");
    out += "\n[" + key + "]\n";
    for (const auto& [name, value] : values) {
      CheckWritableName(name, "value name");
      const size_t lineStart = out.size();
      if (name.empty()) {
        out += '@';
      } else {
        AppendQuoted(out, name);
      }
      out += '=';
      if (value.type == platform::kRegSz && WritableAsText(value.data)) {
        AppendQuoted(out, std::string_view(value.data).substr(0, value.data.size() - 1));
      } else if (value.type == platform::kRegDword && value.data.size() == 4) {
        uint32_t v = 0;
        for (int b = 3; b >= 0; --b) v = (v << 8) | static_cast<unsigned char>(value.data[b]);
        static const char kDigits[] = "0123456789abcdef";
        out += "dword:";
        for (int shift = 28; shift >= 0; shift -= 4) out += kDigits[(v >> shift) & 0xF];
      } else {
        if (value.type == platform::kRegBinary) {
          out += "hex:";
        } else {
          static const char kDigits[] = "0123456789abcdef";
          std::string code;
          uint32_t t = value.type;
          do {
            code.insert(code.begin(), kDigits[t & 0xF]);
            t >>= 4;
          } while (t != 0);
          out += "hex(" + code + "):";
        }
        AppendHex(out, lineStart, value.data);
      }
      out += '\n';
    }
  }
  return out;
}

}  // namespace kpx::posix
