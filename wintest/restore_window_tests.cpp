// The screen's resolution comes from GDI.
#undef NOGDI
#include <windows.h>

#include "restore_window_tests.h"

#include <commctrl.h>

#include <cmath>
#include <cstdlib>
#include <functional>
#include <string>
#include <utility>
#include <vector>

#include "automation/automation_error.h"
#include "shared/resource_texts.h"
#include "check.h"
#include "platform/win32/dependency_window_ids.h"
#include "platform/win32/restore_window_ids.h"
#include "platform/win32/win32_platform.h"
#include "prompt_reader.h"
#include "restore_reader.h"
#include "restore_test_form.h"
#include "restore/kpx_restore_form.h"
#include "shared/module.h"

#if KPX_WINTEST_SCRIPTED_USER
#include "prompt_tests.h"
#include "scripted_user.h"
#include "sim/event_log.h"
#include "sim/json_source.h"
#include "sim/model_file.h"
#include "sim/scenario_file.h"
#include "sim/sim_platform.h"
#endif

namespace wintest {

namespace {

using kpx::platform::ControlRect;
using kpx::platform::RestoreControl;
using kpx::platform::RestoreRow;

// The user at the next Restore (or dependency) window, on a thread of its
// own while the test's thread shows it; presses Cancel if the play left it
// open, so that a failing test cannot hang the run.
class WindowUser {
 public:
  WindowUser(std::vector<HWND> (*find)(), std::function<void(HWND)> play) : find_(find), play_(std::move(play)) {
    thread_ = CreateThread(nullptr, 0, Run, this, 0, nullptr);
  }
  ~WindowUser() { Finish(); }
  WindowUser(const WindowUser&) = delete;
  WindowUser& operator=(const WindowUser&) = delete;
  HWND Finish() {
    if (thread_) {
      WaitForSingleObject(thread_, INFINITE);
      CloseHandle(thread_);
      thread_ = nullptr;
    }
    return window_;
  }
  bool leftOpen() const { return leftOpen_; }

