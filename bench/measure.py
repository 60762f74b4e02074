#!/usr/bin/env python3
"""Runs the programs of bench/ and writes what they say as JSON.

    measure.py BUILD RESULT [--quick]

BUILD is the folder of a build with TAV_BUILD_BENCH, RESULT the file to write. --quick runs everything once and
briefly, to see that it works: its times mean little. Fails when a program fails or an entry gives a wrong result.
"""
import argparse
import json
import os
import pathlib
import platform
import re
import shutil
import statistics
import subprocess
import sys
import tempfile
import time

import compiling

SMALL = "^(W[1-5](dom|mem|file|table)?|call)/([^_]|_[^t]|_t[^r])*$"
TRACED = "_traced$"  # in a process of their own: one that has traced looks twice from then on
# Which entries run interleaved with one another, how often, and for how many seconds each time at the least.
GROUPS = [(SMALL, 15, 0.02), (TRACED, 5, 0.02), ("^W6", 7, 0.02), ("^W[125]cold/", 5, 0.01), ("^W7", 5, 0.01), ("^W9", 5, 0.01)]
QUICK_GROUPS = [(SMALL, 3, 0.001), (TRACED, 1, 0.001), ("^W6cache/", 3, 0.001)]

INSTRUCTIONS = [
    "W1/floor", "W1/tavAddElement", "W1/tavAddElement_kept_descriptor", "W1/tavAddElement_zeroed_descriptor",
    "W1/tavAddElement_initialized_descriptor", "W1/layer", "W1/layer_growing", "W2/floor", "W2/tavGetNextChild", "W2/layer_children",
    "W2/layer_descendants", "W3/floor", "W3/tavFindElmInt", "W3/tavFindElmInt_own_stack", "W3/layer_path", "index/made",
    "W4file/tavPrintSubtree_xml", "W4file/layer_print_xml", "W5/floor", "W5/tavValidateHierarchy", "ring/tavAddElement",
    "ring/tavGetNextChild", "ring/layer_add", "ring/layer_children",
]
GROWING = ["W1/tavAddElement", "W2/tavGetNextChild", "W4file/tavPrintSubtree_xml", "W5/tavValidateHierarchy"]
DOUBLINGS = 6
LAYER_PAIRS = [("plainWrite", "layerWrite"), ("plainWalk", "layerWalk"), ("plainDescend", "layerDescend")]
LEAVES = 24000
PATHS = 4096


def run(command, **options):
    done = subprocess.run([str(word) for word in command], stdout=subprocess.PIPE, text=True, check=False, **options)
    if done.returncode != 0:
        sys.exit(f"measure.py: failed with {done.returncode}: {' '.join(map(str, command))}\n{done.stdout}")
    return done.stdout


def times(bench, groups):
    """The repetitions of every entry, as Google Benchmark reports them."""
    runs = []
    for pattern, repetitions, seconds in groups:
        with tempfile.NamedTemporaryFile(suffix=".json") as out:
            run([bench / "tav_bench", f"--benchmark_filter={pattern}", f"--benchmark_repetitions={repetitions}",
                 f"--benchmark_min_time={seconds}", "--benchmark_enable_random_interleaving=true",
                 f"--benchmark_out={out.name}", "--benchmark_out_format=json"], stderr=subprocess.DEVNULL)
            runs += [r for r in json.load(out)["benchmarks"] if r.get("run_type") == "iteration"]
    return runs


def summarize(runs):
    """Entry -> CPU nanoseconds of a pass (median), spread, nanoseconds an item. Exits on an entry that failed."""
    samples = {}
    failed = set()
    for entry in runs:
        name = entry["run_name"].removesuffix("/real_time")
        if entry.get("error_occurred"):
            failed.add(f"{name}: {entry.get('error_message')}")
            continue
        scale = {"ns": 1, "us": 1e3, "ms": 1e6, "s": 1e9}[entry["time_unit"]]
        samples.setdefault(name, []).append((entry["cpu_time"] * scale, entry))
    if failed or not samples:
        sys.exit("measure.py: " + ("; ".join(sorted(failed)) or "no entry ran"))
    result = {}
    for name, values in samples.items():
        nanoseconds = [value for value, _ in values]
        median = statistics.median(nanoseconds)
        quarters = statistics.quantiles(nanoseconds, n=4) if len(nanoseconds) > 2 else [median] * 3
        result[name] = {"pass_ns": median, "spread": (quarters[2] - quarters[0]) / 2 / median}
        if "items_per_second" in values[0][1]:
            # Of the CPU's time as well: no entry with items asks for the real one.
            result[name]["item_ns"] = statistics.median(1e9 / entry["items_per_second"] for _, entry in values)
        if "records" in values[0][1]:
            result[name]["records"] = values[0][1]["records"]
    return result


def callgrind(command, *options):
    """The instructions of a program: of the whole, and of each part that it dumps, in order."""
    with tempfile.TemporaryDirectory() as folder:
        run(["valgrind", "--tool=callgrind", f"--callgrind-out-file={folder}/counts", *options, *command],
            stderr=subprocess.DEVNULL)
        files = [pathlib.Path(folder) / "counts", *pathlib.Path(folder).glob("counts.*")]
        files[1:] = sorted(files[1:], key=lambda path: int(path.suffix[1:]))
        total, *parts = (int(re.search(r"^totals: (\d+)", file.read_text(), re.M).group(1)) for file in files)
        return total, parts


