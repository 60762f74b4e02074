"""Every command that looks into a stream says what it passes over, in a line each with offset and path, and ends with 1."""
import json
import re
import struct
import unittest
import xml.etree.ElementTree as ElementTree

from layout import BINARY, END, Form
from support import ToolTest, bytes_of_hex, tav

UNKNOWN = 2**64 - 1
HOSTS = 20


def header(size, kind, elm, order="<", wide=True):
    return Form(big=order == ">").header(wide, size, kind, elm)


def number(value, elm=60111, order="<", wide=True):
    return header(8, 57, elm, order, wide) + struct.pack(order + "Q", value)


def group(elm, *children, order="<", wide=True, size=None, more=0):
    content = b"".join(children)
    return header(len(content) + more if size is None else size, 2 if wide else 1, elm, order, wide) + content


def system(order="<", wide=True, hosts=HOSTS, first=0):
    return group(60100, *[group(60102, number(first + i, order=order, wide=wide), order=order, wide=wide)
                          for i in range(hosts)], order=order, wide=wide)


STREAM = system()
HOST = len(group(60102, number(0)))


def host(i):
    """Where a host of the stream begins."""
    return 16 + HOST * i


def overwritten(content, at, length, byte=0xEE):
    return content[:at] + bytes([byte]) * length + content[at + length:]


def with_size(content, at, size):
    return content[:at] + struct.pack("<Q", size) + content[at + 8:]


LATER = (("<", False), (">", True), (">", False))
# What is wrong: the file, the offset of the line, the path in it, a part of its sentence, and how many values are left.
KINDS = {
    "a group of bytes that are nothing": (overwritten(STREAM, host(3), HOST), host(3), "/system", "no node", HOSTS - 1),
    "a group of zeros": (overwritten(STREAM, host(3), HOST, 0), host(3), "/system", "zeros where a node should begin",
                         HOSTS - 1),
    "a header of a group": (overwritten(STREAM, host(3), 16), host(3), "/system", "no node", HOSTS),
    "a header of a value": (overwritten(STREAM, host(3) + 16, 16), host(3) + 16, "/system/host[4]", "no node", HOSTS - 1),
    "zeros to the end": (STREAM[:host(10)] + bytes(HOST * 10), host(10), "/system", "zeros where a node", 10),
    "a cut between nodes": (STREAM[:host(10)], 0, "/system", "past the end of the file", 10),
    "a cut in a value": (STREAM[:host(10) + 28], host(10) + 16, "/system/host[11]", "bytes are too few", 10),
    "a cut in a header": (STREAM[:host(10) + 5], host(10), "/system", "5 bytes are too few", 10),
    "the first header": (overwritten(STREAM, 0, 16), 0, "/", "no node", HOSTS),
    "bytes behind": (STREAM + b"\xEE" * 40, len(STREAM), "/", "no node", HOSTS),
    "bytes behind zeros": (STREAM + bytes(4096) + b"\xEE" * 40, len(STREAM) + 4096, "/", "no node", HOSTS),
    "a value that ends past its parent": (
        group(60100, number(1), header(99, 101, 60111) + bytes(8), size=16 + 8 + 16 + 8) + system(hosts=3), 40, "/system",
        "past its parent", 4),
    "a group that ends past its parent": (
        group(60100, group(60102, number(1), number(2), size=60), size=64) + system(hosts=3), 16, "/system/host",
        "ends 12 bytes past its parent", 5),
}
for later in LATER:
    KINDS[f"a stream in another form behind: {later}"] = (
        STREAM + system(*later), len(STREAM), "/", "--from " + hex(len(STREAM)), HOSTS)
    KINDS[f"a stream in another form behind zeros: {later}"] = (
        STREAM + bytes(5000) + system(*later), len(STREAM) + 5000, "/", "--from " + hex(len(STREAM) + 5000), HOSTS)
# In the same byte order, a root with other headers is read as what it is.
for name in [name for name in KINDS if "('<', False)" in name]:
    del KINDS[name]
