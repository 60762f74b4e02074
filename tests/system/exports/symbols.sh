#!/usr/bin/env bash
# Prints what a shared library exports, sorted, by readable name. Compilers differ in how many symbols they make of a
# constructor or destructor; the readable name is the same for all of them.
set -euo pipefail
export LC_ALL=C
case $1 in
  *.dll)
    # The table of names by which a loaded library's operations are looked up. A 64-bit number and an open
    # file have other names there.
    "${OBJDUMP:-x86_64-w64-mingw32-objdump}" -p "$1" |
      sed -n '/Ordinal\/Name Pointer/,/^$/s/^\t\[ *[0-9]*\] *\(+base\[ *[0-9]*\] *[0-9a-f]* *\)\{0,1\}//p' |
      c++filt | sed 's/unsigned long long/unsigned long/g; s/\b_iobuf\*/_IO_FILE*/g' | sort -u
    ;;
  *)
    "${NM:-nm}" --dynamic --defined-only --format=posix "$1" | cut -d' ' -f1 | c++filt | sort -u
    ;;
esac
