// Failures a model injects: each fault hits the call it names and no other,
// the registry and the resource component fail where the model says, and a
// fault that could never be met is an input error at its line.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "shared/host_ids.h"
#include "shared/resource_strings.h"
#include "shared/resource_texts.h"
#include "sim/faults.h"
#include "sim/host_objects.h"
#include "fakes.h"
#include "test_sim_support.h"

namespace kpx::sim::test {
namespace {

namespace id = kpx::hostid;

using ::testing::HasSubstr;
using kpx::test::ErrorNumberOf;

constexpr const char* kIdeKey = "Software\\Microsoft\\DevStudio\\6.0\\AddIns\\kpxIDEAddin.DSAddIn";

const char* kFaultyWorld = R"({
  "registry": {"HKCU\\Software\\Microsoft\\DevStudio\\6.0\\AddIns\\Other": {"@": "1"},
               "HKLM\\SOFTWARE\\Tolvek Software\\Quarn\\AddIns\\VisualStudio": {"Debug": 1}},
  "addins": [{"name": "VC++", "settings": {"Events": {"OnUser1": "C|Docs|Tools.DocGen"}}},
             {"name": "VisualStudio"}],
  "model": {"elements": [{"kind": "Class", "name": "CFoo", "attributes": [{"name": "m_x"}]}]},
  "faults": {
    "registry": {
      "HKCU\\Software\\Microsoft\\DevStudio\\6.0\\AddIns\\kpxIDEAddin.DSAddIn": {"create": false},
      "HKCU\\Software\\Microsoft\\DevStudio\\6.0\\AddIns\\Other": {"reads": {"@": "0", "Gone": null}},
      "HKLM\\SOFTWARE\\Tolvek Software\\Quarn\\AddIns\\VisualStudio": {"reads": {"DebugOutputFile": "C:\\Faked.log"}}
    },
    "missingResources": [5040],
    "readSetting": {"VC++": {"events": {"onuser1": {"number": 70, "description": "Permission denied"}}}},
    "writeSetting": {"VC++": {"Backup": {"List": {"number": 75}}}},
    "addContextMenuItem": {"VC++": {"call": 2, "raise": {"number": 5, "description": "no menu"}}},
    "calls": [
      {"object": "$app.AddIns", "member": "getat", "call": 3, "raise": {"number": 9}},
      {"object": "element:CFoo.m_x", "member": "Name", "raise": {"number": 91}}
    ]
  }
})";

class SimFaultTest : public ::testing::Test {
 protected:
  SimWorld w{kFaultyWorld};
  platform::Registry& registry() { return w.sim().platform().registry; }
  ObjectPtr addin(const char* name) { return w.world().FindAddIn(name); }
};

TEST_F(SimFaultTest, AHostCallFailsAtItsNthCallOfThatMemberOnThatObjectOnly) {
  ObjectPtr addins = GetObject(GetObject(w.world().application(), id::kAddInManager), id::kAddIns);
  auto getAt = [&](int16_t i) { return CallMethod(addins, id::kGetAt, {Variant(i)}); };
  getAt(1);
  GetProperty(addins, id::kCount);  // another member: not counted with GetAt
  getAt(2);
  EXPECT_EQ(vberr::kSubscript, ErrorNumberOf([&] { getAt(1); }));  // the third GetAt, whatever its index
  EXPECT_EQ("addin:VisualStudio", w.log().Label(getAt(2).toObject().get()));
  // Without "call" every call fails, on that object only.
  ObjectPtr member = w.world().FindElement("CFoo.m_x");
  EXPECT_EQ(91, ErrorNumberOf([&] { GetProperty(member, id::kName); }));
  EXPECT_EQ(91, ErrorNumberOf([&] { GetProperty(member, id::kName); }));
  EXPECT_EQ("CFoo", GetProperty(w.world().FindElement("CFoo"), id::kName).toString());

  const std::vector<EventJson> faults = w.Events("fault");
  ASSERT_EQ(3u, faults.size());
  EXPECT_EQ("$app.AddIns", faults[0]["object"]);
  EXPECT_EQ("GetAt", faults[0]["member"]);  // as the object spells it
  EXPECT_EQ(3, faults[0]["call"]);
  EXPECT_EQ((EventJson{{{"i2", 1}}}), faults[0]["args"]);
  EXPECT_EQ(9, faults[0]["error"]["number"]);
  EXPECT_EQ("Subscript out of range", faults[0]["error"]["description"]);
  EXPECT_EQ(2, faults[2]["call"]);
}

