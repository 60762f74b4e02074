#!/usr/bin/env python3
"""Appends to a file of 20 GiB, follows it and reads at its end, in the memory that an empty one takes. By hand: it takes minutes.

    tests/system/scale/follow20GiB.py [PROGRAM] [GIB]        default: build/release/tools/tav, 20; in TMPDIR

The file has holes where the values of its elements are, so that it takes some hundred MiB where holes take nothing.

A line for each step with an empty and with the large file: seconds, and the most memory that the process had. Ends with 1
where a step takes more than 8 MiB more with the large one. Rings are of 1 MiB: of larger ones an empty file fills less.
"""
import pathlib
import signal
import struct
import subprocess
import sys
import tempfile
import time

MIB = 1 << 20
ROOT = 16 * MIB  # of one root: what a recorder writes in some hours
ELEMENT = MIB // 4


def write(path, gib):
    """Roots of 16 MiB one behind another, each of elements of 256 KiB whose values are zeros but for their last byte."""
    header = struct.pack("<QIHH", ELEMENT - 16, 0, 101, 60101)
    with path.open("wb") as file:
        while file.tell() < gib << 30:
            file.write(struct.pack("<QIHH", ROOT, 0, 2, 60100))
            for _ in range(ROOT // ELEMENT):
                file.write(header)
                file.seek(ELEMENT - 17, 1)
                file.write(b"\x5a")


def measured(command, lines=None):
    """Runs a program to its end, or until it has printed so many lines and is interrupted: seconds, MiB, its output."""
    begin = time.monotonic()
    process = subprocess.Popen(["/usr/bin/time", "-f", "%M", *map(str, command)], stdout=subprocess.PIPE, stderr=subprocess.PIPE,
                               text=True, start_new_session=True)
    out = process.stdout.read() if lines is None else "".join(process.stdout.readline() for _ in range(lines))
    seconds = time.monotonic() - begin
    if lines is not None:
        for child in pathlib.Path(f"/proc/{process.pid}/task/{process.pid}/children").read_text().split():
            subprocess.run(["kill", "-INT", child], check=True)
    told = process.stderr.read()
    process.wait()
    return seconds, int(told.splitlines()[-1]) / 1024, out


def main():
    program = sys.argv[1] if len(sys.argv) > 1 else "build/release/tools/tav"
    gib = int(sys.argv[2]) if len(sys.argv) > 2 else 20
    signal.signal(signal.SIGINT, signal.default_int_handler)
    too_much = False
    with tempfile.TemporaryDirectory() as folder:
        small, large = pathlib.Path(folder, "small.tav"), pathlib.Path(folder, "large.tav")
        subprocess.run([program, "snapshot", "--append", "-o", small], check=True)
        write(large, gib)
        print(f"a file of {large.stat().st_size / (1 << 30):.1f} GiB against one of {small.stat().st_size} bytes")
        steps = {"append": lambda path: ([program, "snapshot", "--append", "-o", path], None),
                 "follow": lambda path: ([program, "get", path, "/system/timestamp", "--follow", "--ring", "1M"], 1),
                 "read at the end": lambda path: ([program, "get", path, "/system[last()]/timestamp", "--ring", "1M"], None)}
        for name, command in steps.items():
            figures = []
            for path in (small, large):
                seconds, mebibytes, out = measured(*command(path))
                if name != "append" and not out.strip():
                    sys.exit(f"{name} of {path.name} has found nothing")
                figures.append((seconds, mebibytes))
            too_much = too_much or figures[1][1] > figures[0][1] + 8
            print(f"{name:16} " + ", ".join(f"{where} {seconds:7.2f} s {mebibytes:6.1f} MiB"
                                            for where, (seconds, mebibytes) in zip(("small", "large"), figures)))
    sys.exit(1 if too_much else 0)


if __name__ == "__main__":
    main()
