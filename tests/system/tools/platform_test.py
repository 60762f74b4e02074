"""What must be the same on every platform: the characters that are printed, names of files, standard streams of bytes."""
import re
import unittest

from support import ToolTest, generate, tav

NAME = "gr\u00fc\u00df \u6587.tav"


class Platform(ToolTest):
    def test_lines_end_as_they_were_written(self):
        path = self.snapshot("--eye-size")
        for arguments in (("info", path), ("tree", path), ("print", path), ("print", path, "--xml"), ("json", path),
                          ("xml", path), ("hex", path), ("check", path), ("elements",), ("--help",)):
            result = tav(*arguments)
            self.assertIn(b"\n", result.raw, arguments)
            self.assertNotIn(b"\r", result.raw, arguments)
        self.assertNotIn("\r", tav("tree", self.folder / "none.tav").err)

    def test_a_file_of_text_holds_no_other_characters_than_standard_output(self):
        path = self.snapshot()
        out = self.folder / "out.json"
        self.assertEqual(tav("json", path, "-o", out).status, 0)
        self.assertEqual(out.read_bytes(), tav("json", path).raw)
        trace = self.folder / "trace"
        self.assertEqual(tav("print", path, "--trace", trace).status, 0)
        self.assertNotIn(b"\r", trace.read_bytes())

    def test_streams_pass_through_standard_streams_unchanged(self):
        path = self.folder / "g.tav"
        generate(path, "--nodes", 2000, "--seed", 5, "--pairs")
        content = path.read_bytes()
        for awkward in (b"\n", b"\r", b"\x1a", b"\0"):
            self.assertIn(awkward, content)
        text = tav("json", "-", stdin=content)
        self.assertEqual(text.raw, tav("json", path).raw)
        self.assertEqual(tav("build", "-", stdin=text.raw).raw, content)

    def test_names_of_files_may_hold_any_characters(self):
        path = self.snapshot()
        other = self.folder / NAME
        other.write_bytes(path.read_bytes())
        self.assertEqual(tav("print", other).raw, tav("print", path).raw)
        again = self.folder / ("again " + NAME)
        self.assertEqual(tav("json", other, "-o", again).status, 0)
        self.assertEqual(again.read_bytes(), tav("json", path).raw)
        self.assertEqual(tav("json", other, "-o", again).status, 2)
        self.assertEqual(tav("json", other, "-o", again, "--force").status, 0)
        missing = self.folder / ("no " + NAME)
        self.assertIn(str(missing), tav("tree", missing).err)
        self.assertEqual(sorted(entry.name for entry in self.folder.iterdir()), sorted(["x.tav", NAME, "again " + NAME]))

    def test_the_machine_is_described(self):
        text = tav("print", self.snapshot(), "--xml").out
        for tag in ("hostName", "osName", "cpuOnline", "memTotal"):
            self.assertTrue(re.search(f"<{tag}>[^<]+</{tag}>", text), tag)


if __name__ == "__main__":
    unittest.main()
