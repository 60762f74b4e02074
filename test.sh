#!/usr/bin/env bash
# Installs what is missing, builds and runs every test.
#   ./test.sh          with g++, optimised
#   TAV_STAGES=REGEX   only the stages whose titles match
#   ./test.sh --full   what CI runs: the checks of the sources, both compilers, the sanitizers, fuzzing, packages,
#                      most of s390x, Windows and WebAssembly
#   ./test.sh --face NAME   one face: python (the package), sql (the extension for DuckDB), browser (the page, in Chromium),
#                           firefox (the page, in Firefox)
#   ./test.sh --platforms   all that is tested of libc++, s390x and aarch64 under qemu, Windows under wine,
#                           WebAssembly under node
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")"

passed=0
failed=0
skipped=0

# processor_seconds: what the processes that have ended took so far, which another load on the machine does not change.
processor_seconds()
{
  awk 'NR == 2 { gsub(/[ms]/, " "); print int($1 * 60 + $2 + $3 * 60 + $4) }' "$work/times"
}

# stage TITLE COMMAND...: runs the command under a header and prints how long it took.
stage()
{
  local title=$1 start=$SECONDS busy
  shift
  [[ $title =~ ${TAV_STAGES:-.} ]] || return 0
  printf '\n== %s\n' "$title"
  times >"$work/times"
  busy=$(processor_seconds)
  "$@"
  times >"$work/times"
  printf '== %s: %d s, %d s of the processors\n' "$title" $((SECONDS - start)) $(($(processor_seconds) - busy))
}

totals()
{
  local line="$passed passed, $failed failed"
  if ((skipped > 0)); then line+=", $skipped skipped"; fi
  printf '\n%s\n' "$line"
}

build()
{
  local preset=$1 options=()
  shift
  while [[ ${1:-} == -D* ]]; do
    options+=("$1")
    shift
  done
  cmake --preset "$preset" -DTAV_BUILD_TESTS=ON -DTAV_BUILD_TOOLS=ON "${options[@]}" >"$work/configure.log" || { cat "$work/configure.log"; return 1; }
  cmake --build --preset "$preset" --parallel "$(nproc)" "$@" >"$work/build.log" || { grep -v '^\[[0-9]*/' "$work/build.log"; return 1; }
}

# attribute NAME: a number in the head of the report that ctest wrote.
attribute()
{
  grep -m 1 -oE "^[[:space:]]*$1=\"[0-9]+\"" "$work/report.xml" | grep -oE '[0-9]+'
}

# run_tests PRESET [CTEST ARGUMENT...]: runs them and adds to the totals what ctest's own report counts. A run without
# a test is a failure.
run_tests()
{
  local preset=$1 status=0 tests bad out
  shift
  rm -f "$work/report.xml"
  ctest --preset "$preset" --parallel "$(nproc)" --output-junit "$work/report.xml" "$@" >"$work/tests.log" 2>&1 || status=$?
  [[ -s $work/report.xml ]] || { cat "$work/tests.log"; echo "no report of the tests of preset $preset"; return 1; }
  tests=$(attribute tests)
  bad=$(attribute failures)
  out=$(($(attribute skipped) + $(attribute disabled)))
  passed=$((passed + tests - bad - out))
  failed=$((failed + bad))
  skipped=$((skipped + out))
  echo "$tests tests, $bad failed, $out skipped"
  if ((status != 0 || bad > 0 || tests == out)); then
    sed -n '/Test project/,$p' "$work/tests.log" | grep -vE '^ *[0-9]+/[0-9]+ Test .* Passed|^ *Start ' || true
    totals
    return 1
  fi
}

check_tidy()
{
  cmake --preset clang -DTAV_BUILD_TESTS=OFF -DTAV_BUILD_TOOLS=OFF >"$work/configure.log" || { cat "$work/configure.log"; return 1; }
  cmake/tidy.py build/clang
}

