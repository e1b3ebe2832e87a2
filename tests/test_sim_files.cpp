// The simulator's input files: every fault must name the line it is on, and
// what is accepted must mean what the reference says.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <fstream>

#include "sim/windows_path.h"
#include "test_sim_support.h"

namespace kpx::sim::test {
namespace {

using ::testing::HasSubstr;

TEST(SimInputLines, SyntaxErrorsNameTheLineOfTheFault) {
  std::string message;
  // The comma is missing after line 2's value; the parser stumbles on line 3.
  EXPECT_EQ(3, FaultLine([] { JsonSource("m.json", "{\n  \"a\": 1\n  \"b\": 2\n}\n"); }, &message));
  EXPECT_THAT(message, HasSubstr("syntax error"));
  // An unterminated document is reported at its last line, not one past it.
  EXPECT_EQ(2, FaultLine([] { JsonSource("m.json", "{\n  \"a\": [1,\n"); }));
  EXPECT_EQ(1, FaultLine([] { JsonSource("m.json", "[1, 2]"); }, &message));
  EXPECT_THAT(message, HasSubstr("one JSON object"));
}

TEST(SimInputLines, DuplicateKeysAreFaultsAtTheSecondKey) {
  std::string message;
  EXPECT_EQ(3, FaultLine([] { JsonSource("m.json", "{\n \"files\": {},\n \"files\": {}\n}"); }, &message));
  EXPECT_THAT(message, HasSubstr("duplicate key \"files\""));
}

TEST(SimInputLines, HostileStructureIsAnsweredAtItsLine) {
  std::string message;
  // Nesting beyond the limit is refused where it passes the limit, however
  // deep it goes; up to the limit it is read.
  const std::string deep = "{\"a\":\n\n" + std::string(20000, '[') + std::string(20000, ']') + "}";
  EXPECT_EQ(3, FaultLine([&] { JsonSource("m.json", deep); }, &message));
  EXPECT_THAT(message, HasSubstr("deeper than 512"));
  const size_t lists = JsonSource::kMaxDepth - 1;  // the top object is one level
  EXPECT_EQ(-1, FaultLine([&] { JsonSource("m.json", "{\"a\":" + std::string(lists, '[') + std::string(lists, ']') + "}"); }));
  EXPECT_EQ(1, FaultLine([&] { JsonSource("m.json", "{\"a\":" + std::string(lists + 1, '[') + std::string(lists + 1, ']') + "}"); }));
  // Brackets inside strings do not nest.
  EXPECT_EQ(-1, FaultLine([&] { JsonSource("m.json", "{\"a\": \"" + std::string(1000, '[') + "\"}"); }));

  EXPECT_EQ(3, FaultLine([] { JsonSource("m.json", "{\"a\": 1,\n\"b\": [1,\n -1e400]}"); }, &message));
  EXPECT_EQ("the number -1e400 is out of range", message);

  // A duplicate among many keys, where keys are no longer searched one by one.
  std::string many = "{";
  for (int i = 0; i < 1000; ++i) many += "\"k" + std::to_string(i) + "\": " + std::to_string(i) + ",\n";
  EXPECT_EQ(1001, FaultLine([&] { JsonSource("m.json", many + "\"k500\": 0}"); }, &message));
  EXPECT_EQ("duplicate key \"k500\"", message);
  const JsonSource large("m.json", many + "\"last\": [true,\n false]}");
  EXPECT_EQ(1001, large.LineOf("/last"));
  EXPECT_EQ(1000, large.LineOfValue(large.root()["k999"]));
  EXPECT_EQ(1001, large.KeyLineOfValue(large.root(), "last"));
  EXPECT_EQ((std::vector<int>{1001, 1002}), large.ElementLines(large.root()["last"]));
}

TEST(SimInputLines, FilesThatCannotBeReadAreNamed) {
  TempDir dir;
  std::string message;
  EXPECT_EQ(0, FaultLine([&] { JsonSource::Load(dir.path()); }, &message));
  EXPECT_EQ("a folder, not a file", message);
  EXPECT_EQ(0, FaultLine([&] { JsonSource::Load(dir.path() / "absent.json"); }, &message));
  EXPECT_EQ("no such file", message);
  std::ofstream(dir.path() / "empty.json") << "";
  EXPECT_EQ(1, FaultLine([&] { JsonSource::Load(dir.path() / "empty.json"); }));
}

TEST(SimInputLines, IndexFollowsEscapedKeysAndNestedLists) {
  const JsonSource s("m.json",
                     "{\n"
                     "  \"registry\": {\n"
                     "    \"HKLM\\\\A/B~C\": {\n"
                     "      \"v\": [1,\n"
                     "             {\"x\": true}]\n"
                     "    }\n"
                     "  }\n"
                     "}\n");
  EXPECT_EQ(3, s.LineOf("/registry/HKLM\\A~1B~0C"));
  EXPECT_EQ(4, s.LineOf("/registry/HKLM\\A~1B~0C/v/0"));
  EXPECT_EQ(5, s.LineOf("/registry/HKLM\\A~1B~0C/v/1/x"));
  EXPECT_EQ(0, s.LineOf("/nowhere"));
}

TEST(SimModelFaults, EachFaultNamesTheLineOfTheOffendingValue) {
  struct Case {
    const char* text;
    int line;
    const char* says;
  } cases[] = {
      {"{\n \"comment\": \"x\",\n \"registery\": {}\n}", 3, "unknown key \"registery\""},
      {"{\n \"addins\": [\n  {\"name\": \"VC++\"},\n  {\"name\": \"X\",\n   \"contextMenus\": \"no\"}\n ]\n}", 5,
       "expected true or false"},
      {"{\"model\": {\"elements\": [\n {\"kind\": \"Klass\", \"name\": \"A\"}\n]}}", 2, "unknown element kind"},
      {"{\"model\": {\"elements\": [\n {\"kind\": \"Class\", \"name\": \"A\"},\n {\"kind\": \"Class\", \"name\": "
       "\"B\",\n  \"components\": [\"A\"]}\n]}}",
       4, "\"A\" is a Class, not a Module"},
      {"{\"model\": {\"elements\": [\n {\"kind\": \"Class\", \"name\": \"A\", \"nestedIn\": \"B\"},\n {\"kind\": "
       "\"Class\", \"name\": \"B\", \"nestedIn\": \"A\"}\n]}}",
       2, "circle"},
      {"{\"model\": {\"elements\": [\n {\"kind\": \"Class\", \"name\": \"A\"},\n {\"kind\": \"Class\", \"name\": "
       "\"A\"}\n]}}",
       3, "a second element \"A\""},
      {"{\"model\": {\n \"elements\": [{\"kind\": \"Class\", \"name\": \"A\"}],\n \"selection\": [\"A\",\n  "
       "\"B\"]\n}}",
       4, "no element \"B\""},
      {"{\"model\": {\"elements\": [\n {\"kind\": \"Attribute\", \"name\": \"m\"}\n]}}", 2, "their class's"},
      {"{\"registry\": {\n \"HKEY_CLASSES_ROOT\\\\x\": {}\n}}", 2, "a registry key is"},
      {"{\"registry\": {\"HKLM\\\\x\": {\n \"a\": 1,\n \"b\": {\"dword\": \"0x1FFFFFFFF\"}\n}}}", 3,
       "does not fit in 32 bits"},
      {"{\"registry\": {\"HKLM\\\\x\": {\n \"b\": {\"binary\": \"0g\"}\n}}}", 2, "not hex"},
      {"{\"clock\": {\n \"date\": \"2026-02-29\"\n}}", 2, "out of range"},
      {"{\"clock\": {\"time\": \"12:00:00\",\n \"step\": -1}}", 2, "backwards"},
      {"{\"resources\": {\n \"50x\": \"text\"\n}}", 2, "string id"},
      {"{\"companions\": [\n {\"members\": {}}\n]}", 2, "\"progid\" or a \"clsid\""},
      {"{\"companions\": [{\"progid\": \"P\", \"members\": {\n \"Go\": {\"returns\": {\"element\": \"Nope\"}},\n "
       "\"Stop\": {}\n}}]}",
       2, "no element \"Nope\""},
      {"{\"companions\": [{\"progid\": \"P\", \"members\": {\n \"Go\": {},\n \"go\": {}\n}}]}", 3, "names ignore case"},
      {"{\"companions\": [{\"progid\": \"P\", \"members\": {\n \"Go\": {\"returns\": 1,\n  \"raise\": "
       "{\"number\": 5}}\n}}]}",
       3, "either returns or raises"},
      {"{\"companions\": [{\"progid\": \"P\", \"members\": {\n \"Go\": {\"returns\": {\"object\": \"sub\"}}\n}}]}", 2,
       "no object \"sub\""},
      {"{\"addins\": [{\"name\": \"A\", \"menuStates\": {\n \"CClass_X\": {\"i2\": 70000}\n}}]}", 2, "16-bit"},
      // Values a Single or a Date cannot hold.
      {"{\"addins\": [{\"name\": \"A\", \"menuStates\": {\"X\": {\"r4\": 3.4e38},\n \"Y\": {\"r4\": 3.5e38}}}]}", 2,
       "Single range"},
      {"{\"addins\": [{\"name\": \"A\", \"menuStates\": {\"X\": {\"date\": -657434},\n \"Y\": {\"date\": 2958466}}}]}",
       2, "a date lies"},
      {"{\"clock\": {\n \"time\": \"23:59:59.99999999999999999\"}}", 2, "before 24:00:00"},
      {"{\"clock\": {\"step\": 86400,\n \"date\": \"2026-01-01\"},\n \"model\": {\"x\": 1}}", 3, "unknown key"},
      {"{\"resources\": {\"-5\": \"minus is fine\",\n \" 5030\": \"text\"\n}}", 2, "string id"},
      {"{\"resources\": {\n \"99999999999\": \"text\"\n}}", 2, "string id"},
      // The k-th add-in of a name is name#k: a name of that form collides.
      {"{\"addins\": [{\"name\": \"A#2\"}, {\"name\": \"A\"},\n {\"name\": \"A\"}]}", 2, "two add-ins"},
      // Registry keys and names as Windows and REGEDIT4 take them.
      {"{\"registry\": {\"HKLM\\\\a\": {},\n \"HKLM\\\\a\\\\\\\\b\": {}}}", 2, "empty part"},
      {"{\"registry\": {\n \"HKCU\\\\a\\\\\": {}}}", 2, "empty part"},
      {"{\"registry\": {\n \"HKCU\\\\a\\u0001\": {}}}", 2, "control character"},
      {"{\"registry\": {\"HKCU\\\\a\": {\n \"x\\u0000y\": 1}}}", 2, "a NUL"},
      {"{\"registry\": {\"HKCU\\\\a\": {\"x\": \"4294967295\",\n \"y\": {\"dword\": \"99999999999999999999999\"}}}}", 2,
       "does not fit"},
      // Paths that Windows cannot make, or that are a file and a folder.
      {"{\"folders\": [\"C:\\\\ok\",\n \"C:\\\\\"]}", 2, "naming a drive"},
      {"{\"files\": {\n \"C:\\\\a?b\": \"\"}}", 2, "< > \" | ? *"},
      {"{\"files\": {\n \"C:\\\\a:b\": \"\"}}", 2, "colon"},
      {"{\"files\": {\n \"C:\\\\dir\\\\con.txt\": \"\"}}", 2, "device name"},
      {"{\"files\": {\n \"C:\\\\a.\\\\b\": \"\"}}", 2, "ending in a dot"},
      {"{\"files\": {\n \"C:\\\\dir\\\\\": \"\"}}", 2, "ending in a backslash"},
      {"{\"files\": {\n \"C:\\\\a\\u000ab\": \"\"}}", 2, "control character"},
      {"{\"files\": {\"C:\\\\a\": \"\",\n \"c:\\\\A\\\\b.txt\": \"\"}}", 2, "\"C:\\a\" is a file"},
      {"{\"folders\": [\"C:\\\\x\\\\y\"],\n \"files\": {\"c:\\\\X\": \"\"}}", 2, "is a folder"},
  };
  for (const Case& c : cases) {
    std::string message;
    EXPECT_EQ(c.line, FaultLine([&] { ParseModel(c.text); }, &message)) << c.text;
    EXPECT_THAT(message, HasSubstr(c.says)) << c.text;
  }
}

TEST(SimModelFaults, PathsLongerThanWindowsAllowsAreRefused) {
  std::string message;
  const std::string name(200, 'n');
  EXPECT_EQ(-1, FaultLine([&] { ParseModel("{\"folders\": [\"C:\\\\" + name + "\"]}"); }));
  EXPECT_EQ(2, FaultLine([&] { ParseModel("{\"folders\": [\n\"C:\\\\" + name + "\\\\" + name + "\"]}"); }, &message));
  EXPECT_THAT(message, HasSubstr("longer than 259"));
  EXPECT_EQ(2, FaultLine([&] { ParseModel("{\"folders\": [\n\"" + std::string(256, 'n') + "\"]}"); }, &message));
  EXPECT_THAT(message, HasSubstr("longer than 255"));
}

TEST(SimPaths, SpellingsOfOnePlaceFoldTogether) {
  using Parts = std::vector<std::string>;
  EXPECT_EQ((Parts{"c", "dir", "f.txt"}), FoldedPathParts(R"(C:\Dir\.\\F.TXT)"));
  EXPECT_EQ((Parts{"c", "dir", "f.txt"}), FoldedPathParts("dir/f.txt"));
  EXPECT_EQ((Parts{"d", "etc"}), FoldedPathParts(R"(d:\a\..\..\..\Etc\)"));
  EXPECT_EQ((Parts{"unc", "srv", "share", "x"}), FoldedPathParts(R"(\\SRV\Share\..\..\x)"));

  PathPlan plan;
  EXPECT_EQ("", plan.MakeFolder(R"(C:\Logs\Old)"));
  EXPECT_EQ("", plan.WriteFile(R"(c:\logs\a.txt)"));
  EXPECT_THAT(plan.WriteFile(R"(C:\LOGS\a.txt\b)"), HasSubstr("is a file"));
  EXPECT_THAT(plan.WriteFile(R"(C:\logs\old)"), HasSubstr("is a folder"));
  EXPECT_THAT(plan.RemoveFile(R"(C:\Logs)"), HasSubstr("only files are deleted"));
  // A file deleted may become a folder; deleting what is not there is no fault.
  EXPECT_EQ("", plan.RemoveFile(R"(C:\Logs\A.TXT)"));
  EXPECT_EQ("", plan.WriteFile(R"(C:\Logs\a.txt\b)"));
  EXPECT_EQ("", plan.RemoveFile(R"(C:\nothing\here)"));
}

TEST(SimModelRegistry, ValueFormsBecomeTheRegistryTypesTheyName) {
  const ModelDef m = ParseModel(R"({"registry": {
    "HKLM\\SOFTWARE\\K": {"Debug": 2130706560, "Neg": -1, "Hex": {"dword": "0xff000080"},
                           "Path": "C:\\log.txt", "@": "dflt", "Empty": {"sz": ""}, "Raw": {"binary": "0102ff"}},
    "hkey_current_user\\Only\\Key": {}
  }})");
  auto find = [&](const char* name) -> const RegistryEntry& {
    for (const RegistryEntry& e : m.registry)
      if (e.name && *e.name == name) return e;
    throw std::runtime_error(name);
  };
  EXPECT_EQ(std::string("\x80\x00\x00\x7f", 4), find("Debug").value.data);
  EXPECT_EQ(platform::kRegDword, find("Debug").value.type);
  EXPECT_EQ(std::string("\xff\xff\xff\xff", 4), find("Neg").value.data);
  EXPECT_EQ(std::string("\x80\x00\x00\xff", 4), find("Hex").value.data);
  EXPECT_EQ(std::string("C:\\log.txt\0", 11), find("Path").value.data);
  EXPECT_EQ(platform::kRegSz, find("Path").value.type);
  EXPECT_EQ(std::string("dflt\0", 5), find("").value.data);  // "@" is the default value
  EXPECT_EQ(std::string("\0", 1), find("Empty").value.data);
  EXPECT_EQ(platform::kRegBinary, find("Raw").value.type);
  EXPECT_EQ(std::string("\x01\x02\xff", 3), find("Raw").value.data);
  EXPECT_EQ(platform::RootKey::LocalMachine, find("Debug").root);
  EXPECT_EQ("SOFTWARE\\K", find("Debug").key);
  // A key without values is still created.
  const RegistryEntry& last = m.registry.back();
  EXPECT_EQ(platform::RootKey::CurrentUser, last.root);
  EXPECT_EQ("Only\\Key", last.key);
  EXPECT_FALSE(last.name.has_value());
}

