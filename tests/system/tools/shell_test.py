"""What the program does between its commands and the system: input that is no plain file, messages on a terminal, and one wording
for one thing."""
import os
import pathlib
import subprocess
import sys
import unittest

from support import EMULATOR, LONGEST_MESSAGE, WINDOWS, ToolTest, bytes_of_hex, running, tav, until
from terminal_test import TerminalTest

STEERING = "\x1b]0;owned\x07\r\u202e\x9b"
SEEN = "\\x1b]0;owned\\a\\r\\xe2\\x80\\xae\\xc2\\x9b"


class Inputs(ToolTest):
    @unittest.skipUnless(os.path.exists("/proc/self/cmdline"), "there is no /proc")
    def test_files_that_the_system_makes_are_read_although_their_size_is_wrong(self):
        words = [sys.executable, "-c", "import sys; sys.stdin.read()", "x" * 100000]
        content = b"".join(word.encode() + b"\0" for word in words)
        with running(words, stdin=subprocess.PIPE) as run:
            path = pathlib.Path(f"/proc/{run.pid}/cmdline")
            self.assertTrue(until(lambda: path.read_bytes() == content))  # at first it is a copy of this process
            self.assertEqual(path.stat().st_size, 0)
            shown = tav("hex", path)
        self.assertEqual(bytes_of_hex(shown.out), content)

    @unittest.skipUnless(os.path.exists("/proc/self/maps"), "there is no /proc")
    def test_what_is_no_stream_there_is_told_as_such(self):
        result = tav("info", "/proc/self/maps")
        self.assertEqual(result.status, 3)
        self.assertNotIn("empty", result.out + result.err)
        self.assertNotRegex(result.out, r"\b0 bytes")

    def test_a_pipe_has_a_limit_that_can_be_set(self):
        content = self.snapshot().read_bytes()
        for limit, status in ((len(content), 0), (len(content) - 1, 2), ("1M", 0), (1, 2), (0, 0)):
            with self.subTest(limit=limit):
                result = tav("tree", "-", "--spool-limit", limit, stdin=content)
                self.assertEqual(result.status, status)
                if status == 2:
                    self.assertEqual(result.out, "")
                    self.assertRegex(result.err, r"^tav: standard input: more than \d+ bytes? come from it\n"
                                                 r" +--spool-limit sets .*\n$")
        self.assertEqual(tav("tree", self.folder / "x.tav", "--spool-limit", 1).status, 0)

    @unittest.skipIf(WINDOWS or not os.path.exists("/dev/zero"), "there is no /dev/zero")
    def test_input_that_never_ends_is_given_up_and_leaves_nothing(self):
        folder = self.folder / "temporary"
        folder.mkdir()
        result = tav("info", "/dev/zero", "--spool-limit", "8M", env={**os.environ, "TMPDIR": str(folder)})
        self.assertEqual((result.status, result.out), (2, ""))
        self.assertIn("/dev/zero: more than 8.0 MiB come from it", result.err)
        self.assertEqual(list(folder.iterdir()), [])


class OneWording(ToolTest):
    def test_a_missing_file_has_one_wording(self):
        path = self.snapshot()
        none = self.folder / "none"
        for words in ([name, none] for name in ("info", "tree", "print", "json", "xml", "check", "hex", "build")):
            self.assertEqual((result := tav(*words)).err, f"tav: {none}: no such file or folder (KOR_RC_NO_SUCH_FILE)\n", words)
            self.assertEqual(result.status, 2)
        for words, name in (((("get", none, "/system")), none), (("diff", path, none), none), (("diff", none, path), none),
                            (("recover", none, "-o", self.folder / "out"), none), (("info", ""), "''"), (("build", ""), "''"),
                            (("json", path, "-o", none / "x"), none / "x"), (("snapshot", "-o", none / "x"), none / "x"),
                            (("info", path, "--trace", none / "x"), none / "x"),
                            (("recover", path, "-o", self.folder / "out", "--report", none / "x"), none / "x")):
            result = tav(*words)
            self.assertEqual(result.err, f"tav: {name}: no such file or folder (KOR_RC_NO_SUCH_FILE)\n", words)
            self.assertEqual(result.status, 2)

    @unittest.skipIf(WINDOWS, "a folder has another answer there")
    def test_a_folder_has_one_wording(self):
        for name in ("info", "tree", "print", "json", "xml", "check", "hex", "build"):
            self.assertEqual(tav(name, self.folder).err, f"tav: {self.folder}: the path names a folder (KOR_RC_IS_FOLDER)\n")

    def test_a_document_has_one_form(self):
        form = '"form": {"byteOrder": "big"}'
        nodes = '"nodes": [{"element": "system", "type": "group64", "children": []}]'
        for document, said in ((f'{{{form}, {form}, {nodes}}}', "the form is given twice"),
                               (f'{{"form": {{}}, {form}, {nodes}}}', "the form is given twice"),
                               ('{"nodes": {"system": {}}, "nodes": {"system": {}}}', "the nodes are given twice")):
            result = tav("build", "-", stdin=document.encode())
            self.assertEqual((result.status, result.raw), (2, b""))
            self.assertIn(said, result.err)
        self.assertEqual(tav("build", "-", stdin=f"{{{form}, {nodes}}}".encode()).status, 0)


