"""Where an output appears: mode and owner of the file that it replaces, links, devices, pipes and open files, long names, and
what a signal or a power loss leaves."""
import os
import pathlib
import signal
import stat
import subprocess
import unittest

from support import EMULATOR, PATIENCE, TAV, WINDOWS, ToolTest, running, tav, until

try:
    import pty
    import resource
except ImportError:
    pty = None

CALLS = os.environ.get("TAV_CALLS_LIBRARY", "")
# Commands that write files, each with an option that names the file. {} is the stream that is read.
WRITERS = (("json", "{}", "-o"), ("xml", "{}", "-o"), ("snapshot", "-o"), ("recover", "{}", "-o"),
           ("recover", "{}", "-o", "/dev/null", "--report"))


@unittest.skipIf(WINDOWS, "files have other rights there")
class PlaceTest(ToolTest):
    def setUp(self):
        super().setUp()
        self.path = self.snapshot()
        self.target = self.folder / "target"
        self.target.mkdir()
        self.out = self.target / "out"
        previous = os.umask(0o022)
        self.addCleanup(os.umask, previous)

    def mode(self, path=None):
        return stat.S_IMODE((path or self.out).stat().st_mode)

    def write(self, writer, *more, to=None, **how):
        return tav(*[str(word).format(self.path) for word in writer], to or self.out, *more, **how)

    def written(self, writer, *more, **how):
        result = self.write(writer, *more, **how)
        self.assertIn(result.status, (0, 1), result.err)
        return result

    def waiting(self, *words, **how):
        """A writer that has opened its output and waits for its input."""
        run = subprocess.Popen([*TAV, *map(str, words)], stdin=subprocess.PIPE, stdout=subprocess.PIPE,
                               stderr=subprocess.PIPE, **how)
        self.addCleanup(run.wait)
        self.addCleanup(run.kill)
        for stream in (run.stdin, run.stdout, run.stderr):
            self.addCleanup(stream.close)
        return run

    def beside(self):
        return [entry for entry in self.target.iterdir() if entry != self.out]


class Rights(PlaceTest):
    def test_a_file_that_is_replaced_keeps_its_mode(self):
        for writer in WRITERS:
            for mode in (0o600, 0o400, 0o644, 0o664, 0o755, 0o660, 0o000, 0o2750):
                with self.subTest(writer=writer, mode=oct(mode)):
                    self.out.unlink(missing_ok=True)
                    self.out.write_bytes(b"old")
                    self.out.chmod(mode)
                    self.written(writer, "--force")
                    self.assertEqual(self.mode(), mode)
                    self.out.chmod(0o600)
                    self.assertNotIn(self.out.read_bytes(), (b"", b"old"))

    def test_a_new_file_has_the_mode_of_new_files(self):
        for mask in (0o022, 0o077, 0o000):
            os.umask(mask)
            for force in ((), ("--force",)):
                self.written(WRITERS[0], *force)
                self.assertEqual(self.mode(), 0o666 & ~mask)
                self.out.unlink()

    @unittest.skipIf(EMULATOR, "an emulator starts too slowly")
    def test_a_secret_file_is_secret_at_every_moment(self):
        for exists in (True, False):
            self.out.unlink(missing_ok=True)
            if exists:
                self.out.write_bytes(b"old")
                self.out.chmod(0o600)
            run = self.waiting("json", "-", "-o", self.out, "--force")
            self.assertTrue(until(self.beside))
            temporary, = self.beside()
            self.assertEqual(self.mode(temporary), 0o600)
            self.assertEqual(self.out.exists() and self.out.read_bytes(), b"old" if exists else False)
            run.stdin.write(self.path.read_bytes())
            run.stdin.close()
            self.assertEqual(run.wait(timeout=PATIENCE), 0)
            self.assertEqual((self.mode(), self.beside()), (0o600 if exists else 0o644, []))

    @unittest.skipUnless(hasattr(os, "geteuid") and os.geteuid() == 0, "only root gives files away")
    def test_a_file_that_is_replaced_keeps_its_owner(self):
        for writer in WRITERS:
            for mode in (0o640, 0o4755):
                self.out.write_bytes(b"old")
                os.chown(self.out, 12345, 23456)
                self.out.chmod(mode)
                self.written(writer, "--force")
                found = self.out.stat()
                self.assertEqual((found.st_uid, found.st_gid, self.mode()), (12345, 23456, mode))

    @unittest.skipUnless(hasattr(os, "geteuid") and os.geteuid() == 0, "only root becomes somebody else")
    @unittest.skipIf(EMULATOR, "an emulator has its own idea of users")
    def test_who_cannot_give_a_file_away_lets_nobody_new_read_it(self):
        for folder in (self.folder, self.target):
            folder.chmod(0o777)
        self.path.chmod(0o644)
        for mode, wanted in ((0o600, 0o600), (0o660, 0o600), (0o664, 0o644), (0o4755, 0o755)):
            self.out.unlink(missing_ok=True)
            self.out.write_bytes(b"old")
            os.chown(self.out, 12345, 23456)
            self.out.chmod(mode)
            try:
                self.written(WRITERS[0], "--force", user=23, group=24, extra_groups=())
            except PermissionError:
                self.skipTest("the program is where others cannot start it")
            found = self.out.stat()
            self.assertEqual((found.st_uid, found.st_gid, oct(self.mode())), (23, 24, oct(wanted)))