# cppcheck follows values further than a compiler does. A finding that is none is told so beside the line, with the reason.
check_static_analysis()
{
  cppcheck --enable=warning,performance,portability --inconclusive --std=c++20 --language=c++ --inline-suppr --quiet \
    --error-exitcode=1 -j "$(nproc)" -I include -I . -DTAV_VERSION='""' \
    --template='{file}:{line}: {severity}: {id}: {message}' \
    kor trace format storage dictionary core api layer inspect include tools examples web/module
}

# The description of the format for other languages, compiled, finds what the library finds.
check_kaitai()
{
  build release --target tav_tool
  tests/system/kaitai/run.sh build/release/tools/tav
}

check_documents()
{
  docs/site/build.sh
  tests/system/docs/check_links.py .
}

check_thread()
{
  build tsan --target kor_tests trace_tests threads_tests
  local -x TAV_MEANWHILE_MS=5000
  run_tests tsan --label-regex '^(kor|trace|threads)$'
}

# run_shards PROGRAM: runs a test program in as many parts at a time as there are processors, or as the caller's
# `shards` says, ten minutes at most. An emulator that hangs, as wine does once in a while, gets a
# second go: then all tests have to pass as ever.
run_shards()
{
  local status=0
  run_parts "$1" || status=$?
  if ((status == 124)) && [[ -n ${emulator:-} ]]; then
    echo "$1 hung and is run once more"
    status=0
    run_parts "$1" || status=$?
  fi
  return "$status"
}

run_parts()
{
  local program=$1 parts part status=0 running=()
  parts=${shards:-$(nproc)}
  rm -f "$work"/shard.*
  for ((part = 0; part < parts; ++part)); do
    (cd tests && GTEST_TOTAL_SHARDS=$parts GTEST_SHARD_INDEX=$part timeout "${patience:-600}" ${emulator:-} "$program" --gtest_brief=1) >"$work/shard.$part" 2>&1 &
    running+=($!)
  done
  for part in "${running[@]}"; do wait "$part" || status=$?; done
  cat "$work"/shard.* >"$work/tests.log"
  return "$status"
}

# run_rooms PRESET FOLDER ENDING ROOM...: the programs of whole rooms, each in one go, which spares thousands of
# starts; adds to the totals what they count themselves.
run_rooms()
{
  local preset=$1 folder=$PWD/build/$1/$2 ending=$3 room status
  shift 3
  for room in "$@"; do
    status=0
    run_shards "$folder/${room}_tests$ending" || status=$?
    count_room "$preset" "$room" "$status" || return 1
  done
}

# failed_tests: how many failed. The brief output that is asked for names each, and counts none.
failed_tests()
{
  tr -d '\r' <"$work/tests.log" | grep -cE '^\[  FAILED  \] .* \([0-9]+ ms\)$' || true
}

# gtest_count WHAT: the sum of the numbers in the last lines that the test framework printed.
gtest_count()
{
  tr -d '\r' <"$work/tests.log" | awk -v what="$1" '$1 == "[" && $2 == what && $3 == "]" && $5 ~ /^tests?[.,]/ { sum += $4 } END { print sum + 0 }'
}

count_room()
{
  local good bad out
  good=$(gtest_count PASSED)
  bad=$(failed_tests)
  out=$(gtest_count SKIPPED)
  passed=$((passed + good))
  failed=$((failed + bad))
  skipped=$((skipped + out))
  echo "$1, $2: $good passed, $bad failed, $out skipped"
  if (($3 != 0 || bad > 0 || good == 0)); then
    tail -n 60 "$work/tests.log"
    totals
    return 1
  fi
}

# run_properties PRESET FOLDER ENDING: as run_rooms, with fewer streams through rings, of which there are most; an
# emulator, which takes twenty times as long, has a tenth of the others.
run_properties()
{
  GTEST_FILTER='*RingEqualsDirect*' TAV_TEST_CASES=4000 run_rooms "$@" property
  if [[ -n ${emulator:-} ]]; then local -x TAV_TEST_CASES=60; fi
  GTEST_FILTER='-*RingEqualsDirect*' run_rooms "$@" property
}

rooms=(kor trace format storage dictionary core api golden cpp host inspect)

