"""tav json, and that tav build gives the bytes back."""
import json
import os
import pathlib
import random
import shutil
import subprocess
import unittest

import encode
from support import *

# Streams of the identity test; any number on demand, as 100000.
STREAMS = int(os.environ.get("TAV_IDENTITY_STREAMS", "300" if SANITIZED else "2000"))
GOLDEN = pathlib.Path(__file__).resolve().parents[2] / "golden"


def golden_bytes(path):
    """The bytes of a golden vector: hexadecimal rows, with notes behind #."""
    rows = [line.split("#")[0] for line in path.read_text().splitlines()]
    return bytes.fromhex("".join("".join(row.split()) for row in rows))


class Folder(ToolTest):
    def file(self, data, name="x.tav"):
        path = self.folder / name
        path.write_bytes(data)
        return path

    def json_of(self, data, *options):
        return tav("json", self.file(data), *options)

    def comes_back(self, data, *options):
        """Whether the bytes come back; the document itself, for more checks."""
        document = self.json_of(data, *options)
        built = tav("build", stdin=document.raw)
        self.assertEqual(built.err, "")
        self.assertEqual(built.status, 0)
        self.assertEqual(built.raw, data)
        return document


class Identity(Folder):
    def test_random_streams_of_every_form_and_with_every_kind_of_damage_come_back(self):
        for seed in range(STREAMS):
            forms = encode.Form.all()
            data = encode.RandomStream(seed, forms[seed % len(forms)], wild=seed % 3 == 0).bytes()
            kind = None
            if seed % 2:
                kind = encode.DAMAGES[seed // 16 % len(encode.DAMAGES)]
                data = encode.damaged(data, kind, random.Random(seed))
            style = ((), ("--lines",), ("--compact",), ("--safe",))[seed // 8 % 4]
            with self.subTest(seed=seed, damage=kind, style=style):
                document = self.comes_back(data, *style)
                texts = document.raw.splitlines() if style == ("--lines",) else [document.raw]
                for text in texts:
                    json.loads(text)

    def test_streams_that_the_library_wrote_come_back(self):
        for number, options in enumerate([("--utf8",), ("--strings", "--pairs"), ("--pairs", "--open"), ("--mixed",),
                                          ("--unfinished", "--pairs"), ("--wild", "--pairs"), ("--zeros", 9000)]):
            for form in [(), ("--swap",), ("--align",), ("--swap", "--align"), ("--root32",), ("--root32", "--swap")]:
                path = self.folder / "g.tav"
                generate(path, "--seed", number, *options, *form)
                with self.subTest(options=options, form=form):
                    self.comes_back(path.read_bytes())

    def test_golden_vectors_come_back(self):
        vectors = sorted(GOLDEN.glob("*.hex"))
        self.assertGreater(len(vectors), 5)
        for path in vectors:
            with self.subTest(vector=path.name):
                self.comes_back(golden_bytes(path))

    def test_snapshots_of_every_form_come_back(self):
        for options in [(), ("--byte-order", "big"), ("--align",), ("--eye-size", "--align", "--byte-order", "big"),
                        ("--hdr32",), ("--hdr32", "--byte-order", "big")]:
            with self.subTest(options=options):
                self.comes_back(tav("snapshot", *options).raw)

    def test_bytes_that_are_no_stream_come_back(self):
        for data in (b"", b"\0", bytes(5000), random.Random(1).randbytes(3000), b"no stream at all\n"):
            with self.subTest(data=data[:16]):
                self.comes_back(data)

    def test_what_is_longer_than_one_piece_comes_back(self):
        writer = encode.Writer(encode.Form(big=True))
        writer.open(60100)
        writer.data(60103, encode.UTF8, b"\x04\xb8" + "\u00e4\u20ac\U0001f600x".encode() * 200000)
        writer.data(60103, encode.ASCII, b"text" * 500000 + b"\xff")
        writer.data(60103, encode.ARRAY, random.Random(1).randbytes(2400000))
        writer.data(60103, encode.BINARY, bytes(3000001) + b"x" + bytes(5000) + b"\x01" * 2000000)
        writer.close()
        self.comes_back(bytes(writer.bytes))

    def test_a_hundred_thousand_levels_come_back(self):
        writer = encode.Writer(encode.Form())
        for _ in range(100000):
            writer.open(60102)
        while writer.groups:
            writer.close()
        for style in ((), ("--lines",)):
            with self.subTest(style=style):
                self.comes_back(bytes(writer.bytes), *style)


class Document(Folder):
    def stream(self, form=None, fill=None):
        writer = encode.Writer(form or encode.Form())
        writer.open(60100)
        fill(writer)
        writer.close()
        return bytes(writer.bytes)

    def only_child(self, kind, payload, *options, form=None):
        text = self.json_of(self.stream(form, lambda w: w.data(60103, kind, payload)), *options).raw
        return json.loads(text)["nodes"][0]["children"][0]

    def test_tells_the_form(self):
        for form in encode.Form.all():
            data = self.stream(form, lambda w: w.data(60103, encode.ASCII, b"some text"))
            with self.subTest(form=form):
                order = {"byteOrder": "big" if form.big else "little", "root": 64 if form.wide else 32,
                         "aligned": form.align}
                options = ("--align",) if form.align else ("--no-align",)
                self.assertEqual(json.loads(self.json_of(data, *options).raw)["form"], order)

    def test_values_are_written_in_their_natural_form(self):
        for kind, payload, value in [
                (encode.UINT32, encode.words(7, size=4), 7), (encode.UINT64, b"\xff" * 8, 2 ** 64 - 1), (52, b"\xff", -1),
                (encode.ASCII, b"a\0\"\n\x1b", "a\0\"\n\x1b"), (encode.UTF8, encode.words(1208, size=2) + b"\xc3\xa4", "\u00e4"),
                (103, b"\xff" * 16, str(2 ** 128 - 1)), (104, b"\xff" * 16, "-1"), (105, b"\x2a", 42),
                (encode.ARRAY, encode.words(1, 2), [1, 2]),
                (encode.STAMP, encode.words(1709202600) + bytes(8), "2024-02-29T10:30:00.000000+00:00")]:
            with self.subTest(kind=kind):
                self.assertEqual(self.only_child(kind, payload)["value"], value)

    def test_values_that_would_not_come_back_are_written_as_bytes(self):
        for kind, payload in [(encode.ASCII, b"\xff"), (encode.UINT32, b"\1\2\3"), (encode.BINARY, b"\0\1"),
                              (12345, b"ab"), (encode.UTF8, b"x"), (encode.STAMP, b"short")]:
            with self.subTest(kind=kind):
                node = self.only_child(kind, payload)
                self.assertEqual(node["bytes"], payload.hex())
                self.assertNotIn("value", node)

    def test_a_date_that_the_calendar_does_not_hold_is_four_numbers(self):
        node = self.only_child(encode.STAMP, encode.words(2 ** 63) + encode.words(1, 2, 3, 0xFFFF, size=2))
        self.assertEqual(node["value"], {"seconds": 2 ** 63, "fractionA": 1, "fractionB": 2, "further": 3,
                                         "offsetMinutes": -1})

    def test_safe_writes_large_numbers_as_texts(self):
        self.assertEqual(self.only_child(encode.UINT64, encode.words(2 ** 53 + 1), "--safe")["value"],
                         str(2 ** 53 + 1))
        self.assertEqual(self.only_child(encode.UINT64, encode.words(2 ** 53), "--safe")["value"], 2 ** 53)

    def test_damaged_bytes_have_a_reason_and_the_status_is_1(self):
        data = bytearray(self.stream(None, lambda w: [w.data(60103, encode.ASCII, b"x" * 8) for _ in range(4)]))
        data[64:80] = b"\xee" * 16
        result = self.json_of(bytes(data))
        self.assertEqual(result.status, 1)
        damaged = [n for n in json.loads(result.raw)["nodes"][0]["children"] if "damaged" in n]
        self.assertEqual(len(damaged), 1)
        self.assertTrue(damaged[0]["damaged"].startswith("ee" * 16))
        self.assertIn("would end", damaged[0]["reason"])

    def test_an_unknown_element_keeps_its_id(self):
        data = self.stream(None, lambda w: w.data(64999, encode.ASCII, b"x"))
        node = json.loads(self.json_of(data).raw)["nodes"][0]["children"][0]
        self.assertEqual((node["element"], node["id"]), ("#64999", 64999))

    def test_lines_are_one_object_a_node_with_a_path_that_get_understands(self):
        path = self.file(self.stream(None, lambda w: [w.data(elm, encode.UINT32, bytes([n, 0, 0, 0])) for n, elm in
                                                      enumerate([60103, 60103, 64999, 60111, 60103, 64999])]))
        rows = [json.loads(line) for line in tav("json", path, "--lines").raw.splitlines()][1:]
        numbers = [row for row in rows if "value" in row]
        self.assertEqual(len(numbers), 6)
        for row in numbers:
            self.assertEqual(tav("get", path, row["path"]).out, "%d\n" % row["value"])

    @unittest.skipUnless(shutil.which("jq"), "jq is not installed")
    def test_jq_reads_every_style(self):
        for seed in range(20):
            data = encode.RandomStream(seed, wild=True).bytes()
            for style in ((), ("--compact",), ("--lines",)):
                done = subprocess.run(["jq", "-c", "."], input=self.json_of(data, *style).raw, capture_output=True)
                with self.subTest(seed=seed, style=style):
                    self.assertEqual(done.stderr, b"")
                    self.assertEqual(done.returncode, 0)

    def test_memory_is_bounded_whatever_the_file_is_large(self):
        writer = encode.Writer(encode.Form())
        writer.open(60100)
        writer.data(60103, encode.BINARY, bytes(range(256)) * 400000)
        writer.close()
        path = self.file(bytes(writer.bytes))
        out = self.folder / "x.json"
        self.assertEqual(tav_in_little_memory("json", path, "-o", out, "--ring", "1M").status, 0)
        self.assertEqual(tav_in_little_memory("build", out, "-o", self.folder / "y.tav").status, 0)
        self.assertEqual((self.folder / "y.tav").read_bytes(), path.read_bytes())

    def test_two_styles_at_once_are_refused(self):
        result = tav("json", self.file(b""), "--lines", "--compact")
        self.assertEqual(result.status, 2)
        self.assertIn("exclude each other", result.err)


if __name__ == "__main__":
    unittest.main()
