// The simulated host's side of restoring sources: file details and faults
// from the model, the recorded file calls, the model's programs, the played
// Restore and module dependency dialogs, and the module dependency's host
// members.
#include <gtest/gtest.h>

#include <sys/stat.h>

#include "automation/automation_error.h"
#include "shared/host_ids.h"
#include "sim/host_objects.h"
#include "test_sim_support.h"

namespace kpx::sim::test {
namespace {

namespace id = kpx::hostid;
using platform::FileTimes;

// "YYYY-MM-DD HH:MM:SS" of a file time, as the log writes them.
std::string Text(platform::FileTime t) { return FileTimeText(t); }

FileTimes TimesOf(platform::FileSystem& files, const std::string& path) {
  const platform::FileHandle h = files.OpenForTimes(path);
  EXPECT_NE(h, platform::kNoFile) << path;
  FileTimes t;
  EXPECT_TRUE(files.GetFileTimes(h, t));
  files.CloseFile(h);
  return t;
}

// Plays scenario steps that only change the world (answers, files).
void Apply(SimWorld& w, const std::string& actions) {
  const JsonSource source("s.json", R"({"actions": )" + actions + "}");
  for (const Action& a : LoadScenario(source, w.model()).actions) w.sim().Apply(a);
}

// ------------------------------------------------------------- the model

TEST(SimRestoreModel, FilesTakeTextReadOnlyAndTimesAndPlainFilesTheClocksStart) {
  SimWorld w(R"({
    "clock": {"date": "2026-11-20", "time": "08:30:00"},
    "files": {
      "C:\\src\\a.cpp": "plain",
      "C:\\src\\b.cpp": {"text": "kept", "readOnly": true,
                         "times": {"creation": "2026-11-01 09:00:00", "lastWrite": "2026-11-02 10:11:12"}},
      "C:\\src\\empty.cpp": {}
    }})");
  posix::SandboxFileSystem& files = w.files();
  const FileTimes a = TimesOf(files, "C:\\src\\a.cpp");
  EXPECT_EQ(Text(a.creation), "2026-11-20 08:30:00");
  EXPECT_EQ(Text(a.lastAccess), "2026-11-20 08:30:00");
  EXPECT_EQ(Text(a.lastWrite), "2026-11-20 08:30:00");
  EXPECT_EQ(files.GetAttributes("C:\\src\\a.cpp"), platform::kAttributeArchive);

  EXPECT_EQ(files.GetAttributes("C:\\src\\b.cpp"), platform::kAttributeReadOnly | platform::kAttributeArchive);
  ASSERT_TRUE(files.SetAttributes("C:\\src\\b.cpp", platform::kAttributeArchive));
  const FileTimes b = TimesOf(files, "C:\\src\\b.cpp");
  EXPECT_EQ(Text(b.creation), "2026-11-01 09:00:00");
  EXPECT_EQ(Text(b.lastAccess), "2026-11-20 08:30:00");  // not given: the clock's start
  EXPECT_EQ(Text(b.lastWrite), "2026-11-02 10:11:12");
  // The simulated machine's local time is UTC.
  const auto date = files.FileDateTime("C:\\src\\b.cpp");
  ASSERT_TRUE(date);
  EXPECT_EQ(date->day, 2);
  EXPECT_EQ(date->hour, 10);
  EXPECT_EQ(date->second, 12);
  // Read last: reading sets a file's access time.
  EXPECT_EQ(files.ReadText("C:\\src\\b.cpp"), "kept");
  EXPECT_EQ(files.ReadText("C:\\src\\empty.cpp"), "");

