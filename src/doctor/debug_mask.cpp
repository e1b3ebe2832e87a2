#include "doctor/debug_mask.h"

#include <algorithm>
#include <cctype>
#include <charconv>
#include <cstdio>

#include "automation/vb_strings.h"
#include "shared/shared_debug_logger.h"

namespace kpx::doctor {

namespace {

constexpr int kFirstId = 1, kLastId = 14;
constexpr int kFirstLevel = 0, kLastLevel = 6;
constexpr int kLevelBit = 24;

// Names, or numbers in range, comma-separated; "all" for the whole range.
std::optional<std::vector<int>> ParseNames(std::string_view list, int first, int last,
                                           std::string (*name)(int32_t), const char* what, std::string& error) {
  std::vector<int> out;
  if (EqualsNoCase(Trim(list), "all")) {
    for (int v = first; v <= last; ++v) out.push_back(v);
    return out;
  }
  size_t start = 0;
  while (start <= list.size()) {
    size_t comma = list.find(',', start);
    if (comma == std::string_view::npos) comma = list.size();
    const std::string item = Trim(list.substr(start, comma - start));
    start = comma + 1;
    if (item.empty()) {
      error = std::string("an empty ") + what + " in \"" + std::string(list) + "\"";
      return std::nullopt;
    }
    std::optional<int> found;
    for (int v = first; v <= last && !found; ++v)
      if (EqualsNoCase(item, name(v))) found = v;
    int number = 0;
    auto [end, ec] = std::from_chars(item.data(), item.data() + item.size(), number);
    if (!found && ec == std::errc() && end == item.data() + item.size() && number >= first && number <= last)
      found = number;
    if (!found) {
      std::string known;
      for (int v = first; v <= last; ++v) known += (known.empty() ? "" : ", ") + name(v);
      error = std::string("unknown ") + what + " \"" + item + "\" (known: " + known + ")";
      return std::nullopt;
    }
    out.push_back(*found);
  }
  std::sort(out.begin(), out.end());
  out.erase(std::unique(out.begin(), out.end()), out.end());
  return out;
}

std::string Join(const std::vector<int>& values, std::string (*name)(int32_t)) {
  if (values.empty()) return "none";
  std::string out;
  for (int v : values) out += (out.empty() ? "" : ", ") + name(v);
  return out;
}

}  // namespace

MaskParts DecodeMask(uint32_t mask) {
  MaskParts parts;
  uint32_t meaningful = 0;
  for (int id = kFirstId; id <= kLastId; ++id) {
    meaningful |= 1u << id;
    if (mask & (1u << id)) parts.ids.push_back(id);
  }
  for (int level = kFirstLevel; level <= kLastLevel; ++level) {
    meaningful |= 1u << (kLevelBit + level);
    if (mask & (1u << (kLevelBit + level))) parts.levels.push_back(level);
  }
  parts.unusedBits = mask & ~meaningful;
  return parts;
}

uint32_t EncodeMask(const std::vector<int>& ids, const std::vector<int>& levels) {
  uint32_t mask = 0;
  for (int id : ids)
    if (id >= kFirstId && id <= kLastId) mask |= 1u << id;
  for (int level : levels)
    if (level >= kFirstLevel && level <= kLastLevel) mask |= 1u << (kLevelBit + level);
  return mask;
}

std::optional<std::vector<int>> ParseLogIds(std::string_view list, std::string& error) {
  return ParseNames(list, kFirstId, kLastId, &DebugLogger::LogIdName, "log id", error);
}

std::optional<std::vector<int>> ParseLevels(std::string_view list, std::string& error) {
  return ParseNames(list, kFirstLevel, kLastLevel, &DebugLogger::LogLevelName, "level", error);
}

std::string IdNames(const std::vector<int>& ids) { return Join(ids, &DebugLogger::LogIdName); }
std::string LevelNames(const std::vector<int>& levels) { return Join(levels, &DebugLogger::LogLevelName); }

std::string MaskText(uint32_t mask) {
  char text[32];
  std::snprintf(text, sizeof text, "0x%08X (%u)", mask, mask);
  return text;
}

std::optional<uint32_t> ParseMaskValue(std::string_view text) {
  std::string t = Trim(text);
  int base = 10;
  std::string_view digits = t;
  if (digits.size() > 2 && (digits.substr(0, 2) == "0x" || digits.substr(0, 2) == "0X" ||
                            digits.substr(0, 2) == "&H" || digits.substr(0, 2) == "&h")) {
    digits.remove_prefix(2);
    base = 16;
  }
  if (digits.empty()) return std::nullopt;
  // A negative decimal is the signed reading of the same 32 bits, as the
  // registry editor shows a DWORD with bit 31 set.
  bool negative = base == 10 && digits.front() == '-';
  if (negative) digits.remove_prefix(1);
  uint64_t value = 0;
  auto [end, ec] = std::from_chars(digits.data(), digits.data() + digits.size(), value, base);
  if (ec != std::errc() || end != digits.data() + digits.size()) return std::nullopt;
  if (negative ? value > 0x80000000ull : value > 0xFFFFFFFFull) return std::nullopt;
  return negative ? static_cast<uint32_t>(-static_cast<int64_t>(value)) : static_cast<uint32_t>(value);
}

}  // namespace kpx::doctor
