#!/usr/bin/env bash
# What COM costs: the host-call benchmarks natively (kpx-bench) and on the
# real DLL through IDispatch under Wine, x64 and x86 (kpx-combench), set
# side by side per member: the time of a call, the host's share of it (time
# inside the host's objects and the companions) and the add-in's own share,
# and the DLL's own share over the native add-in's. Reports; gates nothing.
#
# Google Benchmark for mingw-w64 is built from Debian's source package,
# fetched with `apt-get source` through a package list of its own in the
# build folder (the machine's package sources stay as they are), with
# mingw-w64's POSIX thread model, which it needs.
#
# Usage: scripts/bench-com.sh   (BUILD=<folder>; KPX_BENCH_ARCHS="x64 x86";
#        KPX_BENCH_FILTER=<regex> for fewer members; KPX_BENCH_REPETITIONS=3)
set -euo pipefail
cd "$(dirname "$0")/.."
BUILD=${BUILD:-build}
read -r -a archs <<<"${KPX_BENCH_ARCHS:-x64 x86}"
filter=${KPX_BENCH_FILTER:-'BM_(Name|EnableClassMenuOneClass|Activate)/|BM_Platform'}
jobs=$(nproc 2>/dev/null || echo 2)
# Each run repeated; the report takes the least disturbed.
repeat=(--benchmark_repetitions="${KPX_BENCH_REPETITIONS:-3}")
root=$(realpath -m "$BUILD")
out="$root/bench-com"
mkdir -p "$out"

scripts/setup.sh native windows wine bench
if [[ " ${archs[*]} " == *" x86 "* ]] && ! scripts/setup.sh wine32; then
  echo "bench-com: no 32-bit Wine: x86 left out"
  read -r -a archs <<<"${archs[*]/x86/}"
fi

toolchain() { if [ "$1" = x86 ]; then echo cmake/mingw-i686$2.cmake; else echo cmake/mingw-x86_64$2.cmake; fi; }

# ------------------------------------------------ Google Benchmark for mingw

