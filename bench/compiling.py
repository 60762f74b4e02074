#!/usr/bin/env python3
"""Says how long a program that includes tav.hpp takes to compile: the first example of the README, with `g++ -c`.

    compiling.py [ROUNDS]

Processor time, user and system together: it does not depend on what else the machine does. The least of the rounds
counts; beside it stands the same program without a line of code, which is the header's part.
"""
import json
import pathlib
import re
import resource
import subprocess
import sys
import tempfile

ROOT = pathlib.Path(__file__).resolve().parent.parent
ROUNDS = 5


def example():
    """The first complete program of the README."""
    return re.search(r"^```cpp\n(.*?)^```", (ROOT / "README.md").read_text(), re.M | re.S).group(1)


def command(source, *options):
    return ["g++", "-std=c++20", f"-I{ROOT / 'include'}", *options, str(source)]


def seconds(source, rounds):
    """Processor seconds of one compilation without optimisation."""
    taken = []
    for _ in range(rounds):
        before = resource.getrusage(resource.RUSAGE_CHILDREN)
        subprocess.run(command(source, "-c", "-o", "/dev/null"), check=True)
        after = resource.getrusage(resource.RUSAGE_CHILDREN)
        taken.append(after.ru_utime - before.ru_utime + after.ru_stime - before.ru_stime)
    return min(taken)


def measured(rounds):
    with tempfile.TemporaryDirectory() as folder:
        program, header = pathlib.Path(folder) / "program.cpp", pathlib.Path(folder) / "header.cpp"
        program.write_text(example())
        header.write_text('#include "tav/tav.hpp"\n')
        text = subprocess.run(command(program, "-E"), stdout=subprocess.PIPE, text=True, check=True).stdout
        return {"program_s": seconds(program, rounds), "header_s": seconds(header, rounds),
                "lines": text.count("\n")}


def main():
    if len(sys.argv) > 2:
        sys.exit(__doc__)
    print(json.dumps(measured(int(sys.argv[1]) if len(sys.argv) == 2 else ROUNDS), indent=1))


if __name__ == "__main__":
    main()