def instructions(bench, doublings):
    once = bench / "tav_once"
    parts = ["nothing", *INSTRUCTIONS, *(f"{part}:{2 ** i}" for part in GROWING for i in range(doublings + 1))]
    _, counts = callgrind([once, *parts], "--toggle-collect=measuredWork", "--dump-after=measuredWork")
    if len(counts) != len(parts):
        sys.exit(f"measure.py: {len(parts)} parts, but {len(counts)} counts")
    counted = {part: count - counts[0] for part, count in zip(parts, counts)}
    items = {part: PATHS if part.startswith("W3/") else LEAVES for part in INSTRUCTIONS}
    layer = {}
    for plain, layered in LAYER_PAIRS:
        (first, _), (second, _) = (callgrind([bench / "layer_cost", "--once", part], f"--toggle-collect={part}*")
                                   for part in (plain, layered))
        layer[layered] = second / first
    return {
        "items": {part: counted[part] / items[part] for part in INSTRUCTIONS},
        "growth": {part: [counted[f"{part}:{2 ** i}"] for i in range(doublings + 1)] for part in GROWING},
        "layer": layer,
    }


def memory(bench, folder, stream_bytes):
    program = bench / "tav_memory"
    stream = pathlib.Path(folder) / "tav-bench-stream"
    try:
        return {
            "stream_bytes": stream_bytes,
            "nothing": int(run([program, "nothing"])),
            "write": int(run([program, "write", stream, stream_bytes])),
            "walk": int(run([program, "walk", stream])),
            "handles_100": int(run([program, "handles", 100])),
            "handles_100000": int(run([program, "handles", 100000])),
        }
    finally:
        stream.unlink(missing_ok=True)


def processors(bench, mebibytes):
    """W10: what one thread and two take of the same stream."""
    found = {}
    for line in run([bench / "tav_parts", mebibytes]).splitlines():
        plan = re.match(r"W10/(plan_\w+): ([\d.]+) ms for (\d+) parts: ([\d.]+) ms a GB", line)
        both = re.match(r"W10/(\w+): one thread ([\d.]+) ms, two ([\d.]+) ms: ([\d.]+) .* in all ([\d.]+) times", line)
        if plan:
            found[plan[1]] = {"ms": float(plan[2]), "parts": int(plan[3]), "ms_a_gb": float(plan[4])}
        elif both:
            found[both[1]] = {"one_ms": float(both[2]), "two_ms": float(both[3]), "faster": float(both[4]), "work": float(both[5])}
    if not found:
        sys.exit("measure.py: tav_parts told nothing")
    return {"mebibytes": mebibytes, "ways": found}


def files(bench, folder, mebibytes):
    """The table of file_access, row by row."""
    lines = run([bench / "file_access", pathlib.Path(folder) / "tav-bench-access", mebibytes]).splitlines()
    rows = [[cell.strip() for cell in line.strip("|").split("|")] for line in lines]
    return {"mebibytes": mebibytes, "head": rows[0], "rows": rows[2:]}


def startup(bench, rounds):
    empty, opens = bench / "tav_startup_empty", bench / "tav_startup"
    taken = {empty: [], opens: []}
    for _ in range(rounds):
        for program, samples in taken.items():
            start = time.perf_counter()
            run([program])
            samples.append(time.perf_counter() - start)
    return {
        "empty_ms": statistics.median(taken[empty]) * 1e3,
        "opens_ms": statistics.median(taken[opens]) * 1e3,
        "empty_instructions": callgrind([empty])[0],
        "opens_instructions": callgrind([opens])[0],
    }


def stripped_bytes(build, name):
    with tempfile.NamedTemporaryFile() as out:
        shutil.copyfile(build / name, out.name)
        run(["strip", "--strip-unneeded", out.name])
        return os.path.getsize(out.name)


def machine():
    info = pathlib.Path("/proc/cpuinfo")
    model = re.search(r"^model name\s*:\s*(.*)$", info.read_text(), re.M) if info.exists() else None
    compiler = subprocess.run(["g++", "-dumpfullversion"], stdout=subprocess.PIPE, text=True, check=True)
    return {"cpu": model.group(1) if model else platform.machine(), "cores": os.cpu_count(),
            "compiler": "g++ " + compiler.stdout.strip()}


def main():
    parser = argparse.ArgumentParser()
    parser.add_argument("build", type=pathlib.Path)
    parser.add_argument("result", type=pathlib.Path)
    parser.add_argument("--quick", action="store_true")
    arguments = parser.parse_args()
    quick, bench = arguments.quick, arguments.build / "bench"
    folder = os.environ.get("BENCH_DIR", tempfile.gettempdir())
    result = {
        "quick": quick,
        "machine": machine(),
        "times": summarize(times(bench, QUICK_GROUPS if quick else GROUPS)),
        "instructions": instructions(bench, 1 if quick else DOUBLINGS),
        "memory": memory(bench, folder, (16 << 20) if quick else (4 << 30)),
        "processors": processors(bench, 8 if quick else 64),
        "files": files(bench, folder, 8 if quick else 100),
        "startup": startup(bench, 5 if quick else 200),
        "compile": compiling.measured(1 if quick else compiling.ROUNDS),
        "library": {name: stripped_bytes(arguments.build, name) for name in ("libtav.so", "libkor.so")},
    }
    arguments.result.write_text(json.dumps(result, indent=1) + "\n")


if __name__ == "__main__":
    main()
