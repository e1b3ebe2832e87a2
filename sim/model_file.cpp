#include "sim/model_file.h"

#include <algorithm>
#include <cctype>
#include <chrono>
#include <cmath>
#include <cstdio>
#include <limits>
#include <tuple>

#include "automation/automation_error.h"
#include "automation/vb_strings.h"
#include "sim/faults.h"
#include "sim/windows_path.h"

namespace kpx::sim {

bool NoCaseLess::operator()(std::string_view a, std::string_view b) const { return kpx::NoCaseLess()(a, b); }

const MemberDef* CompanionDef::FindMember(std::string_view name) const {
  auto it = members.find(name);
  return it == members.end() ? nullptr : &it->second;
}

std::optional<size_t> ModelDef::PlaceOf(std::string_view key) const {
  auto it = elementIndex_.find(key);
  return it == elementIndex_.end() ? std::nullopt : std::optional<size_t>(it->second);
}

const ElementDef* ModelDef::FindElement(std::string_view key) const {
  std::optional<size_t> place = PlaceOf(key);
  return place ? &elements[*place] : nullptr;
}

const AddInDef* ModelDef::FindAddIn(std::string_view id) const {
  auto it = addinIndex_.find(id);
  return it == addinIndex_.end() ? nullptr : &addins[it->second];
}

void ModelDef::ReserveElements(size_t count) {
  elements.reserve(count);
  elementIndex_.reserve(count);
}

bool ModelDef::AddElement(ElementDef&& element) {
  if (!elementIndex_.emplace(element.key, elements.size()).second) return false;
  elements.push_back(std::move(element));
  return true;
}

bool ModelDef::AddAddIn(AddInDef&& addin) {
  if (!addinIndex_.emplace(addin.id, addins.size()).second) return false;
  addins.push_back(std::move(addin));
  return true;
}

const std::vector<std::string_view>& ElementKinds() {
  static const std::vector<std::string_view> kKinds = {"Class",
                                                       "Module",
                                                       "Attribute",
                                                       "Operation",
                                                       "Role",
                                                       "Association",
                                                       "InheritRelation",
                                                       "RealizeRelation",
                                                       "HasRelation",
                                                       "DependencyRelation",
                                                       "ModuleVisibilityRelationship"};
  return kKinds;
}

bool IsRelationKind(std::string_view kind) {
  return kind == "InheritRelation" || kind == "RealizeRelation" || kind == "HasRelation" ||
         kind == "DependencyRelation" || kind == "ModuleVisibilityRelationship";
}

// ------------------------------------------------------------ small pieces

ErrorDef ParseError(const Node& node) {
  node.ExpectKeys({"number", "description"});
  ErrorDef e;
  e.number = node.Member("number").Int32();
  if (e.number == 0) node.Member("number").Fail("an error number must not be 0");
  e.description = node.StringOr("description", VbErrorDescription(e.number));
  return e;
}

namespace {

std::optional<platform::RootKey> RootOf(std::string_view name) {
  if (EqualsNoCase(name, "HKEY_LOCAL_MACHINE") || EqualsNoCase(name, "HKLM")) return platform::RootKey::LocalMachine;
  if (EqualsNoCase(name, "HKEY_CURRENT_USER") || EqualsNoCase(name, "HKCU")) return platform::RootKey::CurrentUser;
  return std::nullopt;
}

// The longest name of one key, as Windows allows.
constexpr size_t kMaxKeyPart = 255;

std::string DwordBytes(uint32_t u) {
  std::string data;
  for (int i = 0; i < 4; ++i) data.push_back(static_cast<char>((u >> (8 * i)) & 0xFF));
  return data;
}

uint32_t DwordOf(const Node& n) {
  if (n.IsString()) {
    const std::string s = n.String();
    std::string_view digits = s;
    uint64_t base = 10;
    if (digits.size() > 2 && digits[0] == '0' && (digits[1] == 'x' || digits[1] == 'X')) {
      digits.remove_prefix(2);
      base = 16;
    }
    auto digit = [&](char c) -> int {
      if (c >= '0' && c <= '9') return c - '0';
      if (base == 16 && c >= 'a' && c <= 'f') return c - 'a' + 10;
      if (base == 16 && c >= 'A' && c <= 'F') return c - 'A' + 10;
      return -1;
    };
    if (digits.empty() || !std::all_of(digits.begin(), digits.end(), [&](char c) { return digit(c) >= 0; }))
      n.Fail("\"" + s + "\" is not a 32-bit number (write 4278190208 or \"0xff000080\")");
    uint64_t v = 0;
    for (char c : digits) {
      v = v * base + static_cast<uint64_t>(digit(c));
      if (v > 0xFFFFFFFFull) n.Fail("\"" + s + "\" does not fit in 32 bits");
    }
    return static_cast<uint32_t>(v);
  }
  const int64_t v = n.Integer();
  if (v < std::numeric_limits<int32_t>::min() || v > 0xFFFFFFFFll) n.Fail("number does not fit in 32 bits");
  return static_cast<uint32_t>(v);
}

std::string HexBytes(const Node& n) {
  const std::string hex = n.String();
  std::string data;
  if (hex.size() % 2 != 0) n.Fail("binary data needs two hex digits per byte");
  for (size_t i = 0; i < hex.size(); i += 2) {
    if (!std::isxdigit(static_cast<unsigned char>(hex[i])) || !std::isxdigit(static_cast<unsigned char>(hex[i + 1])))
      n.Fail("\"" + hex + "\" is not hex data");
    data.push_back(static_cast<char>(std::stoi(hex.substr(i, 2), nullptr, 16)));
  }
  return data;
}

int ParseNumberPart(const Node& n, const std::string& text, size_t pos, size_t len, int lo, int hi) {
  if (pos + len > text.size()) n.Fail("malformed \"" + text + "\"");
  int v = 0;
  for (size_t i = pos; i < pos + len; ++i) {
    if (!std::isdigit(static_cast<unsigned char>(text[i]))) n.Fail("malformed \"" + text + "\"");
    v = v * 10 + (text[i] - '0');
  }
  if (v < lo || v > hi) n.Fail("\"" + text + "\" is out of range");
  return v;
}

int DaysInMonth(int year, int month) {
  static constexpr int kDays[] = {31, 28, 31, 30, 31, 30, 31, 31, 30, 31, 30, 31};
  const bool leap = (year % 4 == 0 && year % 100 != 0) || year % 400 == 0;
  return month == 2 && leap ? 29 : kDays[month - 1];
}

// Key names as Windows takes them: parts between single backslashes, of
// printable characters (no line break, which REGEDIT4 cannot write).
void CheckKeyName(const Node& registry, const std::string& fullKey, std::string_view path) {
  size_t start = 0;
  for (;;) {
    const size_t end = std::min(path.find('\\', start), path.size());
    if (end == start) registry.FailKey(fullKey, "a registry key has an empty part (\"\\\\\" twice, or at an end)");
    if (end - start > kMaxKeyPart)
      registry.FailKey(fullKey, "a part of a registry key is longer than " + std::to_string(kMaxKeyPart) + " characters");
    if (end == path.size()) break;
    start = end + 1;
  }
  if (std::any_of(path.begin(), path.end(), [](char c) { return static_cast<unsigned char>(c) < 0x20; }))
    registry.FailKey(fullKey, "a registry key holds a control character or a line break");
}

}  // namespace

platform::RegistryValue ParseRegistryValue(const Node& n) {
  if (n.IsString()) return {platform::kRegSz, n.String() + '\0'};
  if (n.json().is_number()) return {platform::kRegDword, DwordBytes(DwordOf(n))};
  if (!n.IsObject() || n.json().size() != 1)
    n.Fail("a registry value is a string, a number, or one of {\"sz\": ...}, {\"dword\": ...}, {\"binary\": ...}");
  n.ExpectKeys({"sz", "dword", "binary"});
  if (auto sz = n.Find("sz")) return {platform::kRegSz, sz->String() + '\0'};
  if (auto dw = n.Find("dword")) return {platform::kRegDword, DwordBytes(DwordOf(*dw))};
  return {platform::kRegBinary, HexBytes(n.Member("binary"))};
}

std::pair<platform::RootKey, std::string> ParseRegistryKey(const Node& registry, const std::string& fullKey) {
  const size_t slash = fullKey.find('\\');
  std::optional<platform::RootKey> root = RootOf(fullKey.substr(0, slash));
  if (!root || slash == std::string::npos || slash + 1 == fullKey.size())
    registry.FailKey(fullKey,
                     "a registry key is HKEY_LOCAL_MACHINE\\..., HKEY_CURRENT_USER\\..., HKLM\\... or HKCU\\...");
  CheckKeyName(registry, fullKey, std::string_view(fullKey).substr(slash + 1));
  return {*root, fullKey.substr(slash + 1)};
}

std::vector<RegistryEntry> ParseRegistry(const Node& node) {
  std::vector<RegistryEntry> out;
  for (const auto& [fullKey, values] : node.Members()) {
    RegistryEntry keyOnly;
    std::tie(keyOnly.root, keyOnly.key) = ParseRegistryKey(node, fullKey);
    values.ExpectObject("an object of values");
    out.push_back(keyOnly);
    for (const auto& [name, value] : values.Members()) {
      if (name.find_first_of(std::string_view("\r\n\0", 3)) != std::string::npos)
        values.FailKey(name, "a value name holds a line break or a NUL, which the registry file cannot hold");
      RegistryEntry e = keyOnly;
      e.name = name == "@" ? "" : name;
      e.value = ParseRegistryValue(value);
      out.push_back(std::move(e));
    }
  }
  return out;
}

ClockSetting ParseClock(const Node& node) {
  node.ExpectKeys({"date", "time", "step"});
  ClockSetting c;
  if (auto d = node.Find("date")) {
    const std::string s = d->String();
    if (s.size() != 10 || s[4] != '-' || s[7] != '-') d->Fail("a date is written YYYY-MM-DD");
    platform::DateTime t;
    t.year = ParseNumberPart(*d, s, 0, 4, 100, 9999);
    t.month = ParseNumberPart(*d, s, 5, 2, 1, 12);
    t.day = ParseNumberPart(*d, s, 8, 2, 1, DaysInMonth(t.year, t.month));
    c.date = t;
  }
  if (auto tm = node.Find("time")) {
    const std::string s = tm->String();
    if (s.size() < 8 || s[2] != ':' || s[5] != ':') tm->Fail("a time is written HH:MM:SS or HH:MM:SS.fff");
    double seconds = ParseNumberPart(*tm, s, 0, 2, 0, 23) * 3600.0 + ParseNumberPart(*tm, s, 3, 2, 0, 59) * 60.0 +
                     ParseNumberPart(*tm, s, 6, 2, 0, 59);
    if (s.size() > 8) {
      if (s[8] != '.' || s.size() == 9) tm->Fail("a time is written HH:MM:SS or HH:MM:SS.fff");
      double scale = 0.1;
      for (size_t i = 9; i < s.size(); ++i, scale /= 10) {
        if (!std::isdigit(static_cast<unsigned char>(s[i]))) tm->Fail("malformed \"" + s + "\"");
        seconds += (s[i] - '0') * scale;
      }
    }
    // Many decimals can round up to a whole day, which Timer never reads.
    if (seconds >= 86400) tm->Fail("a time lies before 24:00:00");
    c.seconds = seconds;
  }
  if (auto st = node.Find("step")) {
    c.step = st->Number();
    if (*c.step < 0) st->Fail("the clock cannot step backwards");
    if (*c.step > 86400) st->Fail("the clock steps at most one day (86400 seconds) at a time");
  }
  return c;
}

platform::FileTime ToFileTime(const platform::DateTime& date, double seconds) {
  using namespace std::chrono;
  const sys_days days = year_month_day{year{date.year}, month{static_cast<unsigned>(date.month)},
                                      day{static_cast<unsigned>(date.day)}};
  constexpr int64_t kEpoch = 11644473600LL;  // 1601-01-01 to 1970-01-01, seconds
  const int64_t whole = (days.time_since_epoch().count() * 86400LL) + kEpoch;
  return static_cast<platform::FileTime>(whole * 10000000LL + std::llround(seconds * 1e7));
}

platform::FileTime ParseFileTime(const Node& node) {
  const std::string s = node.String();
  if (s.size() != 19 || s[4] != '-' || s[7] != '-' || s[10] != ' ' || s[13] != ':' || s[16] != ':')
    node.Fail("a file time is written YYYY-MM-DD HH:MM:SS (UTC)");
  platform::DateTime t;
  t.year = ParseNumberPart(node, s, 0, 4, 1601, 9999);
  t.month = ParseNumberPart(node, s, 5, 2, 1, 12);
  t.day = ParseNumberPart(node, s, 8, 2, 1, DaysInMonth(t.year, t.month));
  const double seconds = ParseNumberPart(node, s, 11, 2, 0, 23) * 3600.0 +
                         ParseNumberPart(node, s, 14, 2, 0, 59) * 60.0 + ParseNumberPart(node, s, 17, 2, 0, 59);
  return ToFileTime(t, seconds);
}

std::string FileTimeText(platform::FileTime time) {
  using namespace std::chrono;
  constexpr int64_t kEpochDays = 134774;  // 1601-01-01 to 1970-01-01
  const int64_t ticks = static_cast<int64_t>(time % 10000000);
  const int64_t seconds = static_cast<int64_t>(time / 10000000);
  const int64_t days = seconds / 86400;
  const int64_t inDay = seconds % 86400;
  const year_month_day ymd{sys_days{std::chrono::days{days - kEpochDays}}};
  char text[48];
  std::snprintf(text, sizeof text, "%04d-%02u-%02u %02d:%02d:%02d", static_cast<int>(ymd.year()),
                static_cast<unsigned>(ymd.month()), static_cast<unsigned>(ymd.day()), static_cast<int>(inDay / 3600),
                static_cast<int>(inDay / 60 % 60), static_cast<int>(inDay % 60));
  std::string out = text;
  if (ticks) {
    std::snprintf(text, sizeof text, ".%07d", static_cast<int>(ticks));
    out += text;
  }
  return out;
}

// ------------------------------------------------------------------ values

void CheckValue(const Node& n, const ModelDef& model, const CompanionDef* owner, bool byRef) {
  const InputJson& j = n.json();
  if (j.is_null() || j.is_boolean() || j.is_string() || j.is_number_float()) return;
  if (j.is_number()) {
    n.Int32();  // a bare whole number is a Long
    return;
  }
  if (j.is_array()) n.Fail("a list is not a value (an argument or a result is one value)");
  if (j.size() != 1) n.Fail("a typed value is an object with exactly one key, such as {\"i2\": 4}");
  const std::string form = j.begin().key();
  const Node inner = n.Member(form);
  if (form == "string")
    inner.String();
  else if (form == "i2") {
    int64_t v = inner.Integer();
    if (v < -32768 || v > 32767) inner.Fail("number out of the 16-bit range");
  } else if (form == "i4")
    inner.Int32();
  else if (form == "r4") {
    if (std::abs(inner.Number()) > std::numeric_limits<float>::max()) inner.Fail("number out of the Single range");
  } else if (form == "r8")
    inner.Number();
  else if (form == "date") {
    // 100-01-01 to the last moment of 9999-12-31, as a Date can hold.
    const double d = inner.Number();
    if (d < -657434.0 || d >= 2958466.0) inner.Fail("a date lies from -657434 (100-01-01) to 2958465.99 (9999-12-31)");
  }
  else if (form == "bool")
    inner.Bool();
  else if (form == "null" || form == "nothing") {
    if (!inner.Bool()) inner.Fail("write {\"" + form + "\": true}");
  } else if (form == "element") {
    if (!model.FindElement(inner.String())) inner.Fail("no element \"" + inner.String() + "\" in the model");
  } else if (form == "addin") {
    if (!model.FindAddIn(inner.String())) inner.Fail("no add-in \"" + inner.String() + "\" in the model");
  } else if (form == "object" && owner) {
    if (!owner->objects.count(inner.String())) inner.Fail("the companion has no object \"" + inner.String() + "\"");
  } else if (form == "byref" && byRef) {
    CheckValue(inner, model, owner, false);
  } else {
    std::string forms = "string, i2, i4, r4, r8, date, bool, null, nothing, element, addin";
    if (owner) forms += ", object";
    if (byRef) forms += ", byref";
    n.FailKey(form, "unknown value form \"" + form + "\" (expected one of: " + forms + ")");
  }
}

// ------------------------------------------------------------------- model

namespace {

class ModelReader {
 public:
  explicit ModelReader(const JsonSource& source) : root_(Node::Root(source)) {}

