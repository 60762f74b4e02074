"""What the program does on a real terminal: progress, colours, its width; completion in the shells themselves; and what an
interrupt leaves."""
import json
import os
import re
import select
import shutil
import signal
import struct
import subprocess
import time
import unittest

try:
    import fcntl
    import pty
    import termios
except ImportError:
    pty = None

from sparse_test import read_by
from support import EMULATOR, PATIENCE, TAV, ToolTest, tav, until

ESCAPE = re.compile(r"\x1b\[[0-9;]*[A-Za-z]")
# What is shown, and wiped, where a busy machine makes short work long.
PROGRESS = re.compile(r"\r\w+: [^\r\n\x1b]* s left\x1b\[K|\r\x1b\[K")
PROGRESS_BEGINS = 0.5  # seconds
LONG = 16 << 30  # nobody waits for the end of this


@unittest.skipIf(pty is None, "this platform has no pseudo-terminals")
@unittest.skipIf(EMULATOR, "an emulator has its own idea of a terminal")
class TerminalTest(ToolTest):
    def long_stream(self):
        """A sound stream that takes no room on the disk and long to read."""
        path = self.folder / "long.tav"
        with path.open("wb") as file:
            file.write(struct.pack("<QIHH", LONG - 16, 0, 2, 20) + struct.pack("<QIHH", LONG - 32, 0, 101, 307))
            file.truncate(LONG)
        return path

    def start(self, *arguments, width=80, terminal=("stdout", "stderr"), other=None, **more):
        """Starts the program with some of its streams on a new terminal; the others go to another file."""
        ours, theirs = pty.openpty()
        self.addCleanup(os.close, ours)
        fcntl.ioctl(theirs, termios.TIOCSWINSZ, struct.pack("HHHH", 24, width, 0, 0))
        with open(other or self.folder / "elsewhere", "wb") as file:
            streams = {name: theirs if name in terminal else file for name in ("stdout", "stderr")}
            run = subprocess.Popen([*TAV, *map(str, arguments)], stdin=subprocess.DEVNULL, **streams,
                                   env={**os.environ, "TERM": "xterm", "PAGER": "", **more})
        os.close(theirs)
        self.addCleanup(self.end, run)
        return run, ours

    def end(self, run):
        if run.poll() is None:
            run.kill()
        run.wait()

    def read(self, ours, until=None, seconds=PATIENCE):
        """What appears on the terminal, up to the end of the program or to a match."""
        seen = b""
        deadline = time.monotonic() + seconds
        while time.monotonic() < deadline and not (until and re.search(until, seen.decode("utf-8", "replace"))):
            ready, _, _ = select.select([ours], [], [], 0.1)
            if not ready:
                continue
            try:
                piece = os.read(ours, 65536)
            except OSError:  # the program has ended
                break
            if not piece:
                break
            seen += piece
        return seen.decode("utf-8", "replace")

    def on_terminal(self, *arguments, status=None, **more):
        """What the program shows, but for how far it is: that depends on how fast the machine is."""
        run, ours = self.start(*arguments, **more)
        text = self.read(ours)
        ended = run.wait(timeout=PATIENCE)
        self.assertIn(status, (None, ended))
        return PROGRESS.sub("", text)


