"""The C++ layer, the program and an XPath engine find the same nodes; what the layer prints is XML; a file that a
killed writer overwrites is whole."""
import itertools
import json
import os
import pathlib
import shutil
import subprocess
import sys
import tempfile
import time
import unittest
import xml.etree.ElementTree

sys.path.insert(0, str(pathlib.Path(__file__).resolve().parent.parent / "tools"))
from support import PATIENCE, running, tav, until  # noqa: E402  (behind the path that leads to it)

FACE = os.environ["TAV_LAYER_FACE"]
SEEDS = range(1, 9)
NAMES = {"*": "*", "host": "host", "os": "os", "#40001": "element[@id='40001']"}  # as the XML has them
PLACES = ("", "[1]", "[2]")


def layer(*arguments, stdin=None):
    done = subprocess.run([FACE, *map(str, arguments)], input=stdin, capture_output=True, timeout=PATIENCE)
    if done.returncode != 0:
        raise AssertionError(done.stderr.decode())
    return done.stdout


def paths():
    """Every path of one to three steps below the root, with the XPath that means the same."""
    steps = [(name + place, xpath + place) for name, xpath in NAMES.items() for place in PLACES]
    for count in (1, 2):
        for chosen in itertools.product(steps, repeat=count):
            yield "/system/" + "/".join(s[0] for s in chosen), "/tav/system/" + "/".join(s[1] for s in chosen)
    for first, second, third in itertools.product(steps[:6], repeat=3):
        yield ("/system/" + "/".join((first[0], second[0], third[0])),
               "/tav/system/" + "/".join((first[1], second[1], third[1])))


class Faces(unittest.TestCase):
    def setUp(self):
        folder = tempfile.TemporaryDirectory(prefix="tav-faces-")
        self.addCleanup(folder.cleanup)
        self.folder = pathlib.Path(folder.name)
        self.file = self.folder / "x.tav"

    def found_by_the_program(self, path):
        result = tav("get", self.file, "--all", "--json", path)
        return [json.loads(line)["offset"] for line in result.out.splitlines()]

    def test_the_second_of_any_kind_is_one_node(self):
        layer("tree", self.file, 2)
        for path in ("/system/*[2]", "/*[1]/*[2]", "system/*[1]"):
            with self.subTest(path):
                self.assertEqual(len(self.found_by_the_program(path)), 1)
                self.assertEqual(len(layer("find", self.file, stdin=path.encode() + b"\n").split()), 1)

    def test_layer_and_program_find_the_same(self):
        every = [path for path, _ in paths()]
        met = 0
        for seed in SEEDS:
            self.file.unlink(missing_ok=True)
            layer("tree", self.file, seed)
            lines = layer("find", self.file, stdin="\n".join(every).encode()).decode().splitlines()
            asked = [i for i in range(len(every)) if i % len(SEEDS) == seed % len(SEEDS) or len(every[i]) < 16]
            for i in asked[::2]:
                found = [int(offset) for offset in lines[i].split()]
                self.assertEqual(self.found_by_the_program(every[i]), found, f"seed {seed}, {every[i]}")
                met += bool(found)
        self.assertGreater(met, 50)

    @unittest.skipIf(shutil.which("xmllint") is None, "no xmllint")
    def test_an_xpath_engine_finds_as_many_with_the_same_values(self):
        every = list(paths())
        met = 0
        for seed in SEEDS:
            self.file.unlink(missing_ok=True)
            layer("tree", self.file, seed)
            made = self.folder / "x.xml"
            made.write_bytes(tav("xml", self.file).raw)
            lines = layer("find", self.file, stdin="\n".join(path for path, _ in every).encode()).decode().splitlines()
            chosen = range(seed % 4, len(every), 4)
            # One call counts all; an element that only ends a group is none of the tree.
            ended = "[not(self::endHdrEyeSize)]"
            expression = "concat(" + ",' ',".join(f"count({every[i][1]})" for i in chosen) + ")"
            counts = subprocess.run(["xmllint", "--xpath", expression.replace("*", "*" + ended), str(made)],
                                    capture_output=True, check=True, text=True, timeout=PATIENCE).stdout.split()
            for i, count in zip(chosen, counts):
                self.assertEqual(len(lines[i].split()), int(float(count)), f"seed {seed}, {every[i]}")
                met += count != "0"
        self.assertGreater(met, 100)

    def test_every_value_that_can_be_added_is_printed_as_xml(self):
        layer("values", self.file)
        root = xml.etree.ElementTree.fromstring(layer("print", self.file))
        self.assertEqual(root.tag, "system")
        texts = [child.text or "" for child in root]
        self.assertEqual(texts[:5], ["ada", "", "<&>\"'", "gr\u00fc\u00dfe", "]]>"])
        self.assertEqual(root[5].attrib, {"encoding": "hex"})
        self.assertEqual(texts[5], "1B5B33316D")
        self.assertEqual(texts[6], "\r\n\t")
        self.assertIn("\u20ac \U0001F600", texts)
        self.assertIn("2024-02-29T00:00:00.123456+00:00", texts)
        self.assertEqual(root.find("host").attrib["hostName"], "<\"two\">\n")
        self.assertEqual(root.find("element").attrib, {"id": "40001", "encoding": "hex"})

    @unittest.skipIf(sys.platform == "win32", "processes end otherwise there")
    def test_a_file_that_a_killed_writer_overwrites_is_whole(self):
        def state():
            found = self.file.stat()
            return found.st_ino, found.st_mtime_ns
        layer("tree", self.file, 1)
        for kill in range(30):
            before = state()
            with running([FACE, "overwrite", str(self.file)], stderr=subprocess.PIPE) as writer:
                if kill % 2 == 1:
                    self.assertTrue(until(lambda: state() != before or writer.poll() is not None))
                time.sleep(0.003 * kill)  # at another moment each time, whatever it is doing then
                writer.kill()
                writer.wait()
                self.assertEqual(writer.stderr.read(), b"")
            self.assertEqual(tav("check", self.file).status, 0, f"kill {kill}")
        values = set(tav("get", self.file, "--all", "/system/cpuOnline").out.split())
        self.assertEqual(len(values), 1, "one round's values, all of them")
        left = [path.name for path in self.folder.iterdir() if path != self.file]
        self.assertTrue(all(name.startswith(".tav-") for name in left), left)


if __name__ == "__main__":
    unittest.main()