  ModelDef Read() {
    root_.ExpectKeys({"comment", "registry", "files", "folders", "clock", "application", "addins", "companions",
                      "resources", "resourceComponent", "model", "processes", "faults"});
    if (auto n = root_.Find("registry")) m_.registry = ParseRegistry(*n);
    ReadFilesAndFolders(root_.Find("files"), root_.Find("folders"));
    if (auto n = root_.Find("clock")) m_.clock = ParseClock(*n);
    if (auto n = root_.Find("processes")) ReadProcesses(*n);
    if (auto n = root_.Find("application")) ReadApplication(*n);
    if (auto n = root_.Find("resources")) ReadResources(*n);
    if (auto n = root_.Find("resourceComponent")) {
      n->ExpectKeys({"registered"});
      m_.resourceRegistered = n->BoolOr("registered", true);
    }
    // Names first: add-ins, companions and the selection refer to elements
    // and add-ins wherever they stand in the file.
    if (auto n = root_.Find("model")) ReadModel(*n);
    if (auto n = root_.Find("addins")) ReadAddIns(*n);
    if (auto n = root_.Find("companions"))
      for (const Node& c : n->Elements()) m_.companions.push_back(ReadCompanion(c, true));
    // Last: faults name add-ins, elements and registry keys.
    if (auto n = root_.Find("faults")) ReadFaults(*n, m_);
    return std::move(m_);
  }

