#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

#include <filesystem>
#include <fstream>
#include <random>
#include <sstream>

#include "doctor/checks.h"
#include "doctor/debug_mask.h"
#include "doctor/doctor.h"
#include "doctor/log_reader.h"
#include "fakes.h"
#include "platform/posix/sandbox_machine.h"
#include "shared/shared_debug_logger.h"
#include "shared/shared_registryapi2.h"

namespace kpx::doctor {
namespace {

namespace fs = std::filesystem;

// ------------------------------------------------------------- the mask

TEST(DoctorMask, EveryComputedMaskDecodesToItsIdsAndLevelsAndTheLoggerFiltersExactlySo) {
  std::mt19937 random(7);
  for (int round = 0; round < 300; ++round) {
    std::vector<int> ids, levels;
    for (int id = 1; id <= 14; ++id)
      if (random() & 1) ids.push_back(id);
    for (int level = 0; level <= 6; ++level)
      if (random() & 1) levels.push_back(level);
    const uint32_t mask = EncodeMask(ids, levels);

    // By name, as a modeller types them, and back.
    std::string error;
    if (!ids.empty()) {
      ASSERT_EQ(ParseLogIds(IdNames(ids), error), ids) << IdNames(ids);
    }
    const MaskParts parts = DecodeMask(mask);
    ASSERT_EQ(parts.ids, ids);
    ASSERT_EQ(parts.levels, levels);
    ASSERT_EQ(parts.unusedBits, 0u);

    // The add-in's own filter agrees with the decoding, ids and levels out of
    // range included.
    test::World world;
    platform::Platform platform = world.platform();
    world.registry.CreateKey(RootKey::LocalMachine, kDebugSettingsKey);
    RegistrySetValue(world.registry, RootKey::LocalMachine, kDebugSettingsKey, "Debug",
                     Variant(static_cast<int32_t>(mask)), platform::kRegDword);
    DebugLogger logger(platform);
    for (int id = -1; id <= 16; ++id)
      for (int level = -1; level <= 8; ++level) {
        const bool idOn = std::find(ids.begin(), ids.end(), id) != ids.end();
        const int filterLevel = level < 0 || level > 6 ? 6 : level;
        const bool levelOn = std::find(levels.begin(), levels.end(), filterLevel) != levels.end();
        ASSERT_EQ(logger.DebugLogEnabled(id, level), idOn && levelOn) << "mask " << mask << " id " << id << " level " << level;
      }
  }
}

TEST(DoctorMask, NamesNumbersAllAndBadInput) {
  std::string error;
  EXPECT_EQ(ParseLogIds("addin, Ide ,7", error), (std::vector<int>{7, 12}));
  EXPECT_EQ(ParseLevels("all", error)->size(), 7u);
  EXPECT_EQ(EncodeMask(*ParseLogIds("ADDIN", error), *ParseLevels("ERROR,TRACE", error)), 0x12000080u);
  EXPECT_FALSE(ParseLogIds("ADDIN,NOPE", error));
  EXPECT_NE(error.find("\"NOPE\""), std::string::npos);
  EXPECT_FALSE(ParseLogIds("UNKNOWN", error)) << "id 0 is never written, so it cannot be chosen";
  EXPECT_FALSE(ParseLevels("ERROR,,TRACE", error));
  EXPECT_FALSE(ParseLevels("7", error));

  EXPECT_EQ(DecodeMask(0x80000001u).unusedBits, 0x80000001u);
  EXPECT_EQ(ParseMaskValue("0x12000080"), 0x12000080u);
  EXPECT_EQ(ParseMaskValue("&H80"), 0x80u);
  EXPECT_EQ(ParseMaskValue("-1"), 0xFFFFFFFFu);
  EXPECT_EQ(ParseMaskValue("301990016"), 0x12000080u);
  EXPECT_FALSE(ParseMaskValue("4294967296"));
  EXPECT_FALSE(ParseMaskValue("12abc"));
  EXPECT_FALSE(ParseMaskValue("0x"));
}

// The scenario debug-mask-errors-only shows the add-in writing exactly the
// lines of the mask the doctor computes for "ADDIN at ERROR"; it must hold
// that very mask.
TEST(DoctorMask, TheErrorsOnlyScenarioHoldsTheMaskTheDoctorComputes) {
  std::ifstream in(std::string(KPX_SCENARIO_DIR) + "/debug-mask-errors-only.model.json");
  const nlohmann::json model = nlohmann::json::parse(in);
  const std::string held =
      model["registry"]["HKEY_LOCAL_MACHINE\\SOFTWARE\\Tolvek Software\\Quarn\\AddIns\\VisualStudio"]["Debug"]["dword"];
  std::string error;
  EXPECT_EQ(ParseMaskValue(held), EncodeMask(*ParseLogIds("ADDIN", error), *ParseLevels("ERROR", error)));
}

// ------------------------------------------------------------- the log

TEST(DoctorLog, ReadsBackWhatTheLoggerWritesWithAndWithoutStamps) {
  for (const char* suppress : {"", "TRUE"}) {
    test::World world;
    platform::Platform platform = world.platform();
    world.registry.CreateKey(RootKey::LocalMachine, kDebugSettingsKey);
    RegistrySetValue(world.registry, RootKey::LocalMachine, kDebugSettingsKey, "Debug", Variant(int32_t(-1)),
                     platform::kRegDword);
    RegistrySetValue(world.registry, RootKey::LocalMachine, kDebugSettingsKey, "SuppressTimeStamps",
                     Variant(std::string(suppress)), platform::kRegSz);
    DebugLogger logger(platform);
    logger.DebugLog("kpxAddin.OnActivate(QuarnApp)", logid::ADDIN, loglevel::TRACE);
    logger.DebugLog("eight wide  ERROR    ADDIN  inside", 8, loglevel::CRITICAL);
    logger.DebugLog("", 14, 9);
    logger.DebugLog("failed: (x) ", logid::ADDIN, loglevel::ERROR);
    const std::string text = world.files.at("C:\\tzndebuglog.txt") + "a line some other program wrote\r\n";

    std::istringstream lines(text);
    std::string line;
    std::vector<LogLine> parsed;
    while (std::getline(lines, line)) {
      line.pop_back();  // CR
      if (auto p = ParseLogLine(line)) parsed.push_back(*p);
    }
    ASSERT_EQ(parsed.size(), 4u) << text;
    EXPECT_EQ(parsed[0].level, loglevel::TRACE);
    EXPECT_EQ(parsed[0].message, "kpxAddin.OnActivate(QuarnApp)");
    EXPECT_EQ(parsed[1].logId, 8);
    EXPECT_EQ(parsed[1].message, "eight wide  ERROR    ADDIN  inside");
    EXPECT_EQ(parsed[2].logId, 14);
    EXPECT_EQ(parsed[2].level, 9);
    EXPECT_EQ(parsed[2].message, "");
    EXPECT_EQ(parsed[3].message, "failed: (x) ");
    EXPECT_EQ(parsed[0].stamp.empty(), std::string(suppress) == "TRUE");

    EXPECT_EQ(FilterLog(text, {}).size(), 5u);
    std::vector<std::string> errors = FilterLog(text, {{loglevel::ERROR}, {}});
    ASSERT_EQ(errors.size(), 1u);
    EXPECT_NE(errors[0].find("failed: (x) "), std::string::npos);
    EXPECT_EQ(FilterLog(text, {{}, {logid::ADDIN}}).size(), 2u);
    EXPECT_EQ(FilterLog(text, {{loglevel::CRITICAL}, {logid::ADDIN}}).size(), 0u);
  }
}

// ------------------------------------------------------------ the checks

// A Windows DLL as far as the checks read one: the DOS header's pointer to
// the PE header and the machine it names.
std::string PeFile(uint16_t machine) {
  std::string bytes(0x40, '\0');
  bytes[0] = 'M', bytes[1] = 'Z';
  bytes[0x3C] = 0x40;
  bytes += std::string("PE\0\0", 4);
  bytes += static_cast<char>(machine & 0xFF);
  bytes += static_cast<char>(machine >> 8);
  return bytes;
}
constexpr uint16_t kI386 = 0x014C, kAmd64 = 0x8664;

constexpr const char* kInstall = "C:\\Program Files\\kpxAddIn";

struct ServerKeys {
  const char* dll;
  std::vector<std::pair<const char*, const char*>> classes;  // ProgID, class id
  const char* libid;
};
const ServerKeys kRes{"kpxres.dll", {{"kpxres.KPXResourceInterface", "{87694CC1-5110-11D3-B9F8-006008BF3ACB}"}},
                      "{4ED818EC-01C0-42B2-938B-A3D1C09740EB}"};
const ServerKeys kAdd{"kpxaddin.dll",
                      {{"kpxAddIn.API", "{2D1767C8-8B10-4302-8E74-1E0BF011D914}"},
                       {"kpxAddIn.TokenScanner", "{3625D03C-F587-4C68-94E3-9D82FAF1CD65}"}},
                      "{F845D8FA-67C0-4002-B806-E4EE645261AA}"};

const char* const kCompanionProgIds[] = {"kpxModelAssist.API",     "kpxmdcnv.API",
                                         "tznclwiz.api",           "kpxImportMFC.API",
                                         "kpxLangSupport.kpxStatementGenerator", "kpxCodeView.kpxCodeViewAPI",
                                         "kpxatltools.kpxatlGUI",  "kpxatlassist.kpxatlAPI"};
const char* const kCompanionClasses[] = {"{05D99488-AB9F-11D2-B9EB-006008BF3ACB}",
                                         "{CFD996E3-1393-11D3-B9F3-006008BF3ACB}",
                                         "{B025E5DB-4064-11D3-B9F7-006008BF3ACB}"};

// A sandbox with everything the add-in needs installed, as the package
// installs it; each test breaks one thing.
class DoctorChecks : public ::testing::Test {
 protected:
  void SetUp() override {
    dir = fs::temp_directory_path() / ("kpx-doctor-" + std::to_string(::getpid()) + "-" +
                                      ::testing::UnitTest::GetInstance()->current_test_info()->name());
    fs::remove_all(dir);
    fs::create_directories(dir / "C");
    Registration(kRes, std::string(kInstall) + "\\kpxres.dll");
    Registration(kAdd, std::string(kInstall) + "\\kpxaddin.dll");
    File(std::string(kInstall) + "\\kpxres.dll", PeFile(kI386));
    File(std::string(kInstall) + "\\kpxaddin.dll", PeFile(kI386));
    int n = 0;
    for (const char* progId : kCompanionProgIds) {
      const std::string clsid = "{00000000-0000-0000-0000-0000000000" + std::to_string(10 + n++) + "}";
      Value("HKEY_CLASSES_ROOT\\" + std::string(progId) + "\\CLSID", "@", clsid);
      Value("HKEY_CLASSES_ROOT\\CLSID\\" + clsid + "\\InprocServer32", "@", "C:\\Quarn\\companions.dll");
    }
    for (const char* clsid : kCompanionClasses)
      Value("HKEY_CLASSES_ROOT\\CLSID\\" + std::string(clsid) + "\\LocalServer32", "@",
            "\"C:\\Quarn\\companion server.exe\" /automation");
    File("C:\\Quarn\\companions.dll", PeFile(kI386));
    File("C:\\Quarn\\companion server.exe", PeFile(kI386));
    Value("HKEY_LOCAL_MACHINE\\SOFTWARE\\Microsoft\\VisualStudio\\6.0\\Setup\\Microsoft Visual C++", "ProductDir",
          "C:\\VS\\VC98");
    Value("HKEY_LOCAL_MACHINE\\SOFTWARE\\Microsoft\\VisualStudio\\6.0\\Setup\\Microsoft Visual Studio", "ProductDir",
          "C:\\VS");
    File("C:\\VS\\Common\\Tools\\windiff.exe", PeFile(kI386));
    Value("HKEY_CURRENT_USER\\Software\\Microsoft\\DevStudio\\6.0\\AddIns\\kpxIDEAddin.DSAddIn", "Filename",
          "C:\\Quarn\\vc\\dlls\\kpxideaddin.dll");
    File("C:\\Quarn\\vc\\dlls\\kpxideaddin.dll", PeFile(kI386));
    Value("HKEY_LOCAL_MACHINE\\SOFTWARE\\Tolvek Software\\Quarn\\AddIns\\VisualStudio", "DebugOutputFile",
          "C:\\Temp\\kpx.log");
    Value("HKEY_CURRENT_USER\\SOFTWARE\\Tolvek Software\\Quarn\\AddIns\\VisualStudio", "Active", "Yes");
    Value("HKEY_LOCAL_MACHINE\\SOFTWARE\\Tolvek Software\\Quarn\\AddIns\\VC++", "InstallDir", "C:\\Quarn\\VC");
    Value("HKEY_LOCAL_MACHINE\\SOFTWARE\\Tolvek Software\\Quarn\\AddIns\\VC++", "StereotypeCfgFile", "stereo.cfg");
    File("C:\\Quarn\\VC\\stereo.cfg", "Item=Component\r\nStereotype=dll\r\nItem=Class\r\nStereotype=atlobject\r\n");
    fs::create_directories(dir / "C" / "Temp");
    Mask(0x12000080);
  }
  void TearDown() override { fs::remove_all(dir); }

