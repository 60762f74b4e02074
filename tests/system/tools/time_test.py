"""Timestamps mean seconds plus milliseconds (fraction A) plus microseconds (fraction B), whichever face shows them."""
import datetime
import json
import os
import random
import struct
import subprocess
import unittest
import xml.etree.ElementTree as ElementTree

from support import BIG_ENDIAN, EMULATOR, PATIENCE, ToolTest, tav

STAMPS = [*EMULATOR, os.environ.get("TAV_STAMPS", "")]
TIMESTAMP = 1005
EPOCH = datetime.datetime(1970, 1, 1)


def iso(microseconds):
    return (EPOCH + datetime.timedelta(microseconds=microseconds)).isoformat(timespec="microseconds") + "+00:00"


def stream(order, stamps):
    """A root of timestamps: seconds, fractions A and B, further field, minutes east."""
    nodes = b"".join(struct.pack(order + "QIHH", 16, 0, 100, TIMESTAMP) + struct.pack(order + "QHHHh", *stamp)
                     for stamp in stamps)
    return struct.pack(order + "QIHH", len(nodes), 0, 2, 60100) + nodes


class Time(ToolTest):
    def write(self, order, *stamps):
        path = self.folder / "t.tav"
        path.write_bytes(stream(order, stamps))
        return path

    def shown(self, path):
        """What each command that shows values says of all timestamps of a file."""
        get = tav("get", path, "--all", "/system/timestamp")
        as_json = json.loads(tav("json", path).out)["nodes"][0]["children"]
        lines = [json.loads(line) for line in tav("json", "--lines", path).out.splitlines()]
        rows = [json.loads(line) for line in tav("get", path, "--all", "--json", "/system/timestamp").out.splitlines()]
        root = ElementTree.fromstring(tav("xml", path).raw)
        tree = [line.split("  ")[-1] for line in tav("tree", path, "--width", 0, "--only", "timestamp").out.splitlines()]
        dump = [line.split("payload: ")[1] for line in tav("hex", path).out.splitlines() if "payload: " in line and ":" in
                line.split("payload: ")[1]]
        return {"get": get.out.splitlines(), "get --json": [row["value"] for row in rows],
                "json": [node["value"] for node in as_json if node["id"] == TIMESTAMP], "json --lines": [line["value"] for line in lines if line.get("id") == TIMESTAMP],
                "xml": [node.text for node in root.iter("timestamp")], "tree": tree, "hex": dump}

    def comes_back(self, path):
        for options in ((), ("--lines",), ("--compact",), ("--safe",)):
            built = tav("build", stdin=tav("json", path, *options).raw)
            self.assertEqual((built.status, built.raw), (0, path.read_bytes()))

    def test_what_the_layer_writes_is_shown_as_it_was(self):
        rng = random.Random(28)
        moments = [0, 1, 999, 1000, 123456, 999999, 1000000, 1709202600123456, 253402300799999999]
        moments += [rng.randrange(253402300800000000) for _ in range(100)]
        path = self.folder / "t.tav"
        subprocess.run([*STAMPS, str(path), *map(str, moments)], check=True, timeout=PATIENCE)
        for command, values in self.shown(path).items():
            with self.subTest(command=command):
                self.assertEqual(values, [iso(moment) for moment in moments])
        self.comes_back(path)

    def test_fractions_of_more_than_their_unit_move_the_moment_on(self):
        for a, b, text in ((0, 1000, "1970-01-01T00:00:00.001000+00:00"), (1000, 0, "1970-01-01T00:00:01.000000+00:00"),
                           (999, 1000, "1970-01-01T00:00:01.000000+00:00"), (0, 65535, "1970-01-01T00:00:00.065535+00:00"),
                           (65535, 65535, "1970-01-01T00:01:05.600535+00:00")):
            for order in "<>":
                path = self.write(order, (0, a, b, 0, 0))
                with self.subTest(a=a, b=b, order=order):
                    self.assertEqual(tav("get", path, "/system/timestamp").out, text + "\n")
                    node = ElementTree.fromstring(tav("xml", path).raw).find("system/timestamp")
                    self.assertEqual((node.text, node.get("fractionA"), node.get("fractionB")), (text, str(a), str(b)))
        path = self.write("<", (253402300799, 1000, 0, 0, 0))
        self.assertEqual(tav("get", path, "/system/timestamp").out, "253402300799 s\n")

    def test_the_zone_moves_the_text_and_not_the_moment(self):
        path = self.write("<", (0, 123, 456, 0, 90), (0, 123, 456, 0, -90))
        for command, values in self.shown(path).items():
            with self.subTest(command=command):
                self.assertEqual(values, ["1970-01-01T01:30:00.123456+01:30", "1969-12-31T22:30:00.123456-01:30"])
        self.comes_back(path)

    def test_json_gives_the_bytes_of_every_field_back(self):
        edges = (0, 1, 455, 456, 999, 1000, 1001, 32767, 65535)
        stamps = [(1709202600, a, b, 0, zone) for a in edges for b in edges for zone in (0, 60, -90)]
        stamps += [(seconds, a, b, further, zone) for seconds in (0, 59, 253402300799, 2**64 - 1) for a in (0, 999, 1000)
                   for b in (0, 999, 1000) for further in (0, 1) for zone in (0, -32768, 32767)]
        for order in "<>":
            self.comes_back(self.write(order, *stamps))

    def test_a_text_is_a_value_only_where_it_tells_all(self):
        for a, b in ((0, 0), (999, 999), (123, 456)):
            value = json.loads(tav("json", self.write("<", (5, a, b, 0, 0))).out)["nodes"][0]["children"][0]["value"]
            self.assertEqual(value, f"1970-01-01T00:00:05.{a:03}{b:03}+00:00")
        for a, b in ((0, 1000), (1000, 0)):
            value = json.loads(tav("json", self.write("<", (5, a, b, 0, 0))).out)["nodes"][0]["children"][0]["value"]
            self.assertEqual(value, {"seconds": 5, "fractionA": a, "fractionB": b, "further": 0, "offsetMinutes": 0})

    def test_a_text_is_written_as_the_layer_writes_it(self):
        moments = {"1970-01-01T00:00:00.5Z": (0, 500, 0, 0, 0), "1970-01-01T00:00:07.999999Z": (7, 999, 999, 0, 0),
                   "1970-01-01T01:00:00.065536+01:00": (0, 65, 536, 0, 60)}
        for text, stamp in moments.items():
            document = {"system": {f"#{TIMESTAMP}": {"$type": "UTC Timestamp", "$value": text}}}
            built = tav("build", stdin=json.dumps(document).encode())
            self.assertEqual((built.status, built.err), (0, ""))
            self.assertEqual(built.raw, stream(">" if BIG_ENDIAN else "<", [stamp]))

    def test_the_plain_operation_prints_as_ever(self):
        path = self.write("<", (0, 123, 456, 0, 0))
        self.assertIn(".000456", tav("print", path).out)

    def test_diff_shows_the_same_texts(self):
        first = self.write("<", (0, 123, 456, 0, 0))
        second = self.folder / "u.tav"
        second.write_bytes(stream("<", [(0, 0, 456, 0, 0)]))
        self.assertIn("1970-01-01T00:00:00.123456+00:00 -> 1970-01-01T00:00:00.000456+00:00", tav("diff", first, second).out)


if __name__ == "__main__":
    unittest.main()
