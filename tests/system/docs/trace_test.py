"""docs/trace.md lists every record: what the tests of the library leave in a trace, no more and no less."""
import collections
import os
import pathlib
import re
import subprocess
import tempfile
import unittest

ROOT = pathlib.Path(__file__).resolve().parents[3]
PROGRAMS = os.environ["TAV_TRACED_PROGRAMS"].split(":")
ENTRY, EXIT, DUMP, ERROR = 1, 2, 3, 4

# Tests that start a trace of their own, that count what only a call without a trace does not allocate, or that take a
# trace of gigabytes.
UNTRACED = ("*MissedPath*", "*RefusedOutput*", "OutputToAFullDevice.*", "SubtreeWithoutMemory.ForAnyEntry*",
            "*NothingIsAllocated*", "*AgainstNaive*", "*Huge*")

ROW = re.compile(r"^\| `(0x[0-9A-F]+)` \| `([^`]+)`([^|]*)\| ([^|]*)\| ?([^|]*)\|$")
DUMPS = re.compile(r"(\d+(?:, \d+)*): (.+)")


def listed():
    """probe -> name, and the sets of (probe, point, items) and (probe, point) that the page lists."""
    names = {}
    dumps, failures, unreachable = set(), set(), set()
    for line in (ROOT / "docs" / "trace.md").read_text(encoding="utf-8").splitlines():
        row = ROW.match(line)
        if row is None:
            continue
        probe = int(row[1], 16)
        names[probe] = row[2]
        for dump in filter(None, row[4].strip().split("; ")):
            points, items = DUMPS.fullmatch(dump).groups()
            count = len(re.sub(r'"[^"]*"', "label", items).split(", "))
            dumps |= {(probe, int(point), count) for point in points.split(", ")}
        for point in row[5].split():
            (unreachable if point.startswith("(") else failures).add((probe, int(point.strip("()"))))
    return names, dumps, failures, unreachable


def named():
    """probe -> function, of probes.h."""
    text = (ROOT / "include" / "tav" / "probes.h").read_text(encoding="utf-8")
    base = int(re.search(r"kBase = (0x[0-9A-F]+)", text)[1], 16)
    return {base + int(number, 16): name for number, name in re.findall(r'PROBE\(\w+, +(0x\w+), "([^"]+)"\)', text)}


def seen():
    """kind -> the set of (probe, point, items) that a run of the programs leaves."""
    records = collections.defaultdict(set)
    with tempfile.TemporaryDirectory(prefix="tav-trace-") as folder:
        for number, program in enumerate(PROGRAMS):
            out = pathlib.Path(folder) / str(number)
            environment = os.environ | {"TAV_TRACE_SEEN": str(out), "GTEST_FILTER": "-" + ":".join(UNTRACED)}
            done = subprocess.run([program, "--gtest_brief=1"], cwd=ROOT / "tests", env=environment,
                                  capture_output=True, text=True, check=False)
            if done.returncode != 0:
                raise AssertionError(f"{program} failed while traced:\n{done.stdout[-4000:]}{done.stderr[-1000:]}")
            for line in out.read_text(encoding="ascii").splitlines():
                probe, kind, point, items = map(int, line.split())
                records[kind].add((probe, point, items))
    return records


def readable(records):
    return sorted((hex(probe), *rest) for probe, *rest in records)


class Records(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        cls.names, cls.dumps, cls.failures, cls.unreachable = listed()
        cls.seen = seen()

    def same(self, said, left):
        self.assertEqual(readable(said - left), [], "listed, but no test leaves it")
        self.assertEqual(readable(left - said), [], "left, but not listed")

    def test_every_probe_is_listed_by_its_name(self):
        self.assertEqual(self.names, named())

    def test_every_function_has_an_entry_and_an_exit(self):
        for kind in (ENTRY, EXIT):
            self.same({(probe, 0, 0) for probe in self.names}, self.seen[kind])

    def test_every_dump_is_listed_with_its_items(self):
        self.same(self.dumps, self.seen[DUMP])

    def test_every_failure_is_listed(self):
        self.same(self.failures, {(probe, point) for probe, point, _ in self.seen[ERROR]})

    def test_what_is_said_to_be_unreachable_is_in_the_list_of_nothing_else(self):
        self.assertEqual(self.unreachable & self.failures, set())


if __name__ == "__main__":
    unittest.main()