class Links(PlaceTest):
    def test_the_file_behind_a_symbolic_link_is_replaced(self):
        real = self.folder / "real"
        (self.folder / "again").symlink_to("real")
        for writer in WRITERS:
            for link in (real, "../real", "../again"):
                with self.subTest(writer=writer, link=link):
                    real.write_bytes(b"old")
                    self.out.unlink(missing_ok=True)
                    self.out.symlink_to(link)
                    said = self.write(writer)
                    self.assertEqual((said.status, real.read_bytes()), (2, b"old"))
                    self.assertIn("KOR_RC_FILE_EXISTS", said.err)
                    self.written(writer, "--force")
                    self.assertTrue(self.out.is_symlink() and (self.folder / "again").is_symlink())
                    self.assertNotIn(real.read_bytes(), (b"", b"old"))
                    self.assertEqual(self.beside(), [])

    def test_a_link_that_leads_nowhere_yet_makes_the_file_there(self):
        real = self.folder / "real"
        for force in ((), ("--force",)):
            self.out.unlink(missing_ok=True)
            self.out.symlink_to("../real")
            self.written(WRITERS[0], *force)
            self.assertTrue(self.out.is_symlink())
            self.assertEqual(real.read_bytes(), tav("json", self.path).raw)
            real.unlink()

    def test_links_that_lead_to_each_other_stay_and_are_told(self):
        self.out.symlink_to("other")
        (self.target / "other").symlink_to("out")
        for force in ((), ("--force",)):
            said = self.write(WRITERS[0], *force)
            self.assertEqual(said.status, 2)
            self.assertIn("KOR_RC_BAD_NAME", said.err)
        self.assertTrue(self.out.is_symlink())


