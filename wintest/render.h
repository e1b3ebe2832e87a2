// Drawing a picture to look at what it shows. Kept apart: it needs GDI,
// which the rest of the Windows build keeps out of its headers.
#pragma once

#include "platform/win32/win32_api.h"

namespace wintest {

// Renders `picture` with IPicture::Render into a white 32-bit bitmap of
// `pixels` square; the count of pixels that are not white afterwards, or -1
// when the picture could not be drawn.
int InkedPixelsAfterRender(IPicture* picture, int pixels);

}  // namespace wintest
