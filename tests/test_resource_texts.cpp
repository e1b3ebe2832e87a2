#include "shared/resource_texts.h"

#include <gtest/gtest.h>

#include <cctype>
#include <climits>
#include <cstdint>
#include <map>
#include <set>
#include <string>
#include <string_view>

namespace kpx {
namespace {

std::string TextOf(int32_t id) {
  const char* text = FindResourceText(id);
  return text ? text : std::string();
}

// Placeholder numbers in a text, each "%" followed by a digit.
std::set<int> PlaceholdersIn(std::string_view text) {
  std::set<int> found;
  for (size_t i = 0; i + 1 < text.size(); ++i)
    if (text[i] == '%' && text[i + 1] >= '0' && text[i + 1] <= '9') found.insert(text[i + 1] - '0');
  return found;
}

std::string ReplaceAll(std::string text, std::string_view from, std::string_view to) {
  for (size_t at = text.find(from); at != std::string::npos; at = text.find(from, at + to.size()))
    text.replace(at, from.size(), to);
  return text;
}

TEST(ResourceTexts, IdsAreStrictlyAscendingAndUnique) {
  auto texts = ResourceTexts();
  ASSERT_FALSE(texts.empty());
  for (size_t i = 1; i < texts.size(); ++i)
    EXPECT_LT(texts[i - 1].id, texts[i].id) << "at position " << i;
}

TEST(ResourceTexts, EveryTextIsNonEmptyPrintableAscii) {
  for (const auto& entry : ResourceTexts()) {
    ASSERT_NE(entry.text, nullptr) << entry.id;
    std::string_view text = entry.text;
    EXPECT_FALSE(text.empty()) << entry.id;
    for (char c : text) EXPECT_TRUE(c >= 0x20 && c <= 0x7E) << entry.id << " holds character " << int(c);
  }
}

TEST(ResourceTexts, EveryIdTheAddInAsksForIsPresent) {
  std::set<int32_t> wanted = {1132, 1176, 1218, 1219, 5080, 5081};
  for (int32_t id = 5001; id <= 5060; ++id) wanted.insert(id);
  for (int32_t id = 30000; id <= 30013; ++id) wanted.insert(id);
  for (int32_t id : wanted) EXPECT_NE(FindResourceText(id), nullptr) << id;
}

TEST(ResourceTexts, FindReturnsTheTableEntryForEveryId) {
  for (const auto& entry : ResourceTexts()) EXPECT_EQ(FindResourceText(entry.id), entry.text) << entry.id;
}

TEST(ResourceTexts, FindReturnsNullForIdsWithoutText) {
  for (int32_t id : {INT32_MIN, -1, 0, 1131, 1133, 5000, 5061, 29999, 30014, INT32_MAX})
    EXPECT_EQ(FindResourceText(id), nullptr) << id;
}

TEST(ResourceTexts, PlaceholdersAreNumberedFromOneWithoutGaps) {
  for (const auto& entry : ResourceTexts()) {
    std::string_view text = entry.text;
    std::set<int> found = PlaceholdersIn(text);
    int expected = 1;
    for (int n : found) EXPECT_EQ(n, expected++) << entry.id << ": " << text;
    EXPECT_LE(found.size(), 6u) << entry.id;
    // "%1" followed by a digit would be replaced inside "%10" and the like.
    for (size_t i = 0; i + 2 < text.size(); ++i)
      if (text[i] == '%' && isdigit(static_cast<unsigned char>(text[i + 1]))) {
        EXPECT_FALSE(isdigit(static_cast<unsigned char>(text[i + 2]))) << entry.id << ": " << text;
      }
  }
}

TEST(ResourceTexts, PlaceholdersMatchTheArgumentsCallersPass) {
  // Every other text is shown as it is or with empty arguments, where a
  // placeholder would show up as "<blank>" or stay literally in the text.
  const std::map<int32_t, size_t> arguments = {
      {1132, 2},  // old and new base name
      {1176, 1},  // old base name
      {5033, 2},  // restore prefix and source path
      {5046, 1},  // deleted relation's text
  };
  for (const auto& entry : ResourceTexts()) {
    auto it = arguments.find(entry.id);
    size_t expected = it == arguments.end() ? 0 : it->second;
    EXPECT_EQ(PlaceholdersIn(entry.text).size(), expected) << entry.id << ": " << entry.text;
  }
}

TEST(ResourceTexts, MenuCaptionsAreSingleLinePlainCaptions) {
  for (int32_t id : {5001, 5002, 5003, 5004, 5005, 5006, 5007, 5008, 5009, 5038, 5039, 5040, 5041, 5042, 5043,
                     5044, 5051, 5052, 5053, 5054}) {
    std::string text = TextOf(id);
    EXPECT_LE(text.size(), 40u) << id;
    // The host reads these words in a caption as menu structure.
    EXPECT_NE(text.rfind("Submenu", 0), 0u) << id;
    EXPECT_NE(text, "Separator") << id;
    EXPECT_NE(text, "endsubmenu") << id;
  }
}

TEST(ResourceTexts, LogFragmentsJoinWithBlanks) {
  // Prefixes are followed directly by a path or a further text.
  for (int32_t id : {1176, 5012, 5013}) {
    std::string text = TextOf(id);
    ASSERT_FALSE(text.empty()) << id;
    EXPECT_EQ(text.back(), ' ') << id;
  }
  // Suffixes follow a path or a date directly.
  for (int32_t id : {5014, 5015, 5020}) {
    std::string text = TextOf(id);
    ASSERT_FALSE(text.empty()) << id;
    EXPECT_EQ(text.front(), ' ') << id;
  }
}

TEST(ResourceTexts, ReadOnlyMessageStartsWithPrefixAndPath) {
  std::string message = ReplaceAll(ReplaceAll(TextOf(5033), "%1", TextOf(5013)), "%2", "C:\\Work\\App\\App.cpp");
  EXPECT_EQ(message.rfind(TextOf(5013) + "C:\\Work\\App\\App.cpp", 0), 0u) << message;
}

TEST(ResourceTexts, BackupFolderMakesAValidListPath) {
  // A project's list file lies at the project folder (with its trailing
  // backslash) + the backup folder text + "\" + project + ".lst".
  std::string path = "C:\\Work\\App\\" + TextOf(5029) + "\\App.lst";
  EXPECT_EQ(path.rfind("C:\\Work\\App\\", 0), 0u) << path;
  EXPECT_EQ(path.find("\\\\"), std::string::npos) << path;
  std::string folder = TextOf(5029);
  EXPECT_FALSE(folder.empty());
  EXPECT_EQ(folder.find_first_of("\\/:*?\"<>|"), std::string::npos) << folder;
}

TEST(ResourceTexts, SettingsSectionNameCanHoldRecords) {
  std::string section = TextOf(5028);
  EXPECT_FALSE(section.empty());
  EXPECT_EQ(section.find_first_of("[]=|\\"), std::string::npos) << section;
}

TEST(ResourceTexts, SharedButtonCaptions) {
  // The restore and prompt dialogs caption OK, Cancel and Help from these.
  EXPECT_EQ(TextOf(30013), "OK");
  EXPECT_EQ(TextOf(30003), "Cancel");
  EXPECT_EQ(TextOf(30000), "Help");
}

}  // namespace
}  // namespace kpx
