"""What the commands that look into a stream tell where there is less to see than was asked for."""
import json
import struct
import unittest

from damage_test import group, header, number
from layout import BINARY, END, Form
from planted import recorded
from support import ToolTest, bytes_of_hex, nodes_of, tav

UNKNOWN = 2**64 - 1


class Info(ToolTest):
    def open_groups(self, path, *options):
        lines = tav("info", path, *options).out.splitlines()
        return next(line[len("open groups"):].strip() for line in lines if line.startswith("open groups"))

    def write(self, root, groups):
        """A root of so many groups with a number each, more than are counted unless all are asked for."""
        path = self.folder / "many.tav"
        with path.open("wb") as file:
            file.write(header(root, 2, 60100) + (header(20, 2, 60102) + header(4, 55, 307) + bytes(4)) * groups)
        return path

    def test_an_open_root_of_a_large_file_is_told(self):
        for root in (UNKNOWN, 0):
            path = self.write(root, 60000)
            self.assertEqual(self.open_groups(path), "at least 1, the root among them; --full counts them")
            self.assertEqual(self.open_groups(path, "--full"), "1, of them 1 without an end element")

    def test_open_groups_that_were_not_counted_are_not_told_to_be_none(self):
        path = self.write(36 * 60000, 60000)
        self.assertEqual(self.open_groups(path), "not counted; --full counts them")
        self.assertEqual(self.open_groups(path, "--full"), "none")

    def test_open_groups_of_a_small_file_are_counted(self):
        self.assertEqual(self.open_groups(self.write(UNKNOWN, 3)), "1, of them 1 without an end element")
        self.assertEqual(self.open_groups(self.write(36 * 3, 3)), "none")


class Hex(ToolTest):
    def setUp(self):
        super().setUp()
        self.path = self.folder / "x.tav"
        nodes = header(4, 55, 307) + b"\1\2\3\4", b"\xee" * 700, header(4, 55, 308) + b"\5\6\7\x08"
        self.content = header(sum(map(len, nodes)), 2, 60100) + b"".join(nodes)
        self.path.write_bytes(self.content)

    def shown(self, offset, damaged=False):
        """The bytes that are shown from an offset on, where no node begins."""
        result = tav("hex", self.path, "--at", offset)
        self.assertEqual((result.status, result.err.count("passed over 700 bytes")), (1, int(damaged)))
        self.assertTrue(result.out.startswith(f"; no node begins at {offset:#x}, "), result.out)
        return bytes_of_hex(result.out)[offset:], result.out

    def test_damaged_bytes_are_shown_by_their_offset(self):
        damaged = int(tav("check", self.path, "--rule", "damaged").out.split(": ")[2].split()[0], 16)
        self.assertEqual(damaged, 36)
        bytes_there, text = self.shown(damaged, damaged=True)
        self.assertEqual(bytes_there, b"\xee" * 512)
        self.assertIn("; damaged: ", text)
        self.assertIn("; and 188 bytes more of it\n", text)

    def test_the_bytes_end_where_the_next_piece_begins(self):
        bytes_there, text = self.shown(36 + 690, damaged=True)
        self.assertEqual(bytes_there, b"\xee" * 10)
        self.assertNotIn("more of it", text)

    def test_a_place_inside_a_node_is_shown_with_what_it_is(self):
        bytes_there, text = self.shown(33)
        self.assertEqual(bytes_there, b"\2\3\4")
        self.assertIn("payload: ", text)
        bytes_there, text = self.shown(20)
        self.assertEqual(bytes_there, self.content[20:32])
        self.assertIn("64-bit header: ", text)

    def test_a_node_is_shown_as_ever(self):
        result = tav("hex", self.path, "--at", 16)
        self.assertEqual((result.status, bytes_of_hex(result.out)[16:]), (0, self.content[16:36]))

    def test_a_place_behind_the_end_is_told(self):
        result = tav("hex", self.path, "--at", len(self.content))
        self.assertEqual((result.status, result.out), (1, ""))
        self.assertIn("lies behind the end of the file", result.err)

    def test_tree_and_print_name_the_command_that_shows_the_bytes(self):
        for command in ("tree", "print"):
            result = tav(command, self.path, "--at", 36)
            self.assertEqual((result.status, result.out), (1, ""))
            self.assertIn("no node begins there", result.err)
            self.assertIn("'tav hex --at 0x24'", result.err)


