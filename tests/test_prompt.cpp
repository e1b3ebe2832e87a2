// The prompt dialog's rules: its icon by the message kind, its captions,
// when Help works, and what it keeps of the user's answer.
#include <gtest/gtest.h>

#include "dialogs/kpx_prompt.h"
#include "fakes.h"

namespace kpx {
namespace {

class PromptTest : public ::testing::Test {
 protected:
  test::World world;
  platform::Platform platform = world.platform();
  ResourceStrings resources{platform.objects};
  KpxPrompt prompt{world.ui, resources};
};

TEST_F(PromptTest, TheIconFollowsTheMessageBoxStyleAndOtherKindsShowNone) {
  using platform::PromptIcon;
  EXPECT_EQ(KpxPrompt::IconOf(16), PromptIcon::Critical);
  EXPECT_EQ(KpxPrompt::IconOf(32), PromptIcon::Question);
  EXPECT_EQ(KpxPrompt::IconOf(64), PromptIcon::Information);
  for (int32_t other : {0, 48, 17, 80})
    EXPECT_EQ(KpxPrompt::IconOf(other), PromptIcon::None) << other;

  prompt.Initialize("m", "t", 48, false, 0, "", false);
  ASSERT_EQ(world.ui.prompts.size(), 1u) << "a kind without an icon still shows the dialog";
  EXPECT_EQ(world.ui.prompts[0].icon, PromptIcon::None);
}

TEST_F(PromptTest, CaptionsComeFromTheResourcesAndTheCallersTitleWins) {
  world.texts[5045] = "Own caption";
  world.texts[30013] = "OK";
  world.texts[30003] = "Cancel";
  world.texts[30000] = "Help";
  prompt.Initialize("Relation deleted", "Base Interface Replaced", 64, false, 0, "", true);
  prompt.Initialize("Relation deleted", "", 64, false, 0, "", true);
  ASSERT_EQ(world.ui.prompts.size(), 2u);
  const platform::PromptView& first = world.ui.prompts[0];
  EXPECT_EQ(first.message, "Relation deleted");
  EXPECT_EQ(first.title, "Base Interface Replaced");
  EXPECT_EQ(first.okCaption + "|" + first.cancelCaption + "|" + first.helpCaption, "OK|Cancel|Help");
  EXPECT_FALSE(first.dontShowCaption.empty());
  EXPECT_EQ(world.ui.prompts[1].title, "Own caption");
}

TEST_F(PromptTest, HelpNeedsATopicAndAFileAndOpensThatTopic) {
  world.ui.pressHelp = true;
  prompt.Initialize("m", "t", 64, false, 0, "C:\\vc.hlp", false);
  EXPECT_FALSE(prompt.helpAvailable());
  prompt.Initialize("m", "t", 64, false, 145, "", false);
  EXPECT_FALSE(prompt.helpAvailable());
  EXPECT_TRUE(world.ui.help.empty()) << "Help without a topic or a file opens nothing";
  EXPECT_FALSE(world.ui.prompts.back().helpAvailable);

  prompt.Initialize("m", "t", 64, false, 145, "C:\\vc.hlp", false);
  EXPECT_TRUE(prompt.helpAvailable());
  EXPECT_TRUE(world.ui.prompts.back().helpAvailable);
  EXPECT_EQ(world.ui.help, std::vector<std::string>{"C:\\vc.hlp"});
}

TEST_F(PromptTest, TheAnswerAndTheFlagsAreKeptUntilTheNextShow) {
  world.ui.promptAnswers = {{true, true}, {false, false}};
  prompt.Initialize("m", "t", 16, true, 0, "", false);
  EXPECT_TRUE(prompt.cancelled());
  EXPECT_EQ(prompt.dontShowValue(), 1);
  EXPECT_TRUE(prompt.optionFlag());
  EXPECT_FALSE(prompt.secondOptionFlag());
  prompt.Initialize("m", "t", 16, false, 0, "", true);
  EXPECT_FALSE(prompt.cancelled());
  EXPECT_EQ(prompt.dontShowValue(), 0);
  EXPECT_FALSE(prompt.optionFlag());
  EXPECT_TRUE(prompt.secondOptionFlag());
}

}  // namespace
}  // namespace kpx
