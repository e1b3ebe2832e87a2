// Whole runs of the simulated host: values in and out, the add-in object's
// life, the virtual clock, the recorded platform and the transcript.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>

#include "sim/transcript.h"
#include "sim/values.h"
#include "test_sim_support.h"

namespace kpx::sim::test {
namespace {

using ::testing::HasSubstr;

const char* kWorld = R"({
  "registry": {"HKLM\\SOFTWARE\\Tolvek Software\\Quarn\\AddIns\\VisualStudio":
                 {"Debug": 0, "DebugOutputFile": "C:\\Logs\\Kpx.LOG"}},
  "folders": ["C:\\Logs"],
  "addins": [{"name": "VC++"},
             {"name": "VisualStudio",
              "eventHandler": {"members": {"OnGenerateCode": {"returns": 0, "setArgs": [{"nothing": true}]}}}}],
  "model": {"elements": [{"kind": "Class", "name": "CFoo"}]}
})";

TEST(SimValues, FileValuesBecomeVariantsAndLogInTheSameForm) {
  SimWorld w(kWorld);
  struct Case {
    const char* in;
    const char* out;  // as logged; empty when it is the input itself
  } cases[] = {
      {"null", ""},
      {"true", ""},
      {"12", ""},
      {"-2147483648", ""},
      {"1.5", "{\"r8\":1.5}"},
      {"\"text\"", ""},
      {"{\"string\":\"$app\"}", "\"$app\""},
      {"{\"i2\":-4}", ""},
      {"{\"i4\":7}", "7"},
      {"{\"r4\":0.1}", ""},  // shortest form of the float, not 0.10000000149011612
      {"{\"r8\":0.1}", ""},
      {"{\"date\":46341.5}", ""},
      {"{\"bool\":false}", "false"},
      {"{\"null\":true}", ""},
      {"{\"nothing\":true}", "{\"object\":null}"},
      {"\"$app\"", "{\"object\":\"$app\"}"},
      {"\"$model\"", "{\"object\":\"$model\"}"},
      {"{\"element\":\"CFoo\"}", "{\"object\":\"element:CFoo\"}"},
      {"{\"addin\":\"VisualStudio\"}", "{\"object\":\"addin:VisualStudio\"}"},
  };
  for (const Case& c : cases) {
    const InputJson in = InputJson::parse(c.in);
    const EventJson expected = EventJson::parse(*c.out ? c.out : c.in);
    EXPECT_EQ(expected, w.log().Value(w.world().ToVariant(in))) << c.in;
  }
  EXPECT_EQ(VarType::Integer, PlainValue(InputJson::parse("{\"i2\":1}"))->type());
  EXPECT_EQ(VarType::Single, PlainValue(InputJson::parse("{\"r4\":1}"))->type());
  EXPECT_EQ(VarType::Date, PlainValue(InputJson::parse("{\"date\":1}"))->type());
}

TEST(SimRun, ByReferenceArgumentsShowWhatTheAddInWroteBack) {
  SimWorld w(kWorld);
  w.Run(R"({"actions": [
    {"call": "OnActivate", "args": [{"byref": "$app"}]},
    {"call": "OnGenerateCode", "args": [{"byref": "$app"}]},
    {"call": "CanDropFileOnDiagram", "args": ["$app", {"byref": "C:\\x.txt"}]}
  ]})");
  const std::vector<EventJson> calls = w.Events("call");
  ASSERT_EQ(3u, calls.size());
  EXPECT_EQ((EventJson{{"byref", {{"object", "$app"}}}}), calls[0]["args"][0]);
  const std::vector<EventJson> results = w.Events("result");
  ASSERT_EQ(3u, results.size());
  EXPECT_EQ((EventJson{{"1", {{"object", "$app"}}}}), results[0]["byref"]);
  // The sibling's event handler hands back Nothing for the application; the
  // add-in passes that on to its own caller.
  EXPECT_EQ((EventJson{{"1", {{"object", nullptr}}}}), results[1]["byref"]);
  EXPECT_EQ((EventJson{{"2", "C:\\x.txt"}}), results[2]["byref"]);
  EXPECT_FALSE(w.Events("result")[0].contains("kind"));
}

TEST(SimRun, ResultsCountTheHostCallsOfTheirOwnMemberOnly) {
  SimWorld w(kWorld);
  w.Run(R"({"actions": [{"call": "OnActivate", "args": ["$app"]}, {"call": "Name"},
                        {"call": "QuarnApp", "kind": "method"}]})");
  const std::vector<EventJson> results = w.Events("result");
  ASSERT_EQ(3u, results.size());
  EXPECT_GT(results[0]["hostCalls"].get<uint64_t>(), 0u);
  EXPECT_EQ(0u, results[1]["hostCalls"].get<uint64_t>());
  EXPECT_EQ((EventJson{{"object", "$app"}}), results[2]["value"]);
  EXPECT_EQ("method", w.Events("call")[2]["kind"]);
}

