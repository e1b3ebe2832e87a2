#include "restore_reader.h"

#include <commctrl.h>

#include "platform/win32/dependency_window_ids.h"
#include "platform/win32/restore_window_ids.h"
#include "platform/win32/win32_strings.h"
#include "prompt_reader.h"

namespace wintest {

namespace {

HWND List(HWND dialog) { return GetDlgItem(dialog, KPX_RESTORE_LIST); }

std::string Cell(HWND list, int row, int column) {
  wchar_t buffer[1024] = {};
  LVITEMW item = {};
  item.iSubItem = column;
  item.pszText = buffer;
  item.cchTextMax = 1024;
  SendMessageW(list, LVM_GETITEMTEXTW, static_cast<WPARAM>(row), reinterpret_cast<LPARAM>(&item));
  return kpx::win32::WideToUtf8(buffer);
}

bool IsPopupMenu(HWND window) {
  wchar_t name[16] = {};
  GetClassNameW(window, name, 16);
  return std::wstring(name) == L"#32768";
}

}  // namespace

bool IsRestoreWindow(HWND window) {
  return IsDialogWith(window, {KPX_RESTORE_TITLE, KPX_RESTORE_SUBTITLE, KPX_RESTORE_INSTRUCTIONS, KPX_RESTORE_LIST,
                               IDOK, IDCANCEL, IDHELP});
}

bool IsDependencyWindow(HWND window) {
  return IsDialogWith(window, {KPX_DEPENDENCY_LABEL, KPX_DEPENDENCY_TEXT, IDOK, IDCANCEL});
}

std::vector<HWND> ShownRestoreWindows() { return ShownWindows(IsRestoreWindow); }
std::vector<HWND> ShownDependencyWindows() { return ShownWindows(IsDependencyWindow); }

std::vector<int> ReadChecks(HWND dialog) {
  HWND list = List(dialog);
  const int n = static_cast<int>(SendMessageW(list, LVM_GETITEMCOUNT, 0, 0));
  std::vector<int> checks(static_cast<size_t>(n));
  for (int i = 0; i < n; ++i)
    checks[static_cast<size_t>(i)] =
        static_cast<int>((SendMessageW(list, LVM_GETITEMSTATE, static_cast<WPARAM>(i), LVIS_STATEIMAGEMASK) >> 12) & 15);
  return checks;
}

RestoreSeen ReadRestore(HWND dialog) {
  RestoreSeen seen;
  seen.caption = WindowText(dialog);
  seen.title = WindowText(GetDlgItem(dialog, KPX_RESTORE_TITLE));
  seen.subtitle = WindowText(GetDlgItem(dialog, KPX_RESTORE_SUBTITLE));
  seen.instructions = WindowText(GetDlgItem(dialog, KPX_RESTORE_INSTRUCTIONS));
  seen.ok = WindowText(GetDlgItem(dialog, IDOK));
  seen.cancel = WindowText(GetDlgItem(dialog, IDCANCEL));
  seen.help = WindowText(GetDlgItem(dialog, IDHELP));
  seen.okEnabled = IsWindowEnabled(GetDlgItem(dialog, IDOK)) != 0;
  HWND list = List(dialog);
  for (int c = 0; c < 3; ++c) {
    wchar_t buffer[256] = {};
    LVCOLUMNW column = {};
    column.mask = LVCF_TEXT | LVCF_WIDTH;
    column.pszText = buffer;
    column.cchTextMax = 256;
    if (SendMessageW(list, LVM_GETCOLUMNW, static_cast<WPARAM>(c), reinterpret_cast<LPARAM>(&column))) {
      seen.columns[c] = kpx::win32::WideToUtf8(buffer);
      seen.columnWidths[c] = column.cx;
    }
  }
  const std::vector<int> checks = ReadChecks(dialog);
  seen.rows.resize(checks.size());
  for (size_t i = 0; i < checks.size(); ++i) {
    RestoreRowSeen& row = seen.rows[i];
    const int at = static_cast<int>(i);
    for (int c = 0; c < 3; ++c) row.cells[c] = Cell(list, at, c);
    LVITEMW item = {};
    item.mask = LVIF_INDENT;
    item.iItem = at;
    SendMessageW(list, LVM_GETITEMW, 0, reinterpret_cast<LPARAM>(&item));
    row.indent = item.iIndent;
    row.check = checks[i];
    row.selected = SendMessageW(list, LVM_GETITEMSTATE, i, LVIS_SELECTED) != 0;
  }
  return seen;
}

int FindRestoreRow(const RestoreSeen& seen, const std::string& name) {
  for (size_t i = 0; i < seen.rows.size(); ++i) {
    const RestoreRowSeen& row = seen.rows[i];
    const bool project = row.indent == 0;
    if (project ? row.cells[0] == name : row.cells[2] + "\\" + row.cells[1] == name) return static_cast<int>(i);
  }
  return -1;
}

void TickRow(HWND dialog, int row, bool ticked) {
  LVITEMW item = {};
  item.stateMask = LVIS_STATEIMAGEMASK;
  item.state = INDEXTOSTATEIMAGEMASK(ticked ? 2 : 1);
  SendMessageW(List(dialog), LVM_SETITEMSTATE, static_cast<WPARAM>(row), reinterpret_cast<LPARAM>(&item));
}

void SelectRow(HWND dialog, int row) {
  LVITEMW item = {};
  item.stateMask = LVIS_SELECTED | LVIS_FOCUSED;
  item.state = LVIS_SELECTED | LVIS_FOCUSED;
  SendMessageW(List(dialog), LVM_SETITEMSTATE, static_cast<WPARAM>(row), reinterpret_cast<LPARAM>(&item));
}

void ClickRow(HWND dialog, int row, bool right) {
  HWND list = List(dialog);
  RECT cell = {};
  cell.top = 1;
  cell.left = LVIR_LABEL;
  SendMessageW(list, LVM_GETSUBITEMRECT, static_cast<WPARAM>(row), reinterpret_cast<LPARAM>(&cell));
  const LPARAM at = MAKELPARAM((cell.left + cell.right) / 2, (cell.top + cell.bottom) / 2);
  // Posted, as the mouse's messages come: the list watches its queue for
  // the button's release while it tells a click from a drag.
  PostMessageW(list, right ? WM_RBUTTONDOWN : WM_LBUTTONDOWN, right ? MK_RBUTTON : MK_LBUTTON, at);
  PostMessageW(list, right ? WM_RBUTTONUP : WM_LBUTTONUP, 0, at);
}

HWND WaitForPopupMenu(int milliseconds) {
  for (int waited = 0; waited <= milliseconds; waited += 10) {
    const std::vector<HWND> menus = ShownWindows(IsPopupMenu);
    if (!menus.empty()) return menus.front();
    Sleep(10);
  }
  return nullptr;
}

std::string PopupMenuText(HWND menu) {
  HMENU handle = reinterpret_cast<HMENU>(SendMessageW(menu, MN_GETHMENU, 0, 0));
  wchar_t buffer[256] = {};
  if (handle) GetMenuStringW(handle, 0, buffer, 256, MF_BYPOSITION);
  return kpx::win32::WideToUtf8(buffer);
}

void ChoosePopupCommand(HWND menu, bool choose) {
  // The menu's own loop reads the keys from its thread's queue.
  if (choose) {
    PostMessageW(menu, WM_KEYDOWN, VK_DOWN, 0);
    PostMessageW(menu, WM_KEYDOWN, VK_RETURN, 0);
  } else {
    PostMessageW(menu, WM_KEYDOWN, VK_ESCAPE, 0);
  }
}

DependencySeen ReadDependency(HWND dialog) {
  DependencySeen seen;
  seen.caption = WindowText(dialog);
  seen.label = WindowText(GetDlgItem(dialog, KPX_DEPENDENCY_LABEL));
  HWND text = GetDlgItem(dialog, KPX_DEPENDENCY_TEXT);
  seen.text = WindowText(text);
  seen.ok = WindowText(GetDlgItem(dialog, IDOK));
  seen.cancel = WindowText(GetDlgItem(dialog, IDCANCEL));
  seen.readOnly = (GetWindowLongW(text, GWL_STYLE) & ES_READONLY) != 0;
  seen.okEnabled = IsWindowEnabled(GetDlgItem(dialog, IDOK)) != 0;
  const LRESULT id = SendMessageW(dialog, DM_GETDEFID, 0, 0);
  seen.defaultButton = HIWORD(id) == DC_HASDEFID ? LOWORD(id) : 0;
  return seen;
}

void TypeDependencyText(HWND dialog, const std::string& text) {
  // As typing does: the edit box's text replaced, its change reported.
  HWND edit = GetDlgItem(dialog, KPX_DEPENDENCY_TEXT);
  SendMessageW(edit, EM_SETSEL, 0, -1);
  SendMessageW(edit, EM_REPLACESEL, TRUE, reinterpret_cast<LPARAM>(kpx::win32::Utf8ToWide(text).c_str()));
}

}  // namespace wintest