TEST_F(SimFaultTest, SettingsFailForTheirSectionAndEntryWhateverTheCase) {
  ObjectPtr vc = addin("VC++");
  EXPECT_EQ(70, ErrorNumberOf([&] { CallMethod(vc, id::kReadSetting, {"EVENTS", "OnUser1", ""}); }));
  EXPECT_EQ("", CallMethod(vc, id::kReadSetting, {"Events", "OnUser2", ""}).toString());
  EXPECT_EQ(75, ErrorNumberOf([&] { CallMethod(vc, id::kWriteSetting, {"backup", "list", "x"}); }));
  EXPECT_TRUE(CallMethod(vc, id::kWriteSetting, {"Backup", "Other", "x"}).toBool());
  // The same setting of another add-in is not touched.
  CallMethod(addin("VisualStudio"), id::kReadSetting, {"Events", "OnUser1", ""});
  // A failed call has no effect of its own: only the fault is recorded.
  EXPECT_EQ(2u, w.Events("setting-read").size());
  EXPECT_EQ(1u, w.Events("setting-write").size());
  const std::vector<EventJson> faults = w.Events("fault");
  ASSERT_EQ(2u, faults.size());
  EXPECT_EQ((EventJson{"EVENTS", "OnUser1", ""}), faults[0]["args"]);
  EXPECT_EQ("Permission denied", faults[0]["error"]["description"]);
  EXPECT_EQ("Path/File access error", faults[1]["error"]["description"]);
}

TEST_F(SimFaultTest, AContextMenuEntryIsRejectedAtItsCallOnly) {
  ObjectPtr vc = addin("VC++");
  auto add = [&](const char* name) {
    return CallMethod(vc, id::kAddContextMenuItem, {Variant(int16_t{4}), "Caption", name});
  };
  add("First");
  EXPECT_EQ(5, ErrorNumberOf([&] { add("Second"); }));
  add("Third");
  const std::vector<EventJson> added = w.Events("menu-add");
  ASSERT_EQ(2u, added.size());
  EXPECT_EQ("Third", added[1]["name"]);
}

TEST_F(SimFaultTest, AKeyThatCannotBeCreatedTakesItsSubkeysWithItButNotItsSiblings) {
  EXPECT_EQ(platform::KeyDisposition::Failed, registry().CreateKey(platform::RootKey::CurrentUser, kIdeKey));
  EXPECT_EQ(platform::KeyDisposition::Failed,
            registry().CreateKey(platform::RootKey::CurrentUser, std::string(kIdeKey) + "\\Below"));
  EXPECT_EQ(platform::KeyDisposition::Failed,
            registry().CreateKey(platform::RootKey::CurrentUser, "software\\microsoft\\devstudio\\6.0\\addins\\KPXIDEADDIN.DSADDIN"));
  EXPECT_EQ(platform::KeyDisposition::Created,
            registry().CreateKey(platform::RootKey::CurrentUser, std::string(kIdeKey) + "Two"));
  EXPECT_EQ(platform::KeyDisposition::Opened,
            registry().CreateKey(platform::RootKey::CurrentUser, "Software\\Microsoft\\DevStudio\\6.0\\AddIns"));
  // The same path under the other root is another key.
  EXPECT_EQ(platform::KeyDisposition::Created, registry().CreateKey(platform::RootKey::LocalMachine, kIdeKey));
  const std::vector<EventJson> created = w.Events("registry-create");
  ASSERT_EQ(6u, created.size());
  EXPECT_TRUE(created[0]["fault"].get<bool>());
  EXPECT_EQ("failed", created[0]["disposition"]);
  EXPECT_FALSE(created[3].contains("fault"));
}

