#!/usr/bin/env bash
# Runs a Windows program under wine, which keeps its own messages to itself and has its files in one place of its own.
#   run-windows.sh PROGRAM [ARGUMENT...]
set -euo pipefail
export WINEDEBUG=${WINEDEBUG:--all} WINEPREFIX=${WINEPREFIX:-${XDG_CACHE_HOME:-$HOME/.cache}/tav-wine}
export LC_ALL=C.UTF-8 # names of files are UTF-8
mkdir -p "$WINEPREFIX"
if [[ ! -e $WINEPREFIX/system.reg ]]; then
  # Made once, by one of the tests that start together; the 32-bit half of wine is missed here and nowhere else.
  flock "$WINEPREFIX" sh -c '[ -e "$WINEPREFIX/system.reg" ] || { wineboot --init && wineserver --wait; }' >/dev/null 2>&1 || true
fi
# A server that waits for the next program spares that one a start of its own.
wineserver --persistent=20 >/dev/null 2>&1 </dev/null || true
exec wine "$@"