  void Registration(const ServerKeys& s, const std::string& path) {
    for (auto [progId, clsid] : s.classes) {
      const std::string key = std::string("HKEY_CLASSES_ROOT\\CLSID\\") + clsid;
      Value(key, "@", progId);
      Value(key + "\\InprocServer32", "@", path);
      Value(key + "\\InprocServer32", "ThreadingModel", "Apartment");
      Value(key + "\\ProgID", "@", progId);
      Value(key + "\\TypeLib", "@", s.libid);
      Value(std::string("HKEY_CLASSES_ROOT\\") + progId + "\\CLSID", "@", clsid);
    }
    Value(std::string("HKEY_CLASSES_ROOT\\TypeLib\\") + s.libid + "\\1.0\\0\\win32", "@", path);
  }
  void Unregister(const ServerKeys& s) {
    for (auto [progId, clsid] : s.classes) {
      Remove(std::string("HKEY_CLASSES_ROOT\\CLSID\\") + clsid);
      Remove(std::string("HKEY_CLASSES_ROOT\\") + progId);
    }
    Remove(std::string("HKEY_CLASSES_ROOT\\TypeLib\\") + s.libid);
  }
  // "@" is the key's default value, as REGEDIT4 writes it.
  void Value(const std::string& key, const std::string& name, const std::string& value) {
    registry[key][name == "@" ? "" : name] = {platform::kRegSz, value + '\0'};
  }
  void Mask(uint32_t mask) {
    std::string bytes(4, '\0');
    for (int i = 0; i < 4; ++i) bytes[i] = static_cast<char>(mask >> (8 * i));
    registry["HKEY_LOCAL_MACHINE\\SOFTWARE\\Tolvek Software\\Quarn\\AddIns\\VisualStudio"]["Debug"] = {
        platform::kRegDword, bytes};
  }
  // The key and every key below it.
  void Remove(const std::string& key) {
    for (auto it = registry.begin(); it != registry.end();)
      it = EqualsNoCase(it->first, key) || EqualsNoCase(it->first.substr(0, key.size() + 1), key + "\\")
               ? registry.erase(it)
               : std::next(it);
  }
  fs::path Host(std::string_view windows) {
    std::string rel(windows.substr(3));
    std::replace(rel.begin(), rel.end(), '\\', '/');
    return dir / "C" / rel;
  }
  void File(std::string_view windows, const std::string& bytes) {
    fs::create_directories(Host(windows).parent_path());
    std::ofstream(Host(windows), std::ios::binary) << bytes;
  }

