"""Output stays in proportion to the file, however deep its groups are nested."""
import json
import struct
import subprocess
import unittest

from support import PATIENCE, TAV, ToolTest, running, tav

OPEN64 = struct.pack("<QIHH", 2**64 - 1, 0, 2, 60100)
OPEN32 = struct.pack("<IHH", 2**32 - 1, 1, 60100)
UNKNOWN64 = struct.pack("<QIHH", 2**64 - 1, 0, 2, 64321)  # named by its number, with a remark each
NUMBER = struct.pack("<QIHHI", 4, 0, 55, 60111, 7)
MIB = 1 << 20


def nest(levels):
    """Groups in groups, each with its size."""
    return b"".join(struct.pack("<QIHH", 16 * (levels - 1 - i), 0, 2, 60100) for i in range(levels))


class Depth(ToolTest):
    def size(self, *arguments):
        """Bytes on standard output; read piece by piece, for it can be too much."""
        with running([*TAV, *map(str, arguments)], stdout=subprocess.PIPE, stderr=subprocess.DEVNULL) as run:
            size = sum(map(len, iter(lambda: run.stdout.read(MIB), b"")))
            self.assertIn(run.wait(timeout=PATIENCE), (0, 1))
        return size

    def file(self, content):
        path = self.folder / "deep.tav"
        path.write_bytes(content)
        return path

    def test_a_megabyte_of_nested_open_groups_stays_small_in_every_command(self):
        limits = {("hex",): 100, ("check",): 10, ("check", "--notes"): 50, ("tree",): 25, ("tree", "--paths"): 25,
                  ("xml",): 25, ("json",): 25, ("json", "--lines"): 25, ("check", "--json"): 60,
                  ("get", "--all", "--paths", "**"): 25, ("get", "--all", "--json", "**"): 120,
                  ("tree", "--only", "system"): 25, ("info",): 0.01}
        for content in (OPEN64 * (MIB // 16), OPEN32 * (MIB // 8), (OPEN64 + NUMBER) * (MIB // 36), UNKNOWN64 * (MIB // 16)):
            path = self.file(content)
            for (command, *options), limit in limits.items():
                with self.subTest(command=command, options=options, element=content[14:16]):
                    pattern = [options.pop()] if command == "get" else []
                    self.assertLess(self.size(command, path, *pattern, *options), limit * MIB)

    def test_hex_grows_with_the_file_and_not_with_its_square(self):
        small, large = (self.size("hex", self.file(OPEN64 * (size // 16))) for size in (MIB // 4, MIB))
        self.assertLess(large, 4.1 * small)

    def test_a_path_is_shortened_in_the_middle_from_25_steps_on(self):
        for levels in (24, 25, 40):
            path = self.file(OPEN64 * (levels - 1) + NUMBER)
            whole = "/system" * (levels - 1) + "/cpuOnline"
            short = whole if levels <= 24 else "/system" * 4 + "/…" + "/system" * 7 + "/cpuOnline"
            with self.subTest(levels=levels):
                self.assertEqual(tav("tree", path, "--only", "cpuOnline", "--width", 0).out.split()[2], short)
                self.assertEqual(tav("get", path, "**/cpuOnline", "--paths").out, f"{short}\t7\n")
                self.assertIn(f"; {short}\n", tav("hex", path).out)
                self.assertEqual(json.loads(tav("get", path, "**/cpuOnline", "--json").out)["path"], whole)
                self.assertEqual(json.loads(tav("json", path, "--lines").out.splitlines()[-1])["path"], whole)

    def test_json_has_whole_paths_or_such_that_lead_to_the_node(self):
        path = self.file(OPEN64 * 4010 + NUMBER)
        found = json.loads(tav("get", path, "**/cpuOnline", "--json").out)
        self.assertEqual(found["path"], f"/**/cpuOnline[@{4010 * 16:#x}]")
        self.assertEqual(tav("get", path, found["path"]).out, "7\n")
        findings = json.loads(tav("check", path, "--json").out)["findings"]
        paths = {finding["offset"]: finding["path"] for finding in findings if finding["rule"] == "group-open"}
        self.assertEqual([paths[16 * level] for level in (0, 100, 3999)], ["/system" * count for count in (1, 101, 4000)])
        self.assertNotIn("…", "".join(paths.values()))

    def test_groups_below_4000_levels_that_were_never_closed_are_counted_in_one_line(self):
        for below, text in ((0, "was never closed"), (1, "was never closed, nor was 1 group in it"),
                            (500, "was never closed, nor were 500 groups in it")):
            path = self.file(OPEN64 * (4001 + below) + NUMBER)
            result = tav("check", path, "--rule", "group-open")
            with self.subTest(below=below):
                self.assertEqual(len(result.out.splitlines()), 4001 + 1)
                self.assertEqual(result.out.splitlines()[0].split(": ")[-1], text + " [group-open] (TAV_RC_NOT_FOUND)")

    def test_the_librarys_own_print_costs_what_its_document_says(self):
        path = self.file(nest(3999))
        self.assertEqual(self.size("print", path), 72094971)
        self.assertEqual(self.size("print", "--xml", path), 48040027)


if __name__ == "__main__":
    unittest.main()