# labels_of ROOM...: the expression by which ctest knows the tests of these rooms.
labels_of()
{
  local IFS='|'
  echo "^($*)\$"
}

# Everything. The rooms run as whole programs: by ctest it would be a process for each of their 4,600 tests.
build_and_test()
{
  build "$1"
  run_rooms "$1" tests "" "${rooms[@]}"
  run_tests "$1" --label-exclude "$(labels_of "${rooms[@]}")"
}

# check_platform PRESET FOLDER ENDING EMULATOR ROOM...: rooms and properties on another platform, the exported symbols,
# the program's behaviour that platforms tend to differ in, and the streams that cross from and to this one.
# `ctest --preset PRESET` runs everything.
check_platform()
{
  local preset=$1 folder=$2 ending=$3 emulator=$4 programs=(tav kor tav_tool tav_generate tav_streams)
  shift 4
  if [[ $preset == windows ]]; then
    programs+=(tav_load)
    local shards=1 # of two programs that start wine together one may wait for ever
    local patience=300
  fi
  build release --target tav_tool tav_streams # with which streams cross
  [[ -n ${without_properties:-} ]] || programs+=(property_tests)
  build "$preset" --target "${@/%/_tests}" "${programs[@]}"
  run_rooms "$preset" "$folder" "$ending" "$@"
  if [[ -z ${without_properties:-} ]]; then run_properties "$preset" "$folder" "$ending"; fi
  run_tests "$preset" --parallel "${shards:-$(nproc)}" --tests-regex '^(platform\.cross|exports\..*|tools\.platform_test)$'
}

# The longest tests of the program run once, with g++ and without sanitizers.
slow='tools\.(json|check|recover|damages|build|forms|guess|collect)_test'

# Sanitizers keep a process busy at its start and its end, so rooms run as a whole; the program's tests as ever. With
# clang++, which compiles what is sanitized in half of g++'s time, and whose sanitizers look for more.
check_sanitizers()
{
  build asan-clang
  local -x ASAN_OPTIONS=detect_leaks=1:detect_stack_use_after_return=1:strict_string_checks=1:allocator_may_return_null=1
  local -x UBSAN_OPTIONS=print_stacktrace=1
  run_rooms asan-clang tests "" "${rooms[@]}"
  run_properties asan-clang tests ""
  # A writer and three readers for some seconds; tests/system/threads/meanwhile.sh does it for a minute.
  local -x TAV_MEANWHILE_MS=5000
  run_tests asan-clang --label-regex '^(tools|fuzz|faults|disk|kill|threads)$' --exclude-regex "^($slow)$"
}

# With clang++ the tests run where libc++ and the sanitizers are; here the libraries, the program and the examples.
check_clang()
{
  build clang --target tav kor tav_tool snapshot growing_storage layer_tour
}

# The tests link the library's objects statically everywhere; here the installed static libraries are what is new.
check_static()
{
  build static --target tav kor tav_texts snapshot growing_storage layer_tour record
  run_tests static --tests-regex '^(install|examples)\.'
}

# The benchmarks, with warnings as errors, and the least of them once; the others run in the nightly run.
check_benchmarks()
{
  cmake --preset bench >"$work/configure.log" || { cat "$work/configure.log"; return 1; }
  cmake --build --preset bench --parallel "$(nproc)" >"$work/build.log" || { grep -v '^\[[0-9]*/' "$work/build.log"; return 1; }
  build/bench/bench/tav_walk_memory >"$work/walks.log" || return 1
  [[ $(wc -l <"$work/walks.log") == 4 ]] || return 1 # each way has seen every node
  build/bench/bench/tav_parts 5 >"$work/parts.log" || return 1 # less is not cut into parts
  grep -q '^W10/find_hosts: one thread' "$work/parts.log" || return 1
  ! grep -E 'something else|are missing|other nodes' "$work/parts.log"
}

# What one compiler run cannot see: two types or functions of one name that differ between objects. At link time g++ 12
# also sees overflows where there are none (its bug 105651), so the preset leaves that warning out; any other is an error.
check_link_time()
{
  build lto --target tav kor tav_tool all_in_one
  ! grep -A 5 'warning:' "$work/build.log"
}