class Print(ToolTest):
    def test_a_bare_group_is_explained(self):
        path = self.snapshot()
        for arguments in ((path,), ("--at", 0, path), ("--at", 16, path), ("--xml", path)):
            with self.subTest(arguments=arguments):
                result = tav("print", "--bare", *arguments)
                self.assertEqual((result.status, result.out), (2, ""))
                self.assertIn("is a group, which has no value of its own", result.err)
                self.assertIn("--at OFFSET", result.err)

    def test_a_bare_value_is_the_value_alone(self):
        path = self.snapshot()
        self.assertEqual(tav("print", "--bare", "--at", 32, path).out, tav("get", path, "/system/host/hostName").out)


class Tree(ToolTest):
    def test_lines_are_never_wider_than_asked_for(self):
        path = self.folder / "x.tav"
        path.write_bytes(recorded())
        for width in (1, 2, 5, 20, 21, 23, 30, 45):
            for options in ((), ("--paths",)):
                with self.subTest(width=width, options=options):
                    lines = tav("tree", path, "--width", width, *options).out.splitlines()
                    self.assertEqual(len(lines), len(nodes_of(path)))
                    self.assertLessEqual(max(map(len, lines)), width)
                    self.assertTrue(any(line.endswith("..."[:width]) for line in lines))


class Repetitions(ToolTest):
    def write(self, content):
        path = self.folder / "many.tav"
        path.write_bytes(content)
        return path

    def folded(self, content, *options):
        """The names, types and values that are shown, without offsets and sizes, and the status."""
        result = tav("tree", self.write(content), "--fold", *options)
        return [line[21:] for line in result.out.splitlines()], result.status

    def test_repetitions_are_folded(self):
        content = group(60100, *[group(60102, number(i)) for i in range(1000)], number(7))
        host = [line for i in range(3) for line in ("  host" + (f"[{i + 1}]" if i else "") + "  group",
                                                    f"    cpuOnline  Uint64  {i}")]
        self.assertEqual(self.folded(content), (["system  group", *host, "  \u2026 997 more like this", "  cpuOnline  Uint64  7"], 0))
        line = tav("tree", self.write(content), "--fold").out.splitlines()[-2]
        self.assertEqual(int(line.split()[0], 16), 16 + 3 * 40)

    def test_only_siblings_that_follow_one_another_are_folded(self):
        lines, _ = self.folded(group(60100, *[number(i, 60111 + i % 2) for i in range(20)]))
        self.assertEqual(len(lines), 21)
        lines, _ = self.folded(group(60100, *[group(60102, number(1), number(2)) for _ in range(3)]))
        self.assertEqual(len(lines), 10)
        lines, _ = self.folded(group(60100, *[number(1)] * 4))
        self.assertEqual(lines[-1], "  \u2026 1 more like this")

    def test_every_node_has_its_line_where_no_terminal_is(self):
        path = self.write(group(60100, *[number(i) for i in range(1000)]))
        whole = tav("tree", path)
        self.assertEqual(len(whole.out.splitlines()), 1001)
        self.assertEqual(tav("tree", path, "--all").out, whole.out)
        self.assertEqual(len(tav("tree", path, "--fold", "--only", "cpuOnline").out.splitlines()), 1000)
        self.assertEqual(tav("tree", path, "--fold", "--all").status, 2)

    def test_damage_among_repetitions_is_shown(self):
        hosts = [group(60102, number(i)) for i in range(100)]
        hosts[50] = b"\xee" * 40
        lines, status = self.folded(group(60100, *hosts))
        damaged = next(i for i, line in enumerate(lines) if line.startswith("  damaged"))
        self.assertEqual((status, lines[damaged - 1]), (1, "  \u2026 47 more like this"))
        self.assertEqual((lines[damaged + 1].split("[")[0], lines[-1]), ("  host", "  \u2026 46 more like this"))
        inside = [group(60102, number(i)) for i in range(100)]
        inside[50] = group(60102, b"\xee" * 24)
        lines, status = self.folded(group(60100, *inside))
        damaged = next(i for i, line in enumerate(lines) if "damaged" in line)
        self.assertEqual((status, lines[damaged - 1], lines[-1]), (1, "  \u2026 48 more like this", "  \u2026 46 more like this"))

    def test_levels_and_one_subtree_are_folded_as_the_whole(self):
        content = group(60100, group(60102, *[number(i) for i in range(10)]))
        self.assertEqual(self.folded(content, "--depth", "1")[0], ["system  group", "  host  group"])
        self.assertEqual(self.folded(content, "--at", "16")[0][-1], "  \u2026 7 more like this")
        self.assertEqual(self.folded(content, "--paths")[0][-1], "\u2026 7 more like this")


