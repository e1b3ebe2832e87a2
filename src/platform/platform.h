// One interface per outside thing the add-in touches. The Win32 build
// implements them over the real system; the native build over a sandbox.
// Paths are Windows paths ("C:\dir\file.txt") in both builds. Text is UTF-8
// unless a member says otherwise.
#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <string_view>

#include "automation/object.h"

namespace kpx::platform {

// ---------------------------------------------------------------- registry

enum class RootKey : uint32_t {
  CurrentUser = 0x80000001u,
  LocalMachine = 0x80000002u,
};

inline constexpr uint32_t kRegSz = 1;
inline constexpr uint32_t kRegBinary = 3;
inline constexpr uint32_t kRegDword = 4;

// A value as the registry holds it: its type code and its bytes. A REG_SZ's
// bytes are text in the system code page with its terminating NUL counted;
// a REG_DWORD's are four little-endian bytes.
struct RegistryValue {
  uint32_t type = 0;
  std::string data;
};

enum class KeyDisposition { Failed, Created, Opened };

class Registry {
 public:
  virtual ~Registry() = default;
  // Opens the key for reading (READ_CONTROL | KEY_QUERY_VALUE |
  // KEY_ENUMERATE_SUB_KEYS) and reads one value ("" is the key's default
  // value). Nothing when the key or the value is missing.
  virtual std::optional<RegistryValue> QueryValue(RootKey root, std::string_view key,
                                                  std::string_view name) = 0;
  // Opens an existing key for writing (KEY_WRITE) and writes one value. A
  // missing key is not created; false when nothing was written.
  virtual bool SetValue(RootKey root, std::string_view key, std::string_view name,
                        const RegistryValue& value) = 0;
  // Creates the key, or opens it when it exists (non-volatile, all access).
  virtual KeyDisposition CreateKey(RootKey root, std::string_view key) = 0;

