#!/usr/bin/env bash
# The Windows build's tests under Wine, for both builds: x64 and x86 (the
# one the 32-bit Quarn host loads). One 64-bit Wine prefix runs both, as
# 64-bit Windows does. For each architecture in turn: registers the build's
# two DLLs, runs the test host kpx-wintest built for that architecture,
# which drives the add-in through COM as the Quarn host does, then plays
# every scenario that has a golden log through kpx-comsim (the simulated
# host as a COM host, also built for that architecture) and holds its log
# against the native one, answering the add-in's message boxes on a screen
# of its own (Xvfb); then unregisters the build, so that the next one
# starts from the same registry.
#
# x86 needs Debian's 32-bit Wine (wine32:i386); `scripts/setup.sh wine32`
# installs it when missing. Where that fails the run says so, still runs
# x64, and fails: x86 never counts as passed without having run.
# KPX_WINTEST_ARCHS=x64 (or x86) runs one architecture on purpose;
# KPX_WINTEST_DOCTOR_ONLY=1 runs only kpxdoctor's part.
#
# Usage: wintest/run.sh   (BUILD=<folder> to use another build folder)
set -euo pipefail
cd "$(dirname "$0")/.."
BUILD=${BUILD:-build}
read -r -a archs <<<"${KPX_WINTEST_ARCHS:-x64 x86}"
wants() { [[ " ${archs[*]} " == *" $1 "* ]]; }

# Packages first, once (not again inside the screen below).
if [ -z "${KPX_WINTEST_SCREEN:-}" ]; then
  KPX_WINTEST_STARTED=$(date +%s)
  export KPX_WINTEST_STARTED
  scripts/setup.sh native windows wine
  if wants x86 && ! scripts/setup.sh wine32; then
    export KPX_WINTEST_NO_WINE32="32-bit Wine (wine32:i386) could not be installed here: scripts/setup.sh wine32 failed"
  fi
fi

# One screen of its own for every Windows process of the run: the add-in's
# message boxes are shown there (kpx-comsim answers them), and Wine's
# desktop, which the first process starts, must have it from the beginning.
if [ -z "${KPX_WINTEST_SCREEN:-}" ] && command -v xvfb-run >/dev/null; then
  export KPX_WINTEST_SCREEN=1
  exec xvfb-run -a "$PWD/wintest/run.sh" "$@"
fi
started=${KPX_WINTEST_STARTED:-$(date +%s)}

WINE64=$(command -v wine64 || echo /usr/lib/wine/wine64)
WINESERVER=$(command -v wineserver || echo /usr/lib/wine/wineserver)
WINE32=""
if [ -x /usr/lib/wine/wine ] && dpkg-query -W -f='${Status}' wine32:i386 2>/dev/null | grep -q "install ok installed"; then
  WINE32=/usr/lib/wine/wine
fi

# What each architecture came to: "" (not got there), or a reason it did
# not run; its test host's checks and its scenarios.
declare -A skipped_why checks fails same differ skipped
for arch in "${archs[@]}"; do
  case "$arch" in x64|x86) ;; *) echo "wintest: unknown architecture '$arch' (x64, x86)"; exit 2 ;; esac
  skipped_why[$arch]="" checks[$arch]=0 fails[$arch]=0 same[$arch]=0 differ[$arch]=0 skipped[$arch]=0
done
if wants x86 && [ -z "$WINE32" ]; then
  skipped_why[x86]=${KPX_WINTEST_NO_WINE32:-"no 32-bit Wine (wine32:i386) installed"}
fi

# Both test hosts of each architecture, configured as `make windows` does,
# when not there yet.
for arch in "${archs[@]}"; do
  dir="$BUILD/win-$arch"
  toolchain=cmake/mingw-x86_64.cmake
  [ "$arch" = x86 ] && toolchain=cmake/mingw-i686.cmake
  if [ -f "$dir/CMakeCache.txt" ]; then
    cmake -S . -B "$dir" >/dev/null
  else
    cmake -S . -B "$dir" -DCMAKE_TOOLCHAIN_FILE="$toolchain" -DCMAKE_BUILD_TYPE=Release >/dev/null
  fi
  targets=(kpx-wintest kpxdoctor)
  grep -q '^kpx-comsim' <(cmake --build "$dir" --target help 2>/dev/null | sed 's/^\.\.\. //') && targets+=(kpx-comsim)
  if ! cmake --build "$dir" -j "$(nproc 2>/dev/null || echo 2)" --target "${targets[@]}" >"$BUILD/wintest-build-$arch.log" 2>&1; then
    tail -40 "$BUILD/wintest-build-$arch.log"
    echo "wintest: the $arch build failed"
    skipped_why[$arch]="its build failed ($BUILD/wintest-build-$arch.log)"
  fi