  // A read-only file is replaced whole by a setFile step, and stamped with
  // the clock's time then.
  ASSERT_TRUE(files.SetAttributes("C:\\src\\b.cpp", platform::kAttributeReadOnly));
  Apply(w, R"([{"clock": {"time": "09:00:00"}}, {"setFile": {"C:\\src\\b.cpp": "new"}}])");
  EXPECT_TRUE(w.Events("world-failed").empty());
  EXPECT_EQ(files.ReadText("C:\\src\\b.cpp"), "new");
  EXPECT_EQ(Text(TimesOf(files, "C:\\src\\b.cpp").lastWrite), "2026-11-20 09:00:00");
}

TEST(SimRestoreModel, BadFileDetailsProcessesAndFileFaultsAreInputErrorsAtTheirLine) {
  std::string message;
  EXPECT_EQ(FaultLine([] { ParseModel("{\"files\": {\n\"C:\\\\a\": {\"txt\": \"x\"}}}"); }, &message), 2);
  EXPECT_EQ(FaultLine([] { ParseModel("{\"files\": {\"C:\\\\a\": {\"times\":\n{\"created\": \"x\"}}}}"); }), 2);
  EXPECT_EQ(FaultLine([] {
              ParseModel("{\"files\": {\"C:\\\\a\": {\"times\": {\n\"creation\": \"2026-11-01T09:00:00\"}}}}");
            },
                      &message),
            2);
  EXPECT_NE(message.find("YYYY-MM-DD HH:MM:SS"), std::string::npos);
  EXPECT_EQ(FaultLine([] {
              ParseModel("{\"files\": {\"C:\\\\a\": {\"times\": {\n\"creation\": \"2026-02-30 09:00:00\"}}}}");
            }),
            2);
  EXPECT_EQ(FaultLine([] { ParseModel("{\"files\": {\"C:\\\\a\": {\n\"readOnly\": \"yes\"}}}"); }), 2);

  EXPECT_EQ(FaultLine([] { ParseModel("{\"processes\": {\n\"C:\\\\t.exe\": {\"exit\": 0}}}"); }, &message), 2);
  EXPECT_EQ(FaultLine([] { ParseModel("{\"processes\": {\n\"C:\\\\t.exe\": {\"exitCode\": 0, \"timeout\": true}}}"); },
                      &message),
            2);
  EXPECT_NE(message.find("exactly one"), std::string::npos);
  EXPECT_EQ(FaultLine([] { ParseModel("{\"processes\": {\"C:\\\\t.exe\": {\"start\":\n{\"error\": 0}}}}"); }), 2);
  EXPECT_EQ(FaultLine([] { ParseModel("{\"processes\": {\"C:\\\\t.exe\": {\n\"timeout\": false}}}"); }), 2);
  EXPECT_EQ(FaultLine([] { ParseModel("{\"processes\": {\"C:\\\\t.exe\": {\"exitCode\": 1},\n\"c:\\\\T.EXE\": {\"exitCode\": 2}}}"); },
                      &message),
            2);
  EXPECT_EQ(FaultLine([] { ParseModel("{\"processes\": {\n\"C:\\\\a?.exe\": {\"exitCode\": 1}}}"); }), 2);

  EXPECT_EQ(FaultLine([] { ParseModel("{\"faults\": {\"files\": {\"C:\\\\a\": {\n\"delete\": {\"number\": 70}}}}}"); }),
            2);
  EXPECT_EQ(FaultLine([] { ParseModel("{\"faults\": {\"files\": {\"C:\\\\a\": {\"remove\":\n{\"number\": 0}}}}}"); }),
            2);
  EXPECT_EQ(FaultLine([] { ParseModel("{\"faults\": {\"files\": {\"C:\\\\a\":\n{}}}}"); }), 2);

  const ModelDef ok = ParseModel(R"({"processes": {"C:\\t.exe": {"exitCode": -1073741819},
    "C:\\u.exe": {"start": {"error": 5}}, "C:\\v.exe": {"timeout": true}, "C:\\w.exe": {"waitFails": {"error": 6}}}})");
  EXPECT_EQ(ok.processes.at("c:\\T.exe").exitCode, 0xC0000005u);
  EXPECT_EQ(ok.processes.at("C:\\u.exe").kind, ProcessDef::Kind::StartFails);
  EXPECT_EQ(ok.processes.at("C:\\w.exe").error, 6u);
}

TEST(SimRestoreModel, TheVirtualClocksFileTimeIsItsDateAndTimeAsUtc) {
  VirtualClock clock;
  EXPECT_EQ(Text(*clock.SystemFileTime()), "2026-11-15 03:07:12.5000000");
  ClockSetting s;
  s.date = platform::DateTime{2027, 1, 1};
  s.seconds = 0;
  clock.Set(s);
  EXPECT_EQ(*clock.SystemFileTime(), (1798761600ull + 11644473600ull) * 10000000ull);
  clock.Sleep(86400 * 1000u);  // a day later
  EXPECT_EQ(Text(*clock.SystemFileTime()), "2027-01-02 00:00:00");
}

