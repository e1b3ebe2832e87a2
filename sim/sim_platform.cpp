#include "sim/sim_platform.h"

#include <algorithm>
#include <chrono>
#include <cmath>
#include <cstdio>
#include <fstream>
#include <stdexcept>

#include "automation/vb_strings.h"
#include "dialogs/code_icons.h"
#include "shared/shared_utilities.h"
#include "sim/faults.h"

namespace kpx::sim {

// ------------------------------------------------------------------- clock

namespace {

constexpr double kDay = 86400.0;

}  // namespace

VirtualClock::VirtualClock() {
  date_.year = 2026;
  date_.month = 11;
  date_.day = 15;
  seconds_ = 3 * 3600 + 7 * 60 + 12.5;
}

void VirtualClock::Set(const ClockSetting& setting) {
  if (setting.date) {
    date_.year = setting.date->year;
    date_.month = setting.date->month;
    date_.day = setting.date->day;
  }
  if (setting.seconds) seconds_ = *setting.seconds;
  if (setting.step) step_ = *setting.step;
}

float VirtualClock::Timer() {
  const float now = static_cast<float>(seconds_);
  Advance(step_);
  return now;
}

platform::DateTime VirtualClock::Now() {
  platform::DateTime t = date_;
  const int whole = static_cast<int>(std::floor(seconds_));
  t.hour = whole / 3600;
  t.minute = whole / 60 % 60;
  t.second = whole % 60;
  return t;
}

// Whole days at once, so that a long step costs no more than a short one.
// The clock stops at the last second of 9999-12-31, the last a Date holds.
void VirtualClock::Advance(double seconds) {
  using namespace std::chrono;
  seconds_ += seconds;
  if (seconds_ < kDay) return;
  const double days = std::floor(seconds_ / kDay);
  seconds_ = std::max(0.0, seconds_ - days * kDay);
  const sys_days today = year_month_day{year{date_.year}, month{static_cast<unsigned>(date_.month)},
                                        day{static_cast<unsigned>(date_.day)}};
  const sys_days last = year_month_day{year{9999}, December, day{31}};
  if (days > static_cast<double>((last - today).count())) {
    date_.year = 9999;
    date_.month = 12;
    date_.day = 31;
    seconds_ = kDay - 1;
    return;
  }
  const year_month_day then{today + std::chrono::days{static_cast<int>(days)}};
  date_.year = static_cast<int>(then.year());
  date_.month = static_cast<int>(static_cast<unsigned>(then.month()));
  date_.day = static_cast<int>(static_cast<unsigned>(then.day()));
}

void RecordingClock::Sleep(uint32_t milliseconds) {
  log_.Add({{"ev", "sleep"}, {"ms", milliseconds}});
  inner_.Sleep(milliseconds);
}

// ----------------------------------------------------------- user interface

int SimUserInterface::MessageBox(std::string_view text, std::string_view title, uint32_t style) {
  int answer = platform::kIdOk;
  const bool scripted = !answers_.empty();
  if (scripted) {
    answer = answers_.front();
    answers_.pop_front();
  }
  log_.Add({{"ev", "messagebox"},
            {"text", text},
            {"title", title},
            {"style", style},
            {"answer", answer},
            {"answered", scripted ? "scenario" : "default"}});
  return answer;
}

namespace {

const char* IconName(platform::PromptIcon icon) {
  switch (icon) {
    case platform::PromptIcon::Critical:
      return "critical";
    case platform::PromptIcon::Question:
      return "question";
    case platform::PromptIcon::Information:
      return "information";
    case platform::PromptIcon::None:
      break;
  }
  return "none";
}

}  // namespace

platform::PromptOutcome SimUserInterface::ShowPrompt(const platform::PromptView& view, platform::PromptHelp& help) {
  PromptAnswer answer;  // OK, box not ticked, when the scenario says nothing
  const bool scripted = !promptAnswers_.empty();
  if (scripted) {
    answer = promptAnswers_.front();
    promptAnswers_.pop_front();
  }
  // A disabled Help button does nothing when pressed.
  const bool helpPressed = answer.help && view.helpAvailable;
  if (helpPressed) help.ShowHelp(kPromptWindow);
  log_.Add({{"ev", "prompt"},
            {"message", view.message},
            {"title", view.title},
            {"icon", IconName(view.icon)},
            {"buttons", EventJson::array({view.okCaption, view.cancelCaption, view.helpCaption})},
            {"helpEnabled", view.helpAvailable},
            {"checkBox", view.dontShowCaption},
            {"helpPressed", helpPressed},
            {"pressed", answer.outcome.cancelled ? "cancel" : "ok"},
            {"dontShow", answer.outcome.dontShow},
            {"answered", scripted ? "scenario" : "default"}});
  return answer.outcome;
}

bool SimUserInterface::WinHelp(int64_t window, std::string_view helpFile, uint32_t command, uint64_t data) {
  log_.Add({{"ev", "help"}, {"window", window}, {"file", helpFile}, {"command", command}, {"data", data}});
  return true;
}

void SimUserInterface::DoEvents() { log_.Add({{"ev", "doevents"}}); }

ObjectPtr SimUserInterface::LoadIconPicture(int32_t resourceId, int32_t pixels) {
  for (const CodeIconArt& art : CodeIconArtwork())
    if (art.smallResource == resourceId || art.largeResource == resourceId)
      return std::make_shared<SimPicture>(resourceId, pixels);
  throw AutomationError(326, "Resource with identifier '" + std::to_string(resourceId) + "' not found");
}

std::string SimPicture::label() const {
  return "icon:" + std::to_string(resourceId_) + "/" + std::to_string(pixels_);
}

DispId SimPicture::IdOfName(std::string_view name) {
  static constexpr std::pair<const char*, DispId> kNames[] = {{"Handle", platform::kPictureHandle},
                                                              {"hPal", platform::kPicturePalette},
                                                              {"Type", platform::kPictureType},
                                                              {"Width", platform::kPictureWidth},
                                                              {"Height", platform::kPictureHeight}};
  for (const auto& [n, id] : kNames)
    if (EqualsNoCase(n, name)) return id;
  throw AutomationError(vberr::kNoSuchMember);
}

Variant SimPicture::Invoke(DispId id, CallKind kind, std::span<Variant> args) {
  // The picture's properties are read-only here, as an icon's are.
  if (kind == CallKind::PropertyPut || kind == CallKind::PropertyPutRef) throw AutomationError(vberr::kNoSuchMember);
  if (!args.empty()) throw AutomationError(vberr::kWrongArgCount);
  switch (id) {
    case platform::kPictureHandle: return resourceId_;
    case platform::kPicturePalette: return int32_t{0};  // an icon has none
    case platform::kPictureType: return platform::kPictureTypeIcon;
    case platform::kPictureWidth:
    case platform::kPictureHeight: return platform::PixelsToHimetric(pixels_);
    default: throw AutomationError(vberr::kNoSuchMember);
  }
}

// ---------------------------------------------------------------- registry

std::string RootName(platform::RootKey root) {
  switch (root) {
    case platform::RootKey::LocalMachine:
      return "HKLM";
    case platform::RootKey::CurrentUser:
      return "HKCU";
  }
  return "0x" + std::to_string(static_cast<uint32_t>(root));
}

std::string RegistryTypeName(uint32_t type) {
  switch (type) {
    case platform::kRegSz:
      return "REG_SZ";
    case platform::kRegBinary:
      return "REG_BINARY";
    case platform::kRegDword:
      return "REG_DWORD";
    default:
      return "type " + std::to_string(type);
  }
}

EventJson RegistryValueJson(const platform::RegistryValue& value) {
  const std::string& d = value.data;
  if (value.type == platform::kRegSz && !d.empty() && d.back() == '\0') return d.substr(0, d.size() - 1);
  if (value.type == platform::kRegDword && d.size() == 4) {
    uint32_t u = 0;
    for (int i = 3; i >= 0; --i) u = (u << 8) | static_cast<unsigned char>(d[static_cast<size_t>(i)]);
    return u;
  }
  static constexpr char kHex[] = "0123456789abcdef";
  std::string hex;
  for (unsigned char c : d) {
    hex += kHex[c >> 4];
    hex += kHex[c & 15];
  }
  return {{"binary", hex}};
}

std::optional<platform::RegistryValue> RecordingRegistry::QueryValue(platform::RootKey root, std::string_view key,
                                                                     std::string_view name) {
  const auto injected = InjectedRead(faults_, root, key, name);
  std::optional<platform::RegistryValue> v = injected ? *injected : inner_.QueryValue(root, key, name);
  EventJson ev{{"ev", "registry-read"},
               {"root", RootName(root)},
               {"key", key},
               {"name", name},
               {"type", v ? EventJson(RegistryTypeName(v->type)) : EventJson()},
               {"value", v ? RegistryValueJson(*v) : EventJson()}};
  if (injected) ev["fault"] = true;
  log_.Add(std::move(ev));
  return v;
}

bool RecordingRegistry::SetValue(platform::RootKey root, std::string_view key, std::string_view name,
                                 const platform::RegistryValue& value) {
  const bool written = inner_.SetValue(root, key, name, value);
  log_.Add({{"ev", "registry-write"},
            {"root", RootName(root)},
            {"key", key},
            {"name", name},
            {"type", RegistryTypeName(value.type)},
            {"value", RegistryValueJson(value)},
            {"written", written}});
  return written;
}

platform::KeyDisposition RecordingRegistry::CreateKey(platform::RootKey root, std::string_view key) {
  const bool injected = InjectedCreateFailure(faults_, root, key);
  const platform::KeyDisposition d = injected ? platform::KeyDisposition::Failed : inner_.CreateKey(root, key);
  const char* name = d == platform::KeyDisposition::Created  ? "created"
                     : d == platform::KeyDisposition::Opened ? "opened"
                                                             : "failed";
  EventJson ev{{"ev", "registry-create"}, {"root", RootName(root)}, {"key", key}, {"disposition", name}};
  if (injected) ev["fault"] = true;
  log_.Add(std::move(ev));
  return d;
}

void SeedRegistry(platform::Registry& registry, const std::vector<RegistryEntry>& entries) {
  for (const RegistryEntry& e : entries) {
    if (!e.name) {
      if (registry.CreateKey(e.root, e.key) == platform::KeyDisposition::Failed)
        throw WorldError("cannot create registry key " + RootName(e.root) + "\\" + e.key);
    } else if (!registry.SetValue(e.root, e.key, *e.name, e.value)) {
      throw WorldError("cannot set registry value " + RootName(e.root) + "\\" + e.key + " " + *e.name);
    }
  }
}

// ------------------------------------------------------------------- files

bool RecordingFileSystem::Exists(std::string_view path) {
  const bool exists = inner_.Exists(path);
  log_.Add({{"ev", "file-exists"}, {"path", path}, {"exists", exists}});
  return exists;
}

bool RecordingFileSystem::DeleteFile(std::string_view path) {
  const bool ok = inner_.DeleteFile(path);
  log_.Add({{"ev", "file-delete"}, {"path", path}, {"ok", ok}});
  return ok;
}

bool RecordingFileSystem::AppendComposed(std::string_view path, const std::function<std::string()>& compose) {
  std::optional<std::string> text;  // stays empty when the file never opened
  const bool ok = inner_.AppendComposed(path, [&] {
    text = compose();
    return *text;
  });
  if (EqualsNoCase(path, debugLog_.Path())) {
    EventJson ev{{"ev", "debuglog"}};
    if (text) {
      std::string_view line = *text;
      if (line.size() >= 2 && line.substr(line.size() - 2) == "\r\n") line.remove_suffix(2);
      ev["line"] = line;
    }
    ev["ok"] = ok;
    log_.Add(std::move(ev));
  } else {
    // Other files are written with a text known beforehand; making it
    // again for the record costs nothing the add-in can see.
    log_.Add({{"ev", "file-append"}, {"path", path}, {"text", text ? *text : compose()}, {"ok", ok}});
  }
  return ok;
}

std::string RecordingFileSystem::ReadText(std::string_view path) {
  try {
    std::string text = inner_.ReadText(path);
    log_.Add({{"ev", "file-read"}, {"path", path}, {"ok", true}});
    return text;
  } catch (const AutomationError& e) {
    log_.Add({{"ev", "file-read"}, {"path", path}, {"ok", false}, {"error", ErrorJson(e)}});
    throw;
  }
}

namespace {

// Where the file system's refusal is the sim's failure to change the world.
template <typename F>
void Seeding(std::string_view windowsPath, const char* what, F change) {
  try {
    change();
  } catch (const std::filesystem::filesystem_error& e) {
    throw WorldError(std::string("cannot ") + what + " " + std::string(windowsPath) + ": " + e.code().message());
  }
}

// Refuses a path below a file, in the same words on every system.
void CheckFolders(std::string_view windowsPath, const std::filesystem::path& path, const char* what) {
  for (std::filesystem::path up = path.parent_path(); !up.empty(); up = up.parent_path()) {
    const std::filesystem::file_status status = std::filesystem::status(up);
    if (std::filesystem::exists(status)) {
      if (!std::filesystem::is_directory(status))
        throw WorldError(std::string("cannot ") + what + " " + std::string(windowsPath) +
                         ": a file lies where a folder must be");
      return;
    }
    if (up == up.root_path()) return;
  }
}

// The world replaces a file whole, read-only or not: the new file is not.
void MakeWritable(const std::filesystem::path& path) {
  std::error_code ec;
  if (std::filesystem::is_regular_file(path, ec))
    std::filesystem::permissions(path, std::filesystem::perms::owner_write, std::filesystem::perm_options::add, ec);
}

}  // namespace

void FileSeeder::MakeFolder(std::string_view windowsPath) {
  Seeding(windowsPath, "make the folder", [&] {
    const std::filesystem::path path = hostPath_(windowsPath);
    CheckFolders(windowsPath, path / "x", "make the folder");  // the folder itself too
    std::filesystem::create_directories(path);
  });
}

void FileSeeder::WriteFile(std::string_view windowsPath, std::string_view content) {
  Seeding(windowsPath, "write", [&] {
    const std::filesystem::path path = hostPath_(windowsPath);
    CheckFolders(windowsPath, path, "write");
    if (path.has_parent_path()) std::filesystem::create_directories(path.parent_path());
    if (std::filesystem::is_directory(path))
      throw WorldError("cannot write " + std::string(windowsPath) + ": a folder of that name is in the way");
    MakeWritable(path);
    std::ofstream out(path, std::ios::binary | std::ios::trunc);
    out.write(content.data(), static_cast<std::streamsize>(content.size()));
    out.close();
    if (!out) throw WorldError("cannot write " + std::string(windowsPath) + " (" + path.string() + ")");
  });
}

void FileSeeder::RemoveFile(std::string_view windowsPath) {
  Seeding(windowsPath, "delete", [&] {
    const std::filesystem::path path = hostPath_(windowsPath);
    if (std::filesystem::is_directory(path))
      throw WorldError("cannot delete " + std::string(windowsPath) + ": it is a folder");
    MakeWritable(path);
    std::filesystem::remove(path);
  });
}

// ----------------------------------------------------------------- objects

ObjectPtr RecordingObjectFactory::Record(EventJson event, const std::function<ObjectPtr()>& create) {
  event["ev"] = "object-create";
  try {
    ObjectPtr object = create();
    event["instance"] = log_.Label(object.get());
    event["ok"] = true;
    log_.Add(std::move(event));
    return object;
  } catch (const AutomationError& e) {
    event["ok"] = false;
    event["error"] = ErrorJson(e);
    log_.Add(std::move(event));
    throw;
  }
}

ObjectPtr RecordingObjectFactory::CreateObject(std::string_view progId) {
  return Record({{"progid", progId}}, [&] { return inner_.CreateObject(progId); });
}

ObjectPtr RecordingObjectFactory::CreateInstance(std::string_view clsid, std::string_view iid) {
  return Record({{"clsid", clsid}, {"iid", iid}}, [&] { return inner_.CreateInstance(clsid, iid); });
}


// ------------------------------------------------------------ file times

std::optional<platform::FileTime> VirtualClock::SystemFileTime() { return ToFileTime(date_, seconds_); }

// ------------------------------------------------------- restore file calls

namespace {

EventJson FileErrorJson(const platform::FileError& e) {
  return {{"number", e.number}, {"description", e.description}};
}

EventJson TimesJson(const platform::FileTimes& t) {
  return {{"creation", FileTimeText(t.creation)},
          {"lastAccess", FileTimeText(t.lastAccess)},
          {"lastWrite", FileTimeText(t.lastWrite)}};
}

std::string DateText(const platform::DateTime& d) {
  char text[32];
  std::snprintf(text, sizeof text, "%04d-%02d-%02d %02d:%02d:%02d", d.year, d.month, d.day, d.hour, d.minute,
                d.second);
  return text;
}

}  // namespace

const ErrorDef* RecordingFileSystem::Fault(std::string_view path, std::optional<ErrorDef> FileFaultDef::*call) const {
  auto it = faults_.files.find(path);
  if (it == faults_.files.end() || !(it->second.*call)) return nullptr;
  return &*(it->second.*call);
}

void RecordingFileSystem::Outcome(EventJson& event, bool ok) {
  event["ok"] = ok;
  if (!ok) event["error"] = FileErrorJson(inner_.LastError());
}

bool RecordingFileSystem::Faultable(EventJson event, std::string_view path,
                                    std::optional<ErrorDef> FileFaultDef::*kind, const std::function<bool()>& call) {
  injected_.reset();
  bool ok = false;
  if (const ErrorDef* fault = Fault(path, kind)) {
    injected_ = platform::FileError{fault->number, fault->description};
    event["ok"] = false;
    event["error"] = FileErrorJson(*injected_);
    event["fault"] = true;
  } else {
    ok = call();
    Outcome(event, ok);
  }
  log_.Add(std::move(event));
  return ok;
}

const platform::FileError& RecordingFileSystem::LastError() {
  return injected_ ? *injected_ : inner_.LastError();
}

std::optional<uint32_t> RecordingFileSystem::GetAttributes(std::string_view path) {
  injected_.reset();
  const std::optional<uint32_t> attributes = inner_.GetAttributes(path);
  EventJson ev{{"ev", "file-attributes"}, {"path", path}, {"attributes", attributes ? EventJson(*attributes) : EventJson()}};
  if (!attributes) ev["error"] = FileErrorJson(inner_.LastError());
  log_.Add(std::move(ev));
  return attributes;
}

bool RecordingFileSystem::SetAttributes(std::string_view path, uint32_t attributes) {
  injected_.reset();
  const bool ok = inner_.SetAttributes(path, attributes);
  EventJson ev{{"ev", "file-attributes"}, {"path", path}, {"set", attributes}};
  Outcome(ev, ok);
  log_.Add(std::move(ev));
  return ok;
}

bool RecordingFileSystem::RemoveFile(std::string_view path) {
  return Faultable({{"ev", "file-remove"}, {"path", path}}, path, &FileFaultDef::remove,
                   [&] { return inner_.RemoveFile(path); });
}

bool RecordingFileSystem::MoveFile(std::string_view from, std::string_view to) {
  return Faultable({{"ev", "file-move"}, {"from", from}, {"to", to}}, from, &FileFaultDef::move,
                   [&] { return inner_.MoveFile(from, to); });
}

std::optional<platform::DateTime> RecordingFileSystem::FileDateTime(std::string_view path) {
  injected_.reset();
  const std::optional<platform::DateTime> date = inner_.FileDateTime(path);
  EventJson ev{{"ev", "file-date"}, {"path", path}, {"date", date ? EventJson(DateText(*date)) : EventJson()}};
  if (!date) ev["error"] = FileErrorJson(inner_.LastError());
  log_.Add(std::move(ev));
  return date;
}

bool RecordingFileSystem::ReplaceText(std::string_view path, std::string_view text) {
  return Faultable({{"ev", "file-replace"}, {"path", path}, {"text", text}}, path, &FileFaultDef::replace,
                   [&] { return inner_.ReplaceText(path, text); });
}

platform::FileHandle RecordingFileSystem::OpenForTimes(std::string_view path) {
  platform::FileHandle handle = platform::kNoFile;
  Faultable({{"ev", "file-times"}, {"call", "open"}, {"path", path}}, path, &FileFaultDef::times, [&] {
    handle = inner_.OpenForTimes(path);
    if (handle != platform::kNoFile) openPaths_[handle] = std::string(path);
    return handle != platform::kNoFile;
  });
  return handle;
}

namespace {

// The file a handle stands for, as the log names it.
EventJson HandlePath(const std::map<platform::FileHandle, std::string>& open, platform::FileHandle file) {
  auto it = open.find(file);
  return it == open.end() ? EventJson() : EventJson(it->second);
}

}  // namespace

bool RecordingFileSystem::GetFileTimes(platform::FileHandle file, platform::FileTimes& times) {
  injected_.reset();
  const bool ok = inner_.GetFileTimes(file, times);
  EventJson ev{{"ev", "file-times"}, {"call", "get"}, {"path", HandlePath(openPaths_, file)}};
  Outcome(ev, ok);
  if (ok) ev["times"] = TimesJson(times);
  log_.Add(std::move(ev));
  return ok;
}

bool RecordingFileSystem::SetFileTimes(platform::FileHandle file, const platform::FileTimes& times) {
  injected_.reset();
  const bool ok = inner_.SetFileTimes(file, times);
  EventJson ev{{"ev", "file-times"}, {"call", "set"}, {"path", HandlePath(openPaths_, file)}, {"times", TimesJson(times)}};
  Outcome(ev, ok);
  log_.Add(std::move(ev));
  return ok;
}

void RecordingFileSystem::CloseFile(platform::FileHandle file) {
  inner_.CloseFile(file);
  log_.Add({{"ev", "file-times"}, {"call", "close"}, {"path", HandlePath(openPaths_, file)}});
  openPaths_.erase(file);
}

// ---------------------------------------------------------- restore dialog

namespace {

// A row's name in a scenario: a project by its project, a file by its full
// path (the source path of its restore item, else its folder and name).
std::string RowName(const platform::RestoreRow& row) {
  if (row.project) return row.cells[0];
  std::string_view key = row.key;
  for (int field = 0; field < 2; ++field) {
    const size_t bar = key.find('|');
    if (bar == std::string_view::npos) {
      key = {};
      break;
    }
    key.remove_prefix(bar + 1);
  }
  const std::string source(key.substr(0, key.find('|')));
  if (!source.empty()) return source;
  return row.cells[2].empty() ? row.cells[1] : row.cells[2] + "\\" + row.cells[1];
}

int32_t FindRow(const platform::RestoreForm& form, const std::string& name) {
  const auto& rows = form.rows();
  for (size_t i = 0; i < rows.size(); ++i)
    if (EqualsNoCase(RowName(rows[i]), name)) return static_cast<int32_t>(i);
  return -1;
}

EventJson RowsJson(const platform::RestoreForm& form) {
  EventJson rows = EventJson::array();
  for (const platform::RestoreRow& r : form.rows()) {
    EventJson row{{"kind", r.project ? "project" : "file"},
                  {"cells", EventJson::array({r.cells[0], r.cells[1], r.cells[2]})},
                  {"check", r.check}};
    if (!r.project) row["modified"] = r.modified;
    rows.push_back(std::move(row));
  }
  return rows;
}

// What the window shows, to tell what a step changed.
struct RestoreState {
  std::vector<int32_t> checks;
  std::vector<std::string> names;
  int32_t selected = -1;
  std::string title, subtitle;
  bool ok = false;
};

RestoreState StateOf(const platform::RestoreForm& form) {
  RestoreState s;
  for (const platform::RestoreRow& r : form.rows()) {
    s.checks.push_back(r.check);
    s.names.push_back(RowName(r));
  }
  s.selected = form.selectedRow();
  s.title = form.headerTitle();
  s.subtitle = form.headerSubtitle();
  s.ok = form.okEnabled();
  return s;
}

void AddChanges(EventJson& step, const RestoreState& before, const RestoreState& after) {
  if (before.names != after.names) {
    step["rows"] = after.names.size();
  } else {
    EventJson checks = EventJson::object();
    for (size_t i = 0; i < after.checks.size(); ++i)
      if (after.checks[i] != before.checks[i]) checks[after.names[i]] = after.checks[i];
    if (!checks.empty()) step["checks"] = std::move(checks);
  }
  if (after.selected != before.selected)
    step["selected"] = after.selected < 0 || static_cast<size_t>(after.selected) >= after.names.size()
                           ? EventJson()
                           : EventJson(after.names[static_cast<size_t>(after.selected)]);
  if (after.title != before.title) step["title"] = after.title;
  if (after.subtitle != before.subtitle) step["subtitle"] = after.subtitle;
  if (after.ok != before.ok) step["okEnabled"] = after.ok;
}

// The list tells the dialog of a row newly selected only: selecting the
// row that is already selected changes nothing.
void SelectAsTheListDoes(platform::RestoreForm& form, int32_t row) {
  if (form.selectedRow() != row) form.Select(row);
}

const char* StepName(RestoreStep::Kind kind) {
  switch (kind) {
    case RestoreStep::Kind::Tick: return "tick";
    case RestoreStep::Kind::Untick: return "untick";
    case RestoreStep::Kind::Select: return "select";
    case RestoreStep::Kind::Click: return "click";
    case RestoreStep::Kind::Compare: return "compare";
    case RestoreStep::Kind::Timer: return "timer";
    case RestoreStep::Kind::Help: return "help";
    case RestoreStep::Kind::Ok: return "ok";
    case RestoreStep::Kind::Cancel: break;
  }
  return "cancel";
}

}  // namespace

void SimUserInterface::WorldFailed(int line, const std::string& reason) {
  log_.Add({{"ev", "world-failed"}, {"action", "answer"}, {"line", line}, {"reason", reason}});
}

void SimUserInterface::ShowRestoreDialog(platform::RestoreForm& form, const platform::HostPlacement& placement) {
  const platform::RestoreForm::Texts& texts = form.texts();
  EventJson ev{{"ev", "restore-dialog"},
               {"owner", placement.ownerWindow},
               {"host",
                {{"top", placement.top}, {"left", placement.left}, {"height", placement.height}, {"width", placement.width}}},
               {"caption", texts.caption},
               {"instructions", texts.instructions},
               {"buttons", EventJson::array({texts.ok, texts.cancel, texts.help})},
               {"columns", EventJson::array({texts.columns[0], texts.columns[1], texts.columns[2]})},
               {"title", form.headerTitle()},
               {"subtitle", form.headerSubtitle()},
               {"rows", RowsJson(form)},
               {"okEnabled", form.okEnabled()}};
  const int32_t selected = form.selectedRow();
  ev["selected"] = selected >= 0 && static_cast<size_t>(selected) < form.rows().size()
                       ? EventJson(RowName(form.rows()[static_cast<size_t>(selected)]))
                       : EventJson();
  const bool scripted = !restoreAnswers_.empty();
  RestoreAnswer answer;
  if (scripted) {
    answer = std::move(restoreAnswers_.front());
    restoreAnswers_.pop_front();
  }
  EventJson steps = EventJson::array();
  bool closedByOk = false, closed = false;
  int32_t menuRow = -1;     // the row whose context menu is open
  bool timerRunning = false;
  std::optional<std::pair<int, std::string>> failure;
  for (const RestoreStep& step : answer.steps) {
    const RestoreState before = StateOf(form);
    EventJson record{{"step", StepName(step.kind)}};
    if (!step.row.empty()) record["row"] = step.row;
    const int32_t openMenu = menuRow;
    menuRow = -1;  // any step but the menu's command closes the menu
    int32_t row = -1;
    if (!step.row.empty()) {
      row = FindRow(form, step.row);
      if (row < 0) failure = {{step.line, "the Restore dialog shows no row \"" + step.row + "\""}};
    }
    if (!failure) switch (step.kind) {
        case RestoreStep::Kind::Tick:
        case RestoreStep::Kind::Untick:
          form.SetCheck(row, step.kind == RestoreStep::Kind::Tick);
          break;
        case RestoreStep::Kind::Select:
          SelectAsTheListDoes(form, row);
          break;
        case RestoreStep::Kind::Click: {
          // A click on a row, left or right, selects it before the dialog
          // hears of the click, as the list control does.
          SelectAsTheListDoes(form, row);
          bool startTimer = false;
          const std::string caption = form.Click(row, startTimer);
          if (!caption.empty()) {
            record["menu"] = caption;
            menuRow = row;
          }
          if (startTimer) {
            record["timerStarted"] = true;
            timerRunning = true;
          }
          break;
        }
        case RestoreStep::Kind::Compare:
          if (openMenu < 0)
            failure = {{step.line, "no context menu is open to compare from"}};
          else
            form.Compare(openMenu);
          break;
        case RestoreStep::Kind::Timer:
          if (!timerRunning) {
            failure = {{step.line, "no timer runs in the Restore dialog"}};
          } else {
            timerRunning = false;
            form.Timer();
          }
          break;
        case RestoreStep::Kind::Help:
          form.Help(kRestoreWindow);
          break;
        case RestoreStep::Kind::Ok:
          if (!form.okEnabled()) {
            failure = {{step.line, "OK is disabled: no file is ticked"}};
          } else {
            form.Ok();
            closed = closedByOk = true;
          }
          break;
        case RestoreStep::Kind::Cancel:
          form.Cancel();
          closed = true;
          break;
      }
    if (failure) {
      record["failed"] = true;
      steps.push_back(std::move(record));
      break;
    }
    AddChanges(record, before, StateOf(form));
    steps.push_back(std::move(record));
    if (closed) break;
  }
  // Whatever the play did not close is closed with Cancel: nothing is lost.
  if (!closed) form.Cancel();
  ev["steps"] = std::move(steps);
  ev["pressed"] = closedByOk ? "ok" : "cancel";
  ev["answered"] = scripted ? "scenario" : "default";
  log_.Add(std::move(ev));
  if (failure) WorldFailed(failure->first, failure->second);
}

platform::DependencyOutcome SimUserInterface::ShowDependencyDialog(const platform::DependencyView& view) {
  const bool scripted = !dependencyAnswers_.empty();
  DependencyAnswer answer;  // Cancel, nothing edited
  if (scripted) {
    answer = std::move(dependencyAnswers_.front());
    dependencyAnswers_.pop_front();
  }
  platform::DependencyOutcome outcome;
  outcome.text = view.text;
  // A read-only text takes no edit.
  if (answer.text && !view.readOnly) {
    outcome.changed = true;
    outcome.text = *answer.text;
  }
  const bool okRefused = answer.ok && view.readOnly;
  outcome.ok = answer.ok && !view.readOnly;
  EventJson ev{{"ev", "dependency-dialog"},
               {"caption", view.caption},
               {"label", view.label},
               {"text", view.text},
               {"buttons", EventJson::array({view.ok, view.cancel})},
               {"readOnly", view.readOnly},
               {"edited", outcome.changed}};
  if (outcome.changed) ev["newText"] = outcome.text;
  ev["pressed"] = outcome.ok ? "ok" : "cancel";
  ev["answered"] = scripted ? "scenario" : "default";
  log_.Add(std::move(ev));
  if (okRefused) WorldFailed(answer.line, "OK is disabled: the module dependency is read-only");
  return outcome;
}

// --------------------------------------------------------------- processes

namespace {

constexpr uint32_t kErrorFileNotFound = 2;
constexpr uint32_t kErrorInvalidHandle = 6;

}  // namespace

SimProcesses::Handle* SimProcesses::Find(int64_t handle) {
  auto it = handles_.find(handle);
  if (it != handles_.end()) return &it->second;
  lastError_ = kErrorInvalidHandle;
  return nullptr;
}

bool SimProcesses::CreateProcess(std::string_view applicationName, std::string_view commandLine,
                                 platform::ProcessRecord& record) {
  const std::string program = applicationName.empty() ? CommandLineProgram(commandLine) : std::string(applicationName);
  auto def = programs_.find(program);
  const uint32_t error = def == programs_.end()                            ? kErrorFileNotFound
                         : def->second.kind == ProcessDef::Kind::StartFails ? def->second.error
                                                                            : 0;
  if (error) {
    lastError_ = error;
    log_.Add({{"ev", "process"},
              {"application", applicationName},
              {"commandLine", commandLine},
              {"started", false},
              {"error", error}});
    return false;
  }
  auto child = std::make_shared<Child>();
  child->application = std::string(applicationName);
  child->commandLine = std::string(commandLine);
  child->def = def->second;
  record.process = nextHandle_++;
  record.thread = nextHandle_++;
  record.processId = nextId_++;
  record.threadId = nextId_++;
  handles_[record.process] = {child, false};
  handles_[record.thread] = {child, true};
  lastError_ = 0;
  return true;
}

// Nothing runs, so nothing is ever busy starting up.
uint32_t SimProcesses::WaitForInputIdle(int64_t process, uint32_t) {
  const Handle* h = Find(process);
  if (!h || h->thread) {
    lastError_ = kErrorInvalidHandle;
    return platform::kWaitFailed;
  }
  return 0;
}

uint32_t SimProcesses::WaitForSingleObject(int64_t handle, uint32_t milliseconds) {
  Handle* h = Find(handle);
  if (!h) return platform::kWaitFailed;
  Child& child = *h->child;
  uint32_t result = platform::kWaitObject0;
  EventJson ev{{"ev", "process"},
               {"application", child.application},
               {"commandLine", child.commandLine},
               {"started", true},
               {"timeout", milliseconds}};
  switch (child.def.kind) {
    case ProcessDef::Kind::Exits:
      child.waited = true;
      ev["outcome"] = "exited";
      ev["exitCode"] = child.def.exitCode;
      break;
    case ProcessDef::Kind::TimesOut:
      result = platform::kWaitTimeout;
      ev["outcome"] = "timeout";
      break;
    case ProcessDef::Kind::WaitFails:
    case ProcessDef::Kind::StartFails:
      result = platform::kWaitFailed;
      lastError_ = child.def.error;
      ev["outcome"] = "wait-failed";
      ev["error"] = child.def.error;
      break;
  }
  // One event per process: its first wait on the process handle.
  if (!h->thread && !child.recorded) {
    child.recorded = true;
    log_.Add(std::move(ev));
  }
  return result;
}

bool SimProcesses::GetExitCodeProcess(int64_t process, uint32_t& exitCode) {
  const Handle* h = Find(process);
  if (!h || h->thread) {
    lastError_ = kErrorInvalidHandle;
    return false;
  }
  const Child& child = *h->child;
  exitCode = child.def.kind == ProcessDef::Kind::Exits ? child.def.exitCode : kStillActive;
  return true;
}

bool SimProcesses::CloseHandle(int64_t handle) {
  Handle* h = Find(handle);
  if (!h) return false;
  Child& child = *h->child;
  if (!h->thread && !child.recorded) {
    child.recorded = true;
    log_.Add({{"ev", "process"},
              {"application", child.application},
              {"commandLine", child.commandLine},
              {"started", true},
              {"waited", false}});
  }
  handles_.erase(handle);
  return true;
}

}  // namespace kpx::sim
