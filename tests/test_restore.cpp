// Restore Source on fakes: what the scenarios cannot show cheaply. The
// order of the process calls, the layout arithmetic, every difference-tool
// command form, and the restore's bookkeeping when files fail half-way.
#include <gtest/gtest.h>

#include "fakes.h"
#include "restore/difference_tool.h"
#include "restore/kpx_restore_form.h"
#include "restore/min_window_size.h"
#include "restore/restore_source.h"
#include "shared/host_ids.h"
#include "shared/shared_utilities.h"

namespace kpx {
namespace {

using Args = std::span<Variant>;
using platform::RestoreControl;
using platform::RootKey;
using test::FakeObject;

class RestoreTest : public ::testing::Test {
 protected:
  RestoreTest() {
    test::Journal* j = &world.journal;
    app = std::make_shared<FakeObject>("app", j);
    vc = std::make_shared<FakeObject>("vc", j);
    auto manager = std::make_shared<FakeObject>("manager", nullptr);
    auto addIns = std::make_shared<FakeObject>("addins", nullptr);
    addIns->On(hostid::kCount, "Count", [](Args) -> Variant { return int16_t(1); })
        .On(hostid::kGetAt, "GetAt", [this](Args) -> Variant { return ObjectPtr(vc); });
    manager->On(hostid::kAddIns, "AddIns", [addIns](Args) -> Variant { return ObjectPtr(addIns); });
    app->On(hostid::kAddInManager, "AddInManager", [manager](Args) -> Variant { return ObjectPtr(manager); })
        .On(hostid::kWriteErrorLog, "WriteErrorLog", [this](Args a) -> Variant {
          hostLog.push_back(a[0].toString());
          return {};
        })
        .On(900, "GetMainWnd", [](Args) -> Variant { return 4242; })
        .On(hostid::kWindowTop, "Top", [](Args) -> Variant { return int16_t(10); })
        .On(hostid::kWindowLeft, "Left", [](Args) -> Variant { return int16_t(20); })
        .On(hostid::kWindowHeight, "Height", [](Args) -> Variant { return int16_t(600); })
        .On(hostid::kWindowWidth, "Width", [](Args) -> Variant { return int16_t(800); });
    vc->On(hostid::kAddInName, "Name", [](Args) -> Variant { return "VC++"; })
        .On(hostid::kHelpFile, "HelpFile", [](Args) -> Variant { return "C:\\Quarn\\vc.hlp"; })
        .On(hostid::kReadSetting, "ReadSetting", [this](Args a) -> Variant {
          auto it = settings.find(a[0].toString() + "/" + a[1].toString());
          return it == settings.end() ? a[2].deref() : Variant(it->second);
        })
        .On(hostid::kWriteSetting, "WriteSetting", [this](Args a) -> Variant {
          settings[a[0].toString() + "/" + a[1].toString()] = a[2].toString();
          writes.push_back(a[1].toString() + "=" + a[2].toString());
          return true;
        });
    world.texts[5013] = "Cannot restore ";
    world.texts[5014] = " is gone";
    world.texts[5015] = " restored";
    world.texts[5020] = " (last backup)";
    world.texts[5029] = "Backup";
    world.texts[5033] = "%1%2 is read-only";
    world.texts[5028] = "Backups";
    module.resources().InitResourceStrings();
    world.ui.defaultAnswer = 6;  // Yes to the confirmation
    world.journal.clear();
  }

  // A project of `files` sources, each with its backup and a list line;
  // returns its record.
  std::string Project(const std::string& name, std::initializer_list<std::string> files) {
    const std::string folder = "C:\\" + name + "\\";
    const std::string list = folder + "Backup\\" + name + ".lst";
    std::string text;
    for (const std::string& f : files) {
      world.files.at(folder + f) = "new " + f;
      world.files.at(folder + "Backup\\" + f + ".bak") = "old " + f;
      text += folder + f + "|" + folder + "Backup\\" + f + ".bak\r\n";
    }
    world.files.at(list) = text;
    return folder + name + ".dsp|" + name + "|" + list;
  }
  void Record(int n, const std::string& record) { settings["Backups/" + std::to_string(n)] = record; }

