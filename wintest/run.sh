#!/usr/bin/env bash
# The Windows build's tests, under Wine: registers both DLLs of the x64 build
# in a private Wine prefix and runs the test host, which drives the add-in
# through COM as the Quarn host does; then plays every scenario that has a
# golden log through kpx-comsim (the simulated host as a COM host) and holds
# its log against the native one, answering the add-in's message boxes on
# a screen of its own (Xvfb). The x86 build is run too where a 32-bit
# Wine is installed; Debian's wine32 could not be installed on these
# machines, so there it is built and reported as not run.
#
# Usage: wintest/run.sh   (BUILD=<folder> to use another build folder)
set -euo pipefail
cd "$(dirname "$0")/.."
BUILD=${BUILD:-build}
started=$(date +%s)

scripts/setup.sh native windows wine

# One screen of its own for every Windows process of the run: the add-in's
# message boxes are shown there (kpx-comsim answers them), and Wine's
# desktop, which the first process starts, must have it from the beginning.
if [ -z "${KPX_WINTEST_SCREEN:-}" ] && command -v xvfb-run >/dev/null; then
  export KPX_WINTEST_SCREEN=1
  exec xvfb-run -a "$PWD/wintest/run.sh" "$@"
fi

WINE64=$(command -v wine64 || echo /usr/lib/wine/wine64)
WINESERVER=$(command -v wineserver || echo /usr/lib/wine/wineserver)
WINE32=""
if [ -x /usr/lib/wine/wine ] && dpkg-query -W -f='${Status}' wine32 2>/dev/null | grep -q "install ok installed"; then
  WINE32=/usr/lib/wine/wine
fi

# Both builds, configured as `make windows` does, when not there yet.
for arch in x64 x86; do
  dir="$BUILD/win-$arch"
  toolchain=cmake/mingw-x86_64.cmake
  [ "$arch" = x86 ] && toolchain=cmake/mingw-i686.cmake
  if [ -f "$dir/CMakeCache.txt" ]; then
    cmake -S . -B "$dir" >/dev/null
  else
    cmake -S . -B "$dir" -DCMAKE_TOOLCHAIN_FILE="$toolchain" -DCMAKE_BUILD_TYPE=Release >/dev/null
  fi
  targets=(kpx-wintest)
  [ "$arch" = x64 ] && grep -q '^kpx-comsim' <(cmake --build "$dir" --target help 2>/dev/null | sed 's/^\.\.\. //') &&
    targets+=(kpx-comsim)
  if ! cmake --build "$dir" -j "$(nproc 2>/dev/null || echo 2)" --target "${targets[@]}" >"$BUILD/wintest-build-$arch.log" 2>&1; then
    tail -40 "$BUILD/wintest-build-$arch.log"
    echo "wintest: the $arch build failed"
    exit 1
  fi
done

export WINEPREFIX="$(realpath -m "$BUILD/wine-prefix")"
export WINEDEBUG=-all
# No Mono or Gecko installer dialogs: nothing here needs them.
export WINEDLLOVERRIDES="mscoree,mshtml="
if [ ! -f "$WINEPREFIX/system.reg" ]; then
  echo "wintest: creating the Wine prefix $WINEPREFIX"
  "$WINE64" wineboot -i >/dev/null 2>&1
  "$WINESERVER" -w
fi

winpath() { echo "Z:$(realpath -m "$1" | tr / '\\')"; }

# The server first, on its own, so that no Windows process started later
# keeps this script's output open.
"$WINESERVER" -p5 </dev/null >/dev/null 2>&1

failed=0
passed_total=0
failed_total=0
ran=()
run_arch() {
  local arch=$1 wine=$2 dir="$BUILD/win-$1"
  local addin res
  addin=$(winpath "$dir/src/com/kpxaddin.dll")
  res=$(winpath "$dir/src/com/kpxres.dll")
  # The resource component first: the add-in cannot be created without it.
  "$wine" regsvr32 /s "$res" || { echo "wintest: $arch: regsvr32 kpxres.dll failed"; return 1; }
  "$wine" regsvr32 /s "$addin" || { echo "wintest: $arch: regsvr32 kpxaddin.dll failed"; return 1; }
  local log="$BUILD/wintest-$arch.log"
  local rc=0
  timeout 300 "$wine" "$dir/wintest/kpx-wintest.exe" "$addin" "$res" 'C:\kpxtest' >"$log.raw" 2>&1 || rc=$?
  tr -d '\r' <"$log.raw" >"$log"
  grep -v '^\[ group \]' "$log" || true
  local summary
  summary=$(grep -E '^[0-9]+ checks, [0-9]+ failed$' "$log" | tail -1)
  if [ -n "$summary" ]; then
    local checks fails
    checks=${summary%% checks*}
    fails=${summary#*, }; fails=${fails%% failed}
    passed_total=$((passed_total + checks - fails))
    failed_total=$((failed_total + fails))
  else
    failed_total=$((failed_total + 1))
    echo "wintest: $arch: the test host ended without a summary (exit $rc)"
  fi
  ran+=("$arch")
  return "$rc"
}

# The scenarios of the native build, played against the real DLL.
differential() {
  local comsim="$BUILD/win-x64/wintest/kpx-comsim.exe"
  if [ ! -f "$comsim" ]; then
    echo "wintest: kpx-comsim not built (nlohmann-json missing): no differential run"
    return 0
  fi
  local out="$BUILD/comsim" same=0 differ=0 skipped=0
  mkdir -p "$out"
  for golden in tests/scenarios/*.golden.jsonl; do
    local name rc=0
    name=$(basename "$golden" .golden.jsonl)
    timeout 120 "$WINE64" "$comsim" "$(winpath "tests/scenarios/$name.scenario.json")" "$(winpath "$golden")" \
      "$(winpath "$out/$name.jsonl")" >"$out/$name.txt" 2>&1 || rc=$?
    case $rc in
      0) same=$((same + 1)) ;;
      3) skipped=$((skipped + 1)); echo "wintest: scenario $name: $(tr -d '\r' <"$out/$name.txt" | sed 's/^ *//')" ;;
      *) differ=$((differ + 1)); echo "wintest: scenario $name differs from the native run (exit $rc):"
         tr -d '\r' <"$out/$name.txt" ;;
    esac
  done
  echo "wintest: scenarios through COM: $same as native, $differ different, $skipped skipped"
  passed_total=$((passed_total + same))
  failed_total=$((failed_total + differ))
  [ "$differ" -eq 0 ]
}

run_arch x64 "$WINE64" || failed=1
differential || failed=1
if [ -n "$WINE32" ]; then
  run_arch x86 "$WINE32" || failed=1
else
  echo "wintest: x86 built ($BUILD/win-x86/src/com/kpxaddin.dll), not run: no 32-bit Wine (wine32) here"
fi
# Whatever a timed-out run left behind ends with the server.
timeout 30 "$WINESERVER" -w || "$WINESERVER" -k || true
[ "$failed_total" -eq 0 ] || failed=1

echo "wintest: ran ${ran[*]:-nothing} in $(( $(date +%s) - started ))s"
echo "wintest: $passed_total passed, $failed_total failed"
exit "$failed"
