#include <gtest/gtest.h>

#include "fakes.h"
#include "shared/shared_debug_logger.h"
#include "shared/shared_registryapi2.h"

namespace kpx {
namespace {

constexpr int32_t kLevelBits = 0x7F000000;  // levels 0..6
constexpr int32_t kAddinBit = 1 << logid::ADDIN;

class DebugLoggerTest : public ::testing::Test {
 protected:
  void Set(std::string_view name, const Variant& v, uint32_t type) {
    world.registry.CreateKey(RootKey::LocalMachine, kDebugSettingsKey);
    RegistrySetValue(world.registry, RootKey::LocalMachine, kDebugSettingsKey, name, v, type);
  }
  void Mask(int32_t mask) { Set("Debug", Variant(mask), platform::kRegDword); }
  std::string Log() { return world.files.at("C:\\tzndebuglog.txt"); }

  test::World world;
  platform::Platform platform = world.platform();
  DebugLogger logger{platform};
};

TEST_F(DebugLoggerTest, WritesOnlyWhenBothTheIdAndTheLevelBitAreSet) {
  Mask(kAddinBit | (1 << (24 + loglevel::ERROR)));
  EXPECT_TRUE(logger.DebugLog("kept", logid::ADDIN, loglevel::ERROR));
  EXPECT_FALSE(logger.DebugLog("wrong level", logid::ADDIN, loglevel::TRACE));
  EXPECT_FALSE(logger.DebugLog("wrong id", logid::KPXADDIN, loglevel::ERROR));
  EXPECT_EQ(world.files.appendAttempts, 1);
}

TEST_F(DebugLoggerTest, IdZeroAndOutOfRangeIdsAreNeverWrittenAndOddLevelsFilterAsDebug) {
  Mask(-1);  // every bit
  EXPECT_FALSE(logger.DebugLog("unknown", logid::UNKNOWN, loglevel::TRACE));
  EXPECT_FALSE(logger.DebugLog("id 20", 20, loglevel::TRACE));
  EXPECT_TRUE(logger.DebugLog("level 9", logid::ADDIN, 9));
  EXPECT_NE(Log().find(" 9LEVEL   ADDIN     level 9\r\n"), std::string::npos) << Log();

  DebugLogger fresh{platform};
  Mask(kAddinBit | (1 << (24 + loglevel::TRACE)));
  EXPECT_FALSE(fresh.DebugLog("level 9 without the DEBUG bit", logid::ADDIN, 9));
  EXPECT_FALSE(fresh.DebugLog("negative level", logid::ADDIN, -1));
}

TEST_F(DebugLoggerTest, LineHasStampPaddedNamesAndCrLf) {
  Mask(-1);
  logger.DebugLog("kpxAddin.OnActivate(QuarnApp)", logid::ADDIN, loglevel::TRACE);
  logger.DebugLog("eight", 8, loglevel::CRITICAL);
  logger.DebugLog("big id name", 14, loglevel::WARNING);
  EXPECT_EQ(Log(),
            "11/15/2026 3:07:12 AM (11232.5)  TRACE    ADDIN     kpxAddin.OnActivate(QuarnApp)\r\n"
            "11/15/2026 3:07:12 AM (11232.5)  CRITICAL APPSTART  eight\r\n"
            "11/15/2026 3:07:12 AM (11232.5)  WARNING  KPXADDIN  big id name\r\n");
}

TEST_F(DebugLoggerTest, SuppressedStampsAnyCaseStartTheLineWithOneBlank) {
  Mask(-1);
  Set("SuppressTimeStamps", Variant("TRUE"), platform::kRegSz);
  logger.DebugLog("m", logid::ADDIN, loglevel::INFO);
  EXPECT_EQ(Log(), " INFO     ADDIN     m\r\n");
}

TEST_F(DebugLoggerTest, AFileThatCannotBeWrittenCostsFiveAttemptsAndFiveWaits) {
  Mask(-1);
  world.clock.step = 0.1f;
  world.files.failing.insert("c:\\tzndebuglog.txt");
  EXPECT_TRUE(logger.DebugLog("lost", logid::ADDIN, loglevel::TRACE));
  EXPECT_EQ(world.files.appendAttempts, 5);
  EXPECT_EQ(world.clock.sleeps, (std::vector<uint32_t>{100, 100, 100, 100, 100}));
  EXPECT_EQ(world.clock.seconds, 11232.5f) << "an attempt that cannot open the file reads no clock";
}

TEST_F(DebugLoggerTest, TheStampIsTheTimeOfTheOpenThatSucceeded) {
  Mask(-1);
  world.clock.step = 0.1f;
  world.files.failNext = 2;
  EXPECT_TRUE(logger.DebugLog("late", logid::ADDIN, loglevel::TRACE));
  EXPECT_EQ(world.clock.sleeps, (std::vector<uint32_t>{100, 100}));
  EXPECT_EQ(Log(), "11/15/2026 3:07:12 AM (11232.5)  TRACE    ADDIN     late\r\n");
}

TEST_F(DebugLoggerTest, PathComesFromOutputFileThenInstallDirThenDefault) {
  Mask(-1);
  Set("InstallDir", Variant("D:\\Quarn"), platform::kRegSz);
  EXPECT_EQ(logger.DebugOutputPath(), "D:\\Quarn");  // taken as it stands, a folder name

  Set("DebugOutputFile", Variant("E:\\logs\\kpx.txt"), platform::kRegSz);
  EXPECT_EQ(logger.DebugOutputPath(), "D:\\Quarn");  // read once per process
  DebugLogger second{platform};
  EXPECT_EQ(second.DebugOutputPath(), "E:\\logs\\kpx.txt");

  test::World bare;
  platform::Platform barePlatform = bare.platform();
  DebugLogger third{barePlatform};
  EXPECT_EQ(third.DebugOutputPath(), "C:\\tzndebuglog.txt");
  EXPECT_EQ(third.DebugMask(), 0);
  EXPECT_FALSE(third.DebugLog("nothing", logid::ADDIN, loglevel::CRITICAL));
}

TEST_F(DebugLoggerTest, MaskStoredAsTextConvertsWhenItHoldsANumber) {
  Set("Debug", Variant("2130706560"), platform::kRegSz);
  EXPECT_EQ(logger.DebugMask(), 0x7F000080);
  DebugLogger second{platform};
  Set("Debug", Variant("lots"), platform::kRegSz);
  EXPECT_EQ(second.DebugMask(), 0);
}

TEST(DebugLoggerNames, UnknownIdsAndLevelsAreSpelledOut) {
  EXPECT_EQ(DebugLogger::LogIdName(20), "20LOGID");
  EXPECT_EQ(DebugLogger::LogIdName(-1), "-1LOGID");
  EXPECT_EQ(DebugLogger::LogLevelName(7), "7LEVEL");
  EXPECT_EQ(DebugLogger::LogIdName(12), "IDE");
  EXPECT_EQ(FormatShortDateTime({2026, 1, 2, 0, 5, 9}), "1/2/2026 12:05:09 AM");
  EXPECT_EQ(FormatShortDateTime({2026, 1, 2, 12, 0, 0}), "1/2/2026 12:00:00 PM");
  EXPECT_EQ(FormatShortDateTime({2026, 1, 2, 23, 59, 59}), "1/2/2026 11:59:59 PM");
}

}  // namespace
}  // namespace kpx
