#include "platform/win32/dependency_window.h"

#include <algorithm>
#include <string>

#include "automation/automation_error.h"
#include "platform/win32/com_errors.h"
#include "platform/win32/dependency_window_ids.h"
#include "platform/win32/win32_strings.h"

namespace kpx::win32 {

namespace {

struct DependencyState {
  const platform::DependencyView& view;
  platform::DependencyOutcome outcome;
  bool filled = false;  // the text the window opened with is in: edits count from here
};

std::wstring TextOf(HWND control) {
  const int n = GetWindowTextLengthW(control);
  std::wstring text(static_cast<size_t>(n) + 1, L'\0');
  text.resize(static_cast<size_t>(GetWindowTextW(control, text.data(), n + 1)));
  return text;
}

// Centred over its owner (the work area when it has none), inside the
// work area.
void PlaceOverOwner(HWND dialog) {
  RECT window, area;
  GetWindowRect(dialog, &window);
  SystemParametersInfoW(SPI_GETWORKAREA, 0, &area, 0);
  RECT over = area;
  HWND owner = GetWindow(dialog, GW_OWNER);
  if (owner && IsWindowVisible(owner) && !IsIconic(owner)) GetWindowRect(owner, &over);
  const int width = window.right - window.left, height = window.bottom - window.top;
  int left = over.left + (over.right - over.left - width) / 2;
  int top = over.top + (over.bottom - over.top - height) / 2;
  left = std::max<int>(area.left, std::min<int>(left, area.right - width));
  top = std::max<int>(area.top, std::min<int>(top, area.bottom - height));
  SetWindowPos(dialog, nullptr, left, top, 0, 0, SWP_NOZORDER | SWP_NOSIZE | SWP_NOACTIVATE);
}

// Sets the focus itself; false for the dialog manager.
BOOL Fill(HWND dialog, DependencyState& state) {
  const platform::DependencyView& view = state.view;
  SetWindowTextW(dialog, Utf8ToWide(view.caption).c_str());
  SetDlgItemTextW(dialog, KPX_DEPENDENCY_LABEL, Utf8ToWide(view.label).c_str());
  SetDlgItemTextW(dialog, KPX_DEPENDENCY_TEXT, Utf8ToWide(view.text).c_str());
  SetDlgItemTextW(dialog, IDOK, Utf8ToWide(view.ok).c_str());
  SetDlgItemTextW(dialog, IDCANCEL, Utf8ToWide(view.cancel).c_str());
  state.filled = true;
  HWND text = GetDlgItem(dialog, KPX_DEPENDENCY_TEXT);
  if (view.readOnly) {
    // Only to read: the text can be selected and copied, not changed; Enter
    // closes as Cancel does.
    SendMessageW(text, EM_SETREADONLY, TRUE, 0);
    EnableWindow(GetDlgItem(dialog, IDOK), FALSE);
    SendDlgItemMessageW(dialog, IDOK, BM_SETSTYLE, BS_PUSHBUTTON, TRUE);
    SendDlgItemMessageW(dialog, IDCANCEL, BM_SETSTYLE, BS_DEFPUSHBUTTON, TRUE);
    SendMessageW(dialog, DM_SETDEFID, IDCANCEL, 0);
    SetFocus(GetDlgItem(dialog, IDCANCEL));
  } else {
    SetFocus(text);
    SendMessageW(text, EM_SETSEL, 0, -1);
  }
  PlaceOverOwner(dialog);
  return FALSE;
}

INT_PTR CALLBACK DependencyProc(HWND dialog, UINT message, WPARAM wParam, LPARAM lParam) {
  if (message == WM_INITDIALOG) {
    SetWindowLongPtrW(dialog, DWLP_USER, lParam);
    return Fill(dialog, *reinterpret_cast<DependencyState*>(lParam));
  }
  auto* state = reinterpret_cast<DependencyState*>(GetWindowLongPtrW(dialog, DWLP_USER));
  if (!state || message != WM_COMMAND) return FALSE;
  switch (LOWORD(wParam)) {
    case KPX_DEPENDENCY_TEXT:
      if (HIWORD(wParam) == EN_CHANGE && state->filled) state->outcome.changed = true;
      return TRUE;
    case IDOK:
      // Enter reaches here also while OK is disabled.
      if (!IsWindowEnabled(GetDlgItem(dialog, IDOK))) return TRUE;
      state->outcome.ok = true;
      state->outcome.text = WideToUtf8(TextOf(GetDlgItem(dialog, KPX_DEPENDENCY_TEXT)));
      EndDialog(dialog, IDOK);
      return TRUE;
    case IDCANCEL:  // also Esc and the close box
      state->outcome.ok = false;
      state->outcome.text = WideToUtf8(TextOf(GetDlgItem(dialog, KPX_DEPENDENCY_TEXT)));
      EndDialog(dialog, IDCANCEL);
      return TRUE;
  }
  return FALSE;
}

}  // namespace

platform::DependencyOutcome ShowDependencyWindow(HINSTANCE resources, HWND owner, const platform::DependencyView& view) {
  if (!resources)
    throw AutomationError(vberr::kInternal, "the module dependency dialog has no module to take its template from");
  DependencyState state{view, {}};
  const INT_PTR rc = DialogBoxParamW(resources, MAKEINTRESOURCEW(KPX_DEPENDENCY_DIALOG), owner, DependencyProc,
                                     reinterpret_cast<LPARAM>(&state));
  if (rc != IDOK && rc != IDCANCEL)
    throw AutomationError(vberr::kInternal, "the module dependency dialog could not be shown: " +
                                                SystemErrorText(HRESULT_FROM_WIN32(GetLastError())));
  return state.outcome;
}

}  // namespace kpx::win32
