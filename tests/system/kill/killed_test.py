"""A writer is killed at random moments: recover brings back every group whose bytes had reached the file."""
import json
import os
import pathlib
import random
import subprocess
import sys
import tempfile
import time
import unittest

sys.path.insert(0, str(pathlib.Path(__file__).resolve().parent.parent / "tools"))
from planted import EYE_SIZE, Encoder, Form, Node  # noqa: E402  (behind the path that leads to it)
from support import running, tav  # noqa: E402

WRITER = os.environ["TAV_KILL_WRITER"]
KILLS = int(os.environ.get("TAV_KILLS", "150"))  # hundreds and more on demand
SEED = int(os.environ.get("TAV_TEST_SEED", "1"))
GROUPS = 1500
ROOT = 16  # bytes of the root's header


def group(number):
    """The group that the writer appends as its `number`th, from 0."""
    return Node(60002, 2, info=EYE_SIZE, children=[
        Node(60003, 55, number.to_bytes(4, sys.byteorder), info=EYE_SIZE),
        Node(60103, 50, bytes([97 + number % 26]) * (number * 7 % 40)),
        Node(60004, 101, bytes([number % 256]) * (number * 13 % 200), info=EYE_SIZE)])


def made():
    """The bytes of every group, and where each begins in the file."""
    groups, at = [], ROOT
    for number in range(GROUPS):
        encoder = Encoder(Form(big=sys.byteorder == "big"))
        encoder.put(group(number), True)
        groups.append((at, bytes(encoder.out)))
        at += len(encoder.out)
    return groups


class KilledWriter(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        cls.groups = made()

    def setUp(self):
        folder = tempfile.TemporaryDirectory(prefix="tav-kill-")
        self.addCleanup(folder.cleanup)
        self.file = pathlib.Path(folder.name) / "x.tav"
        self.saved = pathlib.Path(folder.name) / "saved.tav"

    def write(self, page, pages, seed, delay=None):
        """Runs the writer, killed after a delay; whether it was still at work."""
        self.file.unlink(missing_ok=True)
        command = [WRITER, str(self.file), str(page), str(pages), str(GROUPS), str(seed)]
        with running(command, stderr=subprocess.PIPE) as writer:
            while not self.file.exists() and writer.poll() is None:
                pass
            start = time.monotonic()
            if delay is not None:
                time.sleep(delay)
                writer.kill()
            status = writer.wait()
            self.took = time.monotonic() - start
            error = writer.stderr.read().decode()
        self.assertIn(status, (0, -9), error)
        return status != 0

    def due(self, content):
        """The groups of which every byte is in the file where it belongs."""
        return [(number, made) for number, (at, made) in enumerate(self.groups)
                if content[at:at + len(made)] == made]

    def recover(self):
        result = tav("recover", self.file, "-o", self.saved, "--force", "--json", "--root", "64", "--no-align",
                     "--byte-order", "native")
        self.assertIn(result.status, (0, 1, 3), result.err)
        return self.saved.read_bytes() if result.status != 3 else b"", result

    def expect_all(self, due, saved, told):
        at = 0
        for number, group_bytes in due:
            found = saved.find(group_bytes, at)
            self.assertGreaterEqual(found, 0, f"group {number} of {len(due)} that are whole did not come back; {told}")
            at = found + len(group_bytes)

    def test_what_the_writer_makes_is_what_this_test_makes(self):
        self.assertFalse(self.write(4096, 4, 7))
        content = self.file.read_bytes()
        self.assertEqual(len(self.due(content)), GROUPS)
        self.assertEqual(tav("check", self.file).status, 0)

    def test_every_group_that_reached_the_file_comes_back(self):
        rng = random.Random(SEED)
        longest = 0.01  # follows how long the writer takes where it is let alone
        killed = whole = partly = 0
        for kill in range(10 * KILLS):  # more of them where a busy machine lets the writer end before the kill comes
            if kill >= KILLS and partly > KILLS // 10:
                break
            page, pages, seed = rng.choice((64, 512, 4096, 65536)), rng.randrange(2, 9), rng.randrange(1 << 32)
            if self.write(page, pages, seed, rng.random() * longest):
                killed += 1
                longest *= 1.1
            else:
                longest *= 0.9
            content = self.file.read_bytes() if self.file.exists() else b""
            due = self.due(content)
            saved, result = self.recover() if content else (b"", None)
            told = f"kill {kill} of seed {SEED}: {page} x {pages}, {len(content)} bytes"
            with self.subTest(told):
                self.expect_all(due, saved, told)
                if due:
                    account = json.loads(result.out)
                    self.assertEqual(account["kept"] + account["lost"] + account["unread"], len(content))
                    self.assertEqual(tav("check", self.saved, "--root", "64", "--no-align").status, 0)
            whole += len(due)
            partly += 0 < len(due) < GROUPS
        print(f"{killed} killed at work, {partly} with a part of the groups, {whole} groups due in all")
        self.assertGreater(partly, KILLS // 10, "most kills hit the writer at its work")


if __name__ == "__main__":
    unittest.main()