  // Text crosses the registry in the system's ANSI code page.
  virtual std::string ToAnsi(std::string_view utf8) = 0;
  virtual std::string FromAnsi(std::string_view ansi) = 0;
};

// ------------------------------------------------------------------- files

class FileSystem {
 public:
  virtual ~FileSystem() = default;
  // Whether a file or a folder of that name exists.
  virtual bool Exists(std::string_view path) = 0;
  // Deletes a file; false when it was missing or could not be deleted.
  virtual bool DeleteFile(std::string_view path) = 0;
  // Opens the file for appending (creating it when missing) and, only once
  // it is open, asks `compose` for the text, writes it in the system code
  // page and closes the file. False on any failure. A debug line's stamp is
  // the time of a successful open, so a file that cannot be opened never
  // has its text made.
  virtual bool AppendComposed(std::string_view path, const std::function<std::string()>& compose) = 0;
  // The same for a text known beforehand.
  bool AppendText(std::string_view path, std::string_view text) {
    return AppendComposed(path, [text] { return std::string(text); });
  }
  // Reads a whole text file, as VB's Open ... For Input reads one: the
  // bytes in the system code page, returned as UTF-8, line breaks as they
  // stand. Raises what Open raises: 53 (File not found) when the folder has
  // no such file, 76 (Path not found) when a folder on the way is missing,
  // 75 (Path/File access error) when the path names a folder or the file
  // cannot be opened or read.
  virtual std::string ReadText(std::string_view path) = 0;
};

// ------------------------------------------------------------------- clock

struct DateTime {
  int year = 1899, month = 12, day = 30;
  int hour = 0, minute = 0, second = 0;
};

class Clock {
 public:
  virtual ~Clock() = default;
  // Seconds since midnight, as VB's Timer gives them.
  virtual float Timer() = 0;
  virtual DateTime Now() = 0;
  virtual void Sleep(uint32_t milliseconds) = 0;
};

// ---------------------------------------------------------------- objects

class ObjectFactory {
 public:
  virtual ~ObjectFactory() = default;
  // CreateObject(progId). Raises 429 (or the system's error) on failure.
  virtual ObjectPtr CreateObject(std::string_view progId) = 0;
  // `New` of a class known by its class id, used through interface `iid`.
  // Ids are in registry form, "{XXXXXXXX-...}". Raises 429 on failure.
  virtual ObjectPtr CreateInstance(std::string_view clsid, std::string_view iid) = 0;
  // A new keyed collection: the Scripting Runtime's dictionary where the
  // system has one; by default the add-in's own, shaped like it.
  virtual ObjectPtr CreateDictionary();
};

// ----------------------------------------------------------- user interface

inline constexpr uint32_t kMbOk = 0;
inline constexpr int kIdOk = 1;
inline constexpr uint32_t kHelpContext = 1;
inline constexpr uint32_t kHelpFinder = 11;

// ----------------------------------------------------------- prompt dialog

// The add-in's own message box: a message, an icon by the message's kind,
// OK, Cancel and Help, and a "do not show this again" check box.
enum class PromptIcon : uint8_t { None, Critical, Question, Information };

// What the prompt shows. Texts are UTF-8; the captions come from the
// resource component.
struct PromptView {
  std::string message, title;
  PromptIcon icon = PromptIcon::None;
  std::string okCaption, cancelCaption, helpCaption, dontShowCaption;
  bool helpAvailable = false;  // Help is enabled only then
};

// What the Help button does while the prompt stays open; `window` is the
// prompt's own window.
class PromptHelp {
 public:
  virtual ~PromptHelp() = default;
  virtual void ShowHelp(int64_t window) = 0;
};

// How the user closed the prompt.
struct PromptOutcome {
  bool cancelled = false;  // Cancel (or the close box) rather than OK
  bool dontShow = false;   // the check box was ticked
};

// ---------------------------------------------------------------- pictures

// The standard picture object (StdPicture) as automation reaches it: its
// members' dispatch ids, and the type of an icon.
inline constexpr DispId kPictureHandle = 0;
inline constexpr DispId kPicturePalette = 2;
inline constexpr DispId kPictureType = 3;
inline constexpr DispId kPictureWidth = 4;   // HIMETRIC (0.01 mm)
inline constexpr DispId kPictureHeight = 5;  // HIMETRIC
inline constexpr int16_t kPictureTypeIcon = 3;

// A length in pixels of a 96 dpi screen as HIMETRIC, rounded as pictures
// measure themselves, and back.
constexpr int32_t PixelsToHimetric(int32_t pixels) { return (pixels * 2540 + 48) / 96; }
constexpr int32_t HimetricToPixels(int32_t himetric) { return (himetric * 96 + 1270) / 2540; }

class UserInterface {
 public:
  virtual ~UserInterface() = default;
  // Shows the prompt modally, owned by the window active on the calling
  // thread (the host's main window while the host calls), until OK or
  // Cancel.
  virtual PromptOutcome ShowPrompt(const PromptView& view, PromptHelp& help) = 0;
  // A modal message box; returns the button pressed (kIdOk ...). An empty
  // title means the default one.
  virtual int MessageBox(std::string_view text, std::string_view title, uint32_t style) = 0;
  virtual bool WinHelp(int64_t window, std::string_view helpFile, uint32_t command, uint64_t data) = 0;
  // Lets the host process its pending window messages once.
  virtual void DoEvents() = 0;
  // One of the add-in's own icon resources, drawn `pixels` wide and high,
  // as a standard picture object of type icon. Raises 326 when the add-in
  // has no icon of that id.
  virtual ObjectPtr LoadIconPicture(int32_t resourceId, int32_t pixels) = 0;
};

// Everything outside, handed to the add-in's module as one.
struct Platform {
  Registry& registry;
  FileSystem& files;
  Clock& clock;
  ObjectFactory& objects;
  UserInterface& ui;
};

}  // namespace kpx::platform