// ------------------------------------------------------------ file calls

const char* kFiles = R"({
  "clock": {"date": "2026-11-20", "time": "08:30:00"},
  "files": {
    "C:\\src\\a.cpp": "source",
    "C:\\src\\a.cpp.bak": {"text": "backup", "times": {"creation": "2026-11-01 09:00:00"}},
    "C:\\src\\ro.cpp": {"text": "ro", "readOnly": true},
    "C:\\src\\stuck.cpp": "stuck",
    "C:\\src\\list.lst": "C:\\src\\a.cpp|C:\\src\\a.cpp.bak\r\n"
  },
  "faults": {"files": {"c:\\SRC\\stuck.cpp": {"remove": {"number": 75}, "move": {"number": 70, "description": "no"},
                                               "replace": {"number": 70}, "times": {"number": 53}}}}
})";

TEST(SimRestoreFiles, EveryCallIsRecordedWithItsOutcome) {
  SimWorld w(kFiles);
  platform::FileSystem& files = w.sim().platform().files;
  EXPECT_EQ(files.GetAttributes("C:\\src\\ro.cpp"), platform::kAttributeReadOnly | platform::kAttributeArchive);
  EXPECT_FALSE(files.RemoveFile("C:\\src\\ro.cpp"));
  EXPECT_EQ(files.LastError().number, 70);
  EXPECT_TRUE(files.RemoveFile("C:\\src\\a.cpp"));
  EXPECT_TRUE(files.MoveFile("C:\\src\\a.cpp.bak", "C:\\src\\a.cpp"));
  const platform::FileHandle h = files.OpenForTimes("C:\\src\\a.cpp");
  FileTimes t;
  ASSERT_TRUE(files.GetFileTimes(h, t));
  const platform::FileTime now = *w.sim().platform().clock.SystemFileTime();
  ASSERT_TRUE(files.SetFileTimes(h, {t.creation, now, now}));
  files.CloseFile(h);
  EXPECT_TRUE(files.ReplaceText("C:\\src\\list.lst", ""));
  EXPECT_EQ(files.FileDateTime("C:\\src\\a.cpp")->hour, 8);

  using J = EventJson;
  const auto attrs = w.Events("file-attributes");
  ASSERT_EQ(attrs.size(), 1u);
  EXPECT_EQ(attrs[0]["attributes"], 0x21);
  const auto removes = w.Events("file-remove");
  ASSERT_EQ(removes.size(), 2u);
  EXPECT_EQ(removes[0], (J{{"ev", "file-remove"},
                           {"path", "C:\\src\\ro.cpp"},
                           {"ok", false},
                           {"error", {{"number", 70}, {"description", "Permission denied"}}}}));
  EXPECT_EQ(removes[1]["ok"], true);
  EXPECT_EQ(w.Events("file-move").at(0),
            (J{{"ev", "file-move"}, {"from", "C:\\src\\a.cpp.bak"}, {"to", "C:\\src\\a.cpp"}, {"ok", true}}));
  const auto times = w.Events("file-times");
  ASSERT_EQ(times.size(), 4u);
  EXPECT_EQ(times[0]["call"], "open");
  EXPECT_EQ(times[1]["times"], (J{{"creation", "2026-11-01 09:00:00"},
                                  {"lastAccess", "2026-11-20 08:30:00"},
                                  {"lastWrite", "2026-11-20 08:30:00"}}));
  EXPECT_EQ(times[2]["call"], "set");
  EXPECT_EQ(times[2]["path"], "C:\\src\\a.cpp");
  EXPECT_EQ(times[3], (J{{"ev", "file-times"}, {"call", "close"}, {"path", "C:\\src\\a.cpp"}}));
  EXPECT_EQ(w.Events("file-replace").at(0),
            (J{{"ev", "file-replace"}, {"path", "C:\\src\\list.lst"}, {"text", ""}, {"ok", true}}));
  EXPECT_EQ(w.Events("file-date").at(0)["date"], "2026-11-20 08:30:00");
}

