#!/usr/bin/env bash
# Fuzzes for a time or a number of times: builds the preset `fuzz`, runs each target from its corpus and all findings
# of the past, and fails on a new finding. What is new in a corpus and what was found stays in build/fuzz-work.
#   fuzz/run.sh SECONDS [TARGET...]      targets: read write layer append c path dictionary table rows plan tool recover
#                                        build; all unless some are named
#   fuzz/run.sh fixed [TARGET...]        the same inputs in every run, as many as take about half a minute: a fast machine
#                                        finds nothing that a slow one has passed
# To reproduce: build/fuzz/fuzz/fuzz_TARGET FILE. A finding becomes a file in fuzz/findings/TARGET, which every build
# runs as a test from then on.
#   FUZZ_BUILD=FOLDER    another build folder
#   FUZZ_WORK=FOLDER     another place for what is made
#   FUZZ_SEED=N          which choices; 1 when their number is fixed, else others each time
#   FUZZ_JOBS=N          how many targets at a time; as many as there are processors
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/.."

if (($# == 0)) || [[ ! $1 =~ ^([0-9]+|fixed)$ ]]; then
  echo "usage: $0 SECONDS|fixed [TARGET...]" >&2
  exit 2
fi
seconds=$1
shift
declare -A executions=([read]=35000 [write]=10000 [layer]=70000 [append]=8000 [c]=2500 [path]=1500 [dictionary]=30000 [table]=10000 [rows]=5000 [plan]=2000 [tool]=10000 [recover]=45000 [build]=8500)
targets=("$@")
((${#targets[@]} > 0)) || targets=(read write layer append c path dictionary table rows plan tool recover build)

build=${FUZZ_BUILD:-build/fuzz}
work=${FUZZ_WORK:-build/fuzz-work}
jobs=${FUZZ_JOBS:-$(nproc)}
mkdir -p "$work"
cmake --preset fuzz -B "$build" >"$work/configure.log" || { cat "$work/configure.log"; exit 1; }
cmake --build "$build" --parallel "$(nproc)" --target "${targets[@]/#/fuzz_}" tav_tool >"$work/build.log" || { cat "$work/build.log"; exit 1; }
fuzz/seeds.py "$build/tools/tav" "$work/seeds" >"$work/seeds.log"

# What is compared steers the choices, addresses, too: with all variables and addresses the same, the choices are.
surroundings=(env ASAN_OPTIONS=detect_stack_use_after_return=1:allocator_may_return_null=1 UBSAN_OPTIONS=print_stacktrace=1)
if [[ $seconds == fixed ]]; then
  surroundings=(env -i PATH=/usr/bin:/bin "${surroundings[@]:1}")
  if setarch -R true 2>/dev/null; then surroundings+=(setarch -R); fi
fi

# fuzz TARGET: runs it from everything that is known for it.
fuzz()
{
  local target=$1 log=$work/$1.log made=$work/corpus/$1 found=$work/findings/$1 kind runs reached TIMEFORMAT='%U %S' user system
  [[ $seconds != fixed ]] || rm -rf "$made"
  mkdir -p "$made" "$found"
  local folders=("$made" "$work/seeds/$target")
  for kind in corpus findings; do
    [[ -d fuzz/$kind/$target ]] && folders+=("fuzz/$kind/$target")
  done
  # Texts are long and hold words; streams are short.
  local more=("-max_total_time=$seconds" "-seed=${FUZZ_SEED:-0}")
  [[ $seconds != fixed ]] || more=("-runs=${executions[$target]}" "-seed=${FUZZ_SEED:-1}" -reload=0)
  [[ -f fuzz/$target.dict ]] && more+=("-dict=fuzz/$target.dict")
  if { time "${surroundings[@]}" "$build/fuzz/fuzz_$target" -timeout=20 -rss_limit_mb=2048 -max_len=1024 -close_fd_mask=3 \
    -print_final_stats=1 -artifact_prefix="$found/" "${more[@]}" "${folders[@]}" 2>"$log"; } 2>"$work/$target.time"; then
    read -r user system <"$work/$target.time"
    runs=$(sed -n 's/^stat::number_of_executed_units: //p' "$log")
    reached=$(grep -oE 'cov: [0-9]+ ft: [0-9]+ corp: [0-9]+/[0-9a-zA-Z]+' "$log" | tail -n 1)
    echo "$target: ${runs:-?} executions, $((${user%.*} + ${system%.*})) s, $reached, no finding"
    return 0
  fi
  echo "$target: FOUND, see $log and $found"
  tail -n 40 "$log"
  return 1
}

status=0
running=0
for target in "${targets[@]}"; do
  if ((running == jobs)); then
    wait -n || status=1
    running=$((running - 1))
  fi
  fuzz "$target" &
  running=$((running + 1))
done
for ((; running > 0; --running)); do wait -n || status=1; done
exit "$status"
