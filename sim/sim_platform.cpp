#include "sim/sim_platform.h"

#include <algorithm>
#include <chrono>
#include <cmath>
#include <fstream>
#include <stdexcept>

#include "automation/vb_strings.h"
#include "dialogs/code_icons.h"
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


// Not there yet on this platform.
std::optional<uint32_t> RecordingFileSystem::GetAttributes(std::string_view) { RaiseNotImplemented("GetAttributes"); }
bool RecordingFileSystem::SetAttributes(std::string_view, uint32_t) { RaiseNotImplemented("SetAttributes"); }
bool RecordingFileSystem::RemoveFile(std::string_view) { RaiseNotImplemented("RemoveFile"); }
bool RecordingFileSystem::MoveFile(std::string_view, std::string_view) { RaiseNotImplemented("MoveFile"); }
std::optional<platform::DateTime> RecordingFileSystem::FileDateTime(std::string_view) { RaiseNotImplemented("FileDateTime"); }
bool RecordingFileSystem::ReplaceText(std::string_view, std::string_view) { RaiseNotImplemented("ReplaceText"); }
platform::FileHandle RecordingFileSystem::OpenForTimes(std::string_view) { RaiseNotImplemented("OpenForTimes"); }
bool RecordingFileSystem::GetFileTimes(platform::FileHandle, platform::FileTimes&) { RaiseNotImplemented("GetFileTimes"); }
bool RecordingFileSystem::SetFileTimes(platform::FileHandle, const platform::FileTimes&) { RaiseNotImplemented("SetFileTimes"); }
void RecordingFileSystem::CloseFile(platform::FileHandle) { RaiseNotImplemented("CloseFile"); }
const platform::FileError& RecordingFileSystem::LastError() { RaiseNotImplemented("LastError"); }
std::optional<platform::FileTime> VirtualClock::SystemFileTime() { RaiseNotImplemented("SystemFileTime"); }
std::optional<platform::FileTime> RecordingClock::SystemFileTime() { RaiseNotImplemented("SystemFileTime"); }
void SimUserInterface::ShowRestoreDialog(platform::RestoreForm&, const platform::HostPlacement&) {
  RaiseNotImplemented("ShowRestoreDialog");
}
platform::DependencyOutcome SimUserInterface::ShowDependencyDialog(const platform::DependencyView&) {
  RaiseNotImplemented("ShowDependencyDialog");
}


bool SimProcesses::CreateProcess(std::string_view, std::string_view, platform::ProcessRecord&) {
  RaiseNotImplemented("CreateProcess");
}
uint32_t SimProcesses::WaitForInputIdle(int64_t, uint32_t) { RaiseNotImplemented("WaitForInputIdle"); }
uint32_t SimProcesses::WaitForSingleObject(int64_t, uint32_t) { RaiseNotImplemented("WaitForSingleObject"); }
bool SimProcesses::GetExitCodeProcess(int64_t, uint32_t&) { RaiseNotImplemented("GetExitCodeProcess"); }
bool SimProcesses::CloseHandle(int64_t) { RaiseNotImplemented("CloseHandle"); }
uint32_t SimProcesses::LastError() { RaiseNotImplemented("LastError"); }

}  // namespace kpx::sim