TEST(SimModelElements, MembersGetQualifiedKeysAndRelationsDefaultTheirText) {
  const ModelDef m = ParseModel(R"({"model": {"elements": [
    {"kind": "Class", "name": "CFoo", "attributes": [{"name": "m_x"}], "operations": [{"name": "Run"}]},
    {"kind": "Class", "name": "IBar"},
    {"kind": "InheritRelation", "name": "r", "client": "CFoo", "supplier": "IBar"}]}})");
  const ElementDef* x = m.FindElement("CFoo.m_x");
  ASSERT_NE(nullptr, x);
  EXPECT_EQ("m_x", x->name);
  EXPECT_EQ("Attribute", x->kind);
  EXPECT_EQ("CFoo", x->owner);
  EXPECT_EQ("Operation", m.FindElement("CFoo.Run")->kind);
  EXPECT_EQ(std::vector<std::string>{"CFoo.m_x"}, m.FindElement("CFoo")->attributes);
  EXPECT_EQ("CFoo -> IBar", m.FindElement("r")->relationText);
}

TEST(SimModelAddIns, NamesakesAreNumberedInListOrder) {
  const ModelDef m =
      ParseModel(R"({"addins": [{"name": "VisualStudio"}, {"name": "VC++"}, {"name": "VisualStudio"}]})");
  ASSERT_EQ(3u, m.addins.size());
  EXPECT_EQ("VisualStudio", m.addins[0].id);
  EXPECT_EQ("VC++", m.addins[1].id);
  EXPECT_EQ("VisualStudio#2", m.addins[2].id);
  EXPECT_NE(nullptr, m.FindAddIn("VisualStudio#2"));
}

