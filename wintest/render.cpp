// GDI is wanted here alone: the build's headers leave it out.
#undef NOGDI
#include <windows.h>
#include <ocidl.h>
#include <olectl.h>

#include <cstdint>
#include <cstring>

#include "render.h"

namespace wintest {

int InkedPixelsAfterRender(IPicture* picture, int pixels) {
  HDC dc = CreateCompatibleDC(nullptr);
  if (!dc) return -1;
  BITMAPINFO info = {};
  info.bmiHeader.biSize = sizeof info.bmiHeader;
  info.bmiHeader.biWidth = pixels;
  info.bmiHeader.biHeight = -pixels;  // top row first
  info.bmiHeader.biPlanes = 1;
  info.bmiHeader.biBitCount = 32;
  info.bmiHeader.biCompression = BI_RGB;
  void* bits = nullptr;
  HBITMAP bitmap = CreateDIBSection(dc, &info, DIB_RGB_COLORS, &bits, nullptr, 0);
  if (!bitmap || !bits) {
    DeleteDC(dc);
    return -1;
  }
  HGDIOBJ old = SelectObject(dc, bitmap);
  std::memset(bits, 0xFF, static_cast<size_t>(pixels) * pixels * 4);

  OLE_XSIZE_HIMETRIC width = 0;
  OLE_YSIZE_HIMETRIC height = 0;
  int inked = -1;
  if (SUCCEEDED(picture->get_Width(&width)) && SUCCEEDED(picture->get_Height(&height)) &&
      SUCCEEDED(picture->Render(dc, 0, 0, pixels, pixels, 0, height, width, -height, nullptr))) {
    GdiFlush();
    inked = 0;
    const auto* p = static_cast<const uint32_t*>(bits);
    for (int i = 0; i < pixels * pixels; ++i)
      if ((p[i] & 0x00FFFFFFu) != 0x00FFFFFFu) ++inked;
  }
  SelectObject(dc, old);
  DeleteObject(bitmap);
  DeleteDC(dc);
  return inked;
}

}  // namespace wintest
