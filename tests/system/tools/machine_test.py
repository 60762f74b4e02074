"""What tav snapshot says of the machine is what the system's own files and tools say, and every own element has a name."""
import json
import os
import pathlib
import re
import shutil
import socket
import subprocess
import sys
import unittest

from support import EMULATOR, WINDOWS, ToolTest, tav

ROOT = next(folder for folder in pathlib.Path(__file__).resolve().parents if (folder / "packaging").exists())
NAMES = {int(id): what for id, what in json.loads((ROOT / "packaging/snapshot-names.json").read_text()).items()}
IDS = {what["tag"]: id for id, what in NAMES.items()}
FIRST, END = 44000, 45000  # of own elements


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
        steps = "/".join(step(tag) for tag in path.split("/"))
        return tav("get", "--all", self.path, "/system/host/" + steps).out.splitlines()

    def value(self, path):
        found = self.values(path)
        self.assertEqual(len(found), 1, path)
        return int(found[0]) if found[0].isdigit() else found[0]

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
        names = os.uname()
        for path, expected in (("hostName", names.nodename), ("machineId", names.machine), ("os/osName", names.sysname),
                               ("os/osRelease", names.release), ("os/osVersion", names.version)):
            self.assertEqual(self.values(path), [expected])
        self.assertEqual(socket.gethostname(), names.nodename)

    def test_the_processors(self):
        self.assertEqual(self.value("cpu/cpuOnline"), os.sysconf("SC_NPROCESSORS_ONLN"))
        self.assertEqual(self.value("cpu/cpuConfig"), os.sysconf("SC_NPROCESSORS_CONF"))
        self.assertIn(self.value("cpu/cpuTotalUsage"), range(101))
        tick = 1000 // os.sysconf("SC_CLK_TCK")
        for place, tag in enumerate(("cpuTimeUser", "cpuTimeNice", "cpuTimeSystem", "cpuTimeIdle"), 1):
            # Idle times of processors that sleep are made up when they are asked for, and may go back a little.
            self.counted("cpu/" + tag, lambda place=place: int(read("/proc/stat").split()[place]) * tick, slack=2000)

    def test_memory(self):
        def kib(word):
            return int(re.search(rf"^{word}:\s+(\d+) kB", read("/proc/meminfo"), re.MULTILINE)[1]) * 1024
        total = kib("MemTotal")
        self.assertEqual(self.value("memory/memTotal"), total)
        self.assertEqual(self.value("memory/swapMemTotal"), kib("SwapTotal"))
        self.assertEqual(self.value("memory/virtMemTotal"), total + kib("SwapTotal"))
        for tag, word in (("memFree", "MemFree"), ("memAvail", "MemAvailable"), ("memCached", "Cached"),
                          ("memBuffers", "Buffers"), ("virtMemReserved", "Committed_AS"), ("swapMemFree", "SwapFree")):
            self.snapshot()
            self.assertLess(abs(self.value("memory/" + tag) - kib(word)), total / 4, tag)
        if shutil.which("free"):
            words = subprocess.run(["free", "-b"], capture_output=True, text=True, check=True).stdout.split("\n")[1].split()
            self.assertEqual(int(words[1]), total)

    def test_the_load(self):
        self.counted("systemLoad/uptime", lambda: int(float(read("/proc/uptime").split()[0])))
        for tag, word in (("contextSwitches", "ctxt"), ("interruptsServed", "intr"), ("processesStarted", "processes")):
            self.counted("systemLoad/" + tag,
                         lambda word=word: int(re.search(rf"^{word} (\d+)", read("/proc/stat"), re.MULTILINE)[1]))
        self.snapshot()
        for tag, average in zip(("loadAverage1", "loadAverage5", "loadAverage15"), os.getloadavg()):
            # It changes every five seconds, and then by no more than a part of what there is to run.
            self.assertLess(abs(self.value("systemLoad/" + tag) - average * 100), 200 + average * 50, tag)

    def test_file_systems(self):
        folders = self.values("fileSystem/fileSystemFolder")
        kinds = {line.split()[1]: line.split()[2] for line in read("/proc/self/mounts").splitlines()}
        for place, folder in enumerate(folders, 1):
            at = f"/system/host/{step('fileSystem')}[{place}]/"
            told = os.statvfs(folder)
            get = lambda tag, at=at: tav("get", self.path, at + step(tag)).out.strip()
            self.assertEqual(int(get("fs_total_sz")), told.f_blocks * told.f_frsize)
            self.assertEqual(int(get("fs_total_sz")), shutil.disk_usage(folder).total)
            self.assertLess(abs(int(get("fs_used_sz")) - shutil.disk_usage(folder).used), told.f_blocks * told.f_frsize / 4)
            self.assertEqual(get("fileSystemKind"), kinds[folder])

    def test_disks_and_networks(self):
        disks = {line.split()[2]: line.split() for line in read("/proc/diskstats").splitlines()}
        for place, name in enumerate(self.values("diskDevice/diskName"), 1):
            self.assertTrue(pathlib.Path("/sys/block", name).exists())
            at = f"/system/host/{step('diskDevice')}[{place}]/"
            for tag, column, factor in (("diskReads", 3, 1), ("diskBytesRead", 5, 512), ("diskWrites", 7, 1),
                                        ("diskBytesWritten", 9, 512), ("diskTimeBusy", 12, 1)):
                found = int(tav("get", self.path, at + step(tag)).out)
                self.assertLessEqual(found, int(disks[name][column]) * factor, tag)
                self.assertEqual(found % factor, 0)
        networks = {line.split(":")[0].strip(): line.split(":")[1].split() for line in read("/proc/net/dev").splitlines()[2:]}
        self.assertEqual(self.values("networkDevice/networkName"), list(networks))
        columns = ("networkBytesReceived", 0), ("networkPacketsReceived", 1), ("networkBytesSent", 8), ("networkPacketsSent", 9)
        for tag, column in columns:
            found = [int(value) for value in self.values("networkDevice/" + tag)]
            self.assertEqual(len(found), len(networks))
            for value, name in zip(found, networks):
                self.assertLessEqual(value, int(networks[name][column]), (tag, name))

    def test_the_busiest_processes(self):
        busy = subprocess.Popen([sys.executable, "-c", "while True: pass"])
        self.addCleanup(lambda: (busy.kill(), busy.wait()))
        path = self.folder / "series.tav"
        self.assertEqual(tav("snapshot", "--append", "--every", "1s", "--count", "4", "-o", path).status, 0)
        last = f"/system[last()]/host/{step('busyProcess')}"
        own = tav("get", path, f"{last}[{step('processId')}={busy.pid}]/{step('processCpuTime')}").out
        ticks = sum(int(word) for word in read(f"/proc/{busy.pid}/stat").rsplit(")", 1)[1].split()[11:13])
        self.assertLessEqual(int(own), ticks * 1000 // os.sysconf("SC_CLK_TCK"))
        recent = [int(word) for word in tav("get", "--all", path, f"{last}/{step('processCpuRecent')}").out.split()]
        self.assertEqual(recent, sorted(recent, reverse=True))
        self.assertLessEqual(len(recent), 10)
        self.assertLessEqual(recent[0], 60000)
        names = tav("get", "--all", path, f"{last}[{step('processId')}={busy.pid}]/{step('processName')}").out
        self.assertEqual(names.strip(), read(f"/proc/{busy.pid}/comm").strip())


if __name__ == "__main__":
    unittest.main()
