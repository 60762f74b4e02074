#!/usr/bin/env bash
# The project's version, which CMakeLists.txt states.
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/.."
version=$(sed -nE '/^project\(/,/\)/ s/^ *VERSION ([0-9.]+)$/\1/p' CMakeLists.txt)
[[ $version =~ ^[0-9]+\.[0-9]+\.[0-9]+$ ]] || { echo "CMakeLists.txt states no version" >&2; exit 1; }
echo "$version"
