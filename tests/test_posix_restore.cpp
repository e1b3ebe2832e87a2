// The native platform's file calls of the restore routines and its child
// processes, on a real sandbox folder and real children.
#include <gtest/gtest.h>

#include <signal.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <chrono>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>

#include "automation/automation_error.h"
#include "platform/posix/posix_platform.h"

namespace kpx::posix {
namespace {

namespace fs = std::filesystem;
using platform::FileTimes;

class TempDir {
 public:
  TempDir() {
    static std::atomic<int> counter{0};
    path_ = fs::temp_directory_path() /
            ("kpx-restore-test-" + std::to_string(::getpid()) + "-" + std::to_string(counter++));
    fs::remove_all(path_);
    fs::create_directories(path_ / "C" / "src");
  }
  ~TempDir() {
    std::error_code ignored;
    for (auto it = fs::recursive_directory_iterator(path_, ignored); it != fs::recursive_directory_iterator();
         it.increment(ignored))
      fs::permissions(it->path(), fs::perms::owner_write, fs::perm_options::add, ignored);
    fs::remove_all(path_, ignored);
  }
  const fs::path& path() const { return path_; }

 private:
  fs::path path_;
};

std::string Slurp(const fs::path& p) {
  std::ifstream in(p, std::ios::binary);
  return {std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
}

void Put(const fs::path& p, const std::string& text) {
  std::ofstream out(p, std::ios::binary | std::ios::trunc);
  out << text;
}

// Files in the folder other than the ones named: what a replace left behind.
std::vector<std::string> Others(const fs::path& folder, const std::vector<std::string>& expected) {
  std::vector<std::string> out;
  for (const auto& e : fs::directory_iterator(folder)) {
    const std::string name = e.path().filename().string();
    if (std::find(expected.begin(), expected.end(), name) == expected.end()) out.push_back(name);
  }
  return out;
}

// 2026-11-01 09:00:00 UTC as a file time.
constexpr platform::FileTime kNov1 = (1793523600LL + 11644473600LL) * 10000000LL;

// ------------------------------------------------------------ attributes

TEST(SandboxRestoreFiles, ReadOnlyIsTheOwnerWriteBitAndIsHonouredEvenByRoot) {
  TempDir dir;
  SandboxFileSystem files(dir.path());
  Put(dir.path() / "C" / "src" / "a.cpp", "a");
  EXPECT_EQ(files.GetAttributes("C:\\SRC\\A.CPP"), platform::kAttributeArchive);

  ASSERT_TRUE(files.SetAttributes("C:\\src\\a.cpp", platform::kAttributeReadOnly | platform::kAttributeArchive));
  EXPECT_EQ(fs::status(dir.path() / "C" / "src" / "a.cpp").permissions() & fs::perms::owner_write, fs::perms::none);
  EXPECT_EQ(files.GetAttributes("C:\\src\\a.cpp"), platform::kAttributeReadOnly | platform::kAttributeArchive);
  // Another object over the same sandbox still sees it read-only.
  SandboxFileSystem again(dir.path());
  EXPECT_EQ(again.GetAttributes("C:\\src\\a.cpp").value_or(0) & platform::kAttributeReadOnly,
            platform::kAttributeReadOnly);

  EXPECT_FALSE(files.RemoveFile("C:\\src\\a.cpp"));
  EXPECT_EQ(files.LastError().number, 70);
  EXPECT_EQ(files.LastError().description, "Permission denied");
  EXPECT_EQ(files.OpenForTimes("C:\\src\\a.cpp"), platform::kNoFile);
  EXPECT_EQ(files.LastError().number, 70);
  EXPECT_FALSE(files.ReplaceText("C:\\src\\a.cpp", "b"));
  EXPECT_EQ(Slurp(dir.path() / "C" / "src" / "a.cpp"), "a");
  EXPECT_TRUE(fs::exists(dir.path() / "C" / "src" / "a.cpp"));

  // Clearing every bit reads back as Normal; then it can go.
  ASSERT_TRUE(files.SetAttributes("C:\\src\\a.cpp", platform::kAttributeNormal));
  EXPECT_EQ(files.GetAttributes("C:\\src\\a.cpp"), platform::kAttributeNormal);
  EXPECT_TRUE(files.RemoveFile("C:\\src\\a.cpp"));
  EXPECT_FALSE(fs::exists(dir.path() / "C" / "src" / "a.cpp"));
}

TEST(SandboxRestoreFiles, ErrorsAreTheNumbersVbGives) {
  TempDir dir;
  SandboxFileSystem files(dir.path());
  EXPECT_FALSE(files.GetAttributes("C:\\src\\none.cpp"));
  EXPECT_EQ(files.LastError().number, 53);
  EXPECT_EQ(files.LastError().description, "File not found");
  EXPECT_FALSE(files.RemoveFile("C:\\nowhere\\none.cpp"));
  EXPECT_EQ(files.LastError().number, 76);
  EXPECT_EQ(files.LastError().description, "Path not found");
  EXPECT_FALSE(files.RemoveFile("C:\\src"));  // a folder is not a file
  EXPECT_EQ(files.LastError().number, 75);
  EXPECT_FALSE(files.FileDateTime("C:\\src\\none.cpp"));
  EXPECT_EQ(files.LastError().number, 53);
  EXPECT_FALSE(files.ReplaceText("C:\\nowhere\\x.txt", "x"));
  EXPECT_EQ(files.LastError().number, 76);
  platform::FileTimes t;
  EXPECT_FALSE(files.GetFileTimes(12345, t));
  EXPECT_FALSE(files.SetFileTimes(12345, t));
}

// ---------------------------------------------------------------- moves

TEST(SandboxRestoreFiles, MoveRefusesAnExistingTargetAndKeepsAttributesAndTimes) {
  TempDir dir;
  SandboxFileSystem files(dir.path());
  const fs::path src = dir.path() / "C" / "src";
  Put(src / "a.cpp.bak", "backup");
  Put(src / "b.cpp", "other");
  const platform::FileHandle h = files.OpenForTimes("C:\\src\\a.cpp.bak");
  ASSERT_NE(h, platform::kNoFile);
  const FileTimes set{kNov1, kNov1 + 10000000, kNov1 + 20000000};
  ASSERT_TRUE(files.SetFileTimes(h, set));
  files.CloseFile(h);
  ASSERT_TRUE(files.SetAttributes("C:\\src\\a.cpp.bak", platform::kAttributeReadOnly | 0x2 /* hidden */));

  EXPECT_FALSE(files.MoveFile("C:\\src\\a.cpp.bak", "c:\\SRC\\B.CPP"));
  EXPECT_EQ(files.LastError().number, 58);
  EXPECT_EQ(files.LastError().description, "File already exists");
  EXPECT_EQ(Slurp(src / "b.cpp"), "other");
  EXPECT_FALSE(files.MoveFile("C:\\src\\gone.cpp", "C:\\src\\c.cpp"));
  EXPECT_EQ(files.LastError().number, 53);
  EXPECT_FALSE(files.MoveFile("C:\\src\\a.cpp.bak", "C:\\nowhere\\a.cpp"));
  EXPECT_EQ(files.LastError().number, 76);

  // A read-only file may be renamed; it stays what it was.
  ASSERT_TRUE(files.MoveFile("C:\\src\\a.cpp.bak", "C:\\src\\a.cpp"));
  EXPECT_FALSE(fs::exists(src / "a.cpp.bak"));
  EXPECT_EQ(files.GetAttributes("C:\\src\\a.cpp"), platform::kAttributeReadOnly | 0x2u);
  ASSERT_TRUE(files.SetAttributes("C:\\src\\a.cpp", 0x2));
  const platform::FileHandle moved = files.OpenForTimes("C:\\src\\A.cpp");
  ASSERT_NE(moved, platform::kNoFile);
  FileTimes got;
  ASSERT_TRUE(files.GetFileTimes(moved, got));
  files.CloseFile(moved);
  EXPECT_EQ(got, set);
  EXPECT_EQ(Slurp(src / "a.cpp"), "backup");  // reading it sets its access time: last

  // Only the letter case changes: Windows renames, and the name is found in
  // any case afterwards.
  ASSERT_TRUE(files.MoveFile("C:\\src\\a.cpp", "C:\\src\\A.Cpp"));
  EXPECT_TRUE(fs::exists(src / "A.Cpp"));
  EXPECT_FALSE(fs::exists(src / "a.cpp"));
  EXPECT_TRUE(files.Exists("C:\\src\\a.CPP"));
}

// ---------------------------------------------------------------- times

TEST(SandboxRestoreFiles, TimesAreFileTimesAndTheLastTwoAreTheRealFilesOwn) {
  TempDir dir;
  SandboxFileSystem files(dir.path(), SandboxFileSystem::Zone::Utc);
  const fs::path file = dir.path() / "C" / "src" / "a.cpp";
  Put(file, "a");
  const platform::FileHandle h = files.OpenForTimes("C:\\src\\a.cpp");
  ASSERT_NE(h, platform::kNoFile);
  FileTimes before;
  ASSERT_TRUE(files.GetFileTimes(h, before));
  // A fresh file's times are close to now.
  const platform::FileTime now = *SystemClock().SystemFileTime();
  EXPECT_LT(now - before.lastWrite, 600ull * 10000000);
  EXPECT_LE(before.creation, before.lastWrite + 10000000);

  const FileTimes set{kNov1, kNov1 + 3600ull * 10000000 + 1234500, kNov1 + 7200ull * 10000000};
  ASSERT_TRUE(files.SetFileTimes(h, set));
  FileTimes after;
  ASSERT_TRUE(files.GetFileTimes(h, after));
  EXPECT_EQ(after, set);
  files.CloseFile(h);
  EXPECT_FALSE(files.GetFileTimes(h, after));  // closed

  struct stat st{};
  ASSERT_EQ(::stat(file.c_str(), &st), 0);
  EXPECT_EQ(st.st_mtim.tv_sec, 1793523600 + 7200);
  EXPECT_EQ(st.st_atim.tv_sec, 1793523600 + 3600);
  EXPECT_EQ(st.st_atim.tv_nsec, 123450000);
  const auto date = files.FileDateTime("C:\\src\\a.cpp");
  ASSERT_TRUE(date);
  EXPECT_EQ(date->year, 2026);
  EXPECT_EQ(date->month, 11);
  EXPECT_EQ(date->day, 1);
  EXPECT_EQ(date->hour, 11);
  EXPECT_EQ(date->minute, 0);

  // Zero leaves a time as it is.
  const platform::FileHandle again = files.OpenForTimes("C:\\src\\a.cpp");
  ASSERT_TRUE(files.SetFileTimes(again, {0, 0, kNov1}));
  ASSERT_TRUE(files.GetFileTimes(again, after));
  files.CloseFile(again);
  EXPECT_EQ(after, (FileTimes{kNov1, set.lastAccess, kNov1}));

  // Removing the file forgets its creation time: a new file is new.
  ASSERT_TRUE(files.RemoveFile("C:\\src\\a.cpp"));
  Put(file, "new");
  const platform::FileHandle fresh = files.OpenForTimes("C:\\src\\a.cpp");
  ASSERT_TRUE(files.GetFileTimes(fresh, after));
  files.CloseFile(fresh);
  EXPECT_GT(after.creation, kNov1 + 7200ull * 10000000);
}

// --------------------------------------------------------------- replace

TEST(SandboxRestoreFiles, ReplaceKeepsTheFilesCreationTimeAndAttributes) {
  TempDir dir;
  SandboxFileSystem files(dir.path());
  const fs::path file = dir.path() / "C" / "src" / "list.lst";
  Put(file, "old\r\n");
  ::chmod(file.c_str(), 0640);
  const platform::FileHandle h = files.OpenForTimes("C:\\src\\list.lst");
  ASSERT_TRUE(files.SetFileTimes(h, {kNov1, kNov1, kNov1}));
  files.CloseFile(h);

  ASSERT_TRUE(files.ReplaceText("C:\\SRC\\List.lst", "new\r\ntext\r\n"));
  EXPECT_EQ(Slurp(file), "new\r\ntext\r\n");
  EXPECT_TRUE(Others(file.parent_path(), {"list.lst"}).empty());
  struct stat st{};
  ASSERT_EQ(::stat(file.c_str(), &st), 0);
  EXPECT_EQ(st.st_mode & 0777, 0640u);
  FileTimes t;
  const platform::FileHandle h2 = files.OpenForTimes("C:\\src\\list.lst");
  ASSERT_TRUE(files.GetFileTimes(h2, t));
  files.CloseFile(h2);
  EXPECT_EQ(t.creation, kNov1);
  EXPECT_GT(t.lastWrite, kNov1);

  // A missing file is made; an empty text is a file of no bytes.
  ASSERT_TRUE(files.ReplaceText("C:\\src\\fresh.txt", ""));
  EXPECT_TRUE(fs::exists(file.parent_path() / "fresh.txt"));
  EXPECT_EQ(Slurp(file.parent_path() / "fresh.txt"), "");
}

TEST(SandboxRestoreFiles, AFailedReplaceAtAnyStepLeavesTheOldTextWholeAndNoTemporary) {
  using Step = SandboxFileSystem::ReplaceStep;
  const std::string oldText = "line one\r\nline two\r\n";
  const std::string newText = "a much longer replacement text\r\nthat is written in two halves\r\n";
  for (Step failing : {Step::CreateTemp, Step::Write, Step::Close, Step::Rename}) {
    SCOPED_TRACE(static_cast<int>(failing));
    TempDir dir;
    SandboxFileSystem files(dir.path());
    const fs::path file = dir.path() / "C" / "src" / "a.lst";
    Put(file, oldText);
    std::vector<Step> seen;
    files.SetReplaceHook([&](Step s) {
      seen.push_back(s);
      return s != failing;
    });
    EXPECT_FALSE(files.ReplaceText("C:\\src\\a.lst", newText));
    EXPECT_EQ(files.LastError().number, 75);
    EXPECT_EQ(seen.back(), failing);
    EXPECT_EQ(Slurp(file), oldText);
    EXPECT_EQ(Others(file.parent_path(), {"a.lst"}), std::vector<std::string>{});

    // The same object replaces once the fault is gone.
    files.SetReplaceHook({});
    EXPECT_TRUE(files.ReplaceText("C:\\src\\a.lst", newText));
    EXPECT_EQ(Slurp(file), newText);
    EXPECT_EQ(Others(file.parent_path(), {"a.lst"}), std::vector<std::string>{});
  }
}

TEST(SandboxRestoreFiles, ACrashAtAnyStepLeavesTheOldTextOrTheNewWhole) {
  using Step = SandboxFileSystem::ReplaceStep;
  const std::string oldText = "old text\r\n";
  const std::string newText(100000, 'n');
  for (Step crashing : {Step::CreateTemp, Step::Write, Step::Close, Step::Rename}) {
    SCOPED_TRACE(static_cast<int>(crashing));
    TempDir dir;
    const fs::path file = dir.path() / "C" / "src" / "a.lst";
    Put(file, oldText);
    const pid_t pid = ::fork();
    ASSERT_GE(pid, 0);
    if (pid == 0) {
      SandboxFileSystem files(dir.path());
      // Dies without unwinding, as a process killed at that moment does.
      files.SetReplaceHook([&](Step s) {
        if (s == crashing) ::_exit(9);
        return true;
      });
      files.ReplaceText("C:\\src\\a.lst", newText);
      ::_exit(0);
    }
    int status = 0;
    ASSERT_EQ(::waitpid(pid, &status, 0), pid);
    ASSERT_TRUE(WIFEXITED(status));
    EXPECT_EQ(WEXITSTATUS(status), 9);
    const std::string now = Slurp(file);
    EXPECT_TRUE(now == oldText || now == newText) << now.size() << " bytes";
    // Before the rename nothing of the new text has reached the file.
    EXPECT_EQ(now, oldText);

    // A temporary left by the crash does not stand in the way of the next.
    SandboxFileSystem files(dir.path());
    EXPECT_TRUE(files.ReplaceText("C:\\src\\a.lst", "after\r\n"));
    EXPECT_EQ(Slurp(file), "after\r\n");
  }
}

// ----------------------------------------------------------------- clock

TEST(SystemClockFileTime, IsUtcNowInHundredNanosecondsSince1601) {
  SystemClock clock;
  const auto before = std::chrono::system_clock::now();
  const std::optional<platform::FileTime> ft = clock.SystemFileTime();
  ASSERT_TRUE(ft);
  const int64_t unixSeconds = static_cast<int64_t>(*ft / 10000000) - 11644473600LL;
  const int64_t expected = std::chrono::duration_cast<std::chrono::seconds>(before.time_since_epoch()).count();
  EXPECT_NEAR(static_cast<double>(unixSeconds), static_cast<double>(expected), 2.0);
}

// ------------------------------------------------------------- processes

TEST(CommandLines, SplitAsWindowsProgramsSplitThem) {
  using V = std::vector<std::string>;
  EXPECT_EQ(SplitCommandLine(""), V{});
  EXPECT_EQ(SplitCommandLine("  \t "), V{});
  EXPECT_EQ(SplitCommandLine("windiff \"C:\\a b\\x.cpp\" \"C:\\y.cpp\""), (V{"windiff", "C:\\a b\\x.cpp", "C:\\y.cpp"}));
  EXPECT_EQ(SplitCommandLine("a\tb  c"), (V{"a", "b", "c"}));
  EXPECT_EQ(SplitCommandLine("x\"a b\"y"), (V{"xa by"}));
  EXPECT_EQ(SplitCommandLine("\"\""), (V{""}));
  EXPECT_EQ(SplitCommandLine("a\\\\b \\\"q\\\" c\\\\\\\\\"d e\""), (V{"a\\\\b", "\"q\"", "c\\\\d e"}));
  EXPECT_EQ(SplitCommandLine("\"say \"\"hi\"\"\""), (V{"say \"hi\""}));
  EXPECT_EQ(SplitCommandLine("\"open"), (V{"open"}));
}

TEST(PosixProcesses, RunsRealChildrenAndReadsTheirExits) {
  PosixProcesses processes;
  platform::ProcessRecord r;
  ASSERT_TRUE(processes.CreateProcess("/bin/sh", "sh -c \"exit 3\"", r));
  EXPECT_NE(r.process, r.thread);
  EXPECT_GT(r.processId, 0u);
  EXPECT_EQ(processes.WaitForInputIdle(r.process, platform::kInfinite), 0u);
  EXPECT_TRUE(processes.CloseHandle(r.thread));
  EXPECT_EQ(processes.WaitForSingleObject(r.process, 10000), platform::kWaitObject0);
  uint32_t code = 0;
  ASSERT_TRUE(processes.GetExitCodeProcess(r.process, code));
  EXPECT_EQ(code, 3u);
  EXPECT_TRUE(processes.CloseHandle(r.process));
  // Closed: every call refuses the handle.
  EXPECT_FALSE(processes.CloseHandle(r.process));
  EXPECT_EQ(processes.LastError(), 6u);
  EXPECT_EQ(processes.WaitForSingleObject(r.process, 0), platform::kWaitFailed);
  EXPECT_FALSE(processes.GetExitCodeProcess(r.process, code));

  ASSERT_TRUE(processes.CreateProcess("/bin/sh", "sh -c \"exit 0\"", r));
  EXPECT_EQ(processes.WaitForSingleObject(r.process, platform::kInfinite), platform::kWaitObject0);
  ASSERT_TRUE(processes.GetExitCodeProcess(r.process, code));
  EXPECT_EQ(code, 0u);

  // An empty command line: the program is its own argv[0].
  ASSERT_TRUE(processes.CreateProcess("/bin/true", "", r));
  EXPECT_EQ(processes.WaitForSingleObject(r.process, 10000), platform::kWaitObject0);
  ASSERT_TRUE(processes.GetExitCodeProcess(r.process, code));
  EXPECT_EQ(code, 0u);

  // The words reach the child as Windows splits them.
  ASSERT_TRUE(processes.CreateProcess("/bin/sh", "sh -c \"test \\\"$0\\\" = 'a b'\" \"a b\"", r));
  EXPECT_EQ(processes.WaitForSingleObject(r.process, 10000), platform::kWaitObject0);
  ASSERT_TRUE(processes.GetExitCodeProcess(r.process, code));
  EXPECT_EQ(code, 0u);

  // A crash reads as a crash status: non-zero, top bit set.
  ASSERT_TRUE(processes.CreateProcess("/bin/sh", "sh -c \"kill -SEGV $$\"", r));
  EXPECT_EQ(processes.WaitForSingleObject(r.process, 10000), platform::kWaitObject0);
  ASSERT_TRUE(processes.GetExitCodeProcess(r.process, code));
  EXPECT_EQ(code, 0xC0000005u);
  EXPECT_NE(code & 0x80000000u, 0u);
}

TEST(PosixProcesses, AProgramThatCannotStartFailsWithTheSystemsCode) {
  PosixProcesses processes;
  platform::ProcessRecord r;
  EXPECT_FALSE(processes.CreateProcess("/no/such/program", "program a b", r));
  EXPECT_EQ(processes.LastError(), 2u);
  EXPECT_FALSE(processes.CreateProcess("", "", r));
  EXPECT_EQ(processes.LastError(), 2u);
  TempDir dir;
  const fs::path script = dir.path() / "not-executable";
  Put(script, "#!/bin/sh\n");
  ::chmod(script.c_str(), 0644);
  if (::geteuid() != 0) {  // root may run what it may not
    EXPECT_FALSE(processes.CreateProcess(script.string(), "", r));
    EXPECT_EQ(processes.LastError(), 5u);
  }
  EXPECT_FALSE(processes.CreateProcess(dir.path().string(), "", r));
  EXPECT_EQ(processes.LastError(), 5u);
}

TEST(PosixProcesses, AWaitTimesOutAndLeavesTheChildRunning) {
  PosixProcesses processes;
  platform::ProcessRecord r;
  ASSERT_TRUE(processes.CreateProcess("/bin/sleep", "sleep 30", r));
  const auto start = std::chrono::steady_clock::now();
  EXPECT_EQ(processes.WaitForSingleObject(r.process, 200), platform::kWaitTimeout);
  const auto waited = std::chrono::steady_clock::now() - start;
  EXPECT_GE(waited, std::chrono::milliseconds(200));
  EXPECT_LT(waited, std::chrono::seconds(5));
  uint32_t code = 0;
  ASSERT_TRUE(processes.GetExitCodeProcess(r.process, code));
  EXPECT_EQ(code, PosixProcesses::kStillActive);
  EXPECT_TRUE(processes.CloseHandle(r.thread));
  EXPECT_TRUE(processes.CloseHandle(r.process));
  // Still alive after every handle is gone.
  const pid_t pid = static_cast<pid_t>(r.processId);
  EXPECT_EQ(::kill(pid, 0), 0);
  ::kill(pid, SIGKILL);
  int status = 0;
  EXPECT_EQ(::waitpid(pid, &status, 0), pid);
}

}  // namespace
}  // namespace kpx::posix
