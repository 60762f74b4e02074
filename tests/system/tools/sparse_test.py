"""Sparse files: what the system says to be zeros is not read. Counted by the bytes that the program takes from files."""
import os
import struct
import subprocess
import unittest

from support import EMULATOR, PATIENCE, TAV, WINDOWS, ToolTest, tav

SIZE = 8 << 30
MOST = 32 << 20


def header(size, kind, elm):
    return struct.pack("<QIHH", size, 0, kind, elm)


def read_by(*arguments):
    """Runs the program; its exit status, and the bytes that it read."""
    process = subprocess.Popen([*TAV, *map(str, arguments)], stdin=subprocess.DEVNULL, stdout=subprocess.DEVNULL,
                               stderr=subprocess.DEVNULL)
    try:
        os.waitid(os.P_PID, process.pid, os.WEXITED | os.WNOWAIT)
        with open(f"/proc/{process.pid}/io", encoding="ascii") as counts:
            taken = dict(line.split(": ") for line in counts)
    finally:
        status = process.wait(PATIENCE)
    return status, int(taken["rchar"])


@unittest.skipIf(WINDOWS or EMULATOR or not os.path.exists("/proc/self/io"), "nothing counts what is read here")
class Sparse(ToolTest):
    def setUp(self):
        super().setUp()
        nodes = b"".join(header(4, 55, 307) + struct.pack("<I", value) for value in range(20))
        group = header(len(nodes), 2, 60102) + nodes
        self.content = header(2 * len(group), 2, 60100) + 2 * group
        self.path = self.folder / "sparse.tav"
        self.path.write_bytes(self.content)
        os.truncate(self.path, SIZE)
        with self.path.open("rb") as file:
            try:
                hole = os.lseek(file.fileno(), len(self.content), os.SEEK_HOLE)
            except OSError:
                hole = SIZE
        if hole == SIZE:
            self.skipTest("this file system tells of no holes")

    def commands(self):
        out = self.folder / "out.tav"
        yield from (("info",), ("info", "--full"), ("tree",), ("get", "//cpuOnline"), ("json",), ("xml",), ("check",),
                    ("hex",), ("schema",), ("recover", "-o", out, "--force"), ("print",),
                    ("extract", "/*", "-o", out, "--force"), ("cat", "-o", out, "--force"))

    def test_a_hole_behind_the_stream_is_not_read(self):
        for command, *options in self.commands():
            with self.subTest(command=command, options=options):
                status, taken = read_by(command, self.path, *options)
                self.assertIn(status, (0, 1))
                self.assertLess(taken, MOST)

    def test_a_hole_between_two_streams_is_not_read(self):
        with self.path.open("r+b") as file:
            file.seek(SIZE)
            file.write(self.content)
        for command, *options in self.commands():
            with self.subTest(command=command, options=options):
                status, taken = read_by(command, self.path, *options)
                self.assertIn(status, (0, 1))
                self.assertLess(taken, MOST)

    def test_files_are_compared_without_their_holes(self):
        other = self.folder / "other.tav"
        other.write_bytes(self.content)
        os.truncate(other, SIZE)
        status, taken = read_by("diff", self.path, other)
        self.assertEqual(status, 0)
        self.assertLess(taken, MOST)

    def test_holes_and_zeros_are_told_alike(self):
        zeros = 3 << 20
        written, sparse = self.folder / "a.tav", self.folder / "b.tav"
        for tail in (b"", self.content, b"\xee" * 100):
            written.write_bytes(self.content + bytes(zeros) + tail)
            with sparse.open("wb") as file:
                file.write(self.content)
                file.truncate(len(self.content) + zeros)
                file.seek(0, os.SEEK_END)
                file.write(tail)
            for command, *options in self.commands():
                if command == "info":
                    continue  # it says how far the form was looked for, which is farther where zeros cost nothing
                with self.subTest(command=command, options=options, tail=len(tail)):
                    results = [tav(command, path, *options) for path in (written, sparse)]
                    told = [(one.status, (one.out + one.err).replace(path.name, "x"))
                            for one, path in zip(results, (written, sparse))]
                    self.assertEqual(*told)


if __name__ == "__main__":
    unittest.main()
