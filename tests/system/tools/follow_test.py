"""--follow: what is written is printed as it comes, over files that take the place, until an interrupt."""
import os
import queue
import signal
import struct
import subprocess
import threading
import unittest

from support import PATIENCE, TAV, WINDOWS, ToolTest, running, tav, until

OPEN = 2**64 - 1
CPU_ONLINE, HOST, HOST_NAME, SYSTEM = 60111, 60102, 60103, 60100


def header(size, kind, elm):
    return struct.pack("<QIHH", size, 0, kind, elm)


def number(value):
    return header(4, 55, CPU_ONLINE) + struct.pack("<I", value)


def name(text):
    return header(len(text), 50, HOST_NAME) + text.encode()


def group(elm, *children, size=None):
    content = b"".join(children)
    return header(len(content) if size is None else size, 2, elm) + content


class Following:
    """A process that follows, and the lines that it has printed."""

    def __init__(self, *words):
        self.process = subprocess.Popen([*TAV, *map(str, words)], stdout=subprocess.PIPE, stderr=subprocess.PIPE,
                                        text=True, bufsize=1)
        self.lines, self.notes = queue.Queue(), queue.Queue()
        self.threads = [threading.Thread(target=self.read, args=pair, daemon=True)
                        for pair in ((self.process.stdout, self.lines), (self.process.stderr, self.notes))]
        for thread in self.threads:
            thread.start()

    @staticmethod
    def read(stream, to):
        for line in stream:
            to.put(line.rstrip("\n"))
        to.put(None)

    def next(self, lines):
        """The next line; an error where the process has ended without one."""
        line = lines.get(timeout=PATIENCE)
        if line is None:
            raise AssertionError(f"ended with status {self.process.wait()}: {list(self.notes.queue)}")
        return line

    def take(self, count=1):
        return [self.next(self.lines) for _ in range(count)]

    def note(self):
        return self.next(self.notes)

    def end(self, number=signal.SIGINT):
        """Interrupts it; the status, and the lines that nobody has taken."""
        self.process.send_signal(number)
        status = self.process.wait(timeout=PATIENCE)
        for thread in self.threads:
            thread.join()
        for stream in (self.process.stdout, self.process.stderr):
            stream.close()
        return status, *([line for line in lines.queue if line is not None] for lines in (self.lines, self.notes))