class Terminal(TerminalTest):
    def test_a_tree_has_the_terminals_width(self):
        path = self.hostile_text("long" * 100, more=10)
        for width in (50, 60):  # names are not cut
            lines = ESCAPE.sub("", self.on_terminal("tree", path, "--all", width=width)).split("\r\n")
            self.assertGreater(len(lines), 10)
            self.assertEqual(max(map(len, lines)), width)
        self.assertGreater(max(map(len, tav("tree", path).out.split("\n"))), 60)

    def test_a_tree_on_a_terminal_is_folded(self):
        path = self.folder / "many.tav"
        number = struct.pack("<QIHH", 8, 0, 57, 60111) + bytes(8)
        path.write_bytes(struct.pack("<QIHH", len(number) * 1000, 0, 2, 60100) + number * 1000)
        lines = self.on_terminal("tree", path, "--color", "never").rstrip().split("\r\n")
        self.assertEqual((len(lines), lines[-1].split(None, 1)[1]), (5, "\u2026 997 more like this"))
        self.assertEqual(len(self.on_terminal("tree", path, "--all").rstrip().split("\r\n")), 1001)

    def test_a_tree_is_coloured_unless_the_user_wants_none(self):
        path = self.snapshot()
        self.assertRegex(self.on_terminal("tree", path), ESCAPE)
        for text in (self.on_terminal("tree", path, NO_COLOR="1"), self.on_terminal("tree", path, "--color", "never"),
                     tav("tree", path).out):
            self.assertNotRegex(text, ESCAPE)
        self.assertRegex(self.on_terminal("tree", path, NO_COLOR=""), ESCAPE)

    def test_nothing_is_coloured_on_a_terminal_that_knows_no_colours(self):
        path = self.snapshot()
        self.assertNotRegex(self.on_terminal("tree", path, TERM="dumb"), ESCAPE)
        self.assertRegex(self.on_terminal("tree", path, "--color", "always", TERM="dumb"), ESCAPE)

    def many(self, count=100):
        path = self.folder / "many.tav"
        number = struct.pack("<QIHH", 8, 0, 57, 60111) + bytes(8)
        path.write_bytes(struct.pack("<QIHH", len(number) * count, 0, 2, 60100) + number * count)
        return path

    def test_a_tree_goes_through_the_pager_that_the_user_wants(self):
        path = self.many()
        plain = self.on_terminal("tree", path, "--all", "--color", "never").splitlines()
        self.assertEqual(len(plain), 101)
        paged = self.on_terminal("tree", path, "--all", "--color", "never", PAGER="sed s/^/paged:/ && echo end").splitlines()
        self.assertEqual(paged, ["paged:" + line for line in plain] + ["end"])
        self.assertRegex(self.on_terminal("tree", path, PAGER="sed s/^/paged:/"), "paged:" + ESCAPE.pattern)
        for words, more in ((("--no-pager",), {"PAGER": "echo paged:"}), ((), {"PAGER": "cat"}), ((), {"PAGER": ""}),
                            ((), {"PAGER": "echo paged:", "TERM": "dumb"}),
                            ((), {"PAGER": "echo paged:", "terminal": ("stderr",)})):
            self.assertNotIn("paged:", self.on_terminal("tree", path, *words, **more))
        self.assertNotIn("paged:", tav("tree", path, env={**os.environ, "PAGER": "echo paged:", "TERM": "xterm"}).out)

    def test_what_was_passed_over_is_told_behind_the_pager(self):
        path = self.many()
        with path.open("ab") as file:
            file.write(b"\xee" * 40)
        lines = self.on_terminal("tree", path, "--all", "--color", "never", status=1,
                                 PAGER="sed s/^/paged:/ && sleep 0.3 && echo end").splitlines()
        self.assertEqual(lines[-2], "end")
        self.assertIn("passed over 40 bytes", lines[-1])

    def test_a_pager_that_ends_early_ends_the_tree(self):
        path = self.many(200_000)
        shown = self.on_terminal("tree", path, "--all", "--color", "never", status=0, PAGER="head -n 2")
        self.assertEqual(len(shown.splitlines()), 2)

    @unittest.skipUnless(shutil.which("less"), "less is not installed")
    def test_less_is_the_pager_and_ends_by_itself_where_all_fits(self):
        path = self.many()
        unset = {key: value for key, value in os.environ.items() if key not in ("PAGER", "LESS")}
        for words, key in (((), b""), (("--all",), b"q")):
            ours, theirs = pty.openpty()
            fcntl.ioctl(theirs, termios.TIOCSWINSZ, struct.pack("HHHH", 24, 80, 0, 0))
            run = subprocess.Popen([*TAV, "tree", str(path), *words], stdin=theirs, stdout=theirs, stderr=theirs,
                                   start_new_session=True, env={**unset, "TERM": "xterm"},
                                   preexec_fn=lambda: fcntl.ioctl(0, termios.TIOCSCTTY, 0))
            os.close(theirs)
            self.addCleanup(os.close, ours)
            self.addCleanup(self.end, run)
            if key:
                self.assertIn("cpuOnline", self.read(ours, until="cpuOnline(.|\n)*:"))
                self.assertIsNone(run.poll())
                os.write(ours, key)
            self.read(ours)
            self.assertEqual(run.wait(timeout=PATIENCE), 0)

    def hostile_text(self, text, more=0):
        """A stream with a text, and more numbers behind it."""
        path = self.folder / "hostile.tav"
        payload = struct.pack("<H", 1208) + text.encode()
        node = struct.pack("<QIHH", len(payload), 0, 102, 60103) + payload
        node += (struct.pack("<QIHH", 8, 0, 57, 60111) + bytes(8)) * more
        path.write_bytes(struct.pack("<QIHH", len(node), 0, 2, 60100) + node)
        return path

    def test_no_text_of_a_stream_steers_the_terminal(self):
        steering = "\x1b]0;owned\x07\x7f\x9b31m\r\n\t" + "".join(map(chr, [*range(0x202A, 0x202F), *range(0x2066, 0x206A)]))
        harmless = "\"\u00e9\u2029\u202f\u2065\u206a\U0001f600\\"
        path = self.hostile_text(steering + harmless)
        for arguments in (["get", path, "/system/hostName"], ["get", path, "--paths", "/system/hostName"],
                          ["get", path, "--json", "/system/hostName"], ["tree", path, "--color", "never", "--width", "0"]):
            with self.subTest(arguments=arguments):
                shown = self.on_terminal(*arguments).replace("\r\n", "\n")
                self.assertEqual([c for c in shown if c in steering and not c.isprintable() and c not in "\n\t"], [])
                self.assertIn("owned", shown)
        self.assertEqual(self.on_terminal("get", path, "/system/hostName"),
                         "\\x1b]0;owned\\a\\x7f\\xc2\\x9b31m\\r\\n\\t" +
                         "".join(f"\\xe2\\x80\\x{byte:02x}" for byte in range(0xAA, 0xAF)) +
                         "".join(f"\\xe2\\x81\\x{byte:02x}" for byte in range(0xA6, 0xAA)) + harmless + "\r\n")

    def test_a_long_text_does_not_steer_the_terminal_either(self):
        path = self.hostile_text("\u00e9\x1b" * 400000)
        shown = self.on_terminal("get", path, "/system/hostName", terminal=("stdout",))
        self.assertNotIn("\x1b", shown)
        self.assertEqual(shown.count("\u00e9\\x1b"), 400000)

    def test_texts_stay_exact_where_no_terminal_is(self):
        text = "\x1b]0;owned\x07\u202e\u2066"
        path = self.hostile_text(text)
        self.assertEqual(tav("get", path, "/system/hostName").out, text + "\n")
        self.assertEqual(json.loads(tav("get", path, "--json", "/system/hostName").out)["value"], text)

    def test_raw_bytes_do_not_go_to_a_terminal(self):
        path = self.hostile_text("\x1b")
        self.assertNotIn("\x1b", self.on_terminal("get", path, "--raw", "/system/hostName", status=2))

    def test_a_difference_is_coloured_unless_the_user_wants_none(self):
        one, other = self.snapshot(), self.folder / "other.tav"
        made = bytearray(one.read_bytes())
        made[-1] ^= 1
        other.write_bytes(made)
        self.assertRegex(self.on_terminal("diff", one, other), ESCAPE)
        self.assertNotRegex(self.on_terminal("diff", one, other, NO_COLOR="1"), ESCAPE)
        self.assertNotRegex(tav("diff", one, other).out, ESCAPE)

    def test_help_fits_the_terminal(self):
        for arguments in (["--help"], *([name, "--help"] for name in ("tree", "recover", "check", "json"))):
            lines = self.on_terminal(*arguments).rstrip().split("\r\n")
            self.assertLessEqual(max(map(len, lines)), 120)
        self.assertLessEqual(len(self.on_terminal("--help").rstrip().split("\r\n")), 24)

    def test_a_stream_of_bytes_does_not_go_to_a_terminal(self):
        self.assertIn("-o", self.on_terminal("snapshot", status=2))


