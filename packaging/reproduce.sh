#!/usr/bin/env bash
# Builds artefacts twice and compares them byte by byte: in folders of different names and lengths, whose files were made
# in another order, on another day, with other time zones, languages, rights of new files and homes, and without a
# compiler's cache, which would hand out the first build's objects as the second's.
#   packaging/reproduce.sh [PART...]        parts: as packaging/build.sh has them
# Where they differ it says how, by diffoscope if that is there.
#   REPRODUCE_KEEP=FOLDER   both builds' artefacts stay in FOLDER/first and FOLDER/second
#   REPRODUCE_CACHE=1       objects come from ccache, and the clock stays: a look at all that is done with objects, in
#                           some minutes. It says nothing of the compilers.
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/.."

work=$(mktemp -d)
# Where that is memory, a folder lists what was made last first, and so in another order than the first build's does.
elsewhere=$work
if (($(df --output=avail -k /dev/shm 2>/dev/null | tail -n 1 || echo 0) > 4 * 1024 * 1024)); then elsewhere=$(mktemp -d /dev/shm/reproduce.XXXXXX); fi
trap 'rm -rf "$work" "$elsewhere"' EXIT
kept=$work
if [[ -n ${REPRODUCE_KEEP:-} ]]; then
  mkdir -p "$REPRODUCE_KEEP"
  kept=$(cd "$REPRODUCE_KEEP" && pwd)
fi
first=$work/one
second="$elsewhere/another folder/below"

# made_of FOLDER ORDER...: the tree as committed, its files made in the order that the words sort them.
made_of()
{
  local folder=$1
  shift
  mkdir -p "$folder"
  git archive HEAD >"$work/tree.tar"
  tar -tf "$work/tree.tar" | grep -v '/$' | LC_ALL=C "$@" >"$work/names"
  mkdir -p "$work/plain"
  tar -xf "$work/tree.tar" -C "$work/plain"
  tar -C "$work/plain" --no-recursion -cf - -T "$work/names" | tar -x -C "$folder"
  rm -rf "$work/plain"
}
made_of "$first" sort
made_of "$second" sort -r
chmod -R go-rwx "$second" # as a checkout with this umask would have it

# Another day as well, if there is a clock that can be set: what a build is told of the time then differs in every part.
cmake/install-packages.sh reproduce
later=(faketime -f '+400d')
plainly=(env -u SOURCE_DATE_EPOCH -u CMAKE_CXX_COMPILER_LAUNCHER -u CMAKE_C_COMPILER_LAUNCHER CCACHE_DISABLE=1)
if [[ -n ${REPRODUCE_CACHE:-} ]]; then
  later=() # what a cache keeps would be a year younger than all else in it
  plainly=(env -u SOURCE_DATE_EPOCH CMAKE_CXX_COMPILER_LAUNCHER=ccache CCACHE_DIR="${CCACHE_DIR:-$HOME/.cache/ccache}" CCACHE_NOHASHDIR=1)
fi

(cd "$first" && umask 022 &&
  "${plainly[@]}" CCACHE_BASEDIR="$first" TZ=UTC LC_ALL=C.UTF-8 HOME="$work" packaging/build.sh "$kept/first" "$@")
(cd "$second" && umask 077 &&
  "${plainly[@]}" CCACHE_BASEDIR="$second" TZ=Asia/Kolkata LC_ALL=POSIX HOME="$elsewhere" "${later[@]}" packaging/build.sh "$kept/second" "$@")

different=()
count=0
for file in "$kept"/first/*; do
  name=$(basename "$file")
  count=$((count + 1))
  if cmp -s "$file" "$kept/second/$name"; then
    echo "same bytes: $name"
  else
    different+=("$name")
    echo "DIFFERENT: $name"
    if [[ -e $kept/second/$name ]] && command -v diffoscope >/dev/null; then
      diffoscope --max-report-size 20000 "$file" "$kept/second/$name" || true
    fi
  fi
done
for file in "$kept"/second/*; do
  [[ -e $kept/first/$(basename "$file") ]] || { echo "only in the second: $(basename "$file")"; different+=("$(basename "$file")"); }
done
((count > 0)) || { echo "nothing was built"; exit 1; }
((${#different[@]} == 0)) || { echo "${#different[@]} of $count differ: ${different[*]}"; exit 1; }
