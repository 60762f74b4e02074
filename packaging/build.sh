#!/usr/bin/env bash
# Builds what a release consists of: the Debian packages, the wheel and the sdist of the Python package, the page,
# the extension for SQL, and the site.
#   packaging/build.sh FOLDER [PART...]        FOLDER: where they go; parts: packages wheel page sql site; all unless named
# The same tree gives the same bytes wherever and whenever it is built: SOURCE_DATE_EPOCH is the time in them, that of the
# last change in CHANGELOG.md unless it is set.
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/.."
umask 022
export LC_ALL=C TZ=UTC

(($# >= 1)) || { echo "usage: $0 FOLDER [PART...]" >&2; exit 2; }
mkdir -p "$1"
out=$(cd "$1" && pwd)
shift
parts=("$@")
((${#parts[@]} > 0)) || parts=(packages wheel page sql site)
: "${SOURCE_DATE_EPOCH:=$(date -d "$(grep -m 1 -oE '[0-9]{4}-[0-9]{2}-[0-9]{2}' CHANGELOG.md || echo 2026-11-22)" +%s)}"
export SOURCE_DATE_EPOCH

work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
quietly() { "$@" >"$work/log" 2>&1 || { cat "$work/log" >&2; return 1; }; }

# archive FOLDER PART NAME: what is in FOLDER/PART as the artefact NAME, without whose it was, its rights and its times.
archive()
{
  tar -C "$1" --sort=name --mtime="@$SOURCE_DATE_EPOCH" --owner=0 --group=0 --numeric-owner --mode=u=rwX,go=rX -cf - "$2" | gzip -9n >"$out/$3"
}

# The packages bring the page for `tav view`.
build_packages()
{
  cmake/install-packages.sh build package browser python
  quietly web/build.sh
  quietly cmake --preset package -DTAV_PAGE="$PWD/web/dist/tav.html" -DTAV_BUILD_PYTHON=ON -DPython3_EXECUTABLE=/usr/bin/python3
  quietly cmake --build --preset package --parallel "$(nproc)"
  quietly cpack --config build/package/CPackConfig.cmake -B "$work/packages"
  find "$work/packages" -maxdepth 1 -name '*.deb' -exec cp {} "$out/" \;
}

build_wheel()
{
  cmake/install-packages.sh python
  quietly python/build-wheel.sh "$work/wheel"
  cp "$work"/wheel/*.whl "$out/"
  # The sources of the Python package, in a name and an order of their own: as it was made it has the name of the whole
  # source and the times of the build.
  mkdir "$work/sdist"
  tar -xzf "$work"/wheel/tav-*.tar.gz -C "$work/sdist"
  archive "$work/sdist" "tav-$(cmake/version.sh)" "tav-python-$(cmake/version.sh).tar.gz"
}

build_page()
{
  cmake/install-packages.sh browser
  quietly web/build.sh
  cp web/dist/tav.html "$out/"
}

build_sql()
{
  cmake/install-packages.sh build sql
  quietly cmake --preset package -DTAV_BUILD_DUCKDB=ON
  quietly cmake --build --preset package --parallel "$(nproc)" --target tav_duckdb
  cp build/package/duckdb/tav.duckdb_extension "$out/"
}

build_site()
{
  quietly docs/site/build.sh "$work/site"
  archive "$work" site "tav-site-$(cmake/version.sh).tar.gz"
}

for part in "${parts[@]}"; do
  "build_$part"
done