TEST(SimRestoreFiles, AFileFaultFailsTheCallWithoutTouchingTheFile) {
  SimWorld w(kFiles);
  platform::FileSystem& files = w.sim().platform().files;
  EXPECT_FALSE(files.RemoveFile("C:\\src\\STUCK.cpp"));
  EXPECT_EQ(files.LastError().number, 75);
  EXPECT_EQ(files.LastError().description, "Path/File access error");
  EXPECT_FALSE(files.MoveFile("C:\\src\\stuck.cpp", "C:\\src\\moved.cpp"));
  EXPECT_EQ(files.LastError().description, "no");
  EXPECT_FALSE(files.ReplaceText("C:\\src\\stuck.cpp", "x"));
  EXPECT_EQ(files.LastError().number, 70);
  EXPECT_EQ(files.OpenForTimes("C:\\src\\stuck.cpp"), platform::kNoFile);
  EXPECT_EQ(files.LastError().number, 53);
  EXPECT_EQ(w.files().ReadText("C:\\src\\stuck.cpp"), "stuck");
  EXPECT_FALSE(w.files().Exists("C:\\src\\moved.cpp"));
  // A fault's error lasts only until the next call.
  EXPECT_FALSE(files.RemoveFile("C:\\src\\none.cpp"));
  EXPECT_EQ(files.LastError().number, 53);

  for (const char* kind : {"file-remove", "file-move", "file-replace", "file-times"}) {
    const auto events = w.Events(kind);
    ASSERT_FALSE(events.empty()) << kind;
    EXPECT_EQ(events[0]["fault"], true) << kind;
    EXPECT_EQ(events[0]["ok"], false) << kind;
  }
  EXPECT_FALSE(w.Events("file-remove")[1].contains("fault"));
}

// ------------------------------------------------------------- processes

TEST(SimRestoreProcesses, ProgramsAnswerFromTheModelAndEachStartIsRecordedOnce) {
  SimWorld w(R"({"processes": {
    "C:\\Tools\\dd.exe": {"exitCode": 3},
    "C:\\Tools\\ok.exe": {"exitCode": 0},
    "C:\\Tools\\denied.exe": {"start": {"error": 5}},
    "C:\\Tools\\slow.exe": {"timeout": true},
    "C:\\Tools\\odd.exe": {"waitFails": {"error": 87}}}})");
  platform::Processes& p = w.sim().platform().processes;
  platform::ProcessRecord r;
  uint32_t code = 0;

  ASSERT_TRUE(p.CreateProcess("c:\\tools\\DD.exe", "-a x y", r));
  EXPECT_EQ(p.WaitForInputIdle(r.process, platform::kInfinite), 0u);
  EXPECT_TRUE(p.CloseHandle(r.thread));
  EXPECT_EQ(p.WaitForSingleObject(r.process, 0x7FFFFFFF), platform::kWaitObject0);
  ASSERT_TRUE(p.GetExitCodeProcess(r.process, code));
  EXPECT_EQ(code, 3u);
  EXPECT_TRUE(p.CloseHandle(r.process));
  EXPECT_FALSE(p.CloseHandle(r.process));
  EXPECT_EQ(p.LastError(), 6u);
  EXPECT_EQ(p.WaitForSingleObject(r.process, 0), platform::kWaitFailed);

  // Without an application name, the command line's first word.
  ASSERT_TRUE(p.CreateProcess("", "\"C:\\Tools\\ok.exe\" a b", r));
  EXPECT_EQ(p.WaitForSingleObject(r.process, 10), platform::kWaitObject0);
  ASSERT_TRUE(p.GetExitCodeProcess(r.process, code));
  EXPECT_EQ(code, 0u);

  EXPECT_FALSE(p.CreateProcess("C:\\Tools\\denied.exe", "", r));
  EXPECT_EQ(p.LastError(), 5u);
  EXPECT_FALSE(p.CreateProcess("C:\\Tools\\missing.exe", "m", r));
  EXPECT_EQ(p.LastError(), 2u);

  ASSERT_TRUE(p.CreateProcess("C:\\Tools\\slow.exe", "", r));
  EXPECT_EQ(p.WaitForSingleObject(r.process, 5000), platform::kWaitTimeout);
  ASSERT_TRUE(p.GetExitCodeProcess(r.process, code));
  EXPECT_EQ(code, SimProcesses::kStillActive);

  ASSERT_TRUE(p.CreateProcess("C:\\Tools\\odd.exe", "", r));
  EXPECT_EQ(p.WaitForSingleObject(r.process, 5000), platform::kWaitFailed);
  EXPECT_EQ(p.LastError(), 87u);

  ASSERT_TRUE(p.CreateProcess("C:\\Tools\\ok.exe", "never waited", r));
  EXPECT_TRUE(p.CloseHandle(r.process));

  using J = EventJson;
  const auto events = w.Events("process");
  ASSERT_EQ(events.size(), 7u);
  EXPECT_EQ(events[0], (J{{"ev", "process"},
                          {"application", "c:\\tools\\DD.exe"},
                          {"commandLine", "-a x y"},
                          {"started", true},
                          {"timeout", 0x7FFFFFFF},
                          {"outcome", "exited"},
                          {"exitCode", 3}}));
  EXPECT_EQ(events[1]["exitCode"], 0);
  EXPECT_EQ(events[2], (J{{"ev", "process"},
                          {"application", "C:\\Tools\\denied.exe"},
                          {"commandLine", ""},
                          {"started", false},
                          {"error", 5}}));
  EXPECT_EQ(events[3]["error"], 2);
  EXPECT_EQ(events[4]["outcome"], "timeout");
  EXPECT_EQ(events[5]["outcome"], "wait-failed");
  EXPECT_EQ(events[5]["error"], 87);
  EXPECT_EQ(events[6]["waited"], false);
}

