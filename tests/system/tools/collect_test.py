"""tav extract and tav cat: subtrees and whole streams as one new stream."""
import json
import struct
import unittest

import encode
from damage_test import HOST, STREAM, group, host, number, overwritten, system
from json_test import GOLDEN, Folder, golden_bytes
from support import EMULATOR, SANITIZED, WINDOWS, tav, tav_in_little_memory

ADDED = encode.EYE_SIZE | encode.ALIGNED
SEEDS = 60 if SANITIZED or EMULATOR else 100


def options_of(form):
    return ("--byte-order", "big" if form.big else "little", "--root", "64" if form.wide else "32",
            "--align" if form.align else "--no-align")


def plain(node):
    """What of a node of `tav json` has to stay: not sizes, headers, paddings and pairs."""
    kind = node["type"]
    stays = {"id": node["id"], "type": "group" if kind in ("group32", "group64") else kind,
             "info": node.get("info", 0) & ~ADDED}
    for key in ("value", "bytes", "codePage"):
        if key in node:
            stays[key] = node[key]
    if kind == "UTF8 String" and isinstance(node.get("bytes"), str):
        stays["bytes"] = sorted((node["bytes"][:2], node["bytes"][2:4])), node["bytes"][4:]  # the code page has an order
    if "children" in node:
        stays["children"] = [plain(child) for child in node["children"] if child.get("id") != encode.END]
    return stays


def outermost(node, name):
    """The groups of a name that are inside no other one, of a node and below it."""
    if node.get("element") == name and "children" in node:
        return [node]
    return [found for child in node.get("children", ()) for found in outermost(child, name)]


class Collect(Folder):
    def roots(self, path, *options):
        result = tav("json", path, *options)
        self.assertEqual((result.status, result.err), (0, ""))
        return [node for node in json.loads(result.out)["nodes"] if "zeros" not in node]

    def expect_sound(self, path, *options):
        """`tav check` finds nothing, and of the notes only those of what a value is."""
        self.assertEqual((result := tav("check", path, *options)).status, 0, result.out + result.err)
        notes = json.loads(tav("check", path, "--notes", "--json", *options).out)["findings"]
        self.assertEqual({note["rule"] for note in notes} & {"align-flag", "padding-missing", "padding-dirty", "string-extra",
                                                             "zeros-between", "size-unknown"}, set())