# The Python package of the build folder, with the Python that the packages are of.
check_python()
{
  build release -DTAV_BUILD_PYTHON=ON -DPython3_EXECUTABLE=/usr/bin/python3 --target tav_python tav_tool
  local -x PYTHONPATH=$PWD/build/release/python PYTHONDONTWRITEBYTECODE=1 TAV_TOOL=$PWD/build/release/tools/tav
  /usr/bin/python3 -m mypy --strict --no-error-summary --cache-dir="$work/mypy" python/tav
  /usr/bin/python3 -m pytest -q -p no:cacheprovider --junitxml="$work/report.xml" python/tests >"$work/tests.log" 2>&1 ||
    { tail -n 60 "$work/tests.log"; return 1; }
  count_python
  python/check-wheel.sh
}

check_browser()
{
  local status=0
  web/build.sh >"$work/build.log" 2>&1 || { tail -n 40 "$work/build.log"; return 1; }
  build release --target tav_tool tav_generate
  (cd web && TAV_TOOL=$PWD/../build/release/tools/tav npm test --silent) >"$work/tests.log" 2>&1 || status=$?
  count_browser
  if ((status != 0)); then
    sed -n '/^not ok/,/^  \.\.\./p' "$work/tests.log"
    return 1
  fi
}

# Adds to the totals what node counted. A run without a test is a failure.
count_browser()
{
  local good bad out
  good=$(sed -n 's/^# pass //p' "$work/tests.log")
  bad=$(sed -n 's/^# fail //p' "$work/tests.log")
  out=$(sed -n 's/^# skipped //p' "$work/tests.log")
  passed=$((passed + good))
  failed=$((failed + bad))
  skipped=$((skipped + out))
  echo "$((good + bad)) tests, $bad failed, $out skipped"
  ((good > 0)) || { tail -n 40 "$work/tests.log"; return 1; }
}

# Adds to the totals what pytest's report counts.
count_python()
{
  local tests bad out
  tests=$(grep -oE ' tests="[0-9]+"' "$work/report.xml" | grep -oE '[0-9]+' | head -n 1)
  bad=$(grep -oE ' (failures|errors)="[0-9]+"' "$work/report.xml" | grep -oE '[0-9]+' | awk '{ sum += $1 } END { print sum + 0 }')
  out=$(grep -oE ' skipped="[0-9]+"' "$work/report.xml" | grep -oE '[0-9]+' | head -n 1)
  passed=$((passed + tests - bad - out))
  failed=$((failed + bad))
  skipped=$((skipped + out))
  echo "$tests tests, $bad failed, $out skipped"
  ((tests > out && bad == 0))
}

