#!/usr/bin/env bash
# Makes the sdist and, of it alone, the wheel. Nothing comes from a network.
#   python/build-wheel.sh FOLDER       FOLDER: where they go
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/.."

(($# == 1)) || { echo "usage: $0 FOLDER" >&2; exit 2; }
mkdir -p "$1"
out=$(cd "$1" && pwd)
mkdir -p build
work=$(mktemp -d build/sdist.XXXXXX) # where a compiler cache may take one checkout for another
trap 'rm -rf "$work" python/*.egg-info' EXIT

rm -rf python/*.egg-info # a list of files in it would be taken for this one
/usr/bin/python3 -m build --no-isolation --sdist -o "$out" python
tar -xzf "$out"/tav-*.tar.gz -C "$work" --strip-components 1
chmod -R u=rwX,go=rX "$work" # the wheel keeps rights, which are those of a checkout
(cd "$work" && /usr/bin/python3 -m build --no-isolation --wheel -o "$out" .)
