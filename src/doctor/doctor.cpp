#include "doctor/doctor.h"

#include <algorithm>
#include <map>
#include <ostream>

#include "doctor/checks.h"
#include "doctor/debug_mask.h"
#include "doctor/log_reader.h"
#include "shared/shared_debug_logger.h"

namespace kpx::doctor {

namespace {

struct BadUsage {
  std::string message;
};

// "--name value" options after the command; flags take no value.
struct Arguments {
  std::map<std::string, std::string> values;
  std::vector<std::string> flags;

  bool Has(const std::string& name) const {
    return values.count(name) || std::find(flags.begin(), flags.end(), name) != flags.end();
  }
  const std::string* Value(const std::string& name) const {
    auto it = values.find(name);
    return it == values.end() ? nullptr : &it->second;
  }
};

Arguments Parse(const std::vector<std::string>& args, size_t from, const std::vector<std::string>& withValue,
                const std::vector<std::string>& flags) {
  Arguments out;
  for (size_t i = from; i < args.size(); ++i) {
    const std::string& a = args[i];
    if (std::find(withValue.begin(), withValue.end(), a) != withValue.end()) {
      if (i + 1 >= args.size()) throw BadUsage{a + " needs a value"};
      out.values[a] = args[++i];
    } else if (std::find(flags.begin(), flags.end(), a) != flags.end()) {
      out.flags.push_back(a);
    } else {
      throw BadUsage{"unknown argument \"" + a + "\""};
    }
  }
  return out;
}

std::string JsonString(std::string_view s) {
  std::string out = "\"";
  for (unsigned char c : s) {
    switch (c) {
      case '"': out += "\\\""; break;
      case '\\': out += "\\\\"; break;
      case '\n': out += "\\n"; break;
      case '\r': out += "\\r"; break;
      case '\t': out += "\\t"; break;
      default:
        if (c < 0x20) {
          char esc[8];
          std::snprintf(esc, sizeof esc, "\\u%04x", c);
          out += esc;
        } else {
          out += static_cast<char>(c);
        }
    }
  }
  return out + "\"";
}

// ------------------------------------------------------------- the checks

std::string Summary(const std::vector<Finding>& findings, std::map<Verdict, int>& counts) {
  for (const Finding& f : findings) ++counts[f.verdict];
  std::string text = std::to_string(counts[Verdict::Ok]) + " OK, " + std::to_string(counts[Verdict::Warn]) +
                     " WARN, " + std::to_string(counts[Verdict::Fail]) + " FAIL, " +
                     std::to_string(counts[Verdict::Skip]) + " SKIP";
  if (counts[Verdict::Fail])
    text += ": the add-in will not start in Quarn until every FAIL is fixed";
  else if (counts[Verdict::Warn])
    text += ": the add-in starts; the features named under WARN do not work";
  else
    text += ": the installation is intact";
  return text;
}

void PrintText(const std::vector<Finding>& findings, Machine& m, std::ostream& out) {
  out << "kpxdoctor: the VC++ add-in as the 32-bit Quarn host sees it (this program is " << m.ProcessBits()
      << "-bit)\n";
  for (const Finding& f : findings) {
    std::string verdict = VerdictName(f.verdict);
    verdict.resize(6, ' ');
    out << verdict << f.title << ": " << f.detail << "\n";
    out << "      for: " << f.guards << "\n";
    if (f.verdict == Verdict::Warn || f.verdict == Verdict::Fail) {
      out << "      means: " << f.meaning << "\n";
      out << "      fix: " << f.fix << "\n";
    }
  }
  std::map<Verdict, int> counts;
  out << Summary(findings, counts) << "\n";
}

void PrintJson(const std::vector<Finding>& findings, Machine& m, std::ostream& out) {
  std::map<Verdict, int> counts;
  const std::string summary = Summary(findings, counts);
  out << "{\"program\":\"kpxdoctor\",\"bits\":" << m.ProcessBits() << ",\"checks\":[";
  for (size_t i = 0; i < findings.size(); ++i) {
    const Finding& f = findings[i];
    out << (i ? "," : "") << "\n {\"id\":" << JsonString(f.id) << ",\"verdict\":" << JsonString(VerdictName(f.verdict))
        << ",\"title\":" << JsonString(f.title) << ",\"guards\":" << JsonString(f.guards)
        << ",\"detail\":" << JsonString(f.detail);
    if (f.verdict == Verdict::Warn || f.verdict == Verdict::Fail)
      out << ",\"meaning\":" << JsonString(f.meaning) << ",\"fix\":" << JsonString(f.fix);
    out << "}";
  }
  out << "\n],\"summary\":{\"ok\":" << counts[Verdict::Ok] << ",\"warn\":" << counts[Verdict::Warn]
      << ",\"fail\":" << counts[Verdict::Fail] << ",\"skip\":" << counts[Verdict::Skip]
      << ",\"text\":" << JsonString(summary) << "},\"exitCode\":" << ExitCode(findings) << "}\n";
}

int Checks(const std::vector<std::string>& args, Machine& m, std::ostream& out) {
  Arguments a = Parse(args, 0, {"--host-dir"}, {"--json"});
  Options options;
  if (const std::string* dir = a.Value("--host-dir")) options.hostFolder = *dir;
  const std::vector<Finding> findings = RunChecks(m, options);
  if (a.Has("--json"))
    PrintJson(findings, m, out);
  else
    PrintText(findings, m, out);
  return ExitCode(findings);
}

// --------------------------------------------------------------- the mask

const std::string kDebugKeyText = "HKEY_LOCAL_MACHINE\\" + std::string(kDebugSettingsKey) + "\\Debug";

void PrintMask(uint32_t mask, std::ostream& out) {
  const MaskParts parts = DecodeMask(mask);
  out << "mask:      " << MaskText(mask) << "\n";
  out << "log ids:   " << IdNames(parts.ids) << "\n";
  out << "levels:    " << LevelNames(parts.levels) << "\n";
  if (parts.unusedBits) out << "unused:    " << MaskText(parts.unusedBits) << " (bits that mean nothing)\n";
  const bool addin = std::find(parts.ids.begin(), parts.ids.end(), logid::ADDIN) != parts.ids.end();
  std::vector<int> addinLevels;
  for (int level : {loglevel::ERROR, loglevel::INFO, loglevel::TRACE})
    if (std::find(parts.levels.begin(), parts.levels.end(), level) != parts.levels.end()) addinLevels.push_back(level);
  out << "the add-in's lines (ADDIN at ERROR, INFO, TRACE): ";
  if (addin && !addinLevels.empty())
    out << "written at " << LevelNames(addinLevels) << "\n";
  else
    out << "not written\n";
}

int Mask(const std::vector<std::string>& args, Machine& m, std::ostream& out, std::ostream& err) {
  Arguments a = Parse(args, 1, {"--ids", "--levels", "--value"}, {"--set"});
  if (const std::string* value = a.Value("--value")) {
    if (a.Has("--ids") || a.Has("--levels") || a.Has("--set")) throw BadUsage{"--value goes alone"};
    std::optional<uint32_t> mask = ParseMaskValue(*value);
    if (!mask) throw BadUsage{"\"" + *value + "\" is not a mask (a number, or hexadecimal after 0x)"};
    PrintMask(*mask, out);
    return 0;
  }
  if (!a.Has("--ids") && !a.Has("--levels")) {
    if (a.Has("--set")) throw BadUsage{"--set needs --ids and --levels"};
    out << "the debug mask in " << kDebugKeyText << "\n";
    PrintMask(ReadDebugSettings(m).mask, out);
    return 0;
  }
  if (!a.Has("--ids") || !a.Has("--levels"))
    throw BadUsage{"give both --ids and --levels: a line is written only when its log id and its level are both on"};
  std::string error;
  std::optional<std::vector<int>> ids = ParseLogIds(*a.Value("--ids"), error);
  if (!ids) throw BadUsage{error};
  std::optional<std::vector<int>> levels = ParseLevels(*a.Value("--levels"), error);
  if (!levels) throw BadUsage{error};
  const uint32_t mask = EncodeMask(*ids, *levels);
  PrintMask(mask, out);
  if (!a.Has("--set")) return 0;
  const std::string key(kDebugSettingsKey);
  if (!m.WriteDword(View::Bits32, Hive::LocalMachine, key, "Debug", mask) ||
      m.ReadDword(View::Bits32, Hive::LocalMachine, key, "Debug") != mask) {
    err << "kpxdoctor: could not write " << kDebugKeyText << " (writing HKEY_LOCAL_MACHINE needs an administrator)\n";
    return 1;
  }
  out << "written to " << kDebugKeyText << "; the add-in reads it when Quarn next starts\n";
  return 0;
}

// ---------------------------------------------------------------- the log

int Log(const std::vector<std::string>& args, Machine& m, std::ostream& out) {
  Arguments a = Parse(args, 1, {"--level", "--id"}, {});
  LogFilter filter;
  std::string error;
  if (const std::string* levels = a.Value("--level")) {
    std::optional<std::vector<int>> parsed = ParseLevels(*levels, error);
    if (!parsed) throw BadUsage{error};
    filter.levels = *parsed;
  }
  if (const std::string* ids = a.Value("--id")) {
    std::optional<std::vector<int>> parsed = ParseLogIds(*ids, error);
    if (!parsed) throw BadUsage{error};
    filter.ids = *parsed;
  }
  const DebugSettings settings = ReadDebugSettings(m);
  out << "debug log: " << settings.path << " (from " << settings.from << ")\n";
  const MaskParts parts = DecodeMask(settings.mask);
  out << "mask:      " << MaskText(settings.mask) << ": ids " << IdNames(parts.ids) << "; levels "
      << LevelNames(parts.levels) << (settings.mask == 0 ? " (logging is off)" : "") << "\n";
  out << "stamps:    " << (settings.timeStamps ? "date and time on each line" : "suppressed") << "\n";
  const PathKind kind = m.Kind(settings.path);
  if (kind == PathKind::Folder) {
    out << "state:     a folder: no line can be written\n";
    return 1;
  }
  const bool writable = m.CanAppend(settings.path);
  std::optional<std::string> text = kind == PathKind::File ? m.ReadAll(settings.path) : std::nullopt;
  if (kind == PathKind::Missing)
    out << "state:     not there yet; " << (writable ? "it can be made" : "it cannot be made (is its folder missing?)")
        << "\n";
  else
    out << "state:     " << (writable ? "can be written" : "cannot be written (read-only or locked)") << "\n";
  if (!text) return writable ? 0 : 1;
  const std::vector<std::string> lines = FilterLog(*text, filter);
  out << "lines:     " << lines.size() << (filter.levels.empty() && filter.ids.empty() ? "" : " that pass the filter")
      << "\n";
  for (const std::string& line : lines) out << line << "\n";
  return writable ? 0 : 1;
}

}  // namespace

std::string Usage(const std::string& prefix) {
  const std::string p = "  kpxdoctor " + prefix;
  return "usage:\n" + p + "[--json] [--host-dir QUARN_FOLDER]\n" +
         "      checks the installation: one line per check, OK, WARN or FAIL, and what to do\n" + p +
         "mask [--value N | --ids LIST --levels LIST [--set]]\n" +
         "      the debug mask decoded, or computed from log ids and levels (e.g. --ids ADDIN --levels ERROR,TRACE);\n"
         "      --set writes it to the registry\n" +
         p + "log [--level LIST] [--id LIST]\n" +
         "      where the debug log is, whether it can be written, and its lines filtered\n"
         "  log ids: CAT, CUT, MERGE, MAT, MUT, IM, ADDIN, APPSTART, MCHECK, SGEN, CODEVIEW, IDE, RES, KPXADDIN, all\n"
         "  levels:  CRITICAL, ERROR, WARNING, INFO, TRACE, TIMING, DEBUG, all\n";
}

int RunDoctor(const std::vector<std::string>& args, Machine& machine, std::ostream& out, std::ostream& err) {
  try {
    if (!args.empty() && (args[0] == "--help" || args[0] == "-h" || args[0] == "help")) {
      out << Usage("");
      return 0;
    }
    if (!args.empty() && args[0] == "mask") return Mask(args, machine, out, err);
    if (!args.empty() && args[0] == "log") return Log(args, machine, out);
    return Checks(args, machine, out);
  } catch (const BadUsage& bad) {
    err << "kpxdoctor: " << bad.message << "\n" << Usage("");
    return 2;
  }
}

}  // namespace kpx::doctor
