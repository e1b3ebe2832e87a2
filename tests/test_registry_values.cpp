#include <gtest/gtest.h>

#include "fakes.h"
#include "shared/shared_addinmanager.h"
#include "shared/shared_registryapi2.h"

namespace kpx {
namespace {

constexpr std::string_view kKey = "SOFTWARE\\Tolvek Software\\Quarn\\AddIns\\VisualStudio";

class RegistryValues : public ::testing::Test {
 protected:
  void Raw(std::string_view name, uint32_t type, std::string bytes) {
    registry.CreateKey(RootKey::LocalMachine, kKey);
    registry.SetValue(RootKey::LocalMachine, kKey, name, {type, std::move(bytes)});
  }
  Variant Read(std::string_view name) { return RegistryQueryValue(registry, RootKey::LocalMachine, kKey, name); }

  posix::FileRegistry registry;
};

TEST_F(RegistryValues, ReadsStringsDwordsAndNothingElse) {
  Raw("Text", platform::kRegSz, std::string("abc\0", 4));
  Raw("EmptyText", platform::kRegSz, std::string("\0", 1));
  Raw("NoNul", platform::kRegSz, "");
  Raw("Mask", platform::kRegDword, std::string("\x80\x00\x00\xff", 4));
  Raw("Blob", platform::kRegBinary, "\x01\x02");

  EXPECT_EQ(Read("Text"), Variant("abc"));
  EXPECT_EQ(Read("EmptyText"), Variant(""));  // an empty string, not Empty
  EXPECT_EQ(Read("NoNul"), Variant(""));
  EXPECT_EQ(Read("Mask"), Variant(static_cast<int32_t>(0xff000080u)));
  EXPECT_TRUE(Read("Blob").isEmpty());
  EXPECT_TRUE(Read("Missing").isEmpty());
  EXPECT_TRUE(RegistryQueryValue(registry, RootKey::LocalMachine, "SOFTWARE\\Nowhere", "Text").isEmpty());
}

TEST_F(RegistryValues, WritesTextWithItsNulAndNumbersAsFourBytes) {
  registry.CreateKey(RootKey::LocalMachine, kKey);
  RegistrySetValue(registry, RootKey::LocalMachine, kKey, "S", Variant("abc"), platform::kRegSz);
  RegistrySetValue(registry, RootKey::LocalMachine, kKey, "N", Variant("-2"), platform::kRegDword);
  RegistrySetValue(registry, RootKey::LocalMachine, kKey, "Bad", Variant("x"), platform::kRegDword);
  RegistrySetValue(registry, RootKey::LocalMachine, kKey, "Bin", Variant("x"), platform::kRegBinary);

  auto s = registry.QueryValue(RootKey::LocalMachine, kKey, "S");
  ASSERT_TRUE(s);
  EXPECT_EQ(s->type, platform::kRegSz);
  EXPECT_EQ(s->data, std::string("abc\0", 4));
  auto n = registry.QueryValue(RootKey::LocalMachine, kKey, "N");
  ASSERT_TRUE(n);
  EXPECT_EQ(n->data, std::string("\xfe\xff\xff\xff", 4));
  EXPECT_FALSE(registry.QueryValue(RootKey::LocalMachine, kKey, "Bad"));
  EXPECT_FALSE(registry.QueryValue(RootKey::LocalMachine, kKey, "Bin"));
}

TEST_F(RegistryValues, WritingUnderAMissingKeyDoesNotCreateIt) {
  RegistrySetValue(registry, RootKey::CurrentUser, "Software\\Missing", "V", Variant("1"), platform::kRegSz);
  EXPECT_FALSE(registry.QueryValue(RootKey::CurrentUser, "Software\\Missing", "V"));
  EXPECT_EQ(registry.CreateKey(RootKey::CurrentUser, "Software\\Missing"), platform::KeyDisposition::Created);
}

TEST_F(RegistryValues, AnAddInIsOffOnlyWhenActiveIsExactlyNo) {
  const std::string key = "SOFTWARE\\Tolvek Software\\Quarn\\AddIns\\Sibling";
  EXPECT_TRUE(IsAddInActive(registry, nullptr, "Sibling"));  // no key at all
  registry.CreateKey(RootKey::CurrentUser, key);
  for (const char* value : {"Yes", "no", "NO", "No ", ""}) {
    RegistrySetValue(registry, RootKey::CurrentUser, key, "Active", Variant(value), platform::kRegSz);
    EXPECT_TRUE(IsAddInActive(registry, nullptr, "Sibling")) << value;
  }
  RegistrySetValue(registry, RootKey::CurrentUser, key, "Active", Variant("No"), platform::kRegSz);
  EXPECT_FALSE(IsAddInActive(registry, nullptr, "Sibling"));
  // The value is read from the current user's hive, not the machine's.
  EXPECT_TRUE(IsAddInActive(registry, nullptr, "Other"));
}

}  // namespace
}  // namespace kpx
