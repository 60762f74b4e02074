#!/usr/bin/env bash
# Installs a build into a fresh prefix, moves the prefix, and builds and runs a small project from outside against it:
# with the CMake package and with pkg-config.
#   run.sh BUILD_FOLDER [COMPILER]       the build is complete; shared or static, as it was configured
set -euo pipefail
here=$(cd "$(dirname "${BASH_SOURCE[0]}")" && pwd)
build=$(cd "$1" && pwd)
compiler=${2:-c++}
export CMAKE_GENERATOR=Ninja # as all else here is built: make need not be there

work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
prefix=$work/moved

cmake --install "$build" --prefix "$work/installed" >"$work/install.log"
mv "$work/installed" "$prefix"
if grep -rIlF -e "$work/installed" -e "$build" "$prefix"; then
  echo "the installed files above name a folder of the build"
  exit 1
fi
if [[ -e $prefix/include/tav && -z $(find "$prefix/include" -name '*.h') ]]; then
  echo "no headers were installed"
  exit 1
fi

if grep -q '^TAV_HARDEN:BOOL=ON' "$build/CMakeCache.txt"; then
  echo "== hardened"
  optimized=()
  if grep -q '^CMAKE_BUILD_TYPE:STRING=Debug' "$build/CMakeCache.txt"; then optimized=(--not-optimized); fi
  mapfile -t binaries < <(find "$prefix" -type f \( -name '*.so.*' -o -path '*/bin/tav' \))
  if ((${#binaries[@]} > 0)); then "$here/hardening.py" "${optimized[@]}" "${binaries[@]}"; fi
fi

if [[ -x $prefix/bin/tav ]]; then
  echo "== pages that help texts name"
  mapfile -t pages < <({
    LD_LIBRARY_PATH=$(dirname "$(find "$prefix" -name 'libtav.*' | head -n 1)")
    export LD_LIBRARY_PATH
    "$prefix/bin/tav" help --man | sed 's/\\-/-/g'
    for command in $("$prefix/bin/tav" help | awk '/^  [a-z]/ { print $1 }'); do "$prefix/bin/tav" "$command" --help; done
  } | grep -oE '[[:alnum:]/._-]+\.md' | sort -u)
  ((${#pages[@]} > 0)) || { echo "the help texts name no page"; exit 1; }
  for page in "${pages[@]}"; do
    [[ -s $prefix/$page ]] || { echo "the help texts name $page, which is not installed"; exit 1; }
  done
fi

echo "== CMake package"
version=$(sed -n 's/^CMAKE_PROJECT_VERSION:STATIC=//p' "$build/CMakeCache.txt")
IFS=. read -r major minor patch <<<"$version"
cmake -S "$here/outside" -B "$work/outside" -DCMAKE_PREFIX_PATH="$prefix" -DTAV_WANTED="$major.$minor" -DCMAKE_CXX_COMPILER="$compiler" \
  -DCMAKE_FIND_USE_PACKAGE_REGISTRY=OFF >"$work/configure.log"
grep -q "tav_DIR:PATH=$prefix/" "$work/outside/CMakeCache.txt"
cmake --build "$work/outside"
"$work/outside/outside"
"$work/outside/outside_inspect"
"$work/outside/outside_kor"

echo "== versions that the CMake package takes for its own"
file=$(find "$prefix" -name tavConfigVersion.cmake)
# fits VERSION: whether a project that asks for it is content.
fits()
{
  local parts
  IFS=. read -ra parts <<<"$1"
  printf 'set(PACKAGE_FIND_VERSION %s)\nset(PACKAGE_FIND_VERSION_MAJOR %s)\nset(PACKAGE_FIND_VERSION_MINOR %s)\ninclude("%s")\nmessage("fits: ${PACKAGE_VERSION_COMPATIBLE}")\n' \
    "$1" "${parts[0]}" "${parts[1]}" "$file" >"$work/fits.cmake"
  cmake -P "$work/fits.cmake" 2>&1 | grep -qx 'fits: TRUE'
}
fits "$version" && fits "$major.$minor.0" || { echo "the package $version is not taken for itself"; exit 1; }
for other in "$major.$((minor - 1)).0" "$major.$((minor + 1)).0" "$major.$minor.$((patch + 1))" "$((major + 1)).$minor.0"; do
  if fits "$other"; then echo "the package $version is taken for $other"; exit 1; fi
done

echo "== pkg-config"
PKG_CONFIG_PATH=$(dirname "$(find "$prefix" -name tav.pc)")
export PKG_CONFIG_PATH
mode=()
if [[ -n $(find "$prefix" -name libtav.a) ]]; then
  mode=(--static)
else
  LD_LIBRARY_PATH=$(pkg-config --variable=libdir tav)
  export LD_LIBRARY_PATH
fi
pkg-config --print-errors --exact-version="$version" tav
for part in tav:main tav-inspect:inspect kor:kor; do
  read -ra flags <<<"$(pkg-config "${mode[@]}" --cflags --libs "${part%%:*}")"
  program=$work/${part##*:}
  "$compiler" -std=c++20 -Wall -Wextra -Werror "$here/outside/${part##*:}.cpp" -o "$program" "${flags[@]}"
  "$program"
done

if ((${#mode[@]} == 0)) && command -v cc >/dev/null; then
  echo "== C"
  read -ra flags <<<"$(pkg-config --cflags --libs tav-inspect)"
  cc -std=c99 -Wall -Wextra -Wpedantic -Werror "$here/outside/c.c" -o "$work/c" "${flags[@]}"
  "$work/c"
fi

if ((${#mode[@]} == 0)); then
  echo "== shared libraries find each other"
  unset LD_LIBRARY_PATH
  if [[ -x $prefix/bin/tav ]]; then LD_LIBRARY_PATH=$(pkg-config --variable=libdir tav) "$prefix/bin/tav" --version; fi
  readelf -d "$work/main" | grep -q 'NEEDED.*libtav\.so\.1' || { echo "the program does not ask for libtav.so.1"; exit 1; }
fi
echo "the installed package works"
