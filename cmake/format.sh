#!/usr/bin/env bash
# Brings the sources into the project's form, or says where they are not in it.
#   format.sh             rewrites what needs it
#   format.sh --check     fails when something does
# Line breaks are the author's (see .clang-format); only a line of more than 120 columns is broken by the tool. What a
# condition guards is in braces on lines of its own, which the author has to see to.
set -euo pipefail
export LC_ALL=C.UTF-8
cd "$(dirname "${BASH_SOURCE[0]}")/.."

sources()
{
  find . \( -path ./build -o -path ./.git -o -path ./web/node_modules \) -prune -o \( -name '*.h' -o -name '*.hpp' -o -name '*.cpp' \) -print0
}

# FILE:LINE of each line that is too long.
long_lines()
{
  sources | xargs -0 grep -nHE '^.{121,}' | cut -d: -f1,2 || true
}

# FILE:LINE of each condition with what it guards on its line.
guarded_on_the_line()
{
  sources | xargs -0 grep -nHE '^ *(else )?if (constexpr )?\(.*\) [^/{]*;( *//.*)?$|^ *else [^i{].*;$' | cut -d: -f1,2 || true
}

wrap()
{
  local wrapping file line
  wrapping=$(mktemp)
  sed 's/^ColumnLimit: 0$/ColumnLimit: 120/' .clang-format >"$wrapping"
  declare -A places=()
  while IFS=: read -r file line; do
    places[$file]+=" --lines=$line:$line"
  done < <(long_lines)
  for file in "${!places[@]}"; do
    read -ra lines <<<"${places[$file]}"
    clang-format -i --style="file:$wrapping" "${lines[@]}" "$file"
  done
  rm -f "$wrapping"
}

case ${1:-} in
  "")
    sources | xargs -0 clang-format -i
    wrap
    sources | xargs -0 clang-format -i
    ;;
  --check)
    sources | xargs -0 clang-format --dry-run -Werror
    ;;
  *)
    echo "usage: $0 [--check]" >&2
    exit 2
    ;;
esac

mapfile -t guarded < <(guarded_on_the_line)
if ((${#guarded[@]} > 0)); then
  printf '%s: what a condition guards belongs on lines of its own, in braces\n' "${guarded[@]}"
  exit 1
fi
mapfile -t long < <(long_lines)
if ((${#long[@]} > 0)); then
  printf '%s: longer than 120 columns\n' "${long[@]}"
  exit 1
fi
