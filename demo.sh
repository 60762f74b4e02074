#!/usr/bin/env bash
# Installs what is missing, builds, and shows tav at work: this machine described as a stream, in memory and in a file,
# printed as text and as XML, looked into with the program, damaged, and recovered; then recorded for ten seconds.
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")"

cmake/install-packages.sh build
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
# What is built already is taken; else a build without optimisation, which is there sooner.
folder=build/release options=()
[[ -x $folder/tools/tav ]] || folder=build/demo options=(-DCMAKE_CXX_FLAGS_RELEASE=-O0 -DTAV_HARDEN=OFF -DTAV_PRECOMPILE=ON)
if ! { cmake --preset release -B "$folder" -DTAV_BUILD_TESTS=OFF "${options[@]}" &&
  cmake --build "$folder" --target snapshot tav_tool; } >"$work/log" 2>&1; then
  cat "$work/log" >&2
  exit 1
fi

show() { printf '\n$ %s\n' "$*"; "$@"; }
# Findings (status 1) are what some of these commands are asked for.
look() { show "$@" || (($? == 1)); }

page=$PWD/web/dist/tav.html
names=$PWD/packaging/snapshot-names.json
PATH=$PWD/$folder/tools:$PWD/$folder/examples:$PATH
show snapshot "$work/snapshot.tav"
cd "$work"
show tav info snapshot.tav
show tav tree snapshot.tav
show tav get snapshot.tav /system/host/hostName
show tav xml snapshot.tav

printf '\n# The same file, with 40 bytes in its middle overwritten and its end cut off:\n'
cp snapshot.tav damaged.tav
printf '%040d' 0 | dd of=damaged.tav bs=1 seek=150 conv=notrunc status=none
truncate --size 450 damaged.tav
look tav check damaged.tav
look tav recover damaged.tav -o recovered.tav
show tav check recovered.tav
show tav tree recovered.tav

printf '\n# This machine, recorded for ten seconds, while another process watches:\n'
printf '\n$ tav get series.tav --follow /system/host/memory/memFree &\n'
tav get series.tav --follow /system/host/memory/memFree 2>/dev/null &
watching=$!
show tav snapshot --append --every 1s --count 10 -o series.tav
sleep 1
kill "$watching" # on a terminal Ctrl-C ends it; what a script starts beside itself takes no interrupts
wait "$watching" || true
export TAV_DICTIONARY=$names
printf '\n$ export TAV_DICTIONARY=snapshot-names.json # what the snapshots have beside the built-in elements\n'
show tav table series.tav --each /system --col time=timestamp --col usage=host/cpu/cpuTotalUsage \
  --col load=host/systemLoad/loadAverage1 --col switches=host/systemLoad/contextSwitches --rate
show tav schema series.tav
show tav check series.tav

if [[ -f $page ]]; then
  printf '\n# A browser looks into streams, too, without a server: open this page and drop a file on it\nfile://%s\n' "$page"
fi
