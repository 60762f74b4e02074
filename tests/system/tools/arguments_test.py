"""What the words of a command line become: names as they are, options that a command takes, and what was meant by those that
it does not."""
import re
import unittest

from support import EMULATOR, WINDOWS, ToolTest, tav

COMMANDS = ("snapshot", "info", "tree", "print", "get", "hex", "elements", "json", "build", "xml", "check", "recover", "diff",
            "schema", "table", "extract", "cat", "set", "view", "help", "completion")
COMMON = ("--byte-order", "--root", "--align", "--no-align", "--ring", "--spool-limit", "--trace", "--trace-probe",
          "--force", "--stats")


class Arguments(ToolTest):
    @unittest.skipIf(WINDOWS or EMULATOR, "its names know fewer characters")
    def test_every_name_of_a_file_is_taken_as_it_is(self):
        content = self.snapshot().read_bytes()
        document = tav("json", "-", stdin=content).raw
        for name in ("[x]", "[]", "[x", "{x}", '"x"', "'x'", "`x`", " x ", "x ", "%%", "%%x%%", "%x", "a,b", "a=b", "#x", ";x",
                     "$HOME", "\\x", "\\n", "a\nb", "\t", "[[a,b]]", "true", "!x", "~", "x\udcff"):
            with self.subTest(name=name):
                (self.folder / name).write_bytes(content)
                self.assertEqual(tav("info", name, cwd=self.folder).status, 0)
                self.assertEqual(tav("json", name, cwd=self.folder).raw, document)
                for words in (("-o", "out" + name), ("--output", "out" + name), ("--output=out" + name,), ("-oout" + name,)):
                    self.assertEqual(tav("json", *words, "--force", "--", name, cwd=self.folder).status, 0)
                    self.assertEqual((self.folder / ("out" + name)).read_bytes(), document)
                    (self.folder / ("out" + name)).unlink()
                (self.folder / name).unlink()
                self.assertEqual(list(self.folder.iterdir()), [self.folder / "x.tav"])

    @unittest.skipIf(WINDOWS, "its names know fewer characters")
    def test_a_value_of_an_option_is_taken_as_it_is(self):
        path = self.snapshot()
        for value in ("[x]", "-", "--trace", "-o", "{x}", "''", " "):
            with self.subTest(value=value):
                said = tav("hex", path, "--at", value)
                self.assertEqual(said.status, 2)
                self.assertIn(f"--at: '{value}' is no number", said.err)
                self.assertIn(f"--at: '{value}' is no number", tav("hex", path, "--at=" + value).err)
        self.assertIn("'/[x]'", tav("get", path, "/[x]").err)
        self.assertEqual(tav("get", path, "--ignore").status, 2)

    def test_two_dashes_end_the_options(self):
        path = self.snapshot()
        for name in ("--help", "-h", "--depth", "-", "--"):
            with self.subTest(name=name):
                result = tav("tree", "--", f"./{name}")
                self.assertIn(f"./{name}", result.err)
                self.assertEqual(tav("get", "--", path, name).out, "")
                self.assertIn(f"'{name}'", tav("get", "--", path, name).err)

    def test_the_last_of_repeated_values_counts(self):
        path = self.snapshot()
        self.assertEqual(tav("tree", path, "--depth", "1").out, tav("tree", path, "--depth=5", "--depth", "1").out)

    def test_values_that_are_missing_or_not_wanted_are_told(self):
        path = self.snapshot()
        for words, said in ((("tree", path, "--depth"), "--depth needs a value: --depth "),
                            (("tree", path, "--paths=1"), "--paths takes no value"),
                            (("json", path, "-o", ""), "--output: a file has a name"),
                            (("tree", path, "--root", "33"), "'33' is none of 32, 64")):
            result = tav(*words)
            self.assertEqual((result.status, result.out), (2, ""))
            self.assertIn(said, result.err)
            self.assertIn("'tav " + words[0] + " --help'", result.err)

    def test_help_is_given_beside_something_that_is_wrong(self):
        for words in (("tree", "--help"), ("tree", "-h"), ("tree", "--nonsense", "--help"), ("tree", "--depth", "--help"),
                      ("--stats", "tree", "-h")):
            result = tav(*words)
            self.assertEqual((result.status, result.err), (0, ""), words)
            self.assertTrue(result.out.startswith("usage: tav tree "), words)


