// kpx-pictures: pictures of the add-in's windows for the manual. Each
// prompt is filled by the prompt form itself (its captions from the
// registered resource component), shown from kpxaddin.dll's template, and
// taken off the screen into a 24-bit BMP once it has drawn itself; then OK
// closes it. The Restore dialog shows the add-in's own form with
// three projects' backups, a project selected and some files ticked; the
// module dependency dialog shows its text, editable and read-only.
// scripts/pictures.sh runs it on a screen of its own and turns the BMPs
// into PNGs.
//
// Usage: kpx-pictures <kpxaddin.dll> <output folder>   (Windows paths)

// Taking the picture needs GDI.
#undef NOGDI
#include <windows.h>

#include "platform/win32/win32_api.h"

#include <cstdio>
#include <filesystem>
#include <fstream>
#include <string>
#include <vector>

#include "dialogs/kpx_prompt.h"
#include "platform/win32/com_bridge.h"
#include "platform/win32/win32_platform.h"
#include "platform/win32/win32_strings.h"
#include "prompt_reader.h"
#include "restore_reader.h"
#include "restore/kpx_restore_form.h"
#include "shared/module.h"
#include "shared/resource_strings.h"

namespace {

// The warnings as the element events show them: the registered resource
// component's texts, "%1" filled with a relation's text.
struct Picture {
  const char* file;
  int32_t messageId;
  int32_t titleId;
  int32_t kind;
  int32_t helpContext;
  const char* helpFile;
};

const Picture kPictures[] = {
    {"prompt-inherit-information", 5046, 5047, 64, 0, ""},
    {"prompt-realize-critical", 5048, 5049, 16, 0, ""},
    {"prompt-help-available", 5050, 5049, 16, 1050, "C:\\Program Files\\Quarn\\kpxaddin.hlp"},
};

struct Shot {
  std::wstring path;
  std::vector<HWND> (*find)() = wintest::ShownPrompts;
  void (*play)(HWND) = nullptr;  // what the user does before the picture
  int close = IDOK;
  bool taken = false;
};

// The window's pixels as the screen shows them, bottom-up 24-bit rows.
bool WriteBmp(HWND window, const std::wstring& path) {
  RECT r;
  GetWindowRect(window, &r);
  const int width = r.right - r.left, height = r.bottom - r.top;
  BITMAPINFO info = {};
  info.bmiHeader.biSize = sizeof(BITMAPINFOHEADER);
  info.bmiHeader.biWidth = width;
  info.bmiHeader.biHeight = height;
  info.bmiHeader.biPlanes = 1;
  info.bmiHeader.biBitCount = 24;
  info.bmiHeader.biCompression = BI_RGB;
  void* bits = nullptr;
  HDC screen = GetDC(nullptr);
  HDC memory = CreateCompatibleDC(screen);
  HBITMAP bitmap = CreateDIBSection(screen, &info, DIB_RGB_COLORS, &bits, nullptr, 0);
  HGDIOBJ old = SelectObject(memory, bitmap);
  const bool copied = BitBlt(memory, 0, 0, width, height, screen, r.left, r.top, SRCCOPY) != 0;
  GdiFlush();
  const size_t stride = (static_cast<size_t>(width) * 3 + 3) & ~size_t{3};
  const size_t size = stride * static_cast<size_t>(height);
  BITMAPFILEHEADER file = {};
  file.bfType = 0x4D42;
  file.bfOffBits = sizeof(BITMAPFILEHEADER) + sizeof(BITMAPINFOHEADER);
  file.bfSize = static_cast<DWORD>(file.bfOffBits + size);
  std::ofstream out(std::filesystem::path(path), std::ios::binary);
  out.write(reinterpret_cast<const char*>(&file), sizeof file);
  out.write(reinterpret_cast<const char*>(&info.bmiHeader), sizeof info.bmiHeader);
  out.write(static_cast<const char*>(bits), static_cast<std::streamsize>(size));
  const bool written = copied && out.good();
  SelectObject(memory, old);
  DeleteObject(bitmap);
  DeleteDC(memory);
  ReleaseDC(nullptr, screen);
  return written;
}

DWORD WINAPI Photograph(void* param) {
  auto* shot = static_cast<Shot*>(param);
  HWND prompt = nullptr;
  for (int waited = 0; waited < 10000 && !prompt; waited += 10) {
    const std::vector<HWND> shown = shot->find();
    if (shown.empty())
      Sleep(10);
    else
      prompt = shown.front();
  }
  if (!prompt) return 0;
  // No window manager gives the prompt the focus on this screen: it is
  // given here, so that it shows as the active window it is on a desktop.
  if (shot->play) shot->play(prompt);
  SetForegroundWindow(prompt);
  // Wine may still have drawn the frame as inactive from the moment the
  // window appeared: the frame is drawn again as the active window's.
  SendMessageW(prompt, WM_NCACTIVATE, TRUE, 0);
  RedrawWindow(prompt, nullptr, nullptr, RDW_INVALIDATE | RDW_ERASE | RDW_FRAME | RDW_ALLCHILDREN | RDW_UPDATENOW);
  Sleep(500);  // until the screen has what the window drew
  shot->taken = WriteBmp(prompt, shot->path);
  wintest::Click(prompt, shot->close);
  return 0;
}

// Shows a window through `show` while the shot is taken on a thread of its
// own; whether it was taken.
template <class Show>
bool Take(Shot& shot, Show show) {
  HANDLE thread = CreateThread(nullptr, 0, Photograph, &shot, 0, nullptr);
  try {
    show();
  } catch (const std::exception& e) {
    std::fprintf(stderr, "kpx-pictures: %s\n", e.what());
  }
  WaitForSingleObject(thread, INFINITE);
  CloseHandle(thread);
  std::printf("%s: %s\n", kpx::win32::WideToUtf8(shot.path).c_str(), shot.taken ? "taken" : "FAILED");
  return shot.taken;
}

// The first project selected (the header speaks of it), one of its files
// ticked (it shows as partly ticked), and the second project's one file.
void PlayRestore(HWND dialog) {
  wintest::SelectRow(dialog, 0);
  wintest::TickRow(dialog, 1, true);
  wintest::TickRow(dialog, 5, true);
}

kpx::platform::DependencyView DependencyView(bool readOnly) {
  kpx::platform::DependencyView view;
  view.caption = std::string("Module Dependency Properties") + (readOnly ? " {read-only}" : "");
  view.label = "Import options:";
  view.text = "no_namespace rename(\"EOF\", \"adoEOF\")";
  view.ok = "OK";
  view.cancel = "Cancel";
  view.readOnly = readOnly;
  return view;
}

}  // namespace

