#!/usr/bin/env bash
# What packaging/build.sh made, on a Debian that has nothing: a root made by debootstrap, `apt install` of the packages, and
# the first page of each face's documents in it: the program, Python, C, C++, and where they are in the folder the wheel,
# the extension for SQL and the page. With --source also the README's two commands, which begin without a compiler.
# Takes minutes and one gigabyte, two with the page; needs root. Debian's packages come from where this machine has its own
# from; the engine for SQL and what drives the browser come from npm's registry, and are copied into the root.
#   packaging/bare-machine.sh FOLDER [--source]
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/.."

(($# >= 1)) || { echo "usage: $0 FOLDER [--source]" >&2; exit 2; }
packages=$(cd "$1" && pwd)
((EUID == 0)) || { echo "$0: run as root" >&2; exit 1; }
command -v debootstrap >/dev/null || { apt-get update -qq && apt-get install -y -qq --no-install-recommends debootstrap; } >/dev/null

release=$(. /etc/os-release && echo "$VERSION_CODENAME")
mirror=$(apt-get indextargets --format '$(REPO_URI)' "Created-By: Packages" "Codename: $release" | head -n 1)
[[ -n $mirror ]] || mirror=http://deb.debian.org/debian
work=$(mktemp -d)
root=$work/root
cleanup()
{
  umount -l "$root/proc" "$root/dev" 2>/dev/null || true
  rm -rf --one-file-system "$work"
}
trap cleanup EXIT

echo "== a root with nothing in it"
debootstrap --variant=minbase "$release" "$root" "$mirror" >"$work/log" 2>&1 || { tail -n 30 "$work/log"; exit 1; }
mount -t proc proc "$root/proc"
mount --rbind /dev "$root/dev"
mount --make-rslave "$root/dev" # so that taking it away takes away nothing of this machine's
for setting in /etc/apt/sources.list /etc/apt/sources.list.d /etc/apt/apt.conf.d /etc/apt/trusted.gpg.d /etc/resolv.conf /etc/hosts /usr/share/keyrings; do
  if [[ -e $setting ]]; then cp -rL "$setting" "$root$(dirname "$setting")/"; fi
done
inside() { chroot "$root" /usr/bin/env -i PATH=/usr/sbin:/usr/bin:/sbin:/bin HOME=/tmp LC_ALL=C.UTF-8 DEBIAN_FRONTEND=noninteractive "$@"; }
quietly() { "$@" >"$work/log" 2>&1 || { tail -n 40 "$work/log"; exit 1; }; }
quietly inside apt-get update
if inside sh -c 'command -v c++ cc python3'; then echo "the root is not bare"; exit 1; fi

echo "== apt install"
mkdir "$root/packages"
cp "$packages"/*.deb "$root/packages/"
quietly inside sh -c 'apt-get install -y --no-install-recommends /packages/*.deb'

echo "== the program"
inside tav snapshot -o /tmp/day.tav
inside tav check /tmp/day.tav
inside tav get /tmp/day.tav /system/host/hostName
inside sh -c 'tav json /tmp/day.tav | tav build - -o /tmp/again.tav && tav diff /tmp/day.tav /tmp/again.tav'

if compgen -G "$packages/python3-tav_*.deb" >/dev/null; then
  echo "== Python"
  inside python3 -c 'import tav; print(tav.open("/tmp/day.tav").find("/system/host/hostName").value, len(tav.check("/tmp/day.tav")))'
fi

echo "== C and C++"
quietly inside apt-get install -y --no-install-recommends g++ pkg-config libc6-dev
mkdir "$root/programs"
cp tests/system/install/outside/*.c* examples/layer_tour.cpp "$root/programs/"
for program in main:tav inspect:tav-inspect kor:kor; do
  inside sh -c "g++ -std=c++20 /programs/${program%%:*}.cpp -o /programs/p \$(pkg-config --cflags --libs ${program##*:}) && /programs/p"
done
inside sh -c 'gcc -std=c99 -Wpedantic -Werror /programs/c.c -o /programs/p $(pkg-config --cflags --libs tav-inspect) && /programs/p'

echo "== the programs on the first pages of the documents"
mkdir "$root/examples"
tests/system/docs/extract_examples.py "$root/examples" README.md docs/getting-started.md docs/producers.md docs/consumers.md \
  docs/inspect.md docs/c.md >"$work/examples"
count=0
while read -r path; do
  example=/examples/$(basename "$path")
  if [[ $path == *.c ]]; then compiler="gcc -std=c99"; else compiler="g++ -std=c++20"; fi
  quietly inside sh -c "$compiler $example -o /programs/p \$(pkg-config --cflags --libs tav-inspect) && /programs/p"
  count=$((count + 1))
done <"$work/examples"
((count >= 6)) || { echo "only $count programs on six pages"; exit 1; }
echo "$count programs"

echo "== the first program, by CMake"
quietly inside apt-get install -y --no-install-recommends cmake make
mkdir "$root/first"
sed -n '/^```cmake$/,/^```$/{/^```/d; p; /^target_link_libraries/q}' docs/getting-started.md >"$root/first/CMakeLists.txt"
cp "$root"/examples/getting-started_1.cpp "$root/first/first.cpp"
quietly inside sh -c 'cd /first && cmake -S . -B build && cmake --build build'
inside /first/build/first

echo "== apt remove"
quietly inside sh -c 'apt-get purge -y $(dpkg-query -W -f "\${Package}\n" | grep -E "^(lib)?tav|^python3-tav")'
left=$(find "$root/usr" "$root/etc" -name '*tav*' -not -path '*/apt/*' | grep -vE '/(share/perl|octave)' || true)
[[ -z $left ]] || { echo "left behind: $left"; exit 1; }

# What follows has the libraries inside and needs none of the packages.

if compgen -G "$packages/tav-*.whl" >/dev/null; then
  echo "== the wheel"
  quietly inside apt-get install -y --no-install-recommends python3 python3-venv
  cp "$packages"/tav-*.whl "$root/packages/"
  quietly inside sh -c 'python3 -m venv /tmp/env && /tmp/env/bin/pip install --no-index /packages/tav-*.whl'
  inside /tmp/env/bin/python3 -c 'import tav; print(tav.open("/tmp/day.tav").find("/system/host/hostName").value)'
fi

# first_page FACE FOLDER ARTEFACT: with the packages that FOLDER/package-lock.json names, as this machine fetches them.
first_page()
{
  local place=$root/face-$1
  mkdir "$place"
  cp packaging/first-page.mjs "$2/package.json" "$2/package-lock.json" "$packages/$3" "$place/"
  quietly npm --prefix "$place" ci --ignore-scripts --no-audit --no-fund --silent
  inside node "/face-$1/first-page.mjs" "$1" "/face-$1/$3" /tmp/day.tav
}

if [[ -e $packages/tav.duckdb_extension ]]; then
  echo "== SQL"
  quietly inside apt-get install -y --no-install-recommends nodejs
  first_page sql duckdb tav.duckdb_extension
fi

if [[ -e $packages/tav.html ]]; then
  echo "== the page"
  quietly inside apt-get install -y --no-install-recommends nodejs chromium
  first_page page web tav.html
fi

if [[ ${2:-} == --source ]]; then
  echo "== the two commands of the README"
  mkdir "$root/source"
  git archive HEAD | tar -x -C "$root/source"
  quietly inside apt-get purge -y g++ g++-12 gcc gcc-12 cpp cmake make
  if inside sh -c 'command -v c++ g++ cc gcc cmake'; then echo "the root has a compiler"; exit 1; fi
  inside sh -c 'cd /source && ./demo.sh && ./test.sh'
fi
echo "the packages install, run and go on a bare machine"
