#!/usr/bin/env bash
# Builds the library instrumented, runs the tests of the rooms, and says what of it they reach. Fails below the limits,
# or when a line is not reached that docs/coverage.md does not name.
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/../../.."

cmake/install-packages.sh build test coverage
folder=build/coverage
rooms=(kor trace format storage core dictionary api golden cpp inspect faults threads disk)
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT

quietly()
{
  "$@" >"$work/log" 2>&1 || { cat "$work/log"; return 1; }
}

quietly cmake --preset coverage -DTAV_BUILD_TESTS=ON -DTAV_BUILD_TOOLS=OFF -DTAV_BUILD_EXAMPLES=OFF
quietly cmake --build --preset coverage --parallel "$(nproc)" --target "${rooms[@]/%/_tests}" property_tests preloaded_tests
find "$folder" -name '*.gcda' -delete

# The random tests repeat themselves: a few hundred cases reach what thousands do, and a few dozen of whole tables.
for room in "${rooms[@]}"; do
  (cd tests && TAV_TEST_CASES=40 quietly "../$folder/tests/${room}_tests" --gtest_brief=1)
done
(cd tests && GTEST_FILTER=-HostileStream.TruncatedAtEveryLength TAV_TEST_CASES=300 quietly "../$folder/tests/property_tests" --gtest_brief=1)
quietly ctest --preset coverage --label-regex '^faults$'
# The search for eye catchers is there once more, for processors without the newest vector instructions.
if [[ $(uname -m) == x86_64 ]]; then
  (cd tests && quietly qemu-x86_64-static -cpu Nehalem "../$folder/tests/format_tests" --gtest_brief=1)
fi

# The headers of include/ are templates and inline functions, so their counts are in the objects of tests, too. Windows'
# sources are not compiled here. For the compiler every call can throw, which makes a branch of it.
gcovr --root . -j "$(nproc)" --json "$work/coverage.json" \
  --filter 'api/' --filter 'core/' --filter 'format/' --filter 'storage/' --filter 'dictionary/' --filter 'trace/' \
  --filter 'kor/' --filter 'layer/' --filter 'inspect/' \
  --filter 'include/' \
  --exclude-throw-branches --exclude-unreachable-branches \
  "$folder"/{api,layer,format,storage,dictionary,trace,kor,inspect} \
  "$folder"/tests/CMakeFiles/{core,cpp,inspect}_tests.dir
tests/system/reach/coverage.py "$work/coverage.json" docs/coverage.md