gbench="$root/gbench"
if [ ! -f "$gbench/source/CMakeLists.txt" ]; then
  codename=$(. /etc/os-release && echo "${VERSION_CODENAME:-}")
  # The Debian archive the machine installs from (the first one that is not
  # the security archive).
  mirror=$(cat /etc/apt/sources.list.d/*.sources 2>/dev/null |
           awk 'tolower($1) == "uris:" && $2 !~ /security/ { print $2; exit }')
  [ -n "$mirror" ] || mirror=$(cat /etc/apt/sources.list /etc/apt/sources.list.d/*.list 2>/dev/null |
           sed -E 's/\[[^]]*\]//' | awk '$1 == "deb" && $2 !~ /security/ { print $2; exit }')
  mirror=${mirror:-http://deb.debian.org/debian}
  mkdir -p "$gbench/apt/lists/partial" "$gbench/apt/archives/partial" "$gbench/apt/cache"
  echo "deb-src [signed-by=/usr/share/keyrings/debian-archive-keyring.gpg] $mirror $codename main" \
    >"$gbench/apt/sources.list"
  apt_opts=(-o "Dir::Etc::SourceList=$gbench/apt/sources.list" -o "Dir::Etc::SourceParts=$gbench/apt/none"
            -o "Dir::State::Lists=$gbench/apt/lists" -o "Dir::Cache=$gbench/apt/cache"
            -o "Dir::Cache::Archives=$gbench/apt/archives" -o "APT::Sandbox::User=$(id -un)")
  echo "bench-com: fetching Google Benchmark's Debian source ($mirror $codename)"
  apt-get "${apt_opts[@]}" update -qq
  (cd "$gbench" && apt-get "${apt_opts[@]}" source --download-only -qq benchmark)
  rm -rf "$gbench/source"
  mkdir -p "$gbench/source"
  tar -xzf "$gbench"/benchmark_*.orig.tar.gz -C "$gbench/source" --strip-components=1
fi

for arch in "${archs[@]}"; do
  if [ ! -f "$gbench/$arch/lib/cmake/benchmark/benchmarkConfig.cmake" ]; then
    echo "bench-com: building Google Benchmark for $arch"
    cmake -S "$gbench/source" -B "$gbench/build-$arch" -DCMAKE_TOOLCHAIN_FILE="$PWD/$(toolchain "$arch" -posix)" \
      -DCMAKE_BUILD_TYPE=Release -DBENCHMARK_ENABLE_TESTING=OFF -DBENCHMARK_ENABLE_GTEST_TESTS=OFF \
      -DBENCHMARK_ENABLE_WERROR=OFF -DBENCHMARK_ENABLE_INSTALL=ON -DCMAKE_INSTALL_PREFIX="$gbench/$arch" \
      >"$gbench/build-$arch.log" 2>&1
    cmake --build "$gbench/build-$arch" -j "$jobs" --target install >>"$gbench/build-$arch.log" 2>&1 ||
      { tail -20 "$gbench/build-$arch.log"; exit 1; }
  fi
done

# ----------------------------------------------------------------- builds

echo "bench-com: building kpx-bench and, for ${archs[*]}, the DLLs and kpx-combench"
cmake -S . -B "$BUILD/bench" -DCMAKE_BUILD_TYPE=Release >/dev/null
cmake --build "$BUILD/bench" -j "$jobs" --target kpx-bench >"$out/build-native.log" 2>&1 ||
  { tail -20 "$out/build-native.log"; exit 1; }
for arch in "${archs[@]}"; do
  # The DLLs as shipped (Win32 thread model), and the bench host apart.
  if [ ! -f "$BUILD/win-$arch/CMakeCache.txt" ]; then
    cmake -S . -B "$BUILD/win-$arch" -DCMAKE_TOOLCHAIN_FILE="$(toolchain "$arch" "")" -DCMAKE_BUILD_TYPE=Release >/dev/null
  fi
  cmake --build "$BUILD/win-$arch" -j "$jobs" --target kpxaddin kpxres >"$out/build-$arch.log" 2>&1 ||
    { tail -20 "$out/build-$arch.log"; exit 1; }
  cmake -S . -B "$BUILD/bench-win-$arch" -DCMAKE_TOOLCHAIN_FILE="$(toolchain "$arch" -posix)" \
    -DCMAKE_BUILD_TYPE=Release -DKPX_BENCHMARK_DIR="$gbench/$arch" >/dev/null
  cmake --build "$BUILD/bench-win-$arch" -j "$jobs" --target kpx-combench >>"$out/build-$arch.log" 2>&1 ||
    { tail -20 "$out/build-$arch.log"; exit 1; }
done

# ------------------------------------------------------------------- runs

echo "bench-com: native"
"$BUILD/bench/bench/kpx-bench" --benchmark_filter="$filter" "${repeat[@]}" --benchmark_out="$out/native.json" \
  --benchmark_out_format=json

export WINEPREFIX="$root/wine-prefix" WINEDEBUG=-all WINEDLLOVERRIDES="mscoree,mshtml="
WINE64=$(command -v wine64 || echo /usr/lib/wine/wine64)
WINESERVER=$(command -v wineserver || echo /usr/lib/wine/wineserver)
if [ ! -f "$WINEPREFIX/system.reg" ]; then
  echo "bench-com: creating the Wine prefix $WINEPREFIX"
  "$WINE64" wineboot -i >/dev/null 2>&1
  "$WINESERVER" -w
fi
"$WINESERVER" -p5 </dev/null >/dev/null 2>&1
winpath() { echo "Z:$(realpath -m "$1" | tr / '\\')"; }

reports=("$out/native.json")
for arch in "${archs[@]}"; do
  wine=$WINE64
  [ "$arch" = x86 ] && wine=/usr/lib/wine/wine
  com="$BUILD/win-$arch/src/com"
  # Registered for this run only; the marker tells wintest/run.sh to take it
  # away should this run be stopped.
  touch "$WINEPREFIX/kpx-registered-$arch"
  "$wine" regsvr32 /s "$(winpath "$com/kpxres.dll")"
  "$wine" regsvr32 /s "$(winpath "$com/kpxaddin.dll")"
  echo "bench-com: $arch, through COM under Wine"
  rc=0
  "$wine" "$BUILD/bench-win-$arch/bench/com/kpx-combench.exe" --benchmark_filter="$filter" "${repeat[@]}" \
    --benchmark_out="$(winpath "$out/$arch.json")" --benchmark_out_format=json || rc=$?
  "$wine" regsvr32 /s /u "$(winpath "$com/kpxaddin.dll")"
  "$wine" regsvr32 /s /u "$(winpath "$com/kpxres.dll")"
  rm -f "$WINEPREFIX/kpx-registered-$arch"
  [ "$rc" -eq 0 ] && reports+=("$out/$arch.json") || echo "bench-com: kpx-combench $arch failed (exit $rc)"
done
timeout 30 "$WINESERVER" -w || "$WINESERVER" -k || true

python3 scripts/bench_com_report.py "${reports[@]}" | tee "$out/report.txt"