TEST(SimClockSetting, DatesAndTimesAreReadExactly) {
  const ModelDef m = ParseModel(R"({"clock": {"date": "2024-02-29", "time": "23:59:59.25", "step": 0.5}})");
  EXPECT_EQ(2024, m.clock.date->year);
  EXPECT_EQ(2, m.clock.date->month);
  EXPECT_EQ(29, m.clock.date->day);
  EXPECT_DOUBLE_EQ(86399.25, *m.clock.seconds);
  EXPECT_DOUBLE_EQ(0.5, *m.clock.step);
  EXPECT_EQ(1, FaultLine([] { ParseModel(R"({"clock": {"time": "24:00:00"}})"); }));
  EXPECT_EQ(1, FaultLine([] { ParseModel(R"({"clock": {"time": "12:00:00."}})"); }));
}

// ------------------------------------------------------------------ scenario

const char* kModel = R"({"addins": [{"name": "VC++"}],
  "model": {"elements": [{"kind": "Class", "name": "CFoo"}]}})";

int ScenarioFault(const std::string& text, std::string* message = nullptr) {
  const ModelDef model = ParseModel(kModel);
  return FaultLine([&] { LoadScenario(JsonSource("s.json", text), model); }, message);
}

TEST(SimScenarioFaults, CallsAreCheckedAgainstTheAddInsMembers) {
  std::string message;
  EXPECT_EQ(3, ScenarioFault("{\"actions\": [\n {\"call\": \"OnActivate\", \"args\": [\"$app\"]},\n {\"call\": "
                             "\"OnActivat\", \"args\": [\"$app\"]}\n]}",
                             &message));
  EXPECT_THAT(message, HasSubstr("no member \"OnActivat\""));
  // Too many arguments, and too few: the line of the argument list, or of
  // the call when there is no list.
  EXPECT_EQ(3, ScenarioFault("{\"actions\": [\n {\"call\": \"Name\",\n  \"args\": [1]}\n]}", &message));
  EXPECT_THAT(message, HasSubstr("Name takes 0 arguments, not 1"));
  EXPECT_EQ(2, ScenarioFault("{\"actions\": [\n {\"call\": \"OnActivate\"}\n]}", &message));
  EXPECT_THAT(message, HasSubstr("takes 1 argument, not 0"));
  // An optional parameter may be left out.
  EXPECT_EQ(-1, ScenarioFault(R"({"actions": [{"call": "OnProperties", "args": [{"element": "CFoo"}]}]})"));
  EXPECT_EQ(2, ScenarioFault("{\"actions\": [\n {\"call\": \"Name\", \"kind\": \"put\"}]}", &message));
}

