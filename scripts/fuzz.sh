#!/usr/bin/env bash
# Runs each libFuzzer target of a KPX_FUZZ build for a bounded time, one
# after the other, and sums up what each reached.
# Usage: scripts/fuzz.sh BUILD_DIR [TARGET...]   (all targets when none named)
# FUZZ_SECONDS (default 60) bounds each run. What a target finds is kept in
# BUILD_DIR/corpus/TARGET, so later runs start from there; inputs that
# break a target land in BUILD_DIR/findings/TARGET/.
set -uo pipefail

build=${1:?usage: scripts/fuzz.sh BUILD_DIR [TARGET...]}
shift
seconds=${FUZZ_SECONDS:-60}
source_dir=$(cd "$(dirname "$0")/.." && pwd)
targets=("$@")
if [ ${#targets[@]} -eq 0 ]; then
  for seeds in "$source_dir"/fuzz/seeds/*/; do targets+=("$(basename "$seeds")"); done
fi

failed=()
summary=()
for target in "${targets[@]}"; do
  program="$build/fuzz/fuzz-$target"
  if [ ! -x "$program" ]; then
    echo "fuzz: no $program (build the fuzz-all target of a KPX_FUZZ build)" >&2
    exit 2
  fi
  corpus="$build/corpus/$target"
  findings="$build/findings/$target"
  log="$build/logs/$target.log"
  mkdir -p "$corpus" "$findings" "$(dirname "$log")"
  dict=()
  [ -f "$source_dir/fuzz/dicts/$target.dict" ] && dict=(-dict="$source_dir/fuzz/dicts/$target.dict")
  echo "fuzz: $target for ${seconds}s (log: $log)"
  "$program" "$corpus" "$source_dir/fuzz/seeds/$target" "${dict[@]}" \
    -max_total_time="$seconds" -timeout=10 -rss_limit_mb=2048 -print_final_stats=1 \
    -artifact_prefix="$findings/" >"$log" 2>&1
  status=$?
  last=$(grep -E '^#[0-9]+.*cov: ' "$log" | tail -1 | sed -E 's/^#([0-9]+)\s+\S+\s+(cov: [0-9]+ ft: [0-9]+).*/\2 execs: \1/')
  if [ $status -ne 0 ]; then
    failed+=("$target")
    summary+=("$target: FAILED ($last) - see $log and $findings/")
  else
    summary+=("$target: $last")
  fi
done

printf '%s\n' "${summary[@]}"
if [ ${#failed[@]} -ne 0 ]; then
  echo "fuzz: failures in ${failed[*]}" >&2
  exit 1
fi
