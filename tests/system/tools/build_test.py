"""tav build on documents written by hand, on conversions and on errors."""
import json
import os
import pathlib
import random
import re
import unittest

import encode
from json_test import Folder
from support import *


def build(document, *options):
    text = document if isinstance(document, str) else json.dumps(document)
    return tav("build", *options, stdin=text.encode())


def made(form, fill, eye=False):
    writer = encode.Writer(form)
    fill(writer, eye)
    return bytes(writer.bytes)


def ada(writer, eye=False):
    writer.open(60100, eye=eye)
    writer.open(60102, eye=eye)
    writer.data(60103, encode.ASCII, b"ada", eye)
    writer.data(60111, encode.UINT32, writer.pack("I", 8), eye)
    writer.close()
    writer.close()


SHORT = {"system": {"host": {"hostName": "ada", "cpuOnline": 8}}}


class ByHand(Folder):
    def test_names_with_values_suffice(self):
        self.assertEqual(build(SHORT).raw, made(encode.Form(), ada))

    def test_a_list_of_nodes_with_defaults_is_the_same(self):
        nodes = [{"element": "system", "children": [{"id": 60102, "children": [
            {"element": "hostName", "value": "ada"}, {"element": "cpuOnline", "type": "uint32", "value": "8"}]}]}]
        self.assertEqual(build(nodes).raw, made(encode.Form(), ada))
        self.assertEqual(build({"tav": 1, "nodes": nodes}).raw, made(encode.Form(), ada))

    def test_the_documents_on_the_page_about_json_are_streams(self):
        page = (pathlib.Path(__file__).resolve().parents[3] / "docs" / "json.md").read_text()
        blocks = re.findall(r"```json\n(.*?)```", page, re.S)
        self.assertEqual(len(blocks), 2)
        self.assertEqual(build(blocks[0]).raw, made(encode.Form(), ada))
        data = build(blocks[1]).raw
        self.assertEqual(tav("json", self.file(data)).raw.decode(), blocks[1])

    def test_the_form_of_the_document_is_taken(self):
        for form in encode.Form.all():
            document = {"form": {"byteOrder": "big" if form.big else "little", "root": 64 if form.wide else 32,
                                 "aligned": form.align}, "nodes": SHORT}
            with self.subTest(form=form):
                self.assertEqual(build(document).raw, made(form, ada))

    def test_eyeSize_makes_pairs_and_end_elements(self):
        name = {"$eyeSize": True, "$value": "ada"}
        document = {"system": {"$eyeSize": True, "host": {"$eyeSize": True, "hostName": name,
                                                          "cpuOnline": {"$value": 8, "$eyeSize": True}}}}
        self.assertEqual(build(document).raw, made(encode.Form(), ada, eye=True))

    def test_an_array_is_several_elements(self):
        tree = tav("get", self.file(build({"system": {"hostName": ["a", "b", {"$value": "c"}]}}).raw), "--all",
                   "/system/hostName")
        self.assertEqual(tree.out, "a\nb\nc\n")

    def test_types_are_chosen_from_the_values(self):
        for value, kind in [("a", 50), ("\u00e4", 102), (0, 55), (2 ** 32 - 1, 55), (2 ** 32, 57), (-1, 56),
                            (-2 ** 31 - 1, 58), (2 ** 64, 103), (-2 ** 63 - 1, 104), (True, 51)]:
            data = build({"system": {"hostName": value}}).raw
            with self.subTest(value=value):
                self.assertEqual(int.from_bytes(data[28:30], encode.HOST), kind)

    def test_the_order_of_keys_does_not_matter_where_it_need_not(self):
        document = {"nodes": [{"children": [{"value": "ada", "type": "ASCII String", "element": "hostName"}],
                               "eyeSize": True, "element": "system", "size": "unknown"}]}
        writer = encode.Writer(encode.Form())
        writer.open(60100, eye=True, size=-1)
        writer.data(60103, encode.ASCII, b"ada")
        writer.close(keep_size=True)
        self.assertEqual(build(document).raw, bytes(writer.bytes))

    def test_lines_without_sizes_get_new_ones(self):
        path = self.file(made(encode.Form(), ada))
        rows = [json.loads(line) for line in tav("json", path, "--lines").raw.splitlines()]
        for row in rows:
            row.pop("size", None)
            if row.get("element") == "hostName":
                row["value"] = "grace"
        data = build("\n".join(map(json.dumps, rows))).raw
        self.assertEqual(tav("get", self.file(data), "/system/host/hostName", "/system/host/cpuOnline").out, "grace\n8\n")


