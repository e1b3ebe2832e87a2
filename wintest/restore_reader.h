// The add-in's Restore and module dependency dialogs seen from outside, as
// a user (or a test) sees them: found among the process's windows, read
// control by control, and played with the list's own messages, real clicks
// and the popup menu's keys. Every call may come from any thread of the
// process; each action has been handled when it returns.
#pragma once

#include "platform/win32/win32_api.h"

#include <string>
#include <vector>

namespace wintest {

struct RestoreRowSeen {
  std::string cells[3];
  int indent = 0;
  int check = 0;  // the check box's picture: 1 clear, 2 ticked, 3 some files ticked
  bool selected = false;
};

struct RestoreSeen {
  std::string caption, title, subtitle, instructions, ok, cancel, help;
  std::string columns[3];
  int columnWidths[3] = {0, 0, 0};  // pixels
  std::vector<RestoreRowSeen> rows;
  bool okEnabled = false;
};

bool IsRestoreWindow(HWND window);
bool IsDependencyWindow(HWND window);
// The shown Restore (or dependency) windows of this process.
std::vector<HWND> ShownRestoreWindows();
std::vector<HWND> ShownDependencyWindows();

RestoreSeen ReadRestore(HWND dialog);
// Only the rows' check pictures, quicker than reading everything.
std::vector<int> ReadChecks(HWND dialog);

// The row a user means by a name: a project row by its project's name, a
// file row by its file's full path (folder, "\", file). -1 when none.
int FindRestoreRow(const RestoreSeen& seen, const std::string& name);

// The box of a row ticked or cleared, as a click on it does.
void TickRow(HWND dialog, int row, bool ticked);
// The row selected, as a click or the arrow keys select it.
void SelectRow(HWND dialog, int row);
// A mouse click (left or right) on the row's second column; handled on the
// window's thread after this returns, in the order of the clicks.
void ClickRow(HWND dialog, int row, bool right);

// The popup menu this process shows now, waited for up to `milliseconds`:
// null when none came.
HWND WaitForPopupMenu(int milliseconds);
// The text of a popup menu's first command.
std::string PopupMenuText(HWND menu);
// Chooses the popup menu's first command (or none: Esc) with the keys.
void ChoosePopupCommand(HWND menu, bool choose);

struct DependencySeen {
  std::string caption, label, text, ok, cancel;
  bool readOnly = false, okEnabled = false;
  int defaultButton = 0;
};
DependencySeen ReadDependency(HWND dialog);
// Types the text into the edit box, replacing what it holds.
void TypeDependencyText(HWND dialog, const std::string& text);

}  // namespace wintest
