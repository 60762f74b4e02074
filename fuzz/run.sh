#!/usr/bin/env bash
# Fuzzes for a time: builds the preset `fuzz`, runs each target from its corpus and all findings of the past, and fails
# on a new finding. What is new in a corpus and what was found stays in build/fuzz-work.
#   fuzz/run.sh SECONDS [TARGET...]      targets: read write layer tool recover build; all unless some are named
# To reproduce: build/fuzz/fuzz/fuzz_TARGET FILE. A finding becomes a file in fuzz/findings/TARGET, which every build
# runs as a test from then on.
#   FUZZ_BUILD=FOLDER    another build folder
#   FUZZ_WORK=FOLDER     another place for what is made
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/.."

if (($# == 0)) || [[ ! $1 =~ ^[0-9]+$ ]]; then
  echo "usage: $0 SECONDS [TARGET...]" >&2
  exit 2
fi
seconds=$1
shift
targets=("$@")
((${#targets[@]} > 0)) || targets=(read write layer tool recover build)

build=${FUZZ_BUILD:-build/fuzz}
work=${FUZZ_WORK:-build/fuzz-work}
mkdir -p "$work"
cmake --preset fuzz -B "$build" >"$work/configure.log" || { cat "$work/configure.log"; exit 1; }
cmake --build "$build" --parallel "$(nproc)" --target "${targets[@]/#/fuzz_}" tav_tool >"$work/build.log" || { cat "$work/build.log"; exit 1; }
fuzz/seeds.py "$build/tools/tav" "$work/seeds" >"$work/seeds.log"

export ASAN_OPTIONS=detect_stack_use_after_return=1:allocator_may_return_null=1 UBSAN_OPTIONS=print_stacktrace=1
status=0
for target in "${targets[@]}"; do
  made=$work/corpus/$target
  found=$work/findings/$target
  mkdir -p "$made" "$found"
  folders=("$made" "$work/seeds/$target")
  for kind in corpus findings; do
    [[ -d fuzz/$kind/$target ]] && folders+=("fuzz/$kind/$target")
  done
  log=$work/$target.log
  # Texts are long and hold words; streams are short.
  more=()
  [[ -f fuzz/$target.dict ]] && more+=("-dict=fuzz/$target.dict")
  if "$build/fuzz/fuzz_$target" -max_total_time="$seconds" -timeout=20 -rss_limit_mb=2048 -max_len=1024 -close_fd_mask=2 \
    -print_final_stats=1 -artifact_prefix="$found/" "${more[@]}" "${folders[@]}" 2>"$log"; then
    runs=$(sed -n 's/^stat::number_of_executed_units: //p' "$log")
    reached=$(grep -oE 'cov: [0-9]+ ft: [0-9]+ corp: [0-9]+/[0-9a-zA-Z]+' "$log" | tail -n 1)
    echo "$target: ${runs:-?} executions, $reached, no finding"
  else
    echo "$target: FOUND, see $log and $found"
    tail -n 40 "$log"
    status=1
  fi
done
exit "$status"