 private:
  // Folders are made first, then files, as the run lays them out.
  void ReadFilesAndFolders(const std::optional<Node>& files, const std::optional<Node>& folders) {
    PathPlan plan;
    if (folders)
      for (const Node& f : folders->Elements()) {
        const std::string path = f.String();
        std::string fault = PathFault(path, false);
        if (fault.empty()) fault = plan.MakeFolder(path);
        if (!fault.empty()) f.Fail(fault);
        m_.folders.push_back(path);
      }
    if (files)
      for (const auto& [path, content] : files->Members()) {
        std::string fault = PathFault(path, true);
        if (fault.empty()) fault = plan.WriteFile(path);
        if (!fault.empty()) files->FailKey(path, fault);
        if (content.IsObject()) {
          // {"text": ... or "binary": "hex", "readOnly": ..., "times": {...}}
          content.ExpectKeys({"text", "binary", "readOnly", "times"});
          if (content.Find("text") && content.Find("binary")) content.Fail("a file has \"text\" or \"binary\", not both");
          FileDetailDef detail;
          detail.readOnly = content.BoolOr("readOnly", false);
          if (auto t = content.Find("times")) {
            t->ExpectObject("an object of times: creation, lastAccess, lastWrite");
            t->ExpectKeys({"creation", "lastAccess", "lastWrite"});
            if (auto c = t->Find("creation")) detail.creation = ParseFileTime(*c);
            if (auto a = t->Find("lastAccess")) detail.lastAccess = ParseFileTime(*a);
            if (auto w = t->Find("lastWrite")) detail.lastWrite = ParseFileTime(*w);
          }
          auto binary = content.Find("binary");
          m_.files.emplace_back(path, binary ? HexBytes(*binary) : content.StringOr("text", ""));
          m_.fileDetails[path] = detail;
        } else {
          m_.files.emplace_back(path, content.String());
        }
      }
  }