TEST(SimScenarioFaults, ArgumentValuesAreChecked) {
  std::string message;
  EXPECT_EQ(3, ScenarioFault("{\"actions\": [\n {\"call\": \"OnNewModelElement\",\n  \"args\": [\"$app\", "
                             "{\"element\": \"CBar\"}]}\n]}",
                             &message));
  EXPECT_THAT(message, HasSubstr("no element \"CBar\""));
  EXPECT_EQ(2, ScenarioFault("{\"actions\": [\n {\"call\": \"OnActivate\", \"args\": [{\"i2\": 40000}]}]}", &message));
  EXPECT_EQ(2,
            ScenarioFault("{\"actions\": [\n {\"call\": \"OnActivate\", \"args\": [{\"addin\": \"VisualStudio\"}]}]}",
                          &message));
  EXPECT_EQ(2, ScenarioFault("{\"actions\": [\n {\"call\": \"OnActivate\", \"args\": [{\"byref\": {\"byref\": 1}}]}]}",
                             &message));
  EXPECT_EQ(2, ScenarioFault("{\"actions\": [\n {\"call\": \"OnActivate\", \"args\": [[1]]}]}", &message));
  EXPECT_EQ(2, ScenarioFault("{\"actions\": [\n {\"call\": \"OnActivate\", \"args\": [2147483648]}]}", &message));
  EXPECT_THAT(message, HasSubstr("32-bit"));
}

