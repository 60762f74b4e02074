"""Damaged and hostile bytes: no crash, no endless run, no memory beyond the depth, every byte accounted for once."""
import os
import random
import resource
import struct
import unittest

from layout import EYE_SIZE, Form
from support import EMULATOR, ToolTest, bytes_of_hex, generate, nodes_of, tav, tav_in_little_memory, tree_rows

OPEN = 2**64 - 1
LITTLE = Form(big=False)


def group(size, elm=60100, info=0, kind=2):
    return LITTLE.header(True, size, kind, elm, info)


def number(value, elm=307, info=0):
    return LITTLE.header(True, 4, 55, elm, info) + LITTLE.number(value, 4)


def processor_time():
    """Seconds that the programs run so far have computed: what other work on the machine does not change."""
    used = resource.getrusage(resource.RUSAGE_CHILDREN)
    return used.ru_utime + used.ru_stime


def damage(rng, content):
    """One of the ways in which files go bad."""
    content = bytearray(content)
    way = rng.randrange(5)
    at = rng.randrange(len(content))
    if way == 0:
        return content[:at]
    if way == 1:
        length = min(rng.choice((1, 8, 100, 1024)), len(content) - at)
        content[at:at + length] = bytes(length)
    elif way == 2:
        for _ in range(rng.choice((1, 2, 10))):
            content[rng.randrange(len(content))] ^= 1 << rng.randrange(8)
    elif way == 3:
        for _ in range(rng.choice((1, 2, 10))):
            content[rng.randrange(len(content))] = rng.choice((0, 1, 2, 255))
    else:
        return rng.randbytes(rng.randrange(2000))
    return content


