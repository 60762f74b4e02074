#!/usr/bin/env bash
# Makes a release: the source, the packages and the site, the lists of what is in them, checksums and a signature.
#   packaging/release.sh FOLDER [KEY]       FOLDER is made; KEY: a secret key of minisign, without it nothing is signed
# It refuses what nobody could make again: a tree with changes, a version that files disagree on, or one that the
# changelog does not tell of. Times in the artefacts are that of the last commit.
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/.."

(($# >= 1 && $# <= 2)) || { echo "usage: $0 FOLDER [KEY]" >&2; exit 2; }
out=$1
key=${2:-}
refuse() { echo "$0: $*" >&2; exit 1; }

version=$(cmake/version.sh)
[[ ! -e $out ]] || refuse "$out exists already"
[[ -z $key || -r $key ]] || refuse "there is no key $key"
[[ -z $key ]] || command -v minisign >/dev/null || refuse "nothing can be signed without minisign"
[[ -z $(git status --porcelain) ]] || refuse "the tree has changes that are in no commit"
grep -qE "^## \[$version\] - [0-9]{4}-[0-9]{2}-[0-9]{2}$" CHANGELOG.md || refuse "CHANGELOG.md has no dated section for $version"
! sed -n '/^## \[Unreleased\]$/,/^## \[[0-9]/p' CHANGELOG.md | grep -q '^- ' || refuse "CHANGELOG.md tells of changes that are in no version"
cmake/check-version.sh >&2 || refuse "the version is not the same everywhere"
SOURCE_DATE_EPOCH=$(git log -1 --format=%ct)
export SOURCE_DATE_EPOCH

work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
made=$work/made
mkdir "$made"
git -c tar.umask=0022 archive --format=tar --prefix="tav-$version/" HEAD | gzip -9n >"$made/tav-$version.tar.gz"

# Built from the archive: what is not in the tree is not in a release.
tar -xzf "$made/tav-$version.tar.gz" -C "$work"
(cd "$work/tav-$version" && packaging/build.sh "$made")

packaging/sbom.py "$version" "$made"
(cd "$made" && sha256sum -- * >"$work/SHA256SUMS" && mv "$work/SHA256SUMS" .)
if [[ -n $key ]]; then
  minisign -S -s "$key" -m "$made/SHA256SUMS" -t "tav $version" >&2
fi
mkdir -p "$(dirname "$out")"
mv "$made" "$out"
echo "$out"
