#include "scripted_user.h"

#include <tlhelp32.h>

#include <cstdio>
#include <exception>
#include <iterator>
#include <string>
#include <vector>

#include "platform/win32/prompt_window_ids.h"
#include "prompt_reader.h"
#include "restore_player.h"
#include "restore_reader.h"

namespace wintest {

namespace {

constexpr UINT kBoxFound = WM_APP + 1;
constexpr wchar_t kClassName[] = L"kpxComsimScriptedUser";

std::wstring ClassOf(HWND window) {
  wchar_t name[64] = {};
  GetClassNameW(window, name, 64);
  return name;
}

BOOL CALLBACK FirstText(HWND child, LPARAM out) {
  if (_wcsicmp(ClassOf(child).c_str(), L"Static") != 0 || GetWindowTextLengthW(child) == 0) return TRUE;
  *reinterpret_cast<std::string*>(out) = WindowText(child);
  return FALSE;
}

// The message: the box's one static control with text (the icon has none).
std::string MessageOf(HWND box) {
  std::string found;
  EnumChildWindows(box, FirstText, reinterpret_cast<LPARAM>(&found));
  return found;
}

bool Shown(HWND box, int id) {
  HWND button = GetDlgItem(box, id);
  return button && IsWindowVisible(button);
}

// The MB_ button set a box shows (the style's lowest four bits).
uint32_t ButtonsOf(HWND box) {
  if (Shown(box, IDABORT)) return MB_ABORTRETRYIGNORE;
  if (Shown(box, IDYES)) return Shown(box, IDCANCEL) ? MB_YESNOCANCEL : MB_YESNO;
  if (Shown(box, IDRETRY)) return MB_RETRYCANCEL;
  if (Shown(box, IDCANCEL)) return MB_OKCANCEL;
  return MB_OK;
}

struct Boxes {
  std::vector<HWND> own;     // the add-in's: dialogs of this process, shown
  std::vector<HWND> others;  // dialogs of other processes, shown
};

BOOL CALLBACK FindBoxes(HWND window, LPARAM out) {
  if (!IsWindowVisible(window) || ClassOf(window) != L"#32770") return TRUE;
  DWORD process = 0;
  GetWindowThreadProcessId(window, &process);
  auto* boxes = reinterpret_cast<Boxes*>(out);
  (process == GetCurrentProcessId() ? boxes->own : boxes->others).push_back(window);
  return TRUE;
}

// The processes this process started.
std::set<DWORD> Children() {
  std::set<DWORD> children;
  HANDLE snapshot = CreateToolhelp32Snapshot(TH32CS_SNAPPROCESS, 0);
  if (snapshot == INVALID_HANDLE_VALUE) return children;
  PROCESSENTRY32W entry = {};
  entry.dwSize = sizeof(entry);
  for (BOOL more = Process32FirstW(snapshot, &entry); more; more = Process32NextW(snapshot, &entry))
    if (entry.th32ParentProcessID == GetCurrentProcessId() && entry.th32ProcessID != GetCurrentProcessId())
      children.insert(entry.th32ProcessID);
  CloseHandle(snapshot);
  return children;
}

}  // namespace

ScriptedUser::ScriptedUser(kpx::platform::UserInterface& answers) : answers_(answers) {
  WNDCLASSW wc = {};
  wc.lpfnWndProc = WindowProc;
  wc.hInstance = GetModuleHandleW(nullptr);
  wc.lpszClassName = kClassName;
  RegisterClassW(&wc);
  window_ = CreateWindowExW(0, kClassName, L"", 0, 0, 0, 0, 0, HWND_MESSAGE, nullptr, wc.hInstance, nullptr);
  SetWindowLongPtrW(window_, GWLP_USERDATA, reinterpret_cast<LONG_PTR>(this));
  stop_ = CreateEventW(nullptr, TRUE, FALSE, nullptr);
  thread_ = CreateThread(nullptr, 0, Watch, this, 0, nullptr);
}

ScriptedUser::~ScriptedUser() {
  SetEvent(stop_);
  WaitForSingleObject(thread_, INFINITE);
  CloseHandle(thread_);
  CloseHandle(stop_);
  DestroyWindow(window_);
  UnregisterClassW(kClassName, GetModuleHandleW(nullptr));
}

// The watcher only looks at the add-in's boxes: each one it sees goes to
// the add-in's thread, whose modal loop (the box's own) hands it to
// WindowProc. A box of a process the add-in started (the help viewer saying
// it cannot read a help file) holds the add-in too, waiting for that
// process: the watcher presses its OK itself, as a user would.
DWORD WINAPI ScriptedUser::Watch(void* self) {
  auto* user = static_cast<ScriptedUser*>(self);
  std::set<HWND> pressed;
  while (WaitForSingleObject(user->stop_, 20) == WAIT_TIMEOUT) {
    Boxes boxes;
    EnumWindows(FindBoxes, reinterpret_cast<LPARAM>(&boxes));
    for (HWND box : boxes.own) PostMessageW(user->window_, kBoxFound, 0, reinterpret_cast<LPARAM>(box));
    for (auto it = pressed.begin(); it != pressed.end();) it = IsWindow(*it) ? std::next(it) : pressed.erase(it);
    if (boxes.others.empty()) continue;
    const std::set<DWORD> children = Children();
    for (HWND box : boxes.others) {
      DWORD process = 0;
      GetWindowThreadProcessId(box, &process);
      if (!children.count(process) || !pressed.insert(box).second) continue;
      PostMessageW(box, WM_COMMAND, MAKEWPARAM(IDOK, BN_CLICKED), reinterpret_cast<LPARAM>(GetDlgItem(box, IDOK)));
    }
  }
  return 0;
}

LRESULT CALLBACK ScriptedUser::WindowProc(HWND window, UINT message, WPARAM wParam, LPARAM lParam) {
  if (message == kBoxFound) {
    auto* user = reinterpret_cast<ScriptedUser*>(GetWindowLongPtrW(window, GWLP_USERDATA));
    if (user) user->Answer(reinterpret_cast<HWND>(lParam));
    return 0;
  }
  LRESULT result = 0;
  if (AnswerRestoreHelp(message, wParam, lParam, result)) return result;
  return DefWindowProcW(window, message, wParam, lParam);
}

// Help pressed on the real prompt reaches the add-in's own Help (and the
// real WinHelpA) through the window; the simulator is only told of it.
struct HelpAsked final : kpx::platform::PromptHelp {
  bool asked = false;
  void ShowHelp(int64_t) override { asked = true; }
};

void ScriptedUser::Answer(HWND box) {
  for (auto it = answered_.begin(); it != answered_.end();) it = IsWindow(*it) ? std::next(it) : answered_.erase(it);
  if (!IsWindow(box) || !IsWindowVisible(box) || answered_.count(box)) return;
  answered_.insert(box);
  if (IsPromptWindow(box)) {
    AnswerPrompt(box);
    return;
  }
  if (IsDependencyWindow(box)) {
    AnswerDependency(box);
    return;
  }
  if (IsRestoreWindow(box)) {
    AnswerRestore(box);
    return;
  }
  const int button = answers_.MessageBox(MessageOf(box), WindowText(box), ButtonsOf(box));
  // What a click on the button sends; the box ends with that id.
  PostMessageW(box, WM_COMMAND, MAKEWPARAM(button, BN_CLICKED), reinterpret_cast<LPARAM>(GetDlgItem(box, button)));
}

// The prompt as the simulator sees it, read off the window; then what the
// scenario says, played on the window in a user's order: Help, the tick,
// the closing button. Each click is handled before the next is made.
void ScriptedUser::AnswerPrompt(HWND prompt) {
  HelpAsked help;
  const kpx::platform::PromptOutcome outcome = answers_.ShowPrompt(ReadPrompt(prompt).view, help);
  if (help.asked) Click(prompt, IDHELP);
  if (!IsWindow(prompt)) return;
  if (outcome.dontShow) Click(prompt, KPX_PROMPT_DONT_SHOW);
  Click(prompt, outcome.cancelled ? IDCANCEL : IDOK);
}

// The module dependency dialog as the simulator sees it, read off the
// window; the scenario's edit typed in, then OK or Cancel pressed.
void ScriptedUser::AnswerDependency(HWND dialog) {
  const DependencySeen seen = ReadDependency(dialog);
  kpx::platform::DependencyView view;
  view.caption = seen.caption;
  view.label = seen.label;
  view.text = seen.text;
  view.ok = seen.ok;
  view.cancel = seen.cancel;
  view.readOnly = seen.readOnly;
  const kpx::platform::DependencyOutcome outcome = answers_.ShowDependencyDialog(view);
  if (outcome.changed) TypeDependencyText(dialog, outcome.text);
  Click(dialog, outcome.ok ? IDOK : IDCANCEL);
}

// The Restore window is played from a thread of its own (see
// restore_player.h) while this thread, the window's, goes on handling its
// messages. The dialog's own loop takes over again once the play is done,
// its closing button pressed and its record made: only then does the
// add-in go on past the dialog.
void ScriptedUser::AnswerRestore(HWND dialog) {
  restore_ = dialog;
  HANDLE player = CreateThread(nullptr, 0, PlayRestore, this, 0, nullptr);
  while (MsgWaitForMultipleObjectsEx(1, &player, INFINITE, QS_ALLINPUT, MWMO_INPUTAVAILABLE) != WAIT_OBJECT_0) {
    MSG message;
    while (PeekMessageW(&message, nullptr, 0, 0, PM_REMOVE)) {
      TranslateMessage(&message);
      DispatchMessageW(&message);
    }
  }
  CloseHandle(player);
  restore_ = nullptr;
}

DWORD WINAPI ScriptedUser::PlayRestore(void* self) {
  auto* user = static_cast<ScriptedUser*>(self);
  try {
    RestoreWindowForm form(user->restore_, user->window_);
    user->answers_.ShowRestoreDialog(form, PlacementSeen(user->restore_, user->host_));
  } catch (const std::exception& e) {
    std::printf("  the Restore window could not be played: %s\n", e.what());
    if (IsWindowVisible(user->restore_)) Click(user->restore_, IDCANCEL);
  }
  return 0;
}

int ScriptedUser::EndChildren() {
  int ended = 0;
  for (DWORD id : Children()) {
    HANDLE process = OpenProcess(PROCESS_TERMINATE | SYNCHRONIZE, FALSE, id);
    if (!process) continue;
    if (TerminateProcess(process, 0)) {
      WaitForSingleObject(process, 5000);
      ++ended;
    }
    CloseHandle(process);
  }
  return ended;
}

}  // namespace wintest
