"""The record of the long runs tells of each part that was run, and of one that fails that it did."""
import os
import pathlib
import shutil
import subprocess
import tempfile
import unittest

ROOT = pathlib.Path(__file__).resolve().parents[3]
NAMED = {"GIT_AUTHOR_NAME": "a", "GIT_AUTHOR_EMAIL": "a@b", "GIT_COMMITTER_NAME": "a", "GIT_COMMITTER_EMAIL": "a@b"}
BUILDS = """#!/bin/sh
echo "same bytes: one"
echo "same bytes: two"
"""
FAILS = """#!/bin/sh
echo "no such machine"
false
"""
FUZZES = """#!/bin/sh
# ... || targets=(read write)
echo "read: 1000 executions, 61 s, cov: 10 ft: 20 corp: 5/70b, no finding"
echo "write: $1, see a file"
"""
SUMS = """| target | seconds | executions | edges | features | last run |
| --- | ---: | ---: | ---: | ---: | --- |
| read | 7,000 | 200,000 | 11 | 18 | 2026-01-02 |
| write | 7,000 | 200,000 | 11 | 18 | 2026-01-02 |
"""


@unittest.skipUnless(shutil.which("git"), "a commit needs git")
class Record(unittest.TestCase):
    def setUp(self):
        folder = tempfile.TemporaryDirectory()
        self.addCleanup(folder.cleanup)
        self.tree = pathlib.Path(folder.name)
        shutil.copy(ROOT / "nightly.sh", self.tree)
        for name, text in (("packaging/reproduce.sh", BUILDS), ("packaging/build.sh", FAILS),
                           ("packaging/bare-machine.sh", BUILDS)):
            path = self.tree / name
            path.parent.mkdir(exist_ok=True)
            path.write_text(text)
            path.chmod(0o755)
        (self.tree / "docs").mkdir()
        for command in (["init", "-q"], ["add", "-A"], ["commit", "-qm", "all"]):
            self.assertEqual(self.run_in_tree("git", *command).returncode, 0)

    def run_in_tree(self, *command):
        return subprocess.run(command, cwd=self.tree, capture_output=True, text=True, timeout=120,
                              env={**os.environ, **NAMED})

    def rows(self):
        lines = (self.tree / "docs/nightly.md").read_text().splitlines()
        rows = [[cell.strip() for cell in line.strip("|").split("|")] for line in lines if line.startswith("| ")]
        return rows[2:]

    def test_each_part_has_its_line_and_a_failure_keeps_none_from_running(self):
        done = self.run_in_tree("./nightly.sh", "3", "bare", "reproduce")
        self.assertEqual(done.returncode, 1, done.stderr)
        commit = self.run_in_tree("git", "rev-parse", "--short", "HEAD").stdout.strip()
        rows = self.rows()
        self.assertEqual([row[1:4] for row in rows], [[commit, "bare", "3"], [commit, "reproduce", "3"]])
        # The second of its commands would have worked.
        self.assertEqual([row[5] for row in rows], ["FAILED: no such machine", "2 artefacts, the same bytes"])

    def test_lines_are_added_and_changes_are_told(self):
        self.assertEqual(self.run_in_tree("./nightly.sh", "1", "reproduce").returncode, 0)
        (self.tree / "packaging/build.sh").write_text(BUILDS)
        self.assertEqual(self.run_in_tree("./nightly.sh", "2", "reproduce").returncode, 0)
        rows = self.rows()
        self.assertEqual([row[3] for row in rows], ["1", "2"])
        self.assertFalse(rows[0][1].endswith(" and changes"))
        self.assertTrue(rows[1][1].endswith(" and changes"))

    def test_fuzzing_is_summed_up_and_a_finding_begins_a_sum_anew(self):
        (self.tree / "fuzz").mkdir()
        shutil.copy(ROOT / "fuzz/tally.py", self.tree / "fuzz")
        (self.tree / "docs/fuzzing.md").write_text(SUMS)
        (self.tree / "fuzz/run.sh").write_text(FUZZES.replace("$1", "FOUND"))
        (self.tree / "fuzz/run.sh").chmod(0o755)
        self.run_in_tree("./nightly.sh", "1", "fuzz")
        sums = [line.rsplit("|", 2)[0] for line in (self.tree / "docs/fuzzing.md").read_text().splitlines()[2:]]
        self.assertEqual(sums, ["| read | 7,061 | 201,000 | 11 | 20 ", "| write | 0 | 0 | 11 | 18 "])

    def test_what_is_no_part_is_refused_before_anything_runs(self):
        done = self.run_in_tree("./nightly.sh", "1", "reproduce", "nothing")
        self.assertEqual(done.returncode, 2)
        self.assertIn("no part 'nothing'", done.stderr)
        self.assertFalse((self.tree / "docs/nightly.md").exists())


if __name__ == "__main__":
    unittest.main()
