#!/usr/bin/env bash
# Compiles docs/tav.ksy to JavaScript and compares what it reads with what the program reads.
#   run.sh TAV       the program, as built
# The compiler comes from npm into a folder that is removed again.
set -euo pipefail
here=$(cd "$(dirname "${BASH_SOURCE[0]}")" && pwd)
tool=$(realpath "$1")

command -v node >/dev/null && command -v npm >/dev/null || "$here/../../../cmake/install-packages.sh" kaitai

work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
npm install --prefix "$work" --no-save --no-audit --no-fund --silent \
  kaitai-struct-compiler@0.11.0 kaitai-struct@0.11.0 js-yaml@4.1.0 >"$work/log" 2>&1 || { cat "$work/log"; exit 1; }

cd "$here"
NODE_PATH=$work/node_modules TAV_TOOL=$tool python3 -B -m unittest -v kaitai_test
