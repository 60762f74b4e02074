#!/usr/bin/env bash
# Reads hostile bytes by the extension in the engine, with the address and undefined behaviour sanitizers in the extension:
# the fuzzers' corpora, and golden vectors that are damaged anew.
#   duckdb/hostile.sh [ROUNDS]      rounds of damage to each golden vector, 20 unless given; the seed is fixed
# The sanitizers' library is loaded before node, which has none itself. So memory of the engine is watched, too, as far as
# it is taken by malloc.
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/.."

build=build/sql-asan
library=$(clang++ -print-file-name=libclang_rt.asan-x86_64.so)
mkdir -p build
cmake --preset asan-clang -B "$build" -DTAV_BUILD_DUCKDB=ON -DTAV_BUILD_TESTS=OFF -DTAV_BUILD_TOOLS=OFF \
  -DTAV_BUILD_EXAMPLES=OFF -DCMAKE_CXX_FLAGS=-shared-libasan >build/sql-asan.log || { cat build/sql-asan.log; exit 1; }
cmake --build "$build" --parallel "$(nproc)" --target tav_duckdb >build/sql-asan.log || { cat build/sql-asan.log; exit 1; }
[[ -d duckdb/node_modules ]] || npm --prefix duckdb ci --ignore-scripts --no-audit --no-fund --silent
# Node.js does not give back all that it has at its end.
TAV_BUILD=$PWD/$build LD_PRELOAD=$library ASAN_OPTIONS=detect_leaks=0:allocator_may_return_null=1 \
  UBSAN_OPTIONS=print_stacktrace=1 node duckdb/hostile.mjs "${1:-20}"
