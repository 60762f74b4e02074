#!/usr/bin/env python3
"""Runs clang-tidy over the sources of the libraries and the program.

    cmake/tidy.py BUILD [FOLDER...]

BUILD is a folder configured with clang++, which knows how each source is compiled. Of what the checks take for a source
most goes into the standard library's headers, so the sources of a folder are given to them as one that includes them
all; where two of these have a name in common, one by one. The analyzer looks at nothing that is included, so it gets
each source by itself."""
import collections
import concurrent.futures
import json
import os
import pathlib
import shlex
import subprocess
import sys

ROOT = pathlib.Path(__file__).resolve().parent.parent
FOLDERS = ("kor", "trace", "format", "storage", "dictionary", "api", "layer", "inspect")
MOST = 16  # sources at a time: the longest run should not be the last one
NO_ANALYZER = "--checks=-clang-analyzer-*,-bugprone-suspicious-include"
ANALYZER = "--checks=" + ",".join(f"-{group}-*" for group in (
    "bugprone", "performance", "cert", "cppcoreguidelines", "google", "misc", "modernize", "readability"))


def flags_of(entry):
    """How it is compiled, without what is about its file."""
    words = iter(shlex.split(entry["command"]))
    kept = []
    for word in words:
        if word.endswith("clang++"):
            kept = []
        elif word in ("-o", "-c", "-MF", "-MT"):
            next(words)
        elif word != "-MD":
            kept.append(word)
    return tuple(kept)


def groups(build, folders):
    """The sources that are compiled alike in a folder."""
    found = collections.defaultdict(list)
    for entry in json.loads((build / "compile_commands.json").read_text()):
        path = pathlib.Path(entry["file"]).relative_to(ROOT)
        if any(path.is_relative_to(folder) for folder in folders):
            found[path.parent, flags_of(entry)].append(path)
    for (folder, flags), paths in found.items():
        for start in range(0, len(paths), MOST):
            yield folder, flags, sorted(set(paths))[start:start + MOST]


def together(build, number, folder, flags, paths):
    """The one source that includes them all; None where that cannot be compiled."""
    made = build / "tidy" / f"{str(folder).replace(os.sep, '_')}{number}.cpp"
    made.parent.mkdir(exist_ok=True)
    made.write_text("".join(f'#include "{ROOT / path}"\n' for path in paths))
    compiles = subprocess.run(["clang++", *flags, "-w", "-fsyntax-only", made], capture_output=True).returncode == 0
    return made if compiles else None


def tidy(path, flags, *options):
    run = subprocess.run(["clang-tidy", "--quiet", f"--config-file={ROOT / '.clang-tidy'}", *options, path, "--", *flags],
                         cwd=ROOT, capture_output=True, text=True)
    return run.returncode, run.stdout + (run.stderr if run.returncode else "")


def look(build, number, folder, flags, paths):
    made = together(build, number, folder, flags, paths) if len(paths) > 1 else None
    if made is None:
        return [tidy(ROOT / path, flags) for path in paths]
    return [tidy(made, flags, NO_ANALYZER), *(tidy(ROOT / path, flags, ANALYZER) for path in paths)]


def main():
    build = pathlib.Path(sys.argv[1]).resolve()
    jobs = [(build, number, *group) for number, group in enumerate(groups(build, sys.argv[2:] or FOLDERS))]
    jobs.sort(key=lambda job: -len(job[-1]))
    status = 0
    with concurrent.futures.ThreadPoolExecutor(os.cpu_count()) as pool:
        for results in pool.map(lambda job: look(*job), jobs):
            for code, text in results:
                status = status or code
                print(text if code else "", end="", flush=True)
    return status


if __name__ == "__main__":
    sys.exit(main())