TEST_F(SimFaultTest, ValuesReadAsTheFaultSaysWhileWritesStillLand) {
  const char* key = "Software\\Microsoft\\DevStudio\\6.0\\AddIns\\Other";
  const platform::RootKey hkcu = platform::RootKey::CurrentUser;
  EXPECT_TRUE(registry().SetValue(hkcu, key, "", {platform::kRegSz, std::string("1\0", 2)}));
  EXPECT_TRUE(registry().SetValue(hkcu, key, "Gone", {platform::kRegSz, std::string("here\0", 5)}));
  EXPECT_TRUE(registry().SetValue(hkcu, key, "Kept", {platform::kRegSz, std::string("kept\0", 5)}));
  EXPECT_EQ(std::string("0\0", 2), registry().QueryValue(hkcu, key, "")->data);
  EXPECT_FALSE(registry().QueryValue(hkcu, key, "gone").has_value());  // value names ignore case
  EXPECT_EQ(std::string("kept\0", 5), registry().QueryValue(hkcu, key, "Kept")->data);
  // The registry itself holds what was written.
  EXPECT_EQ(std::string("1\0", 2), w.registry().QueryValue(hkcu, key, "")->data);
  const std::vector<EventJson> reads = w.Events("registry-read");
  ASSERT_EQ(3u, reads.size());
  EXPECT_EQ("0", reads[0]["value"]);
  EXPECT_TRUE(reads[0]["fault"].get<bool>());
  EXPECT_TRUE(reads[1]["value"].is_null());
  EXPECT_TRUE(reads[1]["fault"].get<bool>());
  EXPECT_FALSE(reads[2].contains("fault"));
}

TEST_F(SimFaultTest, TheDebugLogIsFoundWhereTheAddInReadsItToBe) {
  // The add-in reads the injected DebugOutputFile, so appends there are its debug log.
  w.sim().platform().files.AppendText("C:\\Faked.log", "a line\r\n");
  const std::vector<EventJson> lines = w.Events("debuglog");
  ASSERT_EQ(1u, lines.size());
  EXPECT_EQ("a line", lines[0]["line"]);
}

TEST_F(SimFaultTest, AMissingResourceFailsByEitherWayInAndIsRecorded) {
  platform::ObjectFactory& objects = w.sim().platform().objects;
  ObjectPtr res = objects.CreateInstance(kResourceClassId, kResourceInterfaceId);
  EXPECT_EQ(326, ErrorNumberOf([&] { CallOwnOperation(res, 1, CallKind::Method, {Variant(5040)}); }));
  Variant idArg(5040);
  EXPECT_EQ(326, ErrorNumberOf([&] { CallByName(res, "GetString", CallKind::Method, {Variant::Ref(&idArg)}); }));
  EXPECT_EQ(FindResourceText(5041), CallOwnOperation(res, 1, CallKind::Method, {Variant(5041)}).toString());
  const std::vector<EventJson> faults = w.Events("fault");
  ASSERT_EQ(2u, faults.size());
  EXPECT_EQ("LoadResString", faults[0]["member"]);
  EXPECT_EQ("GetString", faults[1]["member"]);
  EXPECT_EQ((EventJson{5040}), faults[1]["args"]);
  EXPECT_EQ("Resource with identifier '5040' not found", faults[1]["error"]["description"]);
  EXPECT_FALSE(faults[0].contains("call"));
}

TEST(SimFaultLabels, HostObjectsAreKnownByTheLabelsTheLogGivesThem) {
  const ModelDef m = ParseModel(R"({
    "addins": [{"name": "VC++"}, {"name": "Plain", "contextMenus": false}],
    "model": {"elements": [
      {"kind": "Class", "name": "CFoo", "package": {"name": "Logical View"}},
      {"kind": "Module", "name": "Lib"},
      {"kind": "ModuleVisibilityRelationship", "name": "dep", "client": "Lib", "supplier": "Lib"}]}})");
  auto has = [&](std::string_view label, std::string_view member) {
    std::optional<std::span<const MemberName>> names = HostMembersOf(m, label);
    if (!names) return false;
    for (const MemberName& n : *names)
      if (n.name == member) return true;
    return false;
  };
  EXPECT_TRUE(has("$app", "WriteErrorLog"));
  EXPECT_TRUE(has("$app.AddInManager", "AddIns"));
  EXPECT_TRUE(has("$app.AddIns", "GetAt"));
  EXPECT_FALSE(has("$app.AddIns", "Add"));  // the host's list cannot be changed
  EXPECT_TRUE(has("collection:selection", "Add"));
  EXPECT_TRUE(has("collection:CFoo.components", "RemoveAll"));
  EXPECT_FALSE(HostMembersOf(m, "collection:Lib.components"));  // only classes have them
  EXPECT_TRUE(has("addin:VC++", "AddContextMenuItem"));
  EXPECT_FALSE(has("addin:Plain", "AddContextMenuItem"));
  EXPECT_TRUE(has("addin:Plain", "ReadSetting"));
  EXPECT_FALSE(HostMembersOf(m, "addin:Nobody"));
  EXPECT_TRUE(has("element:CFoo", "GetAssignedLanguage"));
  EXPECT_FALSE(has("element:Lib", "GetAssignedLanguage"));
  EXPECT_TRUE(has("element:Lib", "Language"));
  EXPECT_TRUE(has("menu:CClass_UpdateCode#2", "MenuState"));
  EXPECT_TRUE(has("classkind:CFoo", "Name"));
  EXPECT_TRUE(has("package:Logical View", "KindTest"));
  EXPECT_FALSE(HostMembersOf(m, "package:Nowhere"));
  EXPECT_TRUE(has("unit:dep", "IsModifiable"));
  EXPECT_TRUE(has("property:CFoo/VC++/X", "ToolName"));
  EXPECT_FALSE(HostMembersOf(m, "addin:VC++.EventHandler"));
  EXPECT_FALSE(HostMembersOf(m, "API"));
}

