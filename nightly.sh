#!/usr/bin/env bash
# What CI has no time for, and a line in docs/nightly.md for each part that was run: when, of which commit, what, how long,
# and what came of it. A part that fails does not keep the others from running.
#   ./nightly.sh MINUTES [PART...]    MINUTES: how much of a part that can go on for ever; parts: all unless some are named
#     fuzz         every target of fuzz/, in the time together, which docs/fuzzing.md sums up
#     hostile      the growth of cost over hostile streams: all sizes and accesses from 90 minutes on, else the shortest
#     crash        disks as a power failure may leave them, 200 a minute
#     kill         writers and recorders that are killed, 5 a minute each
#     properties   random streams, 1,000 of each property a minute
#     meanwhile    readers and a writer of one file under sanitizers, for the time
#     damages      damaged streams that are recovered, 100 a minute
#     mutation     changes of the library that tests have to notice, one a minute of each group
#     coverage     lines and branches that tests reach
#     platforms    every room with libc++, on s390x, aarch64 and Windows; WebAssembly
#     firefox      the page's tests in Firefox
#     page         files that are opened, gone through and closed in one page, for the time
#     bench        every benchmark once, to see that it works
#     python       the package under a debug Python, which counts references
#     reproduce    all artefacts built twice
#     bare         the packages, the wheel, the page and the extension on a machine that has nothing; needs root
#   NIGHTLY_RECORD=FILE    another record
# What each part printed is in build/nightly/PART.log.
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")"

