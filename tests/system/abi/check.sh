#!/usr/bin/env bash
# Compares the binary interfaces with those of the last release, tests/system/abi/released, and with those that were
# recorded since, tests/system/abi/*.abi: what was removed, and every change of a class's layout or an operation's arguments.
# Additions are fine. A change that is meant is recorded by dump.sh tests/system/abi; where a release had it, it
# is a new TAV_ABI_VERSION, too, and nothing is compared with that release any more.
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/../../.."
mkdir -p build
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
released=tests/system/abi/released

tests/system/abi/dump.sh "$work"
# compare NAME RECORDED: one library's interface with a recorded one.
compare() { abidiff --no-added-syms --suppressions tests/system/abi/padding.suppr "$2" "$work/lib$1.abi"; }

version=$(sed -n 's/^version //p' "$released/VERSION")
last=$(sed -n 's/^interface //p' "$released/VERSION")
now=$(sed -nE 's/^set\(TAV_ABI_VERSION ([0-9]+)\)$/\1/p' CMakeLists.txt)
[[ $version =~ ^[0-9.]+$ && $last =~ ^[0-9]+$ && $now =~ ^[0-9]+$ ]] || { echo "the released or the present interface has no number"; exit 1; }
((now >= last)) || { echo "TAV_ABI_VERSION is $now, and $version was released with $last"; exit 1; }

for library in tav tav-inspect kor; do
  compare "$library" "tests/system/abi/lib$library.abi" || { echo "lib$library is not as recorded"; exit 1; }
  if ((now == last)); then
    gzip -dc "$released/lib$library.abi.gz" >"$work/released.abi"
    compare "$library" "$work/released.abi" || { echo "programs built with $version would not run with this lib$library"; exit 1; }
  fi
done
if ((now == last)); then
  echo "the binary interfaces are those of $version"
else
  echo "the binary interfaces are as recorded, for TAV_ABI_VERSION $now; $version was released with $last"
fi
