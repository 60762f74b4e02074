#!/usr/bin/env python3
"""Measures the program's commands on one stream: W8.

    program.py BUILD RESULT [--quick]

BUILD is the folder of a build with TAV_BUILD_BENCH and TAV_BUILD_TOOLS; RESULT is a JSON file, to which this is added.
The commands run one after the other, round by round, so that what disturbs the machine disturbs all of them; what is told is the
median of the rounds. Other programs do like work on the same stream as JSON and XML; one that is missing is left out.
"""
import argparse
import json
import pathlib
import shlex
import shutil
import statistics
import subprocess
import sys
import tempfile

import measure

HOSTS, ROUNDS = 42, 7  # a million leaves
LEAVES = 24000  # of one host
FEW = (2, 3)  # hosts between which instructions are counted: what a start costs is in both
TREE_PATH, LEAF_PATH = "/#5000/#4000[{last}]", "/#5000/#4000[{last}]/#3003/#2050/#1012"

# Name -> what a shell is to do. {tav} is the program; {s}, {json} and {xml} the stream in its forms; {out} a new file.
COMMANDS = {
    "print": "{tav} print {s}",
    "check": "{tav} check {s}",
    "tree": "{tav} tree {s}",
    "json": "{tav} json {s}",
    "json --compact": "{tav} json --compact {s}",
    "json --lines": "{tav} json --lines {s}",
    "xml": "{tav} xml {s}",
    "hex": "{tav} hex {s}",
    "diff with itself": "{tav} diff {s} {s}",
    "recover": "{tav} recover {s} -o {out} --force",
    "build": "{tav} build {json} -o {out} --force",
    "json | build": "{tav} json {s} | {tav} build - -o {out} --force",
    "info": "{tav} info {s}",
    "schema": "{tav} schema {s}",
    "get, one by a path": f"{{tav}} get {{s}} '{LEAF_PATH}'",
    "get, all of a name": "{tav} get {s} -a '//#1006'",
    "extract, one group": f"{{tav}} extract {{s}} '{TREE_PATH}' -o {{out}} --force",
    "cat": "{tav} cat {s} -o {out} --force",
    "set, one by a path": f"{{tav}} set {{s}} '{LEAF_PATH}' 7 -o {{out}} --force",
}
PEERS = {
    "jq -c . of the JSON": "jq -c . {json}",
    "python3 -m json.tool of the JSON": "/usr/bin/python3 -m json.tool {json}",
    "xmllint --noout of the XML": "xmllint --huge --noout {xml}",
}
PIPE = "json | build"


def spend(bench, line):
    """Seconds of the CPU and peak bytes of a shell's line."""
    done = subprocess.run([bench / "tav_spend", "sh", "-c", line], stdout=subprocess.PIPE, text=True, check=False)
    if done.returncode != 0:
        sys.exit(f"program.py: failed with {done.returncode}: {line}")
    seconds, peak = done.stdout.split()
    return float(seconds), int(peak)


class Streams:
    """One stream in its forms, in a folder."""

    def __init__(self, build, folder, hosts):
        folder = pathlib.Path(folder)
        names = {"s": folder / f"{hosts}.tav", "json": folder / f"{hosts}.json", "xml": folder / f"{hosts}.xml"}
        self.names = {"tav": build / "tools" / "tav", "out": folder / "out.tav", "last": hosts, **names}
        self.hosts = hosts
        subprocess.run([build / "bench" / "tav_stream", names["s"], str(hosts)], check=True)
        for form in ("json", "xml"):
            subprocess.run([self.names["tav"], form, names["s"], "-o", names[form], "--force"], check=True)

    def line(self, command):
        return command.format(**self.names)


def times(bench, streams, commands, rounds):
    """Command -> median seconds, spread, peak bytes. The first round warms the caches and is not counted."""
    samples = {name: [] for name in commands}
    for number in range(rounds + 1):
        for name, command in commands.items():
            taken = spend(bench, streams.line(command))
            if number != 0:
                samples[name].append(taken)
    result = {}
    for name, taken in samples.items():
        seconds = [one for one, _ in taken]
        median = statistics.median(seconds)
        quarters = statistics.quantiles(seconds, n=4) if len(seconds) > 2 else [median] * 3
        result[name] = {"seconds": median, "spread": (quarters[2] - quarters[0]) / 2 / median,
                        "peak": max(peak for _, peak in taken)}
    return result


def instructions(few, more, names):
    """Command -> instructions a leaf, without those of the start."""
    def count(streams, command):
        return measure.callgrind(shlex.split(streams.line(command)))[0]

    result = {}
    for name in names:
        if name != PIPE:
            taken = count(more, COMMANDS[name]) - count(few, COMMANDS[name])
            result[name] = taken / (LEAVES * (more.hosts - few.hosts))
    if PIPE in names:
        result[PIPE] = result["json"] + result["build"]
    return result


def measured(build, quick):
    bench = build / "bench"
    missing = {name: command.split()[0] for name, command in PEERS.items() if shutil.which(command.split()[0]) is None}
    entries = {**COMMANDS, **{name: command for name, command in PEERS.items() if name not in missing}}
    with tempfile.TemporaryDirectory() as folder:
        streams = Streams(build, folder, 1 if quick else HOSTS)
        few, more = (Streams(build, folder, hosts) for hosts in FEW)
        return {
            "hosts": streams.hosts,
            "leaves": LEAVES * streams.hosts,
            "bytes": {form: streams.names[form].stat().st_size for form in ("s", "json", "xml")},
            "times": times(bench, streams, entries, 1 if quick else ROUNDS),
            "instructions": instructions(few, more, ["print", "check"] if quick else list(COMMANDS)),
            "missing": missing,
        }


def main():
    parser = argparse.ArgumentParser()
    parser.add_argument("build", type=pathlib.Path)
    parser.add_argument("result", type=pathlib.Path)
    parser.add_argument("--quick", action="store_true")
    arguments = parser.parse_args()
    result = json.loads(arguments.result.read_text()) if arguments.result.exists() else {}
    result["program"] = {"quick": arguments.quick, "machine": measure.machine(),
                         **measured(arguments.build.resolve(), arguments.quick)}
    arguments.result.write_text(json.dumps(result, indent=1) + "\n")


if __name__ == "__main__":
    main()
