#!/usr/bin/env python3
"""What reading hostile streams costs grows with their length, and with what is printed of them, and no faster.

    hostile_test.py [--full] [--least N] [--most N] [--family NAME]... [--form FORM]...

Counts instructions for each family of streams, operation and access, from the least length to the most by doubling, and
prints a table: the worst growth a doubling first. What is printed counts as length, too: indentation alone grows with
the square of the nesting. --full takes 16 KiB to 1 MiB, all accesses, both byte orders and aligned payloads, and an
hour or more; the test takes the first doubling in memory and over a ring of two pages.
"""
import argparse
import collections
import concurrent.futures
import os
import pathlib
import re
import subprocess
import sys
import tempfile
import unittest

PROGRAM = os.environ.get("TAV_SCALE_HOSTILE", "build/release/tests/system/scale/scale_hostile")
VALGRIND = os.environ.get("TAV_VALGRIND", "valgrind")
LIMIT = 2.2
FAMILIES = 26
SHORT = ["memory", "ring2"]
FULL = ["memory", "ring1", "ring2", "ring10", "memory+swapped", "memory+aligned", "ring2+swapped+aligned"]

# valgrind counts each byte of a repeated move as an instruction.
TUNABLES = "glibc.cpu.x86_rep_movsb_threshold=0x7fffffff:glibc.cpu.x86_rep_stosb_threshold=0x7fffffff"

Sample = collections.namedtuple("Sample", "length printed instructions")


def families():
    return subprocess.run([PROGRAM], capture_output=True, text=True, check=True).stdout.split()


def measure(family, least, most, forms):
    """(family, form, operation) -> samples by rising length."""
    with tempfile.TemporaryDirectory(prefix="tav-hostile-") as folder:
        out = pathlib.Path(folder) / "cost"
        done = subprocess.run(
            [VALGRIND, "--tool=callgrind", f"--callgrind-out-file={out}", "--zero-before=tavMeasured",
             "--dump-after=tavMeasured", PROGRAM, family, str(least), str(most), *forms],
            capture_output=True, text=True, check=False, env=dict(os.environ, GLIBC_TUNABLES=TUNABLES))
        if done.returncode != 0:
            raise AssertionError(done.stdout[-2000:] + done.stderr[-2000:])
        found = collections.defaultdict(list)
        for number, line in enumerate(done.stdout.splitlines(), start=1):
            form, operation, length, printed, _ = line.split()
            text = pathlib.Path(f"{out}.{number}").read_text(encoding="utf-8", errors="replace")
            instructions = int(re.search(r"^(?:summary|totals): (\d+)", text, re.M)[1])
            found[family, form, operation].append(Sample(int(length), int(printed), instructions))
        return found


def measure_all(names, least, most, forms):
    samples = {}
    with concurrent.futures.ThreadPoolExecutor(os.cpu_count()) as pool:
        for found in pool.map(lambda name: measure(name, least, most, forms), names):
            samples.update(found)
    return samples


def growths(samples):
    """By how much the cost grows for each doubling of what is read and printed, or of what is read if that is more."""
    return [2 * after.instructions / before.instructions
            / max(2, (after.length + after.printed) / (before.length + before.printed))
            for before, after in zip(samples, samples[1:])]


def table(samples):
    rows = sorted(((growths(some), key, some) for key, some in samples.items()),
                  key=lambda row: max(row[0], default=0), reverse=True)
    yield f"{'family':32} {'access':24} {'operation':12} {'worst':>6}  {'instructions of the longest':>27}  each doubling"
    for each, (family, form, operation), some in rows:
        last = some[-1]
        yield (f"{family:32} {form:24} {operation:12} {max(each, default=0):6.2f}  {last.instructions:27}  "
               + " ".join(f"{growth:.2f}" for growth in each))


class Hostile(unittest.TestCase):
    def test_streams_cost_no_more_than_their_length(self):
        names = families()
        self.assertGreaterEqual(len(names), FAMILIES)
        samples = measure_all(names, 0x4000, 0x8000, SHORT)
        self.assertEqual(len(samples), len(names) * len(SHORT) * 10, "ten operations each")
        print("\n".join(list(table(samples))[:20]))
        for key, some in sorted(samples.items()):
            with self.subTest(key=key):
                self.assertLessEqual(max(growths(some), default=0), LIMIT, some)


def main():
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("--full", action="store_true")
    parser.add_argument("--least", type=lambda text: int(text, 0), default=0x4000)
    parser.add_argument("--most", type=lambda text: int(text, 0))
    parser.add_argument("--family", action="append")
    parser.add_argument("--form", action="append")
    given = parser.parse_args()
    most = given.most or (0x100000 if given.full else 0x8000)
    samples = measure_all(given.family or families(), given.least, most, given.form or (FULL if given.full else SHORT))
    print("\n".join(table(samples)))
    over = sum(max(growths(some), default=0) > LIMIT for some in samples.values())
    print(f"{len(samples)} rows, {over} of them above {LIMIT}")
    return 1 if over else 0


if __name__ == "__main__":
    sys.exit(main())
