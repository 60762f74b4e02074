"""Streams of one platform on another: both write the same bytes, each reads what the other wrote, and the program says
the same of it.

    cross.py NATIVE_STREAMS NATIVE_TAV OTHER_STREAMS OTHER_TAV [EMULATOR...]
"""
import pathlib
import re
import subprocess
import sys
import tempfile

COUNT = 400
TABLE = ["table", "--each", "//*", "--file", "--col", "value=.", "--col", "below=.//*", "--join", " "]
LOOKS = [["info"], ["tree", "--paths"], ["print"], ["print", "--xml"], ["json"], ["hex"], ["check"], ["xml"], ["schema"],
         TABLE, [*TABLE, "--format", "jsonl"], ["recover", "--json", "-o", "recovered.tav", "--force"]]
LOOKED_AT = range(1, 9)


THIS_MACHINES = re.compile(rb", (?:not )?this machine's")
# The printer shows the 16 bytes of a Uint128 in the machine's order.
LONG_NUMBER = re.compile(rb"(?<![0-9A-F])[0-9A-F]{32}(?![0-9A-F])")


def run(command, cwd):
    done = subprocess.run(command, cwd=cwd, capture_output=True, timeout=1200)
    return done.returncode, done.stdout, done.stderr


def alike(look, out):
    """What the program printed, without what differs from machine to machine on purpose."""
    if look[0] == "info":
        return THIS_MACHINES.sub(b"", out)
    if look[0] == "print":
        return LONG_NUMBER.sub(lambda match: min(match[0], bytes.fromhex(match[0].decode())[::-1].hex().upper().encode()),
                               out)
    return out


def main(native_streams, native_tav, other_streams, other_tav, *emulator):
    failures = []
    with tempfile.TemporaryDirectory(prefix="tav-cross-") as name:
        root = pathlib.Path(name)
        sides = {"native": ([native_streams], [native_tav]), "other": ([*emulator, other_streams], [*emulator, other_tav])}
        for side, (streams, _) in sides.items():
            (root / side).mkdir()
            status, out, err = run([*streams, "write", side, str(COUNT)], root)
            if status != 0:
                failures.append(f"{side} cannot write: {err.decode()}{out.decode()}")
        for number in range(1, COUNT + 1):
            paths = [root / side / f"{number}.tav" for side in sides]
            if not all(path.is_file() for path in paths) or paths[0].read_bytes() != paths[1].read_bytes():
                failures.append(f"stream {number} is not the same on both")
        for side, folder in (("native", "other"), ("other", "native")):
            status, out, err = run([*sides[side][0], "read", folder, str(COUNT)], root)
            if status != 0:
                failures.append(f"{side} cannot read what {folder} wrote: {err.decode()}{out.decode()}")
        looks = 0
        for number in LOOKED_AT:
            for look in LOOKS:
                # The same relative path for both, so that it is the same in what they print.
                words = [look[0], f"other/{number}.tav", *look[1:]]
                native, other = (run([*tav, *words], root) for _, tav in sides.values())
                looks += 1
                # An emulator may have something to say on standard error.
                same = native[0] == other[0] and alike(look, native[1]) == alike(look, other[1])
                if not same or native[1] == b"":
                    failures.append(f"tav {' '.join(words)}: {native} here, {other} there")
    print("\n".join(failures[:20] + [f"{COUNT} streams, {looks} looks, {len(failures)} failures"]))
    return 1 if failures else 0


if __name__ == "__main__":
    sys.exit(main(*sys.argv[1:]))