class Progress(TerminalTest):
    def test_long_work_shows_rate_and_remaining_time_on_standard_error(self):
        run, ours = self.start("recover", self.long_stream(), "-o", "/dev/null", "--force", "--byte-order", "little",
                               "--root", "64", "--no-align", terminal=("stderr",))
        text = self.read(ours, until=r"s left")
        self.assertRegex(text, r"recover: [\d.]+ \w+ of 16(\.0)? GiB \(\d+ %\), [\d.]+ \w+/s, \d+ s left")
        run.send_signal(signal.SIGINT)
        self.assertEqual(run.wait(timeout=PATIENCE), -signal.SIGINT)

    def test_it_is_shown_inside_one_long_payload(self):
        path = self.long_stream()
        form = ("--byte-order", "little", "--root", "64", "--no-align")
        for command in (["xml", path], ["get", path, "/**", "--raw", "--all"]): # json and hex pass over holes
            with self.subTest(command[0]):
                run, ours = self.start(*command, *form, terminal=("stderr",), other=os.devnull)
                self.assertRegex(self.read(ours, until=r"s left"), command[0] + r": [\d.]+ \w+ of 16(\.0)? GiB")
                run.send_signal(signal.SIGINT)
                self.assertEqual(run.wait(timeout=PATIENCE), -signal.SIGINT)

    def test_nothing_is_shown_when_standard_error_is_no_terminal(self):
        path = self.long_stream()
        run, ours = self.start("recover", path, "-o", "/dev/null", "--force", "--byte-order", "little", "--root", "64",
                               "--no-align", terminal=("stdout",))
        self.assertEqual(self.read(ours, until="s left", seconds=1.5), "")
        self.assertEqual((self.folder / "elsewhere").read_bytes(), b"")
        run.send_signal(signal.SIGINT)
        self.assertEqual(run.wait(timeout=PATIENCE), -signal.SIGINT)

    def test_nothing_is_shown_when_the_work_is_short(self):
        path = self.snapshot()
        for _ in range(100):
            begin = time.monotonic()
            run, ours = self.start("check", path)
            text = self.read(ours)
            if time.monotonic() - begin < PROGRESS_BEGINS:
                self.assertEqual(run.wait(timeout=PATIENCE), 0)
                self.assertNotIn("left", text)
                return
        self.skipTest("this machine has no short work")