done
wine_started=$(date +%s)

export WINEPREFIX="$(realpath -m "$BUILD/wine-prefix")"
export WINEDEBUG=-all
# No Mono or Gecko installer dialogs: nothing here needs them.
export WINEDLLOVERRIDES="mscoree,mshtml="
# A prefix made before 32-bit Wine was installed has no 32-bit system.
if [ -n "$WINE32" ] && [ -f "$WINEPREFIX/system.reg" ] && [ ! -f "$WINEPREFIX/drive_c/windows/syswow64/kernel32.dll" ]; then
  echo "wintest: the Wine prefix has no 32-bit Windows yet: made again"
  rm -rf "$WINEPREFIX"
fi
if [ ! -f "$WINEPREFIX/system.reg" ]; then
  echo "wintest: creating the Wine prefix $WINEPREFIX"
  "$WINE64" wineboot -i >/dev/null 2>&1
  "$WINESERVER" -w
fi

winpath() { echo "Z:$(realpath -m "$1" | tr / '\\')"; }

# The server first, on its own, so that no Windows process started later
# keeps this script's output open.
"$WINESERVER" -p5 </dev/null >/dev/null 2>&1

loader() { if [ "$1" = x86 ]; then echo "$WINE32"; else echo "$WINE64"; fi; }

# A build stays registered only while its own run lasts; a marker in the
# prefix says which one an interrupted run left registered.
register() {
  local arch=$1 verb=$2 dll wine
  wine=$(loader "$arch")
  local dlls=("$BUILD/win-$arch/src/com/kpxres.dll" "$BUILD/win-$arch/src/com/kpxaddin.dll")
  if [ "$verb" = off ]; then
    # The add-in first: the resource component must outlive it.
    dlls=("${dlls[1]}" "${dlls[0]}")
  fi
  for dll in "${dlls[@]}"; do
    if [ "$verb" = on ]; then
      "$wine" regsvr32 /s "$(winpath "$dll")" || { echo "wintest: $arch: regsvr32 $(basename "$dll") failed"; return 1; }
    else
      "$wine" regsvr32 /s /u "$(winpath "$dll")" || true
    fi
  done
  if [ "$verb" = on ]; then touch "$WINEPREFIX/kpx-registered-$arch"; else rm -f "$WINEPREFIX/kpx-registered-$arch"; fi
}

# The test host of one architecture.
test_host() {
  local arch=$1 wine dir="$BUILD/win-$1"
  wine=$(loader "$arch")
  local log="$BUILD/wintest-$arch.log" rc=0
  timeout 300 "$wine" "$dir/wintest/kpx-wintest.exe" "$(winpath "$dir/src/com/kpxaddin.dll")" \
    "$(winpath "$dir/src/com/kpxres.dll")" 'C:\kpxtest' >"$log.raw" 2>&1 || rc=$?
  tr -d '\r' <"$log.raw" >"$log"
  rm -f "$log.raw"
  grep -v '^\[ group \]' "$log" | sed "s/^/wintest: $arch: /" || true
  local summary
  summary=$(grep -E '^[0-9]+ checks, [0-9]+ failed$' "$log" | tail -1)
  if [ -n "$summary" ]; then
    checks[$arch]=${summary%% checks*}
    local f=${summary#*, }
    fails[$arch]=${f%% failed}
  else
    fails[$arch]=$((fails[$arch] + 1))
    echo "wintest: $arch: the test host ended without a summary (exit $rc)"
  fi
  [ "$rc" -eq 0 ]
}

# The scenarios of the native build, played against the real DLL of one
# architecture.
differential() {
  local arch=$1 wine comsim="$BUILD/win-$1/wintest/kpx-comsim.exe"
  wine=$(loader "$arch")
  if [ ! -f "$comsim" ]; then
    echo "wintest: $arch: kpx-comsim not built (nlohmann-json missing): no differential run"
    return 0
  fi
  local out="$BUILD/comsim-$arch"
  rm -rf "$out"
  mkdir -p "$out"
  for golden in tests/scenarios/*.golden.jsonl; do
    local name rc=0
    name=$(basename "$golden" .golden.jsonl)
    timeout 120 "$wine" "$comsim" "$(winpath "tests/scenarios/$name.scenario.json")" "$(winpath "$golden")" \
      "$(winpath "$out/$name.jsonl")" >"$out/$name.txt" 2>&1 || rc=$?
    case $rc in
      0) same[$arch]=$((same[$arch] + 1)) ;;
      3) skipped[$arch]=$((skipped[$arch] + 1))
         echo "wintest: $arch: scenario $name skipped: $(tr -d '\r' <"$out/$name.txt" | sed 's/^ *//; s/^skipped: //')" ;;
      *) differ[$arch]=$((differ[$arch] + 1))
         echo "wintest: $arch: scenario $name differs from the native run (exit $rc):"
         tr -d '\r' <"$out/$name.txt" ;;
    esac
  done
  [ "${differ[$arch]}" -eq 0 ]
}

