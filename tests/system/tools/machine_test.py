"""What tav snapshot says of the machine is what the system's own files and tools say, and every own element has a name."""
import contextlib
import json
import os
import pathlib
import re
import shutil
import subprocess
import sys
import time
import unittest

from support import EMULATOR, WINDOWS, ToolTest, tav

ROOT = next(folder for folder in pathlib.Path(__file__).resolve().parents if (folder / "packaging").exists())
NAMES = {int(id): what for id, what in json.loads((ROOT / "packaging/snapshot-names.json").read_text()).items()}
IDS = {what["tag"]: id for id, what in NAMES.items()}
FIRST, END = 44000, 45000  # of own elements
MOST_DEVICES = 128  # that are told, of each kind
TRIES = 100  # at a snapshot under which the machine does not change


def step(tag):
    return f"#{IDS[tag]}" if tag in IDS else tag


def read(path):
    return pathlib.Path(path).read_text()


class Names(unittest.TestCase):
    def test_every_own_element_of_the_program_is_named(self):
        header = read(ROOT / "tools/cmd/snapshotNames.h")
        ids = [int(id) for id in re.findall(r"^  \w+ = (\d+),?$", header, re.MULTILINE)]
        self.assertGreater(len(ids), 40)
        self.assertEqual(sorted(ids), sorted(NAMES))
        self.assertEqual(len(set(ids)), len(ids))
        self.assertEqual(len(ids), header.count(" = "))

    def test_the_names_are_free_and_whole(self):
        known = {word.lower() for word in re.findall(r'"(\w+)"', read(ROOT / "include/tav/elements.def"))}
        taken = {int(id) for id in re.findall(r"TAV_ELEMENT\((\d+),", read(ROOT / "include/tav/elements.def"))}
        for id, what in NAMES.items():
            with self.subTest(id=id):
                self.assertTrue(FIRST <= id < END and id not in taken)
                self.assertRegex(what["tag"], r"^[a-z][A-Za-z0-9]*$")
                self.assertFalse({what["tag"].lower(), "sqlm_elm_" + what["tag"].lower()} & known)
                self.assertLessEqual(set(what), {"tag", "kind", "unit", "text"})
                self.assertIn(what.get("kind", "gauge"), ("gauge", "counter", "text"))
                self.assertEqual("unit" in what, what.get("kind") in ("gauge", "counter"))
                self.assertTrue(what["text"])
        self.assertEqual(len(IDS), len(NAMES), "each tag once")


