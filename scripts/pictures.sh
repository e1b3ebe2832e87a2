#!/usr/bin/env bash
# The add-in's windows' pictures in docs/pictures/, taken from the real x64
# kpxaddin.dll under Wine on a 24-bit screen of its own (Xvfb). The
# resource component is registered for the run, as the prompt's captions
# come from it, and unregistered after.
#
# Usage: scripts/pictures.sh   (BUILD=<folder> to use another build folder)
set -euo pipefail
cd "$(dirname "$0")/.."
BUILD=${BUILD:-build}

if [ -z "${KPX_PICTURES_SCREEN:-}" ]; then
  scripts/setup.sh windows wine
  dir="$BUILD/win-x64"
  if [ ! -f "$dir/CMakeCache.txt" ]; then
    cmake -S . -B "$dir" -DCMAKE_TOOLCHAIN_FILE=cmake/mingw-x86_64.cmake -DCMAKE_BUILD_TYPE=Release >/dev/null
  fi
  cmake --build "$dir" -j "$(nproc 2>/dev/null || echo 2)" --target kpx-pictures
  export KPX_PICTURES_SCREEN=1
  exec xvfb-run -a -s "-screen 0 1024x768x24" "$PWD/scripts/pictures.sh" "$@"
fi

WINE64=$(command -v wine64 || echo /usr/lib/wine/wine64)
WINESERVER=$(command -v wineserver || echo /usr/lib/wine/wineserver)
export WINEPREFIX="$(realpath -m "$BUILD/wine-prefix")"
export WINEDEBUG=${WINEDEBUG:--all}
export WINEDLLOVERRIDES="mscoree,mshtml="
if [ ! -f "$WINEPREFIX/system.reg" ]; then
  "$WINE64" wineboot -i >/dev/null 2>&1
  "$WINESERVER" -w
fi
# Debian's Wine does not find the fonts it ships (Tahoma, which dialogs
# use, and Marlett, which draws the caption's close button) unless they are
# in the prefix's own font folder.
for font in tahoma.ttf tahomabd.ttf marlett.ttf; do
  if [ -f "/usr/share/wine/fonts/$font" ] && [ ! -f "$WINEPREFIX/drive_c/windows/Fonts/$font" ]; then
    cp "/usr/share/wine/fonts/$font" "$WINEPREFIX/drive_c/windows/Fonts/"
  fi
done
winpath() { echo "Z:$(realpath -m "$1" | tr / '\\')"; }

dir="$BUILD/win-x64"
shots="$BUILD/pictures"
rm -rf "$shots"
mkdir -p "$shots" docs/pictures
# No window manager runs on this screen to draw the frame and caption:
# Wine draws them itself, as Windows does.
x11key='HKCU\Software\Wine\X11 Driver'
"$WINE64" reg add "$x11key" /v Managed /d N /f >/dev/null
"$WINE64" regsvr32 /s "$(winpath "$dir/src/com/kpxres.dll")"
rc=0
"$WINE64" "$dir/wintest/kpx-pictures.exe" "$(winpath "$dir/src/com/kpxaddin.dll")" "$(winpath "$shots")" || rc=$?
"$WINE64" regsvr32 /s /u "$(winpath "$dir/src/com/kpxres.dll")" || true
"$WINE64" reg delete "$x11key" /v Managed /f >/dev/null 2>&1 || true
"$WINESERVER" -w || true
[ "$rc" -eq 0 ] || { echo "pictures: kpx-pictures failed (exit $rc)"; exit 1; }

pairs=()
for bmp in "$shots"/*.bmp; do pairs+=("$bmp" "docs/pictures/$(basename "$bmp" .bmp).png"); done
python3 scripts/bmp_to_png.py "${pairs[@]}"
ls -l docs/pictures/*.png
