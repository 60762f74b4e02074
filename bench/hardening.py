#!/usr/bin/env python3
"""Says what hardening costs: the instructions of the library with it and without, in one run.

    hardening.py BUILD          BUILD is the folder of a build with TAV_BUILD_BENCH

The same program runs with both libraries. Those without hardening are built below BUILD.
"""
import os
import pathlib
import sys

import measure

PARTS = ["W1/tavAddElement", "W2/tavGetNextChild", "W3/tavFindElmInt", "W4file/tavPrintSubtree_xml",
         "W5/tavValidateHierarchy"]


def plain_libraries(build):
    """The folder of the libraries as they are without hardening."""
    root = pathlib.Path(__file__).resolve().parent.parent
    folder = build / "plain"
    off = [f"-DTAV_BUILD_{part}=OFF" for part in ("TESTS", "EXAMPLES", "TOOLS")]
    measure.run(["cmake", "-S", root, "-B", folder, "-G", "Ninja", "-DCMAKE_CXX_COMPILER=g++",
                 "-DCMAKE_BUILD_TYPE=Release", "-DTAV_HARDEN=OFF", *off])
    measure.run(["cmake", "--build", folder, "--target", "tav", "kor"])
    return folder


def counts(program, libraries):
    """Part -> instructions of a pass, and those of a program that opens and closes a handle."""
    os.environ["LD_LIBRARY_PATH"] = str(libraries)
    _, parts = measure.callgrind([program / "tav_once", "nothing", *PARTS], "--toggle-collect=measuredWork",
                                 "--dump-after=measuredWork")
    started = measure.callgrind([program / "tav_startup"])[0]
    return {part: count - parts[0] for part, count in zip(PARTS, parts[1:], strict=True)}, started


def main():
    if len(sys.argv) != 2:
        sys.exit(__doc__)
    build = pathlib.Path(sys.argv[1]).resolve()
    plain, plain_start = counts(build / "bench", plain_libraries(build))
    hardened, hardened_start = counts(build / "bench", build)
    print("| instructions a leaf (W3: a look-up) | plain | hardened | ratio |\n| --- | ---: | ---: | ---: |")
    for part in PARTS:
        items = measure.PATHS if part.startswith("W3/") else measure.LEAVES
        print(f"| `{part}` | {plain[part] / items:,.1f} | {hardened[part] / items:,.1f} | "
              f"{hardened[part] / plain[part]:.3f} |")
    print(f"| a program that opens and closes a handle | {plain_start:,} | {hardened_start:,} | "
          f"{hardened_start / plain_start:.3f} |")


if __name__ == "__main__":
    main()
