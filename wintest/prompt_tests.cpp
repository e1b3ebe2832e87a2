#include "prompt_tests.h"

#include <cstdlib>
#include <functional>
#include <string>
#include <utility>
#include <vector>

#include "automation/automation_error.h"
#include "check.h"
#include "platform/win32/prompt_window_ids.h"
#include "platform/win32/win32_platform.h"
#include "prompt_reader.h"

#if KPX_WINTEST_SCRIPTED_USER
#include "dialogs/kpx_prompt.h"
#include "platform/win32/com_bridge.h"
#include "scripted_user.h"
#include "shared/resource_strings.h"
#include "sim/sim_platform.h"
#endif

namespace wintest {

namespace {

using kpx::platform::PromptHelp;
using kpx::platform::PromptIcon;
using kpx::platform::PromptOutcome;
using kpx::platform::PromptView;

// The user at the next prompt, on a thread of its own while the test's
// thread shows the prompt: waits for the window, plays on it, and presses
// Cancel if the play left it open, so that a failing test cannot hang the
// run.
class PromptUser {
 public:
  explicit PromptUser(std::function<void(HWND)> play) : play_(std::move(play)) {
    thread_ = CreateThread(nullptr, 0, Run, this, 0, nullptr);
  }
  ~PromptUser() { Finish(); }
  PromptUser(const PromptUser&) = delete;
  PromptUser& operator=(const PromptUser&) = delete;

  // Waits for the play to end; the window it played on (null: none came).
  HWND Finish() {
    if (thread_) {
      WaitForSingleObject(thread_, INFINITE);
      CloseHandle(thread_);
      thread_ = nullptr;
    }
    return prompt_;
  }
  bool leftOpen() const { return leftOpen_; }

 private:
  static DWORD WINAPI Run(void* self) {
    auto* user = static_cast<PromptUser*>(self);
    for (int waited = 0; waited < 10000 && !user->prompt_; waited += 10) {
      const std::vector<HWND> shown = ShownPrompts();
      if (shown.empty())
        Sleep(10);
      else
        user->prompt_ = shown.front();
    }
    if (!user->prompt_) return 0;
    user->play_(user->prompt_);
    for (int waited = 0; waited < 5000 && IsWindow(user->prompt_); waited += 10) Sleep(10);
    if (IsWindow(user->prompt_)) {
      user->leftOpen_ = true;
      PostMessageW(user->prompt_, WM_COMMAND, IDCANCEL, 0);
    }
    return 0;
  }

