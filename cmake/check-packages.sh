#!/usr/bin/env bash
# Builds the Debian packages, runs lintian over them, and installs, uses and removes them in a fresh root.
#   check-packages.sh [BUILD_FOLDER]        default: build/package
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/.."
build=${1:-build/package}

work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
quietly() { "$@" >"$work/log" 2>&1 || { cat "$work/log"; return 1; }; }

# The compiler by the name that preset release calls it by: then a compiler cache has all objects already.
quietly cmake -S . -B "$build" -G Ninja -DCMAKE_CXX_COMPILER=g++ -DCMAKE_BUILD_TYPE=Release -DCMAKE_INSTALL_PREFIX=/usr \
  -DTAV_BUILD_TESTS=OFF -DTAV_BUILD_EXAMPLES=OFF -DTAV_COMPRESS_MANUAL=ON -DTAV_BUILD_PYTHON=ON \
  -DPython3_EXECUTABLE=/usr/bin/python3
quietly cmake --build "$build" --parallel "$(nproc)"
quietly cpack --config "$build/CPackConfig.cmake" -B "$work/packages"
mapfile -t packages < <(find "$work/packages" -maxdepth 1 -name '*.deb' | sort)
((${#packages[@]} == 5)) || { echo "expected five packages, got: ${packages[*]}"; exit 1; }

echo "== lintian"
lintian --fail-on error --suppress-tags initial-upload-closes-no-bugs "${packages[@]}"

echo "== install in a fresh root"
root=$work/root
mkdir -p "$root/var/lib/dpkg/info" "$root/var/lib/dpkg/updates"
: >"$root/var/lib/dpkg/status"
dpkg_here() { dpkg --root="$root" --log=/dev/null --force-depends --force-not-root --force-script-chrootless "$@"; }
quietly dpkg_here --install "${packages[@]}"
libraries=$(dirname "$(find "$root/usr/lib" -name 'libtav.so.1')")

echo "== each library in its package"
# libraries_of PACKAGE LIBRARY...: the package has these, and says so to the builds of others.
libraries_of()
{
  local package=$1 library
  shift
  [[ $(dpkg_here --listfiles "$package" | grep -cE '/lib[a-z-]+\.so\.[0-9]+$') == "$#" ]] || { echo "$package has other libraries than $*"; exit 1; }
  for library in "$@"; do
    grep -qE "^$library 1 $package " "$root/var/lib/dpkg/info/$package"*.shlibs || { echo "$package does not tell of $library"; exit 1; }
  done
}
libraries_of libtav1 libkor libtav
libraries_of libtav-inspect1 libtav-inspect

echo "== hardened"
# What Debian's own builds are given for it, the build has, too.
for flag in $(DEB_BUILD_MAINT_OPTIONS=hardening=+all dpkg-buildflags --export=cmdline | grep -oE -e '-(fstack-protector|fcf-protection|fstack-clash|D_FORTIFY_SOURCE|Wformat|Werror=format)[^ "]*|-Wl,-z,[a-z]+' | sort -u); do
  grep -qF -e "$flag" "$build/build.ninja" || { echo "dpkg-buildflags has $flag, the build has not"; exit 1; }
done
tests/system/install/hardening.py "$root/usr/bin/tav" "$libraries"/lib{kor,tav,tav-inspect}.so.1
# The module copies and prints nothing that a size could be checked of.
tests/system/install/hardening.py --not-optimized "$root"/usr/lib/python3/dist-packages/tav/_tav.*.so

echo "== run"
LD_LIBRARY_PATH=$libraries "$root/usr/bin/tav" --version
for page in $(LD_LIBRARY_PATH=$libraries "$root/usr/bin/tav" help json | grep -oE '[[:alnum:]/._-]+\.md'); do
  [[ -s $root/usr/$page ]] || { echo "the package has no $page"; exit 1; }
done
LD_LIBRARY_PATH=$libraries "$root/usr/bin/tav" snapshot -o "$work/x.tav"
[[ $(file -b -m "$root/usr/share/file/magic/tav:/usr/share/misc/magic" "$work/x.tav") == 'tav stream, '* ]] ||
  { echo "file(1) does not know a stream by the package's entry"; exit 1; }
[[ -s $root/usr/share/mime/packages/tav.xml ]] || { echo "the package has no MIME type"; exit 1; }

echo "== the service"
unit=$(find "$root" -name tav-snapshot.service)
[[ -s $unit ]] || { echo "the package has no service"; exit 1; }
enabled=$(find "$root" -type l -lname '*tav-snapshot.service')
[[ -z $enabled ]] || { echo "the service is on by default: $enabled"; exit 1; }
command=$(sed -n 's/^ExecStart=//p' "$unit")
for option in --rotate --keep; do
  [[ $command == *" $option "* ]] || { echo "the service has no $option, so that it fills the disk"; exit 1; }
done
# What it starts is what the program takes: a snapshot by that very line, in another folder.
mkdir "$work/state"
line=${command//%%/%}
line=${line/\/usr\/bin\/tav/$root/usr/bin/tav}
read -ra words <<<"${line/\/var\/lib\/tav/$work/state} --count 1"
LD_LIBRARY_PATH=$libraries "${words[@]}"
[[ -s $work/state/snapshot-1.tav ]] || { echo "the service's command has recorded nothing"; exit 1; }
if command -v systemd-analyze >/dev/null; then
  sed "s|/usr/bin/tav|$root/usr/bin/tav|" "$unit" >"$work/tav-snapshot.service"
  systemd-analyze verify --man=no "$work/tav-snapshot.service"
  systemd-analyze security --offline=yes --threshold=30 --no-pager "$work/tav-snapshot.service" >"$work/log" || { cat "$work/log"; exit 1; }
fi

echo "== Python"
modules=$root/usr/lib/python3/dist-packages
# in_root COMMAND...: with the libraries and modules of the packages, and from elsewhere, where no others lie.
in_root() { (cd "$work" && LD_LIBRARY_PATH=$libraries PYTHONPATH=$modules PYTHONDONTWRITEBYTECODE=1 "$@"); }
in_root /usr/bin/python3 "$PWD/python/tests/installed.py" "$modules"
in_root /usr/bin/python3 -m mypy --strict --no-error-summary --cache-dir="$work/mypy" -c 'import tav
reader: tav.Reader = tav.open("x.tav")'

for part in tav:main tav-inspect:inspect; do
  read -ra flags <<<"$(PKG_CONFIG_PATH=$libraries/pkgconfig pkg-config --cflags --libs "${part%%:*}")"
  g++ -std=c++20 "tests/system/install/outside/${part##*:}.cpp" -o "$work/outside" "${flags[@]}"
  LD_LIBRARY_PATH=$libraries "$work/outside"
done

echo "== remove"
quietly dpkg_here --purge python3-tav tav-tools libtav-dev libtav-inspect1 libtav1
left=$(find "$root" -type f -not -path "$root/var/lib/dpkg/*")
[[ -z $left ]] || { echo "left behind: $left"; exit 1; }
echo "the packages install, run and go without a trace"
