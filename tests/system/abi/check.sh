#!/usr/bin/env bash
# Compares the binary interfaces with those of the last release, tests/system/abi/*.abi: what was removed, and every change of
# a class's layout or an operation's arguments. Additions are fine. When a change is meant, raise TAV_ABI_VERSION and
# run tests/system/abi/dump.sh tests/system/abi.
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/../../.."
mkdir -p build
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT

tests/system/abi/dump.sh "$work"
for library in tav tav-inspect kor; do
  abidiff --no-added-syms --suppressions tests/system/abi/padding.suppr "tests/system/abi/lib$library.abi" "$work/lib$library.abi"
done
echo "the binary interfaces are those of the last release"