SOUND = {
    "plain": STREAM, "zeros behind": STREAM + bytes(8192), "two streams": STREAM + STREAM,
    "two streams and zeros between": STREAM + bytes(8192) + system(first=100) + bytes(100),
    "big-endian streams and zeros between": system(">") + bytes(8192) + system(">"),
    "a root with other headers behind": STREAM + system(wide=False),
    "never closed": with_size(STREAM, 0, UNKNOWN), "never closed, and zeros": with_size(STREAM, 0, 0) + bytes(4096),
    "without its last padding": struct.pack("<QIHH", 24, 0x100000, 2, 60100) + struct.pack("<QIHH", 3, 0x100000, 50, 60103)
                                + b"ada",
}
COMMANDS = {"get": ("get", "{}", "--all", "**/cpuOnline"), "get --paths": ("get", "{}", "--all", "--paths", "**"),
            "get --json": ("get", "{}", "--all", "--json", "**"), "get --raw": ("get", "{}", "--all", "--raw", "**/cpuOnline"),
            "tree": ("tree", "{}"), "tree --depth": ("tree", "{}", "--depth", 9), "tree --paths": ("tree", "{}", "--paths"),
            "tree --only": ("tree", "{}", "--only", "system"), "info": ("info", "{}"),
            "info --json": ("info", "{}", "--json"), "info --full": ("info", "{}", "--full"), "xml": ("xml", "{}"),
            "json": ("json", "{}"), "json --lines": ("json", "{}", "--lines"), "hex": ("hex", "{}"),
            "print": ("print", "{}"), "print --xml": ("print", "{}", "--xml"), "diff": ("diff", "{}", "{}"),
            "diff --json": ("diff", "{}", "{}", "--json"), "cat": ("cat", "{}", "-o", "-"),
            "schema": ("schema", "{}"), "schema --json": ("schema", "{}", "--json"), "extract": ("extract", "{}", "//host", "-o", "-"),
            "table": ("table", "{}", "--each", "**", "--col", "x=.", "--on-damage", "stop"),
            "table --on-damage skip": ("table", "{}", "--each", "**", "--col", "x=.", "--on-damage", "skip"),
            "table --col": ("table", "{}", "--each", "/*", "--col", "x=.//cpuOnline[. > 0]", "--on-damage", "skip")}