all=(fuzz hostile crash kill properties meanwhile damages mutation coverage platforms firefox page bench python reproduce bare)
usage() { sed -n '2,/^set /{/^set /d; s/^# \{0,1\}//; p}' "$0" >&2; exit 2; }
[[ ${1:-} =~ ^[1-9][0-9]*$ ]] || usage
minutes=$1
shift
parts=("$@")
((${#parts[@]} > 0)) || parts=("${all[@]}")
for part in "${parts[@]}"; do
  [[ " ${all[*]} " == *" $part "* ]] || { echo "$0: no part '$part'; there are: ${all[*]}" >&2; exit 2; }
done
record=${NIGHTLY_RECORD:-docs/nightly.md}
logs=build/nightly
mkdir -p "$logs"

# built PRESET TARGET...: what the parts below run.
built()
{
  local preset=$1
  shift
  cmake --preset "$preset" -DTAV_BUILD_TESTS=ON -DTAV_BUILD_TOOLS=ON >/dev/null
  cmake --build --preset "$preset" --parallel "$(nproc)" --target "$@" >"$logs/build.log" || { grep -v '^\[[0-9]*/' "$logs/build.log"; return 1; }
}

# Each part prints, last of all, what it did in one line.

part_fuzz()
{
  local targets seconds
  targets=$(sed -n 's/^.*|| targets=(\(.*\))$/\1/p' fuzz/run.sh | wc -w)
  seconds=$((minutes * 60 * $(nproc) / targets))
  fuzz/run.sh "$seconds" | fuzz/tally.py | tee "$logs/fuzz.targets"
  awk -v seconds="$seconds" '/executions/ { gsub(/[^0-9]/, "", $2); sum += $2; ++targets }
    END { printf "%d targets for %d s each, %d executions, no finding\n", targets, seconds, sum }' "$logs/fuzz.targets"
}

part_hostile()
{
  local extent=()
  built release scale_hostile
  ((minutes < 90)) || extent=(--full)
  tests/system/scale/hostile_test.py "${extent[@]}" >"$logs/hostile.table" || { tail -n 1 "$logs/hostile.table"; return 1; }
  awk 'NR == 2 { worst = $4 } { last = $0 } END { print last ", the worst " worst }' "$logs/hostile.table"
}

part_crash()
{
  built release crash_tests
  (cd tests && TAV_CRASH_IMAGES=$((minutes * 200)) ../build/release/tests/crash_tests --gtest_brief=1)
  echo "$((minutes * 200)) images, every node back that sync() had promised"
}

part_kill()
{
  built release kill_writer kill_recorder tav_tool
  TAV_KILLS=$((minutes * 5)) TAV_TEST_SEED=$RANDOM ctest --preset release -L '^kill$'
  echo "$((minutes * 5)) kills of each kind of writer"
}

part_properties()
{
  built release property_tests
  (cd tests && TAV_TEST_CASES=$((minutes * 1000)) TAV_TEST_SEED=$RANDOM ../build/release/tests/property_tests --gtest_brief=1)
  echo "$((minutes * 1000)) cases of each"
}

part_meanwhile()
{
  tests/system/threads/meanwhile.sh $((minutes * 60))
  echo "$((minutes * 60)) s under each sanitizer"
}

part_damages()
{
  local count=$((minutes * 100)) first=$((RANDOM * 1000))
  built release tav_tool tav_generate
  TAV_DAMAGES=$count TAV_FIRST_DAMAGE=$first ctest --preset release -R '^tools\.damages_test$'
  echo "$count damages from number $first on"
}

part_mutation()
{
  tests/system/reach/mutate.py --count "$minutes" --seed "$RANDOM" | tee "$logs/mutation.table"
  awk '$1 == "all" { print $2 " changes, " $3 " noticed, " $4 " argued to be none, " $5 " unnoticed" }' "$logs/mutation.table"
}

part_coverage()
{
  tests/system/reach/coverage.sh | tee "$logs/coverage.table"
  echo "within the limits"
}

part_platforms()
{
  ./test.sh --platforms | tee "$logs/platforms.list"
  tail -n 1 "$logs/platforms.list"
}

part_firefox()
{
  ./test.sh --face firefox | tee "$logs/firefox.list"
  tail -n 1 "$logs/firefox.list"
}

part_page()
{
  web/build.sh
  (cd web && node test/hour.mjs "$minutes")
}

part_bench()
{
  ./bench.sh --quick
  echo "all ran"
}

part_python()
{
  python/check-references.sh | tee "$logs/python.list"
  echo "no reference left by $(grep -c 'references left' "$logs/python.list") kinds of operations"
}

part_reproduce()
{
  packaging/reproduce.sh | tee "$logs/reproduce.list"
  echo "$(grep -c '^same bytes: ' "$logs/reproduce.list") artefacts, the same bytes"
}

part_bare()
{
  rm -rf "$logs/packages" # those of another version
  packaging/build.sh "$PWD/$logs/packages" packages wheel page sql
  packaging/bare-machine.sh "$logs/packages"
}

# say PART SECONDS RESULT: a line of the record, which is begun where there is none.
say()
{
  local commit
  commit=$(git rev-parse --short HEAD)
  [[ -z $(git status --porcelain --untracked-files=no -- . ":!$record" ":!docs/fuzzing.md") ]] || commit+=" and changes"
  if [[ ! -s $record ]]; then
    cat >"$record" <<'HEAD'
# Long runs

What was run that CI has no time for. `./nightly.sh MINUTES` runs it and writes these lines, the last ones last;
it tells what its parts are when it is called without an argument.

| date | commit | part | minutes given | took | result |
| --- | --- | --- | --- | --- | --- |
HEAD
  fi
  printf '| %s | %s | %s | %d | %d min %02d s | %s |\n' "$(date -u +%Y-%m-%d)" "$commit" "$1" "$minutes" \
    $(($2 / 60)) $(($2 % 60)) "${3//|/\\|}" >>"$record"
}

status=0
for part in "${parts[@]}"; do
  start=$SECONDS
  echo "== $part"
  # In a shell of its own, where the first command that fails ends the part; in a condition it would not.
  set +e
  (set -e; "part_$part") >"$logs/$part.log" 2>&1
  failed=$?
  set -e
  result=$(grep -v '^[[:space:]]*$' "$logs/$part.log" | tail -n 1 || true)
  if ((failed != 0)); then
    status=1
    result="FAILED: $result"
  fi
  say "$part" $((SECONDS - start)) "${result:-nothing was said}"
  echo "$result"
done
exit "$status"