class Interrupt(TerminalTest):
    def test_an_interrupt_leaves_neither_half_a_file_nor_a_temporary_one(self):
        path = self.long_stream()
        for command, number in (("recover", signal.SIGINT), ("recover", signal.SIGTERM), ("xml", signal.SIGINT),
                                ("xml", signal.SIGTERM)):
            with self.subTest(command=command, signal=number.name):
                target = self.folder / "target"
                target.mkdir()
                run, _ = self.start(command, path, "-o", target / "saved", "--byte-order", "little", "--root", "64",
                                    "--no-align")
                until(lambda: list(target.iterdir()))
                begun = [entry.name for entry in target.iterdir()]
                run.send_signal(number)
                self.assertEqual(run.wait(timeout=PATIENCE), -number)
                self.assertEqual((len(begun), "saved" in begun), (1, False))
                self.assertEqual(list(target.iterdir()), [])
                target.rmdir()

    def test_an_interrupt_keeps_the_file_that_was_to_be_replaced(self):
        path, target = self.long_stream(), self.folder / "target"
        target.mkdir()
        (target / "saved").write_bytes(b"precious")
        run, _ = self.start("recover", path, "-o", target / "saved", "--force", "--byte-order", "little", "--root", "64",
                            "--no-align")
        self.assertTrue(until(lambda: len(list(target.iterdir())) == 2))
        run.send_signal(signal.SIGINT)
        self.assertEqual(run.wait(timeout=PATIENCE), -signal.SIGINT)
        self.assertEqual([(entry.name, entry.read_bytes()) for entry in target.iterdir()], [("saved", b"precious")])


