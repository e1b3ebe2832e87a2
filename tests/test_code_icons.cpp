#include <gtest/gtest.h>

#include <cstring>
#include <fstream>
#include <regex>
#include <set>
#include <sstream>

#include "addin/api.h"
#include "automation/collection.h"
#include "automation/enumerator.h"
#include "dialogs/code_icons.h"
#include "fakes.h"
#include "shared/shared_registryapi2.h"

namespace kpx {
namespace {

using test::ErrorNumberOf;

std::shared_ptr<Collection> AsCollection(const ObjectPtr& o) {
  auto c = std::dynamic_pointer_cast<Collection>(o);
  EXPECT_NE(c, nullptr);
  return c;
}

// The keys in collection order, as the collection stores them.
std::vector<std::string> KeysOf(const Collection& c) {
  std::vector<std::string> keys;
  for (size_t i = 0; i < c.size(); ++i) keys.push_back(c.KeyAt(i).value_or("(none)"));
  return keys;
}

// ------------------------------------------------------------ the holder

TEST(CodeIconsHolder, HandsOutEveryProductIconUnderItsKeyInListOrderAtItsSize) {
  test::FakeUi ui;
  CodeIconsHolder holder(ui);
  auto small = AsCollection(holder.GetCodeIcons());
  ASSERT_TRUE(small);
  const std::vector<std::string> keys = {"Class",     "Interface", "CoClass", "ATLObject",
                                         "Component", "Operation", "Attribute"};
  EXPECT_EQ(KeysOf(*small), keys);
  EXPECT_EQ(ui.iconLoads, (std::vector<std::pair<int32_t, int32_t>>{
                              {101, 16}, {102, 16}, {103, 16}, {104, 16}, {105, 16}, {106, 16}, {107, 16}}));
  // Found by key, each the picture of its own resource.
  EXPECT_EQ(small->ByKey("ATLObject").toObject(), ui.pictures.at(104));
  EXPECT_EQ(small->At(1).toObject(), ui.pictures.at(101));

  ui.iconLoads.clear();
  auto large = AsCollection(holder.GetLargeCodeIcons());
  ASSERT_TRUE(large);
  EXPECT_EQ(KeysOf(*large), keys);
  EXPECT_EQ(ui.iconLoads.front(), (std::pair<int32_t, int32_t>{201, 32}));
  EXPECT_EQ(large->ByKey("Attribute").toObject(), ui.pictures.at(207));

  // Each request is a collection of its own: what the host does to one
  // leaves the next untouched.
  small->Clear();
  auto again = AsCollection(holder.GetCodeIcons());
  EXPECT_NE(again, small);
  EXPECT_EQ(again->size(), keys.size());
}

TEST(CodeIconsHolder, LeavesOutAnImageWhosePictureFailsOrWhoseKeyIsTaken) {
  test::FakeUi ui;
  ui.missingIcons = {2, 5};
  // Keys compare without regard to case, so "class" takes the place of
  // "Class"; the later image is the one left out.
  CodeIconsHolder holder(ui, {{"Class", 1}, {"Interface", 2}, {"class", 3}, {"CoClass", 4}, {"Operation", 5}, {"Last", 6}},
                         {});
  auto icons = AsCollection(holder.GetCodeIcons());
  ASSERT_TRUE(icons);
  EXPECT_EQ(KeysOf(*icons), (std::vector<std::string>{"Class", "CoClass", "Last"}));
  EXPECT_EQ(icons->ByKey("class").toObject(), ui.pictures.at(1));
  EXPECT_EQ(ErrorNumberOf([&] { icons->ByKey("Interface"); }), vberr::kInvalidCall);
  // Every image was tried, the failing ones too.
  EXPECT_EQ(ui.iconLoads.size(), 6u);
}

TEST(CodeIconsHolder, AnswersAnEmptyCollectionNotNothingWhenNoImageMakesIt) {
  test::FakeUi ui;
  CodeIconsHolder empty(ui, {}, {});
  auto none = AsCollection(empty.GetLargeCodeIcons());
  ASSERT_TRUE(none);
  EXPECT_EQ(none->size(), 0u);

  ui.missingIcons = {1, 2};
  CodeIconsHolder failing(ui, {{"Class", 1}, {"Interface", 2}}, {});
  auto nothingLoaded = AsCollection(failing.GetCodeIcons());
  ASSERT_TRUE(nothingLoaded);
  EXPECT_EQ(nothingLoaded->size(), 0u);
}

TEST(CodeIconsHolder, PassesKeysThroughUnchanged) {
  test::FakeUi ui;
  CodeIconsHolder holder(ui, {{" Class ", 1}, {"ATL Object", 2}, {"", 3}}, {});
  auto icons = AsCollection(holder.GetCodeIcons());
  ASSERT_TRUE(icons);
  EXPECT_EQ(KeysOf(*icons), (std::vector<std::string>{" Class ", "ATL Object", ""}));
  EXPECT_EQ(icons->ByKey(" Class ").toObject(), ui.pictures.at(1));
  EXPECT_EQ(ErrorNumberOf([&] { icons->ByKey("Class"); }), vberr::kInvalidCall);
  EXPECT_EQ(ErrorNumberOf([&] { icons->ByKey("ATLObject"); }), vberr::kInvalidCall);
}

TEST(CodeIconsMembers, TraceTheirCallAndAnswerTheHoldersCollections) {
  test::World world;
  world.registry.CreateKey(RootKey::LocalMachine, kDebugSettingsKey);
  RegistrySetValue(world.registry, RootKey::LocalMachine, kDebugSettingsKey, "Debug", Variant(int32_t{0x7F000080}),
                   platform::kRegDword);
  RegistrySetValue(world.registry, RootKey::LocalMachine, kDebugSettingsKey, "SuppressTimeStamps", Variant("true"),
                   platform::kRegSz);
  Module module(world.platform());
  auto api = CreateApi(module);
  auto small = AsCollection(api->Invoke(api->IdOfName("CodeIcons"), CallKind::PropertyGet, {}).toObject());
  auto large = AsCollection(api->Invoke(api->IdOfName("LargeCodeIcons"), CallKind::Method, {}).toObject());
  ASSERT_TRUE(small && large);
  EXPECT_EQ(small->size(), CodeIconArtwork().size());
  EXPECT_EQ(large->ByKey("Interface").toObject(), world.ui.pictures.at(202));
  const std::string log = world.files.at("C:\\tzndebuglog.txt");
  EXPECT_NE(log.find("TRACE    ADDIN     kpxAddin.CodeIcons()\r\n"), std::string::npos) << log;
  EXPECT_NE(log.find("TRACE    ADDIN     kpxAddin.LargeCodeIcons()\r\n"), std::string::npos) << log;
}

// ------------------------------------------------------------ the artwork

TEST(CodeIconArtwork, KeysAndResourcesAreDistinct) {
  std::set<std::string> keys;
  std::set<int32_t> ids;
  for (const CodeIconArt& art : CodeIconArtwork()) {
    // A key the collection holds already would leave the icon out.
    EXPECT_TRUE(keys.insert(LCase(art.key)).second) << art.key;
    EXPECT_TRUE(ids.insert(art.smallResource).second) << art.smallResource;
    EXPECT_TRUE(ids.insert(art.largeResource).second) << art.largeResource;
  }
  EXPECT_GE(keys.size(), 7u);
}

std::string ReadFile(const std::string& path) {
  std::ifstream in(path, std::ios::binary);
  std::stringstream s;
  s << in.rdbuf();
  return s.str();
}

uint32_t Le(const std::string& b, size_t at, int bytes) {
  uint32_t v = 0;
  for (int i = bytes - 1; i >= 0; --i) v = (v << 8) | static_cast<unsigned char>(b.at(at + static_cast<size_t>(i)));
  return v;
}

// A one-image icon file: 32-bit BGRA of `pixels` square with its AND mask,
// the mask transparent exactly where the picture is (mostly) transparent,
// and something to see. Failures name the file.
void ExpectIconFile(const std::string& path, uint32_t pixels) {
  SCOPED_TRACE(path);
  const std::string b = ReadFile(path);
  ASSERT_GE(b.size(), 6u + 16u + 40u) << "missing or cut short";
  EXPECT_EQ(Le(b, 0, 2), 0u);
  EXPECT_EQ(Le(b, 2, 2), 1u);  // an icon, not a cursor
  ASSERT_EQ(Le(b, 4, 2), 1u);
  EXPECT_EQ(Le(b, 6, 1), pixels);
  EXPECT_EQ(Le(b, 7, 1), pixels);
  EXPECT_EQ(Le(b, 12, 2), 32u);
  const uint32_t length = Le(b, 14, 4), offset = Le(b, 18, 4);
  const uint32_t maskStride = (pixels + 31) / 32 * 4;
  ASSERT_EQ(length, 40 + pixels * pixels * 4 + maskStride * pixels);
  ASSERT_EQ(b.size(), size_t{offset} + length);
  EXPECT_EQ(Le(b, offset, 4), 40u);
  EXPECT_EQ(Le(b, offset + 4, 4), pixels);
  EXPECT_EQ(Le(b, offset + 8, 4), pixels * 2);  // picture and mask
  EXPECT_EQ(Le(b, offset + 14, 2), 32u);
  const size_t colours = offset + 40, mask = colours + pixels * pixels * 4;
  size_t opaque = 0, maskMismatches = 0;
  for (uint32_t y = 0; y < pixels; ++y) {
    for (uint32_t x = 0; x < pixels; ++x) {
      const uint32_t alpha = Le(b, colours + (y * pixels + x) * 4 + 3, 1);
      const bool transparent = (Le(b, mask + y * maskStride + x / 8, 1) >> (7 - x % 8)) & 1;
      if (alpha == 255) ++opaque;
      if (transparent != (alpha < 128)) ++maskMismatches;
    }
  }
  EXPECT_EQ(maskMismatches, 0u);
  EXPECT_GT(opaque, pixels * pixels / 8) << "hardly anything to see";
  EXPECT_LT(opaque, size_t{pixels} * pixels) << "no transparent edge";
}

TEST(CodeIconArtwork, EveryIconIsInTheResourceScriptAsItsKindsFileOfItsSize) {
  const std::string source = KPX_SOURCE_DIR;
  const std::string script = ReadFile(source + "/src/com/kpxaddin.rc");
  ASSERT_FALSE(script.empty());
  std::map<int32_t, std::string> icons;  // id -> file
  const std::regex line(R"re(^\s*(\d+)\s+ICON\s+"([^"]+)")re", std::regex::multiline);
  for (auto it = std::sregex_iterator(script.begin(), script.end(), line); it != std::sregex_iterator(); ++it)
    EXPECT_TRUE(icons.emplace(std::stoi((*it)[1]), (*it)[2]).second) << "icon " << (*it)[1] << " twice";
  for (const CodeIconArt& art : CodeIconArtwork()) {
    const std::string stem = LCase(art.key);
    for (auto [id, pixels] : {std::pair{art.smallResource, 16u}, std::pair{art.largeResource, 32u}}) {
      auto found = icons.find(id);
      ASSERT_NE(found, icons.end()) << art.key << " " << pixels << ": no icon " << id << " in the resource script";
      EXPECT_EQ(found->second, stem + "-" + std::to_string(pixels) + ".ico") << art.key;
      ExpectIconFile(source + "/res/icons/" + found->second, pixels);
      icons.erase(found);
    }
  }
  // Nothing in the script the artwork does not know.
  for (const auto& [id, file] : icons) ADD_FAILURE() << "icon " << id << " (" << file << ") has no key";
}

// ---------------------------------------------------------- enumeration

TEST(CollectionEnumeration, WalksTheItemsAsTheyWereWhenItBegan) {
  Collection c;
  c.Add(Variant("a"), "k1");
  c.Add(Variant(int32_t{2}));
  c.Add(Variant("c"), "k3");
  auto walk = std::dynamic_pointer_cast<Enumerator>(c.Invoke(c.IdOfName("_NewEnum"), CallKind::Method, {}).toObject());
  ASSERT_TRUE(walk);
  // Changes made while it walks do not reach it.
  c.Add(Variant("late"));
  c.Invoke(Collection::kRemoveAll, CallKind::Method, {});
  EXPECT_EQ(walk->size(), 3u);
  EXPECT_EQ(walk->Next(2), (std::vector<Variant>{Variant("a"), Variant(int32_t{2})}));
  auto copy = walk->Clone();
  EXPECT_EQ(walk->Next(5), std::vector<Variant>{Variant("c")});  // fewer near the end
  EXPECT_TRUE(walk->Next(1).empty());
  // The clone goes on from where the walk was, on its own.
  EXPECT_EQ(copy->position(), 2u);
  EXPECT_EQ(copy->Next(1), std::vector<Variant>{Variant("c")});
  walk->Reset();
  EXPECT_TRUE(walk->Skip(3));
  EXPECT_FALSE(walk->Skip(1));
  walk->Reset();
  EXPECT_FALSE(walk->Skip(4));
  EXPECT_EQ(walk->position(), 3u);
  walk->Reset();
  EXPECT_EQ(walk->Peek(2).size(), 2u);
  EXPECT_EQ(walk->position(), 0u);  // looking does not move it
}

TEST(CollectionEnumeration, NewEnumTakesNoArgumentsAndCannotBeWritten) {
  Collection c;
  auto walk = std::dynamic_pointer_cast<Enumerator>(
      c.Invoke(Collection::kNewEnum, CallKind::PropertyGet, {}).toObject());
  ASSERT_TRUE(walk);
  EXPECT_TRUE(walk->Next(1).empty());
  std::vector<Variant> one{Variant(int32_t{1})};
  EXPECT_EQ(ErrorNumberOf([&] { c.Invoke(Collection::kNewEnum, CallKind::Method, one); }), vberr::kWrongArgCount);
  EXPECT_EQ(ErrorNumberOf([&] { c.Invoke(Collection::kNewEnum, CallKind::PropertyPut, one); }), vberr::kNoSuchMember);
  // The walk itself has no automation members.
  EXPECT_EQ(ErrorNumberOf([&] { walk->IdOfName("Next"); }), vberr::kNoSuchMember);
}

}  // namespace
}  // namespace kpx
