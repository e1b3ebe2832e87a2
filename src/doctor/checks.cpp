#include "doctor/checks.h"

#include <algorithm>
#include <cstring>

#include "automation/variant.h"
#include "automation/vb_strings.h"
#include "doctor/debug_mask.h"
#include "addin/ide_registration.h"
#include "model/stereotype_config.h"
#include "restore/difference_tool.h"
#include "shared/shared_utilities.h"
#include "shared/resource_texts.h"
#include "shared/shared_debug_logger.h"

namespace kpx::doctor {

namespace {

// ------------------------------------------------------------ our servers

struct ClassIdentity {
  const char* progId;
  const char* clsid;
};

// What each DLL registers for itself: the identities of its type library.
struct Server {
  const char* file;
  const char* idPrefix;  // of its findings
  const char* name;      // in the report
  std::vector<ClassIdentity> classes;
  const char* libid;
  const char* libVersion;
  const char* missingMeans;
};

const Server kResource{
    "kpxres.dll", "resource", "resource component",
    {{"kpxres.KPXResourceInterface", "{87694CC1-5110-11D3-B9F8-006008BF3ACB}"}},
    "{4ED818EC-01C0-42B2-938B-A3D1C09740EB}", "1.0",
    "Quarn cannot create the add-in: every text the add-in shows comes from the resource component, so creating "
    "kpxAddIn.API fails (error 429) and Quarn says nothing"};

const Server kAddIn{
    "kpxaddin.dll", "addin", "add-in",
    {{"kpxAddIn.API", "{2D1767C8-8B10-4302-8E74-1E0BF011D914}"},
     {"kpxAddIn.TokenScanner", "{3625D03C-F587-4C68-94E3-9D82FAF1CD65}"}},
    "{F845D8FA-67C0-4002-B806-E4EE645261AA}", "1.0",
    "Quarn cannot create the VC++ add-in: the language, its menus and its commands are missing"};

Finding NewFinding(std::string id, std::string title, std::string guards) {
  Finding f;
  f.id = std::move(id);
  f.title = std::move(title);
  f.guards = std::move(guards);
  return f;
}

int Bits(View v) { return v == View::Bits32 ? 32 : 64; }
std::string BitsText(View v) { return std::to_string(Bits(v)) + "-bit"; }

// The bitness of a Windows executable from its PE header; 0 when the bytes
// are not one.
int PeBits(std::string_view head) {
  if (head.size() < 0x40 || head.substr(0, 2) != "MZ") return 0;
  auto byte = [&](size_t i) { return static_cast<uint32_t>(static_cast<unsigned char>(head[i])); };
  const uint32_t pe = byte(0x3C) | byte(0x3D) << 8 | byte(0x3E) << 16 | byte(0x3F) << 24;
  if (pe > head.size() || head.size() - pe < 6 || head.substr(pe, 4) != std::string_view("PE\0\0", 4)) return 0;
  switch (byte(pe + 4) | byte(pe + 5) << 8) {
    case 0x014C: return 32;  // i386
    case 0x8664: return 64;  // AMD64
    case 0xAA64: return 64;  // ARM64
    default: return 0;
  }
}

std::string Joined(const std::vector<std::string>& parts, const char* separator) {
  std::string out;
  for (const std::string& p : parts) out += (out.empty() ? "" : separator) + p;
  return out;
}

struct Registration {
  bool present = false;  // any of the server's classes has a key in the view
  std::string path;
  std::vector<std::string> problems;
};

// A registered file: it must exist and be built for the view's programs.
void CheckFile(Machine& m, View view, const std::string& path, const std::string& what,
               std::vector<std::string>& problems) {
  switch (m.Kind(path)) {
    case PathKind::Missing: problems.push_back(what + " " + path + " does not exist"); return;
    case PathKind::Folder: problems.push_back(what + " " + path + " is a folder"); return;
    case PathKind::File: break;
  }
  const int bits = PeBits(m.ReadHead(path, 4096));
  if (bits == 0)
    problems.push_back(what + " " + path + " is not a Windows DLL");
  else if (bits != Bits(view))
    problems.push_back(what + " " + path + " is a " + std::to_string(bits) + "-bit DLL registered for " +
                       BitsText(view) + " programs");
}

Registration ReadRegistration(Machine& m, View view, const Server& server) {
  Registration r;
  std::vector<std::string> paths;
  for (const ClassIdentity& c : server.classes) {
    const std::string key = std::string("CLSID\\") + c.clsid;
    if (!m.KeyExists(view, Hive::ClassesRoot, key)) {
      r.problems.push_back(std::string("class ") + c.clsid + " (" + c.progId + ") is not registered");
      continue;
    }
    r.present = true;
    std::optional<std::string> progClass = m.ReadString(view, Hive::ClassesRoot, std::string(c.progId) + "\\CLSID", "");
    if (!progClass)
      r.problems.push_back(std::string("ProgID ") + c.progId + " is not registered");
    else if (!EqualsNoCase(*progClass, c.clsid))
      r.problems.push_back(std::string("ProgID ") + c.progId + " names class " + *progClass + ", not " + c.clsid);
    std::optional<std::string> path = m.ReadString(view, Hive::ClassesRoot, key + "\\InprocServer32", "");
    if (!path || path->empty()) {
      r.problems.push_back(std::string("class ") + c.clsid + " has no InprocServer32 file");
      continue;
    }
    if (std::find_if(paths.begin(), paths.end(), [&](const std::string& p) { return EqualsNoCase(p, *path); }) ==
        paths.end())
      paths.push_back(*path);
    std::optional<std::string> model = m.ReadString(view, Hive::ClassesRoot, key + "\\InprocServer32", "ThreadingModel");
    if (!model || !EqualsNoCase(*model, "Apartment"))
      r.problems.push_back(std::string("class ") + c.clsid + " has threading model \"" + model.value_or("") +
                           "\", not \"Apartment\"");
    std::optional<std::string> lib = m.ReadString(view, Hive::ClassesRoot, key + "\\TypeLib", "");
    if (!lib || !EqualsNoCase(*lib, server.libid))
      r.problems.push_back(std::string("class ") + c.clsid + " names type library \"" + lib.value_or("") +
                           "\", not " + server.libid);
  }
  if (!r.present) return r;
  if (paths.size() > 1) r.problems.push_back("its classes are registered in different files: " + Joined(paths, ", "));
  if (!paths.empty()) {
    r.path = paths.front();
    CheckFile(m, view, r.path, server.file, r.problems);
  }
  const std::string platform = view == View::Bits32 ? "win32" : "win64";
  const std::string libKey = std::string("TypeLib\\") + server.libid + "\\" + server.libVersion + "\\0\\" + platform;
  std::optional<std::string> libPath = m.ReadString(view, Hive::ClassesRoot, libKey, "");
  if (!libPath || libPath->empty())
    r.problems.push_back(std::string("type library ") + server.libid + " is not registered for " + platform);
  else if (m.Kind(*libPath) != PathKind::File)
    r.problems.push_back("type library file " + *libPath + " does not exist");
  return r;
}

std::string RegisterFix(View view) {
  if (view == View::Bits32)
    return "install kpxaddin-x86.msi again (msiexec /i kpxaddin-x86.msi), or register by hand with the 32-bit "
           "regsvr32 (%WINDIR%\\SysWOW64\\regsvr32.exe on 64-bit Windows): regsvr32 kpxres.dll, then regsvr32 "
           "kpxaddin.dll";
  return "install kpxaddin-x64.msi again, or register the x64 build with the 64-bit regsvr32: regsvr32 kpxres.dll, "
         "then regsvr32 kpxaddin.dll";
}

Finding RegistrationFinding(View view, const Server& server, const Registration& r) {
  Finding f = NewFinding(std::string(server.idPrefix) + "-registered-" + std::to_string(Bits(view)),
                         std::string(server.file) + " registered for " + BitsText(view) + " programs",
                         view == View::Bits32 ? "creating the add-in in the 32-bit Quarn host"
                                              : "creating the add-in in 64-bit hosts (Quarn itself is 32-bit)");
  if (!r.present && view == View::Bits64) {
    f.verdict = Verdict::Ok;
    f.detail = "not registered for 64-bit programs; the 32-bit Quarn host does not need it";
    return f;
  }
  if (r.problems.empty()) {
    f.verdict = Verdict::Ok;
    f.detail = r.path;
    return f;
  }
  f.verdict = view == View::Bits32 ? Verdict::Fail : Verdict::Warn;
  f.detail = r.present ? Joined(r.problems, "; ") : "not registered for " + BitsText(view) + " programs";
  f.meaning = view == View::Bits32 ? server.missingMeans
                                   : std::string("64-bit hosts cannot create the ") + server.name +
                                         "; the 32-bit Quarn host is not affected";
  f.fix = RegisterFix(view);
  return f;
}

// `registered`: whether the server has classes in `own`, the view of this
// program's bitness.
Finding CreationFinding(Machine& m, View own, const Server& server, bool registered) {
  const ClassIdentity& first = server.classes.front();
  Finding f = NewFinding(std::string(server.idPrefix) + "-creatable",
                         std::string(first.progId) + " created in a " + BitsText(own) + " program",
                         server.idPrefix == std::string("addin") ? "Quarn starting the add-in" : "every text the add-in shows");
  if (!registered) {
    f.verdict = Verdict::Skip;
    f.detail = "not registered for " + BitsText(own) + " programs";
    return f;
  }
  Creation c = m.CreateInProcess(first.progId);
  switch (c.outcome) {
    case Creation::Outcome::Created: f.verdict = Verdict::Ok; f.detail = "created and released"; return f;
    case Creation::Outcome::Unavailable: f.verdict = Verdict::Skip; f.detail = c.detail; return f;
    case Creation::Outcome::Failed: break;
  }
  f.verdict = own == View::Bits32 ? Verdict::Fail : Verdict::Warn;
  f.detail = c.detail;
  f.meaning = own == View::Bits32 ? server.missingMeans
                                  : std::string("64-bit hosts cannot create the ") + server.name;
  f.fix = server.idPrefix == std::string("addin")
              ? "check the resource component's line above first; if it is OK, install the package for this bitness "
                "again"
              : RegisterFix(own);
  return f;
}

// --------------------------------------------------------- the host's side


// What the add-in writes to Quarn's log at every start while this is so.
std::string HostLogSays(int32_t id) {
  const char* text = FindResourceText(id);
  return std::string("at every start the add-in writes to Quarn's log: \"") + (text ? text : "") + "\"";
}

std::string Value(Machine& m, Hive hive, const std::string& key, const char* name) {
  return m.ReadString(View::Bits32, hive, key, name).value_or("");
}

Finding VisualCppFinding(Machine& m) {
  Finding f = NewFinding("visual-cpp", "Visual C++ 6 installed", "the add-in staying active (round-trip engineering needs it)");
  const std::string dir = Value(m, Hive::LocalMachine, std::string(kVisualCppSetupKey), "ProductDir");
  if (!dir.empty()) {
    f.detail = "ProductDir " + dir;
    return f;
  }
  f.verdict = Verdict::Fail;
  f.detail = "HKEY_LOCAL_MACHINE\\" + std::string(kVisualCppSetupKey) + " has no \"ProductDir\"";
  f.meaning = HostLogSays(5031);
  f.fix = "install Visual C++ 6 (Visual Studio 6.0); if it is installed, repair it so that its setup writes ProductDir";
  return f;
}

Finding IdeAddInFinding(Machine& m, const Options& options) {
  Finding f = NewFinding("ide-addin", "Developer Studio add-in kpxideaddin.dll", "the add-in staying active (round-trip engineering)");
  std::string file;
  std::string from;
  const std::string key(kIdeAddInKey);
  const std::string registered = m.ReadString(View::Bits32, Hive::CurrentUser, key, "Filename").value_or("");
  if (!options.hostFolder.empty()) {
    file = AddInLocation(options.hostFolder, false) + std::string(kIdeAddInFile);
    from = "under the Quarn folder given";
  } else if (!registered.empty()) {
    file = registered;
    from = "as Developer Studio's add-in key names it";
  } else {
    file = AddInLocation("", true) + std::string(kIdeAddInFile);
    from = "under Quarn's default folder (give --host-dir for another)";
  }
  if (m.Kind(file) == PathKind::File) {
    f.detail = file;
    const std::optional<std::string> on = m.ReadString(View::Bits32, Hive::CurrentUser, key, "");
    if (on && *on != "1") f.detail += "; switched off in Developer Studio, switched on again when Quarn starts the add-in";
    return f;
  }
  f.verdict = Verdict::Fail;
  f.detail = file + " (" + from + ") does not exist";
  f.meaning = HostLogSays(1219);
  f.fix = "install Quarn's VC++ support again so that vc\\dlls\\kpxideaddin.dll is in the Quarn folder";
  return f;
}

Finding VisualStudioFinding(Machine& m) {
  Finding f = NewFinding("visualstudio-addin", "Quarn's \"VisualStudio\" add-in", "Generate Code and Update Model (forwarded to it)");
  // The sibling's key is where the debug settings live too.
  const std::string key(kDebugSettingsKey);
  const bool installed = m.KeyExists(View::Bits32, Hive::LocalMachine, key);
  const std::optional<std::string> active = m.ReadString(View::Bits32, Hive::CurrentUser, key, "Active");
  if (!installed) {
    f.verdict = Verdict::Warn;
    f.detail = "HKEY_LOCAL_MACHINE\\" + key + " does not exist";
    f.meaning = "Generate Code, Update Model and the add-in's debug settings belong to the VisualStudio add-in; "
                "without it those commands do nothing";
    f.fix = "install Quarn's VisualStudio add-in";
    return f;
  }
  if (active && *active == "No") {
    f.verdict = Verdict::Warn;
    f.detail = "switched off (\"Active\" is \"No\")";
    f.meaning = HostLogSays(5030);
    f.fix = "switch the VisualStudio add-in on in Quarn's add-in manager";
    return f;
  }
  f.detail = "installed and switched on";
  return f;
}

// ------------------------------------------------------------- companions

struct Companion {
  const char* progId;  // or a class id in braces
  const char* features;
};

const Companion kCompanions[] = {
    {"kpxModelAssist.API", "Model Assistant"},
    {"kpxmdcnv.API", "Model Converter"},
    {"tznclwiz.api", "Class Wizard"},
    {"kpxImportMFC.API", "Import MFC"},
    {"kpxLangSupport.kpxStatementGenerator", "the statement generator Quarn asks for"},
    {"kpxCodeView.kpxCodeViewAPI", "the code view project"},
    {"kpxatltools.kpxatlGUI",
     "New ATL Object, Expand to ATL Object, Add Method, Add Property, Implement Interfaces, Expose Property"},
    {"kpxatlassist.kpxatlAPI",
     "implementing interfaces in ATL object classes when realize relations or interfaces change"},
    // Created by class id: Quarn's language-properties, component-properties
    // and type-library import components.
    {"{05D99488-AB9F-11D2-B9EB-006008BF3ACB}", "Language Properties"},
    {"{CFD996E3-1393-11D3-B9F3-006008BF3ACB}", "Browse Component, Browse Header, Browse Body"},
    {"{B025E5DB-4064-11D3-B9F7-006008BF3ACB}", "Import Type Library"},
};

// Why a class cannot be created in the host's view; "" when it can.
std::string ClassProblem(Machine& m, const std::string& progIdOrClass) {
  if (progIdOrClass.empty()) return "no ProgID given";
  std::string clsid = progIdOrClass;
  if (progIdOrClass.front() != '{') {
    std::optional<std::string> found = m.ReadString(View::Bits32, Hive::ClassesRoot, progIdOrClass + "\\CLSID", "");
    if (!found || found->empty()) return "not registered";
    clsid = *found;
  }
  const std::string key = "CLSID\\" + clsid;
  if (!m.KeyExists(View::Bits32, Hive::ClassesRoot, key)) return "class " + clsid + " is not registered for 32-bit programs";
  std::string file = m.ReadString(View::Bits32, Hive::ClassesRoot, key + "\\InprocServer32", "").value_or("");
  if (file.empty()) file = CommandLineProgram(m.ReadString(View::Bits32, Hive::ClassesRoot, key + "\\LocalServer32", "").value_or(""));
  if (file.empty()) return "class " + clsid + " names no server file";
  if (m.Kind(file) != PathKind::File) return "its server " + file + " does not exist";
  return {};
}

Finding CompanionFinding(Machine& m, const Companion& c) {
  Finding f = NewFinding(std::string("companion:") + c.progId, std::string("companion ") + c.progId, c.features);
  const std::string problem = ClassProblem(m, c.progId);
  if (problem.empty()) {
    f.detail = "registered";
    return f;
  }
  f.verdict = Verdict::Warn;
  f.detail = problem;
  f.meaning = "these do nothing when used; the add-in notes the failure in its debug log and goes on";
  f.fix = std::string("install the Quarn component that provides ") + c.progId + " (32-bit)";
  return f;
}

// ---------------------------------------------------- stereotypes, compare

Finding StereotypeFinding(Machine& m) {
  Finding f = NewFinding("stereotypes", "stereotype configuration file", "the stereotypes Quarn offers for VC++ components and classes");
  const std::string dir = Value(m, Hive::LocalMachine, kVcAddInKey, "InstallDir");
  const std::string name = Value(m, Hive::LocalMachine, kVcAddInKey, "StereotypeCfgFile");
  if (dir.empty() || name.empty()) {
    f.verdict = Verdict::Warn;
    f.detail = std::string("HKEY_LOCAL_MACHINE\\") + kVcAddInKey + " has no \"" + (dir.empty() ? "InstallDir" : "StereotypeCfgFile") + "\"";
    f.meaning = "Quarn offers no VC++ stereotypes (such as atlobject) for components and classes";
    f.fix = "install Quarn's VC++ support again: it writes both values and the file";
    return f;
  }
  const std::string path = dir + "\\" + name;  // joined as the add-in joins them
  std::optional<std::string> text = m.ReadAll(path);
  if (!text) {
    f.verdict = Verdict::Warn;
    f.detail = path + " cannot be read";
    f.meaning = "Quarn gets an error each time it asks the add-in for its stereotypes";
    f.fix = "restore " + path + " from Quarn's VC++ support, or correct \"StereotypeCfgFile\"";
    return f;
  }
  f.detail = path + ": " + std::to_string(SectionStereotypes(*text, kComponentSection).size()) +
             " component and " + std::to_string(SectionStereotypes(*text, kClassSection).size()) +
             " class stereotypes";
  return f;
}

constexpr const char* kCannotCompare = "comparing a file with its backup in the Restore dialog does nothing";

Finding DifferenceToolFinding(Machine& m) {
  Finding f = NewFinding("difference-tool", "difference tool", "comparing a file with its backup in the Restore dialog");
  const std::string command = ParseDifferenceSetting(Value(m, Hive::CurrentUser, kVcAddInEventsKey, "OnDifference")).command;
  if (EqualsNoCase(command, "windiff")) {
    const std::string key(DifferenceTool::kWindiffKey);
    const std::string dir = Value(m, Hive::LocalMachine, key, "ProductDir");
    const std::string windiff = dir.empty() ? "" : ParseShellCommand(WindiffCommand(dir), "", "").program;
    f.detail = "windiff: " + windiff;
    if (!dir.empty() && m.Kind(windiff) == PathKind::File) return f;
    f.verdict = Verdict::Warn;
    f.meaning = kCannotCompare;
    f.detail = dir.empty() ? "windiff, but HKEY_LOCAL_MACHINE\\" + key + " has no \"ProductDir\""
                           : "windiff, but " + windiff + " does not exist";
    f.fix = "install Visual Studio 6's tools, or set another tool in the VC++ add-in's setting Events/OnDifference";
    return f;
  }
  if (IsShellCommand(command)) {
    const std::string program = ParseShellCommand(command, "", "").program;
    if (program.find('\\') == std::string::npos) {
      f.detail = "shell: " + program + ", looked for on the search path when it runs";
      return f;
    }
    f.detail = "shell: " + program;
    if (m.Kind(program) == PathKind::File) return f;
    f.verdict = Verdict::Warn;
    f.meaning = kCannotCompare;
    f.detail += " does not exist";
    f.fix = "install " + program + " or correct the VC++ add-in's setting Events/OnDifference";
    return f;
  }
  // Anything else, "shellexecute ..." too, is a ProgID.
  const std::string problem = ClassProblem(m, command);
  if (problem.empty()) {
    f.detail = "component " + command;
    return f;
  }
  f.verdict = Verdict::Warn;
  f.detail = "component " + command + ": " + problem;
  f.meaning = kCannotCompare;
  f.fix = "install " + command + " or correct the VC++ add-in's setting Events/OnDifference";
  return f;
}

// -------------------------------------------------------------- debug log

Finding DebugLogFinding(Machine& m) {
  Finding f = NewFinding("debug-log", "debug log", "tracing what the add-in does (for support)");
  const std::string key(kDebugSettingsKey);
  const DebugSettings settings = ReadDebugSettings(m);
  const uint32_t mask = settings.mask;
  const std::string& path = settings.path;
  if (mask == 0) {
    f.detail = "off (mask 0)";
    return f;
  }
  const MaskParts parts = DecodeMask(mask);
  const bool addin = std::find(parts.ids.begin(), parts.ids.end(), logid::ADDIN) != parts.ids.end();
  std::string what = "mask " + MaskText(mask) + ": ids " + IdNames(parts.ids) + "; levels " + LevelNames(parts.levels);
  if (!addin || parts.levels.empty()) what += " (none of the add-in's lines: it writes as ADDIN)";
  if (m.Kind(path) == PathKind::Folder) {
    f.verdict = Verdict::Warn;
    f.detail = path + " is a folder; " + what;
    f.meaning = "no line of the debug log is written, and every line costs the add-in five tries of 100 ms";
    f.fix = "set DebugOutputFile under HKEY_LOCAL_MACHINE\\" + key + " to a file, e.g. C:\\Temp\\kpxaddin.log";
    return f;
  }
  if (!m.CanAppend(path)) {
    f.verdict = Verdict::Warn;
    f.detail = path + " cannot be written; " + what;
    f.meaning = "no line of the debug log is written, and every line costs the add-in five tries of 100 ms";
    f.fix = "make the log's folder, or set DebugOutputFile under HKEY_LOCAL_MACHINE\\" + key + " to a file you can write";
    return f;
  }
  f.detail = path + "; " + what;
  return f;
}

}  // namespace

DebugSettings ReadDebugSettings(Machine& m) {
  const std::string key(kDebugSettingsKey);
  DebugSettings out;
  if (std::optional<uint32_t> d = m.ReadDword(View::Bits32, Hive::LocalMachine, key, "Debug"))
    out.mask = *d;
  else if (std::optional<std::string> s = m.ReadString(View::Bits32, Hive::LocalMachine, key, "Debug"))
    out.mask = static_cast<uint32_t>(Variant(*s).toInt32());  // as the add-in reads a mask stored as text
  out.path = Value(m, Hive::LocalMachine, key, "DebugOutputFile");
  out.from = "DebugOutputFile";
  if (out.path.empty()) {
    out.path = Value(m, Hive::LocalMachine, key, "InstallDir");
    out.from = "InstallDir, as DebugOutputFile is not set";
  }
  if (out.path.empty()) {
    out.path = std::string(kDefaultDebugLogPath);
    out.from = "the default, as neither DebugOutputFile nor InstallDir is set";
  }
  const std::string stamps = Value(m, Hive::LocalMachine, key, "SuppressTimeStamps");
  out.timeStamps = LCase(stamps) != "true";
  return out;
}

const char* VerdictName(Verdict v) {
  switch (v) {
    case Verdict::Ok: return "OK";
    case Verdict::Warn: return "WARN";
    case Verdict::Fail: return "FAIL";
    case Verdict::Skip: return "SKIP";
  }
  return "?";
}

std::vector<Finding> RunChecks(Machine& machine, const Options& options) {
  std::vector<Finding> out;
  const std::vector<View> views = machine.Views();
  // Each server's registration is read once per view; creation asks only
  // whether the own view has it.
  const View own = machine.ProcessBits() == 64 ? View::Bits64 : View::Bits32;
  bool resourceHere = false, addinHere = false;
  for (View view : views) {
    const Registration resource = ReadRegistration(machine, view, kResource);
    const Registration addin = ReadRegistration(machine, view, kAddIn);
    out.push_back(RegistrationFinding(view, kResource, resource));
    out.push_back(RegistrationFinding(view, kAddIn, addin));
    if (view == own) {
      resourceHere = resource.present;
      addinHere = addin.present;
    }
  }
  out.push_back(CreationFinding(machine, own, kResource, resourceHere));
  out.push_back(CreationFinding(machine, own, kAddIn, addinHere));
  out.push_back(VisualCppFinding(machine));
  out.push_back(IdeAddInFinding(machine, options));
  out.push_back(VisualStudioFinding(machine));
  for (const Companion& c : kCompanions) out.push_back(CompanionFinding(machine, c));
  out.push_back(StereotypeFinding(machine));
  out.push_back(DifferenceToolFinding(machine));
  out.push_back(DebugLogFinding(machine));
  return out;
}

int ExitCode(const std::vector<Finding>& findings) {
  return std::any_of(findings.begin(), findings.end(), [](const Finding& f) { return f.verdict == Verdict::Fail; })
             ? 1
             : 0;
}

}  // namespace kpx::doctor
