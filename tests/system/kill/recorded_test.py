"""A recorder is killed at random moments, and another one goes on in its file: no node is lost that was promised."""
import os
import pathlib
import random
import re
import subprocess
import sys
import tempfile
import time
import unittest

sys.path.insert(0, str(pathlib.Path(__file__).resolve().parent.parent / "tools"))
from support import running, tav  # noqa: E402  (behind the path that leads to it)

RECORDER = os.environ["TAV_KILL_RECORDER"]
KILLS = int(os.environ.get("TAV_KILLS", "40"))  # hundreds and more on demand
SEED = int(os.environ.get("TAV_TEST_SEED", "1"))
A_FILE = 12  # kills of recorders of one file
TAG = "cpuOnline"


class KilledRecorder(unittest.TestCase):
    def setUp(self):
        folder = tempfile.TemporaryDirectory(prefix="tav-recorded-")
        self.addCleanup(folder.cleanup)
        self.folder = pathlib.Path(folder.name)

    def record(self, file, first, rng):
        """Runs a recorder until it is killed; the number that it was promised last, or the first one."""
        command = [RECORDER, str(file), str(first), str(rng.randrange(1 << 30)), str(rng.choice((2, 3, 10)) << 20)]
        with running(command, stdout=subprocess.PIPE, stderr=subprocess.PIPE) as recorder:
            promised = recorder.stdout.readline() if rng.random() < 0.8 else b""
            time.sleep(rng.random() ** 3 * 0.2)
            recorder.kill()
            promised += recorder.stdout.read()
            error = recorder.stderr.read().decode()
            self.assertEqual(recorder.wait(), -9, error)
        lines = [line for line in promised.decode().splitlines(keepends=True) if line.endswith("\n")]
        return int(lines[-1].split()[1]) if lines else first

    def numbers(self, file):
        result = tav("get", "--all", file, f"**/{TAG}", "--root", "64", "--no-align", "--byte-order", "native")
        self.assertIn(result.status, (0, 1), result.err)
        text = result.out.decode() if isinstance(result.out, bytes) else result.out
        return [int(number) for number in re.findall(r"(\d+)\s*$", text, re.MULTILINE)]

    def test_what_was_promised_is_there_and_the_next_one_goes_on(self):
        rng = random.Random(SEED)
        found = []
        promises = resumed = 0
        for kill in range(KILLS):
            file = self.folder / f"{kill // A_FILE}.tav"
            found = found if file.exists() else []
            first = found[-1] + 1 if found else 0
            promised = self.record(file, first, rng)
            promises += promised > first
            resumed += first > 0 and promised > first
            with self.subTest(kill=kill, seed=SEED, promised=promised):
                before, found = found, self.numbers(file) if file.exists() and file.stat().st_size else []
                self.assertEqual(found, list(range(len(found))), "all of them, in their order")
                self.assertGreaterEqual(len(found), max(promised, len(before)))
        print(f"{KILLS} killed, {promises} of them behind a promise, {resumed} in a file that another one had left")
        self.assertGreater(resumed, KILLS // 4)


if __name__ == "__main__":
    unittest.main()
