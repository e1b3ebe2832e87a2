// The outside world of the Windows build: the real registry, files, clock,
// COM object creation and user interface.
#pragma once

#include "platform/win32/win32_api.h"

#include "platform/platform.h"
#include "platform/win32/com_bridge.h"

namespace kpx::win32 {

// The ANSI registry functions, as the add-in has always used them.
class Win32Registry final : public platform::Registry {
 public:
  std::optional<platform::RegistryValue> QueryValue(platform::RootKey root, std::string_view key,
                                                    std::string_view name) override;
  bool SetValue(platform::RootKey root, std::string_view key, std::string_view name,
                const platform::RegistryValue& value) override;
  platform::KeyDisposition CreateKey(platform::RootKey root, std::string_view key) override;
  std::string ToAnsi(std::string_view utf8) override;
  std::string FromAnsi(std::string_view ansi) override;
};

class Win32FileSystem final : public platform::FileSystem {
 public:
  bool Exists(std::string_view path) override;
  bool DeleteFile(std::string_view path) override;
  bool AppendComposed(std::string_view path, const std::function<std::string()>& compose) override;
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
  const platform::FileError& LastError() override { return lastError_; }

  // The VB error a system error code stands for, as the file statements
  // raise it.
  static platform::FileError ErrorFromSystem(DWORD code);

 private:
  // Records the calling thread's last system error; returns false.
  bool Failed();
  platform::FileError lastError_;
};

class Win32Clock final : public platform::Clock {
 public:
  float Timer() override;
  platform::DateTime Now() override;
  void Sleep(uint32_t milliseconds) override;
  std::optional<platform::FileTime> SystemFileTime() override;
};

// Objects come from COM; the ones that answer IDispatch are wrapped for the
// core through the bridge.
class Win32ObjectFactory final : public platform::ObjectFactory {
 public:
  explicit Win32ObjectFactory(ComBridge& bridge) : bridge_(bridge) {}
  ObjectPtr CreateObject(std::string_view progId) override;
  ObjectPtr CreateInstance(std::string_view clsid, std::string_view iid) override;
  // The Scripting Runtime's dictionary.
  ObjectPtr CreateDictionary() override { return CreateObject("Scripting.Dictionary"); }

 private:
  ComBridge& bridge_;
};

// `resources` is the module holding the add-in's own resources (its DLL):
// the dialog templates, without which the prompt cannot be shown, and the
// icons, which leave as OLE pictures (the program's own module when null).
class Win32UserInterface final : public platform::UserInterface {
 public:
  explicit Win32UserInterface(ComBridge& bridge, HINSTANCE resources = nullptr)
      : bridge_(bridge), resources_(resources) {}
  int MessageBox(std::string_view text, std::string_view title, uint32_t style) override;
  platform::PromptOutcome ShowPrompt(const platform::PromptView& view, platform::PromptHelp& help) override;
  bool WinHelp(int64_t window, std::string_view helpFile, uint32_t command, uint64_t data) override;
  void DoEvents() override;
  ObjectPtr LoadIconPicture(int32_t resourceId, int32_t pixels) override;
  void ShowRestoreDialog(platform::RestoreForm& form, const platform::HostPlacement& placement) override;
  platform::DependencyOutcome ShowDependencyDialog(const platform::DependencyView& view) override;

 private:
  ComBridge& bridge_;
  HINSTANCE resources_;
};

// Child processes through kernel32.
class Win32Processes final : public platform::Processes {
 public:
  bool CreateProcess(std::string_view applicationName, std::string_view commandLine,
                     platform::ProcessRecord& record) override;
  uint32_t WaitForInputIdle(int64_t process, uint32_t milliseconds) override;
  uint32_t WaitForSingleObject(int64_t handle, uint32_t milliseconds) override;
  bool GetExitCodeProcess(int64_t process, uint32_t& exitCode) override;
  bool CloseHandle(int64_t handle) override;
  uint32_t LastError() override;
};

// All of it, handed to the core as one platform::Platform.
class Win32Platform {
 public:
  // `resources`: as for Win32UserInterface.
  explicit Win32Platform(ComBridge& bridge, HINSTANCE resources = nullptr)
      : objects_(bridge), ui_(bridge, resources) {}
  Win32Platform(const Win32Platform&) = delete;
  Win32Platform& operator=(const Win32Platform&) = delete;

  platform::Platform platform() { return {registry_, files_, clock_, objects_, ui_, processes_}; }

 private:
  Win32Registry registry_;
  Win32FileSystem files_;
  Win32Clock clock_;
  Win32ObjectFactory objects_;
  Win32UserInterface ui_;
  Win32Processes processes_;
};

}  // namespace kpx::win32
