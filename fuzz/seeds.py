#!/usr/bin/env python3
"""Writes first inputs for every fuzz target, made from the golden vectors.

    seeds.py TOOL FOLDER        TOOL: the program tav; FOLDER: gets a folder for each target
"""
import pathlib
import subprocess
import sys
import tempfile

GOLDEN = pathlib.Path(__file__).resolve().parent.parent / "tests" / "golden"
BIG = sys.byteorder == "big"


def vector(path):
    """The bytes of a golden vector, and whether its order is not the machine's, and whether it is aligned."""
    made = bytearray()
    swapped = BIG
    aligned = False
    for line in path.read_text(encoding="ascii").splitlines():
        if line.startswith("#: order"):
            swapped = (line.split()[2] == "big") != BIG
        elif line.startswith("#: align"):
            aligned = line.split()[2] == "yes"
        made += bytes.fromhex(line.split("#")[0])
    return bytes(made), swapped, aligned


def flags_of(name, swapped, aligned):
    return swapped | aligned << 1 | (4 if name.startswith("nested32") else 0)


def seeds_of(name, made, swapped, aligned):
    """Pairs of target and input. fuzz/input.h says what the first bytes are."""
    flags = flags_of(name, swapped, aligned)
    memory, ring = bytes((flags, 0, 0, 0)), bytes((flags, 24, 3, 7))
    for form in (memory, ring):
        for parts in (0x01, 0x02, 0x04, 0x08, 0x10, 0x20, 0x40, 0x80):
            yield "read", form + bytes((parts, 1)) + made
        yield "layer", bytes((0,)) + form + b"\x0a*/*[2]/cpu" + b"\x10" + made
        yield "layer", bytes((0,)) + form + b"\x02**" + b"\x20" + made
    order = 2 if swapped != BIG else 1
    form = order + 3 * (1 if name.startswith("nested32") else 2) + 9 * (2 if aligned else 1)
    for choice in (0, form):
        for path in (b"\x0a*/*[2]/cpu", b"\x02**", b"\x09/system/*"):
            yield "c", bytes((choice,)) + path + made
    for more in (3, 4, 5):
        for shown in (made, made[:len(made) * 2 // 3], made + bytes(24)):
            yield "append", bytes((flags, more)) + shown
            yield "append", bytes((flags | 8, more)) + shown
    yield "path", bytes((flags & 1,)) + b"//host[cpu/cpuOnline > 4]/*[last()]/.. | /system/*[2]"
    for asked in range(4):
        yield "table", bytes((flags | 8 * (asked & 1), asked)) + made
    for part in (10, 60):
        yield "rows", bytes((flags, part)) + made
        yield "rows", bytes((flags | 8, part)) + made
        yield "plan", bytes((flags, part)) + made
    yield "recover", bytes((flags,)) + made
    yield "recover", bytes((flags,)) + made[:len(made) * 2 // 3]
    for choice in range(4):
        path = b"\x02**" if choice == 2 else b""
        for form in (0, 0x80 | flags):
            for style in (0, 1):
                yield "tool", bytes((choice, form, style)) + path + made


def documents(tool, made, folder):
    """The vector as `tav json` gives it."""
    path = folder / "x.tav"
    path.write_bytes(made)
    for style in ("--compact", "--lines"):
        done = subprocess.run([tool, "json", style, str(path)], capture_output=True, check=False)
        if done.returncode in (0, 1):
            yield b"\x00" + done.stdout
            yield b"\x55" + done.stdout


def scripts():
    """Sequences of operations: every byte is a choice."""
    for flags in (0, 1, 2, 3, 0x2C):
        for step in (1, 3, 7, 11, 13, 19):
            choices = bytes(i * step % 251 for i in range(160))
            yield "write", bytes((flags, 24 if flags != 3 else 64)) + choices
            yield "layer", bytes((3, flags & 3, 24 * (flags & 1), 3, 0)) + choices


def main(tool, target):
    inputs = list(scripts())
    with tempfile.TemporaryDirectory() as folder:
        for path in sorted(GOLDEN.glob("*.hex")):
            made, swapped, aligned = vector(path)
            inputs += seeds_of(path.stem, made, swapped, aligned)
            inputs += (("build", text) for text in documents(tool, made, pathlib.Path(folder)))
    own = b'{"40001": {"tag": "queueDepth", "kind": "gauge", "unit": "1", "text": "jobs that wait"}, "40002": {"tag": "a"}}'
    inputs += (("dictionary", bytes((len(own),)) + own + other) for other in (own, own[:50], b'{"40001": {"tag": "b"}}'))
    inputs.append(("build", b'\x00{"system": {"host": {"hostName": "ada", "cpuOnline": 8}}}'))
    for number, (name, made) in enumerate(inputs):
        place = pathlib.Path(target) / name
        place.mkdir(parents=True, exist_ok=True)
        (place / f"seed-{number:03}").write_bytes(made)
    print(f"{len(inputs)} inputs")


if __name__ == "__main__":
    main(*sys.argv[1:])
