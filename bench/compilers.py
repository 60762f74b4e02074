#!/usr/bin/env python3
"""Measures the workloads as other compilers and options make them: what is inlined is the program's own code.

    compilers.py BUILD RESULT [--quick]

BUILD is the folder of a build with TAV_BUILD_BENCH, whose libraries are used as they are; RESULT is a JSON file, to which
this is added. The same sources are compiled for each; a compiler that is missing is left out.
"""
import argparse
import concurrent.futures
import json
import os
import pathlib
import shutil
import tempfile

import measure

VARIANTS = [("g++", "-O2"), ("g++", "-O3"), ("clang++", "-O2"), ("clang++", "-O3")]
SOURCES = ["main.cpp", "floor.cpp", "floorApi.cpp", "floorPrint.cpp", "workload.cpp", "library/layer.cpp", "library/plain.cpp",
           "library/print.cpp"]
ENTRIES = "^W[1235]/(floor|layer.*|tavAddElement|tavGetNextChild|tavFindElmInt|tavValidateHierarchy)$"
REPETITIONS = 15


def program(build, folder, compiler, option):
    source = pathlib.Path(__file__).resolve().parent
    flags = ["-std=c++20", option, "-DNDEBUG", f"-I{source.parent}", f"-I{source.parent / 'include'}"]
    made = [pathlib.Path(folder) / f"{name.replace('/', '-')}.o" for name in SOURCES]
    with concurrent.futures.ThreadPoolExecutor(os.cpu_count()) as pool:
        for done in [pool.submit(measure.run, [compiler, *flags, "-c", source / name, "-o", out])
                     for name, out in zip(SOURCES, made)]:
            done.result()
    measure.run([compiler, *made, f"-L{build}", "-ltav", "-lkor", "-lbenchmark", "-lpthread", f"-Wl,-rpath,{build}",
                 "-o", pathlib.Path(folder) / "tav_bench"])


def measured(build, quick):
    found = {}
    for compiler, option in VARIANTS[:1] if quick else VARIANTS:
        if shutil.which(compiler) is None:
            continue
        with tempfile.TemporaryDirectory() as folder:
            program(build, folder, compiler, option)
            group = (ENTRIES, 1 if quick else REPETITIONS, 0.001 if quick else 0.02)
            found[f"{compiler} {option}"] = measure.summarize(measure.times(pathlib.Path(folder), [group]))
    return found


def main():
    parser = argparse.ArgumentParser()
    parser.add_argument("build", type=pathlib.Path)
    parser.add_argument("result", type=pathlib.Path)
    parser.add_argument("--quick", action="store_true")
    arguments = parser.parse_args()
    result = json.loads(arguments.result.read_text()) if arguments.result.exists() else {}
    result["compilers"] = {"quick": arguments.quick, "machine": measure.machine(),
                           "times": measured(arguments.build.resolve(), arguments.quick)}
    arguments.result.write_text(json.dumps(result, indent=1) + "\n")


if __name__ == "__main__":
    main()