// ----------------------------------------------------------- the dialogs

// A Restore dialog's state and rules kept simple: a project's tick ticks
// its files, OK follows the ticks, a file click offers "WinDiff", a project
// click asks for the timer.
class FakeRestoreForm final : public platform::RestoreForm {
 public:
  FakeRestoreForm() {
    texts_.caption = "Restore Source";
    texts_.ok = "OK";
    texts_.cancel = "Cancel";
    texts_.help = "Help";
    texts_.columns[0] = "Project";
    texts_.columns[1] = "File";
    texts_.columns[2] = "Folder";
    Add(true, "C:\\p\\x.dsp|Shapes|C:\\p\\Backup\\Shapes.lst", {"Shapes", "", ""});
    Add(false, "C:\\p\\x.dsp|Shapes|C:\\p\\Circle.cpp|C:\\p\\Backup\\Circle.cpp", {"", "Circle.cpp", "C:\\p"});
    Add(false, "C:\\p\\x.dsp|Shapes|C:\\p\\Disc.cpp|C:\\p\\Backup\\Disc.cpp", {"", "Disc.cpp", "C:\\p"});
  }
  const Texts& texts() const override { return texts_; }
  const std::vector<platform::RestoreRow>& rows() const override { return rows_; }
  int32_t selectedRow() const override { return selected_; }
  const std::string& headerTitle() const override { return title_; }
  const std::string& headerSubtitle() const override { return subtitle_; }
  bool okEnabled() const override {
    for (const auto& r : rows_)
      if (r.check == 1 || r.check == 3) return true;
    return false;
  }
  platform::ControlRect DesignRect(platform::RestoreControl) const override { return {}; }
  double designWidth() const override { return 0; }
  double designHeight() const override { return 0; }
  double minimumWidth() const override { return 0; }
  double minimumHeight() const override { return 0; }
  void Resize(double, double, platform::ControlRect (&)[size_t(platform::RestoreControl::Count)]) override {}
  void Select(int32_t row) override {
    calls.push_back("select " + std::to_string(row));
    selected_ = row;
    title_ = rows_[size_t(row)].project ? "Project" : "Files";
  }
  void SetCheck(int32_t row, bool ticked) override {
    rows_[size_t(row)].check = ticked ? 1 : 0;
    if (rows_[size_t(row)].project)
      for (size_t i = size_t(row) + 1; i < rows_.size() && !rows_[i].project; ++i) rows_[i].check = ticked ? 1 : 0;
  }
  std::string Click(int32_t row, bool& startTimer) override {
    startTimer = rows_[size_t(row)].project;
    return rows_[size_t(row)].project ? "" : "WinDiff";
  }
  void Compare(int32_t row) override { calls.push_back("compare " + std::to_string(row)); }
  void Timer() override { calls.push_back("timer"); }
  void Help(int64_t window) override { calls.push_back("help " + std::to_string(window)); }
  void Ok() override { calls.push_back("ok"); }
  void Cancel() override {
    calls.push_back("cancel");
    rows_.clear();
  }
  std::vector<std::string> calls;

