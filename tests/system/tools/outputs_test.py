"""Files that are written: never one that is read, never one twice, none that is there, and none that is half written."""
import os
import subprocess
import unittest

from support import EMULATOR, PATIENCE, TAV, WINDOWS, ToolTest, tav

try:
    import resource
except ImportError:
    resource = None


class Outputs(ToolTest):
    def setUp(self):
        super().setUp()
        self.path = self.snapshot()
        self.content = self.path.read_bytes()

    def refused(self, *arguments, **more):
        """Runs the program, which must refuse and change no file; returns what it says."""
        before = {entry.name: entry.read_bytes() for entry in self.folder.iterdir() if entry.exists()}
        result = tav(*arguments, **more)
        self.assertEqual((result.status, result.out), (2, ""), arguments)
        self.assertEqual({entry.name: entry.read_bytes() for entry in self.folder.iterdir() if entry.exists()}, before)
        return result.err

    @unittest.skipIf(resource is None or EMULATOR, "limits are of this system")
    def test_what_keeps_an_output_from_growing_is_told(self):
        document = self.folder / "x.json"
        document.write_text(tav("json", self.path).out, encoding="utf-8")
        limit = lambda: resource.setrlimit(resource.RLIMIT_FSIZE, (16, 16))  # noqa: E731
        for arguments in (["snapshot"], ["build", document], ["recover", self.path], ["extract", self.path, "/system"],
                          ["cat", self.path],
                          ["set", self.path, "/system/host/hostName", "longer-than-before"]):
            with self.subTest(arguments[0]):
                error = self.refused(*arguments, "-o", self.folder / "y.tav", preexec_fn=limit)
                self.assertIn("KOR_RC_FILE_TOO_LARGE", error)
                self.assertIn("the file would grow beyond the size that is allowed", error)

    def test_an_existing_file_becomes_a_trace_only_by_force(self):
        trace = self.folder / "trace"
        trace.write_bytes(b"precious")
        said = self.refused("print", self.path, "--trace", trace)
        self.assertIn("KOR_RC_FILE_EXISTS", said)
        self.assertIn("--force", said)
        self.assertEqual(tav("print", self.path, "--trace", trace, "--force").status, 0)
        self.assertIn("tavGetNextChild", trace.read_text())

    def test_no_output_is_the_file_that_is_read(self):
        for arguments in (("tree", self.path, "--trace", self.path), ("recover", self.path, "-o", self.path),
                          ("json", self.path, "-o", self.path), ("xml", self.path, "-o", self.path),
                          ("build", self.path, "-o", self.path), ("diff", self.path, self.path, "--trace", self.path),
                          ("recover", self.path, "-o", self.folder / "saved", "--report", self.path),
                          ("extract", self.path, "/system", "-o", self.path), ("cat", self.path, "-o", self.path),
                          ("set", self.path, "/system/host/hostName", "x", "-o", self.path),
                          ("tree", self.path, "--trace", self.folder / "." / "x.tav")):
            for force in ((), ("--force",)):
                with self.subTest(arguments=arguments, force=force):
                    self.assertIn("is a file that is read", self.refused(*arguments, *force))

    def test_links_do_not_hide_that_an_output_is_the_file_that_is_read(self):
        symbolic, hard = self.folder / "symbolic", self.folder / "hard"
        symbolic.symlink_to(self.path)
        os.link(self.path, hard)
        for given, output in ((self.path, symbolic), (symbolic, self.path), (self.path, hard), (symbolic, hard)):
            for arguments in (("json", given, "-o", output), ("tree", given, "--trace", output)):
                with self.subTest(arguments=arguments):
                    self.assertIn("is a file that is read", self.refused(*arguments, "--force"))

    @unittest.skipIf(WINDOWS, "standard input has no name there")
    @unittest.skipIf(EMULATOR, "an emulator has its own idea of standard input")
    def test_standard_input_that_comes_from_a_file_is_a_file_that_is_read(self):
        for arguments in (("tree", "-", "--trace", self.path), ("build", "-o", self.path)):
            with self.subTest(arguments=arguments), self.path.open("rb") as file:
                done = subprocess.run([*TAV, *map(str, arguments), "--force"], stdin=file, capture_output=True, timeout=PATIENCE)
                self.assertEqual((done.returncode, done.stdout), (2, b""))
                self.assertIn(b"is a file that is read", done.stderr)
                self.assertEqual(self.path.read_bytes(), self.content)

    def test_no_two_outputs_are_the_same_file(self):
        there = self.folder / "there"
        there.write_bytes(b"precious")
        leads_nowhere = self.folder / "leads-nowhere"
        leads_nowhere.symlink_to(self.folder / "new")
        os.link(there, self.folder / "hard")
        for one, other in (("new", "new"), ("there", "there"), ("new", "./new"), ("new", "leads-nowhere"),
                           ("there", "hard")):
            for arguments in (("recover", self.path, "-o", self.folder / one, "--report", f"{self.folder}/{other}"),
                              ("snapshot", "-o", self.folder / one, "--trace", f"{self.folder}/{other}")):
                with self.subTest(arguments=arguments):
                    self.assertIn("lead to the same place", self.refused(*arguments, "--force"))
        self.assertIn("standard output", self.refused("recover", self.path, "-o", "-", "--report", "-"))

    def test_devices_take_any_number_of_outputs(self):
        if not os.path.exists("/dev/null"):
            self.skipTest("there is no /dev/null")
        result = tav("recover", self.path, "-o", "/dev/null", "--report", "/dev/null", "--trace", "/dev/null")
        self.assertEqual((result.status, result.out, result.err), (0, "", ""))

    @unittest.skipIf(resource is None, "this platform has no limit for files")
    def test_a_limit_for_files_is_told_and_leaves_no_temporary_file(self):
        def limit():
            resource.setrlimit(resource.RLIMIT_FSIZE, (100, 100))
        target = self.folder / "target"
        target.mkdir()
        for arguments in (("json", self.path), ("xml", self.path), ("snapshot",), ("recover", self.path)):
            with self.subTest(arguments=arguments):
                result = tav(*arguments, "-o", target / "out", preexec_fn=limit)
                self.assertEqual(result.status, 2)
                self.assertIn("KOR_RC_FILE_TOO_LARGE", result.err)
                self.assertEqual(list(target.iterdir()), [])

    @unittest.skipIf(resource is None, "this platform has no limit for files")
    def test_a_limit_for_files_is_told_of_standard_output(self):
        for command in ("tree", "print"):
            with self.subTest(command), (self.folder / "out").open("wb") as out:
                done = subprocess.run([*TAV, command, str(self.path)], stdout=out, stderr=subprocess.PIPE, timeout=PATIENCE,
                                      preexec_fn=lambda: resource.setrlimit(resource.RLIMIT_FSIZE, (100, 100)))
                self.assertEqual(done.returncode, 2)
                self.assertIn(b"KOR_RC_FILE_TOO_LARGE", done.stderr)


if __name__ == "__main__":
    unittest.main()