  // Program path to {"exitCode": n} | {"start": {"error": n}} |
  // {"timeout": true} | {"waitFails": {"error": n}}.
  void ReadProcesses(const Node& n) {
    n.ExpectObject("an object: program path to what running it gives");
    for (const auto& [program, def] : n.Members()) {
      if (const std::string fault = PathFault(program, true); !fault.empty()) n.FailKey(program, fault);
      def.ExpectObject("{\"exitCode\": n}, {\"start\": {\"error\": n}}, {\"timeout\": true} or {\"waitFails\": {\"error\": n}}");
      def.ExpectKeys({"comment", "exitCode", "start", "timeout", "waitFails"});
      ProcessDef p;
      int given = 0;
      auto systemError = [](const Node& e) {
        e.ExpectKeys({"error"});
        const Node code = e.Member("error");
        const int64_t v = code.Integer();
        if (v <= 0 || v > 0xFFFFFFFFLL) code.Fail("a system error code is a number from 1 to 4294967295");
        return static_cast<uint32_t>(v);
      };
      if (auto c = def.Find("exitCode")) {
        ++given;
        const int64_t v = c->Integer();
        // A crash status may be written as Windows shows it, negative.
        if (v < -2147483648LL || v > 0xFFFFFFFFLL) c->Fail("an exit code is 32 bits");
        p.kind = ProcessDef::Kind::Exits;
        p.exitCode = static_cast<uint32_t>(v);
      }
      if (auto st = def.Find("start")) {
        ++given;
        p.kind = ProcessDef::Kind::StartFails;
        p.error = systemError(*st);
      }
      if (auto t = def.Find("timeout")) {
        ++given;
        if (!t->Bool()) t->Fail("\"timeout\" can only be true");
        p.kind = ProcessDef::Kind::TimesOut;
      }
      if (auto w = def.Find("waitFails")) {
        ++given;
        p.kind = ProcessDef::Kind::WaitFails;
        p.error = systemError(*w);
      }
      if (given != 1) def.Fail("a program needs exactly one of exitCode, start, timeout, waitFails");
      if (!m_.processes.emplace(program, p).second)
        n.FailKey(program, "a second entry for the program " + program + " (paths ignore case)");
    }
  }

