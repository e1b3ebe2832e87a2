#include "restore_player.h"

#include <algorithm>
#include <cstdlib>

#include "platform/win32/restore_window_ids.h"
#include "prompt_reader.h"

namespace wintest {

namespace {

// The player's requests to the window's thread.
constexpr UINT kSettle = WM_APP + 10;  // posted; lParam: an event to set
constexpr UINT kTimer = WM_APP + 11;   // sent; wParam: the dialog; lParam: what to do with its timer
enum TimerRequest : LPARAM { kStopTimer, kFireTimer, kStartTimer };

// How long after the click the dialog's timer fires, and a margin for the
// window's thread to have handled it by itself.
constexpr DWORD kSecond = 1000, kTimerMargin = 200;
// A menu the click opened is shown before its loop handles anything, so
// once the click settled it is there or never comes.
constexpr int kMenuWait = 200;

}  // namespace

bool AnswerRestoreHelp(UINT message, WPARAM wParam, LPARAM lParam, LRESULT& result) {
  switch (message) {
    case kSettle:
      SetEvent(reinterpret_cast<HANDLE>(lParam));
      result = 0;
      return true;
    case kTimer: {
      // Only the window's own thread may touch its timers, and no call
      // tells whether one runs: stopping it does (1 when it ran). Fired, it
      // is stopped and its WM_TIMER handled now, when it ran.
      HWND dialog = reinterpret_cast<HWND>(wParam);
      if (lParam == kStartTimer) {
        result = SetTimer(dialog, KPX_RESTORE_TIMER, kSecond, nullptr) != 0;
        return true;
      }
      result = KillTimer(dialog, KPX_RESTORE_TIMER) ? 1 : 0;
      if (result && lParam == kFireTimer) SendMessageW(dialog, WM_TIMER, KPX_RESTORE_TIMER, 0);
      return true;
    }
  }
  return false;
}

RestoreWindowForm::RestoreWindowForm(HWND dialog, HWND helper) : dialog_(dialog), helper_(helper) {
  Read();
  texts_.caption = seen_.caption;
  texts_.instructions = seen_.instructions;
  texts_.ok = seen_.ok;
  texts_.cancel = seen_.cancel;
  texts_.help = seen_.help;
  for (int c = 0; c < 3; ++c) texts_.columns[c] = seen_.columns[c];
}

// The rows as the form has them: a project row flush left, a file row
// indented with its backup's date in the first column; the check boxes'
// pictures (clear, ticked, some files ticked) as the form's checks.
void RestoreWindowForm::Read() {
  seen_ = ReadRestore(dialog_);
  rows_.assign(seen_.rows.size(), {});
  selected_ = -1;
  for (size_t i = 0; i < seen_.rows.size(); ++i) {
    const RestoreRowSeen& shown = seen_.rows[i];
    kpx::platform::RestoreRow& row = rows_[i];
    row.project = shown.indent == 0;
    (row.project ? row.cells[0] : row.modified) = shown.cells[0];
    row.cells[1] = shown.cells[1];
    row.cells[2] = shown.cells[2];
    row.check = shown.check == 2 ? 1 : shown.check == 3 ? 3 : 0;
    if (shown.selected && selected_ < 0) selected_ = static_cast<int32_t>(i);
  }
}

bool RestoreWindowForm::AskTimer(intptr_t request) {
  return SendMessageW(helper_, kTimer, reinterpret_cast<WPARAM>(dialog_), static_cast<LPARAM>(request)) != 0;
}

void RestoreWindowForm::Settle() {
  // The window's thread takes posted messages in their order.
  HANDLE done = CreateEventW(nullptr, TRUE, FALSE, nullptr);
  PostMessageW(helper_, kSettle, 0, reinterpret_cast<LPARAM>(done));
  WaitForSingleObject(done, INFINITE);
  CloseHandle(done);
}

// Any step but the menu's command closes the menu first, as the native
// player takes it: Esc, which picks nothing.
void RestoreWindowForm::CloseMenu() {
  if (!menu_) return;
  ChoosePopupCommand(menu_, false);
  menu_ = nullptr;
  Settle();
}

void RestoreWindowForm::Press(int button) {
  CloseMenu();
  wintest::Click(dialog_, button);
}

void RestoreWindowForm::Select(int32_t row) {
  CloseMenu();
  SelectRow(dialog_, row);
  Read();
}

void RestoreWindowForm::SetCheck(int32_t row, bool ticked) {
  CloseMenu();
  TickRow(dialog_, row, ticked);
  Read();
}

std::string RestoreWindowForm::Click(int32_t row, bool& startTimer) {
  startTimer = false;
  CloseMenu();
  const bool project = rows_.at(static_cast<size_t>(row)).project;
  // Whether the click starts the timer shows only as a timer that runs
  // after it and did not before: one running already is stopped for the
  // click and started again after it, its second counting anew a few
  // milliseconds later.
  const bool running = project && AskTimer(kStopTimer);
  ClickRow(dialog_, row, !project);
  Settle();
  std::string caption;
  if (!project) {
    menu_ = WaitForPopupMenu(kMenuWait);
    if (menu_) caption = PopupMenuText(menu_);
  } else {
    startTimer = AskTimer(kStopTimer);
    if (startTimer || running) {
      AskTimer(kStartTimer);
      timerStarted_ = GetTickCount();
    }
  }
  Read();
  return caption;
}

void RestoreWindowForm::Compare(int32_t) {
  if (!menu_) return;
  ChoosePopupCommand(menu_, true);
  menu_ = nullptr;
  // The comparison runs on the window's thread before it takes the next
  // posted message.
  Settle();
  Read();
}

void RestoreWindowForm::Timer() {
  CloseMenu();
  const DWORD waited = GetTickCount() - timerStarted_;
  if (waited < kSecond + kTimerMargin) Sleep(kSecond + kTimerMargin - waited);
  Settle();
  AskTimer(kFireTimer);
  Read();
}

// The window's own Help: the add-in hands its own window to WinHelp.
void RestoreWindowForm::Help(int64_t) {
  Press(IDHELP);
  Read();
}

// Once closed the window shows nothing more: the state stays as last seen.
void RestoreWindowForm::Ok() {
  Press(IDOK);
  closed_ = true;
}

void RestoreWindowForm::Cancel() {
  if (closed_ || !IsWindowVisible(dialog_)) return;
  Press(IDCANCEL);
  closed_ = true;
}

kpx::platform::HostPlacement PlacementSeen(HWND dialog, const kpx::platform::HostPlacement& told) {
  RECT window;
  GetWindowRect(dialog, &window);
  const int width = window.right - window.left, height = window.bottom - window.top;
  RECT area;
  SystemParametersInfoW(SPI_GETWORKAREA, 0, &area, 0);
  RECT over = area;
  if (told.width > 0 && told.height > 0) over = {told.left, told.top, told.left + told.width, told.top + told.height};
  const int left = std::max<int>(area.left, std::min<int>(over.left + (over.right - over.left - width) / 2,
                                                          area.right - width));
  const int top = std::max<int>(area.top, std::min<int>(over.top + (over.bottom - over.top - height) / 2,
                                                        area.bottom - height));
  // An owner that is no window of this system leaves the dialog unowned.
  HWND toldOwner = reinterpret_cast<HWND>(static_cast<intptr_t>(told.ownerWindow));
  HWND owner = GetWindow(dialog, GW_OWNER);
  const bool ownedAsTold = owner == (IsWindow(toldOwner) ? toldOwner : nullptr);
  if (ownedAsTold && std::abs(window.left - left) <= 2 && std::abs(window.top - top) <= 2) return told;
  return {static_cast<int64_t>(reinterpret_cast<intptr_t>(owner)), window.top, window.left, height, width};
}

}  // namespace wintest