# What an interrupted run left registered goes first.
for arch in x64 x86; do
  if [ -f "$WINEPREFIX/kpx-registered-$arch" ] && [ -n "$(loader "$arch")" ]; then register "$arch" off; fi
done

declare -A ran took
for arch in "${archs[@]}"; do
  [ -z "${skipped_why[$arch]}" ] || continue
  arch_started=$(date +%s)
  echo "wintest: $arch: kpxaddin.dll through COM"
  if register "$arch" on; then
    ran[$arch]=1
    if [ -z "${KPX_WINTEST_DOCTOR_ONLY:-}" ]; then
      test_host "$arch" || true
      differential "$arch" || true
    fi
    register "$arch" off
  else
    skipped_why[$arch]="regsvr32 failed"
  fi
  took[$arch]=$(( $(date +%s) - arch_started ))
done
# kpxdoctor needs both builds: it checks the 32-bit host's view and the
# 64-bit one.
source wintest/doctor.sh
doctor_ran=""
if [ -n "${ran[x86]:-}" ] && [ -n "${ran[x64]:-}" ]; then
  doctor_phase
  doctor_ran=1
fi

# Whatever a timed-out run left behind ends with the server.
timeout 30 "$WINESERVER" -w || "$WINESERVER" -k || true

# The prefix is large (about 1.3 GB); a CI machine has no use for it after
# the run, a developer's next run starts faster with it.
if [ "${CI:-}" = true ]; then rm -rf "$WINEPREFIX"; fi

failed=0
echo "wintest: summary, per architecture"
for arch in "${archs[@]}"; do
  if [ -z "${ran[$arch]:-}" ]; then
    echo "wintest:   $arch: NOT RUN: ${skipped_why[$arch]}"
    failed=1
    continue
  fi
  echo "wintest:   $arch: test host ${checks[$arch]} checks, ${fails[$arch]} failed;" \
    "scenarios through COM ${same[$arch]} as native, ${differ[$arch]} different, ${skipped[$arch]} skipped (${took[$arch]}s)"
  # The test host's benchmarks: reported, never a failure.
  sed -n 's/^ *benchmark: /wintest:     benchmark: /p' "$BUILD/wintest-$arch.log" 2>/dev/null || true
  if [ "${fails[$arch]}" -ne 0 ] || [ "${differ[$arch]}" -ne 0 ]; then failed=1; fi
done
if [ -n "$doctor_ran" ]; then
  echo "wintest:   kpxdoctor (x86 and x64): $doctor_checks checks, $doctor_fails failed"
  [ "$doctor_fails" -eq 0 ] || failed=1
elif wants x86 && wants x64; then
  echo "wintest:   kpxdoctor: NOT RUN: it needs both builds"
  failed=1
fi
now=$(date +%s)
echo "wintest: Wine part $((now - wine_started))s, whole run $((now - started))s"
if [ "$failed" -eq 0 ]; then echo "wintest: passed"; else echo "wintest: FAILED"; fi
exit "$failed"