class Damage(ToolTest):
    def file(self, content, name="x.tav"):
        path = self.folder / name
        path.write_bytes(content)
        return path

    def run_on(self, command, path):
        return tav(*[str(word).format(path) for word in COMMANDS[command]])

    def test_every_command_tells_every_kind_of_damage(self):
        for kind, (content, offset, place, sentence, _) in KINDS.items():
            path = self.file(content)
            for command in COMMANDS:
                with self.subTest(kind=kind, command=command):
                    result = self.run_on(command, path)
                    if command.startswith("table") and "another form" in kind:  # each stream is read in its own
                        self.assertEqual((result.status, result.err), (0, ""))
                        continue
                    # The library's own printing stops at some damage, and then it is not told as passed over alone.
                    self.assertIn(result.status, (1, 3) if command.startswith("print") else (1,), result.err)
                    begin = f"tav: {path}: {offset:#x} {place}: "
                    lines = [line for line in result.err.splitlines() if line.startswith(begin)]
                    self.assertEqual(len(lines), 2 if command.startswith("diff") else 1, result.err)
                    self.assertIn(sentence, lines[0])
                    self.assertRegex(lines[0], r" \(TAV_RC_[A-Z_]+\)$")
                    # Nothing else is told, but for the cut group around a cut node.
                    others = [line for line in result.err.splitlines() if line not in lines]
                    others = [line for line in others if "ends " not in line and "printer stopped" not in line
                              and not line.startswith("     ")]
                    self.assertEqual(others, [])

    def test_the_values_are_printed_all_the_same(self):
        for kind, (content, _, _, _, left) in KINDS.items():
            with self.subTest(kind=kind):
                path = self.file(content)
                self.assertEqual(len(tav("get", path, "--all", "**/cpuOnline").out.splitlines()), left)
                self.assertEqual(bytes_of_hex(tav("hex", path).out), content)
                self.assertEqual(tav("build", stdin=tav("json", path).raw).raw, content)
                ElementTree.fromstring(tav("xml", path).raw)

    def test_nothing_is_told_of_sound_files(self):
        for kind, content in SOUND.items():
            path = self.file(content)
            for command in COMMANDS:
                no_match = any(name in str(COMMANDS[command]) for name in ("cpuOnline", "//host")) and kind == "without its last padding"
                refused = command.startswith("print") and kind.startswith("never closed")  # by the library
                with self.subTest(kind=kind, command=command):
                    result = self.run_on(command, path)
                    self.assertNotIn("passed over", result.err)
                    if not no_match and not refused:
                        self.assertEqual((result.status, result.err), (0, ""))

    def test_values_beside_damage_are_set_and_nothing_else_is(self):
        sound = {kind: (content, None, None, None, None) for kind, content in SOUND.items()}
        for kind, (content, offset, place, sentence, left) in {**KINDS, **sound}.items():
            path = self.file(content)
            found = tav("get", path, "--all", "--json", "**/cpuOnline").out.splitlines()
            places = [json.loads(line)["offset"] for line in found]
            head = 16 if kind != "a root with other headers behind" else None
            with self.subTest(kind=kind):
                result = tav("set", path, "**/cpuOnline", "77")
                self.assertEqual(len(places), left if left is not None else len(places))
                self.assertEqual(result.status, 0 if kind in SOUND and places else 1, result.err)
                if kind in KINDS:
                    self.assertRegex(result.err, f"(?m)^{re.escape(f'tav: {path}: {offset:#x} {place}: ')}.*{re.escape(sentence)}")
                if head is not None:
                    untouched = bytearray(path.read_bytes())
                    self.assertEqual(len(untouched), len(content))
                    for place in places:
                        untouched[place + head:place + head + 8] = content[place + head:place + head + 8]
                    self.assertEqual(bytes(untouched), content)
                self.assertEqual(tav("get", path, "--all", "**/cpuOnline").out.split(), ["77"] * len(places))

    def test_what_is_not_walked_is_not_told(self):
        path = self.file(overwritten(STREAM, host(3), HOST))
        self.assertEqual((tav("get", path, "/system/host/cpuOnline").err, tav("get", path, "/system/host[9]/cpuOnline").status),
                         ("", 1))

    def test_a_group_whose_end_is_not_there_is_walked_and_not_stepped_over(self):
        def end(length):
            return header(16, BINARY, END) + Form(big=False).end_pair(length, wide=True)
        for more in (1, HOST - 1, HOST + 7, 3 * HOST + 1):
            head = struct.pack("<QIHH", 24 + 32 + more, 0x400000, 2, 60104)
            content = head + number(7) + end(24) + STREAM[16:]
            path = self.file(header(len(content), 2, 60100) + content)
            with self.subTest(more=more, pair=True):
                values = tav("get", path, "--all", "/system/host/cpuOnline").out.split()
                self.assertEqual(values, [str(i) for i in range(HOSTS)])
        head = header(24 + HOST + 5, 2, 60104)  # ends inside a node
        content = head + number(7) + STREAM[16:]
        path = self.file(header(len(content), 2, 60100) + content)
        result = tav("get", path, "--all", "/system/host/cpuOnline")
        self.assertEqual(result.status, 1)
        self.assertIn("passed over", result.err)

    def test_places_on_the_way_to_a_node_are_told(self):
        path = self.file(overwritten(STREAM, host(3), HOST))
        for arguments in (("tree", "--at"), ("hex", "--at"), ("print", "--at")):
            result = tav(arguments[0], path, arguments[1], host(9))
            with self.subTest(arguments=arguments):
                self.assertEqual(result.status, 1)
                self.assertIn(f"{host(3):#x} /system: passed over {HOST} bytes: ", result.err)
        result = tav("hex", path, "--path", "/system/host[9]")
        self.assertEqual((result.status, result.err.count("passed over")), (1, 1))

    def test_one_place_is_one_line_and_a_thousand_lines_are_enough(self):
        for damaged, lines in ((5, 5), (1500, 1001)):
            children = [group(60102, number(i)) + b"\xEE" * 40 for i in range(damaged)]
            path = self.file(group(60100, *children, number(1)))
            result = tav("tree", path, "--depth", 1)
            with self.subTest(damaged=damaged):
                self.assertEqual(result.err.count("\n"), lines)
        self.assertIn("passed over 500 more places; 'tav check' tells all\n", result.err)

    def test_of_groups_that_one_end_cuts_the_outermost_is_told(self):
        whole = group(60100, group(60102, group(60104, number(1), number(2))))
        result = tav("get", self.file(whole[:-24]), "--all", "**")
        self.assertEqual(result.err.count("\n"), 1)
        self.assertIn(": 0x0 /system: ends 24 bytes past the end of the file: what it lacks was passed over "
                      "(TAV_RC_DATA_TOO_LARGE)\n", result.err)


