// The Win32 and OLE automation headers, tamed for the core's names: the
// core has members called DeleteFile, MessageBox and GetObject and a log
// level called ERROR, which <windows.h> would turn into macros. Every file
// of the Windows build includes Windows through this header.
#pragma once

#ifndef NOMINMAX
#define NOMINMAX
#endif
#ifndef NOGDI
#define NOGDI
#endif

#include <windows.h>
#include <objbase.h>
#include <oaidl.h>
#include <oleauto.h>
#include <olectl.h>

#undef DeleteFile
#undef MessageBox
#undef GetObject
#undef ERROR
