#!/usr/bin/env bash
# Reads hostile bytes by the Python package, with the address and undefined behaviour sanitizers in its compiled part.
#   python/hostile.sh [ROUNDS]      rounds of damage to each golden vector, 50 unless given; the seed is fixed
# The sanitizers' library is loaded before the interpreter, which has none itself. So memory of the interpreter is watched,
# too, as far as it is taken by malloc.
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/.."

build=build/python-asan
library=$(clang++ -print-file-name=libclang_rt.asan-x86_64.so)
mkdir -p build
cmake --preset asan-clang -B "$build" -DTAV_BUILD_PYTHON=ON -DPython3_EXECUTABLE=/usr/bin/python3 -DTAV_BUILD_TESTS=OFF \
  -DTAV_BUILD_TOOLS=OFF -DTAV_BUILD_EXAMPLES=OFF -DCMAKE_CXX_FLAGS=-shared-libasan >build/python-asan.log ||
  { cat build/python-asan.log; exit 1; }
cmake --build "$build" --parallel "$(nproc)" --target tav_python >build/python-asan.log || { cat build/python-asan.log; exit 1; }
# The interpreter does not give back all that it has at its end, and takes small blocks from its own store unless told not to.
PYTHONMALLOC=malloc PYTHONDONTWRITEBYTECODE=1 PYTHONPATH=$build/python LD_PRELOAD=$library \
  ASAN_OPTIONS=detect_leaks=0:allocator_may_return_null=1 UBSAN_OPTIONS=print_stacktrace=1 \
  /usr/bin/python3 python/tests/hostile.py "${1:-50}"