TEST(SimScenarioFaults, TheAddInObjectsLifeIsChecked) {
  std::string message;
  EXPECT_EQ(3, ScenarioFault("{\"actions\": [\n {\"release\": true},\n {\"call\": \"Name\"}\n]}", &message));
  EXPECT_THAT(message, HasSubstr("released"));
  EXPECT_EQ(2, ScenarioFault("{\"actions\": [{\"call\": \"Name\"},\n {\"create\": true}]}", &message));
  EXPECT_THAT(message, HasSubstr("exists already"));
  EXPECT_EQ(2, ScenarioFault("{\"actions\": [{\"release\": true},\n {\"release\": true}]}", &message));
  EXPECT_EQ(-1,
            ScenarioFault(R"({"actions": [{"create": true}, {"release": true}, {"create": true}, {"call": "Name"}]})"));
  EXPECT_EQ(2, ScenarioFault("{\"actions\": [\n {\"call\": \"Name\", \"select\": [\"CFoo\"]}]}", &message));
  EXPECT_THAT(message, HasSubstr("one action per entry"));
  EXPECT_EQ(2, ScenarioFault("{\"actions\": [\n {\"selec\": [\"CFoo\"]}]}", &message));
  EXPECT_THAT(message, HasSubstr("unknown action"));
  EXPECT_EQ(2, ScenarioFault("{\"actions\": [\n {\"select\": [\"CFoo\"], \"args\": []}]}", &message));
}