class OtherThanFiles(PlaceTest):
    """Each of them is still there afterwards, and has got the bytes."""

    @unittest.skipIf(EMULATOR, "an emulator has its own idea of standard output")
    def test_names_of_standard_output_are_standard_output(self):
        expected = tav("json", self.path).raw
        (self.folder / "stdout").symlink_to("/proc/self/fd/1")  # as /dev/stdout is one, which must survive a failure
        for name in (self.folder / "stdout", "/dev/fd/1", "/proc/self/fd/1", "/proc/thread-self/fd/1"):
            if not os.path.exists(name):
                continue
            for force in ((), ("--force",)):
                with self.subTest(name=name, force=force):
                    before = os.lstat(name).st_mode
                    through_pipe = tav("json", self.path, "-o", name, *force)
                    self.assertEqual((through_pipe.status, through_pipe.raw), (0, expected))
                    # Into a file, behind what others have written there.
                    with self.out.open("wb") as file:
                        file.write(b"before ")
                        file.flush()
                        done = subprocess.run([*TAV, "json", str(self.path), "-o", name, *force], stdout=file, timeout=PATIENCE)
                        file.write(b" behind")
                    self.assertEqual((done.returncode, self.out.read_bytes()), (0, b"before " + expected + b" behind"))
                    self.assertEqual((os.lstat(name).st_mode, self.beside()), (before, []))

    @unittest.skipIf(EMULATOR, "an emulator has its own idea of open files")
    def test_names_of_other_open_files_are_those_files(self):
        if not os.path.exists("/proc/self/fd"):
            self.skipTest("open files have no names here")
        for writer in (*WRITERS, ("tree", "{}", "--trace")):
            self.out.write_bytes(b"")
            with self.out.open("r+b") as file:
                file.write(b"before ")
                file.flush()
                inode = self.out.stat().st_ino
                self.written(writer, "--force" if writer[0] == "tree" else "--stats" if writer[0] not in ("snapshot",) else
                             "--eye-size", to=f"/proc/self/fd/{file.fileno()}", pass_fds=(file.fileno(),))
                self.assertEqual(self.out.stat().st_ino, inode)
            self.assertTrue(self.out.read_bytes().startswith(b"before "))
            self.assertGreater(self.out.stat().st_size, 100)
            self.assertEqual(self.beside(), [])

    @unittest.skipIf(EMULATOR, "an emulator has its own idea of open files")
    def test_open_files_of_other_processes_are_written_to(self):
        if not os.path.exists("/proc/self/fd"):
            self.skipTest("open files have no names here")
        self.out.write_bytes(b"old" * 10000)
        with self.out.open("r+b") as file:
            inode = self.out.stat().st_ino
            name = f"/proc/{os.getpid()}/fd/{file.fileno()}"
            self.assertEqual(self.write(WRITERS[0], to=name).status, 2)
            self.written(WRITERS[0], "--force", to=name)
        self.assertEqual((self.out.stat().st_ino, self.out.read_bytes()), (inode, tav("json", self.path).raw))

    def test_a_pipe_with_a_name_is_written_to(self):
        os.mkfifo(self.out)
        link = self.folder / "link"
        link.symlink_to(self.out)
        for name in (self.out, link):
            for force in ((), ("--force",)):
                with running(["cat", str(self.out)], stdout=subprocess.PIPE) as reader:
                    self.written(WRITERS[0], *force, to=name)
                    self.assertEqual(reader.communicate(timeout=PATIENCE)[0], tav("json", self.path).raw)
                self.assertTrue(stat.S_ISFIFO(self.out.lstat().st_mode) and link.is_symlink())
                self.assertEqual(self.beside(), [])

    @unittest.skipIf(pty is None or EMULATOR, "there are no pseudo-terminals")
    def test_a_terminal_is_written_to(self):
        ours, theirs = pty.openpty()
        self.addCleanup(os.close, ours)
        self.addCleanup(os.close, theirs)
        name = os.ttyname(theirs)
        for force in ((), ("--force",)):
            self.written(("recover", "{}", "-o", "/dev/null", "--report"), *force, to=name)
            self.assertIn(b"kept", os.read(ours, 65536))
            self.assertTrue(stat.S_ISCHR(os.lstat(name).st_mode))

    @unittest.skipUnless(hasattr(os, "geteuid") and os.geteuid() == 0, "only root makes devices")
    def test_a_device_of_root_is_written_to(self):
        try:
            os.mknod(self.out, stat.S_IFCHR | 0o666, os.makedev(1, 3))  # as /dev/null
            self.out.open("wb").close()
        except OSError:
            self.skipTest("devices are not allowed here")
        for writer in WRITERS:
            for force in ((), ("--force",)):
                self.written(writer, *force)
                self.assertTrue(stat.S_ISCHR(self.out.lstat().st_mode))
                self.assertEqual(self.beside(), [])


