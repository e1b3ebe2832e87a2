// Whole runs of the simulated host: values in and out, the add-in object's
// life, the virtual clock, the recorded platform and the transcript.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <climits>
#include <cstdint>
#include <filesystem>
#include <fstream>
#include <sstream>

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

TEST(SimRun, WorldStepsThatFailAreLoggedWithTheirLineAndTheRunGoesOn) {
  SimWorld w(kWorld);
  // Made outside the scenario, as the add-in makes its files: a file where
  // a step needs a folder, and a folder where a step deletes a file.
  std::ofstream(w.files().HostPath("C:\\Logs\\made.log")) << "x";
  std::filesystem::create_directories(w.files().HostPath("C:\\Logs\\Sub"));
  w.Run("{\"actions\": [\n"
        " {\"setFile\": {\"C:\\\\Logs\\\\made.log\\\\inside.txt\": \"x\", \"C:\\\\Logs\\\\ok.txt\": \"y\"}},\n"
        " {\"setFile\": {\"C:\\\\LOGS\\\\sub\": null}},\n"
        " {\"select\": [\"CFoo\"]}\n"
        "]}");
  const std::vector<EventJson> failed = w.Events("world-failed");
  ASSERT_EQ(2u, failed.size());
  EXPECT_EQ(2, failed[0]["line"]);
  EXPECT_EQ("setFile", failed[0]["action"]);
  EXPECT_THAT(failed[0]["reason"].get<std::string>(), HasSubstr("a file lies where a folder must be"));
  EXPECT_EQ(3, failed[1]["line"]);
  EXPECT_THAT(failed[1]["reason"].get<std::string>(), HasSubstr("it is a folder"));
  // The other file of the step was written, the folder kept, and the run went on.
  EXPECT_TRUE(w.files().Exists("C:\\Logs\\ok.txt"));
  EXPECT_TRUE(w.files().Exists("C:\\Logs\\Sub"));
  EXPECT_EQ(3u, w.Events("world").size());
  EXPECT_EQ(1u, w.world().SelectedItems().size());
}

// Takes the events as they happen; can be made to break after some.
class TestSink final : public EventSink {
 public:
  explicit TestSink(size_t breakAfter = SIZE_MAX) : breakAfter_(breakAfter) {}
  void Write(const EventJson& event) override { kinds.push_back(event.value("ev", "")); }
  void Flush() override { flushedAt.push_back(kinds.size()); }
  bool broken() const override { return kinds.size() >= breakAfter_; }
  std::vector<std::string> kinds;
  std::vector<size_t> flushedAt;

 private:
  size_t breakAfter_;
};

TEST(SimRun, AStreamedLogKeepsNothingFlushesEachStepAndStopsWhenItsSinkBreaks) {
  const char* scenario = R"({"actions": [{"call": "Name"}, {"select": []}, {"call": "Name"}, {"call": "Name"}]})";
  TestSink sink;  // outlives the world, which may log as it goes
  SimWorld streamed(kWorld);
  streamed.log().StreamTo(&sink);
  streamed.Run(scenario);
  EXPECT_TRUE(streamed.log().events().empty());
  EXPECT_EQ(3, std::count(sink.kinds.begin(), sink.kinds.end(), "call"));
  EXPECT_EQ(1, std::count(sink.kinds.begin(), sink.kinds.end(), "release"));
  // After the creation and after each of the four steps.
  EXPECT_EQ(5u, sink.flushedAt.size());
  EXPECT_TRUE(std::is_sorted(sink.flushedAt.begin(), sink.flushedAt.end()));

  SimWorld kept(kWorld);
  kept.Run(scenario);
  EXPECT_EQ(sink.kinds.size(), kept.log().events().size());

  TestSink breaking(4);
  SimWorld broken(kWorld);
  broken.log().StreamTo(&breaking);
  EXPECT_THROW(broken.Run(scenario), std::runtime_error);
  EXPECT_LT(std::count(breaking.kinds.begin(), breaking.kinds.end(), "call"), 3);
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

TEST(SimClock, LongStepsMoveWholeDaysAndTheClockStopsAtTheLastDayADateHolds) {
  VirtualClock clock;
  ClockSetting s;
  s.date = platform::DateTime{2026, 2, 27};
  s.seconds = 43200;
  s.step = 86400;
  clock.Set(s);
  clock.Timer();
  clock.Timer();
  EXPECT_EQ(3, clock.Now().month);
  EXPECT_EQ(1, clock.Now().day);
  EXPECT_EQ(12, clock.Now().hour);
  clock.Sleep(4294967295u);  // 49 days, 17:02:47.295
  EXPECT_EQ(4, clock.Now().month);
  EXPECT_EQ(20, clock.Now().day);
  EXPECT_EQ(5, clock.Now().hour);
  EXPECT_NEAR(5 * 3600 + 2 * 60 + 47.295, clock.seconds(), 1e-6);

  s.date = platform::DateTime{9999, 12, 30};
  clock.Set(s);
  for (int i = 0; i < 5; ++i) clock.Timer();
  const platform::DateTime last = clock.Now();
  EXPECT_EQ(9999, last.year);
  EXPECT_EQ(31, last.day);
  EXPECT_EQ(23, last.hour);
  EXPECT_EQ(59, last.second);
}

TEST(SimTranscript, WrittenAsTheEventsComeItEqualsTheWholeAndKeepsEveryDebugLine) {
  std::vector<EventJson> events = {{{"ev", "call"}, {"member", "OnActivate"}, {"args", EventJson::array()}},
                                   {{"ev", "addin"}, {"addin", "VC++"}, {"action", "Activate"}}};
  for (int i = 0; i < 3000; ++i) events.push_back({{"ev", "debuglog"}, {"line", "line " + std::to_string(i)}, {"ok", true}});
  events.push_back({{"ev", "world-failed"}, {"action", "setFile"}, {"line", 7}, {"reason", "no room"}});
  events.push_back({{"ev", "aborted"}, {"reason", "disk full"}});
  std::ostringstream streamed;
  TranscriptWriter writer(streamed, "title");
  for (const EventJson& e : events) writer.Write(e);
  writer.Finish();
  const std::string whole = Transcript(events, "title");
  EXPECT_EQ(whole, streamed.str());
  EXPECT_THAT(whole, HasSubstr("add-ins          VC++.Activate\n"));
  EXPECT_THAT(whole, HasSubstr("3000 lines written\n    line 0\n    line 1\n"));
  EXPECT_THAT(whole, HasSubstr("    line 2999\n"));
  EXPECT_THAT(whole, HasSubstr("setFile of line 7 FAILED: no room"));
  EXPECT_THAT(whole, HasSubstr("ABORTED   the run stopped here: disk full"));

  SpillList texts;
  for (int i = 0; i < 100; ++i) texts.Add(std::string(static_cast<size_t>(i), static_cast<char>('a' + i % 26)));
  std::vector<std::string> back;
  texts.ForEach([&](const std::string& t) { back.push_back(t); });
  texts.ForEach([&](const std::string& t) { back.push_back(t); });  // again: nothing is used up
  ASSERT_EQ(200u, back.size());
  EXPECT_EQ("", back[0]);
  EXPECT_EQ(std::string(99, 'a' + 99 % 26), back[99]);
  EXPECT_EQ(back[42], back[142]);
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