TEST(SimScenarioFaults, FilesAreCheckedAgainstWhatTheModelAndEarlierStepsMade) {
  const ModelDef model = ParseModel(R"({"folders": ["C:\\Logs"], "files": {"C:\\a.txt": ""}})");
  auto fault = [&](const std::string& text, std::string* message) {
    return FaultLine([&] { LoadScenario(JsonSource("s.json", text), model); }, message);
  };
  std::string message;
  EXPECT_EQ(2, fault("{\"actions\": [\n {\"setFile\": {\"C:\\\\logs\": null}}]}", &message));
  EXPECT_THAT(message, HasSubstr("only files are deleted"));
  EXPECT_EQ(2, fault("{\"actions\": [\n {\"setFile\": {\"C:\\\\A.txt\\\\b\": \"x\"}}]}", &message));
  EXPECT_THAT(message, HasSubstr("is a file"));
  EXPECT_EQ(3, fault("{\"actions\": [{\"setFile\": {\"C:\\\\new\\\\f\": \"x\"}},\n {\"setFile\": {\"C:\\\\x\": \"\"}},\n"
                     " {\"setFile\": {\"C:\\\\NEW\": \"x\"}}]}",
                     &message));
  EXPECT_THAT(message, HasSubstr("is a folder"));
  // Once deleted, a file's place may hold a folder.
  EXPECT_EQ(-1, fault(R"({"actions": [{"setFile": {"C:\\a.txt": null}}, {"setFile": {"C:\\a.txt\\b": "x"}}]})", nullptr));
}

