// The Restore dialog measures its header in the dialog's fonts, makes a
// bold one and draws the list's third check-box state, all of which need
// GDI; the rest of the platform layer keeps <windows.h> without it.
#undef NOGDI
#include <windows.h>
#include <commctrl.h>

#include "platform/win32/restore_window.h"

#include <algorithm>
#include <cmath>
#include <exception>
#include <string>
#include <vector>

#include "automation/automation_error.h"
#include "platform/win32/com_errors.h"
#include "platform/win32/restore_window_ids.h"
#include "platform/win32/win32_strings.h"

namespace kpx::win32 {

namespace {

using platform::ControlRect;
using platform::RestoreControl;
constexpr size_t kControls = size_t(RestoreControl::Count);
constexpr int kControlIds[kControls] = {KPX_RESTORE_LIST, IDOK, IDCANCEL, IDHELP};

// The list's check-box pictures: the control's own two and a third for a
// project only some of whose files are ticked.
constexpr int kUnticked = 1, kTicked = 2, kSomeTicked = 3;
// How far a file row stands in from its project's, pixels.
constexpr int kFileIndent = 10;

struct RestoreState {
  RestoreState(platform::RestoreForm& shown, const platform::HostPlacement& where) : form(shown), placement(where) {}
  platform::RestoreForm& form;
  platform::HostPlacement placement;
  HWND owner = nullptr;  // disabled while the dialog is open
  WNDPROC previous = nullptr;
  double twipsX = 15, twipsY = 15;  // per pixel, read from the screen when the window opens
  POINT minimum = {0, 0};           // tracking size, pixels
  ControlRect rects[kControls];     // where the form has its controls now, twips
  int bandHeight = 0;               // the header and instructions in the top of the list's place, pixels
  HFONT bold = nullptr;
  std::vector<int> shownChecks;  // picture shown per row
  std::string shownTitle, shownSubtitle;
  bool syncing = false;  // the window itself is changing the list: no notification goes to the form
  std::exception_ptr failure;  // what the form raised; passed on once the window is gone
};

RestoreState* StateOf(HWND dialog) { return reinterpret_cast<RestoreState*>(GetWindowLongPtrW(dialog, DWLP_USER)); }

int Pixels(double twips, double perPixel) { return static_cast<int>(std::lround(twips / perPixel)); }

HWND List(HWND dialog) { return GetDlgItem(dialog, KPX_RESTORE_LIST); }

int Picture(int32_t check) { return check == 1 ? kTicked : check == 3 ? kSomeTicked : kUnticked; }

// ------------------------------------------------------------------ layout

int LineHeight(HWND control, HFONT font) {
  HDC dc = GetDC(control);
  HGDIOBJ old = SelectObject(dc, font);
  TEXTMETRICW metrics = {};
  GetTextMetricsW(dc, &metrics);
  SelectObject(dc, old);
  ReleaseDC(control, dc);
  return metrics.tmHeight;
}

int WrappedHeight(HWND control, const std::wstring& text, int width) {
  HDC dc = GetDC(control);
  HGDIOBJ old = SelectObject(dc, reinterpret_cast<HFONT>(SendMessageW(control, WM_GETFONT, 0, 0)));
  RECT r = {0, 0, width, 0};
  const std::wstring measured = text.empty() ? std::wstring(L" ") : text;
  DrawTextW(dc, measured.c_str(), static_cast<int>(measured.size()), &r,
            DT_LEFT | DT_WORDBREAK | DT_NOPREFIX | DT_CALCRECT);
  SelectObject(dc, old);
  ReleaseDC(control, dc);
  return r.bottom - r.top;
}

void Place(HWND dialog, int id, int x, int y, int width, int height) {
  SetWindowPos(GetDlgItem(dialog, id), nullptr, x, y, width < 0 ? 0 : width, height < 0 ? 0 : height,
               SWP_NOZORDER | SWP_NOACTIVATE);
}

// The header (title, subtitle) and the instructions stand above the list,
// in the room the form leaves there, with the list's left margin above
// them where there is room for it; where the room is too small they take
// the top of the list's own place instead, as the list control's own header did. They never
// move: the list's place only ever grows to the right and down. The list
// itself fills the rest of its place.
void PlaceHeader(HWND dialog, RestoreState& state, const std::wstring& instructions) {
  const ControlRect& list = state.rects[size_t(RestoreControl::List)];
  const int x = Pixels(list.left, state.twipsX), listTop = Pixels(list.top, state.twipsY);
  const int width = Pixels(list.width, state.twipsX);
  HWND title = GetDlgItem(dialog, KPX_RESTORE_TITLE);
  HWND subtitle = GetDlgItem(dialog, KPX_RESTORE_SUBTITLE);
  const int titleHeight = LineHeight(title, state.bold);
  const int subtitleHeight = LineHeight(subtitle, reinterpret_cast<HFONT>(SendMessageW(subtitle, WM_GETFONT, 0, 0)));
  const int instructionsHeight = WrappedHeight(GetDlgItem(dialog, KPX_RESTORE_INSTRUCTIONS), instructions, width);
  const int gap = subtitleHeight / 2;
  const int band = titleHeight + 1 + subtitleHeight + gap + instructionsHeight + gap;
  const bool above = band <= listTop;
  const int y = above ? std::min(x, listTop - band) : listTop;
  Place(dialog, KPX_RESTORE_TITLE, x, y, width, titleHeight);
  Place(dialog, KPX_RESTORE_SUBTITLE, x, y + titleHeight + 1, width, subtitleHeight);
  Place(dialog, KPX_RESTORE_INSTRUCTIONS, x, y + titleHeight + 1 + subtitleHeight + gap, width, instructionsHeight);
  state.bandHeight = above ? 0 : band;
}

void PlaceControls(HWND dialog, const RestoreState& state) {
  for (size_t i = 0; i < kControls; ++i) {
    const ControlRect& r = state.rects[i];
    int x = Pixels(r.left, state.twipsX), y = Pixels(r.top, state.twipsY);
    int width = Pixels(r.width, state.twipsX), height = Pixels(r.height, state.twipsY);
    if (i == size_t(RestoreControl::List)) {
      y += state.bandHeight;
      height -= state.bandHeight;
    }
    Place(dialog, kControlIds[i], x, y, width, height);
  }
}

void Resize(HWND dialog, RestoreState& state, int clientWidth, int clientHeight) {
  state.form.Resize(clientWidth * state.twipsX, clientHeight * state.twipsY, state.rects);
  PlaceControls(dialog, state);
}

// Over the host's window (the work area when it gave none), inside the
// work area; the client area at the form's design size, never under the
// smallest size.
void PlaceWindow(HWND dialog, const RestoreState& state) {
  RECT frame = {0, 0, Pixels(state.form.designWidth(), state.twipsX), Pixels(state.form.designHeight(), state.twipsY)};
  AdjustWindowRectEx(&frame, static_cast<DWORD>(GetWindowLongW(dialog, GWL_STYLE)), FALSE,
                     static_cast<DWORD>(GetWindowLongW(dialog, GWL_EXSTYLE)));
  const int width = std::max<int>(frame.right - frame.left, state.minimum.x);
  const int height = std::max<int>(frame.bottom - frame.top, state.minimum.y);
  RECT area;
  SystemParametersInfoW(SPI_GETWORKAREA, 0, &area, 0);
  RECT over = area;
  const platform::HostPlacement& host = state.placement;
  if (host.width > 0 && host.height > 0)
    over = {host.left, host.top, host.left + host.width, host.top + host.height};
  int left = over.left + (over.right - over.left - width) / 2;
  int top = over.top + (over.bottom - over.top - height) / 2;
  left = std::max<int>(area.left, std::min<int>(left, area.right - width));
  top = std::max<int>(area.top, std::min<int>(top, area.bottom - height));
  SetWindowPos(dialog, nullptr, left, top, width, height, SWP_NOZORDER | SWP_NOACTIVATE);
}

// ------------------------------------------------------------------ list

void AddThirdCheckPicture(HWND list) {
  HIMAGELIST images = ListView_GetImageList(list, LVSIL_STATE);
  if (!images) return;
  int width = 0, height = 0;
  ImageList_GetIconSize(images, &width, &height);
  HDC screen = GetDC(nullptr);
  HDC dc = CreateCompatibleDC(screen);
  HBITMAP picture = CreateCompatibleBitmap(screen, width, height);
  HGDIOBJ old = SelectObject(dc, picture);
  RECT all = {0, 0, width, height};
  FillRect(dc, &all, GetSysColorBrush(COLOR_WINDOW));
  // Drawn as the system draws a three-state box in its third state.
  const int side = std::min(width, height) - 3;
  RECT box = {(width - side) / 2, (height - side) / 2, (width - side) / 2 + side, (height - side) / 2 + side};
  DrawFrameControl(dc, &box, DFC_BUTTON, DFCS_BUTTON3STATE | DFCS_CHECKED | DFCS_FLAT);
  SelectObject(dc, old);
  DeleteDC(dc);
  ReleaseDC(nullptr, screen);
  ImageList_Add(images, picture, nullptr);
  DeleteObject(picture);
}

void SetCell(HWND list, int row, int column, const std::string& text) {
  std::wstring wide = Utf8ToWide(text);
  LVITEMW item = {};
  item.iSubItem = column;
  item.pszText = wide.data();
  SendMessageW(list, LVM_SETITEMTEXTW, static_cast<WPARAM>(row), reinterpret_cast<LPARAM>(&item));
}

void SetPicture(HWND list, int row, int picture) {
  LVITEMW item = {};
  item.stateMask = LVIS_STATEIMAGEMASK;
  item.state = INDEXTOSTATEIMAGEMASK(picture);
  SendMessageW(list, LVM_SETITEMSTATE, static_cast<WPARAM>(row), reinterpret_cast<LPARAM>(&item));
}

// The columns and every row, in the form's order: a project, then its files
// indented under it. A file row shows its backup's date where its project
// row shows the project's name. Drawn once, when all are in.
void FillList(HWND dialog, RestoreState& state) {
  HWND list = List(dialog);
  ListView_SetExtendedListViewStyleEx(list, LVS_EX_CHECKBOXES | LVS_EX_FULLROWSELECT,
                                      LVS_EX_CHECKBOXES | LVS_EX_FULLROWSELECT);
  AddThirdCheckPicture(list);
  // Indentation is counted in widths of the small pictures. The rows have
  // none: a list of one-pixel pictures makes the count pixels, and leaves
  // the first column's room to the text (a file row's date is long).
  HIMAGELIST small = ImageList_Create(1, 1, ILC_COLOR32, 0, 1);
  ListView_SetImageList(list, small, LVSIL_SMALL);  // the list destroys it with itself

  const platform::RestoreForm::Texts& texts = state.form.texts();
  const std::vector<platform::RestoreRow>& rows = state.form.rows();
  // The form's widths; the first one wider where a file row's date (in the
  // system's own long format) would not fit in it.
  int dateWidth = 0;
  size_t measured = 0;
  for (const platform::RestoreRow& row : rows) {
    if (row.project || row.modified.size() <= measured) continue;
    measured = row.modified.size();
    const std::wstring date = Utf8ToWide(row.modified);
    dateWidth = std::max<int>(dateWidth, static_cast<int>(SendMessageW(list, LVM_GETSTRINGWIDTHW, 0,
                                                                          reinterpret_cast<LPARAM>(date.c_str()))));
  }
  if (dateWidth > 0) {
    int boxWidth = 0, boxHeight = 0;
    if (HIMAGELIST boxes = ListView_GetImageList(list, LVSIL_STATE)) ImageList_GetIconSize(boxes, &boxWidth, &boxHeight);
    dateWidth += boxWidth + kFileIndent + 2 * GetSystemMetrics(SM_CXEDGE) + 12;  // the cell's own margins
  }
  for (int c = 0; c < 3; ++c) {
    std::wstring header = Utf8ToWide(texts.columns[c]);
    LVCOLUMNW column = {};
    column.mask = LVCF_TEXT | LVCF_WIDTH | LVCF_SUBITEM;
    column.cx = Pixels(texts.columnTwips[c], state.twipsX);
    if (c == 0) column.cx = std::max<int>(column.cx, dateWidth);
    column.pszText = header.data();
    column.iSubItem = c;
    SendMessageW(list, LVM_INSERTCOLUMNW, static_cast<WPARAM>(c), reinterpret_cast<LPARAM>(&column));
  }

  SendMessageW(list, WM_SETREDRAW, FALSE, 0);
  ListView_SetItemCount(list, static_cast<int>(rows.size()));
  state.shownChecks.assign(rows.size(), 0);
  for (size_t i = 0; i < rows.size(); ++i) {
    const platform::RestoreRow& row = rows[i];
    const std::string& first = !row.project && !row.modified.empty() ? row.modified : row.cells[0];
    std::wstring text = Utf8ToWide(first);
    LVITEMW item = {};
    item.mask = LVIF_TEXT | LVIF_INDENT | LVIF_IMAGE;
    item.iItem = static_cast<int>(i);
    item.iImage = I_IMAGENONE;
    item.iIndent = row.project ? 0 : kFileIndent;
    item.pszText = text.data();
    const int at = static_cast<int>(SendMessageW(list, LVM_INSERTITEMW, 0, reinterpret_cast<LPARAM>(&item)));
    SetCell(list, at, 1, row.cells[1]);
    SetCell(list, at, 2, row.cells[2]);
    state.shownChecks[i] = Picture(row.check);
    SetPicture(list, at, state.shownChecks[i]);
  }
  SendMessageW(list, WM_SETREDRAW, TRUE, 0);
  InvalidateRect(list, nullptr, TRUE);
}

// Shows the form's state again after the form has had an action: the
// header, OK, every check that changed and the selected row.
void Sync(HWND dialog, RestoreState& state) {
  const platform::RestoreForm& form = state.form;
  if (form.headerTitle() != state.shownTitle) {
    state.shownTitle = form.headerTitle();
    SetDlgItemTextW(dialog, KPX_RESTORE_TITLE, Utf8ToWide(state.shownTitle).c_str());
  }
  if (form.headerSubtitle() != state.shownSubtitle) {
    state.shownSubtitle = form.headerSubtitle();
    SetDlgItemTextW(dialog, KPX_RESTORE_SUBTITLE, Utf8ToWide(state.shownSubtitle).c_str());
  }
  EnableWindow(GetDlgItem(dialog, IDOK), form.okEnabled());

  HWND list = List(dialog);
  const bool wasSyncing = state.syncing;
  state.syncing = true;
  const std::vector<platform::RestoreRow>& rows = form.rows();
  for (size_t i = 0; i < rows.size() && i < state.shownChecks.size(); ++i) {
    const int picture = Picture(rows[i].check);
    if (picture == state.shownChecks[i]) continue;
    state.shownChecks[i] = picture;
    SetPicture(list, static_cast<int>(i), picture);
  }
  const int selected = form.selectedRow();
  if (selected >= 0 && selected < static_cast<int>(rows.size()) &&
      ListView_GetNextItem(list, -1, LVNI_SELECTED) != selected) {
    ListView_SetItemState(list, selected, LVIS_SELECTED | LVIS_FOCUSED, LVIS_SELECTED | LVIS_FOCUSED);
    ListView_EnsureVisible(list, selected, FALSE);
  }
  state.syncing = wasSyncing;
}

// --------------------------------------------------------------- actions

void Close(HWND dialog, RestoreState& state, int button) {
  KillTimer(dialog, KPX_RESTORE_TIMER);
  // The owner takes input again before this window goes, so that it, not
  // another program's window, becomes the active one.
  if (state.owner) EnableWindow(state.owner, TRUE);
  if (state.previous) {
    SetWindowLongPtrA(dialog, GWLP_WNDPROC, reinterpret_cast<LONG_PTR>(state.previous));
    state.previous = nullptr;
  }
  EndDialog(dialog, button);
}

// Runs one action of the form and shows the state it leaves. Nothing may
// unwind through the dialog manager: what the form raises ends the dialog
// and goes on from ShowRestoreWindow.
template <class Action>
void Act(HWND dialog, RestoreState& state, Action action) {
  try {
    action();
    Sync(dialog, state);
  } catch (...) {
    state.failure = std::current_exception();
    Close(dialog, state, IDCANCEL);
  }
}

int RowAt(HWND list, POINT client) {
  LVHITTESTINFO hit = {};
  hit.pt = client;
  return ListView_SubItemHitTest(list, &hit) >= 0 && (hit.flags & LVHT_ONITEM) ? hit.iItem : -1;
}

bool IsRow(const RestoreState& state, int row) {
  return row >= 0 && row < static_cast<int>(state.form.rows().size());
}

void StartTimerIf(HWND dialog, bool start) {
  if (start) SetTimer(dialog, KPX_RESTORE_TIMER, 1000, nullptr);
}

// The file row's context menu, with the one command the form named, at the
// mouse (or under the row, from the keyboard); the command chosen compares
// the file with its backup.
void ContextMenu(HWND dialog, RestoreState& state, int row, const std::string& caption, bool keyboard) {
  HMENU menu = CreatePopupMenu();
  AppendMenuW(menu, MF_STRING, KPX_RESTORE_COMPARE, Utf8ToWide(caption).c_str());
  POINT at;
  GetCursorPos(&at);
  RECT cell = {};
  cell.top = 1;
  cell.left = LVIR_LABEL;
  if (keyboard && SendMessageW(List(dialog), LVM_GETSUBITEMRECT, static_cast<WPARAM>(row), reinterpret_cast<LPARAM>(&cell))) {
    at = {cell.left, cell.bottom};
    ClientToScreen(List(dialog), &at);
  }
  const UINT chosen = static_cast<UINT>(
      TrackPopupMenu(menu, TPM_RETURNCMD | TPM_RIGHTBUTTON | TPM_NONOTIFY, at.x, at.y, 0, dialog, nullptr));
  DestroyMenu(menu);
  if (chosen == KPX_RESTORE_COMPARE) Act(dialog, state, [&] { state.form.Compare(row); });
}

void OnItemChanged(HWND dialog, RestoreState& state, const NMLISTVIEW& change) {
  if (state.syncing || !(change.uChanged & LVIF_STATE) || !IsRow(state, change.iItem)) return;
  const int row = change.iItem;
  const UINT before = (change.uOldState & LVIS_STATEIMAGEMASK) >> 12;
  const UINT after = (change.uNewState & LVIS_STATEIMAGEMASK) >> 12;
  if (after != 0 && after != before) {
    // The list only knows two pictures: a click on the third (some files
    // ticked) ticks them all, as a tick on the project does.
    const bool ticked = after == kTicked || before == kSomeTicked;
    state.shownChecks[static_cast<size_t>(row)] = static_cast<int>(after);
    Act(dialog, state, [&] { state.form.SetCheck(row, ticked); });
  }
  if ((change.uNewState & LVIS_SELECTED) && !(change.uOldState & LVIS_SELECTED))
    Act(dialog, state, [&] { state.form.Select(row); });
}

// A click on `row`, left or right; `keyboard`: the menu key (or Shift+F10)
// on the selected row, which stands for a right click.
void OnClick(HWND dialog, RestoreState& state, int row, bool right, bool keyboard = false) {
  if (!IsRow(state, row)) return;
  const bool project = state.form.rows()[static_cast<size_t>(row)].project;
  // A left click counts on a project row, a right click opens a file row's menu.
  if (project == right) return;
  std::string caption;
  bool startTimer = false;
  Act(dialog, state, [&] { caption = state.form.Click(row, startTimer); });
  if (!state.failure) StartTimerIf(dialog, startTimer);
  if (right && !state.failure && !caption.empty()) ContextMenu(dialog, state, row, caption, keyboard);
}

void OnCommand(HWND dialog, RestoreState& state, int id) {
  switch (id) {
    case IDOK:
      // Enter reaches here also while OK is disabled.
      if (!IsWindowEnabled(GetDlgItem(dialog, IDOK))) return;
      Act(dialog, state, [&] { state.form.Ok(); });
      if (!state.failure) Close(dialog, state, IDOK);
      return;
    case IDCANCEL:  // also Esc and the close box
      Act(dialog, state, [&] { state.form.Cancel(); });
      if (!state.failure) Close(dialog, state, IDCANCEL);
      return;
    case IDHELP:
      Act(dialog, state, [&] { state.form.Help(reinterpret_cast<int64_t>(dialog)); });
      return;
  }
}

// The smallest size comes before everything else the window does with its
// size. The window procedure that answers it is installed over the dialog's
// own for the window's life and put back when it closes.
LRESULT CALLBACK MinimumSizeProc(HWND dialog, UINT message, WPARAM wParam, LPARAM lParam) {
  RestoreState* state = StateOf(dialog);
  if (!state || !state->previous) return DefWindowProcA(dialog, message, wParam, lParam);
  WNDPROC previous = state->previous;
  if (message == WM_GETMINMAXINFO) {
    reinterpret_cast<MINMAXINFO*>(lParam)->ptMinTrackSize = state->minimum;
    return 0;
  }
  if (message == WM_NCDESTROY) {
    SetWindowLongPtrA(dialog, GWLP_WNDPROC, reinterpret_cast<LONG_PTR>(previous));
    state->previous = nullptr;
  }
  return CallWindowProcA(previous, dialog, message, wParam, lParam);
}

void Initialize(HWND dialog, RestoreState& state) {
  SetWindowLongPtrW(dialog, DWLP_USER, reinterpret_cast<LONG_PTR>(&state));
  platform::RestoreForm& form = state.form;
  HWND owner = reinterpret_cast<HWND>(static_cast<intptr_t>(state.placement.ownerWindow));
  if (owner && IsWindow(owner)) {
    // The host's main window owns the dialog and takes no input while it
    // is open, as for any modal window of the host.
    SetWindowLongPtrA(dialog, GWLP_HWNDPARENT, reinterpret_cast<LONG_PTR>(owner));
    if (IsWindowEnabled(owner)) {
      state.owner = owner;
      EnableWindow(owner, FALSE);
    }
  }

  HDC screen = GetDC(nullptr);
  state.twipsX = 1440.0 / GetDeviceCaps(screen, LOGPIXELSX);
  state.twipsY = 1440.0 / GetDeviceCaps(screen, LOGPIXELSY);
  ReleaseDC(nullptr, screen);
  state.minimum = {Pixels(form.minimumWidth(), state.twipsX), Pixels(form.minimumHeight(), state.twipsY)};

  const platform::RestoreForm::Texts& texts = form.texts();
  const std::wstring instructions = Utf8ToWide(texts.instructions);
  SetWindowTextW(dialog, Utf8ToWide(texts.caption).c_str());
  SetDlgItemTextW(dialog, KPX_RESTORE_INSTRUCTIONS, instructions.c_str());
  SetDlgItemTextW(dialog, IDOK, Utf8ToWide(texts.ok).c_str());
  SetDlgItemTextW(dialog, IDCANCEL, Utf8ToWide(texts.cancel).c_str());
  SetDlgItemTextW(dialog, IDHELP, Utf8ToWide(texts.help).c_str());
  LOGFONTW font = {};
  GetObjectW(reinterpret_cast<HFONT>(SendMessageW(dialog, WM_GETFONT, 0, 0)), sizeof font, &font);
  font.lfWeight = FW_BOLD;
  state.bold = CreateFontIndirectW(&font);
  SendDlgItemMessageW(dialog, KPX_RESTORE_TITLE, WM_SETFONT, reinterpret_cast<WPARAM>(state.bold), FALSE);

  for (size_t i = 0; i < kControls; ++i) state.rects[i] = form.DesignRect(RestoreControl(i));
  PlaceHeader(dialog, state, instructions);
  state.syncing = true;
  FillList(dialog, state);
  Sync(dialog, state);
  state.syncing = false;

  state.previous = reinterpret_cast<WNDPROC>(
      SetWindowLongPtrA(dialog, GWLP_WNDPROC, reinterpret_cast<LONG_PTR>(MinimumSizeProc)));
  PlaceWindow(dialog, state);
  RECT client;
  GetClientRect(dialog, &client);
  Resize(dialog, state, client.right, client.bottom);
}

INT_PTR CALLBACK RestoreProc(HWND dialog, UINT message, WPARAM wParam, LPARAM lParam) {
  if (message == WM_INITDIALOG) {
    auto* state = reinterpret_cast<RestoreState*>(lParam);
    try {
      Initialize(dialog, *state);
    } catch (...) {
      state->failure = std::current_exception();
      Close(dialog, *state, IDCANCEL);
      return TRUE;
    }
    SetFocus(List(dialog));
    return FALSE;  // the focus set here: the list
  }
  RestoreState* state = StateOf(dialog);
  if (!state) return FALSE;
  switch (message) {
    case WM_SIZE:
      if (wParam != SIZE_MINIMIZED) {
        try {
          Resize(dialog, *state, LOWORD(lParam), HIWORD(lParam));
        } catch (...) {
          state->failure = std::current_exception();
          Close(dialog, *state, IDCANCEL);
        }
      }
      return TRUE;
    case WM_NOTIFY: {
      const NMHDR& header = *reinterpret_cast<const NMHDR*>(lParam);
      if (header.idFrom != KPX_RESTORE_LIST) return FALSE;
      switch (header.code) {
        case LVN_ITEMCHANGED:
          OnItemChanged(dialog, *state, *reinterpret_cast<const NMLISTVIEW*>(lParam));
          break;
        case NM_CLICK:
        case NM_RCLICK:
          OnClick(dialog, *state, RowAt(List(dialog), reinterpret_cast<const NMITEMACTIVATE*>(lParam)->ptAction),
                  header.code == NM_RCLICK);
          break;
      }
      return FALSE;
    }
    case WM_TIMER:
      if (wParam != KPX_RESTORE_TIMER) return FALSE;
      KillTimer(dialog, KPX_RESTORE_TIMER);
      Act(dialog, *state, [&] { state->form.Timer(); });
      return TRUE;
    case WM_COMMAND:
      if (HIWORD(wParam) != BN_CLICKED) return FALSE;
      OnCommand(dialog, *state, LOWORD(wParam));
      return TRUE;
    case WM_HELP:
      OnCommand(dialog, *state, IDHELP);
      return TRUE;
    case WM_CONTEXTMENU:
      // From the mouse the list's right click has done it all already.
      if (reinterpret_cast<HWND>(wParam) != List(dialog) || lParam != -1) return FALSE;
      OnClick(dialog, *state, ListView_GetNextItem(List(dialog), -1, LVNI_SELECTED), true, true);
      return TRUE;
  }
  return FALSE;
}

}  // namespace

void ShowRestoreWindow(HINSTANCE resources, platform::RestoreForm& form, const platform::HostPlacement& placement) {
  if (!resources) throw AutomationError(vberr::kInternal, "the Restore dialog has no module to take its template from");
  INITCOMMONCONTROLSEX controls = {sizeof controls, ICC_LISTVIEW_CLASSES};
  InitCommonControlsEx(&controls);
  RestoreState state(form, placement);
  const INT_PTR rc = DialogBoxParamW(resources, MAKEINTRESOURCEW(KPX_RESTORE_DIALOG), nullptr, RestoreProc,
                                     reinterpret_cast<LPARAM>(&state));
  const DWORD error = GetLastError();
  if (state.owner) EnableWindow(state.owner, TRUE);
  if (state.bold) DeleteObject(state.bold);
  if (state.failure) std::rethrow_exception(state.failure);
  if (rc != IDOK && rc != IDCANCEL)
    throw AutomationError(vberr::kInternal,
                          "the Restore dialog could not be shown: " + SystemErrorText(HRESULT_FROM_WIN32(error)));
}

}  // namespace kpx::win32