class Conversion(Folder):
    def test_every_form_is_converted_to_every_other(self):
        for source in encode.Form.all():
            for eye in (False, source.wide):
                document = tav("json", self.file(made(source, ada, eye)), "--align" if source.align else "--no-align").raw
                for to in encode.Form.all():
                    options = ["--byte-order", "big" if to.big else "little", "--root", 64 if to.wide else 32,
                               "--align" if to.align else "--no-align"]
                    with self.subTest(source=source, to=to, eye=eye):
                        self.assertEqual(tav("build", *options, stdin=document).raw, made(to, ada, eye and to.wide))

    def test_eye_size_puts_pairs_everywhere(self):
        document = tav("json", self.file(made(encode.Form(), ada))).raw
        self.assertEqual(tav("build", "--eye-size", stdin=document).raw, made(encode.Form(), ada, eye=True))

    def test_there_and_back_gives_the_same_bytes(self):
        for seed in range(60):
            form = encode.Form(big=seed % 2 == 1)
            writer = encode.RandomStream(seed, form).bytes()
            plain = tav("build", "--byte-order", "little", stdin=tav("json", self.file(writer)).raw).raw
            there = tav("build", "--byte-order", "big", stdin=tav("json", self.file(plain)).raw).raw
            back = tav("build", "--byte-order", "little", stdin=tav("json", self.file(there), "--byte-order", "big").raw)
            with self.subTest(seed=seed):
                self.assertEqual(back.raw, plain)

    def test_what_is_no_node_is_left_out_and_counted(self):
        data = bytearray(made(encode.Form(), lambda w, _: [w.open(60100)] + [
            w.data(60103, encode.ASCII, b"y" * 8) for _ in range(4)] + [w.close()]))
        data[64:80] = b"\xee" * 16
        document = tav("json", self.file(bytes(data))).raw
        result = tav("build", "--byte-order", "big", stdin=document)
        self.assertEqual(result.status, 1)
        self.assertIn("1 damaged place", result.err)
        self.assertEqual(tav("json", self.file(result.raw)).status, 0)

    def test_pairs_without_64_bit_headers_are_refused(self):
        result = build(SHORT, "--root", "32", "--eye-size")
        self.assertEqual(result.status, 2)
        self.assertIn("64-bit", result.err)


class Errors(Folder):
    def test_an_error_tells_line_byte_and_pointer_and_leaves_no_file(self):
        for document, place, what in [
                ('{"system":\n {"hostNam": 1}}', "line 2, byte 22: /system/hostNam", "did you mean hostName?"),
                ('{"system": {"hostName": 1.5}}', "/system/hostName", "whole numbers"),
                ('{"system": {"hostName": null}}', "/system/hostName", "null"),
                ('{"system": {"hostName": {"$type": "Uint8", "$value": 300}}}', "/system/hostName", "from 0 to 255"),
                ('{"system": {"hostName": {"$type": "Float", "$value": 3}}}', "/system/hostName/$type", "no type"),
                ('{"system": [1, 2', "line 1", "no JSON"),
                ('{"system": "\xff"}', "line 1", "no JSON"),
                ("", "line 1", "empty"),
                ('[{"element": "host", "valu": 3}]', "/0/valu", "not known"),
                ('[{"value": 3}]', "/0", "no element"),
                ('[{"element": "host", "id": 3, "value": 3}]', "/0/id", "do not agree"),
                ('[{"element": "host", "bytes": "0"}]', "/0/bytes", "hexadecimal"),
                ('[{"element": "host", "value": 1, "bytes": "00"}]', "/0/bytes", "already"),
                ('[{"element": "host", "header": 32, "eyeSize": true, "children": []}]', "/0", "eye/size"),
                ('[{"element": "host", "children": [{"element": "os", "header": 32, "value": 1}]}]', "/0/children/0", "64"),
                ('{"system": {}} {}', "line 1", "behind the document"),
                ('{"tav": 2}', "/tav", "version"), ("[1]", "/0", "object"), ("7", "line 1", "object or an array")]:
            raw = document.encode("latin-1") if "\xff" in document else document.encode()
            result = tav("build", "-o", self.folder / "e.tav", stdin=raw)
            with self.subTest(document=document):
                self.assertEqual(result.status, 2)
                self.assertIn(place, result.err)
                self.assertIn(what, result.err)
                self.assertEqual(list(self.folder.glob("e.tav*")), [])

    def test_an_existing_file_is_replaced_only_by_force(self):
        path = self.file(b"mine")
        self.assertEqual(build(SHORT, "-o", path).status, 2)
        self.assertEqual(path.read_bytes(), b"mine")
        self.assertEqual(build(SHORT, "-o", path, "--force").status, 0)
        self.assertEqual(path.read_bytes(), made(encode.Form(), ada))

    @unittest.skipUnless(os.path.exists("/dev/full"), "there is no /dev/full")
    def test_a_full_disk_is_told(self):
        result = build(SHORT, "-o", "/dev/full")
        self.assertEqual(result.status, 2)
        self.assertIn("space", result.err)

    def test_a_missing_file_is_told(self):
        result = tav("build", self.folder / "none.json")
        self.assertEqual(result.status, 2)
        self.assertIn("none.json", result.err)

    def test_noise_never_crashes_it(self):
        draw = random.Random(3)
        document = tav("json", self.file(encode.RandomStream(5).bytes())).raw
        for _ in range(150):
            text = bytearray(document)
            for _ in range(draw.randrange(1, 4)):
                text[draw.randrange(len(text))] = draw.choice(b'{}[]",:0-9atn \xff')
            self.assertIn(tav("build", stdin=bytes(text)).status, (0, 2))

    def test_a_hundred_thousand_brackets_are_refused_or_read(self):
        self.assertEqual(build("[" * 100000).status, 2)
        self.assertEqual(build('{"host":' * 100000 + "{}" + "}" * 100000).status, 0)


if __name__ == "__main__":
    unittest.main()