@unittest.skipIf(WINDOWS, "signals of other processes")
class Follow(ToolTest):
    def setUp(self):
        super().setUp()
        self.path = self.folder / "x.tav"
        self.running = []
        self.addCleanup(lambda: [one.process.kill() or one.process.wait() for one in self.running
                                 if one.process.poll() is None])

    def follow(self, command, *words):
        self.running.append(Following(command, self.path, *words, "--follow"))
        return self.running[-1]

    def append(self, *parts, path=None):
        with (path or self.path).open("ab") as file:
            file.write(b"".join(parts))

    def assert_quiet_end(self, following, status=0):
        self.assertEqual(following.end(), (status, [], []))

    def test_values_come_while_another_process_writes(self):
        self.append(group(SYSTEM, number(0)))
        self.path.unlink()
        with running([*TAV, "snapshot", "--append", "--every", "20ms", "-o", str(self.path)]) as writer:
            timestamp = "get", self.path, "/system/timestamp"
            self.assertTrue(until(lambda: self.path.exists() and self.path.stat().st_size and tav(*timestamp).out))
            following = self.follow("get", "/system/timestamp")
            seen = following.take(12)
            writer.kill()
        status, rest, notes = following.end()
        self.assertEqual((status, notes), (0, []))
        all_times = tav("get", "--all", self.path, "/system/timestamp").out.split()
        self.assertEqual(seen + rest, all_times[:len(seen + rest)])
        self.assertGreaterEqual(len(all_times), 12)

    def test_children_of_a_group_that_is_open_come_at_once(self):
        self.append(group(SYSTEM, number(1), number(2), size=OPEN))
        values, tree = self.follow("get", "//cpuOnline", "--paths"), self.follow("tree", "--paths")
        self.assertEqual(values.take(2), ["/system/cpuOnline\t1", "/system/cpuOnline[2]\t2"])
        self.assertEqual([line.split()[1:] for line in tree.take(3)],
                         [["?", "/system", "group", "open"], ["4", "/system/cpuOnline", "Uint32", "1"],
                          ["4", "/system/cpuOnline[2]", "Uint32", "2"]])
        self.append(group(HOST, name("ada"), number(3)))
        self.assertEqual(values.take(), ["/system/host/cpuOnline\t3"])
        self.assertEqual([line.split()[2] for line in tree.take(3)],
                         ["/system/host", "/system/host/hostName", "/system/host/cpuOnline"])
        for following in (values, tree):
            self.assert_quiet_end(following)

    def test_the_tree_has_the_lines_of_the_tree(self):
        self.append(group(SYSTEM, group(HOST, name("ada"), number(3))), bytes(64), group(SYSTEM, number(4)))
        for options in ([], ["--depth", "1"], ["--only", "cpuOnline"], ["--paths"], ["--width", "40"]):
            with self.subTest(options=options):
                expected = [line for line in tav("tree", self.path, *options).out.splitlines() if "zeros" not in line]
                following = self.follow("tree", *options)
                self.assertEqual(following.take(len(expected)), expected)
                self.assert_quiet_end(following)

    def test_conditions_are_answered_when_the_root_is_closed(self):
        self.append(group(SYSTEM, group(HOST, name("ada"), number(3))))
        following = self.follow("get", "/system[2]/host[hostName='ada']/cpuOnline", "//host[cpuOnline > 6]/hostName",
                                "--paths")
        begin = self.path.stat().st_size
        self.append(group(SYSTEM, group(HOST, number(7), name("eve"), size=OPEN), size=OPEN))
        other = self.follow("tree")  # it does not wait for the root
        self.assertEqual(len(other.take(8)), 8)
        other.end()
        self.assertTrue(following.lines.empty())
        host = number(7) + name("eve") + number(8)
        with self.path.open("r+b") as file:
            file.seek(begin)
            file.write(group(SYSTEM, group(HOST, host), group(HOST, name("ada"), number(5))))
        self.assertEqual(following.take(2), ["/system[2]/host/hostName\teve", "/system[2]/host[2]/cpuOnline\t5"])
        self.append(group(SYSTEM, group(HOST, name("ada"), number(5))))
        self.append(group(SYSTEM, group(HOST, number(8), name("joan"))))
        self.assertEqual(following.take(), ["/system[4]/host/hostName\tjoan"])
        self.assert_quiet_end(following)

    def test_another_file_that_takes_the_place_is_followed(self):
        self.append(group(SYSTEM, number(1)))
        following = self.follow("get", "//cpuOnline", "--paths")
        self.assertEqual(following.take(), ["/system/cpuOnline\t1"])
        other = self.folder / "other.tav"
        self.path.rename(other)
        self.assertIn("there is no such file", following.note())
        self.append(group(SYSTEM, number(2)), path=other)
        self.assertEqual(following.take(), ["/system[2]/cpuOnline\t2"])
        self.append(group(SYSTEM, number(3), number(4)))
        self.assertIn("a file has appeared", following.note())
        self.assertEqual(following.take(2), ["/system/cpuOnline\t3", "/system/cpuOnline[2]\t4"])
        third = self.folder / "third.tav"
        self.append(group(SYSTEM, number(5)), path=third)
        third.replace(self.path)
        self.assertIn("another file has taken the place", following.note())
        self.assertEqual(following.take(), ["/system/cpuOnline\t5"])
        self.assert_quiet_end(following)

    def test_a_file_that_was_removed_is_read_on_until_another_one_comes(self):
        self.append(group(SYSTEM, number(1)))
        following = self.follow("get", "//cpuOnline", "--paths")
        self.assertEqual(following.take(), ["/system/cpuOnline\t1"])
        with self.path.open("ab", buffering=0) as writer:
            self.path.unlink()
            self.assertIn("there is no such file", following.note())
            writer.write(group(SYSTEM, number(2)))  # its writer knows nothing of it
            self.assertEqual(following.take(), ["/system[2]/cpuOnline\t2"])
            self.append(group(SYSTEM, number(3), number(4)))
            self.assertIn("a file has appeared", following.note())
            self.assertEqual(following.take(2), ["/system/cpuOnline\t3", "/system/cpuOnline[2]\t4"])
            writer.write(group(SYSTEM, number(5)))  # nobody reads it any more
            self.append(group(SYSTEM, number(6)))
            self.assertEqual(following.take(), ["/system[2]/cpuOnline\t6"])
        self.assert_quiet_end(following)

    def test_files_that_a_recorder_changes_are_followed_through_a_link(self):
        with running([*TAV, "snapshot", "--append", "--every", "50ms", "--rotate", "1", "-o",
                      str(self.folder / "r-%n.tav")]) as writer:
            following = None
            for count in range(1, 7):
                recorded = self.folder / f"r-{count + 1}.tav"
                self.assertTrue(until(recorded.exists))  # the one before is complete
                link = self.folder / "link"
                link.symlink_to(f"r-{count}.tav")
                link.replace(self.path)
                following = following or self.follow("get", "/system/timestamp")
                expected = tav("get", self.folder / f"r-{count}.tav", "/system/timestamp").out.split()
                self.assertEqual(following.take(), expected)
            writer.kill()
        status, rest, notes = following.end()
        self.assertEqual((status, rest), (0, []))
        self.assertEqual(len(notes), 5)
        self.assertTrue(all("another file has taken the place" in note for note in notes), notes)

    def test_a_file_that_is_made_shorter_is_begun_again(self):
        self.append(group(SYSTEM, number(1), number(2)))
        for command, told in (("get", "2"), ("tree", "cpuOnline")):
            with self.subTest(command=command):
                self.path.write_bytes(group(SYSTEM, number(1), number(2)))
                following = self.follow(command, *(["//cpuOnline"] if command == "get" else []))
                self.assertIn(told, following.take(2 if command == "get" else 3)[-1])
                os.truncate(self.path, 0)
                self.assertIn("made shorter, or begun again", following.note())
                self.append(group(HOST, number(3)))
                self.assertIn("3", following.take(1 if command == "get" else 2)[-1])
                self.assert_quiet_end(following)

    def test_a_file_that_is_not_there_is_waited_for(self):
        following = self.follow("get", "//cpuOnline")
        self.assertIn("there is no such file; waiting for one", following.note())
        self.append(group(SYSTEM, number(1), number(2)), path=self.path.with_suffix(".new"))
        self.path.with_suffix(".new").rename(self.path)  # as a whole: an empty one would be told of
        self.assertIn("a file has appeared", following.note())
        self.assertEqual(following.take(2), ["1", "2"])
        self.assert_quiet_end(following)

    def test_a_file_without_a_stream_is_waited_for(self):
        self.path.write_bytes(b"")
        following = self.follow("get", "//cpuOnline")
        self.assertIn("no stream is in it so far", following.note())
        self.append(group(SYSTEM, number(1), number(2)))
        self.assertEqual(following.take(2), ["1", "2"])
        self.assert_quiet_end(following)

    def test_damage_is_told_and_what_is_behind_it_comes(self):
        whole, broken = number(1), bytearray(number(2))
        broken[:8] = struct.pack("<Q", 1 << 40)
        self.append(group(SYSTEM, number(0)), group(SYSTEM, whole, bytes(broken), number(3)), group(SYSTEM, number(4)))
        following = self.follow("get", "//cpuOnline")
        self.assertEqual(following.take(3), ["0", "1", "4"])
        note = following.note()
        self.assertIn("passed over 40 bytes", note)
        self.assertIn(" /system[2]", note)
        self.assert_quiet_end(following, 1)

    def test_a_root_that_was_taken_back_repeats_nothing(self):
        self.append(group(SYSTEM, number(1)), group(SYSTEM, number(2)))
        following = self.follow("get", "//cpuOnline", "--paths")
        self.assertEqual(following.take(2), ["/system/cpuOnline\t1", "/system[2]/cpuOnline\t2"])
        begin = self.path.stat().st_size
        self.append(group(HOST, number(3), size=OPEN))
        self.assertEqual(following.take(), ["/host/cpuOnline\t3"])
        with self.path.open("r+b") as file:
            file.seek(begin)
            file.write(group(SYSTEM, number(4)))
        self.assertEqual(following.take(), ["/system[3]/cpuOnline\t4"])
        self.assert_quiet_end(following)

    def test_what_has_no_meaning_is_refused(self):
        self.append(group(SYSTEM, number(1)))
        for words, told in ((["get", "-", "//cpuOnline"], "--follow needs a FILE"),
                            (["get", self.path, "//cpuOnline", "--from", "16"], "--from exclude each other"),
                            (["get", self.path, "//cpuOnline", "-j", "2"], "--jobs exclude each other"),
                            (["tree", self.path, "--at", "0"], "--at exclude each other"),
                            (["tree", self.path, "--fold"], "--fold exclude each other"),
                            (["get", self.path, "//cpuOnline["], "column")):
            with self.subTest(words=words):
                result = tav(*words, "--follow")
                self.assertEqual((result.status, result.out), (2, ""))
                self.assertIn(told, result.err)
        result = tav("get", self.path, "//cpuOnlin", "--follow")
        self.assertEqual((result.status, result.out), (1, ""))
        self.assertIn("cpuOnline", result.err)

    def test_other_signals_end_it_as_ever(self):
        self.append(group(SYSTEM, number(1)))
        following = self.follow("get", "//cpuOnline")
        self.assertEqual(following.take(), ["1"])
        self.assertEqual(following.end(signal.SIGTERM)[0], -signal.SIGTERM)

    def test_nobody_who_reads_ends_it_quietly(self):
        self.append(group(SYSTEM, number(1)))
        with running([*TAV, "get", str(self.path), "//cpuOnline", "--follow"], stdout=subprocess.PIPE) as process:
            self.assertEqual(process.stdout.readline(), b"1\n")
            process.stdout.close()
            self.append(group(SYSTEM, number(2)))
            self.assertEqual(process.wait(timeout=PATIENCE), 0)


if __name__ == "__main__":
    unittest.main()
