#!/bin/bash
# A writer and three readers of one file for a minute, under the address and undefined behaviour sanitizers, and under
# the one of threads: what CI does for some seconds. Run by a person, or at night; builds what it needs.
#
#     tests/system/threads/meanwhile.sh [SECONDS]
#
# A line for each says how often a reader walked through the file.
set -euo pipefail
cd "$(dirname "$0")/../../.."
readonly seconds=${1:-60}
export ASAN_OPTIONS=detect_leaks=1:detect_stack_use_after_return=1
export UBSAN_OPTIONS=print_stacktrace=1
for preset in asan-clang tsan; do
  cmake --preset "$preset" >/dev/null
  cmake --build --preset "$preset" --target threads_tests >/dev/null
  echo "$preset, $seconds seconds:"
  (cd tests && TAV_MEANWHILE_MS=$((seconds * 1000)) "../build/$preset/tests/threads_tests" \
    --gtest_brief=1 --gtest_filter='ReadersMeanwhile.*')
done
