// The outside world as the simulated host offers it to the add-in: a virtual
// clock, a scripted user, and recording wrappers around whatever registry,
// files and object factory the run is given. The wrappers write every effect
// into the event log and pass the call on unchanged.
#pragma once

#include <cstdint>
#include <deque>
#include <filesystem>
#include <functional>
#include <memory>
#include <optional>
#include <stdexcept>
#include <string>

#include "platform/platform.h"
#include "shared/shared_debug_logger.h"
#include "sim/event_log.h"
#include "sim/model_file.h"
#include "sim/scenario_file.h"

namespace kpx::sim {

// ------------------------------------------------------------------- clock

// Time stands still unless told otherwise: each Timer() read moves it on by
// `step` seconds, each Sleep by its length. Runs are repeatable to the bit.
class VirtualClock final : public platform::Clock {
 public:
  VirtualClock();
  void Set(const ClockSetting& setting);

  float Timer() override;
  platform::DateTime Now() override;
  void Sleep(uint32_t milliseconds) override { Advance(milliseconds / 1000.0); }

  // The clock's date and time taken as UTC: the simulated machine lives
  // in UTC, so a run gives the same file times wherever it runs.
  std::optional<platform::FileTime> SystemFileTime() override;

  double seconds() const { return seconds_; }

 private:
  void Advance(double seconds);
  platform::DateTime date_;
  double seconds_ = 0;
  double step_ = 0;
};

class RecordingClock final : public platform::Clock {
 public:
  RecordingClock(platform::Clock& inner, EventLog& log) : inner_(inner), log_(log) {}
  float Timer() override { return inner_.Timer(); }
  platform::DateTime Now() override { return inner_.Now(); }
  void Sleep(uint32_t milliseconds) override;
  // Not recorded, as Timer and Now are not: the file times it ends up in are.
  std::optional<platform::FileTime> SystemFileTime() override { return inner_.SystemFileTime(); }

 private:
  platform::Clock& inner_;
  EventLog& log_;
};

// ----------------------------------------------------------- user interface

// One of the add-in's icons as the sim hands it out: the standard picture's
// members (Handle, hPal, Type, Width, Height), its size in HIMETRIC as a 96
// dpi screen gives it, its Handle the icon's resource id.
class SimPicture final : public SimObject {
 public:
  SimPicture(int32_t resourceId, int32_t pixels) : resourceId_(resourceId), pixels_(pixels) {}
  std::string label() const override;
  DispId IdOfName(std::string_view name) override;
  Variant Invoke(DispId id, CallKind kind, std::span<Variant> args) override;

  int32_t resourceId() const { return resourceId_; }
  int32_t pixels() const { return pixels_; }

 private:
  int32_t resourceId_;
  int32_t pixels_;
};

// Plays the user: message boxes take the answers the scenario queued, OK
// otherwise. There is no real user to wrap, so it records itself. Its
// icons are the add-in's code icons, the resources the DLL carries.
class SimUserInterface final : public platform::UserInterface {
 public:
  explicit SimUserInterface(EventLog& log) : log_(log) {}
  void QueueAnswer(int button) { answers_.push_back(button); }
  const std::deque<int>& pendingAnswers() const { return answers_; }
  struct PromptAnswer {
    platform::PromptOutcome outcome;
    bool help = false;  // Help pressed before the closing button
  };
  void QueuePromptAnswer(PromptAnswer answer) { promptAnswers_.push_back(answer); }
  const std::deque<PromptAnswer>& pendingPromptAnswers() const { return promptAnswers_; }
  // The window number the played prompt has, as Help hands it on.
  static constexpr int64_t kPromptWindow = 4343;

  platform::PromptOutcome ShowPrompt(const platform::PromptView& view, platform::PromptHelp& help) override;

  void QueueRestoreAnswer(RestoreAnswer answer) { restoreAnswers_.push_back(std::move(answer)); }
  const std::deque<RestoreAnswer>& pendingRestoreAnswers() const { return restoreAnswers_; }
  void QueueDependencyAnswer(DependencyAnswer answer) { dependencyAnswers_.push_back(std::move(answer)); }
  const std::deque<DependencyAnswer>& pendingDependencyAnswers() const { return dependencyAnswers_; }
  // The window number the played Restore dialog has, as Help hands it on.
  static constexpr int64_t kRestoreWindow = 4444;