class Names(PlaceTest):
    def test_names_as_long_as_the_system_allows_work(self):
        for letter in ("x", "\u00fc", "\u6587"):
            name = letter * (255 // len(letter.encode()))
            for length in (len(name), len(name) - 1, 250 // len(letter.encode()), 100, 34):
                for _ in range(2):
                    self.written(WRITERS[0], "--force", to=self.target / name[:length])
                self.assertEqual([entry.name for entry in self.target.iterdir()], [name[:length]])
                (self.target / name[:length]).unlink()

    def test_a_name_that_is_too_long_is_told(self):
        said = self.write(WRITERS[0], to=self.target / ("x" * 256))
        self.assertEqual(said.status, 2)
        self.assertIn("KOR_RC_BAD_NAME", said.err)
        self.assertEqual(list(self.target.iterdir()), [])


@unittest.skipIf(EMULATOR, "an emulator starts too slowly")
class Signals(PlaceTest):
    def setUp(self):
        super().setUp()
        limits = resource.getrlimit(resource.RLIMIT_CORE)
        resource.setrlimit(resource.RLIMIT_CORE, (0, limits[1]))  # SIGQUIT asks for a picture of the memory
        self.addCleanup(resource.setrlimit, resource.RLIMIT_CORE, limits)

    def test_a_signal_leaves_the_old_file_and_nothing_else(self):
        for number in (signal.SIGINT, signal.SIGTERM, signal.SIGHUP, signal.SIGQUIT):
            for old in (None, b"old"):
                with self.subTest(number=number, old=old):
                    self.out.unlink(missing_ok=True)
                    if old:
                        self.out.write_bytes(old)
                    run = self.waiting("json", "-", "-o", self.out, "--force", cwd=self.folder)
                    self.assertTrue(until(self.beside))
                    run.send_signal(number)
                    self.assertEqual(run.wait(timeout=PATIENCE), -number)
                    self.assertEqual(self.beside(), [])
                    self.assertEqual(self.out.exists() and self.out.read_bytes(), old or False)


@unittest.skipUnless(CALLS, "calls are not written down here")
class PowerLoss(PlaceTest):
    def calls(self, *words, old):
        log = self.folder / "calls"
        log.unlink(missing_ok=True)
        self.out.unlink(missing_ok=True)
        if old:
            self.out.write_bytes(b"old")
            self.out.chmod(0o600)
        result = tav(*words, env={**os.environ, "LD_PRELOAD": CALLS, "TAV_CALLS": str(log)})
        self.assertIn(result.status, (0, 1), result.err)
        return log.read_text().splitlines() if log.exists() else []

    def test_bytes_are_on_the_disk_before_the_name_and_the_name_at_the_end(self):
        for writer in (*WRITERS, ("build", "document", "-o")):
            (self.folder / "document").write_bytes(tav("json", self.path).raw)
            words = [str(self.folder / word) if word == "document" else word.format(self.path) for word in writer]
            for old in (False, True):
                with self.subTest(writer=writer, old=old):
                    calls = [line for line in self.calls(*words, self.out, "--force", old=old) if str(self.target) in line]
                    opened, mode, synced, named, folder = [line for line in calls if not line.startswith("owner")]
                    temporary = opened.split()[2]
                    self.assertEqual(opened, f"open 0600 {temporary}")
                    self.assertEqual(mode, f"mode {'0600' if old else '0644'} {temporary}")
                    self.assertEqual(synced, f"sync {temporary}")
                    self.assertEqual(named, f"rename {temporary} {self.out}")
                    self.assertEqual(folder, f"sync {self.target}")
                    self.assertEqual(pathlib.Path(temporary).parent, self.target)

    def test_a_name_that_is_given_without_force_is_on_the_disk_at_the_end(self):
        calls = [line for line in self.calls("json", self.path, "-o", self.out, old=False) if str(self.target) in line]
        self.assertEqual([line.split()[0] for line in calls], ["open", "mode", "sync", "link", "unlink", "sync"])
        self.assertEqual(calls[-1], f"sync {self.target}")

    def test_what_is_no_file_is_not_synced(self):
        log = self.calls("json", self.path, "-o", "/dev/null", old=False)
        self.assertEqual([line for line in log if line.split()[0] != "open"], [])


if __name__ == "__main__":
    unittest.main()