class Hostile(ToolTest):
    def file(self, content):
        path = self.folder / "h.tav"
        path.write_bytes(content)
        return path

    def test_every_byte_of_damaged_files_is_shown_once(self):
        rng = random.Random(1)
        choices = ("--swap", "--align", "--root32", "--pairs", "--strings", "--utf8", "--mixed", "--open", "--unfinished",
                   "--wild")
        for case in range(int(os.environ.get("TAV_TEST_CASES", "120"))):
            options = [name for name in choices if rng.random() < 0.4]
            path = self.folder / "d.tav"
            generate(path, *options, "--seed", case, "--nodes", rng.choice((3, 40, 200)))
            content = bytes(damage(rng, path.read_bytes()))
            path.write_bytes(content)
            with self.subTest(case=case, options=options):
                shown = tav("hex", path)
                self.assertIn(shown.status, (0, 1, 3), shown.err)
                self.assertEqual(bytes_of_hex(shown.out), content)
                for command in ("info", "tree"):
                    result = tav(command, path)
                    self.assertIn(result.status, (0, 1, 3), result.err)

    def test_nodes_behind_a_damaged_region_are_found_again(self):
        children = [number(i) for i in range(200)]
        content = bytearray(group(sum(map(len, children))) + b"".join(children))
        content[416:516] = bytes(100)  # from the middle of node 20 to the middle of node 25
        result = tav("tree", self.file(content), "--paths", "--width", "0")
        nodes, damaged = tree_rows(result.out)
        self.assertEqual(result.status, 1)
        whole = {0} | {16 + 20 * i for i in range(200) if not 20 <= i <= 24}
        self.assertLessEqual(whole, {node[0] for node in nodes})
        self.assertEqual(len(damaged), 1)

    def test_a_subtree_behind_damage_is_found_by_its_pair(self):
        strange = LITTLE.header(True, 8, 60000, 1, EYE_SIZE) + LITTLE.number(5, 8) + LITTLE.pair(8)
        content = group(16 * 3 + len(strange)) + b"\xff" * 48 + strange
        nodes, damaged = tree_rows(tav("tree", self.file(content), "--paths", "--width", "0").out)
        self.assertEqual(([node[0] for node in nodes], damaged), ([0, 64], [16]))

    def test_strange_nodes_before_an_open_group_that_a_node_follows_are_no_damage(self):
        strange = struct.pack("<QIHH", 7, 0, 58, 60102) + b"1234567" + struct.pack("<QIHH", 9, 0, 2353, 30000) + b"123456789"
        content = group(OPEN, 30000) + number(1) + strange + group(OPEN) + number(2)
        nodes, damaged = tree_rows(tav("tree", self.file(content), "--paths", "--width", "0").out)
        self.assertEqual(([node[0] for node in nodes], damaged), ([0, 16, 36, 59, 84, 100], []))

    def test_a_size_that_does_not_suit_the_type_is_told_of_damage(self):
        content = group(OPEN) + number(1) + struct.pack("<QIHH", 7, 0, 58, 60102) + b"\xff" * 40 + number(2)
        shown = tav("tree", self.file(content), "--width", "0").out
        self.assertIn("no node: a size of 7 does not suit type 58, and no node follows", shown)

    def test_claims_of_4_GiB_in_small_files(self):
        for content in (group(2**32) + struct.pack("<QIHH", 2**32, 0, 101, 60102) + b"x" * 8,
                        group(OPEN) + struct.pack("<QIHH", OPEN - 40, 0, 101, 60102) + b"x" * 8,
                        group(OPEN - 8) + number(1), struct.pack("<IHH", 2**32 - 2, 1, 60100) + bytes(32)):
            path = self.file(content)
            for command in ("info", "tree", "hex", "print"):
                run = tav_in_little_memory(command, path)
                self.assertIn(run.status, (0, 1, 3), run.err)
                self.assertNotIn("memory", run.err if command != "print" else "")

    def test_100000_levels(self):
        for content in (group(OPEN) * 100_000, b"".join(group(16 * (99_999 - i)) for i in range(100_000))):
            path = self.file(content)
            for command in ("info", "tree"):
                before = processor_time()
                run = tav_in_little_memory(command, path)
                self.assertEqual(run.status, 0, run.err[:200])
                self.assertLess(processor_time() - before, 20)
            self.assertIn("depth             100000", tav("info", path).out)
            self.assertIn("(99999)", tav("tree", path).out.splitlines()[-1])

    def test_info_of_a_sparse_file_of_8_GiB_is_quick(self):
        path = self.snapshot()
        count = len(nodes_of(path))
        os.truncate(path, 8 << 30)
        result = tav("info", path)
        self.assertEqual(result.status, 0, result.out)
        self.assertIn(f"nodes             {count},", result.out)
        # What starting the program costs here is more than a slow machine takes for what there is to read.
        self.assertLess(self.least_time("info", path), max(0.05, 10 * self.least_time("--version")))

    def least_time(self, *arguments):
        """Seconds of the processor that a call takes at least."""
        least = 60.0
        for _ in range(5):
            before = processor_time()
            self.assertEqual(tav(*arguments).status, 0)
            least = min(least, processor_time() - before)
        return least

    def test_get_of_an_early_match_reads_a_hundredth(self):
        path = self.folder / "big.tav"
        hosts = [number(i) for i in range(50_000)]
        inner = group(len(hosts) * 20, 60102) + b"".join(hosts)
        count = 110
        with open(path, "wb") as file:
            file.write(group(len(inner) * count))
            for _ in range(count):
                file.write(inner)
        for wanted in ("/system/host/#307[100]", "**/node_number"):
            result = tav("get", path, wanted, "--stats")
            self.assertEqual(result.status, 0, result.err)
            read = int(result.err.split(": ")[-1].split()[0])
            self.assertLess(read, path.stat().st_size / 100)
        last = tav("get", path, f"/system/host[{count}]/#307[1]", "--stats")
        self.assertEqual(last.out, "0\n")
        self.assertLess(int(last.err.split(": ")[-1].split()[0]), path.stat().st_size / 10)


if __name__ == "__main__":
    unittest.main()