class From(ToolTest):
    """--from OFFSET reads what begins there, in whatever form it is."""

    def setUp(self):
        super().setUp()
        self.first, self.second, self.third = system(), system(">", first=100), system("<", False, first=200)
        self.path = self.folder / "x.tav"
        self.path.write_bytes(self.first + bytes(4000) + self.second + self.third)

    def begin(self, sentence):
        return re.search(r"--from (0x[0-9a-f]+) reads it", sentence).group(1)

    def test_the_command_that_is_offered_goes_on(self):
        begin = self.begin(tav("get", self.path, "--all", "**/cpuOnline").err)
        self.assertEqual(int(begin, 16), len(self.first) + 4000)
        result = tav("get", self.path, "--all", "**/cpuOnline", "--from", begin)
        self.assertEqual(result.out.split(), [str(i) for i in range(100, 100 + HOSTS)])
        again = self.begin(result.err)
        self.assertEqual(int(again, 16), len(self.first) + 4000 + len(self.second))
        result = tav("get", self.path, "--all", "**/cpuOnline", "--from", again)
        self.assertEqual((result.status, result.err), (0, ""))
        self.assertEqual(result.out.split(), [str(i) for i in range(200, 200 + HOSTS)])
        for told in (tav("info", self.path).out, tav("check", self.path).out):
            self.assertIn(f"--from {begin} reads it", told)

    def test_every_command_reads_as_if_the_file_began_there(self):
        at = len(self.first) + 4000 + len(self.second)
        alone = self.folder / "alone.tav"
        alone.write_bytes(self.third)
        for name, words in COMMANDS.items():
            if name.startswith("diff"):
                continue
            there = tav(*[str(word).format(self.path) for word in words], "--from", at)
            expected = tav(*[str(word).format(alone) for word in words])
            with self.subTest(command=name):
                self.assertEqual((there.status, there.out.replace(f"{self.path} from {at:#x}", str(alone))),
                                 (0, expected.out))
        for command in (("check",), ("tree", "--at", 8), ("print", "--at", 8), ("hex", "--at", 8), ("hex", "--at", 11)):
            there, expected = tav(*command, self.path, "--from", at), tav(*command, alone)
            self.assertEqual((there.status, there.out.replace(f"{self.path} from {at:#x}", str(alone))),
                             (expected.status, expected.out))
        saved = self.folder / "saved.tav"
        self.assertEqual(tav("recover", self.path, "--from", at, "-o", saved).status, 0)
        self.assertEqual(saved.read_bytes(), self.third)

    def test_standard_input_is_read_from_there(self):
        result = tav("get", "-", "/system/host/cpuOnline", "--from", len(self.first) + 4000, stdin=self.path.read_bytes())
        self.assertEqual(result.out, "100\n")

    def test_diff_compares_streams_of_one_file(self):
        second, third = len(self.first) + 4000, len(self.first) + 4000 + len(self.second)
        self.path.write_bytes(self.first + bytes(4000) + system(">") + system("<", False, first=1))
        self.assertEqual(tav("diff", self.path, self.path, "--from", third).status, 0)
        result = tav("diff", self.path, self.path, "--from-a", second, "--from-b", third)
        self.assertEqual((result.status, result.err.count("\n")), (1, 1))  # of A, the third stream is passed over
        self.assertIn("- /system/host  group of 1 node\n", result.out)

    def test_a_place_behind_the_end_is_told(self):
        for at in (self.path.stat().st_size, 1 << 40):
            result = tav("tree", self.path, "--from", at)
            self.assertEqual((result.status, result.out), (2, ""))
            self.assertIn(f"{at:#x}: --from: lies behind the end of the file", result.err)


