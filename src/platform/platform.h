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
#include <vector>

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

// A date and time as VB's Date holds them, to the second.
struct DateTime {
  int year = 1899, month = 12, day = 30;
  int hour = 0, minute = 0, second = 0;
};

// File attributes, as Windows keeps them.
inline constexpr uint32_t kAttributeReadOnly = 0x01;
inline constexpr uint32_t kAttributeArchive = 0x20;
inline constexpr uint32_t kAttributeNormal = 0x80;

// A file time: 100-nanosecond intervals since 1 January 1601, UTC.
using FileTime = uint64_t;
struct FileTimes {
  FileTime creation = 0, lastAccess = 0, lastWrite = 0;
  bool operator==(const FileTimes&) const = default;
};

using FileHandle = int64_t;
inline constexpr FileHandle kNoFile = -1;

// Why the last file operation failed: a VB error number and its text.
struct FileError {
  int32_t number = 0;
  std::string description;
};

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

  // ---- what the restore routines need, each as one system call does it.
  // A failing call leaves its reason in LastError(), as the system keeps
  // its last error: a VB error number (53 File not found, 58 File already
  // exists, 70 Permission denied, 75 Path/File access error, 76 Path not
  // found) and that number's standard description.

  // The file's attributes (kAttribute... bits); nothing when it is missing.
  virtual std::optional<uint32_t> GetAttributes(std::string_view path) = 0;
  virtual bool SetAttributes(std::string_view path, uint32_t attributes) = 0;
  // Deletes a file as Kill does: a read-only file is refused (70).
  virtual bool RemoveFile(std::string_view path) = 0;
  // Renames (moves) a file as Name ... As does; refused when `to` exists.
  // The file keeps its attributes and its three times.
  virtual bool MoveFile(std::string_view from, std::string_view to) = 0;
  // The file's last-write time in local time, as FileDateTime gives it.
  virtual std::optional<DateTime> FileDateTime(std::string_view path) = 0;
  // Replaces the whole file with `text` (UTF-8, written in the system code
  // page) so that the file holds either its old text or the new, never a
  // part: the text goes to a new file beside it, which then takes the old
  // one's place in one step. False, the old file untouched, on failure.
  virtual bool ReplaceText(std::string_view path, std::string_view text) = 0;

  // A file opened for its times: read and write access, shared for reading,
  // opened only when it exists. kNoFile when the open failed.
  virtual FileHandle OpenForTimes(std::string_view path) = 0;
  virtual bool GetFileTimes(FileHandle file, FileTimes& times) = 0;
  virtual bool SetFileTimes(FileHandle file, const FileTimes& times) = 0;
  virtual void CloseFile(FileHandle file) = 0;

  virtual const FileError& LastError() = 0;
};

// ------------------------------------------------------------------- clock


class Clock {
 public:
  virtual ~Clock() = default;
  // Seconds since midnight, as VB's Timer gives them.
  virtual float Timer() = 0;
  virtual DateTime Now() = 0;
  virtual void Sleep(uint32_t milliseconds) = 0;
  // The current time (UTC) as a file time, as GetSystemTime followed by
  // SystemTimeToFileTime gives it; nothing when the conversion fails.
  virtual std::optional<FileTime> SystemFileTime() = 0;
};

// --------------------------------------------------------------- processes

// The handles and ids process creation hands back.
struct ProcessRecord {
  int64_t process = 0, thread = 0;
  uint32_t processId = 0, threadId = 0;
};

inline constexpr uint32_t kInfinite = 0xFFFFFFFFu;
inline constexpr uint32_t kWaitObject0 = 0;
inline constexpr uint32_t kWaitTimeout = 258;
inline constexpr uint32_t kWaitFailed = 0xFFFFFFFFu;