  void ReadApplication(const Node& n) {
    n.ExpectKeys({"path", "mainWindow", "window", "failingScripts"});
    ApplicationDef& a = m_.application;
    a.path = n.StringOr("path", a.path);
    if (auto w = n.Find("mainWindow")) a.mainWindow = w->Int32();
    if (auto w = n.Find("window")) {
      w->ExpectKeys({"top", "left", "height", "width"});
      auto get16 = [&](std::string_view key, int16_t& out) {
        if (auto v = w->Find(key)) {
          int64_t x = v->Integer();
          if (x < -32768 || x > 32767) v->Fail("number out of the 16-bit range");
          out = static_cast<int16_t>(x);
        }
      };
      get16("top", a.top);
      get16("left", a.left);
      get16("height", a.height);
      get16("width", a.width);
    }
    if (auto s = n.Find("failingScripts"))
      for (const auto& [path, error] : s->Members()) a.failingScripts[path] = ParseError(error);
  }

  void ReadResources(const Node& n) {
    for (const auto& [id, text] : n.Members()) {
      // Digits with an optional minus; nothing else, not even blanks.
      const std::string_view digits = std::string_view(id).substr(!id.empty() && id[0] == '-' ? 1 : 0);
      int64_t v = 0;
      bool ok = !digits.empty() && digits.size() <= 10;
      for (char c : digits) {
        ok = ok && c >= '0' && c <= '9';
        if (ok) v = v * 10 + (c - '0');
      }
      if (id[0] == '-') v = -v;
      if (!ok || v < std::numeric_limits<int32_t>::min() || v > std::numeric_limits<int32_t>::max())
        n.FailKey(id, "a resource is keyed by its string id, such as \"5030\"");
      m_.resources[static_cast<int32_t>(v)] = text.String();
    }
  }