TEST(SimFaultInput, EachFaultThatCannotBeMetNamesItsLine) {
  const std::string head = R"({"addins": [{"name": "VC++"}, {"name": "Plain", "contextMenus": false}],
 "registry": {"HKCU\\Software\\Held\\Key": {"@": "1"}},
 "resources": {"5030": "mine"},
 "faults": {
)";  // the faults' own lines start at 5
  struct Case {
    const char* faults;
    int line;
    const char* says;
  } cases[] = {
      {"\"registery\": {}", 5, "unknown key \"registery\""},
      {"\"registry\": {\n\"HKCR\\\\x\": {\"create\": false}}", 6, "a registry key is"},
      {"\"registry\": {\"HKCU\\\\x\": {\n\"create\": true}}", 6, "leave it out"},
      {"\"registry\": {\"HKCU\\\\Software\\\\Held\": {\n\"create\": false}}", 6, "holds this key or one below it"},
      {"\"registry\": {\"HKCU\\\\x\": {\"create\": false,\n\"reads\": {\"a\": \"b\"}}}", 6, "no values to read"},
      {"\"registry\": {\"HKCU\\\\x\": {\"reads\": {\n\"a\": {\"dword\": \"big\"}}}}", 6, "not a 32-bit number"},
      {"\"registry\": {\n\"HKCU\\\\x\": {}}", 6, "needs \"create\": false or \"reads\""},
      {"\"registry\": {\"HKCU\\\\x\": {\"create\": false},\n\"hkcu\\\\X\": {\"create\": false}}", 6, "a second fault"},
      {"\"missingResources\": [5040,\n5030]", 6, "given a text in \"resources\""},
      {"\"missingResources\": [\n1]", 6, "no text 1 to take away"},
      {"\"readSetting\": {\n\"Nobody\": {}}", 6, "no add-in \"Nobody\""},
      {"\"writeSetting\": {\"VC++\": {\"S\": {\n\"E\": {\"number\": 0}}}}", 6, "must not be 0"},
      {"\"addContextMenuItem\": {\"Plain\": {\n\"call\": 1, \"raise\": {\"number\": 5}}}", 5,
       "has no member \"AddContextMenuItem\""},
      {"\"addContextMenuItem\": {\"VC++\": {\n\"call\": 0, \"raise\": {\"number\": 5}}}", 6, "counted from 1"},
      {"\"addContextMenuItem\": {\"VC++\": {\n\"call\": 3}}", 5, "missing \"raise\""},
      {"\"calls\": [{\n\"object\": \"$application\", \"member\": \"Name\", \"raise\": {\"number\": 5}}]", 6,
       "no host object \"$application\""},
      {"\"calls\": [{\n\"object\": \"addin:VC++.EventHandler\", \"member\": \"X\", \"raise\": {\"number\": 5}}]", 6,
       "is no host object"},
      {"\"calls\": [{\"object\": \"$app\",\n\"member\": \"Nme\", \"raise\": {\"number\": 5}}]", 6,
       "$app has no member \"Nme\" (it has: CurrentModel, "},
  };
  for (const Case& c : cases) {
    std::string message;
    const std::string text = head + c.faults + "\n}}";
    EXPECT_EQ(c.line, FaultLine([&] { ParseModel(text); }, &message)) << c.faults;
    EXPECT_THAT(message, HasSubstr(c.says)) << c.faults;
  }
}

}  // namespace
}  // namespace kpx::sim::test