// Child processes, one call for each of the system's: the runner that uses
// them keeps the order and the checks of the calls its callers rely on.
class Processes {
 public:
  virtual ~Processes() = default;
  // CreateProcessA: the application name and command line as given (UTF-8,
  // passed in the system code page), no security attributes, handles
  // inherited, NORMAL_PRIORITY_CLASS only, the parent's environment and
  // current folder, a start-up record with nothing but its size set. An
  // empty application name is passed as none.
  virtual bool CreateProcess(std::string_view applicationName, std::string_view commandLine,
                             ProcessRecord& record) = 0;
  virtual uint32_t WaitForInputIdle(int64_t process, uint32_t milliseconds) = 0;
  virtual uint32_t WaitForSingleObject(int64_t handle, uint32_t milliseconds) = 0;
  virtual bool GetExitCodeProcess(int64_t process, uint32_t& exitCode) = 0;
  virtual bool CloseHandle(int64_t handle) = 0;
  // The system's last error code (GetLastError) of the calling thread.
  virtual uint32_t LastError() = 0;
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

// ----------------------------------------------------------- restore dialog

// One row of the Restore dialog's list: a project, or one of its files
// below it. `cells` are the three columns (project, file, folder); a file
// row also shows its backup's date and time.
struct RestoreRow {
  bool project = false;
  std::string key;  // a project's record; a file's restore item
  std::string cells[3];
  std::string modified;
  int32_t check = 0;  // 1 ticked; a project row is 3 while only some of its files are
};

// The Restore dialog's controls, as the layout rules know them.
enum class RestoreControl : uint8_t { List, Ok, Cancel, Help, Count };

// A control's place in its window, in twips, left and top from the
// window's client area.
struct ControlRect {
  double left = 0, top = 0, width = 0, height = 0;
};

// The state and rules behind the Restore dialog. The window shows what
// this says and hands every user action to it, then shows the state again:
// a tick on a project row ticks its files, OK follows the ticks, the header
// follows the selected row.
class RestoreForm {
 public:
  virtual ~RestoreForm() = default;
  struct Texts {
    std::string caption, instructions, ok, cancel, help;
    std::string columns[3];
    double columnTwips[3] = {0, 0, 0};
  };
  virtual const Texts& texts() const = 0;
  virtual const std::vector<RestoreRow>& rows() const = 0;
  virtual int32_t selectedRow() const = 0;  // -1 when none
  virtual const std::string& headerTitle() const = 0;
  virtual const std::string& headerSubtitle() const = 0;
  virtual bool okEnabled() const = 0;
  // The window's design size and its controls' places at that size, in
  // twips; and its smallest size.
  virtual ControlRect DesignRect(RestoreControl control) const = 0;
  virtual double designWidth() const = 0;
  virtual double designHeight() const = 0;
  virtual double minimumWidth() const = 0;
  virtual double minimumHeight() const = 0;
  // The controls' new places when the window's client area is `width` by
  // `height` twips; `rects` holds their current places, indexed by
  // RestoreControl. A control stops following an edge at its bound.
  virtual void Resize(double width, double height, ControlRect (&rects)[size_t(RestoreControl::Count)]) = 0;

  virtual void Select(int32_t row) = 0;
  virtual void SetCheck(int32_t row, bool ticked) = 0;
  // A click on a row. For a file row while a comparison tool is set: the
  // caption of the one command of the row's context menu, which the window
  // then shows; empty otherwise. `startTimer` asks for the one-second timer.
  virtual std::string Click(int32_t row, bool& startTimer) = 0;
  // The user picked the context menu's command on a file row.
  virtual void Compare(int32_t row) = 0;
  virtual void Timer() = 0;
  virtual void Help(int64_t window) = 0;
  virtual void Ok() = 0;
  virtual void Cancel() = 0;
};

// Where the Restore dialog goes: owned by the host's main window and
// placed over the host's window (its top, left, height and width, pixels).
struct HostPlacement {
  int64_t ownerWindow = 0;
  int32_t top = 0, left = 0, height = 0, width = 0;
};

// -------------------------------------------------- module dependency dialog

struct DependencyView {
  std::string caption;  // " {read-only}" already appended when read-only
  std::string label, text;
  std::string ok, cancel;
  bool readOnly = false;  // the text cannot be edited, OK disabled, Cancel the default
};

struct DependencyOutcome {
  bool ok = false;       // closed by OK
  bool changed = false;  // the text was edited
  std::string text;
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
  // Shows the Restore dialog modally until OK or Cancel.
  virtual void ShowRestoreDialog(RestoreForm& form, const HostPlacement& placement) = 0;
  // Shows the module dependency dialog modally, owned by the active window.
  virtual DependencyOutcome ShowDependencyDialog(const DependencyView& view) = 0;
};

// Everything outside, handed to the add-in's module as one.
struct Platform {
  Registry& registry;
  FileSystem& files;
  Clock& clock;
  ObjectFactory& objects;
  UserInterface& ui;
  Processes& processes;
};

}  // namespace kpx::platform