  std::function<void(HWND)> play_;
  HANDLE thread_ = nullptr;
  HWND prompt_ = nullptr;
  bool leftOpen_ = false;
};

// Shows `view` and plays `play` on it; the window played on.
HWND Show(kpx::platform::UserInterface& ui, const PromptView& view, PromptHelp& help, std::function<void(HWND)> play,
          PromptOutcome* outcome) {
  PromptUser user(std::move(play));
  *outcome = ui.ShowPrompt(view, help);
  HWND played = user.Finish();
  CHECK(played != nullptr);
  CHECK(!user.leftOpen());
  return played;
}

struct HelpRecorder final : PromptHelp {
  std::vector<int64_t> windows;
  bool openWhenAsked = false;
  void ShowHelp(int64_t window) override {
    windows.push_back(window);
    openWhenAsked = IsWindowVisible(reinterpret_cast<HWND>(window)) != 0;
  }
};

PromptView View(std::string message, std::string title, PromptIcon icon, bool help) {
  PromptView v;
  v.message = std::move(message);
  v.title = std::move(title);
  v.icon = icon;
  v.okCaption = "OK";
  v.cancelCaption = "Cancel";
  v.helpCaption = "Help";
  v.dontShowCaption = "&Do not show this message again";
  v.helpAvailable = help;
  return v;
}

RECT RectIn(HWND dialog, int id) {
  RECT r = {};
  GetWindowRect(GetDlgItem(dialog, id), &r);
  MapWindowPoints(nullptr, dialog, reinterpret_cast<POINT*>(&r), 2);
  return r;
}

bool Inside(const RECT& inner, const RECT& outer) {
  return inner.left >= outer.left && inner.top >= outer.top && inner.right <= outer.right && inner.bottom <= outer.bottom;
}

void TextsIconsAndHelp(HMODULE addin) {
  Group("the prompt window shows the view's texts, the one icon of its kind, and Help enabled only when available");
  kpx::win32::ServerLocks locks;
  kpx::win32::ComBridge bridge(locks);
  kpx::win32::Win32UserInterface ui(bridge, addin);
  const struct {
    PromptIcon icon;
    bool help;
  } kinds[] = {{PromptIcon::Critical, false}, {PromptIcon::Question, true}, {PromptIcon::Information, false},
               {PromptIcon::None, true}};
  for (const auto& kind : kinds) {
    const PromptView view = View("The message with Gr\xC3\xBC\xC3\x9F" "e & an ampersand, kind " +
                                     std::to_string(static_cast<int>(kind.icon)) + ".\nIts second line.",
                                 "A title \xE2\x80\x93 " + std::to_string(static_cast<int>(kind.icon)), kind.icon,
                                 kind.help);
    HelpRecorder help;
    PromptSeen seen;
    PromptOutcome outcome{true, true};
    Show(ui, view, help,
         [&](HWND prompt) {
           seen = ReadPrompt(prompt);
           Click(prompt, IDOK);
         },
         &outcome);
    CHECK_EQ(seen.view.message, view.message);
    CHECK_EQ(seen.view.title, view.title);
    CHECK_EQ(seen.view.okCaption, view.okCaption);
    CHECK_EQ(seen.view.cancelCaption, view.cancelCaption);
    CHECK_EQ(seen.view.helpCaption, view.helpCaption);
    CHECK_EQ(seen.view.dontShowCaption, view.dontShowCaption);
    CHECK_EQ(seen.iconsShown, kind.icon == PromptIcon::None ? 0 : 1);
    CHECK_EQ(static_cast<int>(seen.view.icon), static_cast<int>(kind.icon));
    CHECK_EQ(seen.view.helpAvailable, kind.help);
    CHECK(!outcome.cancelled && !outcome.dontShow);
    CHECK(help.windows.empty());
  }
}

void ButtonsAndBox(HMODULE addin) {
  Group("Help opens the topic with the prompt's own window, which stays open; the tick, Cancel and the close box come back");
  kpx::win32::ServerLocks locks;
  kpx::win32::ComBridge bridge(locks);
  kpx::win32::Win32UserInterface ui(bridge, addin);
  {
    HelpRecorder help;
    bool openAfterHelp = false;
    PromptOutcome outcome;
    HWND played = Show(ui, View("Help, tick, Cancel.", "Help", PromptIcon::Question, true), help,
                       [&](HWND prompt) {
                         Click(prompt, IDHELP);
                         openAfterHelp = IsWindowVisible(prompt) != 0;
                         Click(prompt, KPX_PROMPT_DONT_SHOW);
                         Click(prompt, IDCANCEL);
                       },
                       &outcome);
    CHECK_EQ(help.windows.size(), size_t{1});
    CHECK(!help.windows.empty() && help.windows[0] == reinterpret_cast<int64_t>(played));
    CHECK(help.openWhenAsked);
    CHECK(openAfterHelp);
    CHECK(outcome.cancelled);
    CHECK(outcome.dontShow);
  }
  {
    // A disabled Help does nothing, clicked or asked for with F1; the box
    // ticked twice is clear again.
    HelpRecorder help;
    PromptOutcome outcome{true, true};
    Show(ui, View("No help here.", "No help", PromptIcon::Information, false), help,
         [&](HWND prompt) {
           Click(prompt, IDHELP);
           HELPINFO info = {};
           info.cbSize = sizeof info;
           SendMessageW(prompt, WM_HELP, 0, reinterpret_cast<LPARAM>(&info));
           Click(prompt, KPX_PROMPT_DONT_SHOW);
           Click(prompt, KPX_PROMPT_DONT_SHOW);
           Click(prompt, IDOK);
         },
         &outcome);
    CHECK(help.windows.empty());
    CHECK(!outcome.cancelled);
    CHECK(!outcome.dontShow);
  }
  {
    // F1 where Help is available, then the close box: cancelled.
    HelpRecorder help;
    PromptOutcome outcome;
    Show(ui, View("F1 and the close box.", "Close", PromptIcon::None, true), help,
         [&](HWND prompt) {
           HELPINFO info = {};
           info.cbSize = sizeof info;
           SendMessageW(prompt, WM_HELP, 0, reinterpret_cast<LPARAM>(&info));
           Click(prompt, KPX_PROMPT_DONT_SHOW);
           SendMessageW(prompt, WM_SYSCOMMAND, SC_CLOSE, 0);
         },
         &outcome);
    CHECK_EQ(help.windows.size(), size_t{1});
    CHECK(outcome.cancelled);
    CHECK(outcome.dontShow);
  }
  {
    // What Help raises ends the prompt and reaches the caller.
    struct FailingHelp final : PromptHelp {
      void ShowHelp(int64_t) override { throw kpx::AutomationError(kpx::vberr::kFileNotFound, "no help file"); }
    } help;
    int32_t number = 0;
    PromptUser user([](HWND prompt) { Click(prompt, IDHELP); });
    try {
      ui.ShowPrompt(View("Help fails.", "Failing help", PromptIcon::Critical, true), help);
    } catch (const kpx::AutomationError& e) {
      number = e.number();
    }
    CHECK(user.Finish() != nullptr);
    CHECK(!user.leftOpen());
    CHECK_EQ(number, kpx::vberr::kFileNotFound);
  }
  {
    // Without the module that holds the template there is no window.
    kpx::win32::ServerLocks locks;
    kpx::win32::ComBridge bridge(locks);
    kpx::win32::Win32UserInterface without(bridge);
    HelpRecorder help;
    int32_t number = 0;
    try {
      without.ShowPrompt(View("Nowhere.", "None", PromptIcon::None, false), help);
    } catch (const kpx::AutomationError& e) {
      number = e.number();
    }
    CHECK_EQ(number, kpx::vberr::kInternal);
  }
}

struct Geometry {
  RECT client{}, window{}, message{}, check{}, ok{}, cancel{}, help{}, icon{};
  HWND owner = nullptr;
  bool ownerEnabled = true;
};

Geometry GeometryOf(HWND prompt, PromptIcon icon) {
  Geometry g;
  GetClientRect(prompt, &g.client);
  GetWindowRect(prompt, &g.window);
  g.message = RectIn(prompt, KPX_PROMPT_MESSAGE);
  g.check = RectIn(prompt, KPX_PROMPT_DONT_SHOW);
  g.ok = RectIn(prompt, IDOK);
  g.cancel = RectIn(prompt, IDCANCEL);
  g.help = RectIn(prompt, IDHELP);
  const int iconId = icon == PromptIcon::Critical  ? KPX_PROMPT_ICON_CRITICAL
                     : icon == PromptIcon::Question ? KPX_PROMPT_ICON_QUESTION
                                                    : KPX_PROMPT_ICON_INFORMATION;
  g.icon = RectIn(prompt, iconId);
  g.owner = GetWindow(prompt, GW_OWNER);
  if (g.owner) g.ownerEnabled = IsWindowEnabled(g.owner) != 0;
  return g;
}

void LayoutAndOwner(HMODULE addin) {
  Group("the prompt grows with its message, keeps its controls apart and inside, and opens over the active window");
  kpx::win32::ServerLocks locks;
  kpx::win32::ComBridge bridge(locks);
  kpx::win32::Win32UserInterface ui(bridge, addin);
  HelpRecorder help;
  PromptOutcome outcome;

  std::string tenLines;
  for (int i = 1; i <= 10; ++i) tenLines += (i > 1 ? "\n" : "") + std::string("Line ") + std::to_string(i);
  std::string paragraph;
  for (int i = 0; i < 40; ++i) paragraph += "A long message wraps at the window's width. ";

  Geometry oneLine, ten, wrapped, bare;
  Show(ui, View("One line.", "Short", PromptIcon::Critical, false), help,
       [&](HWND p) { oneLine = GeometryOf(p, PromptIcon::Critical); Click(p, IDOK); }, &outcome);
  Show(ui, View(tenLines, "Ten lines", PromptIcon::Critical, false), help,
       [&](HWND p) { ten = GeometryOf(p, PromptIcon::Critical); Click(p, IDOK); }, &outcome);
  Show(ui, View(paragraph, "Wrapped", PromptIcon::Information, true), help,
       [&](HWND p) { wrapped = GeometryOf(p, PromptIcon::Information); Click(p, IDOK); }, &outcome);
  Show(ui, View(paragraph, "No icon", PromptIcon::None, true), help,
       [&](HWND p) { bare = GeometryOf(p, PromptIcon::None); Click(p, IDOK); }, &outcome);

  const int lineHeight = oneLine.message.bottom - oneLine.message.top;
  CHECK(lineHeight > 0);
  CHECK(ten.message.bottom - ten.message.top >= 10 * lineHeight);
  CHECK(wrapped.message.bottom - wrapped.message.top >= 5 * lineHeight);
  CHECK(ten.client.bottom > oneLine.client.bottom);
  // Short lines make a narrow message; a paragraph wraps at a wider one.
  CHECK(ten.message.right - ten.message.left < wrapped.message.right - wrapped.message.left);
  // The long paragraph wraps: the window stays within a screen's width.
  CHECK(wrapped.window.right - wrapped.window.left < GetSystemMetrics(SM_CXSCREEN));
  for (const Geometry* g : {&oneLine, &ten, &wrapped, &bare}) {
    for (const RECT& r : {g->message, g->check, g->ok, g->cancel, g->help}) CHECK(Inside(r, g->client));
    CHECK(g->message.bottom <= g->check.top);
    CHECK(g->check.bottom <= g->ok.top);
    CHECK(g->ok.top == g->cancel.top && g->cancel.top == g->help.top);
    CHECK(g->ok.right <= g->cancel.left && g->cancel.right <= g->help.left);
  }
  for (const Geometry* g : {&oneLine, &ten, &wrapped}) {
    CHECK(Inside(g->icon, g->client));
    CHECK(g->icon.right <= g->message.left);
  }
  // Without an icon the message takes the icon's place.
  CHECK(bare.message.left < wrapped.message.left);
  CHECK(oneLine.owner == nullptr);

  // The host's main window, active on this thread, owns the prompt and is
  // disabled while it is open.
  HWND owner = CreateWindowExW(0, L"Static", L"kpx-wintest: host window", WS_OVERLAPPEDWINDOW | WS_VISIBLE, 50, 40,
                               700, 500, nullptr, nullptr, GetModuleHandleW(nullptr), nullptr);
  SetActiveWindow(owner);
  CHECK(GetActiveWindow() == owner);
  Geometry owned;
  Show(ui, View("Owned.", "Owned", PromptIcon::Question, false), help,
       [&](HWND p) { owned = GeometryOf(p, PromptIcon::Question); Click(p, IDOK); }, &outcome);
  CHECK(owned.owner == owner);
  CHECK(!owned.ownerEnabled);
  CHECK(IsWindowEnabled(owner));
  RECT ownerRect;
  GetWindowRect(owner, &ownerRect);
  const POINT centre = {(owned.window.left + owned.window.right) / 2, (owned.window.top + owned.window.bottom) / 2};
  const POINT ownerCentre = {(ownerRect.left + ownerRect.right) / 2, (ownerRect.top + ownerRect.bottom) / 2};
  CHECK(std::abs(centre.x - ownerCentre.x) <= 2 && std::abs(centre.y - ownerCentre.y) <= 2);
  DestroyWindow(owner);
}

#if KPX_WINTEST_SCRIPTED_USER

// The real window for the prompt; help requests are kept rather than
// handed to WinHelpA, so that no help viewer starts.
class Screen final : public kpx::platform::UserInterface {
 public:
  struct HelpCall {
    int64_t window;
    std::string file;
    uint32_t command;
    uint64_t data;
  };
  Screen(kpx::win32::ComBridge& bridge, HMODULE addin) : real_(bridge, addin) {}
  PromptOutcome ShowPrompt(const PromptView& view, PromptHelp& help) override { return real_.ShowPrompt(view, help); }
  int MessageBox(std::string_view text, std::string_view title, uint32_t style) override {
    return real_.MessageBox(text, title, style);
  }
  bool WinHelp(int64_t window, std::string_view file, uint32_t command, uint64_t data) override {
    helps.push_back({window, std::string(file), command, data});
    return true;
  }
  void DoEvents() override { real_.DoEvents(); }
  kpx::ObjectPtr LoadIconPicture(int32_t resourceId, int32_t pixels) override {
    return real_.LoadIconPicture(resourceId, pixels);
  }
  void ShowRestoreDialog(kpx::platform::RestoreForm& form, const kpx::platform::HostPlacement& where) override {
    real_.ShowRestoreDialog(form, where);
  }
  kpx::platform::DependencyOutcome ShowDependencyDialog(const kpx::platform::DependencyView& view) override {
    return real_.ShowDependencyDialog(view);
  }
  std::vector<HelpCall> helps;

