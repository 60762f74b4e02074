#!/usr/bin/env bash
# Builds the shared libraries with debugging information and writes what their binary interfaces are made of.
#   dump.sh FOLDER        writes FOLDER/libtav.abi, FOLDER/libtav-inspect.abi and FOLDER/libkor.abi
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/../../.."
mkdir -p "$1"
out=$(cd "$1" && pwd)

cmake -S . -B build/abi -G Ninja -DCMAKE_BUILD_TYPE=Debug -DCMAKE_CXX_COMPILER=g++ -DTAV_BUILD_TESTS=OFF \
  -DTAV_BUILD_EXAMPLES=OFF -DTAV_BUILD_TOOLS=OFF >build/abi.log || { cat build/abi.log; exit 1; }
cmake --build build/abi >build/abi.log || { cat build/abi.log; exit 1; }
for library in tav tav-inspect kor; do
  abidw --exported-interfaces-only --headers-dir include --drop-private-types --no-corpus-path --no-comp-dir-path --no-show-locs --type-id-style hash \
    "build/abi/lib$library.so" --out-file "$out/lib$library.abi"
  sed -i "s|$PWD/||g" "$out/lib$library.abi" # the same wherever the project is checked out
done
