#include "prompt_reader.h"

#include "platform/win32/prompt_window_ids.h"
#include "platform/win32/win32_strings.h"

namespace wintest {

namespace {

struct Search {
  bool (*test)(HWND);
  std::vector<HWND> found;
};

BOOL CALLBACK Collect(HWND window, LPARAM out) {
  auto* search = reinterpret_cast<Search*>(out);
  DWORD process = 0;
  GetWindowThreadProcessId(window, &process);
  if (process == GetCurrentProcessId() && IsWindowVisible(window) && search->test(window))
    search->found.push_back(window);
  return TRUE;
}

bool Shown(HWND prompt, int id) {
  HWND control = GetDlgItem(prompt, id);
  return control && IsWindowVisible(control);
}

}  // namespace

std::string WindowText(HWND window) {
  const int n = GetWindowTextLengthW(window);
  std::wstring text(static_cast<size_t>(n) + 1, L'\0');
  text.resize(static_cast<size_t>(GetWindowTextW(window, text.data(), n + 1)));
  return kpx::win32::WideToUtf8(text);
}

bool IsDialogWith(HWND window, std::initializer_list<int> ids) {
  wchar_t name[16] = {};
  GetClassNameW(window, name, 16);
  if (std::wstring(name) != L"#32770") return false;
  for (int id : ids)
    if (!GetDlgItem(window, id)) return false;
  return true;
}

std::vector<HWND> ShownWindows(bool (*test)(HWND)) {
  Search search{test, {}};
  EnumWindows(Collect, reinterpret_cast<LPARAM>(&search));
  return search.found;
}

bool IsPromptWindow(HWND window) {
  return IsDialogWith(window, {KPX_PROMPT_MESSAGE, KPX_PROMPT_ICON_CRITICAL, KPX_PROMPT_ICON_QUESTION,
                               KPX_PROMPT_ICON_INFORMATION, KPX_PROMPT_DONT_SHOW, IDHELP});
}

std::vector<HWND> ShownPrompts() {
  return ShownWindows(IsPromptWindow);
}

PromptSeen ReadPrompt(HWND prompt) {
  PromptSeen seen;
  kpx::platform::PromptView& v = seen.view;
  v.title = WindowText(prompt);
  v.message = WindowText(GetDlgItem(prompt, KPX_PROMPT_MESSAGE));
  v.okCaption = WindowText(GetDlgItem(prompt, IDOK));
  v.cancelCaption = WindowText(GetDlgItem(prompt, IDCANCEL));
  v.helpCaption = WindowText(GetDlgItem(prompt, IDHELP));
  v.dontShowCaption = WindowText(GetDlgItem(prompt, KPX_PROMPT_DONT_SHOW));
  v.helpAvailable = IsWindowEnabled(GetDlgItem(prompt, IDHELP)) != 0;
  const std::pair<int, kpx::platform::PromptIcon> icons[] = {
      {KPX_PROMPT_ICON_CRITICAL, kpx::platform::PromptIcon::Critical},
      {KPX_PROMPT_ICON_QUESTION, kpx::platform::PromptIcon::Question},
      {KPX_PROMPT_ICON_INFORMATION, kpx::platform::PromptIcon::Information}};
  for (const auto& [id, icon] : icons) {
    if (!Shown(prompt, id)) continue;
    ++seen.iconsShown;
    v.icon = icon;
  }
  return seen;
}

void Click(HWND prompt, int id) { SendMessageW(GetDlgItem(prompt, id), BM_CLICK, 0, 0); }

}  // namespace wintest
