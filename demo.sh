#!/usr/bin/env bash
# Installs what is missing, builds the libraries and shows them at work: this machine, described as a stream, read back
# and printed as text and as XML.
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")"

cmake/install-packages.sh build
log=$(mktemp)
trap 'rm -f "$log"' EXIT
if ! { cmake --preset release -DTAV_BUILD_TESTS=OFF -DTAV_BUILD_TOOLS=OFF && cmake --build --preset release --target snapshot; } >"$log" 2>&1; then
  cat "$log" >&2
  exit 1
fi
build/release/examples/snapshot