 private:
  void Add(bool project, std::string key, std::initializer_list<std::string> cells) {
    platform::RestoreRow r;
    r.project = project;
    r.key = std::move(key);
    size_t i = 0;
    for (const std::string& c : cells) r.cells[i++] = c;
    if (!project) r.modified = "11/1/2026 9:00:00 AM";
    rows_.push_back(std::move(r));
  }
  Texts texts_;
  std::vector<platform::RestoreRow> rows_;
  int32_t selected_ = -1;
  std::string title_ = "Backups", subtitle_;
};

const platform::HostPlacement kPlacement{4242, 10, 20, 600, 800};

TEST(SimRestoreDialog, PlaysTheQueuedStepsAndRecordsWhatEachChanged) {
  SimWorld w("{}");
  Apply(w, R"([{"answer": {"restore": [{"tick": "shapes"}, {"untick": "C:\\P\\Disc.cpp"}, {"select": "Shapes"},
    {"click": "C:\\p\\Circle.cpp"}, {"compare": true}, {"click": "Shapes"}, {"timer": true}, {"help": true},
    "ok"]}}])");
  FakeRestoreForm form;
  w.sim().platform().ui.ShowRestoreDialog(form, kPlacement);
  // A click selects its row first, as a real click does.
  EXPECT_EQ(form.calls, (std::vector<std::string>{"select 0", "select 1", "compare 1", "select 0", "timer",
                                                  "help 4444", "ok"}));
  const auto events = w.Events("restore-dialog");
  ASSERT_EQ(events.size(), 1u);
  const EventJson& e = events[0];
  EXPECT_EQ(e["owner"], 4242);
  EXPECT_EQ(e["host"], (EventJson{{"top", 10}, {"left", 20}, {"height", 600}, {"width", 800}}));
  EXPECT_EQ(e["caption"], "Restore Source");
  EXPECT_EQ(e["title"], "Backups");
  ASSERT_EQ(e["rows"].size(), 3u);
  EXPECT_EQ(e["rows"][1], (EventJson{{"kind", "file"},
                                     {"cells", {"", "Circle.cpp", "C:\\p"}},
                                     {"check", 0},
                                     {"modified", "11/1/2026 9:00:00 AM"}}));
  EXPECT_EQ(e["okEnabled"], false);
  const EventJson& steps = e["steps"];
  ASSERT_EQ(steps.size(), 9u);
  EXPECT_EQ(steps[0], (EventJson{{"step", "tick"},
                                 {"row", "shapes"},
                                 {"checks", {{"Shapes", 1}, {"C:\\p\\Circle.cpp", 1}, {"C:\\p\\Disc.cpp", 1}}},
                                 {"okEnabled", true}}));
  EXPECT_EQ(steps[1]["checks"], (EventJson{{"C:\\p\\Disc.cpp", 0}}));
  EXPECT_FALSE(steps[1].contains("okEnabled"));
  EXPECT_EQ(steps[2]["selected"], "Shapes");
  EXPECT_EQ(steps[2]["title"], "Project");
  EXPECT_EQ(steps[3], (EventJson{{"step", "click"},
                                 {"row", "C:\\p\\Circle.cpp"},
                                 {"selected", "C:\\p\\Circle.cpp"},
                                 {"title", "Files"},
                                 {"menu", "WinDiff"}}));
  EXPECT_EQ(steps[5], (EventJson{{"step", "click"},
                                 {"row", "Shapes"},
                                 {"selected", "Shapes"},
                                 {"title", "Project"},
                                 {"timerStarted", true}}));
  EXPECT_EQ(steps[8]["step"], "ok");
  EXPECT_EQ(e["pressed"], "ok");
  EXPECT_EQ(e["answered"], "scenario");
  EXPECT_TRUE(w.Events("world-failed").empty());
}

