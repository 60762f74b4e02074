#!/usr/bin/env bash
# Builds artefacts twice and compares them byte by byte: in folders of different names, at different times, with other
# time zones, languages, rights of new files and homes.
#   packaging/reproduce.sh [PART...]        parts: as packaging/build.sh has them
# Where they differ it says how, by diffoscope if that is there.
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/.."

work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
mkdir -p "$work/one" "$work/another folder/below"
git archive HEAD | tar -x -C "$work/one"
git archive HEAD | tar -x -C "$work/another folder/below"

(cd "$work/one" && umask 022 && env -u SOURCE_DATE_EPOCH TZ=UTC LC_ALL=C.UTF-8 HOME="$work" packaging/build.sh "$work/first" "$@")
sleep 2 # another second in every time stamp
find "$work/another folder" -exec touch {} +
(cd "$work/another folder/below" && umask 077 && env -u SOURCE_DATE_EPOCH TZ=Asia/Kolkata LC_ALL=POSIX HOME=/ packaging/build.sh "$work/second" "$@")

status=0
count=0
for file in "$work"/first/*; do
  name=$(basename "$file")
  count=$((count + 1))
  if cmp -s "$file" "$work/second/$name"; then
    echo "same bytes: $name"
  else
    status=1
    echo "DIFFERENT: $name"
    if command -v diffoscope >/dev/null; then diffoscope --max-report-size 20000 "$file" "$work/second/$name" || true; fi
  fi
done
for file in "$work"/second/*; do
  [[ -e $work/first/$(basename "$file") ]] || { echo "only in the second: $(basename "$file")"; status=1; }
done
((count > 0)) || { echo "nothing was built"; exit 1; }
exit "$status"
