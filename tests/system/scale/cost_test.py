"""Twice as many nodes cost twice as many instructions, whatever is done with them."""
import collections
import os
import pathlib
import re
import subprocess
import tempfile
import unittest

PROGRAM = os.environ["TAV_SCALE_COST"]
VALGRIND = os.environ["TAV_VALGRIND"]
NODES = int(os.environ.get("TAV_SCALE_NODES", "200"))


def instructions():
    """(access, operation) -> instructions of N, 2N and 4N nodes."""
    with tempfile.TemporaryDirectory(prefix="tav-cost-") as folder:
        out = pathlib.Path(folder) / "cost"
        done = subprocess.run(
            [VALGRIND, "--tool=callgrind", f"--callgrind-out-file={out}", "--zero-before=tavMeasured",
             "--dump-after=tavMeasured", PROGRAM, str(NODES)], capture_output=True, text=True, timeout=1200, check=False)
        if done.returncode != 0:
            raise AssertionError(done.stdout + done.stderr)
        names = [line.split() for line in done.stdout.splitlines()]
        costs = collections.defaultdict(list)
        for number, (access, what, _) in enumerate(names, start=1):
            text = (pathlib.Path(f"{out}.{number}")).read_text(encoding="utf-8", errors="replace")
            costs[access, what].append(int(re.search(r"^(?:summary|totals): (\d+)", text, re.M)[1]))
        return costs


class Cost(unittest.TestCase):
    def test_grows_with_the_number_of_nodes_and_no_faster(self):
        costs = instructions()
        self.assertEqual(len(costs), 18, "two ways of access, nine operations each")
        for (access, what), (one, two, four) in sorted(costs.items()):
            # What does not depend on the number falls out of the differences.
            ratio = (four - two) / (two - one)
            print(f"{access:7} {what:15} {one:12} {two:12} {four:12}  x {ratio:.3f}  "
                  f"{(four - two) / (2 * NODES):8.1f} a node")
            with self.subTest(access=access, what=what):
                self.assertGreater(two, one)
                self.assertLess(ratio, 2.3, "more than twice as much for twice as many")
                self.assertGreater(ratio, 1.7, "less is no measurement of what it should measure")


if __name__ == "__main__":
    unittest.main()