 private:
  kpx::win32::Win32UserInterface real_;
};

void ScriptedUserPlaysPrompts(HMODULE addin) {
  Group("kpx-comsim's scripted user reads the real prompt and plays the scenario's answers as the simulator does");
  kpx::win32::ServerLocks locks;
  kpx::win32::ComBridge bridge(locks);
  kpx::win32::Win32ObjectFactory objects(bridge);
  kpx::ResourceStrings resources(objects);

  struct Call {
    const char* message;
    const char* title;
    int32_t kind;
    int32_t helpContext;
    const char* helpFile;
  };
  const Call calls[] = {{"An information, without help.", "First", 64, 0, ""},
                        {"A critical one with a help topic.", "", 16, 7, "C:\\kpx\\kpx.hlp"},
                        {"Kind 48: no icon.", "Third", 48, 3, "C:\\kpx\\kpx.hlp"},
                        {"Nothing queued: OK.", "Fourth", 32, 0, ""}};
  using Answer = kpx::sim::SimUserInterface::PromptAnswer;
  // Help asked where it is disabled; Help, tick, OK; Cancel alone.
  const Answer answers[] = {{{true, true}, true}, {{false, true}, true}, {{true, false}, false}};

  kpx::sim::EventLog nativeLog, comLog;
  kpx::sim::SimUserInterface native(nativeLog), played(comLog);
  for (const Answer& a : answers) {
    native.QueuePromptAnswer(a);
    played.QueuePromptAnswer(a);
  }
  Screen screen(bridge, addin);
  std::vector<std::pair<bool, int16_t>> nativeResults, comResults;
  for (const Call& c : calls) {
    kpx::KpxPrompt prompt(native, resources);
    prompt.Initialize(c.message, c.title, c.kind, false, c.helpContext, c.helpFile, false);
    nativeResults.emplace_back(prompt.cancelled(), prompt.dontShowValue());
  }
  {
    ScriptedUser user(played);
    for (const Call& c : calls) {
      kpx::KpxPrompt prompt(screen, resources);
      prompt.Initialize(c.message, c.title, c.kind, false, c.helpContext, c.helpFile, false);
      comResults.emplace_back(prompt.cancelled(), prompt.dontShowValue());
    }
  }
  CHECK(nativeResults == comResults);
  const std::vector<std::string> want = EventsOf(nativeLog, "prompt"), got = EventsOf(comLog, "prompt");
  CHECK_EQ(want.size(), size_t{4});
  CHECK_EQ(got.size(), want.size());
  for (size_t i = 0; i < want.size() && i < got.size(); ++i) CHECK_EQ(got[i], want[i]);
  CHECK_EQ(comLog.events().size(), got.size());  // the played prompts log nothing else
  // Help, pressed on the real window, reached the add-in's WinHelp once,
  // with that window.
  CHECK_EQ(EventsOf(nativeLog, "help").size(), size_t{1});
  CHECK_EQ(screen.helps.size(), size_t{1});
  if (!screen.helps.empty()) {
    const Screen::HelpCall& h = screen.helps[0];
    CHECK(h.window != 0 && h.window != kpx::sim::SimUserInterface::kPromptWindow);
    CHECK_EQ(h.file, std::string("C:\\kpx\\kpx.hlp"));
    CHECK_EQ(h.command, 1u);
    CHECK_EQ(h.data, uint64_t{7});
  }
}

#endif

}  // namespace

#if KPX_WINTEST_SCRIPTED_USER
std::vector<std::string> EventsOf(const kpx::sim::EventLog& log, const char* kind) {
  std::vector<std::string> out;
  for (const kpx::sim::EventJson& ev : log.events())
    if (ev.at("ev") == kind) out.push_back(ev.dump());
  return out;
}
#endif

void PromptWindowTests(HMODULE addin) {
  TextsIconsAndHelp(addin);
  ButtonsAndBox(addin);
  LayoutAndOwner(addin);
#if KPX_WINTEST_SCRIPTED_USER
  ScriptedUserPlaysPrompts(addin);
#endif
}

}  // namespace wintest
