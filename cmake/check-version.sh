#!/usr/bin/env bash
# Every file that states the project's version states the same one. CMakeLists.txt is where it is changed first.
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/.."
version=$(cmake/version.sh)

# FILE and the expression that finds the version in it, once.
places=(
  packaging/vcpkg/vcpkg.json '"version-semver": "([^"]+)"'
)
status=0
for ((i = 0; i < ${#places[@]}; i += 2)); do
  file=${places[i]}
  [[ -f $file ]] || continue
  stated=$(sed -nE "s/^.*${places[i + 1]#^}.*$/\1/p" "$file" | head -n 1)
  if [[ $stated != "$version" ]]; then
    echo "$file states version '$stated', CMakeLists.txt states '$version'"
    status=1
  fi
done
exit "$status"
