#!/usr/bin/env bash
# Prints what a shared library exports, sorted, by readable name. Compilers differ in how many symbols they make of a
# constructor or destructor; the readable name is the same for all of them.
set -euo pipefail
export LC_ALL=C
nm --dynamic --defined-only --format=posix "$1" | cut -d' ' -f1 | c++filt | sort -u
