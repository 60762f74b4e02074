#!/usr/bin/env bash
# The site: all documents, the reference of the C and C++ headers, and the viewer where it was built. It needs no server:
# open index.html. Searching works from the disk, too.
#   docs/site/build.sh [FOLDER]        default: build/site
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/../.."
site=${1:-$PWD/build/site}
[[ $site == /* ]] || site=$PWD/$site

cmake/install-packages.sh site
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT

# The pages keep their places relative to each other and to the files that they link to, so that links hold.
mkdir -p "$work/source/extra"
cp docs/site/conf.py "$work/source/"
docs/site/lay_out.py . "$work/source"

mkdir -p build
doxygen docs/Doxyfile
cp -r build/reference/html "$work/source/extra/reference"
if [[ -f web/dist/tav.html ]]; then cp web/dist/tav.html "$work/source/extra/"; fi

TAV_VERSION=$(cmake/version.sh) /usr/bin/python3 -m sphinx -q -W --keep-going -b html -d "$work/trees" "$work/source" "$work/site"
docs/site/check_site.py "$work/site"
rm -rf "$site"
mkdir -p "$(dirname "$site")"
mv "$work/site" "$site"
echo "$site/index.html"
