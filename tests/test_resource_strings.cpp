#include <gtest/gtest.h>

#include "fakes.h"
#include "shared/resource_strings.h"

namespace kpx {
namespace {

TEST(ReplacePlaceholder, ReplacesEveryOccurrenceAndShowsBlanks) {
  EXPECT_EQ(ResourceStrings::ReplacePlaceholder("%2", "", "Copy a to %2"), "Copy a to <blank>");
  EXPECT_EQ(ResourceStrings::ReplacePlaceholder("%1", "x", "%1 and %1"), "x and x");
  EXPECT_EQ(ResourceStrings::ReplacePlaceholder("%1", "x", "%10"), "x0");
  EXPECT_EQ(ResourceStrings::ReplacePlaceholder("%1", "x", "no placeholders"), "no placeholders");
  EXPECT_EQ(ResourceStrings::ReplacePlaceholder("%1", "%2", "%1"), "%2");
}

TEST(ResourceStringsTest, MessagesFillArgumentsInOrder) {
  test::World world;
  world.texts[5028] = "Copy %1 to %2 (%3)";
  ResourceStrings res{world.factory};
  EXPECT_EQ(res.GetResourceString(5028, "a", "", "%1"), "Copy a to <blank> (%1)");
  // The late-bound object is made once and kept.
  res.GetResourceString(5028);
  EXPECT_EQ(std::count(world.factory.created.begin(), world.factory.created.end(), "kpxres.KPXResourceInterface"), 1);
}

TEST(ResourceStringsTest, MessagesFromAMissingComponentAreBlank) {
  test::World world;
  world.factory.makers.clear();
  ResourceStrings res{world.factory};
  EXPECT_EQ(res.GetResourceString(5028, "a"), "");
  EXPECT_THROW(res.InitResourceStrings(), AutomationError);
  EXPECT_THROW(res.LoadResString(5001), AutomationError);
}

TEST(ResourceStringsTest, InitMakesAFreshObjectAndLoadsTheMessagesInOrder) {
  test::World world;
  ResourceStrings res{world.factory};
  ObjectPtr first = res.GetResourceObject();
  EXPECT_EQ(res.GetResourceObject(), first);
  res.InitResourceStrings();
  EXPECT_NE(res.GetResourceObject(), first);
  EXPECT_EQ(world.resourceIds, std::vector<int32_t>(ResourceStrings::kMessageIds.begin(),
                                                    ResourceStrings::kMessageIds.end()));
  EXPECT_EQ(res.MessageString(30013), "T30013");
  EXPECT_EQ(res.MessageString(1), "");
  res.SetResourceObject(nullptr);
  EXPECT_NE(res.GetResourceObject(), nullptr);  // made again on demand
}

}  // namespace
}  // namespace kpx