@unittest.skipIf(EMULATOR, "the shells start the program themselves")
class Completion(TerminalTest):
    """The shells complete by themselves: bash by its function, zsh on a terminal, fish by its own command."""

    def script(self, shell):
        path = self.folder / ("_tav" if shell == "zsh" else f"tav.{shell}")
        path.write_text(tav("completion", shell).out)
        return path

    @unittest.skipUnless(shutil.which("bash"), "bash is not installed")
    def test_bash_offers_commands_options_and_choices(self):
        script = self.script("bash")
        for line, wanted in ((["tav", "sn"], ["snapshot"]), (["tav", "tree", "--dep"], ["--depth"]),
                             (["tav", "tree", "--byte-order", "sw"], ["swapped"]),
                             (["tav", "tree", "--byte-order", "=", "sw"], ["swapped"])):
            words = " ".join(f"'{word}'" for word in line)
            done = subprocess.run(["bash", "-c", f". '{script}'; COMP_WORDS=({words}); COMP_CWORD={len(line) - 1}; _tav; "
                                                 "printf '%s\\n' \"${COMPREPLY[@]}\""], capture_output=True, timeout=PATIENCE)
            self.assertEqual((done.stdout.decode().split(), done.stderr), (wanted, b""))

    @unittest.skipUnless(shutil.which("fish"), "fish is not installed")
    def test_fish_offers_commands_options_and_choices(self):
        script = self.script("fish")
        for line, wanted in (("tav sn", "snapshot"), ("tav tree --dep", "--depth"), ("tav tree --byte-order sw", "swapped")):
            done = subprocess.run(["fish", "--no-config", "-c", f"source '{script}'; complete -C '{line}'"],
                                  capture_output=True, timeout=PATIENCE, env={**os.environ, "HOME": str(self.folder)})
            offered = [row.split("\t")[0] for row in done.stdout.decode().splitlines()]
            self.assertEqual((offered, done.stderr), ([wanted], b""))

    @unittest.skipUnless(shutil.which("zsh") and pty is not None, "zsh is not installed")
    def test_zsh_offers_commands_options_and_choices(self):
        self.script("zsh")
        for line, wanted in (("tav sna", "tav snapshot "), ("tav tree --dep", "tav tree --depth "),
                             ("tav tree --byte-order sw", "tav tree --byte-order swapped ")):
            self.assertEqual(self.completed_by_zsh(line), wanted)

    def paths_stream(self):
        """A stream with steps to offer, and a folder in which it is called x.tav."""
        document = {"system": {"host": [{"hostName": "ada"}, {"cpu": {"cpuOnline": 8}}], "#40001": 7, "#40002": 8}}
        path = self.folder / "x.tav"
        self.assertEqual(tav("build", "-o", path, stdin=json.dumps(document).encode()).status, 0)
        (self.folder / "x.tav.names.json").write_text('{"40001": {"tag": "queueDepth"}}')
        return path

    @unittest.skipUnless(shutil.which("bash"), "bash is not installed")
    def test_bash_offers_the_steps_of_a_path(self):
        script, path = self.script("bash"), self.paths_stream()
        for line, wanted in ((["get", path, "/sys"], ["/system"]),
                             (["get", path, "/system/"], ["/system/host", "/system/queueDepth", "/system/#40002"]),
                             (["get", f"'{path}'", "'/system/ho"], ["/system/host"]),
                             (["get", "--all", path, "/system/host/"], ["/system/host/hostName", "/system/host/cpu"]),
                             (["hex", path, "--path", "//cpuO"], ["//cpuOnline"]), (["get", path, "/system/x"], []),
                             # bash makes three words of one with a sign of equality
                             (["hex", path, "--path", "=", "//cpuO"], ["//cpuOnline"]),
                             (["table", path, "--each", "=", "/system/ho"], ["/system/host"]),
                             (["table", path, "--each", "="], ["/system"]),
                             (["table", path, "--each", "=", "/system", "--col", "n", "=", "host/ho"], ["host/hostName"]),
                             (["table", path, "--each", "/system", "--col", "=", "n", "=", "host/ho"], ["host/hostName"]),
                             (["table", path, "--each", "/system", "--col", "'n=host/ho'"], ["n=host/hostName"]),
                             (["get", path, self.folder / "x.t"], []), (["get", self.folder / "x.tav.n"], [path.name + ".names.json"])):
            words = " ".join(f'"{word}"' for word in [TAV[0], *line])
            done = subprocess.run(["bash", "-c", f". '{script}'; COMP_WORDS=({words}); COMP_CWORD={len(line)}; _tav; "
                                                 "printf '%s\\n' \"${COMPREPLY[@]}\""], capture_output=True, timeout=PATIENCE)
            offered = [os.path.basename(word) if word.startswith(str(self.folder)) else word
                       for word in done.stdout.decode().split()]
            self.assertEqual((offered, done.stderr), (wanted, b""), line)

    @unittest.skipUnless(shutil.which("fish"), "fish is not installed")
    def test_fish_offers_the_steps_of_a_path(self):
        script, path = self.script("fish"), self.paths_stream()
        for line, wanted in (("get x.tav /sys", ["/system"]), ("set x.tav /system/queueDepth 9 /system/q", ["/system/queueDepth"]),
                             ("get x.tav /system/host/", ["/system/host/hostName", "/system/host/cpu"]),
                             ("diff x.tav --path-a /system/h", ["/system/host"])):
            done = subprocess.run(["fish", "--no-config", "-c", f"source '{script}'; complete -C 'tav {line}'"],
                                  capture_output=True, timeout=PATIENCE, cwd=self.folder,
                                  env={**os.environ, "HOME": str(self.folder), "PATH": self.path_of_program()})
            offered = [row.split("\t")[0] for row in done.stdout.decode().splitlines()]
            self.assertEqual((sorted(offered), done.stderr), (sorted(wanted), b""), line)

    @unittest.skipUnless(shutil.which("zsh") and pty is not None, "zsh is not installed")
    def test_zsh_offers_the_steps_of_a_path(self):
        self.script("zsh")
        path = self.paths_stream()
        for line, wanted in ((f"get {path} /sys", "/system"), (f"get {path} /system/q", "/system/queueDepth"),
                             (f"hex {path} --path //cpuO", "//cpuOnline")):
            self.assertEqual(self.completed_by_zsh(f"tav {line}"), f"tav {line[:line.rindex(' ')]} {wanted}")

    def test_completion_tells_nothing_and_waits_for_nothing(self):
        path = self.paths_stream()
        offered = tav("complete-words", "fish", "get", path, "/system/")
        self.assertEqual((offered.status, offered.err), (0, ""))
        self.assertEqual(offered.out.split(), ["/system/host", "/system/queueDepth", "/system/#40002"])
        for line, status in ((["get", path, "/sys["], 0), (["get", path, "/nothing/"], 0), (["get", path, "/sys]/"], 0),
                             (["get", "-", "/"], 0), (["get", "/dev/zero", "/"], 0), (["get", self.folder, "/"], 0),
                             (["get", "none", "/"], 0), (["get", path], 1), (["set", path, "/system", "/sys"], 1),
                             (["tree", path, "/sys"], 1), (["nothing", path, "/sys"], 1), (["get"], 1), ([], 1),
                             (["get", path, "--dictionary", "none", "/sys"], 0), (["get", path, "--no-such", "/nothing"], 0)):
            result = tav("complete-words", "fish", *line)
            self.assertEqual((result.status, result.out, result.err), (status, "", ""), line)

    @unittest.skipUnless(os.path.exists("/proc/self/io"), "nothing counts what is read here")
    def test_completion_reads_little_of_a_long_stream(self):
        status, taken = read_by("complete-words", "fish", "get", self.long_stream(), "/")
        self.assertEqual(status, 0)
        self.assertLess(taken, LONG / 100)

    def test_of_a_large_file_the_begin_is_looked_at(self):
        path = self.folder / "many.tav"
        number, last = (struct.pack("<QIHH", 8, 0, 57, element) + bytes(8) for element in (60111, 60112))
        content = number * 400_000 + last
        path.write_bytes(struct.pack("<QIHH", len(content), 0, 2, 60100) + content)
        self.assertEqual(tav("complete-words", "fish", "get", path, "/system/").out, "/system/cpuOnline\n")

    def path_of_program(self):
        """Where the shells find the program under its own name."""
        place = self.folder / "bin"
        place.mkdir(exist_ok=True)
        if not (place / "tav").exists():
            (place / "tav").symlink_to(TAV[0])
        return f"{place}:{os.environ['PATH']}"

    def completed_by_zsh(self, line):
        """The line as it is after the tab key, which the shell writes to a file."""
        answer = self.folder / "answer"
        setup = (f"fpath=('{self.folder}' $fpath); autoload -U compinit; compinit -u -D; "
                 f"show() {{ print -r -- \"$BUFFER|\" > '{answer}'; zle accept-line; BUFFER=exit }}; "
                 "zle -N show; bindkey '^X' show; PS1=ready; print started")
        (self.folder / ".zshrc").write_text(setup + "\n")
        answer.unlink(missing_ok=True)
        ours, theirs = pty.openpty()
        with subprocess.Popen(["zsh", "-i"], stdin=theirs, stdout=theirs, stderr=theirs, start_new_session=True,
                              env={**os.environ, "ZDOTDIR": str(self.folder), "HOME": str(self.folder), "TERM": "xterm",
                                   "PATH": self.path_of_program()}) as run:
            os.close(theirs)
            try:
                self.read(ours, until="started(.|\n)*ready")  # what is typed before may be thrown away
                os.write(ours, (line + "\t\x18").encode())
                until(lambda: self.drain(ours) or (answer.exists() and answer.read_text().endswith("|\n")))
            finally:
                run.kill()
                os.close(ours)
        return answer.read_text().rstrip("\n").rstrip("|")

    def drain(self, ours):
        ready, _, _ = select.select([ours], [], [], 0)
        if ready:
            try:
                os.read(ours, 65536)
            except OSError:
                pass


if __name__ == "__main__":
    unittest.main()