TEST(SimRun, AFailedCreationLeavesNothingToCall) {
  SimWorld w(R"({"resourceComponent": {"registered": false}})");
  w.Run(R"({"actions": [{"call": "OnActivate", "args": ["$app"]}, {"release": true},
                        {"create": true}, {"call": "Name"}]})");
  const std::vector<EventJson>& events = w.log().events();
  std::vector<std::string> kinds;
  for (const EventJson& e : events) kinds.push_back(e["ev"]);
  EXPECT_EQ((std::vector<std::string>{"object-create", "create", "skip", "release", "object-create", "create", "skip"}),
            kinds);
  EXPECT_EQ(429, events[1]["error"]["number"]);
  EXPECT_EQ("no add-in object", events[3]["skipped"]);
}

TEST(SimRun, TheRunReleasesWhatTheScenarioLeftAliveAndReportsUnusedAnswers) {
  SimWorld w(kWorld);
  w.Run(R"({"actions": [{"answer": {"button": 6}}, {"call": "Name"}, {"select": []}]})");
  const std::vector<EventJson>& events = w.log().events();
  auto release = std::find_if(events.begin(), events.end(), [](const EventJson& e) { return e["ev"] == "release"; });
  ASSERT_NE(events.end(), release);
  EXPECT_TRUE((*release)["implicit"].get<bool>());
  // The add-in object's own release routine still ran after it.
  EXPECT_NE(events.end(),
            std::find_if(release, events.end(), [](const EventJson& e) { return e["ev"] == "doevents"; }));
  EXPECT_EQ((EventJson{{"ev", "unused-answers"}, {"buttons", {6}}}), events.back());
  EXPECT_EQ((EventJson{{"ev", "world"}, {"answer", {{"button", 6}}}}), events[2]);
  EXPECT_EQ(nullptr, w.sim().api());
}

TEST(SimRun, WorldActionsChangeRegistryFilesAndSelectionBetweenCalls) {
  SimWorld w(kWorld);
  w.Run(R"({"actions": [
    {"setRegistry": {"HKCU\\Software\\X": {"V": "1"}}},
    {"setFile": {"C:\\Logs\\a.txt": "abc", "C:\\new\\b.txt": ""}},
    {"setFile": {"C:\\Logs\\a.txt": null}},
    {"select": ["CFoo"]}
  ]})");
  const auto v = w.registry().QueryValue(platform::RootKey::CurrentUser, "Software\\X", "V");
  ASSERT_TRUE(v.has_value());
  EXPECT_EQ(std::string("1\0", 2), v->data);
  EXPECT_FALSE(w.files().Exists("C:\\Logs\\a.txt"));
  EXPECT_TRUE(w.files().Exists("C:\\new\\b.txt"));
  EXPECT_EQ(1u, w.world().SelectedItems().size());
  // Seeding the world is not the add-in's doing: nothing of it is recorded
  // but the actions themselves.
  EXPECT_TRUE(w.Events("registry-write").empty());
  EXPECT_EQ(4u, w.Events("world").size());
}

TEST(SimPlatform, AppendsToTheDebugLogAreToldApartWhateverTheCase) {
  SimWorld w(kWorld);
  platform::FileSystem& files = w.sim().platform().files;
  EXPECT_TRUE(files.AppendText("c:\\logs\\kpx.log", "first line\r\n"));
  EXPECT_TRUE(files.AppendText("C:\\Logs\\other.txt", "text\r\n"));
  EXPECT_FALSE(files.AppendText("C:\\Missing\\x.txt", "x"));
  EXPECT_TRUE(files.DeleteFile("C:\\Logs\\other.txt"));
  EXPECT_FALSE(files.Exists("C:\\Logs\\other.txt"));
  const std::vector<EventJson> debug = w.Events("debuglog");
  ASSERT_EQ(1u, debug.size());
  EXPECT_EQ("first line", debug[0]["line"]);
  const std::vector<EventJson> appends = w.Events("file-append");
  ASSERT_EQ(2u, appends.size());
  EXPECT_EQ("text\r\n", appends[0]["text"]);
  EXPECT_FALSE(appends[1]["ok"].get<bool>());
  EXPECT_TRUE(w.Events("file-delete").at(0)["ok"].get<bool>());
  EXPECT_FALSE(w.Events("file-exists").at(0)["exists"].get<bool>());
  // Finding the log's path read the registry unseen.
  EXPECT_TRUE(w.Events("registry-read").empty());
}