@unittest.skipUnless(sys.platform == "linux" and not WINDOWS and not EMULATOR, "what Linux tells of this machine")
class Facts(ToolTest):
    def setUp(self):
        super().setUp()
        self.path = self.snapshot()

    def values(self, path):
        """All values that a path leads to."""
        steps = re.sub(r"\w+(?![\w\]])", lambda tag: step(tag[0]), path)
        return tav("get", "--all", self.path, "/system/host/" + steps).out.splitlines()

    def value(self, path):
        found = self.values(path)
        self.assertEqual(len(found), 1, path)
        return int(found[0]) if found[0].isdigit() else found[0]

    def while_steady(self, look, same=lambda before, after: before == after):
        """Takes a snapshot between two looks at the machine that are the same, and returns both."""
        for _ in range(TRIES):
            before = look()
            self.snapshot()
            after = look()
            if same(before, after):
                return before, after
        self.skipTest(f"the machine has changed under each of {TRIES} snapshots")

    def amount(self, path, look, slack=0, there=lambda: True):
        """A value that changes as the machine goes on lies between what it was before and behind a snapshot. One that goes
        up and down may have been elsewhere in between; then there is another snapshot. `there`: what it is of still is."""
        for _ in range(TRIES):
            before = look()
            self.snapshot()
            if not there():
                self.skipTest("the machine has changed meanwhile")
            found, after = self.value(path), look()
            if min(before, after) - slack <= found <= max(before, after) + slack:
                return
        self.fail(f"{path}: {found} is not between {before} and {after}, and was not in {TRIES} snapshots")

    def counted(self, path, count, slack=0):
        before = count()
        self.snapshot()
        found = self.value(path)
        after = count()
        self.assertLessEqual(before, found + slack, path)
        self.assertLessEqual(found, after + slack, path)

    def test_every_own_element_in_a_snapshot_is_named(self):
        ids = {json.loads(line).get("id", 0) for line in tav("json", self.path, "--lines").out.splitlines()}
        own = {id for id in ids if FIRST <= id < END}
        self.assertGreater(len(own), 20)
        self.assertLessEqual(own, set(NAMES))

    def test_the_system(self):
        names, _ = self.while_steady(os.uname)
        for path, expected in (("hostName", names.nodename), ("machineId", names.machine), ("os/osName", names.sysname),
                               ("os/osRelease", names.release), ("os/osVersion", names.version)):
            self.assertEqual(self.values(path), [expected])

    def test_the_processors(self):
        names = "SC_NPROCESSORS_ONLN", "SC_NPROCESSORS_CONF"
        (online, configured), _ = self.while_steady(lambda: tuple(map(os.sysconf, names)))
        self.assertEqual(self.value("cpu/cpuOnline"), online)
        self.assertEqual(self.value("cpu/cpuConfig"), configured)
        self.assertIn(self.value("cpu/cpuTotalUsage"), range(101))
        tick = 1000 // os.sysconf("SC_CLK_TCK")
        for place, tag in enumerate(("cpuTimeUser", "cpuTimeNice", "cpuTimeSystem", "cpuTimeIdle"), 1):
            # Idle times of processors that sleep are made up when they are asked for, and may go back a little.
            self.counted("cpu/" + tag, lambda place=place: int(read("/proc/stat").split()[place]) * tick, slack=2000)

    def test_memory(self):
        def kib(word):
            return int(re.search(rf"^{word}:\s+(\d+) kB", read("/proc/meminfo"), re.MULTILINE)[1]) * 1024

        def free():
            return subprocess.run(["free", "-b"], capture_output=True, text=True, check=True).stdout.split("\n")[1].split()[1]
        sources = [lambda: kib("MemTotal"), lambda: kib("SwapTotal")]
        if shutil.which("free"):
            sources.append(lambda: int(free()))
        (total, swap, *rest), _ = self.while_steady(lambda: [source() for source in sources])
        self.assertEqual(self.value("memory/memTotal"), total)
        self.assertEqual(self.value("memory/swapMemTotal"), swap)
        self.assertEqual(self.value("memory/virtMemTotal"), total + swap)
        self.assertIn(rest, ([], [total]))
        for tag, word in (("memFree", "MemFree"), ("memAvail", "MemAvailable"), ("memCached", "Cached"),
                          ("memBuffers", "Buffers"), ("virtMemReserved", "Committed_AS"), ("swapMemFree", "SwapFree")):
            self.amount("memory/" + tag, lambda word=word: kib(word), slack=total / 100)

    def test_the_load(self):
        self.counted("systemLoad/uptime", lambda: int(float(read("/proc/uptime").split()[0])))
        for tag, word in (("contextSwitches", "ctxt"), ("interruptsServed", "intr"), ("processesStarted", "processes")):
            self.counted("systemLoad/" + tag,
                         lambda word=word: int(re.search(rf"^{word} (\d+)", read("/proc/stat"), re.MULTILINE)[1]))
        averages, _ = self.while_steady(os.getloadavg)  # they change every five seconds
        for tag, average in zip(("loadAverage1", "loadAverage5", "loadAverage15"), averages):
            # The text that is read has two digits, which the kernel rounds by a hundredth that is itself rounded: at 2.145
            # it may say 2.14 or 2.15.
            self.assertLessEqual(abs(self.value("systemLoad/" + tag) - average * 100), 0.55, tag)

    @staticmethod
    def file_systems():
        """Folder, kind and size of each device that is mounted, where it is mounted first."""
        found = {}
        for line in read("/proc/self/mounts").splitlines():
            device, folder, kind = [re.sub(r"\\(\d{3})", lambda code: chr(int(code[1], 8)), word) for word in line.split()[:3]]
            if device.startswith("/") and device not in found:
                with contextlib.suppress(OSError):
                    told = os.statvfs(folder)
                    found[device] = folder, kind, told.f_blocks * told.f_frsize, shutil.disk_usage(folder).total
        return list(found.values())[:MOST_DEVICES]

    def test_file_systems(self):
        there, _ = self.while_steady(self.file_systems)
        self.assertEqual(self.values("fileSystem/fileSystemFolder"), [folder for folder, *_ in there])
        self.assertEqual(self.values("fileSystem/fileSystemKind"), [kind for _, kind, *_ in there])
        for place, (folder, _, total, other) in enumerate(there, 1):
            at = f"/system/host/{step('fileSystem')}[{place}]/"
            self.assertEqual(int(tav("get", self.path, at + step("fs_total_sz")).out), total)
            self.assertEqual(total, other)
            # The same place while the same is mounted.
            self.amount(f"fileSystem[{place}]/fs_used_sz", lambda folder=folder: shutil.disk_usage(folder).used,
                        slack=total / 100, there=lambda: self.file_systems() == there)

    def counters(self, path, names_of, columns):
        """Counters of devices: those that are there before and behind a snapshot are in it, and have gone no further."""
        def grew(before, after):
            return list(before) == list(after) and all(x <= y for name in before for x, y in zip(before[name], after[name]))
        before, after = self.while_steady(names_of, grew)
        for tag, place, factor in columns:
            found = [int(value) for value in self.values(f"{path}/{tag}")]
            self.assertEqual(len(found), len(before), tag)
            for value, name in zip(found, before):
                self.assertLessEqual(before[name][place] * factor, value, (tag, name))
                self.assertLessEqual(value, after[name][place] * factor, (tag, name))
                self.assertEqual(value % factor, 0)
        return list(before)

    def test_disks(self):
        def disks():
            rows = (line.split() for line in read("/proc/diskstats").splitlines())
            there = {name: [int(word) for word in words] for _, _, name, *words in rows if os.path.exists(f"/sys/block/{name}")}
            used = [name for name, (reads, _, _, _, writes, *_) in there.items() if reads + writes]
            return {name: there[name] for name in used[:MOST_DEVICES]}
        names = self.counters("diskDevice", disks, (("diskReads", 0, 1), ("diskBytesRead", 2, 512), ("diskWrites", 4, 1),
                                                    ("diskBytesWritten", 6, 512), ("diskTimeBusy", 9, 1)))
        self.assertEqual(self.values("diskDevice/diskName"), names)

    def test_networks(self):
        def networks():
            rows = [line.split(":", 1) for line in read("/proc/net/dev").splitlines()[2:MOST_DEVICES + 2]]
            return {name.strip(): [int(word) for word in words.split()] for name, words in rows}
        columns = ("networkBytesReceived", 0), ("networkPacketsReceived", 1), ("networkBytesSent", 8), ("networkPacketsSent", 9)
        names = self.counters("networkDevice", networks, [(tag, place, 1) for tag, place in columns])
        self.assertEqual(self.values("networkDevice/networkName"), names)

    def test_the_busiest_processes(self):
        # In several threads: where much else is computed, too, it is still among the busiest.
        work = ("import hashlib, threading\ndata = bytes(1 << 20)\ndef work():\n  while True: hashlib.sha256(data)\n"
                "for _ in range(4): threading.Thread(target=work).start()")
        busy = subprocess.Popen([sys.executable, "-c", work])
        self.addCleanup(lambda: (busy.kill(), busy.wait()))
        path = self.folder / "series.tav"
        last = f"/system[last()]/host/{step('busyProcess')}"
        for _ in range(10):
            begin = time.monotonic()
            self.assertEqual(tav("snapshot", "--append", "--every", "500ms", "--count", "3", "-o", path).status, 0)
            most = (time.monotonic() - begin + 1) * 1000 * os.sysconf("SC_NPROCESSORS_CONF")
            recent = [int(word) for word in tav("get", "--all", path, f"{last}/{step('processCpuRecent')}").out.split()]
            self.assertEqual(recent, sorted(recent, reverse=True))
            self.assertLessEqual(len(recent), 10)
            self.assertLessEqual(recent[0], most)
            if own := tav("get", path, f"{last}[{step('processId')}={busy.pid}]/{step('processCpuTime')}").out:
                break
            self.assertEqual(len(recent), 10, "a busy process is told, or ten that are busier")
        else:
            self.skipTest("ten others have been busier each time")
        ticks = sum(int(word) for word in read(f"/proc/{busy.pid}/stat").rsplit(")", 1)[1].split()[11:13])
        self.assertLessEqual(int(own), ticks * 1000 // os.sysconf("SC_CLK_TCK"))
        names = tav("get", "--all", path, f"{last}[{step('processId')}={busy.pid}]/{step('processName')}").out
        self.assertEqual(names.strip(), read(f"/proc/{busy.pid}/comm").strip())


if __name__ == "__main__":
    unittest.main()