TEST(SimScenario, StepsKnowTheirLines) {
  const ModelDef model = ParseModel(kModel);
  const Scenario s =
      LoadScenario(JsonSource("s.json", "{\"actions\": [\n {\"call\": \"Name\"},\n\n {\"select\": [\n]}, {\"release\": true}]}"),
                   model);
  ASSERT_EQ(3u, s.actions.size());
  EXPECT_EQ(2, s.actions[0].line);
  EXPECT_EQ(4, s.actions[1].line);
  EXPECT_EQ(5, s.actions[2].line);
}

TEST(SimScenario, TheFirstActionDecidesWhetherTheRunCreatesTheObject) {
  const ModelDef model = ParseModel(kModel);
  EXPECT_TRUE(LoadScenario(JsonSource("s.json", R"({"actions": []})"), model).implicitCreate);
  EXPECT_TRUE(LoadScenario(JsonSource("s.json", R"({"actions": [{"call": "Name"}]})"), model).implicitCreate);
  EXPECT_FALSE(LoadScenario(JsonSource("s.json", R"({"actions": [{"create": true}]})"), model).implicitCreate);
}

TEST(SimScenario, ModelPathIsTakenRelativeToTheScenario) {
  EXPECT_EQ(std::filesystem::path("dir/sub/m.json"),
            ScenarioModelPath(JsonSource("dir/s.json", R"({"model": "sub/m.json", "actions": []})")));
  EXPECT_FALSE(ScenarioModelPath(JsonSource("dir/s.json", R"({"actions": []})")).has_value());
}

}  // namespace
}  // namespace kpx::sim::test
