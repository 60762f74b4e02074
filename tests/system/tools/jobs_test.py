"""-j: several processors say what one says."""
import unittest

from support import ToolTest, generate, tav

COMMANDS = (("check",), ("check", "--json"), ("check", "--notes"), ("schema",), ("schema", "--json"), ("schema", "--ends"),
            ("table", "--each", "//*", "--col", "x=.", "--col", "*"), ("table", "--each", "/*", "--col", "*/*", "--join", "+"),
            ("table", "--each", "//host", "--col", "hostName", "--col", ".//cpuOnline", "--on-damage", "skip"),
            ("table", "--each", "/*/*", "--col", "#307", "--file", "--format", "jsonl"))
PATHS = (("--all", "--paths", "//cpuOnline", "//hostName"), ("--all", "--json", "//host[cpuOnline]/*"),
         ("//memTotal", "//nothing", "/*/*[last()]"), ("--all", "--raw", "/*/*"))


class Jobs(ToolTest):
    def assertSame(self, path):
        for command in COMMANDS:
            self.assertSaysTheSame(command, command[0], *command[1:], path)
        for words in PATHS:
            self.assertSaysTheSame(words, "get", path, *words)

    def assertSaysTheSame(self, what, *words):
        with self.subTest(command=what):
            one = tav(*words)
            for jobs in ("2", "3", "0"):
                many = tav(*words, "-j", jobs)
                self.assertEqual((many.status, many.out, many.err), (one.status, one.out, one.err))

    def test_a_file_says_the_same_for_any_number_of_processors(self):
        path = self.folder / "x.tav"
        generate(path, "--pairs", "--strings", "--utf8", "--seed", 1, "--nodes", 150_000)
        self.assertGreater(path.stat().st_size, 4 << 20)
        self.assertSame(path)

    def test_damage_is_told_of_the_same_way(self):
        path = self.folder / "x.tav"
        generate(path, "--pairs", "--seed", 2, "--nodes", 160_000)
        made = bytearray(path.read_bytes())
        self.assertGreater(len(made), 4 << 20)
        for at in range(300_000, len(made) - 100, 1_300_000):
            made[at:at + 50] = b"\xEE" * 50
        path.write_bytes(made[:-1000])
        self.assertSame(path)

    def test_recover_saves_the_same(self):
        path = self.folder / "x.tav"
        generate(path, "--pairs", "--seed", 3, "--nodes", 160_000)
        made = bytearray(path.read_bytes())
        made[200_000:200_060] = b"\xEE" * 60
        path.write_bytes(made)
        results = []
        for jobs in ("1", "3"):
            out = self.folder / f"r{jobs}.tav"
            result = tav("recover", path, "-o", out, "-j", jobs)
            results.append((result.status, result.out, out.read_bytes()))
        self.assertEqual(results[0], results[1])

    def test_a_number_of_processors_is_a_number(self):
        self.assertEqual(tav("check", "-j", "many", "x.tav").status, 2)


if __name__ == "__main__":
    unittest.main()
