// The add-in's real Restore window seen as the simulator's RestoreForm, so
// that the simulator's own player works it step by step and records it
// exactly as it records the native dialog: each step is played on the
// window as a user makes it (a tick on a row's box, a click that selects
// the row, the context menu's first command, Help, OK, Cancel) and the
// state is read back off the window once the window has handled it.
//
// It runs on a thread of its own while the window's thread (the add-in's)
// pumps its messages: a right click opens a popup menu whose own loop
// blocks that thread until the menu closes. A few things only the window's
// thread can do or see go to `helper`, a window of that thread whose
// procedure hands them to AnswerRestoreHelp.
#pragma once

#include "platform/win32/win32_api.h"

#include <string>
#include <vector>

#include "platform/platform.h"
#include "restore_reader.h"

namespace wintest {

// Handles the player's requests on the window's thread; false for any
// other message.
bool AnswerRestoreHelp(UINT message, WPARAM wParam, LPARAM lParam, LRESULT& result);

class RestoreWindowForm final : public kpx::platform::RestoreForm {
 public:
  RestoreWindowForm(HWND dialog, HWND helper);

  const Texts& texts() const override { return texts_; }
  const std::vector<kpx::platform::RestoreRow>& rows() const override { return rows_; }
  int32_t selectedRow() const override { return selected_; }
  const std::string& headerTitle() const override { return seen_.title; }
  const std::string& headerSubtitle() const override { return seen_.subtitle; }
  bool okEnabled() const override { return seen_.okEnabled; }
  // The window's layout is its own: kpx-wintest checks it.
  kpx::platform::ControlRect DesignRect(kpx::platform::RestoreControl) const override { return {}; }
  double designWidth() const override { return 0; }
  double designHeight() const override { return 0; }
  double minimumWidth() const override { return 0; }
  double minimumHeight() const override { return 0; }
  void Resize(double, double, kpx::platform::ControlRect (&)[size_t(kpx::platform::RestoreControl::Count)]) override {}

  void Select(int32_t row) override;
  void SetCheck(int32_t row, bool ticked) override;
  // A left click on a project row, a right click on a file row: the clicks
  // the dialog answers. The file row's menu stays open for Compare.
  std::string Click(int32_t row, bool& startTimer) override;
  void Compare(int32_t row) override;
  // The second passes: the window's own timer fires, or is fired now if
  // its thread has not had it yet.
  void Timer() override;
  void Help(int64_t window) override;
  void Ok() override;
  void Cancel() override;

 private:
  void Read();
  // Waits until the window's thread has handled what was posted to it so
  // far (or runs a modal loop that one of those messages started).
  void Settle();
  void CloseMenu();
  // Sent to the window's thread: what to do with the dialog's timer.
  bool AskTimer(intptr_t request);
  void Press(int button);

  HWND dialog_, helper_;
  HWND menu_ = nullptr;  // the file row's context menu, open
  DWORD timerStarted_ = 0;  // when its second began
  bool closed_ = false;
  RestoreSeen seen_;
  Texts texts_;
  std::vector<kpx::platform::RestoreRow> rows_;
  int32_t selected_ = -1;
};

// Where the Restore window stands against where the host said its own
// window is: `told` itself when the window is owned as told and centred
// over the host's window (inside the work area), else what the window shows
// instead (its owner, its own place and size), so that a log shows the
// difference.
kpx::platform::HostPlacement PlacementSeen(HWND dialog, const kpx::platform::HostPlacement& told);

}  // namespace wintest
