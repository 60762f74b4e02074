#!/usr/bin/env bash
# Makes the page, web/dist/tav.html: the module by the preset page, and one file of it and of what is in page/.
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/.."

cmake --preset page >/dev/null
cmake --build --preset page --parallel "${TAV_JOBS:-$(nproc)}" --target tav_page
cd web
if ! cmp -s package-lock.json node_modules/.from; then
  npm ci --ignore-scripts --no-audit --no-fund
  cp package-lock.json node_modules/.from
fi
node bundle.mjs ../build/page/web/tav_page.wasm dist/tav.html