  static Properties ReadProperties(const Node& n) {
    Properties p;
    for (const auto& [tool, props] : n.Members()) {
      props.ExpectObject("an object of properties");
      for (const auto& [name, value] : props.Members()) p[tool][name] = value.String();
    }
    return p;
  }

  // ---------------------------------------------------------- elements

  void ReadModel(const Node& n) {
    n.ExpectKeys({"properties", "elements", "selection", "diagram", "diagramMembers"});
    if (auto p = n.Find("properties")) m_.modelProperties = ReadProperties(*p);
    if (auto e = n.Find("elements")) {
      const std::vector<Node> elements = e->Elements();
      m_.ReserveElements(CountElements(elements));
      for (const Node& element : elements) ReadElement(element, "");
    }
    for (const Reference& r : references_) CheckReference(r);
    CheckNesting();
    if (auto s = n.Find("selection"))
      for (const Node& item : s->Elements()) {
        if (!m_.FindElement(item.String())) item.Fail("no element \"" + item.String() + "\" in the model");
        m_.selection.push_back(item.String());
      }
    m_.diagramMembers = n.BoolOr("diagramMembers", true);
    if (auto d = n.Find("diagram")) {
      d->ExpectKeys({"comment", "name", "classes"});
      DiagramDef diagram;
      const Node name = d->Member("name");
      diagram.name = name.String();
      if (diagram.name.empty()) name.Fail("a diagram needs a name");
      if (auto c = d->Find("classes"))
        for (const Node& cls : c->Elements()) {
          const ElementDef* e = m_.FindElement(cls.String());
          if (!e) cls.Fail("no element \"" + cls.String() + "\" in the model");
          if (e->kind != "Class") cls.Fail("\"" + cls.String() + "\" is a " + e->kind + ", not a Class");
          if (std::find(diagram.classes.begin(), diagram.classes.end(), cls.String()) != diagram.classes.end())
            cls.Fail("\"" + cls.String() + "\" is on the diagram once already");
          diagram.classes.push_back(cls.String());
        }
      m_.diagram = std::move(diagram);
    }
  }

  // A name that must denote an element of `kind` (any kind when empty).
  struct Reference {
    Node node;
    std::string_view kind;
  };

  // Elements with their attributes and operations, to make room for once.
  static size_t CountElements(const std::vector<Node>& elements) {
    size_t count = elements.size();
    for (const Node& e : elements)
      if (e.IsObject())
        for (const char* list : {"attributes", "operations"})
          if (auto it = e.json().find(list); it != e.json().end() && it->is_array()) count += it->size();
    return count;
  }

  void Refer(const Node& node, std::string_view kind) { references_.push_back({node, kind}); }

  void CheckReference(const Reference& r) const {
    const std::string& name = r.node.json().is_string() ? r.node.json().get_ref<const std::string&>() : r.node.String();
    const ElementDef* e = m_.FindElement(name);
    if (!e) r.node.Fail("no element \"" + name + "\" in the model");
    if (!r.kind.empty() && e->kind != r.kind)
      r.node.Fail("\"" + name + "\" is a " + e->kind + ", not a " + std::string(r.kind));
  }

  // Following nestedIn must end: a class cannot enclose itself. Each class
  // is followed once; a chain that reaches one already followed stops.
  void CheckNesting() const {
    enum class Mark : unsigned char { None, OnWay, Done };
    std::vector<Mark> marks(m_.elements.size(), Mark::None);
    std::vector<size_t> way;
    for (size_t start = 0; start < m_.elements.size(); ++start) {
      way.clear();
      for (size_t at = start; marks[at] == Mark::None;) {
        marks[at] = Mark::OnWay;
        way.push_back(at);
        const ElementDef& c = m_.elements[at];
        if (c.nestedIn.empty()) break;
        at = *m_.PlaceOf(c.nestedIn);
        if (marks[at] == Mark::OnWay) nestedNodes_.at(start).Fail("classes nested in a circle");
      }
      for (size_t i : way) marks[i] = Mark::Done;
    }
  }