  // Plays the dialog: ticks the named rows (project names or source paths)
  // and presses OK.
  void Tick(std::initializer_list<std::string> list) {
    world.ui.playRestore = [names = std::vector<std::string>(list)](platform::RestoreForm& form) {
      for (const std::string& name : names)
        for (int32_t i = 0; i < static_cast<int32_t>(form.rows().size()); ++i) {
          const platform::RestoreRow& row = form.rows()[i];
          if (row.cells[0] == name || (!row.project && row.cells[2] + "\\" + row.cells[1] == name))
            form.SetCheck(i, true);
        }
      form.Ok();
    };
  }

  test::World world;
  Module module{world.platform()};
  std::shared_ptr<FakeObject> app, vc;
  std::map<std::string, std::string> settings;
  std::vector<std::string> writes, hostLog;
};

// ------------------------------------------------------------ child process

TEST_F(RestoreTest, AChildIsWaitedForWithBothHandlesClosedAndOnlyExitCodeZeroSucceeds) {
  auto& p = world.processes;
  p.programs["C:\\t.exe"] = {};
  EXPECT_TRUE(RunChildProcess(module, "C:\\t.exe", "a b", 5000));
  EXPECT_EQ(p.calls, (std::vector<std::string>{"CreateProcess C:\\t.exe [a b]", "WaitForInputIdle 100 4294967295",
                                                "CloseHandle 101", "WaitForSingleObject 100 5000",
                                                "GetExitCodeProcess 100", "CloseHandle 100"}));
  EXPECT_EQ(module.error().number, 0);

  p.programs["C:\\t.exe"].exitCode = 3;
  EXPECT_FALSE(RunChildProcess(module, "C:\\t.exe", "", 5000));
  EXPECT_EQ(module.error().number, 3);
  EXPECT_EQ(module.error().description, "Error exit from C:\\t.exe: 3");

  // A crash status has the top bit set: still an error, shown as a Long.
  p.programs["C:\\t.exe"].exitCode = 0xC0000005u;
  EXPECT_FALSE(RunChildProcess(module, "C:\\t.exe", "", 5000));
  EXPECT_EQ(module.error().number, static_cast<int32_t>(0xC0000005u));
  EXPECT_EQ(module.error().description, "Error exit from C:\\t.exe: -1073741819");
}

TEST_F(RestoreTest, StartFailuresTimeoutsAndFailedWaitsKeepTheSystemsReason) {
  auto& p = world.processes;
  EXPECT_FALSE(RunChildProcess(module, "C:\\none.exe", "x y", 10));  // unknown: system error 2
  EXPECT_EQ(module.error().number, 2);
  EXPECT_EQ(module.error().description, "Error creating process for: C:\\none.exe x y");

  p.programs["C:\\quiet.exe"].startError = 0;
  p.programs["C:\\quiet.exe"].waitResult = platform::kWaitTimeout;
  p.calls.clear();
  EXPECT_FALSE(RunChildProcess(module, "C:\\quiet.exe", "", 10));
  EXPECT_EQ(module.error().number, 2) << "no system error after a time-out: the default";
  EXPECT_EQ(module.error().description, "Timeout on child process");
  EXPECT_EQ(p.calls.back(), "CloseHandle 100") << "the child is left running, only its handle closed";
  EXPECT_EQ(std::count_if(p.calls.begin(), p.calls.end(), [](auto& c) { return c.starts_with("GetExit"); }), 0);

  p.programs["C:\\quiet.exe"].waitResult = platform::kWaitFailed;
  p.programs["C:\\quiet.exe"].errorAfterWait = 6;
  EXPECT_FALSE(RunChildProcess(module, "C:\\quiet.exe", "", 10));
  EXPECT_EQ(module.error().number, 6);
  EXPECT_EQ(module.error().description, "");

  // A recorded error stays: ResultFromError does not overwrite it.
  EXPECT_FALSE(ResultFromError(module, 0, "later"));
  EXPECT_EQ(module.error().number, 6);
}

// ------------------------------------------------------------------ layout

TEST_F(RestoreTest, LayoutTagsParseCaseSensitivelyWithOptionalBounds) {
  LayoutEntry e = ParseLayoutTag("H(675,3975)W(120,8235)", 'W');
  EXPECT_EQ(e.count, 2);
  EXPECT_FLOAT_EQ(e.first, 120);
  EXPECT_FLOAT_EQ(e.second, 8235);
  e = ParseLayoutTag("W(120)H(5,6)", 'W');  // the comma found belongs to H
  EXPECT_EQ(e.count, 1);
  EXPECT_FLOAT_EQ(e.first, 120);
  EXPECT_FLOAT_EQ(e.second, 0);
  EXPECT_EQ(ParseLayoutTag("w(0,10)", 'W').count, 0);
  EXPECT_EQ(ParseLayoutTag("", 'B').count, 0);
  EXPECT_FLOAT_EQ(ParseLayoutTag("B( 12 ,x)", 'B').first, 12);
}

TEST_F(RestoreTest, AnEntryWithoutABoundTakesTheBoundOfTheEntryBeforeIt) {
  // H without a bound follows W's 500; B without one follows R's 50.
  LayoutControl c{"W(0,500)H(10)", 0, 0, 100, 100};
  ApplyLayoutTag(module, c, 400, 300);
  EXPECT_EQ(c.width, 100) << "400 is below W's bound";
  EXPECT_EQ(c.height, 100) << "290 is below the bound H took from W";
  c = {"W(0,300)H(10)", 0, 0, 100, 100};
  ApplyLayoutTag(module, c, 400, 300);
  EXPECT_EQ(c.width, 400);
  EXPECT_EQ(c.height, 100) << "290 is below 300";
  c = {"R(0,50)B(10)", 0, 0, 100, 100};
  ApplyLayoutTag(module, c, 400, 155);
  EXPECT_EQ(c.left, 300);
  EXPECT_EQ(c.top, 0) << "45 is below the bound B took from R";
  c = {"H(10)", 0, 0, 100, 100};
  ApplyLayoutTag(module, c, 400, 155);
  EXPECT_EQ(c.height, 145) << "without W the bound is 0";
}

TEST_F(RestoreTest, TheRestoreDialogStopsItsButtonsAtTheirBoundsAndHasAMinimumSize) {
  KpxRestoreForm form(module);
  EXPECT_EQ(TwipsToPixels(form.minimumWidth(), 15), 574);
  EXPECT_EQ(TwipsToPixels(form.minimumHeight(), 15), 393);

  platform::ControlRect rects[size_t(RestoreControl::Count)];
  for (size_t i = 0; i < size_t(RestoreControl::Count); ++i) rects[i] = form.DesignRect(RestoreControl(i));
  auto ok = [&] { return rects[size_t(RestoreControl::Ok)]; };
  auto cancel = [&] { return rects[size_t(RestoreControl::Cancel)]; };
  auto list = [&] { return rects[size_t(RestoreControl::List)]; };

  form.Resize(12000, 8000, rects);
  EXPECT_EQ(cancel().left, 12000 - 100 - 1215);
  EXPECT_EQ(ok().left, 12000 - 1530 - 1215);
  EXPECT_EQ(ok().top, 8000 - 100 - 375);
  EXPECT_EQ(list().width, 12000 - 120 - 120);
  EXPECT_EQ(list().height, 8000 - 675 - 1020);
  form.Resize(8505, 8000, rects);
  EXPECT_EQ(ok().left, 5760);
  form.Resize(8395, 8000, rects);
  EXPECT_EQ(cancel().left, 7080);
  form.Resize(3000, 2000, rects);
  EXPECT_EQ(ok().left, 5760) << "OK stops at its bound";
  EXPECT_EQ(cancel().left, 7080) << "Cancel stops at its bound";
  EXPECT_EQ(ok().top, 8000 - 100 - 375) << "below 5040 the buttons stay where they were";
  EXPECT_GE(list().width, 8235);
  EXPECT_GE(list().height, 3975);
}

// --------------------------------------------------------- difference tool

TEST_F(RestoreTest, TheDifferenceSettingGivesCommandAndCaption) {
  DifferenceTool tool(module);
  struct Case {
    const char* setting;
    const char* command;
    const char* caption;
  };
  for (const Case& c : {Case{nullptr, "windiff", "WinDiff"}, Case{"  mytool.Diff  |  Compare ", "mytool.Diff", "Compare"},
                        Case{"WINDIFF", "WINDIFF", "WinDiff"}, Case{"shell notepad", "shell notepad", "Differences"},
                        Case{"windiff|", "windiff", "WinDiff"}}) {
    if (c.setting) settings["Events/OnDifference"] = c.setting;
    EXPECT_TRUE(tool.InitDifferenceTool(app, vc));
    EXPECT_EQ(tool.command(), c.command) << (c.setting ? c.setting : "no setting");
    EXPECT_EQ(tool.toolName(), c.caption) << (c.setting ? c.setting : "no setting");
  }
}

TEST_F(RestoreTest, AComponentGetsTheBackupFirstAndAShellCommandItsPlaceholdersFilledOnce) {
  const std::string item = "C:\\p\\p.dsp|p|C:\\src\\a%1.cpp|C:\\bak\\a%2.cpp";
  std::vector<std::string> compared;
  world.factory.makers["mytool.Diff"] = [&] {
    auto tool = std::make_shared<FakeObject>("tool", nullptr);
    tool->On(1, "OnDifference", [&](Args a) -> Variant {
      compared = {a[0].toString(), a[1].toString()};
      return {};
    });
    return ObjectPtr(tool);
  };
  DifferenceTool tool(module);
  settings["Events/OnDifference"] = "mytool.Diff|Compare";
  tool.InitDifferenceTool(app, vc);
  EXPECT_TRUE(tool.RunDifference(item));
  EXPECT_EQ(compared, (std::vector<std::string>{"C:\\bak\\a%2.cpp", "C:\\src\\a%1.cpp"}));
  EXPECT_FALSE(tool.RunDifference("C:\\p\\p.dsp|p||C:\\bak\\a.cpp")) << "no source: nothing to compare";

  auto& p = world.processes;
  p.programs["C:\\Tools\\dd.exe"] = {};
  p.programs["notepad"] = {};
  settings["Events/OnDifference"] = "shell \"C:\\Tools\\dd.exe\" -a %2 %1";
  tool.InitDifferenceTool(app, vc);
  EXPECT_TRUE(tool.RunDifference(item));
  settings["Events/OnDifference"] = "  SHELL   notepad   %2  ";
  tool.InitDifferenceTool(app, vc);
  EXPECT_TRUE(tool.RunDifference(item));
  settings["Events/OnDifference"] = "shell \"notepad x";  // no closing quote: the program ends at a blank
  tool.InitDifferenceTool(app, vc);
  EXPECT_TRUE(tool.RunDifference(item));
  EXPECT_EQ(p.calls[0], "CreateProcess C:\\Tools\\dd.exe [-a C:\\src\\a%1.cpp C:\\bak\\a%2.cpp]");
  EXPECT_EQ(p.calls[6], "CreateProcess notepad [C:\\src\\a%1.cpp]");
  EXPECT_EQ(p.calls[12], "CreateProcess notepad [x]");
  EXPECT_EQ(p.calls[3], "WaitForSingleObject 100 2147483647");

  p.programs["notepad"].exitCode = 3;
  EXPECT_FALSE(tool.RunDifference(item));
  EXPECT_EQ(module.error().number, 3) << "the reason stays recorded";

  // "shellexecute" is not a verb: the whole command is a ProgID.
  settings["Events/OnDifference"] = "shellexecute notepad";
  tool.InitDifferenceTool(app, vc);
  p.calls.clear();
  EXPECT_FALSE(tool.RunDifference(item));
  EXPECT_EQ(world.factory.created.back(), "shellexecute notepad");
  EXPECT_TRUE(p.calls.empty());
}

TEST_F(RestoreTest, WindiffIsFoundThroughVisualStudiosFolderOnceOrFailsAsAProgId) {
  const std::string item = "C:\\p\\p.dsp|p|C:\\src\\a.cpp|C:\\bak\\a.cpp";
  DifferenceTool tool(module);
  tool.InitDifferenceTool(app, vc);
  EXPECT_FALSE(tool.RunDifference(item));
  EXPECT_EQ(world.factory.created.back(), "") << "without Visual Studio the empty command is tried as a ProgID";
  EXPECT_EQ(tool.command(), "");

  world.registry.CreateKey(RootKey::LocalMachine, DifferenceTool::kWindiffKey);
  world.registry.SetValue(RootKey::LocalMachine, DifferenceTool::kWindiffKey, "ProductDir",
                          {platform::kRegSz, std::string("C:\\VS6\0", 7)});
  const std::string windiff = "C:\\VS6\\Common\\Tools\\windiff.exe";
  world.processes.programs[windiff] = {};
  tool.InitDifferenceTool(app, vc);
  EXPECT_TRUE(tool.RunDifference(item));
  EXPECT_EQ(world.processes.calls[0], "CreateProcess " + windiff + " [windiff \"C:\\bak\\a.cpp\" \"C:\\src\\a.cpp\"]");
  world.registry.SetValue(RootKey::LocalMachine, DifferenceTool::kWindiffKey, "ProductDir",
                          {platform::kRegSz, std::string("D:\\\0", 4)});
  EXPECT_TRUE(tool.RunDifference(item)) << "the command found first is kept while the dialog is open";
  EXPECT_EQ(world.processes.calls[6], world.processes.calls[0]);
}

TEST_F(RestoreTest, ProjectClicksStartNoTimerWhileTheToolHasACaption) {
  DifferenceTool tool(module);
  for (int i = 0; i < 3; ++i) EXPECT_FALSE(tool.ProjectClicked());
  tool.TimerFired();
  EXPECT_TRUE(writes.empty());
  settings["Events/OnDifference"] = "mytool.Diff|";
  tool.InitDifferenceTool(app, vc);
  EXPECT_FALSE(tool.ProjectClicked()) << "an initialised tool always has a caption";
}

// ------------------------------------------------------------ the restore

TEST_F(RestoreTest, RestoringAWholeProjectMovesBackupsDropsItsRecordAndClosesTheGap) {
  Record(1, Project("one", {"a.cpp", "b.h"}));
  Record(2, Project("two", {"c.cpp"}));
  Record(3, Project("three", {"d.cpp"}));
  const std::string recordTwo = settings["Backups/2"], recordThree = settings["Backups/3"];
  world.files.attributes["c:\\one\\backup\\a.cpp.bak"] = platform::kAttributeReadOnly | platform::kAttributeArchive;
  world.files.times["c:\\one\\backup\\a.cpp.bak"] = {111, 222, 333};
  world.clock.fileTime = 999;
  Tick({"one"});

  RestoreSource(module).RestoreSourceFiles(app);

  EXPECT_EQ(world.files.at("C:\\one\\a.cpp"), "old a.cpp");
  EXPECT_EQ(world.files.at("C:\\one\\b.h"), "old b.h");
  EXPECT_FALSE(world.files.Exists("C:\\one\\Backup\\a.cpp.bak"));
  EXPECT_FALSE(world.files.Exists("C:\\one\\Backup\\one.lst"));
  EXPECT_EQ(world.files.times["c:\\one\\a.cpp"], (platform::FileTimes{111, 999, 999}));
  EXPECT_EQ(world.files.attributes["c:\\one\\a.cpp"], platform::kAttributeReadOnly | platform::kAttributeArchive)
      << "the attributes are put back after the touch";
  EXPECT_TRUE(world.files.AllClosed());
  EXPECT_EQ(writes, (std::vector<std::string>{"1=" + recordTwo, "2=" + recordThree, "3="}));
  EXPECT_EQ(hostLog, (std::vector<std::string>{"C:\\one\\a.cpp restored", "C:\\one\\b.h restored"}));
  ASSERT_EQ(world.ui.boxes.size(), 2u);
  EXPECT_EQ(world.ui.boxes[0], "T5016");
  EXPECT_EQ(world.ui.boxes[1], "T5032");
  ASSERT_EQ(world.ui.placements.size(), 1u);
  EXPECT_EQ(world.ui.placements[0].ownerWindow, 4242);
  EXPECT_EQ(world.ui.placements[0].width, 800);
}

TEST_F(RestoreTest, OnlyRecordsWithExistingBackupsAreShownAndNoneMeansNoDialog) {
  RestoreSource(module).RestoreSourceFiles(app);
  EXPECT_EQ(world.ui.boxes, std::vector<std::string>{"T5010"});
  EXPECT_TRUE(world.ui.placements.empty());

  world.ui.boxes.clear();
  Record(1, "C:\\x\\x.dsp|x|C:\\x\\Backup\\x.lst");  // its list file is gone
  Record(2, Project("p", {"a.cpp"}));
  world.files.Forget("c:\\p\\backup\\a.cpp.bak");
  Record(4, Project("after-the-gap", {"z.cpp"}));
  RestoreSource(module).RestoreSourceFiles(app);
  EXPECT_EQ(world.ui.boxes, std::vector<std::string>{"T5010"}) << "no row to show";
  EXPECT_TRUE(world.ui.placements.empty());
  EXPECT_EQ(writes.size(), 2u) << "the records read are written back as they were, up to the first empty entry";
}

TEST_F(RestoreTest, AListThatCannotBeRewrittenStaysAsItWasAndIsReported) {
  Record(1, Project("p", {"a.cpp", "b.cpp"}));
  const std::string list = world.files.at("C:\\p\\Backup\\p.lst");
  world.files.failing.insert("c:\\p\\backup\\p.lst");
  Tick({"C:\\p\\a.cpp"});
  RestoreSource(module).RestoreSourceFiles(app);
  EXPECT_EQ(world.files.at("C:\\p\\Backup\\p.lst"), list);
  ASSERT_EQ(hostLog.size(), 2u);
  EXPECT_EQ(hostLog[1], "T5012C:\\p\\Backup\\p.lst: Path/File access error");

  // A backup that cannot be opened for its times stays where it is.
  hostLog.clear();
  world.files.failing.clear();
  world.files.locked.insert("c:\\p\\backup\\b.cpp.bak");
  Tick({"C:\\p\\b.cpp"});
  RestoreSource(module).RestoreSourceFiles(app);
  EXPECT_TRUE(world.files.Exists("C:\\p\\Backup\\b.cpp.bak"));
  EXPECT_EQ(hostLog, std::vector<std::string>{"Cannot restore C:\\p\\b.cpp: Permission denied"});
}

// -------------------------------------------------------------- the form

TEST_F(RestoreTest, TicksCascadeFromProjectsAndTheHeaderFollowsTheSelection) {
  KpxRestoreForm form(module);
  world.files.dates["c:\\p\\backup\\p.lst"] = {2026, 11, 20, 14, 5, 9};
  const std::string record = Project("p", {"a.cpp", "b.cpp"});
  form.AddEntry(record, {"C:\\p\\a.cpp|C:\\p\\Backup\\a.cpp.bak", "C:\\p\\b.cpp|C:\\p\\Backup\\b.cpp.bak"});
  ASSERT_EQ(form.rows().size(), 3u);
  EXPECT_EQ(form.rows()[1].cells[1], "a.cpp");
  EXPECT_EQ(form.rows()[1].cells[2], "C:\\p");
  EXPECT_EQ(form.rows()[1].modified, "11/1/2026 10:00:00 AM");
  EXPECT_EQ(form.rows()[1].key, "C:\\p\\p.dsp|p|C:\\p\\a.cpp|C:\\p\\Backup\\a.cpp.bak");
  EXPECT_FALSE(form.okEnabled());

  form.SetCheck(2, true);
  EXPECT_EQ(form.rows()[0].check, 3) << "some of the project's files";
  EXPECT_TRUE(form.okEnabled());
  form.SetCheck(0, true);
  EXPECT_EQ(form.rows()[1].check + form.rows()[2].check, 2);
  form.SetCheck(0, false);
  EXPECT_FALSE(form.okEnabled());

  form.Select(0);
  EXPECT_EQ(form.headerTitle(), "T5034");
  EXPECT_EQ(form.headerSubtitle(), "11/20/2026 2:05:09 PM (last backup)");
  form.Select(1);
  EXPECT_EQ(form.headerTitle(), "T5018");
  EXPECT_EQ(form.headerSubtitle(), "");

  bool timer = true;
  form.InitDifferenceTool(app, vc);
  EXPECT_EQ(form.Click(1, timer), "WinDiff") << "a file row's menu carries the tool's caption";
  EXPECT_EQ(form.Click(0, timer), "");
  EXPECT_FALSE(timer);
  form.Help(77);
  EXPECT_EQ(world.ui.help, std::vector<std::string>{"C:\\Quarn\\vc.hlp"});
  form.Cancel();
  EXPECT_TRUE(form.rows().empty());
}

}  // namespace
}  // namespace kpx
