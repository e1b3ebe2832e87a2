// The user at the test host's screen, as the native run scripts it: the
// add-in's real message boxes are answered with the buttons the scenario
// queued (OK when none is left), its prompts with the queued prompt answers
// (Help, the tick, OK or Cancel), its module dependency dialog with the
// queued edit and button, its Restore dialog with the queued steps, and
// whatever the add-in started on the way (the help viewer) is ended after
// the run.
#pragma once

#include "platform/win32/win32_api.h"

#include <set>

#include "platform/platform.h"

namespace wintest {

class ScriptedUser {
 public:
  // `answers` picks the button of each box and prompt (and logs it); it is only
  // ever called on the thread that made this object, inside the add-in's
  // own message loop.
  explicit ScriptedUser(kpx::platform::UserInterface& answers);
  ~ScriptedUser();
  ScriptedUser(const ScriptedUser&) = delete;
  ScriptedUser& operator=(const ScriptedUser&) = delete;

  // Where the host tells the add-in its main window is: the Restore
  // dialog's place is held against it.
  void PlaceHost(const kpx::platform::HostPlacement& host) { host_ = host; }

  // Ends the processes this process started that still run; returns how
  // many.
  static int EndChildren();

 private:
  static LRESULT CALLBACK WindowProc(HWND window, UINT message, WPARAM wParam, LPARAM lParam);
  static DWORD WINAPI Watch(void* self);
  void Answer(HWND box);
  void AnswerPrompt(HWND prompt);
  void AnswerDependency(HWND dialog);
  void AnswerRestore(HWND dialog);
  static DWORD WINAPI PlayRestore(void* self);

  kpx::platform::UserInterface& answers_;
  HWND window_ = nullptr;   // message-only, on the add-in's thread
  HANDLE thread_ = nullptr;
  HANDLE stop_ = nullptr;
  std::set<HWND> answered_;  // boxes pressed and not gone yet (add-in's thread)
  kpx::platform::HostPlacement host_;
  HWND restore_ = nullptr;  // the Restore window being played
};

}  // namespace wintest
