"""tav xml: well-formed whatever the stream holds, and the same content."""
import random
import shutil
import subprocess
import unittest
import xml.etree.ElementTree as ElementTree

import encode
from json_test import Folder
from support import *


class Xml(Folder):
    def tree_of(self, fill, form=None, status=0):
        writer = encode.Writer(form or encode.Form())
        writer.open(60100)
        fill(writer)
        writer.close()
        result = tav("xml", self.file(bytes(writer.bytes)))
        self.assertEqual(result.status, status, result.err)
        return ElementTree.fromstring(result.raw)

    def value_of(self, kind, payload):
        return self.tree_of(lambda w: w.data(60103, kind, payload)).find("system/hostName")

    def test_names_types_and_values(self):
        root = self.tree_of(lambda w: [w.open(60102), w.data(60103, encode.ASCII, b"ada"), w.close()])
        self.assertEqual(root.attrib, {"byteOrder": encode.HOST, "root": "64", "aligned": "false"})
        self.assertEqual(root.find("system").attrib, {"type": "group64", "header": "64"})
        self.assertEqual(root.find("system/host/hostName").text, "ada")
        self.assertEqual(root.find("system/host/hostName").get("type"), "ASCII String")

    def test_texts_come_back_as_they_are(self):
        for text in ("a<b>&\"c'", "]]>", "<!-- -->", "&amp;", "  blanks ", "line\nend\r\ttab", "\u00e4\u20ac\U0001f600", ""):
            with self.subTest(text=text):
                self.assertEqual(self.value_of(encode.ASCII, text.encode()).text or "", text)
                self.assertEqual(self.value_of(encode.UTF8, encode.words(1208, size=2) + text.encode()).text or "", text)

    def test_what_xml_cannot_hold_is_hexadecimal(self):
        for payload in (b"a\0b", b"\x1b[31m", b"\xff", b"\xed\xa0\x80", "\ufffe".encode(), "x\uffff".encode()):
            node = self.value_of(encode.ASCII, payload)
            with self.subTest(payload=payload):
                self.assertEqual((node.get("encoding"), node.text), ("hex", payload.hex()))

    def test_numbers(self):
        for kind, payload, text in [(encode.UINT32, encode.words(7, size=4), "7"), (52, b"\xff", "-1"), (104, b"\xff" * 16, "-1"),
                                    (encode.ARRAY, encode.words(1, 2), "1 2")]:
            with self.subTest(kind=kind):
                self.assertEqual(self.value_of(kind, payload).text, text)

    def test_dates_are_right_around_leap_years(self):
        for seconds, text in [(0, "1970-01-01T00:00:00"), (68169600, "1972-02-29T00:00:00"), (1703980800, "2023-12-31T00:00:00"),
                              (1709164800, "2024-02-29T00:00:00"), (1735603200, "2024-12-31T00:00:00"),
                              (4107542400, "2100-03-01T00:00:00")]:
            node = self.value_of(encode.STAMP, encode.words(seconds) + bytes(8))
            with self.subTest(seconds=seconds):
                self.assertEqual(node.text, text + ".000000+00:00")

    def test_a_date_that_its_text_does_not_tell_has_its_fields(self):
        node = self.value_of(encode.STAMP, encode.words(2 ** 63) + encode.words(1, 2, 3, 0xFFFF, size=2))
        self.assertEqual((node.get("seconds"), node.get("further"), node.get("offsetMinutes")), (str(2 ** 63), "3", "-1"))

    def test_an_unknown_element_is_told_by_its_id(self):
        node = self.tree_of(lambda w: w.data(64999, encode.ASCII, b"x")).find("system/element")
        self.assertEqual((node.get("id"), node.text), ("64999", "x"))

    def test_damaged_bytes_stand_with_their_reason(self):
        writer = encode.Writer(encode.Form())
        writer.open(60100)
        for _ in range(4):
            writer.data(60103, encode.ASCII, b"x" * 8)
        writer.close()
        writer.bytes[64:80] = b"\xee" * 16
        result = tav("xml", self.file(bytes(writer.bytes)))
        node = ElementTree.fromstring(result.raw).find("system/damaged")
        self.assertEqual(result.status, 1)
        self.assertEqual(node.get("offset"), "0x40")
        self.assertTrue(node.text.startswith("ee" * 16))
        self.assertIn("would end", node.get("reason"))

    def test_every_value_of_random_streams_is_the_one_that_json_tells(self):
        import json
        for seed in range(60):
            path = self.file(encode.RandomStream(seed, encode.Form(align=False)).bytes())
            rows = [json.loads(line) for line in tav("json", path, "--lines").raw.splitlines()][1:]
            rows = [row for row in rows if isinstance(row.get("value"), int) and row["type"] != "Byte"]
            nodes = [n for n in ElementTree.fromstring(tav("xml", path).raw).iter()
                     if (n.get("type") or "")[1:4] == "int" and n.get("encoding") is None and "128" not in n.get("type")
                     and "array" not in n.get("type")]
            with self.subTest(seed=seed):
                self.assertEqual([int(n.text) for n in nodes], [row["value"] for row in rows])

    @unittest.skipUnless(shutil.which("xmllint"), "xmllint is not installed")
    def test_xmllint_finds_it_well_formed(self):
        for seed in range(120):
            data = encode.RandomStream(seed, wild=seed % 2 == 0).bytes()
            if seed % 3 == 0:
                data = encode.damaged(data, encode.DAMAGES[seed // 3 % len(encode.DAMAGES)], random.Random(seed))
            result = tav("xml", self.file(data))
            if result.status == 3:
                self.assertEqual(result.out, "")
                continue
            done = subprocess.run(["xmllint", "--noout", "-"], input=result.raw, capture_output=True)
            with self.subTest(seed=seed):
                self.assertEqual((done.returncode, done.stderr), (0, b""))

    def test_what_is_no_stream_is_refused(self):
        for data in (b"", b"no stream at all, just some text\n"):
            self.assertEqual(tav("xml", self.file(data)).status, 3)


if __name__ == "__main__":
    unittest.main()