  std::vector<Finding> Run(Options options = {}) {
    std::ofstream(dir / "registry.reg", std::ios::binary) << kpx::posix::WriteRegedit(registry);
    kpx::posix::SandboxMachine machine(dir);
    return RunChecks(machine, options);
  }
  static const Finding& Get(const std::vector<Finding>& findings, const std::string& id) {
    for (const Finding& f : findings)
      if (f.id == id) return f;
    throw std::runtime_error("no finding " + id);
  }
  // Every finding but `id` (and the creation checks, which a sandbox skips)
  // is OK; `id` has the verdict, and WARN or FAIL says what to do.
  void ExpectOnly(const std::vector<Finding>& findings, const std::string& id, Verdict verdict,
                  const std::string& detailPart) {
    for (const Finding& f : findings) {
      if (f.id == id) {
        EXPECT_EQ(f.verdict, verdict) << f.id << ": " << f.detail;
        EXPECT_NE(f.detail.find(detailPart), std::string::npos) << f.detail;
        EXPECT_FALSE(f.meaning.empty());
        EXPECT_FALSE(f.fix.empty());
      } else if (f.id.find("creatable") == std::string::npos) {
        EXPECT_EQ(f.verdict, Verdict::Ok) << f.id << ": " << f.detail;
      }
    }
    EXPECT_EQ(ExitCode(findings), verdict == Verdict::Fail ? 1 : 0);
  }

