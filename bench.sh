#!/usr/bin/env bash
# Installs what is missing, builds the benchmarks as users get the library, runs them and prints the tables.
#   ./bench.sh           about ten minutes on a quiet machine; also writes docs/performance.{md,json,svg}
#   ./bench.sh --program the program's commands alone, some minutes; writes their part of docs/performance.{md,json}
#   ./bench.sh --quick   everything small once, to see that it works; writes no document
# BENCH_DIR: the folder for a file of 4 GiB, /tmp when unset.
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")"

case ${1:-} in
  "") library=1 measure=() report=(--documents docs) ;;
  --program) library=0 measure=() report=(--documents docs) ;;
  --quick) library=1 measure=(--quick) report=() ;;
  *)
    echo "usage: $0 [--quick | --program]" >&2
    exit 2
    ;;
esac

cmake/install-packages.sh build bench
cmake --preset bench >/dev/null
cmake --build --preset bench --parallel "$(nproc)" | grep -vE '^\[[0-9]+/' || [[ ${PIPESTATUS[0]} == 0 ]]
python=/usr/bin/python3 # the one that the packages are for, whatever else is in the path
rm -f build/bench/result.json
((library == 0)) || "$python" -B bench/measure.py build/bench build/bench/result.json "${measure[@]}"
((library == 0)) || "$python" -B bench/compilers.py build/bench build/bench/result.json "${measure[@]}"
echo "bench.sh: the library's part took ${SECONDS} s" >&2
"$python" -B bench/program.py build/bench build/bench/result.json "${measure[@]}"
echo "bench.sh: ${SECONDS} s in all" >&2
"$python" -B bench/report.py build/bench/result.json "${report[@]}"
