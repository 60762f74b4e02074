#!/usr/bin/env python3
"""The library's tests and the corpora of the fuzzers in WebAssembly, under node.

    wasm.py [--build] [--short] [ROOM|FUZZER...]    --build: makes the programs first, by the preset wasm-tests
                                                    --short: without what the list calls long

What runs, what does not and why is in wasm.list beside this. As many programs run at a time as there are processors. The
last line counts all that ran. It fails where a test fails, where fewer pass than the list says, and where an excluded
test is not there any more.
"""
import concurrent.futures
import fnmatch
import os
import pathlib
import re
import subprocess
import sys
import tempfile

HERE = pathlib.Path(__file__).resolve().parent
ROOT = HERE.parents[2]
BUILD = ROOT / "build/wasm-tests"
# What emscripten writes takes a file for an address to fetch from where node has a fetch.
NODE = ["node", "--no-experimental-fetch"]
PATIENCE = 1500  # ends what hangs


def processors():
    return len(os.sched_getaffinity(0))


def read_list():
    """Floors by (kind, name), those of them that are long, and excluded tests by room."""
    floors, long, excluded = {}, set(), {}
    for line in (HERE / "wasm.list").read_text().splitlines():
        words = line.split("#")[0].split()
        if not words:
            continue
        if words[0] in ("room", "fuzz") and len(words) >= 3 and words[3:] in ([], ["long"]):
            floors[words[0], words[1]] = int(words[2])
            if words[3:]:
                long.add((words[0], words[1]))
        elif words[0] == "test" and len(words) == 3 and "#" in line:
            excluded.setdefault(words[1], []).append(words[2])
        elif not (words[0] == "file" and len(words) == 2 and "#" in line):
            raise SystemExit(f"wasm.list: {line!r} is no line of the list, or has no reason")
    return floors, long, excluded


def run(program, arguments, cwd):
    """Status, output and errors of a program, whose temporary files are its own: all have the same process number."""
    with tempfile.TemporaryDirectory(prefix="tav-wasm-") as folder:
        done = subprocess.run([*NODE, str(program), *arguments], cwd=cwd, capture_output=True, text=True,
                              errors="replace", timeout=PATIENCE, env={**os.environ, "TMPDIR": folder}, check=False)
    return done.returncode, done.stdout, done.stderr


def tests_of(program):
    """All tests of a program, as the filter knows them."""
    status, out, err = run(program, ["--gtest_list_tests"], ROOT / "tests")
    names, suite = [], ""
    for line in out.splitlines():
        name = line.split("#")[0].rstrip()
        if line.startswith("  "):
            names.append(suite + name.strip())
        elif name.endswith("."):
            suite = name
    if status != 0 or not names:
        raise SystemExit(f"{program} lists no tests: {err[-2000:]}")
    return names


def run_room(name, excluded):
    """How many tests passed, and what is wrong."""
    program = BUILD / f"tests/{name}_tests.js"
    names = tests_of(program)
    wrong = [f"wasm.list: room {name} has no test {pattern}" for pattern in excluded
             if not any(fnmatch.fnmatchcase(test, pattern) for test in names)]
    status, out, err = run(program, ["--gtest_brief=1", "--gtest_filter=-" + ":".join(excluded)], ROOT / "tests")
    count = re.search(r"^\[  PASSED  \] (\d+) tests?\.", out, re.MULTILINE)
    if status != 0 or count is None:
        wrong.append(f"{name}, status {status}:\n{out[-6000:]}{err[-2000:]}")
    return int(count[1]) if count else 0, wrong


def run_fuzzer(name):
    folders = [folder for kind in ("corpus", "findings") if (folder := ROOT / "fuzz" / kind / name).is_dir()]
    status, out, err = run(BUILD / f"fuzz/fuzz_{name}.js", map(str, folders), ROOT)
    count = re.search(r"^(\d+) inputs$", out, re.MULTILINE)
    wrong = [] if status == 0 and count else [f"{name}, status {status}:\n{out[-2000:]}{err[-2000:]}"]
    return int(count[1]) if count else 0, wrong


def run_chosen(kind, name, excluded):
    return run_room(name, excluded.get(name, [])) if kind == "room" else run_fuzzer(name)


def build(chosen):
    jobs = str(processors())
    targets = [f"{name}_tests" if kind == "room" else f"fuzz_{name}" for kind, name in chosen]
    for command in (["cmake", "--preset", "wasm-tests"],
                    ["cmake", "--build", "--preset", "wasm-tests", "--parallel", jobs, "--target", *targets]):
        done = subprocess.run(command, cwd=ROOT, stdout=subprocess.PIPE, stderr=subprocess.STDOUT, text=True, check=False)
        if done.returncode != 0:
            raise SystemExit(done.stdout[-8000:])


def main(arguments):
    floors, long, excluded = read_list()
    wanted = [word for word in arguments if not word.startswith("--")]
    left_out = long if "--short" in arguments else set()
    chosen = [key for key in floors if (key[1] in wanted or not wanted) and key not in left_out]
    unknown = set(wanted) - {name for _, name in floors}
    if unknown:
        raise SystemExit(f"wasm.list knows nothing of {', '.join(sorted(unknown))}")
    if "--build" in arguments:
        build(chosen)
    total, wrong = 0, []
    with concurrent.futures.ThreadPoolExecutor(processors()) as pool:
        results = list(pool.map(lambda key: run_chosen(*key, excluded), chosen))
    for (kind, name), (count, faults) in zip(chosen, results):
        print(f"{kind} {name}: {count} {'tests' if kind == 'room' else 'inputs'}, at least {floors[kind, name]}", flush=True)
        total += count
        wrong += faults
        if count < floors[kind, name]:
            wrong.append(f"{kind} {name}: {count} ran, {floors[kind, name]} have to")
    print("\n".join([*wrong, f"{total} passed, {len(wrong)} faults"]))
    return 1 if wrong or total == 0 else 0


if __name__ == "__main__":
    sys.exit(main(sys.argv[1:]))