  fs::path dir;
  kpx::posix::RegeditData registry;
};

TEST_F(DoctorChecks, AnIntactInstallationIsAllOkAndTheSandboxSkipsOnlyCreation) {
  const std::vector<Finding> findings = Run();
  for (const Finding& f : findings) {
    const bool creation = f.id.find("creatable") != std::string::npos;
    EXPECT_EQ(f.verdict, creation ? Verdict::Skip : Verdict::Ok) << f.id << ": " << f.detail;
    EXPECT_FALSE(f.guards.empty()) << f.id;
  }
  EXPECT_EQ(ExitCode(findings), 0);
  EXPECT_EQ(Get(findings, "stereotypes").detail, "C:\\Quarn\\VC\\stereo.cfg: 1 component and 1 class stereotypes");
}

TEST_F(DoctorChecks, TheResourceComponentUnregisteredStopsTheAddIn) {
  Unregister(kRes);
  ExpectOnly(Run(), "resource-registered-32", Verdict::Fail, "not registered for 32-bit programs");
}

TEST_F(DoctorChecks, TheX64BuildRegisteredForTheHostIsTheWrongBitness) {
  File(std::string(kInstall) + "\\kpxaddin.dll", PeFile(kAmd64));
  ExpectOnly(Run(), "addin-registered-32", Verdict::Fail, "is a 64-bit DLL registered for 32-bit programs");
}

TEST_F(DoctorChecks, HalfRightRegistrationsAreNamed) {
  Value("HKEY_CLASSES_ROOT\\CLSID\\{2D1767C8-8B10-4302-8E74-1E0BF011D914}\\InprocServer32", "ThreadingModel", "Both");
  Value("HKEY_CLASSES_ROOT\\kpxAddIn.TokenScanner\\CLSID", "@", "{11111111-8B10-4302-8E74-1E0BF011D914}");
  Remove("HKEY_CLASSES_ROOT\\TypeLib\\{F845D8FA-67C0-4002-B806-E4EE645261AA}");
  const Finding f = Get(Run(), "addin-registered-32");
  EXPECT_EQ(f.verdict, Verdict::Fail);
  EXPECT_NE(f.detail.find("threading model \"Both\""), std::string::npos) << f.detail;
  EXPECT_NE(f.detail.find("ProgID kpxAddIn.TokenScanner names class {11111111"), std::string::npos) << f.detail;
  EXPECT_NE(f.detail.find("is not registered for win32"), std::string::npos) << f.detail;

  fs::remove(Host(std::string(kInstall) + "\\kpxres.dll"));
  EXPECT_NE(Get(Run(), "resource-registered-32").detail.find("kpxres.dll does not exist"), std::string::npos);
}

TEST_F(DoctorChecks, WithoutVisualCppOrTheIdeAddInFileTheAddInSwitchesItselfOff) {
  Remove("HKEY_LOCAL_MACHINE\\SOFTWARE\\Microsoft\\VisualStudio\\6.0\\Setup\\Microsoft Visual C++");
  std::vector<Finding> findings = Run();
  ExpectOnly(findings, "visual-cpp", Verdict::Fail, "has no \"ProductDir\"");
  EXPECT_NE(Get(findings, "visual-cpp").meaning.find("Microsoft Visual C++ 6 is not installed"), std::string::npos);

  SetUp();
  fs::remove(Host("C:\\Quarn\\vc\\dlls\\kpxideaddin.dll"));
  ExpectOnly(Run(), "ide-addin", Verdict::Fail, "C:\\Quarn\\vc\\dlls\\kpxideaddin.dll");
  // A Quarn folder given on the command line wins over the key.
  File("C:\\Other\\vc\\dlls\\kpxideaddin.dll", PeFile(kI386));
  EXPECT_EQ(Get(Run({"C:\\Other\\ "}), "ide-addin").verdict, Verdict::Ok);
}

TEST_F(DoctorChecks, FeatureFaultsWarnAndLeaveTheExitCodeZero) {
  Value("HKEY_CURRENT_USER\\SOFTWARE\\Tolvek Software\\Quarn\\AddIns\\VisualStudio", "Active", "No");
  ExpectOnly(Run(), "visualstudio-addin", Verdict::Warn, "switched off");

  SetUp();
  Remove("HKEY_CLASSES_ROOT\\kpxatlassist.kpxatlAPI");
  ExpectOnly(Run(), "companion:kpxatlassist.kpxatlAPI", Verdict::Warn, "not registered");

  SetUp();
  fs::remove(Host("C:\\Quarn\\companion server.exe"));
  const std::vector<Finding> findings = Run();
  EXPECT_EQ(Get(findings, "companion:{B025E5DB-4064-11D3-B9F7-006008BF3ACB}").verdict, Verdict::Warn);
  EXPECT_NE(Get(findings, "companion:{B025E5DB-4064-11D3-B9F7-006008BF3ACB}").detail.find("companion server.exe does not exist"),
            std::string::npos);

  SetUp();
  Value("HKEY_LOCAL_MACHINE\\SOFTWARE\\Tolvek Software\\Quarn\\AddIns\\VisualStudio", "DebugOutputFile",
        "C:\\NoSuchFolder\\kpx.log");
  ExpectOnly(Run(), "debug-log", Verdict::Warn, "C:\\NoSuchFolder\\kpx.log cannot be written");

  SetUp();
  fs::remove(Host("C:\\Quarn\\VC\\stereo.cfg"));
  ExpectOnly(Run(), "stereotypes", Verdict::Warn, "cannot be read");
}

TEST_F(DoctorChecks, TheDifferenceToolAsEachSettingFormNamesIt) {
  const std::string events = "HKEY_CURRENT_USER\\SOFTWARE\\Tolvek Software\\Quarn\\AddIns\\VC++\\Events";
  Value(events, "OnDifference", " shell \"C:\\Tools\\dd.exe\" -a %2 %1 | Compare ");
  ExpectOnly(Run(), "difference-tool", Verdict::Warn, "C:\\Tools\\dd.exe does not exist");
  File("C:\\Tools\\dd.exe", PeFile(kI386));
  EXPECT_EQ(Get(Run(), "difference-tool").verdict, Verdict::Ok);

  Value(events, "OnDifference", "shell notepad %1");
  EXPECT_EQ(Get(Run(), "difference-tool").detail, "shell: notepad, looked for on the search path when it runs");
  // A word that is not "shell" is a ProgID, "shellexecute" too.
  Value(events, "OnDifference", "shellexecute notepad");
  EXPECT_EQ(Get(Run(), "difference-tool").verdict, Verdict::Warn);
  Value(events, "OnDifference", "kpxModelAssist.API|Compare");
  EXPECT_EQ(Get(Run(), "difference-tool").detail, "component kpxModelAssist.API");
  Value(events, "OnDifference", "WINDIFF");
  Remove("HKEY_LOCAL_MACHINE\\SOFTWARE\\Microsoft\\VisualStudio\\6.0\\Setup\\Microsoft Visual Studio");
  EXPECT_NE(Get(Run(), "difference-tool").detail.find("has no \"ProductDir\""), std::string::npos);
}

// ------------------------------------------------------- the command line

TEST_F(DoctorChecks, CommandLineJsonMaskAndLog) {
  Run();
  kpx::posix::SandboxMachine machine(dir);
  std::ostringstream out, err;
  ASSERT_EQ(RunDoctor({"--json"}, machine, out, err), 0) << err.str();
  const nlohmann::json report = nlohmann::json::parse(out.str());
  EXPECT_EQ(report["exitCode"], 0);
  EXPECT_EQ(report["summary"]["fail"], 0);
  EXPECT_EQ(report["checks"].size(), report["summary"]["ok"].get<size_t>() + report["summary"]["skip"].get<size_t>());

  // --set writes the mask the add-in then reads; the plain command decodes it.
  out.str("");
  ASSERT_EQ(RunDoctor({"mask", "--ids", "ADDIN,IDE", "--levels", "ERROR", "--set"}, machine, out, err), 0) << err.str();
  kpx::posix::SandboxMachine reread(dir);
  EXPECT_EQ(ReadDebugSettings(reread).mask, (1u << 7) | (1u << 12) | (1u << 25));
  out.str("");
  ASSERT_EQ(RunDoctor({"mask"}, reread, out, err), 0);
  EXPECT_NE(out.str().find("log ids:   ADDIN, IDE\nlevels:    ERROR\n"), std::string::npos) << out.str();
  EXPECT_NE(out.str().find("written at ERROR"), std::string::npos) << out.str();

  File("C:\\Temp\\kpx.log", " TRACE    ADDIN     one\r\n ERROR    ADDIN     two\r\n ERROR    IDE       three\r\n");
  out.str("");
  ASSERT_EQ(RunDoctor({"log", "--level", "error", "--id", "ADDIN"}, reread, out, err), 0) << err.str();
  EXPECT_NE(out.str().find("debug log: C:\\Temp\\kpx.log (from DebugOutputFile)"), std::string::npos) << out.str();
  EXPECT_NE(out.str().find("lines:     1 that pass the filter\n ERROR    ADDIN     two\n"), std::string::npos) << out.str();

  for (std::vector<std::string> bad : std::vector<std::vector<std::string>>{
           {"mask", "--ids", "ADDIN"}, {"mask", "--ids", "NOPE", "--levels", "ERROR"}, {"log", "--level"}, {"--frobnicate"}}) {
    err.str("");
    EXPECT_EQ(RunDoctor(bad, reread, out, err), 2) << bad[0];
    EXPECT_NE(err.str().find("usage:"), std::string::npos);
  }
}

}  // namespace
}  // namespace kpx::doctor
