#!/usr/bin/env python3
"""Reads from binaries that they are hardened, and that they name no folder to look for libraries in.

    hardening.py [--not-optimized] FILE...

FILE is a shared library or a program. --not-optimized: checked prints (_FORTIFY_SOURCE) need optimisation.
"""
import argparse
import pathlib
import re
import subprocess
import sys

ENDBR64 = bytes.fromhex("f30f1efa")


def readelf(*arguments):
    return subprocess.run(["readelf", "-W", *map(str, arguments)], check=True, capture_output=True, text=True).stdout


def have_marked_start_files():
    """Whether the system's own part of every program is marked for processors that check where jumps lead. The linker
    marks what it makes only where all parts are."""
    crti = subprocess.run(["g++", "-print-file-name=crti.o"], check=True, capture_output=True, text=True).stdout.strip()
    return "IBT" in readelf("-n", crti)


def exported_functions(path):
    """(name, file offset) of what others may jump to."""
    sections = [(int(address, 16), int(offset, 16), int(size, 16)) for address, offset, size in
                re.findall(r"\] \S+ +PROGBITS +([0-9a-f]{16}) ([0-9a-f]+) ([0-9a-f]+) .*AX", readelf("-S", path))]
    for line in readelf("--dyn-syms", path).splitlines():
        words = line.split()
        if len(words) < 8 or words[3] != "FUNC" or words[6] == "UND":
            continue
        address = int(words[1], 16)
        for start, offset, size in sections:
            if start <= address < start + size:
                yield words[7], address - start + offset


def faults(path, optimized):
    header = readelf("-h", path)
    segments = readelf("-l", path)
    dynamic = readelf("-d", path)
    symbols = readelf("--dyn-syms", path)
    if not re.search(r"Type: +DYN", header):
        yield "its place in memory is fixed"
    if "INTERP" in segments and not re.search(r"FLAGS_1.*\bPIE\b", dynamic):
        yield "no position independent executable"
    if "GNU_RELRO" not in segments:
        yield "no RELRO"
    if not re.search(r"\(FLAGS\).*\bBIND_NOW\b", dynamic) or not re.search(r"FLAGS_1.*\bNOW\b", dynamic):
        yield "not bound at its start, which makes RELRO a partial one"
    if re.search(r"GNU_STACK.*\bRWE\b", segments) or "GNU_STACK" not in segments:
        yield "an executable stack"
    if "TEXTREL" in dynamic:
        yield "relocations in its code"
    for tag in re.findall(r"\((RUNPATH|RPATH)\)", dynamic):
        yield f"a {tag}"
    if "__stack_chk_fail" not in symbols:
        yield "no stack protector"
    # Copies stay as they are where their room is not known; prints never do.
    for name in re.findall(r" UND (v?[sd]?n?f?printf)(?:@|$)", symbols, re.MULTILINE) if optimized else ():
        yield f"{name} is not the checked one"
    if re.search(r"Machine: .*X86-64", header):
        content = path.read_bytes()
        for name, offset in exported_functions(path):
            if content[offset:offset + len(ENDBR64)] != ENDBR64 and name not in ("_init", "_fini"):
                yield f"no mark for jumps at {name}"
        if have_marked_start_files() and not re.search(r"x86 feature: IBT, SHSTK", readelf("-n", path)):
            yield "not marked for checked jumps and returns"


def main():
    parser = argparse.ArgumentParser()
    parser.add_argument("--not-optimized", action="store_true")
    parser.add_argument("files", nargs="+", type=pathlib.Path)
    arguments = parser.parse_args()
    bad = [f"{path}: {fault}" for path in arguments.files for fault in faults(path, not arguments.not_optimized)]
    print("\n".join(bad or [f"{len(arguments.files)} binaries are hardened"]))
    return 1 if bad else 0


if __name__ == "__main__":
    sys.exit(main())