class EndElements(ToolTest):
    """What only ends a group is structure: shown where it is asked for, counted nowhere else."""

    def setUp(self):
        super().setUp()
        self.path = self.snapshot("--eye-size")

    def test_tree_and_xml_show_them_when_asked(self):
        nodes = nodes_of(self.path)
        groups = sum(kind.startswith("group") for kind in nodes)
        self.assertGreaterEqual(groups, 5)
        for command in ("tree", "xml"):
            self.assertNotIn("endHdr", tav(command, self.path).out)
            ends = tav(command, self.path, "--ends").out.count("endHdrEyeSize") // (2 if command == "xml" else 1)
            self.assertEqual(ends, groups)
        self.assertEqual(len(tav("tree", self.path).out.splitlines()), len(nodes))
        self.assertEqual(len(tav("tree", self.path, "--only", "endHdrEyeSize").out.splitlines()), groups)
        offset = tav("tree", self.path, "--only", "endHdrEyeSize").out.split()[0]
        self.assertIn("endHdrEyeSize", tav("tree", self.path, "--at", offset).out)
        self.assertIn("endHdrEyeSize", tav("json", self.path, "--lines").out)

    def test_info_counts_widths_of_nodes_alone(self):
        for options, is_wide in (((), True), (("--hdr32",), False)):
            path = self.snapshot(*options) if options else self.path
            counted = json.loads(tav("info", path, "--json").out)["counted"]
            count = len(nodes_of(path))
            self.assertEqual((counted["nodes"], counted["headers64"], counted["headers32"]),
                             (count, count if is_wide else 0, 0 if is_wide else count))

    def test_an_end_element_is_no_level(self):
        end = header(16, BINARY, END) + Form(big=False).end_pair(0, wide=True)
        path = self.folder / "one.tav"
        path.write_bytes(struct.pack("<QIHH", 32, 0x00400000, 2, 60100) + end)
        self.assertEqual(json.loads(tav("info", path, "--json").out)["counted"]["depth"], 1)


class Snapshot(ToolTest):
    def test_a_32_bit_root_is_that_of_32_bit_headers(self):
        layout = Form()
        root = layout.header_at(self.snapshot("--root", "32").read_bytes(), 0, wide=False)
        other = layout.header_at(self.snapshot("--hdr32").read_bytes(), 0, wide=False)
        self.assertEqual(root[1:], other[1:])  # their sizes differ as the machine goes on
        info = tav("info", self.snapshot("--root", "32")).out
        self.assertIn("root header       32-bit\n", info)
        self.assertIn("headers           32-bit\n", info)
        self.assertIn("root header       64-bit\n", tav("info", self.snapshot("--root", "64")).out)

    def test_widths_that_exclude_each_other_are_wrong_usage(self):
        for options in (("--root", "64", "--hdr32"), ("--root", "32", "--eye-size")):
            result = tav("snapshot", *options)
            self.assertEqual((result.status, result.out), (2, ""))
            self.assertIn("exclude each other", result.err)


if __name__ == "__main__":
    unittest.main()