class Messages(ToolTest):
    def test_what_a_failed_test_says_is_cut(self):
        long = "x" * 3_000_000
        for check in (lambda: self.assertNotIn("x", long), lambda: self.assertEqual(long, "y" + long),
                      lambda: self.assertIn("y", long, "\n" + long), lambda: self.assertRegex(long, "y"),
                      lambda: self.assertEqual([long], []), lambda: self.assertEqual(long.encode(), b"")):
            with self.assertRaises(self.failureException) as failed:
                check()
            self.assertLess(len(str(failed.exception)), 2 * LONGEST_MESSAGE)
        self.assertRaisesRegex(self.failureException, "^1 != 2$", self.assertEqual, 1, 2)


@unittest.skipIf(WINDOWS or EMULATOR, "terminals are others there")
class Steering(TerminalTest):
    """Nothing that somebody else has named steers the terminal on which it is told."""

    def harmless(self, *words, **more):
        text = self.on_terminal(*words, **more).replace("\r\n", "\n")
        self.assertEqual([c for c in text if not c.isprintable() and c != "\n"], [], words)
        self.assertIn("owned", text)
        return text

    def test_names_of_files_do_not_steer_it(self):
        missing = self.folder / ("none" + STEERING)
        for words in (("info", missing), ("build", missing, "-o", "/dev/null"), ("diff", missing, missing), ("snapshot", "-o", missing / "x"),
                      ("info", self.snapshot(), "--trace", missing / "x")):
            self.assertIn("none" + SEEN, self.harmless(*words))
        path = self.folder / ("x" + STEERING)
        path.write_bytes(self.snapshot().read_bytes()[:-9])
        for words in (("info", path), ("check", path), ("tree", path, "--stats", "--color", "never"),
                      ("get", path, "/cpu"), ("recover", path, "-o", "/dev/null"), ("snapshot", "-o", path),
                      ("print", path, "--at", "1"), ("tree", path, "--at", "1"), ("hex", path, "--path", "/cpu")):
            self.assertIn("x" + SEEN, self.harmless(*words))
        self.assertIn("x" + SEEN, self.harmless("recover", path, "-o", "-", terminal=("stderr",)))

    def test_words_of_the_command_line_do_not_steer_it(self):
        path = self.snapshot()
        for words in ((STEERING,), ("help", STEERING), ("tree", "--" + STEERING), ("tree", path, STEERING),
                      ("tree", path, "--depth", STEERING), ("tree", path, "--root", STEERING),
                      ("tree", path, "--only", STEERING), ("get", path, STEERING), ("get", path, "/system[" + STEERING + "]"),
                      ("elements", STEERING), ("completion", STEERING), ("check", path, "--rule", STEERING),
                      ("info", path, "--trace", "x", "--trace-probe", STEERING)):
            self.assertIn(SEEN, self.harmless(*words), words)

    def test_names_in_a_document_do_not_steer_it(self):
        document = self.folder / "x.json"
        document.write_text('{"system": {"' + STEERING.replace("\x1b", "\\u001b").replace("\x07", "\\u0007").replace("\r", "\\r")
                            + '": 1}}')
        self.assertIn(SEEN, self.harmless("build", document, "-o", self.folder / "out"))

    def test_messages_are_exact_where_no_terminal_is(self):
        missing = self.folder / ("none" + STEERING)
        self.assertIn(str(missing), tav("info", missing).err)
        self.assertIn(STEERING, tav("get", self.snapshot(), STEERING).err)


if __name__ == "__main__":
    unittest.main()