 private:
  static DWORD WINAPI Run(void* self) {
    auto* user = static_cast<WindowUser*>(self);
    for (int waited = 0; waited < 20000 && !user->window_; waited += 10) {
      const std::vector<HWND> shown = user->find_();
      if (shown.empty())
        Sleep(10);
      else
        user->window_ = shown.front();
    }
    if (!user->window_) return 0;
    user->play_(user->window_);
    for (int waited = 0; waited < 5000 && IsWindow(user->window_); waited += 10) Sleep(10);
    if (IsWindow(user->window_)) {
      user->leftOpen_ = true;
      PostMessageW(user->window_, WM_COMMAND, IDCANCEL, 0);
    }
    return 0;
  }
  std::vector<HWND> (*find_)();
  std::function<void(HWND)> play_;
  HANDLE thread_ = nullptr;
  HWND window_ = nullptr;
  bool leftOpen_ = false;
};


// Waits until `done` holds, up to two seconds (posted input is handled on
// the window's thread in its own time).
bool WaitFor(const std::function<bool()>& done) {
  for (int waited = 0; waited < 2000; waited += 10) {
    if (done()) return true;
    Sleep(10);
  }
  return done();
}

bool Called(const TestForm& form, const std::string& call) {
  for (const std::string& c : form.calls)
    if (c == call) return true;
  return false;
}

RECT RectIn(HWND dialog, int id) {
  RECT r = {};
  GetWindowRect(GetDlgItem(dialog, id), &r);
  MapWindowPoints(nullptr, dialog, reinterpret_cast<POINT*>(&r), 2);
  return r;
}

int ScreenDpi() {
  HDC screen = GetDC(nullptr);
  const int dpi = GetDeviceCaps(screen, LOGPIXELSX);
  ReleaseDC(nullptr, screen);
  return dpi;
}

HWND HostWindow() {
  return CreateWindowExW(0, L"Static", L"kpx-wintest: host window", WS_OVERLAPPEDWINDOW | WS_VISIBLE, 60, 50, 800,
                         600, nullptr, nullptr, GetModuleHandleW(nullptr), nullptr);
}

const std::vector<TestForm::Project> kProjects = {
    {"Shapes", {"circle.cpp", "circle.h"}}, {"Brushes", {"brush.cpp"}}, {"Tools", {"ruler.cpp", "ruler.h", "pen.h"}}};

void ShowsTheForm(HMODULE addin) {
  Group("the Restore window shows the form's texts, columns and rows, over the host's window which owns it");
  kpx::win32::ServerLocks locks;
  kpx::win32::ComBridge bridge(locks);
  kpx::win32::Win32UserInterface ui(bridge, addin);
  TestForm form(kProjects);
  HWND host = HostWindow();
  RECT hostRect;
  GetWindowRect(host, &hostRect);
  const kpx::platform::HostPlacement placement{reinterpret_cast<int64_t>(host), hostRect.top, hostRect.left,
                                               hostRect.bottom - hostRect.top, hostRect.right - hostRect.left};
  RestoreSeen seen;
  HWND owner = nullptr;
  bool hostEnabled = true;
  RECT window = {}, client = {}, title = {}, subtitle = {}, instructions = {}, list = {}, ok = {};
  WindowUser user(ShownRestoreWindows, [&](HWND dialog) {
    seen = ReadRestore(dialog);
    owner = GetWindow(dialog, GW_OWNER);
    hostEnabled = IsWindowEnabled(host) != 0;
    GetWindowRect(dialog, &window);
    GetClientRect(dialog, &client);
    title = RectIn(dialog, KPX_RESTORE_TITLE);
    subtitle = RectIn(dialog, KPX_RESTORE_SUBTITLE);
    instructions = RectIn(dialog, KPX_RESTORE_INSTRUCTIONS);
    list = RectIn(dialog, KPX_RESTORE_LIST);
    ok = RectIn(dialog, IDOK);
    Click(dialog, IDCANCEL);
  });
  ui.ShowRestoreDialog(form, placement);
  CHECK(user.Finish() != nullptr);
  CHECK(!user.leftOpen());

  CHECK_EQ(seen.caption, form.texts().caption);
  CHECK_EQ(seen.instructions, form.texts().instructions);
  CHECK_EQ(seen.title, std::string("Source Backups"));
  CHECK_EQ(seen.subtitle, std::string());
  CHECK_EQ(seen.ok, std::string("OK"));
  CHECK_EQ(seen.cancel, std::string("Cancel"));
  CHECK_EQ(seen.help, std::string("Help"));
  CHECK(!seen.okEnabled);
  const double twips = 1440.0 / ScreenDpi();
  // The form's widths; the first one may be wider, for the dates.
  for (int c = 0; c < 3; ++c) {
    CHECK_EQ(seen.columns[c], form.texts().columns[c]);
    const int width = static_cast<int>(std::lround(form.texts().columnTwips[c] / twips));
    if (c == 0)
      CHECK(seen.columnWidths[c] >= width && seen.columnWidths[c] < width + 40);
    else
      CHECK_EQ(seen.columnWidths[c], width);
  }
  // Projects flush left, their files indented under them with the backup's date.
  CHECK_EQ(seen.rows.size(), form.rows().size());
  for (size_t i = 0; i < seen.rows.size() && i < form.rows().size(); ++i) {
    const RestoreRow& row = form.rows()[i];
    CHECK_EQ(seen.rows[i].cells[0], row.project ? row.cells[0] : row.modified);
    CHECK_EQ(seen.rows[i].cells[1], row.cells[1]);
    CHECK_EQ(seen.rows[i].cells[2], row.cells[2]);
    CHECK(row.project ? seen.rows[i].indent == 0 : seen.rows[i].indent > 0);
    CHECK_EQ(seen.rows[i].check, 1);
  }
  CHECK_EQ(FindRestoreRow(seen, "Tools"), 5);
  CHECK_EQ(FindRestoreRow(seen, "C:\\work\\Tools\\pen.h"), 8);
  CHECK_EQ(FindRestoreRow(seen, "C:\\work\\Tools\\none.h"), -1);
  // Owned by the host's window, which takes no input until it closes; centred over it.
  CHECK(owner == host);
  CHECK(!hostEnabled);
  CHECK(IsWindowEnabled(host));
  CHECK(std::abs((window.left + window.right) - (hostRect.left + hostRect.right)) <= 2);
  CHECK(std::abs((window.top + window.bottom) - (hostRect.top + hostRect.bottom)) <= 2);
  // The client area has the form's design size; the header, then the
  // instructions, then the list, apart and inside it.
  CHECK_EQ(client.right, static_cast<LONG>(std::lround(form.designWidth() / twips)));
  CHECK_EQ(client.bottom, static_cast<LONG>(std::lround(form.designHeight() / twips)));
  CHECK(title.bottom <= subtitle.top && subtitle.bottom <= instructions.top && instructions.bottom <= list.top);
  if (!CHECK(title.bottom > title.top && subtitle.bottom > subtitle.top &&
             instructions.bottom - instructions.top >= subtitle.bottom - subtitle.top))
    std::printf("  title %ld-%ld, subtitle %ld-%ld, instructions %ld-%ld\n", title.top, title.bottom, subtitle.top,
                subtitle.bottom, instructions.top, instructions.bottom);
  CHECK(list.bottom <= ok.top && list.right <= client.right && ok.bottom <= client.bottom);
  CHECK_EQ(list.left, static_cast<LONG>(std::lround(120 / twips)));
  CHECK_EQ(ok.left, static_cast<LONG>(std::lround(5865 / twips)));
  CHECK(form.calls == std::vector<std::string>{"cancel"});
  DestroyWindow(host);
}

void ActionsGoToTheForm(HMODULE addin) {
  Group("the Restore window hands ticks, selection, clicks, the menu command, the timer and Help to the form, then shows its state");
  kpx::win32::ServerLocks locks;
  kpx::win32::ComBridge bridge(locks);
  kpx::win32::Win32UserInterface ui(bridge, addin);
  TestForm form(kProjects);
  form.timerOnClick = true;
  std::vector<int> afterProjectTick, afterFileUntick, afterPartialTick;
  bool okAfterTick = false, okAfterUntick = true;
  std::string titleAfterSelect, subtitleAfterSelect, menuText;
  bool menuShown = false, keyboardMenu = false, timerBeforeSecond = true, timerAfter = false;
  size_t callsBeforeHelp = 0;
  WindowUser user(ShownRestoreWindows, [&](HWND dialog) {
    TickRow(dialog, 0, true);  // "Shapes" and its two files
    afterProjectTick = ReadChecks(dialog);
    okAfterTick = IsWindowEnabled(GetDlgItem(dialog, IDOK)) != 0;
    TickRow(dialog, 2, false);  // circle.h: Shapes is only partly ticked
    afterFileUntick = ReadChecks(dialog);
    TickRow(dialog, 0, true);  // the partly ticked project ticked again: all its files
    afterPartialTick = ReadChecks(dialog);
    TickRow(dialog, 0, false);
    okAfterUntick = IsWindowEnabled(GetDlgItem(dialog, IDOK)) != 0;
    SelectRow(dialog, 3);  // Brushes
    titleAfterSelect = WindowText(GetDlgItem(dialog, KPX_RESTORE_TITLE));
    subtitleAfterSelect = WindowText(GetDlgItem(dialog, KPX_RESTORE_SUBTITLE));
    // A left click on a file row and a right click on a project row are no
    // clicks for the form; a left click on a project row counts and starts
    // the one-second timer. The clicks are handled in their order.
    ClickRow(dialog, 7, false);
    ClickRow(dialog, 3, true);
    ClickRow(dialog, 5, false);
    WaitFor([&] { return Called(form, "click 5"); });
    Sleep(300);
    timerBeforeSecond = Called(form, "timer");
    timerAfter = WaitFor([&] { return Called(form, "timer"); });
    // A right click on a file row shows the form's command; chosen, it compares.
    ClickRow(dialog, 4, true);
    HWND menu = WaitForPopupMenu(2000);
    menuShown = menu != nullptr;
    if (menu) {
      menuText = PopupMenuText(menu);
      ChoosePopupCommand(menu, true);
      WaitFor([&] { return Called(form, "compare 4"); });
    }
    // Dismissed, it does not.
    ClickRow(dialog, 6, true);
    menu = WaitForPopupMenu(2000);
    if (menu) {
      ChoosePopupCommand(menu, false);
      WaitFor([&] { return WaitForPopupMenu(0) == nullptr; });
    }
    // The menu key on a selected file row opens its menu too.
    SelectRow(dialog, 2);
    PostMessageW(dialog, WM_CONTEXTMENU, reinterpret_cast<WPARAM>(GetDlgItem(dialog, KPX_RESTORE_LIST)), -1);
    menu = WaitForPopupMenu(2000);
    keyboardMenu = menu != nullptr;
    if (menu) {
      ChoosePopupCommand(menu, true);
      WaitFor([&] { return Called(form, "compare 2"); });
    }
    callsBeforeHelp = form.calls.size();
    Click(dialog, IDHELP);
    // OK is disabled: Enter does nothing; a tick enables it, and OK closes.
    SendMessageW(dialog, WM_COMMAND, MAKEWPARAM(IDOK, BN_CLICKED), 0);
    TickRow(dialog, 8, true);
    Click(dialog, IDOK);
  });
  ui.ShowRestoreDialog(form, {});
  HWND played = user.Finish();
  CHECK(played != nullptr);
  CHECK(!user.leftOpen());
  CHECK(afterProjectTick == (std::vector<int>{2, 2, 2, 1, 1, 1, 1, 1, 1}));
  CHECK(afterFileUntick == (std::vector<int>{3, 2, 1, 1, 1, 1, 1, 1, 1}));
  CHECK(afterPartialTick == (std::vector<int>{2, 2, 2, 1, 1, 1, 1, 1, 1}));
  CHECK(okAfterTick);
  CHECK(!okAfterUntick);
  CHECK_EQ(titleAfterSelect, std::string("Backups of the selected project"));
  CHECK_EQ(subtitleAfterSelect, std::string("23.11.2026 07:45:00 - time of the last backup"));
  CHECK(!timerBeforeSecond);
  CHECK(timerAfter);
  CHECK(menuShown);
  CHECK_EQ(menuText, form.compareCaption);
  CHECK(Called(form, "compare 4"));
  CHECK(keyboardMenu);
  CHECK(Called(form, "compare 2"));
  CHECK(Called(form, "click 6"));
  CHECK(!Called(form, "compare 6"));
  CHECK(!Called(form, "click 7"));
  CHECK(!Called(form, "click 3"));
  CHECK(Called(form, "select 7"));
  CHECK_EQ(form.helpWindow, reinterpret_cast<int64_t>(played));
  // The form's own ticks came back to it once each: the window shows them
  // without handing them on again.
  std::vector<std::string> ticks;
  for (const std::string& c : form.calls)
    if (c.rfind("tick", 0) == 0 || c.rfind("untick", 0) == 0) ticks.push_back(c);
  CHECK(ticks == (std::vector<std::string>{"tick 0", "untick 2", "tick 0", "untick 0", "tick 8"}));
  const std::vector<std::string> tail(form.calls.begin() + static_cast<long>(std::min(callsBeforeHelp, form.calls.size())),
                                      form.calls.end());
  CHECK(tail == (std::vector<std::string>{"help", "tick 8", "ok"}));
  // The timer ran once: it ends itself.
  int timers = 0;
  for (const std::string& c : form.calls) timers += c == "timer";
  CHECK_EQ(timers, 1);
}

void SizeAndBounds(HMODULE addin) {
  Group("the Restore window cannot be made smaller than the form's minimum, and OK and Cancel stop at their bounds");
  kpx::win32::ServerLocks locks;
  kpx::win32::ComBridge bridge(locks);
  kpx::win32::Win32UserInterface ui(bridge, addin);
  const int dpi = ScreenDpi();
  const double twips = 1440.0 / dpi;

  // The form's smallest size, in pixels of this screen, whatever is asked.
  TestForm form(kProjects);
  SIZE smallest = {}, minTrack = {};
  WindowUser sizer(ShownRestoreWindows, [&](HWND dialog) {
    MINMAXINFO info = {};
    SendMessageW(dialog, WM_GETMINMAXINFO, 0, reinterpret_cast<LPARAM>(&info));
    minTrack = {info.ptMinTrackSize.x, info.ptMinTrackSize.y};
    SetWindowPos(dialog, nullptr, 0, 0, 100, 100, SWP_NOMOVE | SWP_NOZORDER | SWP_NOACTIVATE);
    RECT r;
    GetWindowRect(dialog, &r);
    smallest = {r.right - r.left, r.bottom - r.top};
    Click(dialog, IDCANCEL);
  });
  ui.ShowRestoreDialog(form, {});
  CHECK(sizer.Finish() != nullptr);
  CHECK(!sizer.leftOpen());
  const LONG minWidth = std::lround(8610 / twips), minHeight = std::lround(5895 / twips);
  if (dpi == 96) CHECK(minWidth == 574 && minHeight == 393);
  CHECK_EQ(minTrack.cx, minWidth);
  CHECK_EQ(minTrack.cy, minHeight);
  CHECK_EQ(smallest.cx, minWidth);
  CHECK_EQ(smallest.cy, minHeight);

  // With room to narrow past the bounds (a form with a smaller minimum):
  // narrowed a pixel at a time, as a drag does, OK and Cancel stop at their
  // bounds; wider again, they follow the right edge, the list grows.
  TestForm narrow(kProjects);
  narrow.minWidth = 3000;
  narrow.minHeight = 3000;
  RECT okNarrow = {}, cancelNarrow = {}, okWide = {}, cancelWide = {}, listWide = {}, clientWide = {}, helpTall = {},
       clientTall = {}, clientNarrow = {};
  ControlRect formOk = {}, formCancel = {};
  WindowUser user(ShownRestoreWindows, [&](HWND dialog) {
    RECT r;
    GetWindowRect(dialog, &r);
    for (int width = r.right - r.left; width >= 300; --width)
      SetWindowPos(dialog, nullptr, 0, 0, width, r.bottom - r.top, SWP_NOMOVE | SWP_NOZORDER | SWP_NOACTIVATE);
    GetClientRect(dialog, &clientNarrow);
    okNarrow = RectIn(dialog, IDOK);
    cancelNarrow = RectIn(dialog, IDCANCEL);
    formOk = narrow.last[size_t(RestoreControl::Ok)];
    formCancel = narrow.last[size_t(RestoreControl::Cancel)];
    SetWindowPos(dialog, nullptr, 0, 0, 800, r.bottom - r.top, SWP_NOMOVE | SWP_NOZORDER | SWP_NOACTIVATE);
    GetClientRect(dialog, &clientWide);
    okWide = RectIn(dialog, IDOK);
    cancelWide = RectIn(dialog, IDCANCEL);
    listWide = RectIn(dialog, KPX_RESTORE_LIST);
    SetWindowPos(dialog, nullptr, 0, 0, 800, 600, SWP_NOMOVE | SWP_NOZORDER | SWP_NOACTIVATE);
    GetClientRect(dialog, &clientTall);
    helpTall = RectIn(dialog, IDHELP);
    Click(dialog, IDCANCEL);
  });
  ui.ShowRestoreDialog(narrow, {});
  CHECK(user.Finish() != nullptr);
  CHECK(!user.leftOpen());
  CHECK(clientNarrow.right * twips < 5760);
  // Stopped at the bound, within the last pixel's step.
  CHECK(formOk.left >= 5760 && formOk.left < 5760 + twips);
  CHECK(formCancel.left >= 7080 && formCancel.left < 7080 + twips);
  CHECK_EQ(okNarrow.left, static_cast<LONG>(std::lround(formOk.left / twips)));
  CHECK_EQ(cancelNarrow.left, static_cast<LONG>(std::lround(formCancel.left / twips)));
  CHECK(okNarrow.right <= cancelNarrow.left);
  CHECK(std::abs(okWide.left - (clientWide.right - std::lround((1530 + 1095) / twips))) <= 1);
  CHECK(std::abs(cancelWide.left - (clientWide.right - std::lround((100 + 1095) / twips))) <= 1);
  CHECK(std::abs(listWide.right - (clientWide.right - std::lround(120 / twips))) <= 1);
  CHECK(std::abs(helpTall.bottom - (clientTall.bottom - std::lround(100 / twips))) <= 1);
}

void ManyRowsAndFailures(HMODULE addin) {
  Group("the Restore window shows 100 projects of 100 files each; what the form raises closes it and reaches the caller");
  kpx::win32::ServerLocks locks;
  kpx::win32::ComBridge bridge(locks);
  kpx::win32::Win32UserInterface ui(bridge, addin);
  std::vector<TestForm::Project> many;
  for (int p = 0; p < 100; ++p) {
    TestForm::Project project{"Project " + std::to_string(p), {}};
    for (int f = 0; f < 100; ++f) project.files.push_back("file" + std::to_string(f) + ".cpp");
    many.push_back(project);
  }
  TestForm big(many);
  DWORD opened = 0;
  const DWORD started = GetTickCount();
  size_t rows = 0;
  std::string last;
  WindowUser user(ShownRestoreWindows, [&](HWND dialog) {
    opened = GetTickCount() - started;
    const RestoreSeen seen = ReadRestore(dialog);
    rows = seen.rows.size();
    if (!seen.rows.empty()) last = seen.rows.back().cells[2] + "\\" + seen.rows.back().cells[1];
    TickRow(dialog, 9999, true);
    Click(dialog, IDOK);
  });
  ui.ShowRestoreDialog(big, {});
  CHECK(user.Finish() != nullptr);
  // A benchmark, not a check: the time depends on the machine and on Wine.
  std::printf("  benchmark: the Restore window showed 10,000 file rows (100 projects of 100 files) in %lu ms\n",
              static_cast<unsigned long>(opened));
  CHECK_EQ(rows, size_t{10100});
  CHECK_EQ(last, std::string("C:\\work\\Project 99\\file99.cpp"));
  CHECK(big.rows()[9999].check == 1 && big.rows()[10099].check == 1);

  TestForm failing(kProjects);
  failing.failHelp = true;
  WindowUser helpUser(ShownRestoreWindows, [&](HWND dialog) { Click(dialog, IDHELP); });
  int32_t number = 0;
  try {
    ui.ShowRestoreDialog(failing, {});
  } catch (const kpx::AutomationError& e) {
    number = e.number();
  }
  CHECK(helpUser.Finish() != nullptr);
  CHECK(!helpUser.leftOpen());
  CHECK_EQ(number, kpx::vberr::kFileNotFound);
  // The close box cancels.
  TestForm closed(kProjects);
  WindowUser closer(ShownRestoreWindows, [&](HWND dialog) { SendMessageW(dialog, WM_SYSCOMMAND, SC_CLOSE, 0); });
  ui.ShowRestoreDialog(closed, {});
  CHECK(closer.Finish() != nullptr);
  CHECK(closed.calls == std::vector<std::string>{"cancel"});
}

void DependencyDialog(HMODULE addin) {
  Group("the module dependency window: the view's texts, edits reported, OK with the text, read-only with Cancel as default");
  kpx::win32::ServerLocks locks;
  kpx::win32::ComBridge bridge(locks);
  kpx::win32::Win32UserInterface ui(bridge, addin);
  kpx::platform::DependencyView view;
  view.caption = "Module Dependency Properties";
  view.label = "Import options:";
  view.text = "no_namespace rename(\"EOF\", \"adoEOF\")";
  view.ok = "OK";
  view.cancel = "Cancel";

  HWND host = HostWindow();
  SetActiveWindow(host);
  DependencySeen seen;
  HWND owner = nullptr;
  WindowUser editor(ShownDependencyWindows, [&](HWND dialog) {
    seen = ReadDependency(dialog);
    owner = GetWindow(dialog, GW_OWNER);
    TypeDependencyText(dialog, "named_guids");
    Click(dialog, IDOK);
  });
  kpx::platform::DependencyOutcome outcome = ui.ShowDependencyDialog(view);
  CHECK(editor.Finish() != nullptr);
  CHECK(!editor.leftOpen());
  CHECK_EQ(seen.caption, view.caption);
  CHECK_EQ(seen.label, view.label);
  CHECK_EQ(seen.text, view.text);
  CHECK_EQ(seen.ok, view.ok);
  CHECK_EQ(seen.cancel, view.cancel);
  CHECK(!seen.readOnly && seen.okEnabled);
  CHECK_EQ(seen.defaultButton, IDOK);
  CHECK(owner == host);
  CHECK(outcome.ok && outcome.changed);
  CHECK_EQ(outcome.text, std::string("named_guids"));

  // OK without an edit: nothing changed, the text as it was.
  WindowUser untouched(ShownDependencyWindows, [&](HWND dialog) { Click(dialog, IDOK); });
  outcome = ui.ShowDependencyDialog(view);
  CHECK(untouched.Finish() != nullptr);
  CHECK(outcome.ok && !outcome.changed);
  CHECK_EQ(outcome.text, view.text);

  // Read-only: no edit, no OK (Enter included); Cancel is the default.
  view.caption += " {read-only}";
  view.readOnly = true;
  bool typedAway = false;
  WindowUser reader(ShownDependencyWindows, [&](HWND dialog) {
    seen = ReadDependency(dialog);
    SendMessageW(GetDlgItem(dialog, KPX_DEPENDENCY_TEXT), WM_CHAR, 'x', 0);
    typedAway = WindowText(GetDlgItem(dialog, KPX_DEPENDENCY_TEXT)) != view.text;
    SendMessageW(dialog, WM_COMMAND, MAKEWPARAM(IDOK, BN_CLICKED), 0);
    if (IsWindow(dialog)) Click(dialog, IDCANCEL);
  });
  outcome = ui.ShowDependencyDialog(view);
  CHECK(reader.Finish() != nullptr);
  CHECK(!reader.leftOpen());
  CHECK_EQ(seen.caption, std::string("Module Dependency Properties {read-only}"));
  CHECK(seen.readOnly && !seen.okEnabled);
  CHECK_EQ(seen.defaultButton, IDCANCEL);
  CHECK(!typedAway);
  CHECK(!outcome.ok && !outcome.changed);
  DestroyWindow(host);
}

void TheAddinsOwnForm(HMODULE addin, const std::string& scratch) {
  Group("the add-in's own Restore form in the window: its captions, rows of real backups, header, smallest size and bounds");
  kpx::win32::ServerLocks locks;
  kpx::win32::ComBridge bridge(locks);
  kpx::win32::Win32Platform win32(bridge, addin);
  kpx::Module module(win32.platform());
  module.resources().InitResourceStrings();  // as the add-in does when it loads
  const std::string folder = scratch + "\\restore";
  CreateDirectoryA(folder.c_str(), nullptr);
  const std::string backups[] = {folder + "\\circle.cpp.bak", folder + "\\circle.h.bak"};
  for (const std::string& backup : backups) {
    HANDLE file = CreateFileA(backup.c_str(), GENERIC_WRITE, 0, nullptr, CREATE_ALWAYS, FILE_ATTRIBUTE_NORMAL, nullptr);
    CHECK(file != INVALID_HANDLE_VALUE);
    CloseHandle(file);
  }
  kpx::KpxRestoreForm form(module);
  form.Reset();
  const std::string record = "C:\\work\\Shapes\\Shapes.dsp|Shapes|" + folder + "\\Shapes.lst";
  form.AddEntry(record, {"C:\\work\\Shapes\\circle.cpp|" + backups[0], "C:\\work\\Shapes\\circle.h|" + backups[1]});
  form.SelectProject(record);
  const std::string selectedTitle = form.headerTitle();

  const double twips = 1440.0 / ScreenDpi();
  RestoreSeen seen;
  std::vector<int> ticked;
  bool okAfterTick = false;
  SIZE smallest = {};
  RECT okNarrow = {}, cancelNarrow = {}, clientNarrow = {}, okWide = {}, clientWide = {}, instructions = {}, list = {};
  WindowUser user(ShownRestoreWindows, [&](HWND dialog) {
    seen = ReadRestore(dialog);
    instructions = RectIn(dialog, KPX_RESTORE_INSTRUCTIONS);
    list = RectIn(dialog, KPX_RESTORE_LIST);
    TickRow(dialog, 0, true);
    ticked = ReadChecks(dialog);
    okAfterTick = IsWindowEnabled(GetDlgItem(dialog, IDOK)) != 0;
    RECT r;
    GetWindowRect(dialog, &r);
    SetWindowPos(dialog, nullptr, 0, 0, 800, r.bottom - r.top, SWP_NOMOVE | SWP_NOZORDER | SWP_NOACTIVATE);
    GetClientRect(dialog, &clientWide);
    okWide = RectIn(dialog, IDOK);
    for (int width = 800; width >= 300; --width)
      SetWindowPos(dialog, nullptr, 0, 0, width, r.bottom - r.top, SWP_NOMOVE | SWP_NOZORDER | SWP_NOACTIVATE);
    SetWindowPos(dialog, nullptr, 0, 0, 100, 100, SWP_NOMOVE | SWP_NOZORDER | SWP_NOACTIVATE);
    GetWindowRect(dialog, &r);
    smallest = {r.right - r.left, r.bottom - r.top};
    GetClientRect(dialog, &clientNarrow);
    okNarrow = RectIn(dialog, IDOK);
    cancelNarrow = RectIn(dialog, IDCANCEL);
    Click(dialog, IDCANCEL);
  });
  form.ShowRestoreDialog(nullptr);
  CHECK(user.Finish() != nullptr);
  CHECK(!user.leftOpen());
  for (const std::string& backup : backups) DeleteFileA(backup.c_str());
  RemoveDirectoryA(folder.c_str());

  CHECK_EQ(seen.caption, std::string(kpx::FindResourceText(5011)));
  CHECK_EQ(seen.instructions, std::string(kpx::FindResourceText(5027)));
  CHECK_EQ(seen.title, selectedTitle);
  CHECK(!seen.subtitle.empty());
  CHECK_EQ(seen.columns[0], std::string(kpx::FindResourceText(5021)));
  CHECK_EQ(seen.columns[1], std::string(kpx::FindResourceText(5023)));
  CHECK_EQ(seen.columns[2], std::string(kpx::FindResourceText(5024)));
  CHECK_EQ(seen.columnWidths[2], static_cast<int>(std::lround(8000 / twips)));
  CHECK(seen.columnWidths[0] >= std::lround(2000 / twips));
  CHECK_EQ(seen.rows.size(), size_t{3});
  if (seen.rows.size() == 3) {
    CHECK_EQ(seen.rows[0].cells[0], std::string("Shapes"));
    CHECK(seen.rows[0].selected);
    CHECK_EQ(FindRestoreRow(seen, "C:\\work\\Shapes\\circle.h"), 2);
    CHECK(!seen.rows[1].cells[0].empty());  // the backup's date
  }
  CHECK(!seen.okEnabled);
  CHECK(ticked == (std::vector<int>{2, 2, 2}));
  CHECK(okAfterTick);
  // The header and the instructions stand above the list.
  CHECK(instructions.bottom <= list.top);
  // Its smallest size, and OK back at its bound after the window was wider.
  CHECK_EQ(smallest.cx, static_cast<LONG>(std::lround(8610 / twips)));
  CHECK_EQ(smallest.cy, static_cast<LONG>(std::lround(5895 / twips)));
  CHECK(okWide.left > std::lround(5760 / twips));
  CHECK_EQ(okNarrow.left, static_cast<LONG>(std::lround(5760 / twips)));
  CHECK(cancelNarrow.left >= std::lround(7080 / twips) && cancelNarrow.right <= clientNarrow.right);
  CHECK(okNarrow.right <= cancelNarrow.left);
  // Cancel left nothing ticked for the restore.
  CHECK(form.rows().empty());
}

#if KPX_WINTEST_SCRIPTED_USER

void ScriptedUserPlaysTheRestoreWindow(HMODULE addin) {
  Group("kpx-comsim's scripted user plays a scenario's Restore steps on the real window as the simulator plays them on the form");
  kpx::win32::ServerLocks locks;
  kpx::win32::ComBridge bridge(locks);
  kpx::win32::Win32UserInterface ui(bridge, addin);
  // A partly ticked project ticked again, a menu's command, a second click
  // on the selected project restarting the timer, a menu the next step
  // closes, Help, a project unticked, OK.
  const kpx::sim::ModelDef model = kpx::sim::LoadModel(kpx::sim::JsonSource("model.json", "{}"));
  const kpx::sim::Scenario scenario = kpx::sim::LoadScenario(
      kpx::sim::JsonSource("restore.json", R"({"actions": [{"answer": {"restore": [
        {"tick": "Shapes"}, {"untick": "C:\\work\\Shapes\\circle.h"}, {"tick": "Shapes"}, {"select": "Brushes"},
        {"click": "C:\\work\\Tools\\ruler.cpp"}, {"compare": true}, {"click": "Tools"}, {"click": "Tools"},
        {"timer": true}, {"click": "C:\\work\\Tools\\pen.h"}, {"select": "Shapes"}, {"help": true},
        {"untick": "Shapes"}, {"tick": "C:\\work\\Tools\\pen.h"}, "ok"]}}]})"),
      model);
  kpx::sim::EventLog nativeLog, comLog;
  kpx::sim::SimUserInterface native(nativeLog), played(comLog);
  native.QueueRestoreAnswer(*scenario.actions.at(0).restore);
  played.QueueRestoreAnswer(*scenario.actions.at(0).restore);
  TestForm nativeForm(kProjects), realForm(kProjects);
  nativeForm.timerOnClick = realForm.timerOnClick = true;
  // Over a host window that owns it.
  HWND host = HostWindow();
  RECT hostRect;
  GetWindowRect(host, &hostRect);
  const kpx::platform::HostPlacement placement{reinterpret_cast<int64_t>(host), hostRect.top, hostRect.left,
                                               hostRect.bottom - hostRect.top, hostRect.right - hostRect.left};
  native.ShowRestoreDialog(nativeForm, placement);
  {
    ScriptedUser user(played);
    user.PlaceHost(placement);
    ui.ShowRestoreDialog(realForm, placement);
  }
  DestroyWindow(host);
  const std::vector<std::string> calls = {"tick 0",  "untick 2", "tick 0",  "select 3", "select 6", "click 6",
                                          "compare 6", "select 5", "click 5", "click 5",  "timer",    "select 8",
                                          "click 8", "select 0", "help",     "untick 0", "tick 8",   "ok"};
  CHECK(nativeForm.calls == calls);
  if (!CHECK(realForm.calls == calls))
    for (const std::string& c : realForm.calls) std::printf("    window's call: %s\n", c.c_str());
  const std::vector<std::string> want = EventsOf(nativeLog, "restore-dialog"), got = EventsOf(comLog, "restore-dialog");
  CHECK_EQ(want.size(), size_t{1});
  CHECK_EQ(got.size(), want.size());
  for (size_t i = 0; i < want.size() && i < got.size(); ++i) CHECK_EQ(got[i], want[i]);
  CHECK_EQ(comLog.events().size(), got.size());  // nothing failed

  // A window that does not stand where the host said it is shows where it
  // does stand: here over the work area, with no owner.
  kpx::sim::EventLog elsewhereLog;
  kpx::sim::SimUserInterface elsewhere(elsewhereLog);
  TestForm unplaced(kProjects);
  {
    ScriptedUser user(elsewhere);
    user.PlaceHost({0, 100, 100, 300, 400});
    ui.ShowRestoreDialog(unplaced, {});
  }
  const std::vector<std::string> shown = EventsOf(elsewhereLog, "restore-dialog");
  if (CHECK_EQ(shown.size(), size_t{1})) {
    const kpx::sim::EventJson ev = kpx::sim::EventJson::parse(shown[0]);
    CHECK_EQ(ev.at("owner").get<int64_t>(), int64_t{0});
    CHECK(ev.at("host") != (kpx::sim::EventJson{{"top", 100}, {"left", 100}, {"height", 300}, {"width", 400}}));
    CHECK(ev.at("host").at("width").get<int>() > 0);
  }
}

#endif

}  // namespace

void RestoreWindowTests(HMODULE addin, const std::string& scratch) {
  ShowsTheForm(addin);
  ActionsGoToTheForm(addin);
  SizeAndBounds(addin);
  ManyRowsAndFailures(addin);
  TheAddinsOwnForm(addin, scratch);
  DependencyDialog(addin);
#if KPX_WINTEST_SCRIPTED_USER
  ScriptedUserPlaysTheRestoreWindow(addin);
#endif
}

}  // namespace wintest