class Cat(Collect):
    def test_the_nodes_and_values_stay_in_every_form(self):
        forms = encode.Form.all()
        for seed in range(SEEDS):
            sources, roots = [], []
            for i in range(1 + seed % 3):
                form = forms[(seed // 3 + 5 * i) % len(forms)]
                path = self.file(encode.RandomStream(seed * 3 + i, form, nodes=30).bytes(), f"{i}.tav")
                found = json.loads(tav("info", path, "--json").out)
                if found["ambiguous"] or found["form"] != {"byteOrder": "big" if form.big else "little",
                                                           "root": 64 if form.wide else 32, "aligned": form.align}:
                    continue  # nobody can know how that one is to be read
                sources.append(path)
                roots += [plain(root) for root in self.roots(path)]
            if not sources:
                continue
            target, out = forms[seed % len(forms)], self.folder / "out.tav"
            with self.subTest(seed=seed, target=target):
                result = tav("cat", *sources, "-o", out, "--force", *options_of(target))
                if "before another one it reads as" in result.err:
                    continue  # an empty root with a 32-bit header
                self.assertEqual((result.status, result.out, result.err), (0, "", ""))
                self.assertEqual([plain(root) for root in self.roots(out, *options_of(target))], roots)
                self.expect_sound(out, *options_of(target))

    def test_the_golden_vectors_stay_what_they_are(self):
        for vector in sorted(GOLDEN.glob("*.hex")):
            path, out = self.file(golden_bytes(vector)), self.folder / "out.tav"
            with self.subTest(vector=vector.name):
                for options in ((), ("--byte-order", "big"), ("--byte-order", "little", "--align")):
                    result = tav("cat", path, "-o", out, "--force", *options)
                    self.assertEqual((result.status, result.err), (0, ""))
                    self.assertEqual((result := tav("diff", path, out)).out, "", result.err)

    def test_the_form_is_that_of_the_first_file(self):
        for order, wide in (("<", True), (">", True), ("<", False), (">", False)):
            first, second = self.file(system(order, wide)), self.file(system(">", True, first=50), "y.tav")
            out = self.folder / "out.tav"
            self.assertEqual(tav("cat", first, second, "-o", out, "--force").status, 0)
            self.assertEqual(out.read_bytes(), system(order, wide) + system(order, wide, first=50))

    def test_zeros_are_dropped(self):
        path = self.file(STREAM + bytes(8192) + STREAM + bytes(100))
        self.assertEqual(tav("cat", path, path, "-o", "-").raw, STREAM * 4)

    def test_an_empty_root_is_told_from_one_that_was_never_closed(self):
        empty = self.file(group(60100), "empty.tav")
        path, out = self.file(STREAM), self.folder / "out.tav"
        self.assertEqual(tav("cat", empty, "-o", "-", "--root", "64").raw, group(60100))
        self.assertEqual(tav("cat", empty, path, "-o", out).status, 0)
        self.expect_sound(out)
        self.assertEqual([len(root["children"]) for root in self.roots(out)], [0, 20])
        result = tav("cat", empty, path, "--root", "32", "-o", out, "--force")
        self.assertEqual(result.status, 2)
        self.assertIn("can only stand at the end", result.err)

    def test_what_a_narrow_header_cannot_hold_is_refused(self):
        flagged = struct.pack("<QIHH", 24, 0, 2, 60100) + struct.pack("<QIHH", 8, 0x40, 57, 60111) + bytes(8)
        path, out = self.file(flagged), self.folder / "out.tav"
        result = tav("cat", path, "-o", out, "--root", "32")
        self.assertEqual((result.status, out.exists()), (2, False))
        self.assertIn("0x10: a 32-bit header has no room for the info bits 0x40", result.err)

    def test_damage_is_left_out_and_told(self):
        path, out = self.file(overwritten(STREAM, host(3), HOST)), self.folder / "out.tav"
        result = tav("cat", path, path, "-o", out)
        self.assertEqual((result.status, result.err.count(f"{host(3):#x} /system: passed over {HOST} bytes")), (1, 2))
        self.expect_sound(out)
        self.assertEqual(tav("get", out, "--all", "**/cpuOnline").out.count("\n"), 2 * 19)

    def test_a_failure_leaves_what_was_there(self):
        path, out = self.file(STREAM), self.file(b"precious", "out.tav")
        empty = self.file(b"", "empty.tav")
        for other, status in ((empty, 3), (self.folder / "none", 2), (path, 2)):
            force = () if other == path else ("--force",)
            self.assertEqual(tav("cat", path, other, "-o", out, *force).status, status)
            self.assertEqual(out.read_bytes(), b"precious")
        for arguments in ((path,), (path, "-o", path, "--force"), ("-", "-", "-o", out, "--force")):
            self.assertEqual(tav("cat", *arguments).status, 2)
        self.assertEqual({entry.name for entry in self.folder.iterdir()}, {"x.tav", "out.tav", "empty.tav"})

    def test_long_values_take_no_memory(self):
        array = struct.pack("<QIHH", 200 << 20, 0, 106, 60118)
        path, out = self.folder / "x.tav", self.folder / "out.tav"
        with path.open("wb") as file:
            file.write(struct.pack("<QIHH", (200 << 20) + 16, 0, 2, 60100) + array)
            file.write(struct.pack("<Q", 7))
            file.truncate((200 << 20) + 32)
        self.assertEqual(tav_in_little_memory("cat", path, "-o", out, "--byte-order", "big").status, 0)
        with out.open("rb") as file:
            self.assertEqual(struct.unpack(">QIHHQIHHQ", file.read(40))[-1], 7)
        self.assertEqual(tav("diff", path, out).status, 0)

    @unittest.skipIf(WINDOWS or EMULATOR, "pipes are others there")
    def test_a_pipe_is_read_and_written(self):
        self.assertEqual(tav("cat", "-", "-o", "-", stdin=STREAM).raw, STREAM)


class Extract(Collect):
    def test_it_takes_the_groups_of_a_name(self):
        forms = encode.Form.all()
        compared = 0
        for seed in range(SEEDS):
            form = forms[seed % len(forms)]
            path, out = self.file(encode.RandomStream(seed, form, nodes=60).bytes()), self.folder / "out.tav"
            options = options_of(form)
            if tav("check", path, *options).status == 3 or tav("json", path, *options).status != 0:
                continue  # an open root of bytes that could be anything
            expected = [found for root in self.roots(path, *options) for found in outermost(root, "host")]
            with self.subTest(seed=seed, form=form):
                result = tav("extract", path, "**/host", "-o", out, "--force", *options)
                if not expected or "is no group" in result.err or "can only stand at the end" in result.err:
                    self.assertNotEqual(result.status, 0)
                    continue
                self.assertEqual((result.status, result.err), (0, ""))
                wide = expected[0]["header"]
                now = ("--byte-order", "big" if form.big else "little", "--root", wide, *options[-1:])
                found = self.roots(out, *now)
                if len({root["header"] for root in expected}) == 1:
                    self.assertEqual([plain(root) for root in found], [plain(root) for root in expected])
                    self.assertEqual({root["header"] for root in found}, {wide})
                    self.expect_sound(out, *now)
                    compared += 1
        self.assertGreater(compared, SEEDS // 10)

    def test_a_root_is_extracted_as_it_is(self):
        for order, wide in (("<", True), (">", True), ("<", False), (">", False)):
            path = self.file(system(order, wide) + system(order, wide, first=50))
            self.assertEqual(tav("extract", path, "/system[2]", "-o", "-").raw, system(order, wide, first=50))
            self.assertEqual(tav("extract", path, "/", "-o", "-").raw, path.read_bytes())

    def test_the_outermost_of_nested_groups_is_taken(self):
        inner = group(60102, group(60102, number(1)), number(2))
        path = self.file(group(60100, inner, group(60104, group(60102, number(3)))))
        self.assertEqual(tav("extract", path, "**/host", "-o", "-").raw, inner + group(60102, number(3)))

    def test_empty_groups_are_all_there(self):
        path, out = self.file(group(60100, *[group(60102)] * 3)), self.folder / "out.tav"
        self.assertEqual(tav("extract", path, "**/host", "-o", out).status, 0)
        self.expect_sound(out)
        self.assertEqual(len(self.roots(out)), 3)

    def test_what_is_no_group_is_refused(self):
        path, out = self.file(STREAM), self.file(b"precious", "out.tav")
        result = tav("extract", path, "**/cpuOnline", "-o", out, "--force")
        self.assertEqual((result.status, out.read_bytes()), (2, b"precious"))
        self.assertIn(f"{host(0) + 16:#x} /system/host/cpuOnline: is no group", result.err)

    def test_a_path_that_leads_nowhere_leaves_what_was_there(self):
        path, out = self.file(overwritten(STREAM, host(3), HOST)), self.file(b"precious", "out.tav")
        for place, said in (("/system/cpu", "no match"), ("/sytem", "did you mean")):
            result = tav("extract", path, place, "-o", out, "--force")
            self.assertEqual((result.status, out.read_bytes()), (1, b"precious"))
            self.assertIn(said, result.err)
        self.assertEqual(tav("extract", path, "/system[", "-o", out, "--force").status, 2)
        self.assertEqual(tav("extract", path, "/system").status, 2)
        self.assertEqual({entry.name for entry in self.folder.iterdir()}, {"x.tav", "out.tav"})

    def test_damage_in_a_subtree_is_left_out_and_told(self):
        path, out = self.file(overwritten(STREAM, host(3), 16)), self.folder / "out.tav"
        result = tav("extract", path, "/system", "-o", out)
        self.assertEqual(result.status, 1)
        self.assertIn(f"{host(3):#x} /system: passed over", result.err)
        self.expect_sound(out)


if __name__ == "__main__":
    unittest.main()
