"""How file(1) and desktops know a stream: packaging/tav.magic and packaging/tav-mime.xml."""
import contextlib
import os
import pathlib
import random
import shutil
import struct
import subprocess
import unittest
import xml.etree.ElementTree as ElementTree

from json_test import GOLDEN, Folder, golden_bytes
from support import EMULATOR, WINDOWS, tav

PACKAGING = pathlib.Path(__file__).resolve().parents[3] / "packaging"
MAGIC = PACKAGING / "tav.magic"
MIME = PACKAGING / "tav-mime.xml"
SYSTEM = pathlib.Path("/usr/share/misc/magic")
# Other files that must not be taken for streams; any number on demand, as TAV_MAGIC_FILES=20000.
OTHERS = int(os.environ.get("TAV_MAGIC_FILES", "2000"))
FORMS = [(*order, *more) for order in (("--byte-order", "little"), ("--byte-order", "big"))
         for more in ((), ("--align",), ("--root", "32"), ("--eye-size",), ("--eye-size", "--align"))]


def matches(rule, data):
    """Whether a <match> of shared-mime-info and one of those inside of it hold."""
    kind, at = rule.get("type"), int(rule.get("offset"))
    size = int(kind[-2:]) // 8
    mask = int(rule.get("mask", "0xffffffff"), 16)
    there = data[at:at + size]
    holds = len(there) == size and (int.from_bytes(there, kind[:-2]) & mask) == int(rule.get("value"), 0)
    inner = rule.findall("{*}match")
    return holds and (not inner or any(matches(one, data) for one in inner))


def other_files(count):
    """Files of the system, a share of each folder."""
    found = []
    for top in ("/usr", "/etc", "/var/lib", "/boot"):
        for folder, _, names in os.walk(top):
            found += [os.path.join(folder, name) for name in sorted(names)]
    random.Random(1).shuffle(found)
    regular = (path for path in found if os.path.isfile(path) and not os.path.islink(path) and os.access(path, os.R_OK)
               and "\n" not in path and not path.endswith(".tav"))
    return [path for path, _ in zip(regular, range(count))]


class Streams(Folder):
    def streams(self):
        """What has to be recognised, each with a name."""
        for vector in sorted(GOLDEN.glob("*.hex")):
            yield vector.name, golden_bytes(vector)
        for form in FORMS:
            result = tav("snapshot", "-o", "-", *form)
            if result.status == 0:  # pairs need 64-bit headers
                yield " ".join(form), result.raw


@unittest.skipIf(WINDOWS or EMULATOR or shutil.which("file") is None, "there is no file(1)")
class File(Streams):
    def file(self, *arguments):
        done = subprocess.run(["file", "-b", "-m", f"{MAGIC}:{SYSTEM}", *map(str, arguments)], capture_output=True, check=True)
        return done.stdout.decode()

    def test_every_stream_is_recognised(self):
        path = self.folder / "x"
        seen = set()
        for name, data in self.streams():
            path.write_bytes(data)
            with self.subTest(name=name):
                said = self.file(path)
                form = tav("info", path).out
                order = "big" if "big-endian" in form else "little"
                bits = "32" if "root header       32-bit" in form else "64"
                self.assertEqual(said, f"tav stream, {order}-endian, {bits}-bit root header\n")
                self.assertEqual(self.file("--mime-type", path), "application/x-tav\n")
                seen.add((order, bits))
        self.assertEqual(len(seen), 4)

    def test_a_root_that_was_never_closed_is_recognised(self):
        for order in "<>":
            for size in (0, 2**64 - 1):
                path = self.folder / "x"
                path.write_bytes(struct.pack(order + "QIHH", size, 0, 2, 60100) + struct.pack(order + "QIHHQ", 8, 0, 57, 60111, 1))
                self.assertTrue(self.file(path).startswith("tav stream, "))

    def test_no_other_file_is_taken_for_a_stream(self):
        others = other_files(OTHERS)
        self.assertGreater(len(others), 500)
        names = self.folder / "names"
        names.write_bytes(b"\n".join(map(os.fsencode, others)) + b"\n")
        done = subprocess.run(["file", "-m", str(MAGIC), "-f", str(names)], capture_output=True, check=True)
        lines = done.stdout.splitlines()
        self.assertEqual(len(lines), len(others))
        self.assertEqual([line for line in lines if b"tav stream" in line], [])

    def test_bytes_that_are_nothing_are_no_stream(self):
        path = self.folder / "x"
        for data in (bytes(4096), b"\xff" * 4096, bytes(range(256)) * 16, b"\1\0" * 2048, b"\1\0\0\0" * 1024, b"\2\0\0\0\0\0\0\0" * 512):
            path.write_bytes(data)
            self.assertNotIn("tav stream", self.file(path))


class MimeType(Streams):
    def setUp(self):
        super().setUp()
        self.rules = ElementTree.parse(MIME).getroot().findall(".//{*}magic/{*}match")

    def recognised(self, data):
        return any(matches(rule, data) for rule in self.rules)

    def test_every_stream_is_recognised(self):
        for name, data in self.streams():
            with self.subTest(name=name):
                self.assertTrue(self.recognised(data))

    @unittest.skipIf(WINDOWS, "there are other files")
    def test_no_other_file_is_taken_for_a_stream(self):
        read = 0
        for path in other_files(OTHERS):
            with contextlib.suppress(OSError), open(path, "rb") as file:  # it may have gone meanwhile
                self.assertFalse(self.recognised(file.read(64)), path)
                read += 1
        self.assertGreater(read, 500)

    @unittest.skipIf(WINDOWS or EMULATOR or shutil.which("update-mime-database") is None, "shared-mime-info is not installed")
    def test_the_database_takes_it(self):
        packages = self.folder / "mime" / "packages"
        packages.mkdir(parents=True)
        shutil.copy(MIME, packages / "tav.xml")
        done = subprocess.run(["update-mime-database", str(packages.parent)], capture_output=True)
        self.assertEqual(done.returncode, 0, done.stderr)
        self.assertIn("application/x-tav:*.tav", (packages.parent / "globs").read_text())


if __name__ == "__main__":
    unittest.main()