# The extension for DuckDB, in the engine that duckdb/package.json names.
check_sql()
{
  build release -DTAV_BUILD_DUCKDB=ON -DTAV_BUILD_PYTHON=ON -DPython3_EXECUTABLE=/usr/bin/python3 \
    --target tav_duckdb tav_python tav_tool tav_generate
  npm --prefix duckdb ci --ignore-scripts --no-audit --no-fund --silent >"$work/npm.log" 2>&1 ||
    { cat "$work/npm.log"; return 1; }
  node --test --test-reporter=tap duckdb/tests/*.test.mjs >"$work/tests.log" ||
    { grep -A 40 -E '^ *not ok' "$work/tests.log"; return 1; }
  count_sql
}

# Adds to the totals what the runner counts.
count_sql()
{
  local tests bad out
  tests=$(awk '/^# tests / { sum += $3 } END { print sum + 0 }' "$work/tests.log")
  bad=$(awk '/^# (fail|cancelled) / { sum += $3 } END { print sum + 0 }' "$work/tests.log")
  out=$(awk '/^# (skipped|todo) / { sum += $3 } END { print sum + 0 }' "$work/tests.log")
  passed=$((passed + tests - bad - out))
  failed=$((failed + bad))
  skipped=$((skipped + out))
  echo "$tests tests, $bad failed, $out skipped"
  ((tests > out && bad == 0))
}

check_libcxx()
{
  check_platform libcxx tests "" "" "$@"
}

check_s390x()
{
  check_platform s390x tests "" "qemu-s390x-static -L /usr/s390x-linux-gnu" "$@"
}

check_aarch64()
{
  check_platform aarch64 tests "" "qemu-aarch64-static -L /usr/aarch64-linux-gnu" "$@"
}

check_windows()
{
  check_platform windows bin .exe "$PWD/cmake/run-windows.sh" "$@"
}

# WebAssembly, under node: what the list beside the program says; with --short without what takes long to be built.
check_wasm()
{
  local status=0 count
  tests/system/platform/wasm.py --build "$@" >"$work/tests.log" 2>&1 || status=$?
  count=$(sed -n 's/^\([0-9]*\) passed, [0-9]* faults$/\1/p' "$work/tests.log")
  passed=$((passed + ${count:-0}))
  tail -n 1 "$work/tests.log"
  if ((status != 0)); then
    failed=$((failed + 1))
    tail -n 80 "$work/tests.log"
    return 1
  fi
}

platforms()
{
  stage "libc++" check_libcxx "${rooms[@]}"
  stage "s390x, big-endian" check_s390x "${rooms[@]}"
  stage "aarch64" check_aarch64 "${rooms[@]}"
  stage "Windows" check_windows "${rooms[@]}"
  stage "WebAssembly" check_wasm
}

full()
{
  stage "format" cmake/format.sh --check
  stage "rooms" cmake/check-rooms.py
  stage "clang-tidy" check_tidy
  stage "cppcheck" check_static_analysis
  stage "documents" check_documents
  stage "Kaitai" check_kaitai
  stage "g++" build_and_test release
  stage "benchmarks" check_benchmarks
  stage "demo" ./demo.sh
  stage "Python" check_python
  stage "SQL" check_sql
  stage "browser" check_browser
  stage "clang++" check_clang
  stage "static libraries" check_static
  stage "link-time optimisation" check_link_time
  # What touches bytes, files or the system; CI has no time for more.
  stage "s390x, big-endian" check_s390x kor trace format storage core api golden host
  without_properties=1 stage "Windows" check_windows kor trace format storage core api golden host
  stage "WebAssembly" check_wasm --short
  stage "address and undefined behaviour" check_sanitizers
  stage "fuzzing" fuzz/run.sh fixed
  stage "threads" check_thread
  stage "Debian packages" cmake/check-packages.sh
  stage "binary interface" tests/system/abi/check.sh
}

work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT

case ${1:-} in
  "")
    stage "packages" cmake/install-packages.sh build test
    stage "g++" build_and_test release
    ;;
  --full)
    stage "packages" cmake/install-packages.sh build test full bench platforms wasm python sql browser site
    # The same sources are compiled again and again, at every place where the project is checked out.
    export CMAKE_CXX_COMPILER_LAUNCHER=ccache CCACHE_BASEDIR=$PWD CCACHE_NOHASHDIR=1
    export CCACHE_SLOPPINESS=pch_defines,time_macros,include_file_mtime,include_file_ctime
    full
    ;;
  --face)
    case ${2:-} in
      python)
        stage "packages" cmake/install-packages.sh python
        stage "Python" check_python
        ;;
      sql)
        stage "packages" cmake/install-packages.sh sql
        stage "SQL" check_sql
        ;;
      browser)
        stage "packages" cmake/install-packages.sh build test browser
        stage "browser" check_browser
        ;;
      firefox)
        stage "packages" cmake/install-packages.sh build test browser firefox
        TAV_BROWSER=/usr/bin/firefox-esr stage "Firefox" check_browser
        ;;
      *)
        echo "usage: $0 --face python|sql|browser|firefox" >&2
        exit 2
        ;;
    esac
    ;;
  --platforms)
    stage "packages" cmake/install-packages.sh build test platforms wasm
    platforms
    ;;
  *)
    echo "usage: $0 [--full | --face python|sql|browser|firefox | --platforms]" >&2
    exit 2
    ;;
esac
totals
