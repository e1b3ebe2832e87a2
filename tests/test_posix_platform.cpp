#include <gtest/gtest.h>

#include <atomic>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <stdexcept>
#include <string>

#include <unistd.h>

#include "automation/automation_error.h"
#include "platform/posix/posix_platform.h"
#include "platform/posix/regedit_file.h"

namespace kpx::posix {
namespace {

namespace fs = std::filesystem;
using platform::KeyDisposition;
using platform::RegistryValue;
using platform::RootKey;

// A fresh folder per test, removed afterwards.
class TempDir {
 public:
  TempDir() {
    static std::atomic<int> counter{0};
    path_ = fs::temp_directory_path() /
            ("kpx-posix-test-" + std::to_string(::getpid()) + "-" + std::to_string(counter++));
    fs::remove_all(path_);
    fs::create_directories(path_);
  }
  ~TempDir() {
    std::error_code ignored;
    fs::remove_all(path_, ignored);
  }
  const fs::path& path() const { return path_; }

 private:
  fs::path path_;
};

std::string ReadFile(const fs::path& p) {
  std::ifstream in(p, std::ios::binary);
  return std::string(std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>());
}

void WriteFile(const fs::path& p, const std::string& text) {
  std::ofstream(p, std::ios::binary) << text;
}

RegistryValue Sz(const std::string& text) { return {platform::kRegSz, text + '\0'}; }
RegistryValue Dword(uint32_t v) {
  return {platform::kRegDword, std::string{static_cast<char>(v), static_cast<char>(v >> 8),
                                           static_cast<char>(v >> 16), static_cast<char>(v >> 24)}};
}

bool operator==(const RegistryValue& a, const RegistryValue& b) { return a.type == b.type && a.data == b.data; }

// --------------------------------------------------------------- REGEDIT4

TEST(Regedit, RoundTripKeepsEveryKindOfValue) {
  std::string longBinary;
  for (int i = 0; i < 100; ++i) longBinary += static_cast<char>(i * 7);
  RegeditData data;
  RegeditValues& app = data["HKEY_LOCAL_MACHINE\\SOFTWARE\\App"];
  app[""] = Sz("default text");
  app["Path"] = Sz("C:\\dir \"quoted\"\\");
  app["Count"] = Dword(0x1f);
  app["Blob"] = {platform::kRegBinary, longBinary};
  app["Empty"] = {platform::kRegBinary, ""};
  app["Multi"] = {7, std::string("a\0b\0\0", 5)};
  // Text that "..." cannot carry must still come back byte for byte.
  app["NoNul"] = {platform::kRegSz, "abc"};
  app["Broken"] = Sz("two\nlines");
  app["ShortDword"] = {platform::kRegDword, "\x01\x02"};
  data["HKEY_CURRENT_USER\\Software\\Empty Key"];

  const std::string text = WriteRegedit(data);
  EXPECT_EQ(text.substr(0, 10), "REGEDIT4\n\n");
  EXPECT_NE(text.find("\"Path\"=\"C:\\\\dir \\\"quoted\\\"\\\\\"\n"), std::string::npos) << text;
  EXPECT_NE(text.find("@=\"default text\"\n"), std::string::npos);
  EXPECT_NE(text.find("\"Count\"=dword:0000001f\n"), std::string::npos);
  EXPECT_NE(text.find(",\\\n  "), std::string::npos) << "long binary data should continue on a new line";
  EXPECT_NE(text.find("\n\n[HKEY_LOCAL_MACHINE\\SOFTWARE\\App]\n"), std::string::npos);
  EXPECT_LT(text.find("HKEY_CURRENT_USER"), text.find("HKEY_LOCAL_MACHINE")) << "keys are sorted";

  const RegeditData back = ParseRegedit(text);
  ASSERT_EQ(back.size(), data.size());
  for (const auto& [key, values] : data) {
    ASSERT_TRUE(back.count(key)) << key;
    const RegeditValues& got = back.at(key);
    ASSERT_EQ(got.size(), values.size()) << key;
    for (const auto& [name, value] : values) {
      ASSERT_TRUE(got.count(name)) << name;
      EXPECT_TRUE(got.at(name) == value) << name;
    }
  }
}

TEST(Regedit, ReadsHandWrittenFiles) {
  const std::string text =
      "REGEDIT4\r\n"
      "\r\n"
      "; written by hand\r\n"
      "[hklm\\Software\\App]\r\n"
      "@=\"abc\"\r\n"
      "\"Bytes\" = hex:01,02,\\\r\n"
      "   ff,\\\r\n"
      "   0A\r\n"
      "\"Expand\"=hex(2):25,00\r\n"
      "\"Big\"=dword:FFFFFFFE\r\n"
      "\r\n"
      "[HKCU\\Software\\Gone\\Child]\r\n"
      "\"x\"=\"y\"\r\n"
      "[-HKEY_CURRENT_USER\\Software\\Gone]\r\n"
      "[HKEY_CURRENT_USER\\Software\\Kept]\r\n"
      "\"x\"=\"y\"\r\n"
      "\"x\"=-\r\n";
  const RegeditData data = ParseRegedit(text);

  ASSERT_EQ(data.size(), 2u);
  const RegeditValues& app = data.at("HKEY_LOCAL_MACHINE\\Software\\App");
  EXPECT_EQ(data.begin()->first, "HKEY_CURRENT_USER\\Software\\Kept") << "short roots are spelled out";
  EXPECT_TRUE(app.at("") == Sz("abc"));
  EXPECT_EQ(app.at("").data.size(), 4u);
  EXPECT_TRUE(app.at("Bytes") == (RegistryValue{platform::kRegBinary, "\x01\x02\xff\x0a"}));
  EXPECT_TRUE(app.at("Expand") == (RegistryValue{2, std::string("%\0", 2)}));
  EXPECT_TRUE(app.at("Big") == Dword(0xfffffffe));
  EXPECT_TRUE(data.at("HKEY_CURRENT_USER\\Software\\Kept").empty());

  // Keys and names ignore case but keep the spelling they were first given.
  const RegeditData merged = ParseRegedit(
      "REGEDIT4\n[HKEY_LOCAL_MACHINE\\Software\\Foo]\n\"Name\"=\"1\"\n"
      "[hklm\\SOFTWARE\\foo]\n\"NAME\"=\"2\"\n");
  ASSERT_EQ(merged.size(), 1u);
  EXPECT_EQ(merged.begin()->first, "HKEY_LOCAL_MACHINE\\Software\\Foo");
  ASSERT_EQ(merged.begin()->second.size(), 1u);
  EXPECT_EQ(merged.begin()->second.begin()->first, "Name");
  EXPECT_TRUE(merged.begin()->second.begin()->second == Sz("2"));
}

TEST(Regedit, ErrorsNameTheLine) {
  const std::string head = "REGEDIT4\n\n[HKLM\\A]\n";  // lines 1-3
  const struct {
    std::string text;
    std::string line;
  } cases[] = {
      {"", "line 1:"},
      {head + "\"a\"=\"unterminated\n", "line 4:"},
      {head + "\"a\"=\"C:\\dir\"\n", "line 4:"},
      {head + "\"a\"=\"x\" junk\n", "line 4:"},
      {head + "\"a\"=dword:123456789\n", "line 4:"},
      {head + "\"a\"=hex:01,\\\n 02,zz\n", "line 5:"},
      {head + "\"a\"=hex:01,,02\n", "line 4:"},
      {head + "\"a\"=hex:01,\\\n", "line 4:"},
      {head + "\"a\"=hex(x):01\n", "line 4:"},
      {head + "\"a\"=text\n", "line 4:"},
      {head + "\"a\" \"b\"\n", "line 4:"},
      {head + "\n[HKEY_NOWHERE\\A]\n", "line 5:"},
      {head + "[HKLM\\B\n", "line 4:"},
      {head + "[]\n", "line 4:"},
      {head + "garbage\n", "line 4:"},
      {"REGEDIT4\n\"a\"=\"b\"\n", "line 2:"},
      {head + "[-HKLM\\A]\n\"a\"=\"b\"\n", "line 5:"},
  };
  for (const auto& c : cases) {
    try {
      ParseRegedit(c.text);
      ADD_FAILURE() << "accepted: " << c.text;
    } catch (const std::runtime_error& e) {
      EXPECT_EQ(std::string(e.what()).rfind(c.line, 0), 0u) << e.what() << "\nfor: " << c.text;
    }
  }
}

// ---------------------------------------------------------------- registry

TEST(FileRegistry, QueriesIgnoreCaseAndMissIsNothing) {
  TempDir dir;
  const fs::path file = dir.path() / "registry.reg";
  WriteFile(file,
            "REGEDIT4\n\n[HKEY_LOCAL_MACHINE\\SOFTWARE\\Quarn\\Addins\\Kpx]\n@=\"dflt\"\n\"Debug\"=dword:00000001\n");
  FileRegistry registry(file);

  auto v = registry.QueryValue(RootKey::LocalMachine, "software\\QUARN\\addins\\kpx", "DEBUG");
  ASSERT_TRUE(v);
  EXPECT_TRUE(*v == Dword(1));
  v = registry.QueryValue(RootKey::LocalMachine, "SOFTWARE\\Quarn\\Addins\\Kpx", "");
  ASSERT_TRUE(v);
  EXPECT_TRUE(*v == Sz("dflt"));

  EXPECT_FALSE(registry.QueryValue(RootKey::LocalMachine, "SOFTWARE\\Quarn\\Addins\\Kpx", "Missing"));
  EXPECT_FALSE(registry.QueryValue(RootKey::LocalMachine, "SOFTWARE\\Quarn\\Addins", "Debug"));
  EXPECT_FALSE(registry.QueryValue(RootKey::CurrentUser, "SOFTWARE\\Quarn\\Addins\\Kpx", "Debug"));
  EXPECT_FALSE(registry.QueryValue(static_cast<RootKey>(0x80000000u), "SOFTWARE\\Quarn\\Addins\\Kpx", "Debug"));

  // A missing file is an empty registry; a malformed one is refused with its line.
  FileRegistry empty(dir.path() / "absent.reg");
  EXPECT_FALSE(empty.QueryValue(RootKey::LocalMachine, "SOFTWARE\\Quarn\\Addins\\Kpx", "Debug"));
  EXPECT_FALSE(fs::exists(dir.path() / "absent.reg"));
  WriteFile(file, "REGEDIT4\n[HKLM\\A]\n\"a\"=dword:\n");
  try {
    FileRegistry bad(file);
    ADD_FAILURE() << "malformed file accepted";
  } catch (const std::runtime_error& e) {
    EXPECT_NE(std::string(e.what()).find("line 3:"), std::string::npos) << e.what();
  }
}

TEST(FileRegistry, WritesOnlyUnderExistingKeysAndPersists) {
  TempDir dir;
  const fs::path file = dir.path() / "registry.reg";
  const std::string original = "REGEDIT4\n\n[HKEY_CURRENT_USER\\Software\\App\\Settings]\n\"Old\"=\"1\"\n";
  WriteFile(file, original);
  {
    FileRegistry registry(file);
    EXPECT_FALSE(registry.SetValue(RootKey::CurrentUser, "Software\\Other", "x", Sz("y")));
    EXPECT_FALSE(registry.SetValue(static_cast<RootKey>(7), "Software\\App\\Settings", "x", Sz("y")));
    EXPECT_EQ(ReadFile(file), original) << "a refused write must leave the file alone";
    EXPECT_FALSE(registry.QueryValue(RootKey::CurrentUser, "Software\\Other", "x"));

    EXPECT_TRUE(registry.SetValue(RootKey::CurrentUser, "SOFTWARE\\app\\settings", "OLD", Sz("2")));
    EXPECT_TRUE(registry.SetValue(RootKey::CurrentUser, "Software\\App\\Settings", "", Dword(5)));
    // A key exists when a key below it does, as in the real registry.
    EXPECT_TRUE(registry.SetValue(RootKey::CurrentUser, "Software\\App", "Parent", Sz("p")));
    EXPECT_FALSE(registry.SetValue(RootKey::CurrentUser, "Software\\Ap", "x", Sz("y")));
  }
  EXPECT_NE(ReadFile(file).find("\"Old\"=\"2\""), std::string::npos) << "first spelling kept:\n" << ReadFile(file);
  EXPECT_FALSE(fs::exists(dir.path() / "registry.reg.tmp"));

  FileRegistry reread(file);
  EXPECT_TRUE(*reread.QueryValue(RootKey::CurrentUser, "Software\\App\\Settings", "Old") == Sz("2"));
  EXPECT_TRUE(*reread.QueryValue(RootKey::CurrentUser, "Software\\App\\Settings", "") == Dword(5));
  EXPECT_TRUE(*reread.QueryValue(RootKey::CurrentUser, "Software\\App", "Parent") == Sz("p"));
}

TEST(FileRegistry, CreateKeyReportsCreatedThenOpened) {
  TempDir dir;
  const fs::path file = dir.path() / "registry.reg";
  {
    FileRegistry registry(file);
    EXPECT_EQ(registry.CreateKey(RootKey::LocalMachine, "SOFTWARE\\New\\Deep"), KeyDisposition::Created);
    EXPECT_EQ(registry.CreateKey(RootKey::LocalMachine, "software\\new\\DEEP"), KeyDisposition::Opened);
    EXPECT_EQ(registry.CreateKey(RootKey::LocalMachine, "SOFTWARE\\New"), KeyDisposition::Opened);
    EXPECT_EQ(registry.CreateKey(static_cast<RootKey>(0x80000003u), "SOFTWARE\\New"), KeyDisposition::Failed);
    EXPECT_TRUE(registry.SetValue(RootKey::LocalMachine, "SOFTWARE\\New\\Deep", "v", Sz("w")));
  }
  EXPECT_NE(ReadFile(file).find("[HKEY_LOCAL_MACHINE\\SOFTWARE\\New\\Deep]"), std::string::npos);
  FileRegistry reread(file);
  EXPECT_EQ(reread.CreateKey(RootKey::LocalMachine, "SOFTWARE\\New\\Deep"), KeyDisposition::Opened);
  EXPECT_TRUE(*reread.QueryValue(RootKey::LocalMachine, "SOFTWARE\\New\\Deep", "v") == Sz("w"));

  // A change the file cannot take is not kept in memory either.
  FileRegistry unwritable(dir.path() / "no such folder" / "registry.reg");
  EXPECT_EQ(unwritable.CreateKey(RootKey::LocalMachine, "SOFTWARE\\X"), KeyDisposition::Failed);
  EXPECT_FALSE(unwritable.SetValue(RootKey::LocalMachine, "SOFTWARE\\X", "v", Sz("w")));
  EXPECT_EQ(unwritable.CreateKey(RootKey::LocalMachine, "SOFTWARE\\X"), KeyDisposition::Failed);
  EXPECT_FALSE(unwritable.SetValue(RootKey::LocalMachine, "", "v", Sz("w"))) << "the root always exists";
  EXPECT_FALSE(unwritable.QueryValue(RootKey::LocalMachine, "", "v"));

  // Without a file the registry lives in memory.
  FileRegistry memory;
  EXPECT_EQ(memory.CreateKey(RootKey::CurrentUser, "K"), KeyDisposition::Created);
  EXPECT_TRUE(memory.SetValue(RootKey::CurrentUser, "K", "v", Sz("w")));
  EXPECT_TRUE(*memory.QueryValue(RootKey::CurrentUser, "k", "V") == Sz("w"));
}

TEST(FileRegistry, ABatchWritesTheFileOnceAndATakenBackChangeLeavesNoTrace) {
  TempDir dir;
  const fs::path file = dir.path() / "registry.reg";
  FileRegistry registry(file);
  registry.WriteOnce([&] {
    EXPECT_EQ(registry.CreateKey(RootKey::CurrentUser, "Software\\Bulk"), KeyDisposition::Created);
    for (int i = 0; i < 100; ++i) {
      std::string name = "V";
      name += std::to_string(i);
      EXPECT_TRUE(registry.SetValue(RootKey::CurrentUser, "Software\\Bulk", name, Dword(i)));
    }
    EXPECT_FALSE(registry.SetValue(RootKey::CurrentUser, "Software\\Missing", "x", Sz("y")));
    EXPECT_FALSE(fs::exists(file)) << "nothing is written before the batch ends";
  });
  FileRegistry reread(file);
  EXPECT_TRUE(*reread.QueryValue(RootKey::CurrentUser, "Software\\Bulk", "V99") == Dword(99));

  // A batch that cannot be written is taken back whole.
  FileRegistry unwritable(dir.path() / "no such folder" / "registry.reg");
  EXPECT_THROW(unwritable.WriteOnce([&] {
    unwritable.CreateKey(RootKey::CurrentUser, "Software\\Bulk");
    unwritable.SetValue(RootKey::CurrentUser, "Software\\Bulk", "V", Sz("1"));
  }),
               std::runtime_error);
  EXPECT_FALSE(unwritable.QueryValue(RootKey::CurrentUser, "Software\\Bulk", "V"));
  EXPECT_EQ(unwritable.CreateKey(RootKey::CurrentUser, "Software\\Bulk"), KeyDisposition::Failed);

  // A single change that cannot be written gives back the value it replaced.
  registry.data()["HKEY_CURRENT_USER\\Two\nLines"] = {};  // REGEDIT4 cannot write this key
  EXPECT_FALSE(registry.SetValue(RootKey::CurrentUser, "Software\\Bulk", "V1", Sz("new")));
  EXPECT_TRUE(*registry.QueryValue(RootKey::CurrentUser, "Software\\Bulk", "V1") == Dword(1));
  EXPECT_FALSE(registry.SetValue(RootKey::CurrentUser, "Software\\Bulk", "Fresh", Sz("new")));
  EXPECT_FALSE(registry.QueryValue(RootKey::CurrentUser, "Software\\Bulk", "Fresh"));
}

// ------------------------------------------------------------------- files

TEST(SandboxFileSystem, MapsWindowsPathsIntoTheSandbox) {
  TempDir dir;
  const fs::path& sb = dir.path();
  SandboxFileSystem files(sb);
  EXPECT_EQ(files.HostPath("C:\\dir\\f.txt"), sb / "C" / "dir" / "f.txt");
  EXPECT_EQ(files.HostPath("c:\\dir\\f.txt"), sb / "C" / "dir" / "f.txt");
  EXPECT_EQ(files.HostPath("d:/dir/f.txt"), sb / "D" / "dir" / "f.txt");
  EXPECT_EQ(files.HostPath("\\\\server\\share\\x"), sb / "UNC" / "server" / "share" / "x");
  EXPECT_EQ(files.HostPath("\\root\\z"), sb / "C" / "root" / "z");
  EXPECT_EQ(files.HostPath("rel\\y"), sb / "C" / "rel" / "y");
  EXPECT_EQ(files.HostPath("C:\\dir\\"), sb / "C" / "dir");
  EXPECT_EQ(files.HostPath("C:\\dir\\\\sub\\.\\f"), sb / "C" / "dir" / "sub" / "f");
  // ".." never climbs out of the drive or the share.
  EXPECT_EQ(files.HostPath("C:\\a\\..\\..\\..\\etc\\passwd"), sb / "C" / "etc" / "passwd");
  EXPECT_EQ(files.HostPath("\\\\server\\share\\..\\..\\x"), sb / "UNC" / "server" / "share" / "x");

  // Existing entries are found whatever the case the caller writes.
  fs::create_directories(sb / "C" / "Logs");
  WriteFile(sb / "C" / "Logs" / "tzndebuglog.txt", "one\n");
  WriteFile(sb / "C" / "tzndebuglog.txt", "");
  EXPECT_EQ(files.HostPath("C:\\TZNDEBUGLOG.TXT"), sb / "C" / "tzndebuglog.txt");
  EXPECT_EQ(files.HostPath("c:\\LOGS\\TznDebugLog.txt"), sb / "C" / "Logs" / "tzndebuglog.txt");
  EXPECT_EQ(files.HostPath("C:\\logs\\New.txt"), sb / "C" / "Logs" / "New.txt");
  EXPECT_TRUE(files.Exists("C:\\LOGS\\TZNDEBUGLOG.TXT"));
  EXPECT_TRUE(files.Exists("c:\\logs"));
  EXPECT_FALSE(files.Exists("C:\\logs\\other.txt"));
  EXPECT_FALSE(files.Exists(""));

  ASSERT_TRUE(files.AppendText("C:\\LOGS\\TZNDEBUGLOG.TXT", "two\r\n\xC3\xA9"));
  EXPECT_EQ(ReadFile(sb / "C" / "Logs" / "tzndebuglog.txt"), "one\ntwo\r\n\xC3\xA9");
  EXPECT_EQ(std::distance(fs::directory_iterator(sb / "C" / "Logs"), fs::directory_iterator()), 1)
      << "appending in another case must not make a second file";
  EXPECT_TRUE(files.DeleteFile("c:\\logs\\TZNDEBUGLOG.txt"));
  EXPECT_FALSE(fs::exists(sb / "C" / "Logs" / "tzndebuglog.txt"));
}

TEST(SandboxFileSystem, APathEndsAtItsFirstNulAsForTheWindowsApi) {
  using namespace std::string_literals;
  TempDir dir;
  const fs::path& sb = dir.path();
  SandboxFileSystem files(sb);
  fs::create_directories(sb / "C" / "Logs");
  WriteFile(sb / "C" / "Logs" / "tzndebuglog.txt", "one\n");

  EXPECT_EQ(files.HostPath("C:\\LOGS\0\\..\\x"s), sb / "C" / "Logs");
  ASSERT_TRUE(files.AppendText("C:\\LOGS\\TZNDEBUGLOG.TXT\0junk"s, "two\n"));
  EXPECT_EQ(ReadFile(sb / "C" / "Logs" / "tzndebuglog.txt"), "one\ntwo\n");
  EXPECT_EQ(std::distance(fs::directory_iterator(sb / "C" / "Logs"), fs::directory_iterator()), 1)
      << "what follows the NUL must not keep the case-blind lookup from finding the file";
  EXPECT_FALSE(files.Exists("\0C:\\Logs"s));
  EXPECT_FALSE(files.AppendText("C:\\Logs\\\0name.txt"s, "x")) << "names the folder";
  EXPECT_TRUE(files.DeleteFile("c:\\logs\\TznDebugLog.txt\0.bak"s));
  EXPECT_FALSE(fs::exists(sb / "C" / "Logs" / "tzndebuglog.txt"));
}

TEST(SandboxFileSystem, FailsWhereWindowsFails) {
  TempDir dir;
  const fs::path& sb = dir.path();
  SandboxFileSystem files(sb);
  fs::create_directories(sb / "C" / "folder");

  EXPECT_TRUE(files.AppendText("C:\\new.txt", "x"));
  EXPECT_TRUE(files.AppendText("C:\\new.txt", "y"));
  EXPECT_EQ(ReadFile(sb / "C" / "new.txt"), "xy");

  EXPECT_FALSE(files.AppendText("C:\\missing\\log.txt", "x"));
  EXPECT_FALSE(fs::exists(sb / "C" / "missing")) << "a missing folder is not made";
  EXPECT_FALSE(files.AppendText("E:\\log.txt", "x")) << "a drive that is not there";
  EXPECT_FALSE(files.AppendText("C:\\folder", "x"));
  EXPECT_FALSE(files.AppendText("C:\\brandnew\\", "x"));
  EXPECT_FALSE(fs::exists(sb / "C" / "brandnew"));
  EXPECT_FALSE(files.AppendText("", "x"));
  EXPECT_TRUE(fs::is_directory(sb / "C" / "folder"));

  EXPECT_FALSE(files.DeleteFile("C:\\absent.txt"));
  EXPECT_FALSE(files.DeleteFile("C:\\folder"));
  EXPECT_TRUE(fs::is_directory(sb / "C" / "folder"));
  EXPECT_TRUE(files.DeleteFile("C:\\new.txt"));
  EXPECT_FALSE(files.DeleteFile("C:\\new.txt"));
}

// Reading raises what VB's Open raises for the same path on Windows.
TEST(SandboxFileSystem, ReadsFilesWhole) {
  TempDir dir;
  const fs::path& sb = dir.path();
  SandboxFileSystem files(sb);
  fs::create_directories(sb / "C" / "Quarn" / "Sub");
  static const char kText[] = "Item=Class\r\nStereotype=x\0y\n";
  const std::string text(kText, sizeof kText - 1);
  WriteFile(sb / "C" / "Quarn" / "vc.cfg", text);

  EXPECT_EQ(files.ReadText("c:\\QUARN\\VC.CFG"), text);
  auto errorOf = [&](std::string_view path) {
    try {
      files.ReadText(path);
    } catch (const AutomationError& e) {
      return e.number();
    }
    return 0;
  };
  EXPECT_EQ(errorOf("C:\\Quarn\\missing.cfg"), vberr::kFileNotFound);
  EXPECT_EQ(errorOf("C:\\Quarn\\Nowhere\\vc.cfg"), vberr::kPathNotFound);
  EXPECT_EQ(errorOf("E:\\vc.cfg"), vberr::kPathNotFound) << "a drive that is not there";
  EXPECT_EQ(errorOf("C:\\Quarn\\Sub"), vberr::kPathFileAccess);
  EXPECT_EQ(errorOf("C:\\Quarn\\vc.cfg\\more"), vberr::kPathNotFound) << "a file is no folder";
  EXPECT_EQ(errorOf(""), vberr::kPathNotFound);
}

TEST(SandboxFileSystem, NamesMadeAfterAFolderIsReadAreFoundInAnyCase) {
  TempDir dir;
  const fs::path& sb = dir.path();
  fs::create_directories(sb / "C" / "dir");
  WriteFile(sb / "C" / "dir" / "b.txt", "");
  WriteFile(sb / "C" / "dir" / "B.txt", "");
  SandboxFileSystem files(sb);
  // Two spellings on the disk: the first by byte order wins.
  EXPECT_EQ(files.HostPath("C:\\DIR\\b.TXT"), sb / "C" / "dir" / "B.txt");
  // A name handed out for a file not there yet, then made, is found by
  // another spelling though the folder was read before it was made.
  const fs::path made = files.HostPath("C:\\dir\\Report.TXT");
  EXPECT_EQ(made, sb / "C" / "dir" / "Report.TXT");
  WriteFile(made, "r");
  EXPECT_EQ(files.HostPath("c:\\Dir\\REPORT.txt"), made);
  ASSERT_TRUE(files.AppendText("C:\\DIR\\report.TXT", "s"));
  EXPECT_EQ(ReadFile(made), "rs");
  // Once deleted, a name is no longer handed out for another spelling.
  EXPECT_TRUE(files.DeleteFile("C:\\dir\\report.txt"));
  EXPECT_EQ(files.HostPath("C:\\dir\\REPORT.txt"), sb / "C" / "dir" / "REPORT.txt");
  // A name looked up but never made is no answer for another spelling.
  EXPECT_FALSE(files.Exists("C:\\dir\\Ghost.txt"));
  EXPECT_EQ(files.HostPath("C:\\dir\\GHOST.txt"), sb / "C" / "dir" / "GHOST.txt");
  // A folder made later, under a name handed out, is read when first needed.
  fs::create_directories(files.HostPath("C:\\dir\\Later"));
  WriteFile(sb / "C" / "dir" / "Later" / "x.TXT", "");
  EXPECT_EQ(files.HostPath("c:\\DIR\\later\\X.txt"), sb / "C" / "dir" / "Later" / "x.TXT");
}

// ------------------------------------------------------------------- clock

TEST(SystemClock, TimerAgreesWithNowAndAdvances) {
  SystemClock clock;
  const platform::DateTime now = clock.Now();
  const float t0 = clock.Timer();
  EXPECT_GE(t0, 0.0f);
  EXPECT_LE(t0, 86400.0f);  // a float rounds the day's last milliseconds up to 86400
  EXPECT_GE(now.year, 2020);
  const float fromNow = static_cast<float>(now.hour * 3600 + now.minute * 60 + now.second);
  if (t0 > 5.0f) {  // unless midnight fell between the two reads
    EXPECT_NEAR(t0, fromNow, 2.0f);
  }

  clock.Sleep(50);
  const float t1 = clock.Timer();
  if (t1 > t0) {
    EXPECT_GE(t1 - t0, 0.04f);
  }
}

}  // namespace
}  // namespace kpx::posix
