#include "sim/sim_platform.h"

#include <cmath>
#include <fstream>
#include <stdexcept>

#include "automation/vb_strings.h"
#include "sim/faults.h"

namespace kpx::sim {

// ------------------------------------------------------------------- clock

namespace {

bool IsLeap(int y) { return (y % 4 == 0 && y % 100 != 0) || y % 400 == 0; }

int DaysIn(int year, int month) {
  static constexpr int kDays[] = {31, 28, 31, 30, 31, 30, 31, 31, 30, 31, 30, 31};
  return month == 2 && IsLeap(year) ? 29 : kDays[month - 1];
}

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

void VirtualClock::Advance(double seconds) {
  seconds_ += seconds;
  while (seconds_ >= kDay) {  // past midnight: Timer starts again from 0
    seconds_ -= kDay;
    if (++date_.day > DaysIn(date_.year, date_.month)) {
      date_.day = 1;
      if (++date_.month > 12) {
        date_.month = 1;
        ++date_.year;
      }
    }
  }
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

bool SimUserInterface::WinHelp(int64_t window, std::string_view helpFile, uint32_t command, uint64_t data) {
  log_.Add({{"ev", "help"}, {"window", window}, {"file", helpFile}, {"command", command}, {"data", data}});
  return true;
}

void SimUserInterface::DoEvents() { log_.Add({{"ev", "doevents"}}); }

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
        throw std::runtime_error("cannot create registry key " + RootName(e.root) + "\\" + e.key);
    } else if (!registry.SetValue(e.root, e.key, *e.name, e.value)) {
      throw std::runtime_error("cannot set registry value " + RootName(e.root) + "\\" + e.key + " " + *e.name);
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

bool RecordingFileSystem::AppendText(std::string_view path, std::string_view text) {
  const bool ok = inner_.AppendText(path, text);
  if (EqualsNoCase(path, debugLog_.Path())) {
    std::string_view line = text;
    if (line.size() >= 2 && line.substr(line.size() - 2) == "\r\n") line.remove_suffix(2);
    log_.Add({{"ev", "debuglog"}, {"line", line}, {"ok", ok}});
  } else {
    log_.Add({{"ev", "file-append"}, {"path", path}, {"text", text}, {"ok", ok}});
  }
  return ok;
}

void FileSeeder::MakeFolder(std::string_view windowsPath) {
  std::filesystem::create_directories(hostPath_(windowsPath));
}

void FileSeeder::WriteFile(std::string_view windowsPath, std::string_view content) {
  const std::filesystem::path path = hostPath_(windowsPath);
  if (path.has_parent_path()) std::filesystem::create_directories(path.parent_path());
  std::ofstream out(path, std::ios::binary | std::ios::trunc);
  out.write(content.data(), static_cast<std::streamsize>(content.size()));
  if (!out) throw std::runtime_error("cannot write " + std::string(windowsPath) + " (" + path.string() + ")");
}

void FileSeeder::RemoveFile(std::string_view windowsPath) { std::filesystem::remove(hostPath_(windowsPath)); }

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

}  // namespace kpx::sim
