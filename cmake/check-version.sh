#!/usr/bin/env bash
# Every file that states the project's version states the same one. CMakeLists.txt is where it is changed first; between
# two releases it is that of the last one.
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/.."
version=$(cmake/version.sh)

# FILE and the expression that finds the version in its first line that has one.
places=(
  packaging/vcpkg/vcpkg.json '"version-semver": "([^"]+)"'
  CHANGELOG.md '^## \[([0-9][^]]*)\] - [0-9]{4}-[0-9]{2}-[0-9]{2}$'
  tests/system/abi/released/VERSION '^version (.*)$'
)
status=0
for ((i = 0; i < ${#places[@]}; i += 2)); do
  file=${places[i]}
  stated=$([[ ! -f $file ]] || sed -nE "/${places[i + 1]}/{s/^.*${places[i + 1]#^}.*$/\1/p; q}" "$file")
  if [[ $stated != "$version" ]]; then
    echo "$file states version '$stated', CMakeLists.txt states '$version'"
    status=1
  fi
done
exit "$status"