NO_STREAMS = {
    "gzip": b"\x1f\x8b\x08\x00" + bytes(range(7, 200)), "zip": b"PK\x03\x04" + bytes(range(200)),
    "zstd": b"\x28\xb5\x2f\xfd" + bytes(range(200)), "json": b' {"a": 1}\n', "xml": b"<?xml version='1.0'?>\n<a/>",
    "text": "The quick brown fox, 3 grüße\n".encode() * 3000, "elf": b"\x7fELF\x02\x01\x01" + bytes(9) + b"\x02\0>\0",
    "sqlite": b"SQLite format 3\0" + bytes(range(200)), "parquet": b"PAR1" + bytes(range(200)) + b"PAR1",
}
TEXTS = {"json": ["[]", "[1, 2]", '{\n "tav": 1}', "{}"], "xml": ["<tav>", "\n <a b='c'/>", "\ufeff<!-- x -->"],
         "text": ["x", "[section]", "<3", "{ int x; }", "#!/bin/sh", "3475,222"]}
WORDS = {"gzip": "a gzip file", "zip": "a zip file", "zstd": "a zstd file", "json": "JSON", "xml": "XML", "text": "text",
         "elf": "an ELF file", "sqlite": "an SQLite database", "parquet": "a Parquet file"}


class NoStream(ToolTest):
    """A file that is no stream, an empty one too: status 3 and one sentence in every command."""

    def expect(self, content, sentence):
        path = self.folder / "x.tav"
        path.write_bytes(content)
        commands = {**COMMANDS, "check": ("check", "{}"), "check --json": ("check", "{}", "--json"),
                    "hex --at": ("hex", "{}", "--at", 0), "tree --at": ("tree", "{}", "--at", 0),
                    "set": ("set", "{}", "//cpuOnline", "1")}
        for name, words in commands.items():
            result = tav(*[str(word).format(path) for word in words])
            with self.subTest(command=name, content=content[:20]):
                self.assertEqual(result.status, 3, result.err)
                told = result.out if name.startswith(("info", "check")) else result.err
                if name == "check --json":
                    self.assertIs(json.loads(result.out)["stream"], False)
                elif name != "hex --at":
                    self.assertIn(sentence, told)
                self.assertNotIn("would end", result.out + result.err)
        saved = self.folder / "saved.tav"
        result = tav("recover", path, "-o", saved)
        self.assertEqual((result.status, result.out, saved.exists()), (3, "", False))
        self.assertIn(sentence, result.err)
        return path

    def test_an_empty_file_is_no_stream(self):
        path = self.expect(b"", "the file is empty")
        self.assertEqual(tav("build", stdin=tav("json", path).raw).raw, b"")
        self.assertEqual(tav("hex", path).out, "")

    def test_bytes_that_are_nothing_are_no_stream(self):
        path = self.expect(bytes(1000), "this is no stream, or nothing of it is whole")
        self.assertEqual(tav("build", stdin=tav("json", path).raw).raw, bytes(1000))
        self.assertEqual(bytes_of_hex(tav("hex", path).out), bytes(1000))

    def test_known_files_are_told_as_what_they_are(self):
        for kind, content in NO_STREAMS.items():
            path = self.expect(content, f"this is {WORDS[kind]}, no stream")
            for command in ("info", "check"):
                found = json.loads(tav(command, "--json", path).out)
                self.assertEqual((found["kind"], found["stream"]), (kind, False))
            self.assertEqual(tav("build", stdin=tav("json", path).raw).raw, content)
            self.assertEqual(bytes_of_hex(tav("hex", path).out), content)

    def test_texts_are_told_apart(self):
        path = self.folder / "x.tav"
        for kind, texts in TEXTS.items():
            for text in texts:
                path.write_bytes(text.encode())
                with self.subTest(text=text):
                    self.assertEqual(json.loads(tav("info", "--json", path).out)["kind"], kind)

    def test_a_stream_that_begins_as_another_file_is_a_stream(self):
        for size in (0x00088B1F, 0x04034B50):  # gzip, zip
            path = self.folder / "x.tav"
            path.write_bytes(header(size, 2, 60100) + header(size - 16, 101, 60105) + bytes(size - 16))
            result = tav("info", path, "--json")
            self.assertEqual((result.status, json.loads(result.out)["stream"]), (0, True))

    def test_a_damaged_stream_whose_texts_come_first_is_a_stream(self):
        texts = header(3000, 50, 60103) + b"ada " * 750
        path = self.folder / "x.tav"
        path.write_bytes((b"x" * 32 + texts[16:] + STREAM[16:]))
        self.assertEqual(json.loads(tav("info", path, "--json").out)["stream"], True)

    def test_a_form_that_is_given_is_tried(self):
        path = self.folder / "x.tav"
        path.write_bytes(b"PK\x03\x04" + bytes(60) + STREAM)
        self.assertEqual(tav("get", path, "**/cpuOnline").status, 3)
        self.assertEqual(tav("get", path, "**/cpuOnline", "--root", 64).out, "0\n")
        self.assertEqual(tav("get", path, "**/cpuOnline", "--from", 64).out, "0\n")


