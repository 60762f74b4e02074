"""Every command of docs/cookbook.md, as it stands there, over files of the kind that the page speaks of.

TAV_TOOL is the path of the program.
"""
import json
import os
import pathlib
import shutil
import subprocess
import tempfile
import unittest

from extract_examples import blocks

PAGE = pathlib.Path(__file__).resolve().parents[3] / "docs/cookbook.md"

# What a command has to answer, by its beginning.
ANSWERS = {
    "tav get monday.tav --all '//host[cpu/cpuOnline > 4]/hostName'": "ada\nada\nada\n",
    "tav get monday.tav --all \"//host[hostName='ada']/cpu/cpuOnline\"": "8\n8\n8\n",
    "tav get both.tav --all": "      6 ada\n      6 grace\n",
    "tav get anonymous.tav --all": "somebody\n",
    "tav get monday.tav --dictionary own.json": "/system/queueDepth\t1\n/system[2]/queueDepth\t2\n/system[3]/queueDepth\t3\n",
    "tav get monday.tav '/system[queueDepth > 2]/host/hostName'": "ada\n",
    "tav get monday.tav --all '//jobsWaiting'": "1\n2\n3\n",
    "tav get changed.tav": "1\n",
    "tav check noon.tav": "tav: noon.tav: no defects in 18 nodes\n",
    "cmp ": "",
    "tail -n +2 noon.csv": "ada,40\n",
    "tav table monday.tav --each /system --col time=timestamp --col jobs": (
        "time,jobs\n2026-03-02T06:00:00.000000Z,\n2026-03-02T12:00:00.000000Z,1\n2026-03-02T18:00:00.000000Z,1\n"),
}


def day(day_of_month, free):
    """A few snapshots of two hosts."""
    return {"system": [{"timestamp": {"$type": "UTC Timestamp", "$value": f"2026-03-{day_of_month:02}T{hour:02}:00:00+00:00"},
                        "#40001": number + 1, "#40003": 21600 * number,
                        "host": [{"hostName": "ada", "#40002": 10 + 30 * number, "cpu": {"cpuOnline": 8}, "memory": {"memFree": free - 1000 * number}},
                                 {"hostName": "grace", "#40002": 30, "cpu": {"cpuOnline": 4}, "memory": {"memFree": 700 + number}}]}
                       for number, hour in enumerate((6, 12, 18))]}


class Cookbook(unittest.TestCase):
    def setUp(self):
        self.folder = pathlib.Path(tempfile.mkdtemp(prefix="cookbook"))
        self.addCleanup(shutil.rmtree, self.folder)
        (self.folder / "bin").mkdir()
        (self.folder / "bin/tav").symlink_to(os.environ["TAV_TOOL"])
        (self.folder / "work").mkdir()
        for name, document in (("monday", day(2, 90000)), ("tuesday", day(3, 50000))):
            subprocess.run([os.environ["TAV_TOOL"], "build", "-o", self.folder / f"work/{name}.tav"],
                           input=json.dumps(document).encode(), check=True)

    def shell(self, line):
        return subprocess.run(["bash", "-euo", "pipefail", "-c", line], cwd=self.folder / "work", capture_output=True, timeout=600,
                              env={**os.environ, "PATH": f"{self.folder / 'bin'}:{os.environ['PATH']}", "LC_ALL": "C"})

    @unittest.skipUnless(shutil.which("jq") and shutil.which("bash"), "jq is not installed")
    def test_every_command_answers(self):
        answered = set()
        lines = [line for info, _, content in blocks(PAGE.read_text(encoding="utf-8")) if info == ["sh", "cookbook"]
                 for line in content]
        self.assertGreater(len(lines), 30)
        for line in lines:
            done = self.shell(line)
            out = done.stdout.decode()
            with self.subTest(line):
                self.assertEqual(done.returncode, 0, done.stderr.decode())
                self.assertNotIn("hint", done.stderr.decode())
                self.assertTrue(out or ">" in line or line.startswith(("echo", "cp", "sed", "cmp", "head", "tav extract", "tav cat", "tav json")),
                                "nothing is answered")
                for begin in (begin for begin in ANSWERS if line.startswith(begin)):
                    answered.add(begin)
                    self.assertEqual(out, ANSWERS[begin])
        self.assertEqual(answered, set(ANSWERS))


if __name__ == "__main__":
    unittest.main()
