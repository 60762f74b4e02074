#!/usr/bin/env bash
# Writes the lists anew from a build, for review.
#   update.sh [BUILD FOLDER]
set -euo pipefail
here=$(cd "$(dirname "${BASH_SOURCE[0]}")" && pwd)
build=${1:-$here/../../../build/release}
for library in kor tav tav-inspect; do
  "$here/symbols.sh" "$build/lib$library.so" >"$here/lib$library.symbols"
done
wc -l "$here"/*.symbols