class InfoJson(ToolTest):
    def test_it_has_what_the_text_has(self):
        for options in ((), ("--eye-size",), ("--byte-order", "big", "--align"), ("--hdr32",)):
            path = self.snapshot(*options)
            found = json.loads(tav("info", path, "--json").out)
            text = tav("info", path).out
            with self.subTest(options=options):
                self.assertEqual((found["stream"], found["ambiguous"], found["damagedStart"]), (True, False, False))
                self.assertEqual(found["bytes"], path.stat().st_size)
                self.assertIn(f"\nbyte order        {found['form']['byteOrder']}-endian", text)
                self.assertIn(f"\nroot header       {found['form']['root']}-bit", text)
                self.assertIn(f"\nnodes             {found['counted']['nodes']}, of them {found['counted']['groups']} group", text)
                self.assertIn(f"\ndepth             {found['counted']['depth']}\n", text)
                self.assertEqual(sum(one["nodes"] for one in found["types"]), found["counted"]["nodes"])
                self.assertEqual(sum(one["nodes"] for one in found["elements"]), found["counted"]["nodes"])
                self.assertEqual([f"because           {reason}" for reason in found["because"]],
                                 [line for line in text.splitlines() if line.startswith("because ")])

    def test_it_counts_damage_and_zeros(self):
        path = self.folder / "x.tav"
        path.write_bytes(overwritten(STREAM, host(3), HOST) + bytes(64) + STREAM + bytes(100))
        result = tav("info", path, "--json")
        counted = json.loads(result.out)["counted"]
        self.assertEqual(result.status, 1)
        self.assertEqual([counted[key] for key in ("roots", "damagedPlaces", "damagedBytes", "zerosBetween", "zerosAtEnd")],
                         [2, 1, HOST, 64, 100])


if __name__ == "__main__":
    unittest.main()
