"""docs/tav.ksy, compiled to JavaScript: nodes and values are those that the program finds."""
import datetime
import json
import os
import pathlib
import subprocess
import sys
import tempfile
import unittest

ROOT = pathlib.Path(__file__).resolve().parents[3]
sys.path.insert(0, str(ROOT / "tests" / "system" / "tools"))
os.environ.setdefault("TAV_GENERATE", "")

import encode  # noqa: E402
from support import tav  # noqa: E402

CODES = {"group32": 1, "group64": 2, "ASCII String": 50, "Uint8": 51, "Sint8": 52, "Uint16": 53, "Sint16": 54, "Uint32": 55,
         "Sint32": 56, "Uint64": 57, "Sint64": 58, "UTC Timestamp": 100, "Binary": 101, "UTF8 String": 102, "Uint128": 103,
         "Sint128": 104, "Byte": 105, "Uint64 array": 106}
SIGNED = ("Sint8", "Sint16", "Sint32", "Sint64", "Sint128")
EXACT = 2**53  # whole numbers of JavaScript beyond it are rounded
SNAPSHOTS = [(*order, *more) for order in (("--byte-order", "little"), ("--byte-order", "big"))
             for more in ((), ("--align",), ("--root", "32"), ("--eye-size",), ("--eye-size", "--align"))]


def flattened(nodes, depth=0):
    for node in nodes:
        yield depth, node
        yield from flattened(node.get("children", ()), depth + 1)


def date_text(seconds, milliseconds, microseconds, further, offset):
    zone = datetime.timezone(datetime.timedelta(minutes=offset))
    moment = datetime.datetime.fromtimestamp(seconds, zone) + datetime.timedelta(milliseconds=milliseconds,
                                                                                 microseconds=microseconds)
    return moment.isoformat(timespec="microseconds")


class Kaitai(unittest.TestCase):
    def setUp(self):
        folder = tempfile.TemporaryDirectory(prefix="tav-test-")
        self.addCleanup(folder.cleanup)
        self.folder = pathlib.Path(folder.name)

    def read(self, files):
        """The nodes of each file by the compiled description."""
        requests = []
        for path in files:
            form = json.loads(tav("info", path, "--json").out)["form"]
            uncounted = any("extra" in line for line in self.lines(path))
            requests.append(json.dumps({"file": str(path), "big": form["byteOrder"] == "big", "wide": form["root"] == 64,
                                        "aligned": form["aligned"], "uncounted": uncounted}))
        done = subprocess.run(["node", ROOT / "tests" / "system" / "kaitai" / "read.js", ROOT / "docs" / "tav.ksy"],
                              input="\n".join(requests).encode(), capture_output=True, timeout=600)
        self.assertEqual((done.returncode, done.stderr), (0, b""))
        read = [json.loads(line) for line in done.stdout.splitlines()]
        self.assertEqual(len(read), len(files))
        return [(json.loads(request), nodes) for request, nodes in zip(requests, read)]

    def lines(self, path):
        result = tav("json", "--lines", path)
        self.assertEqual(result.status, 0, result.err)
        lines = [json.loads(line) for line in result.raw.split(b"\n")[1:-1]]
        return [line for line in lines if "zeros" not in line]

    def compare(self, files):
        compared = 0
        for path, (form, nodes) in zip(files, self.read(files)):
            expected, found = self.lines(path), list(flattened(nodes))
            with self.subTest(file=path.name):
                self.assertEqual(len(found), len(expected))
                for line, (depth, node) in zip(expected, found):
                    self.expect_node(line, depth, node, "big" if form["big"] else "little")
                    compared += 1
        return compared

    def expect_node(self, line, depth, node, order):
        self.assertEqual((node["id"], node["type"], node["header"], depth, node.get("extra")),
                         (line["id"], CODES[line["type"]], line["header"], line["depth"], line.get("extra")))
        if line["size"] != "unknown":
            self.assertEqual(node["size"], line["size"])
        if "info" in line:
            self.assertEqual(node["info"] & ~encode.EYE_SIZE, line["info"] & ~encode.EYE_SIZE)
        self.assertEqual(bool(node["info"] & encode.EYE_SIZE), line.get("eyeSize", False))
        if "children" not in node:
            self.expect_value(line, node, order)

    def expect_value(self, line, node, order):
        kind, raw = line["type"], bytes.fromhex(node["raw"])
        if "bytes" in line:
            self.assertEqual(node["raw"], line["bytes"])
        elif kind in ("ASCII String", "UTF8 String"):
            self.assertEqual(raw[2 if kind == "UTF8 String" else 0:], line["value"].encode())
            if kind == "UTF8 String" or line["value"].isascii():  # an ASCII string may hold more than the description says
                self.assertEqual(node["value"], line["value"])
            self.assertEqual(node.get("codePage", 1208), line.get("codePage", 1208))
        elif kind == "Uint64 array":
            self.assertEqual([int.from_bytes(raw[at:at + 8], order) for at in range(0, len(raw), 8)], line["value"])
            self.assertEqual([number for number in node["value"] if number < EXACT],
                             [number for number in line["value"] if number < EXACT])
        elif kind == "UTC Timestamp" and isinstance(line["value"], str):
            self.assertEqual(date_text(*node["date"]), line["value"])
        elif kind == "UTC Timestamp":
            fields = [line["value"].get(name, 0) for name in ("seconds", "fractionA", "fractionB", "further", "offsetMinutes")]
            self.assertEqual(node["date"][1:], fields[1:])
            self.assertEqual(int.from_bytes(raw[:8], order), fields[0])
        elif kind == "Binary":
            self.assertEqual(node["raw"], line["value"])
        else:
            value = int(line["value"])
            self.assertEqual(int.from_bytes(raw, order, signed=kind in SIGNED), value)
            if "value" in node and abs(value) < EXACT:
                self.assertEqual(node["value"], value)

    def test_the_golden_vectors(self):
        files = []
        for vector in sorted((ROOT / "tests" / "golden").glob("*.hex")):
            rows = [line.split("#")[0] for line in vector.read_text().splitlines()]
            files.append(self.folder / f"{vector.stem}.tav")
            files[-1].write_bytes(bytes.fromhex("".join("".join(row.split()) for row in rows)))
        self.assertGreaterEqual(len(files), 12)
        self.assertGreater(self.compare(files), len(files) * 2)

    def test_snapshots_in_every_form(self):
        files = []
        for number, form in enumerate(SNAPSHOTS):
            path = self.folder / f"{number}.tav"
            if tav("snapshot", "-o", path, *form).status == 0:
                files.append(path)
        self.assertGreaterEqual(self.compare(files), 16 * len(files))

    def test_random_streams(self):
        files = []
        for seed in range(150):
            path = self.folder / f"{seed}.tav"
            path.write_bytes(encode.RandomStream(seed).bytes().rstrip(b"\0") if seed % 10 == 9 else encode.RandomStream(seed).bytes())
            info = json.loads(tav("info", path, "--json").out)
            if not info["stream"] or info["ambiguous"] or tav("json", "--lines", path).status != 0:
                continue
            counted = info["counted"]
            if counted["openGroups"] or counted["extraStrings"] or counted["zerosAtEnd"] or counted["cutGroups"]:
                continue  # a walk has to guess there, which no description can
            files.append(path)
        self.assertGreater(len(files), 20)
        self.assertGreater(self.compare(files), 200)


if __name__ == "__main__":
    unittest.main()
