#!/usr/bin/env python3
"""Shows that misuse of the C++ layer does not compile, and that the compiler says why.

    run.py COMPILER [FLAG...]

Every source beside this script but control.cpp begins with `// EXPECT: REGULAR EXPRESSION`: it must be refused, with a
message that matches; after it `// AND: REGULAR EXPRESSION` may say what else the compiler says beside its messages, and
`// STANDARD: NAME` which language it is told to take. control.cpp must be accepted, so that a refusal says something.
"""
import concurrent.futures
import pathlib
import re
import subprocess
import sys

EXPECT = re.compile(r"// EXPECT: (?P<message>.+)\n(?:// AND: (?P<told>.+)\n)?(?:// STANDARD: (?P<standard>.+)\n)?")
FLAGS = ["-fsyntax-only", "-Werror=unused-result", "-Werror=unused-value"]


def compiles(compiler, source, standard):
    """Returns (whether the source was accepted, what the compiler said)."""
    result = subprocess.run([*compiler, f"-std={standard}", *FLAGS, str(source)], capture_output=True, text=True, check=False)
    return result.returncode == 0, result.stderr


def fault(compiler, source):
    """What is wrong with how the compiler takes a source, or None."""
    expected = EXPECT.match(source.read_text(encoding="utf-8"))
    if expected is None and source.name != "control.cpp":
        return "does not begin with // EXPECT: and what the compiler has to say"
    standard = expected["standard"] if expected is not None else None
    accepted, said = compiles(compiler, source, standard or "c++20")
    if source.name == "control.cpp":
        return None if accepted else f"is refused:\n{said}"
    if accepted:
        return "compiles"
    errors = "\n".join(line for line in said.splitlines() if "error:" in line)
    told = expected["told"] is None or re.search(expected["told"], said)
    return None if told and re.search(expected["message"], errors) else f"is refused for another reason:\n{errors}"


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
