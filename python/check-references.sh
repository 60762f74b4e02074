#!/usr/bin/env bash
# Rounds of every operation of the package under a debug Python, which counts all references: none may be left behind.
#   python/check-references.sh
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/.."

work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
folder=build/python-debug

cmake/install-packages.sh python python-debug
{
  cmake --preset release -B "$folder" -DTAV_BUILD_PYTHON=ON -DTAV_BUILD_TESTS=OFF -DTAV_BUILD_TOOLS=OFF \
    -DTAV_BUILD_EXAMPLES=OFF -DPython3_EXECUTABLE=/usr/bin/python3-dbg &&
    cmake --build "$folder" --parallel "$(nproc)" --target tav_python
} >"$work/build.log" || { tail -n 40 "$work/build.log"; exit 1; }
PYTHONDONTWRITEBYTECODE=1 PYTHONPATH=$folder/python /usr/bin/python3-dbg python/tests/references.py
