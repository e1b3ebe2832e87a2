// The prompt measures its message in the dialog's own font, which needs
// GDI; the rest of the platform layer keeps <windows.h> without it.
#undef NOGDI
#include <windows.h>

#include "platform/win32/prompt_window.h"

#include <algorithm>
#include <exception>
#include <string>

#include "automation/automation_error.h"
#include "platform/win32/com_errors.h"
#include "platform/win32/prompt_window_ids.h"
#include "platform/win32/win32_strings.h"

namespace kpx::win32 {

namespace {

// Layout, in dialog units of the template's font.
constexpr int kMargin = 8;         // around the content
constexpr int kIconGap = 8;        // icon to message
constexpr int kBlockGap = 9;       // message to check box, check box to buttons
constexpr int kButtonGap = 4;      // between buttons
constexpr int kMaxTextWidth = 250; // where the message wraps
constexpr int kCheckGlyph = 14;    // the check box's box and its gap to the caption

struct PromptState {
  const platform::PromptView& view;
  platform::PromptHelp& help;
  platform::PromptOutcome outcome;
  std::exception_ptr failure;  // what Help raised; passed on once the window is gone
};

int IconControl(platform::PromptIcon icon) {
  switch (icon) {
    case platform::PromptIcon::Critical:
      return KPX_PROMPT_ICON_CRITICAL;
    case platform::PromptIcon::Question:
      return KPX_PROMPT_ICON_QUESTION;
    case platform::PromptIcon::Information:
      return KPX_PROMPT_ICON_INFORMATION;
    case platform::PromptIcon::None:
      break;
  }
  return 0;
}

const wchar_t* SystemIcon(int control) {
  switch (control) {
    case KPX_PROMPT_ICON_CRITICAL:
      return IDI_HAND;
    case KPX_PROMPT_ICON_QUESTION:
      return IDI_QUESTION;
    default:
      return IDI_ASTERISK;
  }
}

SIZE Dlu(HWND dialog, int x, int y) {
  RECT r = {0, 0, x, y};
  MapDialogRect(dialog, &r);
  return {r.right, r.bottom};
}

// The text's extent in the control's font: broken only at its own line
// breaks when `width` is 0 (as wide as its widest line), else also wrapped
// at `width` as the static control wraps it.
SIZE Measure(HWND control, const std::wstring& text, int width, UINT flags) {
  HDC dc = GetDC(control);
  HGDIOBJ old = SelectObject(dc, reinterpret_cast<HFONT>(SendMessageW(control, WM_GETFONT, 0, 0)));
  RECT r = {0, 0, width, 0};
  const UINT wrap = width > 0 ? DT_WORDBREAK : 0;
  // An empty text measures as one empty line.
  const std::wstring measured = text.empty() ? std::wstring(L" ") : text;
  DrawTextW(dc, measured.c_str(), static_cast<int>(measured.size()), &r, flags | wrap | DT_CALCRECT);
  SelectObject(dc, old);
  ReleaseDC(control, dc);
  return {r.right - r.left, r.bottom - r.top};
}

void Place(HWND dialog, int id, int x, int y, int width, int height) {
  SetWindowPos(GetDlgItem(dialog, id), nullptr, x, y, width, height, SWP_NOZORDER | SWP_NOACTIVATE);
}

// Message beside the icon, wrapped at a readable width and no wider than it
// needs; the check box under it; the buttons in a row at the bottom right.
// The window takes the size of what it holds and opens over its owner.
void Layout(HWND dialog, const std::wstring& message, const std::wstring& dontShow, bool icon) {
  const SIZE margin = Dlu(dialog, kMargin, kMargin);
  const SIZE gap = Dlu(dialog, kIconGap, kBlockGap);
  const SIZE button = Dlu(dialog, 50, 14);
  const int buttonGap = static_cast<int>(Dlu(dialog, kButtonGap, 0).cx);
  const int maxText = static_cast<int>(Dlu(dialog, kMaxTextWidth, 0).cx);
  const int iconWidth = GetSystemMetrics(SM_CXICON);
  const int iconHeight = GetSystemMetrics(SM_CYICON);

  const int textLeft = icon ? margin.cx + iconWidth + gap.cx : margin.cx;
  HWND text = GetDlgItem(dialog, KPX_PROMPT_MESSAGE);
  const UINT textFlags = DT_LEFT | DT_EXPANDTABS | DT_NOPREFIX;
  // One pixel to spare, so that the control does not wrap a line that the
  // measure found to fit exactly.
  const int textWidth = std::min<int>(Measure(text, message, 0, textFlags).cx + 1, maxText);
  const int textHeight = static_cast<int>(Measure(text, message, textWidth, textFlags).cy);
  int contentTop = margin.cy, textTop = margin.cy, contentBottom = margin.cy + textHeight;
  if (icon && textHeight < iconHeight) {
    textTop = contentTop + (iconHeight - textHeight) / 2;
    contentBottom = contentTop + iconHeight;
  }

  HWND check = GetDlgItem(dialog, KPX_PROMPT_DONT_SHOW);
  const SIZE checkText = Measure(check, dontShow, 0, DT_LEFT);
  const int checkWidth = static_cast<int>(checkText.cx + Dlu(dialog, kCheckGlyph, 0).cx);
  const int checkHeight = std::max<int>(checkText.cy, Dlu(dialog, 0, 10).cy);
  const int checkTop = contentBottom + gap.cy;

  const int rowWidth = 3 * button.cx + 2 * buttonGap;
  const int clientWidth =
      std::max({textLeft + textWidth + margin.cx, textLeft + checkWidth + margin.cx, rowWidth + 2 * margin.cx});
  const int buttonTop = checkTop + checkHeight + gap.cy;
  const int clientHeight = buttonTop + button.cy + margin.cy;

  for (int id : {KPX_PROMPT_ICON_CRITICAL, KPX_PROMPT_ICON_QUESTION, KPX_PROMPT_ICON_INFORMATION})
    Place(dialog, id, margin.cx, contentTop, iconWidth, iconHeight);
  Place(dialog, KPX_PROMPT_MESSAGE, textLeft, textTop, textWidth, textHeight);
  Place(dialog, KPX_PROMPT_DONT_SHOW, textLeft, checkTop, clientWidth - textLeft - margin.cx, checkHeight);
  int x = clientWidth - margin.cx - rowWidth;
  for (int id : {IDOK, IDCANCEL, IDHELP}) {
    Place(dialog, id, x, buttonTop, button.cx, button.cy);
    x += button.cx + buttonGap;
  }

  RECT frame = {0, 0, clientWidth, clientHeight};
  AdjustWindowRectEx(&frame, static_cast<DWORD>(GetWindowLongW(dialog, GWL_STYLE)), FALSE,
                     static_cast<DWORD>(GetWindowLongW(dialog, GWL_EXSTYLE)));
  const int width = frame.right - frame.left, height = frame.bottom - frame.top;

  RECT area;
  SystemParametersInfoW(SPI_GETWORKAREA, 0, &area, 0);
  RECT over = area;
  HWND owner = GetWindow(dialog, GW_OWNER);
  if (owner && IsWindowVisible(owner) && !IsIconic(owner)) GetWindowRect(owner, &over);
  int left = over.left + (over.right - over.left - width) / 2;
  int top = over.top + (over.bottom - over.top - height) / 2;
  left = std::max<int>(area.left, std::min<int>(left, area.right - width));
  top = std::max<int>(area.top, std::min<int>(top, area.bottom - height));
  SetWindowPos(dialog, nullptr, left, top, width, height, SWP_NOZORDER | SWP_NOACTIVATE);
}

void Fill(HWND dialog, const platform::PromptView& view) {
  SetWindowTextW(dialog, Utf8ToWide(view.title).c_str());
  const std::wstring message = Utf8ToWide(view.message);
  const std::wstring dontShow = Utf8ToWide(view.dontShowCaption);
  SetDlgItemTextW(dialog, KPX_PROMPT_MESSAGE, message.c_str());
  SetDlgItemTextW(dialog, IDOK, Utf8ToWide(view.okCaption).c_str());
  SetDlgItemTextW(dialog, IDCANCEL, Utf8ToWide(view.cancelCaption).c_str());
  SetDlgItemTextW(dialog, IDHELP, Utf8ToWide(view.helpCaption).c_str());
  SetDlgItemTextW(dialog, KPX_PROMPT_DONT_SHOW, dontShow.c_str());
  EnableWindow(GetDlgItem(dialog, IDHELP), view.helpAvailable);

  const int shown = IconControl(view.icon);
  for (int id : {KPX_PROMPT_ICON_CRITICAL, KPX_PROMPT_ICON_QUESTION, KPX_PROMPT_ICON_INFORMATION}) {
    HWND control = GetDlgItem(dialog, id);
    if (id == shown) SendMessageW(control, STM_SETICON, reinterpret_cast<WPARAM>(LoadIconW(nullptr, SystemIcon(id))), 0);
    ShowWindow(control, id == shown ? SW_SHOW : SW_HIDE);
  }
  Layout(dialog, message, dontShow, shown != 0);
}

void Close(HWND dialog, PromptState& state, int button) {
  state.outcome.cancelled = button != IDOK;
  state.outcome.dontShow = IsDlgButtonChecked(dialog, KPX_PROMPT_DONT_SHOW) == BST_CHECKED;
  EndDialog(dialog, button);
}

// Help, from its button or F1. A disabled button does nothing, however it
// is pressed. The window stays open.
void Help(HWND dialog, PromptState& state) {
  if (!IsWindowEnabled(GetDlgItem(dialog, IDHELP))) return;
  try {
    state.help.ShowHelp(reinterpret_cast<int64_t>(dialog));
  } catch (...) {
    // Nothing may unwind through the dialog manager: the failure ends the
    // prompt and goes on from ShowPromptWindow.
    state.failure = std::current_exception();
    Close(dialog, state, IDCANCEL);
  }
}

INT_PTR CALLBACK PromptProc(HWND dialog, UINT message, WPARAM wParam, LPARAM lParam) {
  if (message == WM_INITDIALOG) {
    SetWindowLongPtrW(dialog, DWLP_USER, lParam);
    Fill(dialog, reinterpret_cast<PromptState*>(lParam)->view);
    return TRUE;  // the focus on OK, the first stop
  }
  auto* state = reinterpret_cast<PromptState*>(GetWindowLongPtrW(dialog, DWLP_USER));
  if (!state) return FALSE;
  switch (message) {
    case WM_COMMAND:
      switch (LOWORD(wParam)) {
        case IDOK:
        case IDCANCEL:  // also Esc and the close box
          Close(dialog, *state, LOWORD(wParam));
          return TRUE;
        case IDHELP:
          Help(dialog, *state);
          return TRUE;
      }
      return FALSE;
    case WM_HELP:
      Help(dialog, *state);
      return TRUE;
  }
  return FALSE;
}

}  // namespace

platform::PromptOutcome ShowPromptWindow(HINSTANCE resources, HWND owner, const platform::PromptView& view,
                                         platform::PromptHelp& help) {
  if (!resources) throw AutomationError(vberr::kInternal, "the prompt window has no module to take its template from");
  PromptState state{view, help, {}, nullptr};
  const INT_PTR rc = DialogBoxParamW(resources, MAKEINTRESOURCEW(KPX_PROMPT_DIALOG), owner, PromptProc,
                                     reinterpret_cast<LPARAM>(&state));
  if (rc != IDOK && rc != IDCANCEL)
    throw AutomationError(vberr::kInternal,
                          "the prompt window could not be shown: " + SystemErrorText(HRESULT_FROM_WIN32(GetLastError())));
  if (state.failure) std::rethrow_exception(state.failure);
  return state.outcome;
}

}  // namespace kpx::win32