TEST(SimRestoreDialog, TheRowAlreadySelectedIsNotSelectedAgain) {
  SimWorld w("{}");
  Apply(w, R"([{"answer": {"restore": [{"select": "Shapes"}, {"click": "Shapes"}, {"select": "Shapes"}, "cancel"]}}])");
  FakeRestoreForm form;
  w.sim().platform().ui.ShowRestoreDialog(form, kPlacement);
  EXPECT_EQ(form.calls, (std::vector<std::string>{"select 0", "cancel"}));
  const EventJson steps = w.Events("restore-dialog").at(0)["steps"];
  EXPECT_FALSE(steps[1].contains("selected"));
  EXPECT_FALSE(steps[2].contains("selected"));
}

TEST(SimRestoreDialog, AStepTheDialogCannotTakeEndsThePlayWithCancel) {
  struct Case {
    const char* steps;
    const char* reason;
  };
  for (const Case& c : {Case{R"([{"tick": "C:\\p\\Nothing.cpp"}, "ok"])", "shows no row"},
                        Case{R"(["ok"])", "OK is disabled"},
                        Case{R"([{"compare": true}, "ok"])", "no context menu"},
                        Case{R"([{"click": "C:\\p\\Circle.cpp"}, {"select": "Shapes"}, {"compare": true}, "ok"])",
                             "no context menu"},
                        Case{R"([{"click": "C:\\p\\Circle.cpp"}, {"timer": true}, "ok"])", "no timer"}}) {
    SCOPED_TRACE(c.steps);
    SimWorld w("{}");
    Apply(w, std::string(R"([{"answer": {"restore": )") + c.steps + "}}]");
    FakeRestoreForm form;
    w.sim().platform().ui.ShowRestoreDialog(form, kPlacement);
    ASSERT_FALSE(form.calls.empty());
    EXPECT_EQ(form.calls.back(), "cancel");
    EXPECT_EQ(std::count(form.calls.begin(), form.calls.end(), "ok"), 0);
    const auto dialog = w.Events("restore-dialog");
    ASSERT_EQ(dialog.size(), 1u);
    EXPECT_EQ(dialog[0]["pressed"], "cancel");
    EXPECT_EQ(dialog[0]["steps"].back()["failed"], true);
    const auto failed = w.Events("world-failed");
    ASSERT_EQ(failed.size(), 1u);
    EXPECT_EQ(failed[0]["line"], 1);
    EXPECT_NE(failed[0]["reason"].get<std::string>().find(c.reason), std::string::npos)
        << failed[0]["reason"].get<std::string>();
  }

  // No answer: Cancel, and nothing else happens.
  SimWorld w("{}");
  FakeRestoreForm form;
  w.sim().platform().ui.ShowRestoreDialog(form, kPlacement);
  EXPECT_EQ(form.calls, std::vector<std::string>{"cancel"});
  EXPECT_EQ(w.Events("restore-dialog").at(0)["answered"], "default");
  EXPECT_TRUE(w.Events("world-failed").empty());
}

TEST(SimRestoreDialog, BadStepsAreInputErrors) {
  const ModelDef model = ParseModel("{}");
  auto load = [&](const std::string& answer) {
    return FaultLine([&] { LoadScenario(JsonSource("s.json", "{\"actions\": [\n" + answer + "]}"), model); });
  };
  EXPECT_EQ(load(R"({"answer": {"restore": []}})"), 2);
  EXPECT_EQ(load(R"({"answer": {"restore": [{"tick": "x"}]}})"), 2);
  EXPECT_EQ(load(R"({"answer": {"restore": ["ok", "cancel"]}})"), 2);
  EXPECT_EQ(load(R"({"answer": {"restore": [{"poke": "x"}, "ok"]}})"), 2);
  EXPECT_EQ(load(R"({"answer": {"restore": [{"tick": "x", "select": "x"}, "ok"]}})"), 2);
  EXPECT_EQ(load(R"({"answer": {"restore": [{"timer": false}, "ok"]}})"), 2);
  EXPECT_EQ(load(R"({"answer": {"restore": ["close"]}})"), 2);
  EXPECT_EQ(load(R"({"answer": {"dependency": {"button": "yes"}}})"), 2);
  EXPECT_EQ(load(R"({"answer": {"dependency": {"text": "x"}}})"), 2);
  EXPECT_EQ(load(R"({"answer": {"dependency": {"button": "ok", "txt": ""}}})"), 2);
  EXPECT_EQ(load(R"({"answer": {"restore": [{"click": "x"}, {"compare": true}, "cancel"]}})"), -1);
}

}  // namespace
}  // namespace kpx::sim::test
