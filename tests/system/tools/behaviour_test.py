"""Exit statuses, standard error, pipes, devices, output files and interrupts."""
import os
import random
import re
import shutil
import signal
import struct
import subprocess
import sys
import unittest

from support import PATIENCE, TAV, ToolTest, generate, running, tav, until


class Behaviour(ToolTest):
    def test_help_fits_a_screen_and_names_every_command(self):
        result = tav("--help")
        self.assertEqual((result.status, result.err), (0, ""))
        self.assertLessEqual(len(result.out.splitlines()), 30)
        for command in ("snapshot", "info", "tree", "print", "get", "hex", "elements"):
            self.assertIn(f"\n  {command} ", result.out)
            page = tav(command, "--help")
            self.assertEqual(page.status, 0)
            self.assertLessEqual(len(page.out.splitlines()), 50)

    def test_wrong_usage_is_status_2_with_a_hint(self):
        path = self.snapshot()
        for arguments in ((), ("nonsense",), ("tree",), ("tree", path, path), ("tree", "--depth", "x", path),
                          ("tree", "--nonsense", path), ("get", path), ("tree", "--byte-order", "middle", path),
                          ("get", "--raw", "--json", path, "/system"), ("--trace-probe", "tavReadNodeInt", "info", path),
                          ("elements", "a", "b")):
            with self.subTest(arguments=arguments):
                result = tav(*arguments)
                self.assertEqual((result.status, result.out), (2, ""))
                self.assertNotEqual(result.err, "")

    def test_files_that_cannot_be_read_are_status_2(self):
        for path, code in ((self.folder / "none", "KOR_RC_NO_SUCH_FILE"), (self.folder, "KOR_RC_IS_FOLDER")):
            for command in ("info", "tree", "hex", "print"):
                result = tav(command, path)
                self.assertEqual((result.status, result.out), (2, ""))
                self.assertIn(code, result.err)
                self.assertTrue(result.err.startswith(f"tav: {path}: "), result.err)

    def test_what_is_no_stream_is_status_3(self):
        for content in (b"", b"x", bytes(1000), b"The quick brown fox jumps over the lazy dog. " * 20, random.Random(1).randbytes(4096)):
            path = self.folder / "no.tav"
            path.write_bytes(content)
            for command in ("info", "tree", "print"):
                self.assertEqual(tav(command, path).status, 3, (command, content[:20]))

    def test_a_check_that_fails_ends_what_runs_beside_it(self):
        with self.assertRaises(AssertionError):
            with running([sys.executable, "-c", "import time; time.sleep(1e6)"]) as process:
                self.fail()
        self.assertIsNotNone(process.returncode)

    def test_standard_input_works_as_a_file_does(self):
        path = self.snapshot("--eye-size")
        for arguments in (("tree", "{}"), ("get", "{}", "/system/host/os/osName"), ("hex", "{}"), ("print", "{}", "--xml")):
            from_file = tav(*[str(a).format(path) for a in arguments])
            from_pipe = tav(*[str(a).format("-") for a in arguments], stdin=path.read_bytes())
            self.assertEqual((from_pipe.status, from_pipe.raw), (0, from_file.raw))
            self.assertNotEqual(from_pipe.raw, b"")

    def test_a_named_pipe_works_as_a_file_does(self):
        path = self.snapshot()
        pipe = self.folder / "pipe"
        os.mkfifo(pipe)
        with running(["cp", str(path), str(pipe)]) as writer:
            result = tav("tree", pipe)
            writer.wait()
        self.assertEqual((result.status, result.raw), (0, tav("tree", path).raw))

    def test_no_temporary_file_stays(self):
        path = self.snapshot()
        folder = self.folder / "temporary"
        folder.mkdir()
        tav("tree", "-", stdin=path.read_bytes(), env={**os.environ, "TMPDIR": str(folder)})
        self.assertEqual(list(folder.iterdir()), [])

    def test_a_closed_pipe_ends_quietly(self):
        path = self.folder / "g.tav"
        children = b"".join(struct.pack("<QIHHI", 4, 0, 55, 307, i) for i in range(50000))
        path.write_bytes(struct.pack("<QIHH", len(children), 0, 2, 60100) + children)
        for command in ("tree", "hex", "print"):
            with self.subTest(command=command):
                with running([*TAV, command, str(path)], stdout=subprocess.PIPE, stderr=subprocess.PIPE) as run:
                    run.stdout.read(10)
                    run.stdout.close()
                    errors = run.stderr.read()
                    self.assertEqual((run.wait(timeout=PATIENCE), errors), (0, b""))

    @unittest.skipUnless(os.path.exists("/dev/full"), "there is no /dev/full")
    def test_a_full_disk_is_told(self):
        path = self.snapshot()
        for arguments in (["tree", path], ["print", path], ["hex", path], ["get", path, "/system/host/hostName"],
                          ["info", path], ["elements"], ["--help"]):
            with self.subTest(arguments=arguments), open("/dev/full", "wb") as full:
                run = subprocess.run([*TAV, *map(str, arguments)], stdout=full, stderr=subprocess.PIPE, timeout=PATIENCE)
                self.assertEqual(run.returncode, 2)
                self.assertIn(b"KOR_RC_NO_SPACE", run.stderr)
        result = tav("snapshot", "-o", "/dev/full")
        self.assertEqual(result.status, 2)
        self.assertIn("KOR_RC_NO_SPACE", result.err)

    def test_an_existing_file_is_replaced_only_by_force(self):
        path = self.folder / "y.tav"
        path.write_bytes(b"precious")
        result = tav("snapshot", "-o", path)
        self.assertEqual(result.status, 2)
        self.assertIn("KOR_RC_FILE_EXISTS", result.err)
        self.assertIn("--force", result.err)
        self.assertEqual(path.read_bytes(), b"precious")
        self.assertEqual(tav("snapshot", "-o", path, "--force").status, 0)
        self.assertEqual(tav("info", path).status, 0)
        self.assertEqual([entry.name for entry in self.folder.iterdir()], ["y.tav"])

    def test_an_output_that_cannot_be_made_is_told(self):
        for path in (self.folder, self.folder / "none" / "x.tav"):
            self.assertEqual(tav("snapshot", "-o", path).status, 2)

    def test_an_interrupt_leaves_no_temporary_file(self):
        folder = self.folder / "temporary"
        folder.mkdir()
        for number in (signal.SIGINT, signal.SIGTERM):
            with running([*TAV, "tree", "-"], stdin=subprocess.PIPE, stdout=subprocess.DEVNULL,
                         env={**os.environ, "TMPDIR": str(folder)}) as run:
                self.assertEqual(len(until(lambda: list(folder.iterdir()))), 1)
                run.send_signal(number)
                self.assertEqual(run.wait(timeout=PATIENCE), -number)
            self.assertEqual(list(folder.iterdir()), [])

    def test_the_trace_is_written_and_filtered(self):
        path = self.snapshot()
        trace = self.folder / "trace"
        self.assertEqual(tav("print", path, "--trace", trace).status, 0)
        everything = trace.read_text()
        self.assertIn("tavGetNextChild", everything)
        self.assertEqual(tav("print", path, "--trace", trace, "--force", "--trace-probe", "tavReadNodeInt").status, 0)
        filtered = trace.read_text().splitlines()
        self.assertGreater(len(filtered), 0)
        self.assertLess(len(filtered), len(everything.splitlines()))
        self.assertTrue(all(line.startswith("tavReadNodeInt ") for line in filtered))

    def test_no_progress_and_no_colour_without_a_terminal(self):
        path = self.folder / "g.tav"
        generate(path, "--nodes", 3000)
        result = tav("tree", path)
        self.assertEqual(result.err, "")
        self.assertNotIn("\033", result.out)
        self.assertIn("\033[", tav("tree", path, "--color", "always").out)

    def test_completions_and_the_manual_page_name_every_command_and_option(self):
        texts = {shell: tav("completion", shell).out for shell in ("bash", "zsh", "fish")}
        texts["man"] = re.sub(r"\\f[A-Z]", "", tav("help", "--man").out).replace("\\-", "-")
        commands = re.findall(r"^  ([a-z]+) ", tav("help").out, re.MULTILINE)
        self.assertTrue({"view", "recover", "table"} <= set(commands), commands)
        options = 0
        for command in commands:
            words = {command}
            for short, name in re.findall(r"^  (?:(-[A-Za-z]), |    )--([a-z0-9-]+)", tav(command, "--help").out, re.MULTILINE):
                options += 1
                words |= {name, short} - {""}
            for kind, text in texts.items():
                for word in words:
                    # fish has its own way to write a short option.
                    written = f"-s {word[1:]}" if kind == "fish" and word.startswith("-") else word
                    with self.subTest(text=kind, command=command, word=word):
                        self.assertRegex(text, rf"(?<![\w-])(?:--)?{re.escape(written)}(?![\w-])")
        self.assertGreater(options, 100)
        self.assertEqual(subprocess.run(["bash", "-n"], input=texts["bash"].encode(), timeout=PATIENCE).returncode, 0)
        self.assertEqual(tav("completion", "csh").status, 2)

    def test_usage_shows_the_option_that_must_be_given(self):
        self.assertIn("usage: tav recover [options] FILE -o OUT\n", tav("recover", "--help").out)
        self.assertIn("tav recover FILE \\-o OUT\n", tav("help", "--man").out)
        self.assertIn("tav recover FILE -o OUT\n", tav("recover").err)

    def test_a_missing_shell_is_told_with_the_shells_that_there_are(self):
        result = tav("completion")
        self.assertEqual((result.status, result.out), (2, ""))
        for shell in ("bash", "zsh", "fish"):
            self.assertIn(shell, result.err)
        self.assertNotIn("standard input", result.err)

    def test_examples_stand_behind_what_they_use_in_the_manual_page(self):
        titles = [line[4:] for line in tav("help", "--man").out.splitlines() if line.startswith(".SH ")]
        self.assertEqual(titles[0], "NAME")
        self.assertGreater(titles.index("EXAMPLES"), titles.index("EXIT STATUS"))
        self.assertGreater(titles.index("EXAMPLES"), titles.index("COMMON OPTIONS"))

    @unittest.skipUnless(shutil.which("groff"), "groff is not installed")
    def test_the_manual_page_keeps_the_quotes_of_examples(self):
        done = subprocess.run(["groff", "-man", "-Tascii", "-P-cbou", "-rLL=200n"], input=tav("help", "--man").raw,
                              capture_output=True, timeout=PATIENCE)
        self.assertEqual(done.stderr, b"")
        page = done.stdout.decode()
        for example in ("""echo '{"system": {"host": {"hostName": "ada"}}}' | tav build -o x.tav""",
                        """tav json x.tav | jq '.. | objects | select(.element == "hostName") | .value'"""):
            self.assertIn(example, page)


if __name__ == "__main__":
    unittest.main()
