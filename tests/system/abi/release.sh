#!/usr/bin/env bash
# At a release: records the binary interfaces as those of the version in CMakeLists.txt, with which check.sh compares from
# then on, in tests/system/abi/released.
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/../../.."
released=tests/system/abi/released
tests/system/abi/dump.sh tests/system/abi
mkdir -p "$released"
for library in tav tav-inspect kor; do
  gzip -9nc "tests/system/abi/lib$library.abi" >"$released/lib$library.abi.gz"
done
printf 'version %s\ninterface %s\n' "$(cmake/version.sh)" "$(sed -nE 's/^set\(TAV_ABI_VERSION ([0-9]+)\)$/\1/p' CMakeLists.txt)" >"$released/VERSION"