int main(int argc, char** argv) {
  if (argc != 3) {
    std::fprintf(stderr, "usage: kpx-pictures <kpxaddin.dll> <output folder>\n");
    return 2;
  }
  CoInitialize(nullptr);
  HMODULE addin = LoadLibraryW(kpx::win32::Utf8ToWide(argv[1]).c_str());
  if (!addin) {
    std::fprintf(stderr, "kpx-pictures: cannot load %s\n", argv[1]);
    return 1;
  }
  int failed = 0;
  {
    kpx::win32::ServerLocks locks;
    kpx::win32::ComBridge bridge(locks);
    kpx::win32::Win32Platform win32(bridge, addin);
    kpx::platform::Platform world = win32.platform();
    kpx::ResourceStrings resources(world.objects);
    const auto path = [&](const char* name) { return kpx::win32::Utf8ToWide(std::string(argv[2]) + "\\" + name + ".bmp"); };
    for (const Picture& p : kPictures) {
      Shot shot{path(p.file)};
      failed += !Take(shot, [&] {
        kpx::KpxPrompt prompt(world.ui, resources);
        prompt.Initialize(resources.GetResourceString(p.messageId, "IWidget -> IBase1"),
                          resources.GetResourceString(p.titleId), p.kind, false, p.helpContext, p.helpFile, false);
      });
    }
    // The add-in's own form, with three projects' backups made here.
    kpx::Module module(world);
    module.resources().InitResourceStrings();
    kpx::KpxRestoreForm form(module);
    const std::string backups = std::string(argv[2]) + "\\backups";
    CreateDirectoryW(kpx::win32::Utf8ToWide(backups).c_str(), nullptr);
    const struct {
      const char* project;
      std::vector<const char*> files;
    } projects[] = {{"Shapes", {"circle.cpp", "circle.h", "square.cpp"}},
                    {"Brushes", {"brush.cpp"}},
                    {"Tools", {"ruler.cpp", "ruler.h"}}};
    for (const auto& p : projects) {
      const std::string folder = std::string("C:\\Projects\\") + p.project;
      std::vector<std::string> lines;
      std::string list;
      for (const char* file : p.files) {
        const std::string backup = backups + "\\" + file + ".bak";
        world.files.AppendText(backup, "");
        lines.push_back(folder + "\\" + file + "|" + backup);
        list += lines.back() + "\r\n";
      }
      // The list file's date is the project's last backup, in the header.
      const std::string listFile = backups + "\\" + p.project + ".lst";
      world.files.DeleteFile(listFile);
      world.files.AppendText(listFile, list);
      form.AddEntry(folder + "\\" + p.project + ".dsp|" + p.project + "|" + listFile, lines);
    }
    Shot restore{path("restore"), wintest::ShownRestoreWindows, PlayRestore, IDCANCEL};
    failed += !Take(restore, [&] { world.ui.ShowRestoreDialog(form, {}); });
    for (bool readOnly : {false, true}) {
      Shot dependency{path(readOnly ? "dependency-readonly" : "dependency"), wintest::ShownDependencyWindows, nullptr,
                      IDCANCEL};
      failed += !Take(dependency, [&] { world.ui.ShowDependencyDialog(DependencyView(readOnly)); });
    }
  }
  CoUninitialize();
  return failed == 0 ? 0 : 1;
}