  int MessageBox(std::string_view text, std::string_view title, uint32_t style) override;
  bool WinHelp(int64_t window, std::string_view helpFile, uint32_t command, uint64_t data) override;
  void DoEvents() override;
  ObjectPtr LoadIconPicture(int32_t resourceId, int32_t pixels) override;
  // Plays the steps of the next queued answer on the form, then records
  // the dialog ("restore-dialog"). A step the dialog cannot take (a row it
  // does not show, a disabled OK, a menu or a timer that is not there)
  // ends the play: the dialog closes with Cancel and the step is recorded
  // as "world-failed" with its line. No answer queued: Cancel.
  void ShowRestoreDialog(platform::RestoreForm& form, const platform::HostPlacement& placement) override;
  // Takes the next queued answer; none: Cancel. A read-only view takes no
  // edit, and its OK is disabled.
  platform::DependencyOutcome ShowDependencyDialog(const platform::DependencyView& view) override;

 private:
  void WorldFailed(int line, const std::string& reason);

  EventLog& log_;
  std::deque<int> answers_;
  std::deque<PromptAnswer> promptAnswers_;
  std::deque<RestoreAnswer> restoreAnswers_;
  std::deque<DependencyAnswer> dependencyAnswers_;
};

// Child processes as the model answers them: nothing runs. A program is
// found by the application name, or, without one, by the first word of the
// command line; one the model does not list cannot be started (error 2).
// Each start is recorded once ("process"): a failed one at once, a started
// one at the first wait on its process handle (with the time-out and what
// the wait gave), or when that handle is closed unwaited.
class SimProcesses final : public platform::Processes {
 public:
  SimProcesses(EventLog& log, const std::map<std::string, ProcessDef, NoCaseLess>& programs)
      : log_(log), programs_(programs) {}
  bool CreateProcess(std::string_view applicationName, std::string_view commandLine,
                     platform::ProcessRecord& record) override;
  uint32_t WaitForInputIdle(int64_t process, uint32_t milliseconds) override;
  uint32_t WaitForSingleObject(int64_t handle, uint32_t milliseconds) override;
  bool GetExitCodeProcess(int64_t process, uint32_t& exitCode) override;
  bool CloseHandle(int64_t handle) override;
  uint32_t LastError() override { return lastError_; }

  static constexpr uint32_t kStillActive = 259;

 private:
  struct Child {
    std::string application, commandLine;
    ProcessDef def;
    bool recorded = false;
    bool waited = false;  // a wait saw it end
  };
  struct Handle {
    std::shared_ptr<Child> child;
    bool thread = false;
  };
  Handle* Find(int64_t handle);

  EventLog& log_;
  const std::map<std::string, ProcessDef, NoCaseLess>& programs_;
  std::map<int64_t, Handle> handles_;
  int64_t nextHandle_ = 0x1000;
  uint32_t nextId_ = 4000;
  uint32_t lastError_ = 0;
};

// ---------------------------------------------------------------- registry

// Where the model injects a registry fault, the fault answers instead of the
// registry, and the event says so ("fault": true).
class RecordingRegistry final : public platform::Registry {
 public:
  RecordingRegistry(platform::Registry& inner, EventLog& log, const FaultsDef& faults)
      : inner_(inner), log_(log), faults_(faults) {}
  std::optional<platform::RegistryValue> QueryValue(platform::RootKey root, std::string_view key,
                                                    std::string_view name) override;
  bool SetValue(platform::RootKey root, std::string_view key, std::string_view name,
                const platform::RegistryValue& value) override;
  platform::KeyDisposition CreateKey(platform::RootKey root, std::string_view key) override;
  std::string ToAnsi(std::string_view utf8) override { return inner_.ToAnsi(utf8); }
  std::string FromAnsi(std::string_view ansi) override { return inner_.FromAnsi(ansi); }

 private:
  platform::Registry& inner_;
  EventLog& log_;
  const FaultsDef& faults_;
};

// "HKLM" or "HKCU".
std::string RootName(platform::RootKey root);
// A registry value as the log shows it: REG_SZ as its text, REG_DWORD as an
// unsigned number, anything else as {"binary": "hex"}.
EventJson RegistryValueJson(const platform::RegistryValue& value);
std::string RegistryTypeName(uint32_t type);

// A change to the world that the registry or the file system refused.
class WorldError : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

// Puts registry entries in place through the plain interface: the key is
// created, then the value set. Nothing is recorded. Raises WorldError.
void SeedRegistry(platform::Registry& registry, const std::vector<RegistryEntry>& entries);

// ------------------------------------------------------------------- files

// Where the add-in's debug log lies, found the way the add-in finds it: by
// the logger's own settings loader, run over an unrecorded registry the
// first time the answer is needed (the add-in's logger, too, loads on first
// use and never again).
class DebugLogLocator {
 public:
  explicit DebugLogLocator(const platform::Platform& unrecorded) : platform_(unrecorded), logger_(platform_) {}
  const std::string& Path() { return logger_.DebugOutputPath(); }

