// The debug mask as a modeller thinks of it: which log ids and which levels
// are on. A line reaches the log only when both its id's bit and its level's
// bit are set.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace kpx::doctor {

struct MaskParts {
  std::vector<int> ids;     // 1..14, ascending
  std::vector<int> levels;  // 0..6, ascending
  uint32_t unusedBits = 0;  // set bits that mean nothing (0, 15-23, 31)
};

MaskParts DecodeMask(uint32_t mask);
uint32_t EncodeMask(const std::vector<int>& ids, const std::vector<int>& levels);

// "ADDIN,IDE" or "all" (ids 1 to 14); names in any case, or numbers.
// Nothing, with `error` saying which name is unknown, for a bad list.
std::optional<std::vector<int>> ParseLogIds(std::string_view list, std::string& error);
// "ERROR,TRACE" or "all" (levels 0 to 6).
std::optional<std::vector<int>> ParseLevels(std::string_view list, std::string& error);

// "ADDIN, IDE" / "ERROR, TRACE": the names joined, "none" for an empty list.
std::string IdNames(const std::vector<int>& ids);
std::string LevelNames(const std::vector<int>& levels);

// "0x02000080 (33554560)": the hexadecimal a modeller types into the
// registry editor, and the decimal it shows.
std::string MaskText(uint32_t mask);

// A mask as the registry may hold it: a number in decimal, or hexadecimal
// after "0x" or "&H". Nothing when it is not one.
std::optional<uint32_t> ParseMaskValue(std::string_view text);

}  // namespace kpx::doctor
