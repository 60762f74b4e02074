#!/usr/bin/env bash
# Fails when a shared library exports anything else than the reviewed list says, more or less.
#   check.sh LIBRARY LIST
set -euo pipefail
here=$(cd "$(dirname "${BASH_SOURCE[0]}")" && pwd)
library=$1
list=$2

exported=$("$here/symbols.sh" "$library")
if [[ -z $exported || ! -s $list ]]; then
  echo "no symbols in $library or in $list"
  exit 1
fi
# A DLL does not export the names that type information refers to.
expected=$(if [[ $library == *.dll ]]; then grep -v '^typeinfo name for ' "$list"; else cat "$list"; fi)
# LLVM's standard library names its types otherwise, and marks nothing: what names none of them is the same.
if [[ $exported == *std::__1::* ]]; then
  exported=$(grep -v 'std::' <<<"$exported")
  expected=$(grep -v 'std::' <<<"$expected" | sed 's/\[abi:cxx11\]//' | LC_ALL=C sort -u)
fi
if ! difference=$(diff - <(echo "$exported") <<<"$expected"); then
  echo "$library does not export what $list says (< listed, > exported):"
  grep '^[<>]' <<<"$difference"
  echo "When the change is meant, run tests/system/exports/update.sh and review what it changes in the list."
  exit 1
fi
echo "$(wc -l <<<"$exported") names, as listed"
