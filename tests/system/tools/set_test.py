"""tav set: other values for nodes, in place or in a new file."""
import json
import os
import random
import struct
import unittest

import encode
from collect_test import options_of
from damage_test import HOST, STREAM, group, header, host, number, overwritten, system
from json_test import GOLDEN, Folder, golden_bytes
from support import EMULATOR, SANITIZED, WINDOWS, tav

SEEDS = 40 if SANITIZED or EMULATOR else 120
RANGES = {"Uint8": (0, 2**8), "Sint8": (-2**7, 2**7), "Uint16": (0, 2**16), "Sint16": (-2**15, 2**15), "Uint32": (0, 2**32),
          "Sint32": (-2**31, 2**31), "Uint64": (0, 2**64), "Sint64": (-2**63, 2**63), "Uint128": (0, 2**128),
          "Sint128": (-2**127, 2**127)}


def exactly(path):
    """A printed path as one that leads to a single node: a step without a number is the first of its name."""
    return "".join("/" + (step if step.endswith("]") else step + "[1]") for step in path[1:].split("/"))


def new_value(kind, chance):
    """A value of a type as `tav get` prints it, and as `tav json` has it; None for types that are not tried."""
    if kind in RANGES:
        value = chance.randrange(*RANGES[kind])
        return str(value), value
    if kind == "ASCII String":
        text = "".join(chance.choice("abc []%") for _ in range(chance.randrange(20)))
        return text, text
    if kind == "UTF8 String":
        text = "".join(chance.choice("ab\u00e9\u20ac") for _ in range(chance.randrange(20)))
        return text, text
    if kind == "Binary":
        data = chance.randbytes(chance.randrange(20)).hex()
        return data, data
    if kind == "Uint64 array":
        numbers = [chance.getrandbits(64) for _ in range(chance.randrange(4))]
        return "[" + " ".join(map(str, numbers)) + "]", numbers
    if kind == "UTC Timestamp":
        text = f"20{chance.randrange(10, 99)}-02-28T10:30:{chance.randrange(60):02}.{chance.randrange(10**6):06}+01:00"
        return text, text
    return None


class Folders(Folder):
    def lines(self, path, *options):
        result = tav("json", "--lines", path, *options)
        self.assertEqual(result.status, 0, result.err)
        return [json.loads(line) for line in result.raw.split(b"\n")[1:-1]]

    def findings(self, path, *options):
        found = json.loads(tav("check", path, "--notes", "--json", *options).out)["findings"]
        return sorted((finding["rule"], finding.get("path", "")) for finding in found)