 private:
  platform::Platform platform_;
  DebugLogger logger_;
};

// Records every call. Where the model's file faults name the file, a
// remove, move, replace or open for times fails with the fault's error
// without reaching the file system, and its event says so ("fault": true).
class RecordingFileSystem final : public platform::FileSystem {
 public:
  RecordingFileSystem(platform::FileSystem& inner, EventLog& log, DebugLogLocator& debugLog,
                      const FaultsDef& faults)
      : inner_(inner), log_(log), debugLog_(debugLog), faults_(faults) {}
  bool Exists(std::string_view path) override;
  bool DeleteFile(std::string_view path) override;
  bool AppendComposed(std::string_view path, const std::function<std::string()>& compose) override;
  // Recorded as "file-read" with the path and whether it opened, not with
  // the text: the model file already shows what the file holds.
  std::string ReadText(std::string_view path) override;

  std::optional<uint32_t> GetAttributes(std::string_view path) override;
  bool SetAttributes(std::string_view path, uint32_t attributes) override;
  bool RemoveFile(std::string_view path) override;
  bool MoveFile(std::string_view from, std::string_view to) override;
  std::optional<platform::DateTime> FileDateTime(std::string_view path) override;
  bool ReplaceText(std::string_view path, std::string_view text) override;
  platform::FileHandle OpenForTimes(std::string_view path) override;
  bool GetFileTimes(platform::FileHandle file, platform::FileTimes& times) override;
  bool SetFileTimes(platform::FileHandle file, const platform::FileTimes& times) override;
  void CloseFile(platform::FileHandle file) override;
  const platform::FileError& LastError() override;

 private:
  // The fault of `path` for one kind of call; nothing when there is none.
  const ErrorDef* Fault(std::string_view path, std::optional<ErrorDef> FileFaultDef::*call) const;
  // Adds the call's outcome, and its error when it failed.
  void Outcome(EventJson& event, bool ok);
  // Runs `call` unless the model makes this kind of call on `path` fail
  // (the fault's error then answers), and logs `event` with the outcome.
  bool Faultable(EventJson event, std::string_view path, std::optional<ErrorDef> FileFaultDef::*kind,
                 const std::function<bool()>& call);

  platform::FileSystem& inner_;
  EventLog& log_;
  DebugLogLocator& debugLog_;
  const FaultsDef& faults_;
  std::optional<platform::FileError> injected_;  // the last call's error came from a fault
  std::map<platform::FileHandle, std::string> openPaths_;
};

// Lays out the model's folders and files before the run. The platform's
// file interface makes no folders and writes no whole files, so this is the
// sim's own door:
// `hostPath` maps a Windows path to where it really lies. Each raises
// WorldError when the file system refuses.
class FileSeeder {
 public:
  explicit FileSeeder(std::function<std::filesystem::path(std::string_view)> hostPath)
      : hostPath_(std::move(hostPath)) {}
  void MakeFolder(std::string_view windowsPath);
  // Replaces the file with exactly `content`, making its folder if needed.
  void WriteFile(std::string_view windowsPath, std::string_view content);
  // Deletes a file; nothing there is no fault, a folder there is.
  void RemoveFile(std::string_view windowsPath);

 private:
  std::function<std::filesystem::path(std::string_view)> hostPath_;
};

// ----------------------------------------------------------------- objects

class RecordingObjectFactory final : public platform::ObjectFactory {
 public:
  RecordingObjectFactory(platform::ObjectFactory& inner, EventLog& log) : inner_(inner), log_(log) {}
  ObjectPtr CreateObject(std::string_view progId) override;
  ObjectPtr CreateInstance(std::string_view clsid, std::string_view iid) override;

 private:
  ObjectPtr Record(EventJson event, const std::function<ObjectPtr()>& create);
  platform::ObjectFactory& inner_;
  EventLog& log_;
};

}  // namespace kpx::sim
