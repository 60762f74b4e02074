#!/usr/bin/env bash
# Makes the sdist and, of it alone, the wheel; looks into the wheel, and runs tests with it in a fresh environment.
#   python/check-wheel.sh
set -euo pipefail
cd "$(dirname "${BASH_SOURCE[0]}")/.."
here=$PWD

work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
quietly() { "$@" >"$work/log" 2>&1 || { tail -n 60 "$work/log"; return 1; }; }

echo "== sdist and wheel"
# Where there is no network but the machine's own, if this user may have such a place: what is missing is not fetched.
alone=()
if unshare --net true 2>/dev/null; then alone=(unshare --net); fi
export CXX=g++ CMAKE_ARGS=-DTAV_WERROR=ON # as in preset static, of which a compiler cache has the objects
quietly "${alone[@]}" python/build-wheel.sh "$work/made"
wheel=$(find "$work/made" -name 'tav-*.whl')
size=$(stat -c %s "$wheel")
((size < 2 * 1000 * 1000)) || { echo "the wheel has $size bytes"; exit 1; }

echo "== fresh environment"
/usr/bin/python3 -m venv --system-site-packages "$work/venv"
quietly "$work/venv/bin/pip" install --no-index --no-deps "$wheel"
modules=$("$work/venv/bin/python3" -c 'import sysconfig; print(sysconfig.get_path("platlib"))')
[[ -n $(find "$modules" -path '*tav-*.dist-info/LICENSE') ]] || { echo "the wheel has no licence"; exit 1; }
# What every system with this Python has, and nothing else.
needed=$(objdump -p "$modules"/tav/_tav.*.so | awk '$1 == "NEEDED" && $2 !~ /^(libc|libm|libpthread|ld-linux.*)\.so/ { print $2 }')
[[ -z $needed ]] || { echo "the wheel needs $needed"; exit 1; }
# in_environment ARGUMENT...: its Python, where no other package of this name lies.
in_environment() { (cd "$work" && env -u PYTHONPATH PYTHONDONTWRITEBYTECODE=1 "$work/venv/bin/python3" "$@"); }
quietly in_environment "$here/python/tests/installed.py" "$modules"
quietly in_environment -m mypy --strict --no-error-summary --cache-dir="$work/mypy" -c 'import tav
reader: tav.Reader = tav.open("x.tav")'
quietly in_environment -m pytest -q -p no:cacheprovider --rootdir "$here" \
  "$here"/python/tests/test_{reading,writing,table,passes,columns}.py
grep -hE '[0-9]+ passed' "$work/log"
echo "the sdist builds, and its wheel of $((size / 1000)) kB holds"