class NewFile(Folders):
    def test_sizes_and_pairs_around_are_right_afterwards(self):
        """Of random streams in all forms: the value is there, everything else is as it was, and the old value set again gives
        the old bytes."""
        forms = encode.Form.all()
        tried = 0
        for seed in range(SEEDS):
            chance, form = random.Random(seed), forms[seed % len(forms)]
            data = encode.RandomStream(seed, form, nodes=40).bytes()
            path, out, back = self.file(data), self.folder / "out.tav", self.folder / "back.tav"
            options = options_of(form)
            if tav("json", path, *options).status != 0:
                continue
            before = self.lines(path, *options)
            nodes = [(i, line, new_value(line["type"], chance)) for i, line in enumerate(before)
                     if "type" in line and "children" not in line and line["id"] != encode.END]
            nodes = [node for node in nodes if node[2]]
            if not nodes:
                continue
            at, line, (text, _) = chance.choice(nodes)
            place = exactly(line["path"])
            with self.subTest(seed=seed, form=form, path=place, type=line["type"], text=text):
                old = tav("get", path, place, *options).raw[:-1]
                result = tav("set", path, "-o", out, "--force", *options, "--", place, text)
                self.assertEqual((result.status, result.err), (0, ""))
                self.assertIn("1 node changed\n" if old != text.encode() else "0 nodes changed", result.out)
                self.assertEqual(path.read_bytes(), data)
                self.assertEqual(tav("get", out, place, *options).raw, text.encode() + b"\n")
                after = self.lines(out, *options)
                self.assertEqual(len(after), len(before))
                for i, (one, other) in enumerate(zip(before, after)):
                    for changing in ("offset", "size", "value", "bytes", "codePage", "pair", "extra", "padding") if i == at else \
                                    ("offset", "size", "bytes") if one.get("id") == encode.END or "value" not in one else ("offset",):
                        one.pop(changing, None)
                        other.pop(changing, None)
                    self.assertEqual(one, other)
                gone = {"utf8-invalid", "string-high", "string-nul"}
                self.assertEqual([found for found in self.findings(out, *options) if found[0] not in gone],
                                 [found for found in self.findings(path, *options) if found[0] not in gone])
                if b"\0" not in old and line["type"] != "Binary" and "bytes" not in line and "further" not in str(line):
                    again = tav("set", out, "-o", back, "--force", *options, "--", place, os.fsdecode(old))
                    if again.status == 0:  # a date may be one that no text says exactly
                        self.assertEqual(again.err, "")
                        self.assertEqual(tav("get", back, place, *options).raw, old + b"\n")
                        if line["type"] != "UTC Timestamp":
                            self.assertEqual(back.read_bytes(), data)
                        tried += 1
        self.assertGreater(tried, SEEDS // 4)

    def test_all_nodes_of_a_path_are_set(self):
        path, out = self.file(STREAM), self.folder / "out.tav"
        result = tav("set", path, "**/cpuOnline", "70", "-o", out)
        self.assertEqual((result.status, result.out), (0, f"tav: {path}: 20 nodes changed\n"))
        self.assertEqual(tav("get", out, "--all", "**/cpuOnline").out, "70\n" * 20)
        again = tav("set", out, "**/cpuOnline", "70")
        self.assertEqual(again.out, f"tav: {out}: 0 nodes changed, 20 had the value already\n")

    def test_of_paths_to_the_same_node_the_last_counts(self):
        path = self.file(STREAM)
        self.assertEqual(tav("set", path, "**/cpuOnline", "7", "/system/host[2]/cpuOnline", "8").status, 0)
        self.assertEqual(tav("get", path, "--all", "**/cpuOnline").out, "7\n8\n" + "7\n" * 18)

    def test_a_type_is_kept_unless_another_is_asked_for(self):
        path, out = self.file(STREAM), self.folder / "out.tav"
        for kind, text, raw in (("Uint8", "9", b"\x09"), ("ASCII String", "nine", b"nine"), ("Binary", "00ff", b"\x00\xff"),
                                ("UTF8 String", "\u00e9", b"\xb8\x04\xc3\xa9"), ("Uint64 array", "1, 2", struct.pack("<QQ", 1, 2))):
            self.assertEqual(tav("set", path, "/system/host[3]/cpuOnline", text, "--type", kind, "-o", out, "--force").status, 0)
            self.assertEqual(tav("get", "--raw", out, "/system/host[3]/cpuOnline").raw, raw)
            self.assertEqual(json.loads(tav("get", "--json", out, "/system/host[3]/cpuOnline").out)["type"], kind)
            self.assertEqual(tav("check", out).status, 0)

    def test_damage_stays_where_it_is(self):
        path, out = self.file(overwritten(STREAM, host(3), HOST)), self.folder / "out.tav"
        result = tav("set", path, "/system/host[2]/cpuOnline", "word", "--type", "ASCII String", "-o", out)
        self.assertEqual((result.status, result.err.count("passed over")), (1, 1))
        self.assertEqual(out.read_bytes()[host(3) - 4:], path.read_bytes()[host(3):])
        self.assertEqual(tav("check", out, "--rule", "group-size").status, 0)

    def test_the_golden_vectors_come_back(self):
        for vector in sorted(GOLDEN.glob("*.hex")):
            path, out = self.file(golden_bytes(vector)), self.folder / "out.tav"
            for line in self.lines(path):
                if line.get("type") not in RANGES or "value" not in line:
                    continue
                with self.subTest(vector=vector.name, path=line["path"]):
                    step = exactly(line["path"])
                    self.assertEqual(tav("set", path, step, "longer than before", "--type", "ASCII String", "-o", out, "--force").status, 0)
                    before = self.findings(path)
                    dirty = ("padding-dirty", line["path"])  # new padding is clean
                    self.assertEqual(self.findings(out), [found for found in before if found != dirty])
                    self.assertEqual(tav("set", out, "--type", line["type"], "-o", self.folder / "back", "--force", "--", step,
                                         line["value"]).status, 0)
                    if dirty not in before:
                        self.assertEqual((self.folder / "back").read_bytes(), path.read_bytes())

    def test_standard_output_takes_the_stream_alone(self):
        result = tav("set", "-", "**/cpuOnline", "70", "-o", "-", stdin=STREAM)
        self.assertEqual((result.status, len(result.raw)), (0, len(STREAM)))
        self.assertIn("20 nodes changed", result.err)

    def test_a_group_of_32_bits_grows(self):
        path, out = self.file(system("<", False)), self.folder / "out.tav"
        self.assertEqual(tav("set", path, "**/cpuOnline", "x" * 1000, "--type", "ASCII String", "-o", out).status, 0)
        self.assertEqual(struct.unpack("<I", out.read_bytes()[:4])[0], 20 * (8 + 8 + 1000))
        self.assertEqual(tav("check", out).status, 0)


class InPlace(Folders):
    def refused(self, status, *arguments, said=""):
        """Runs set, which must change no file."""
        before = {entry.name: entry.read_bytes() for entry in self.folder.iterdir()}
        result = tav("set", *arguments)
        self.assertEqual((result.status, result.out), (status, ""), result.err)
        self.assertIn(said, result.err)
        self.assertEqual({entry.name: entry.read_bytes() for entry in self.folder.iterdir()}, before)
        return result.err

    def test_only_the_bytes_of_the_value_change(self):
        for order in "<>":
            for wide in (True, False):
                path = self.file(system(order, wide))
                content, inode = path.read_bytes(), path.stat().st_ino
                at = content.index(struct.pack(order + "Q", 5))
                self.assertEqual(tav("set", path, "/system/host[6]/cpuOnline", str(2**63)).status, 0)
                self.assertEqual(path.read_bytes(), content[:at] + struct.pack(order + "Q", 2**63) + content[at + 8:])
                self.assertEqual(path.stat().st_ino, inode)

    def test_a_part_of_a_file_is_changed_where_it_stands(self):
        path = self.file(b"#" * 100 + STREAM)
        self.assertEqual(tav("set", path, "/system/host[1]/cpuOnline", "77", "--from", "100").status, 0)
        self.assertEqual(path.read_bytes(), b"#" * 100 + STREAM[:48] + struct.pack("<Q", 77) + STREAM[56:])

    def test_a_type_of_the_same_size_is_changed_in_place(self):
        path = self.file(STREAM)
        self.assertEqual(tav("set", path, "--type", "Sint64", "--", "/system/host[2]/cpuOnline", "-5").status, 0)
        self.assertEqual(tav("get", path, "/system/host[2]/cpuOnline").out, "-5\n")
        self.assertEqual(tav("check", path).status, 0)

    def test_another_size_needs_a_new_file(self):
        path = self.file(group(60100, header(3, 50, 60103) + b"ada", number(1)))
        self.refused(2, path, "/system/cpuOnline", "7", "/system/hostName", "grace",
                     said="0x10 /system/hostName: the new value takes 5 bytes where 3 are\n     -o OUT writes a new file")
        self.assertEqual(tav("set", path, "/system/hostName", "eva").status, 0)

    def test_it_is_all_or_nothing(self):
        path = self.file(STREAM)
        good = (path, "/system/host[1]/cpuOnline", "7")
        self.refused(1, *good, "/system/cpu", "7", said="no match")
        self.refused(1, *good, "/sytem", "7", said="did you mean")
        self.refused(2, *good, "/system", "7", said="is a group")
        self.refused(2, *good, "/system/host[2]/cpuOnline", "many", said='"many" is no value for Uint64')
        self.refused(2, *good, "/system/host[2]/cpuOnline", str(2**64), said="is no value for Uint64")
        self.refused(2, *good, "/system/host[", "7")
        self.refused(2, *good, "/system/host[2]/cpuOnline", said="has no value behind it")
        self.refused(2, *good, "--type", "group64", said="is no type of a value")
        self.refused(2, *good, "-o", path, "--force", said="is a file that is read")
        for text in ("1", "[1", "1 x"):
            if text != "1":
                self.refused(2, path, "/system/host/cpuOnline", text, "--type", "Uint64 array")
        for kind, text in (("Binary", "0"), ("Byte", "0011"), ("ASCII String", "\u00e9"), ("UTC Timestamp", "now")):
            self.refused(2, path, "/system/host/cpuOnline", text, "--type", kind, said="is no")

    def test_an_end_element_is_refused(self):
        writer = encode.Writer(encode.Form())
        writer.open(60100, eye=True)
        writer.data(60111, encode.UINT32, writer.pack("I", 8))
        writer.close()
        path = self.file(bytes(writer.bytes))
        self.refused(2, path, "/system/endHdrEyeSize", "00" * 16, said="only ends a group")

    def test_what_is_no_file_is_refused(self):
        self.assertEqual(tav("set", "-", "**/cpuOnline", "7", stdin=STREAM).status, 2)
        self.assertEqual(tav("set", self.folder / "none", "**/cpuOnline", "7").status, 2)
        self.refused(3, self.file(b""), "/system", "7")

    @unittest.skipIf(WINDOWS, "rights are others there")
    @unittest.skipIf(hasattr(os, "geteuid") and os.geteuid() == 0, "root may write everywhere")
    def test_a_file_that_may_not_be_written_is_told(self):
        path = self.file(STREAM)
        path.chmod(0o444)
        self.refused(2, path, "**/cpuOnline", "7", said="KOR_RC_")

    @unittest.skipIf(WINDOWS or EMULATOR, "locks are others there")
    def test_a_file_that_another_one_writes_is_refused(self):
        import fcntl
        path = self.file(STREAM)
        with path.open("r+b") as file:
            fcntl.flock(file, fcntl.LOCK_EX)
            result = tav("set", path, "**/cpuOnline", "7")
        self.assertEqual((result.status, path.read_bytes()), (2, STREAM))
        self.assertIn("KOR_RC_LOCKED", result.err)


if __name__ == "__main__":
    unittest.main()