class Suggestions(ToolTest):
    def test_the_nearest_command_is_told(self):
        for word, meant in (("tre", "tree"), ("chekc", "check"), ("recvoer", "recover"), ("inof", "info"), ("JSON", "json"),
                            ("element", "elements"), ("comp", "completion")):
            for words in ((word, "x.tav"), ("help", word)):
                result = tav(*words)
                self.assertEqual((result.status, result.out), (2, ""))
                self.assertIn(f"there is no command '{word}'", result.err)
                self.assertIn(f"did you mean {meant}?", result.err)
        for word in ("nonsense", "q", "", "z" * 10000):
            self.assertNotIn("did you mean", tav(word).err)

    def test_the_nearest_option_is_told_where_no_command_is(self):
        for words, meant in ((("--verison",), "--version"), (("--hlep",), "--help"), (("--stat", "info", "x"), "--stats"),
                             (("--ringg=1", "x"), "--ring")):
            said = tav(*words).err
            self.assertIn(f"there is no option '{words[0].split('=')[0]}'", said)
            self.assertIn(f"did you mean {meant}?", said)

    def test_the_nearest_option_is_told(self):
        for words, meant in ((("tree", "--deph", "2"), "--depth"), (("tree", "--widht=2"), "--width"),
                             (("json", "--out", "x"), "--output"), (("get", "--path"), "--paths"),
                             (("info", "--byteorder", "big"), "--byte-order"), (("recover", "--forse"), "--force")):
            result = tav(*words)
            self.assertEqual((result.status, result.out), (2, ""))
            self.assertIn(f"there is no option '{words[1].split('=')[0]}'", result.err)
            self.assertIn(f"did you mean {meant}?", result.err)
        for words in (("tree", "--nonsense"), ("tree", "-x"), ("elements", "--ring", "1M")):
            result = tav(*words)
            self.assertEqual(result.status, 2)
            self.assertNotIn("did you mean", result.err)


class CommonOptions(ToolTest):
    def options_in_help(self, command):
        return set(re.findall(r"^ {2}(?:-\w, | {4})(--[\w-]+)", tav(command, "--help").out, re.M))

    def test_a_command_takes_exactly_the_options_that_its_help_has(self):
        for command in COMMANDS:
            listed = self.options_in_help(command)
            self.assertIn("--help", listed)
            for option in COMMON:
                with self.subTest(command=command, option=option):
                    refused = "there is no option" in tav(command, option + "=").err
                    self.assertEqual(refused, option not in listed)

    def test_options_without_an_effect_are_not_in_the_help(self):
        for command, options in (("elements", set()), ("view", set()), ("help", set()), ("completion", set()),
                                 ("build", {"--byte-order", "--root", "--align", "--no-align", "--force"}),
                                 ("snapshot", {"--byte-order", "--root", "--align", "--no-align", "--force", "--trace",
                                               "--trace-probe"}),
                                 ("tree", set(COMMON)), ("recover", set(COMMON))):
            self.assertEqual(self.options_in_help(command) & set(COMMON), options, command)

    def test_completions_offer_what_a_command_takes(self):
        for line in tav("completion", "bash").out.splitlines():
            if match := re.match(r" +(\w+)\) COMPREPLY=\(\$\(compgen -W '([^']*)'", line):
                command, words = match.groups()
                self.assertEqual({word for word in words.split() if word.startswith("--")}, self.options_in_help(command))


if __name__ == "__main__":
    unittest.main()