  void ReadElement(const Node& n, const std::string& owner) {
    n.ExpectObject("an element");
    ElementDef e;
    if (!owner.empty()) {
      e.kind = n.StringOr("kind", kindForMembers_);
      if (e.kind != kindForMembers_) n.Member("kind").Fail("this list holds only " + kindForMembers_ + "s");
    } else {
      const Node kind = n.Member("kind");
      e.kind = kind.String();
      if (std::find(ElementKinds().begin(), ElementKinds().end(), e.kind) == ElementKinds().end()) {
        std::string list;
        for (std::string_view k : ElementKinds()) list += (list.empty() ? "" : ", ") + std::string(k);
        kind.Fail("unknown element kind \"" + e.kind + "\" (expected one of: " + list + ")");
      }
      if (e.kind == "Attribute" || e.kind == "Operation")
        kind.Fail("attributes and operations are listed in their class's \"attributes\" and \"operations\"");
    }

    std::vector<std::string_view> keys = {"comment", "name", "kind", "stereotype", "displayName", "properties"};
    if (e.kind == "Class")
      keys.insert(keys.end(),
                  {"language", "components", "nestedIn", "classKind", "package", "attributes", "operations"});
    else if (e.kind == "Module")
      keys.push_back("language");
    else if (IsRelationKind(e.kind))
      keys.insert(keys.end(), {"client", "supplier", "relationText"});
    else if (e.kind == "Association")
      keys.insert(keys.end(), {"role1", "role2"});
    else if (e.kind == "Role")
      keys.insert(keys.end(), {"class", "navigable"});
    if (e.kind == "ModuleVisibilityRelationship") keys.push_back("unit");
    n.ExpectKeys(keys);

    const Node name = n.Member("name");
    e.name = name.String();
    if (e.name.empty()) name.Fail("an element needs a name");
    e.key = owner.empty() ? e.name : owner + "." + e.name;
    e.owner = owner;
    e.stereotype = n.StringOr("stereotype", "");
    e.displayName = n.StringOr("displayName", e.name);
    if (auto p = n.Find("properties")) e.properties = ReadProperties(*p);
    e.language = n.StringOr("language", "");

    if (auto c = n.Find("components"))
      for (const Node& m : c->Elements()) {
        Refer(m, "Module");
        e.components.push_back(m.String());
      }
    if (auto nest = n.Find("nestedIn")) {
      Refer(*nest, "Class");
      e.nestedIn = nest->String();
      nestedNodes_.emplace(m_.elements.size(), *nest);
    }
    e.classKind = n.StringOr("classKind", e.classKind);
    if (auto p = n.Find("package")) {
      p->ExpectKeys({"name", "editable"});
      e.package = p->StringOr("name", e.package);
      e.packageEditable = p->BoolOr("editable", true);
    }
    for (const char* end : {"client", "supplier"})
      if (auto r = n.Find(end)) {
        Refer(*r, "");
        (std::string_view(end) == "client" ? e.client : e.supplier) = r->String();
      }
    e.relationText = n.StringOr("relationText", e.client + " -> " + e.supplier);
    if (auto u = n.Find("unit")) {
      u->ExpectKeys({"modifiable"});
      e.unitModifiable = u->BoolOr("modifiable", true);
    }
    for (const char* role : {"role1", "role2"})
      if (auto r = n.Find(role)) {
        Refer(*r, "Role");
        (std::string_view(role) == "role1" ? e.role1 : e.role2) = r->String();
      }
    if (auto c = n.Find("class")) {
      Refer(*c, "Class");
      e.roleClass = c->String();
    }
    e.navigable = n.BoolOr("navigable", false);

    const std::string key = e.key;
    const size_t index = m_.elements.size();
    if (!m_.AddElement(std::move(e))) name.Fail("a second element \"" + key + "\"");
    for (const char* list : {"attributes", "operations"}) {
      std::optional<Node> members = n.Find(list);
      if (!members) continue;
      kindForMembers_ = std::string_view(list) == "attributes" ? "Attribute" : "Operation";
      for (const Node& member : members->Elements()) {
        ReadElement(member, key);
        (kindForMembers_ == "Attribute" ? m_.elements[index].attributes : m_.elements[index].operations)
            .push_back(m_.elements.back().key);
      }
    }
  }

  // ----------------------------------------------------------- add-ins

  void ReadAddIns(const Node& n) {
    std::vector<Node> list = n.Elements();
    std::map<std::string, int> seen;
    for (const Node& a : list) {
      a.ExpectObject("an add-in");
      AddInDef def;
      const Node name = a.Member("name");
      def.name = name.String();
      const int k = ++seen[def.name];
      def.id = k == 1 ? def.name : def.name + "#" + std::to_string(k);
      const std::string id = def.id;
      if (!m_.AddAddIn(std::move(def)))
        name.Fail("two add-ins are called \"" + id + "\" (the k-th add-in of a name is called name#k)");
    }
    for (size_t i = 0; i < list.size(); ++i) ReadAddIn(list[i], m_.addins[i]);
  }

