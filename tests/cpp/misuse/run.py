#!/usr/bin/env python3
"""Shows that misuse of the C++ layer does not compile, and that the compiler says why.

    run.py COMPILER [FLAG...]

Every source beside this script but control.cpp begins with `// EXPECT: REGULAR EXPRESSION`: it must be refused, with a
message that matches. control.cpp must be accepted, so that a refusal says something.
"""
import concurrent.futures
import pathlib
import re
import subprocess
import sys

EXPECT = re.compile(r"// EXPECT: (?P<message>.+)\n")
FLAGS = ["-std=c++20", "-fsyntax-only", "-Werror=unused-result", "-Werror=unused-value"]


def compiles(compiler, source):
    """Returns (whether the source was accepted, what the compiler said)."""
    result = subprocess.run([*compiler, *FLAGS, str(source)], capture_output=True, text=True, check=False)
    return result.returncode == 0, result.stderr


def fault(compiler, source):
    """What is wrong with how the compiler takes a source, or None."""
    accepted, said = compiles(compiler, source)
    if source.name == "control.cpp":
        return None if accepted else f"is refused:\n{said}"
    expected = EXPECT.match(source.read_text(encoding="utf-8"))
    if expected is None:
        return "does not begin with // EXPECT: and what the compiler has to say"
    if accepted:
        return "compiles"
    errors = "\n".join(line for line in said.splitlines() if "error:" in line)
    return None if re.search(expected["message"], errors) else f"is refused for another reason:\n{errors}"


def main(arguments):
    sources = sorted(pathlib.Path(__file__).resolve().parent.glob("*.cpp"))
    with concurrent.futures.ThreadPoolExecutor(2) as pool:
        faults = list(pool.map(lambda source: fault(arguments, source), sources))
    for source, what in zip(sources, faults):
        if what is not None:
            print(f"{source.name} {what}")
    bad = sum(what is not None for what in faults)
    print(f"{len(sources)} sources, {bad} not as expected")
    return 1 if bad or len(sources) < 2 else 0


if __name__ == "__main__":
    sys.exit(main(sys.argv[1:]))
