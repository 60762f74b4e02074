#!/usr/bin/env bash
# The layer as a module: a program that imports it, and the tour of the layer with its include made an import.
#   run.sh BUILD_FOLDER COMPILER
set -euo pipefail
here=$(cd "$(dirname "${BASH_SOURCE[0]}")" && pwd)
root=$(cd "$here/../../.." && pwd)
build=$(cd "$1" && pwd)
compiler=$2

work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
options=(-std=c++20 -Wall -Wextra -Wpedantic -Werror)
"$compiler" "${options[@]}" -I "$root/include" --precompile "$root/include/tav/tav.cppm" -o "$work/tav.pcm"

sed 's|^#include "tav/tav.hpp"$|import tav;|' "$root/examples/layer_tour.cpp" >"$work/layer_tour.cpp"
grep -qx 'import tav;' "$work/layer_tour.cpp"
cp "$here/imports.cpp" "$work/"
export TMPDIR=$work # where the tour writes
cd "$work"
for program in imports layer_tour; do
  "$compiler" "${options[@]}" -fmodule-file=tav=tav.pcm "$program.cpp" tav.pcm -o "$program" -L "$build" -ltav -lkor
  LD_LIBRARY_PATH=$build "./$program"
done
