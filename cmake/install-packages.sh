#!/usr/bin/env bash
# Installs the Debian packages of the named groups that are missing. This is the one list of them.
#   cmake/install-packages.sh GROUP...        groups: build, test, full, platforms, bench, coverage, package, kaitai,
#                                            python, python-debug, sql, browser, firefox, wasm, site, reproduce
set -euo pipefail

declare -A groups=(
  [build]="g++ cmake ninja-build nlohmann-json3-dev"
  [test]="libgtest-dev libgmock-dev pkg-config python3 binutils jq libxml2-utils python3-lxml python3-prometheus-client zsh fish file shared-mime-info"
  [bench]="libbenchmark-dev libbson-dev libmsgpack-dev libcbor-dev libflatbuffers-dev libebml-dev rapidjson-dev libpugixml-dev pkg-config valgrind binutils python3 python3-matplotlib"
  [full]="clang clang-19 gnumeric clang-format clang-tidy cppcheck libclang-rt-dev ccache doxygen lintian dpkg-dev gzip abigail-tools valgrind"
  [package]="g++ cmake ninja-build nlohmann-json3-dev dpkg-dev gzip file"
  [kaitai]="nodejs npm"
  [python]="g++ cmake ninja-build nlohmann-json3-dev python3-dev python3-pytest python3-hypothesis python3-numpy python3-pandas python3-dask python3-distributed python3-matplotlib python3-ipykernel python3-nbclient python3-nbformat mypy python3-setuptools python3-wheel python3-build python3-venv binutils"
  [sql]="g++ cmake ninja-build nlohmann-json3-dev libgtest-dev libgmock-dev python3-dev nodejs npm"
  [site]="python3-rich doxygen python3-sphinx python3-myst-parser furo"
  [browser]="g++ cmake ninja-build emscripten nodejs npm chromium"
  [firefox]="firefox-esr"
  [python-debug]="python3-dbg"
  [reproduce]="faketime"
  [coverage]="gcovr qemu-user-static"
  [platforms]="clang libc++-dev libc++abi-dev googletest ccache qemu-user-static g++-s390x-linux-gnu g++-aarch64-linux-gnu g++-mingw-w64-x86-64-posix wine64 wine"
  [wasm]="g++ cmake ninja-build emscripten nodejs node-acorn googletest"
)

if (($# == 0)); then
  echo "usage: $0 GROUP...   (groups: ${!groups[*]})" >&2
  exit 2
fi

wanted=()
for group in "$@"; do
  if [[ -z ${groups[$group]:-} ]]; then
    echo "$0: no group '$group'; there are: ${!groups[*]}" >&2
    exit 2
  fi
  read -ra names <<<"${groups[$group]}"
  wanted+=("${names[@]}")
done

if ! command -v apt-get >/dev/null || ! command -v dpkg-query >/dev/null; then
  echo "$0: this script installs with apt-get, which is not here; install the equivalents of: ${wanted[*]}" >&2
  exit 1
fi

# Node.js often does not come from Debian, and then its npm does not either.
declare -A commands=([nodejs]=node [npm]=npm)

missing=()
for name in "${wanted[@]}"; do
  if [[ -n ${commands[$name]:-} ]] && command -v "${commands[$name]}" >/dev/null; then continue; fi
  # shellcheck disable=SC2016  # the variable is dpkg-query's, not the shell's
  [[ $(dpkg-query -W -f='${db:Status-Status}' "$name" 2>/dev/null) == installed ]] || missing+=("$name")
done
((${#missing[@]} > 0)) || exit 0

as_root=()
if ((EUID != 0)); then
  if ! command -v sudo >/dev/null; then
    echo "$0: missing packages: ${missing[*]}; run as root, or install sudo" >&2
    exit 1
  fi
  as_root=(sudo)
fi

echo "installing ${missing[*]}"
log=$(mktemp)
trap 'rm -f "$log"' EXIT
quietly()
{
  if ! "${as_root[@]}" env DEBIAN_FRONTEND=noninteractive "$@" >"$log" 2>&1 </dev/null; then
    cat "$log" >&2
    echo "$0: '$*' failed; these packages are missing: ${missing[*]}" >&2
    exit 1
  fi
}
quietly apt-get update -qq
quietly apt-get install -y -qq --no-install-recommends "${missing[@]}"