TEST(SimPlatform, RegistryEffectsAreRecordedWithTheirOutcome) {
  SimWorld w(kWorld);
  platform::Registry& reg = w.sim().platform().registry;
  EXPECT_FALSE(
      reg.SetValue(platform::RootKey::CurrentUser, "Software\\Nope", "V", {platform::kRegSz, std::string("x\0", 2)}));
  EXPECT_EQ(platform::KeyDisposition::Created, reg.CreateKey(platform::RootKey::CurrentUser, "Software\\Nope"));
  EXPECT_TRUE(reg.SetValue(platform::RootKey::CurrentUser, "Software\\Nope", "",
                           {platform::kRegDword, std::string("\xff\0\0\x80", 4)}));
  EXPECT_FALSE(reg.QueryValue(platform::RootKey::LocalMachine, "Software\\Nope", "").has_value());
  const std::vector<EventJson> writes = w.Events("registry-write");
  ASSERT_EQ(2u, writes.size());
  EXPECT_FALSE(writes[0]["written"].get<bool>());
  EXPECT_EQ(2147483903u, writes[1]["value"].get<uint32_t>());  // shown unsigned
  EXPECT_EQ("REG_DWORD", writes[1]["type"]);
  EXPECT_EQ("created", w.Events("registry-create").at(0)["disposition"]);
  const EventJson read = w.Events("registry-read").at(0);
  EXPECT_TRUE(read["value"].is_null());
  EXPECT_EQ("HKLM", read["root"]);
  EXPECT_EQ((EventJson{{"binary", "0102"}}), RegistryValueJson({platform::kRegBinary, "\x01\x02"}));
  EXPECT_EQ((EventJson{{"binary", "6162"}}), RegistryValueJson({platform::kRegSz, "ab"}));  // no NUL: raw bytes
}

TEST(SimClock, TimerStepsAfterEachReadAndRollsOverAtMidnight) {
  VirtualClock clock;
  ClockSetting s;
  s.date = platform::DateTime{2026, 12, 31};
  s.seconds = 86399.5;
  s.step = 0.25;
  clock.Set(s);
  EXPECT_FLOAT_EQ(86399.5f, clock.Timer());
  const platform::DateTime before = clock.Now();
  EXPECT_EQ(23, before.hour);
  EXPECT_EQ(59, before.second);
  EXPECT_EQ(31, before.day);
  EXPECT_FLOAT_EQ(86399.75f, clock.Timer());
  EXPECT_FLOAT_EQ(0.0f, clock.Timer());  // midnight: Timer starts again
  const platform::DateTime after = clock.Now();
  EXPECT_EQ(2027, after.year);
  EXPECT_EQ(1, after.month);
  EXPECT_EQ(1, after.day);
  clock.Sleep(1500);
  EXPECT_FLOAT_EQ(1.75f, clock.Timer());
}

TEST(SimTranscript, LinesReadAsTheEventsMean) {
  EXPECT_EQ("Empty", ShortValue(nullptr));
  EXPECT_EQ("Nothing", ShortValue({{"object", nullptr}}));
  EXPECT_EQ("$app", ShortValue({{"object", "$app"}}));
  EXPECT_EQ("byref \"C:\\x\"", ShortValue({{"byref", "C:\\x"}}));
  EXPECT_EQ("{\"i2\":4}", ShortValue({{"i2", 4}}));
  EXPECT_THAT(TranscriptLine({{"ev", "error"},
                              {"member", "OnUser1"},
                              {"number", -2147467263},
                              {"description", "not there"},
                              {"hostCalls", 1}}),
              HasSubstr("OnUser1 raised 0x80004001 not there   [1 host call]"));
  EXPECT_THAT(TranscriptLine({{"ev", "registry-read"},
                              {"root", "HKCU"},
                              {"key", "K"},
                              {"name", ""},
                              {"type", nullptr},
                              {"value", nullptr}}),
              HasSubstr("HKCU\\K  @ = (missing)"));
  const std::string text = Transcript({{{"ev", "call"}, {"member", "Name"}, {"args", EventJson::array()}},
                                       {{"ev", "result"}, {"member", "Name"}, {"value", "VC++"}, {"hostCalls", 3}},
                                       {{"ev", "debuglog"}, {"line", "a line"}, {"ok", true}}},
                                      "title");
  EXPECT_THAT(text, HasSubstr("host calls       Name 3"));
  EXPECT_THAT(text, HasSubstr("debug log        1 line written\n    a line\n"));
}

}  // namespace
}  // namespace kpx::sim::test