  void ReadAddIn(const Node& n, AddInDef& a) {
    n.ExpectKeys({"comment", "name", "settings", "installDirectory", "registryRoot", "helpFile", "contextMenus",
                  "eventHandler", "menuStates"});
    if (auto s = n.Find("settings"))
      for (const auto& [section, entries] : s->Members()) {
        entries.ExpectObject("an object of entries");
        for (const auto& [entry, value] : entries.Members()) a.settings[section][entry] = value.String();
      }
    a.installDirectory = n.StringOr("installDirectory", "");
    a.registryRoot = n.StringOr("registryRoot", "");
    a.helpFile = n.StringOr("helpFile", "");
    a.contextMenus = n.BoolOr("contextMenus", true);
    if (auto h = n.Find("eventHandler")) a.eventHandler = ReadCompanion(*h, false);
    if (auto ms = n.Find("menuStates"))
      for (const auto& [name, value] : ms->Members()) {
        CheckValue(value, m_, nullptr, false);
        a.menuStates[name] = value.json();
      }
  }

  // -------------------------------------------------------- companions

  std::shared_ptr<const CompanionDef> ReadCompanion(const Node& n, bool creatable) {
    auto c = std::make_shared<CompanionDef>();
    if (creatable) {
      n.ExpectKeys({"comment", "progid", "clsid", "create", "operations", "interfaces", "members", "objects"});
      c->progid = n.StringOr("progid", "");
      c->clsid = n.StringOr("clsid", "");
      if (c->progid.empty() && c->clsid.empty()) n.Fail("a companion needs a \"progid\" or a \"clsid\"");
      if (auto cr = n.Find("create")) {
        if (cr->json().is_boolean()) {
          if (!cr->Bool()) cr->Fail("write {\"error\": {...}} for a companion that cannot be created");
        } else {
          cr->ExpectKeys({"error"});
          c->createError = ParseError(cr->Member("error"));
        }
      }
    } else {
      n.ExpectKeys({"comment", "operations", "interfaces", "members", "objects"});
    }
    if (auto ops = n.Find("operations"))
      for (const Node& op : ops->Elements()) c->operations.push_back(op.String());
    if (auto ifs = n.Find("interfaces"))
      for (const auto& [iid, list] : ifs->Members()) {
        if (iid.size() != 38 || iid.front() != '{' || iid.back() != '}')
          ifs->FailKey(iid, "an interface id is written \"{XXXXXXXX-XXXX-XXXX-XXXX-XXXXXXXXXXXX}\"");
        std::vector<std::string>& members = c->interfaces[iid];
        for (const Node& m : list.Elements()) members.push_back(m.String());
      }
    if (auto objs = n.Find("objects"))
      for (const auto& [name, def] : objs->Members()) c->objects[name] = ReadCompanion(def, false);
    if (auto members = n.Find("members"))
      for (const auto& [name, def] : members->Members()) {
        if (c->FindMember(name)) members->FailKey(name, "a second member \"" + name + "\" (names ignore case)");
        c->members[name] = ReadMember(def, *c);
      }
    return c;
  }

  MemberDef ReadMember(const Node& n, const CompanionDef& owner) {
    n.ExpectKeys({"comment", "returns", "raise", "setArgs", "answers"});
    MemberDef m;
    if (auto r = n.Find("returns")) {
      if (r->IsObject() && r->json().size() == 1 && r->json().contains("companion"))
        m.returnsObject = ReadCompanion(r->Member("companion"), false);
      else {
        CheckValue(*r, m_, &owner, false);
        m.returns = r->json();
      }
    }
    if (auto e = n.Find("raise")) m.raise = ParseError(*e);
    if (m.raise && (m.returns || m.returnsObject)) n.Member("raise").Fail("a member either returns or raises");
    if (auto s = n.Find("setArgs"))
      for (const Node& v : s->Elements()) {
        if (!(v.IsObject() && v.json().size() == 1 && v.json().contains("keep"))) CheckValue(v, m_, &owner, false);
        m.setArgs.push_back(v.json());
      }
    if (auto answers = n.Find("answers"))
      for (const Node& a : answers->Elements()) m.answers.push_back(ReadAnswer(a, owner));
    return m;
  }

  // {"args": [values], "returns": value} or {"args": [...], "raise": {...}}
  AnswerDef ReadAnswer(const Node& n, const CompanionDef& owner) {
    n.ExpectObject("an answer {\"args\": [...], \"returns\": ...}");
    n.ExpectKeys({"comment", "args", "returns", "raise"});
    AnswerDef a;
    for (const Node& v : n.Member("args").Elements()) {
      CheckValue(v, m_, &owner, false);
      a.args.push_back(v.json());
    }
    if (auto r = n.Find("returns")) {
      CheckValue(*r, m_, &owner, false);
      a.returns = r->json();
    }
    if (auto e = n.Find("raise")) a.raise = ParseError(*e);
    if (a.raise && a.returns) n.Member("raise").Fail("an answer either returns or raises");
    return a;
  }

  Node root_;
  ModelDef m_;
  std::vector<Reference> references_;
  std::unordered_map<size_t, Node> nestedNodes_;  // by the place of the element
  std::string kindForMembers_;
};

}  // namespace

ModelDef LoadModel(const JsonSource& source) { return ModelReader(source).Read(); }

}  // namespace kpx::sim
