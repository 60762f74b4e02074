"""Every path that is printed leads back to its node; bad paths are explained."""
import json
import pathlib
import re
import shlex
import struct
import unittest

from hostile_test import processor_time
from support import SANITIZED, ToolTest, generate, nodes_of, tav, tree_rows


class Paths(ToolTest):
    def stream(self, content):
        """The bytes of a stream that is given as it is in JSON."""
        text, made = self.folder / "made.json", self.folder / "made.tav"
        text.write_text(json.dumps(content))
        result = tav("build", text, "-o", made, "--force")
        self.assertEqual((result.status, result.err), (0, ""))
        return made.read_bytes()

    def test_every_printed_path_leads_back_to_its_node(self):
        path = self.folder / "g.tav"
        for seed in range(6):
            generate(path, "--seed", seed, "--nodes", 60, "--pairs", "--mixed", *(["--wild"] if seed % 2 else []))
            nodes, _ = tree_rows(tav("tree", path, "--paths", "--width", "0").out)
            result = tav("get", path, "--json", *[node[2] for node in nodes])
            found = [json.loads(line) for line in result.out.splitlines()]
            self.assertEqual(sorted((one["offset"], one["path"]) for one in found),
                             sorted((node[0], node[2]) for node in nodes))

    def test_more_different_siblings_than_are_counted_are_named_by_offset(self):
        path = self.folder / "many.tav"
        children = b"".join(struct.pack("<QIHHB", 1, 0, 51, 40000 + i, i % 256) for i in range(300)) * 2
        path.write_bytes(struct.pack("<QIHH", len(children), 0, 2, 60100) + children)
        nodes, _ = tree_rows(tav("tree", path, "--paths", "--width", "0").out)
        self.assertEqual(len(nodes), 601)
        self.assertIn("[@0x", nodes[-1][2])
        for node in (nodes[1], nodes[300], nodes[301], nodes[600]):
            found = json.loads(tav("get", path, "--json", node[2]).out)
            self.assertEqual(found["offset"], node[0])

    def test_stars_stand_for_nodes_and_levels(self):
        path = self.snapshot()
        everything = tav("get", path, "--all", "--paths", "**").out.splitlines()
        self.assertEqual(len(everything), len(nodes_of(path)))
        below_host = [line for line in everything if re.match(r"/system/host/[^/\t:]+[\t:]", line)]
        self.assertEqual(tav("get", path, "--all", "--paths", "/system/*/*").out.splitlines(), below_host)
        self.assertEqual(tav("get", path, "**/cpuOnline").out, tav("get", path, "/system/host/cpu/cpuOnline").out)
        self.assertEqual(tav("get", path, "/TAV_ELM_CMN_SYSTEM/#60102/60103").out,
                         tav("get", path, "/system/host/hostName").out)

    def test_bad_paths_are_wrong_usage(self):
        path = self.snapshot()
        for bad, column in (("", 1), ("///host", 3), ("/system/", 9), ("/system[0]", 9), ("/system[", 9),
                            ("/system[host=]", 14), ("/system[@]", 10), ("/**[2]", 4), ("/#70000", 2), ("/system]", 8),
                            ("//host[contains(hostName)]", 25), ("/nope[", 7), ("//host[/system]", 8)):
            with self.subTest(path=bad):
                result = tav("get", path, bad)
                self.assertEqual((result.status, result.out), (2, ""))
                self.assertTrue(result.err.startswith(f"tav: path '{bad}': column {column}: "), result.err)
                self.assertEqual(tav("hex", path, "--path", bad).status, 2)
                self.assertEqual(tav("diff", path, path, "--ignore", bad).status, 2)

    def test_a_path_that_leads_nowhere_does_not_keep_the_others_back(self):
        path = self.snapshot()
        name = tav("get", path, "/system/host/os/osName").out
        for nowhere in ("/nope", "/system/hots", "/system/host/node", "/system/host[2]"):
            with self.subTest(path=nowhere):
                result = tav("get", path, nowhere, "/system/host/os/osName", nowhere)
                self.assertEqual((result.status, result.out), (1, name))
                self.assertIn(f"tav: {path}: {nowhere}: no match", result.err)
                self.assertEqual(tav("hex", path, "--path", nowhere).status, 1)

    def test_a_difference_is_not_sought_with_a_name_that_no_element_has(self):
        path = self.snapshot()
        for ignored, status in (("/nope", 1), ("/system/hots", 1), ("/", 2)):
            result = tav("diff", path, path, "--ignore", ignored)
            self.assertEqual((result.status, result.out), (status, ""))
            self.assertEqual("no element is called" in result.err, status == 1)

    def test_a_slash_alone_leads_to_the_roots(self):
        path = self.folder / "roots.tav"
        root = struct.pack("<QIHHQIHHI", 20, 0, 2, 60100, 4, 0, 55, 307, 7)
        path.write_bytes(root * 2)
        found = [json.loads(line) for line in tav("get", path, "--all", "--json", "/").out.splitlines()]
        self.assertEqual([(one["path"], one["offset"]) for one in found], [("/system", 0), ("/system[2]", 36)])
        self.assertEqual(tav("get", path, "/").out, "/system: group of 20 bytes\n")
        self.assertEqual(tav("hex", path, "--path", "/").raw, tav("hex", path, "--at", 0).raw)

    def test_conditions_look_into_every_host(self):
        path = self.folder / "hosts.tav"
        hosts = [{"hostName": name, "cpu": {"cpuOnline": count}} for name, count in (("ada", 8), ("bob", 2), ("eve", 64))]
        path.write_bytes(self.stream({"system": {"host": hosts}}))
        for wanted, values in (("//host[cpu/cpuOnline > 4]/hostName", ["ada", "eve"]),
                               ("//host[hostName='bob']/cpu/cpuOnline", ["2"]),
                               ("//host[last()]/hostName", ["eve"]), ("//host[-1]/hostName", ["eve"]),
                               ("//hostName[../cpu[cpuOnline < 8]]", ["bob"]),
                               ("//cpuOnline[.='64']/../../hostName", ["eve"]),
                               ("//host[position() <= 2]/hostName | //host[3]/cpu/cpuOnline", ["ada", "bob", "64"])):
            with self.subTest(path=wanted):
                self.assertEqual(tav("get", path, "-a", wanted).out.split(), values)
        self.assertEqual(tav("get", path, "//host[hostName='nobody']").status, 1)
        self.assertEqual(tav("diff", path, path, "--ignore", "//host[cpu/cpuOnline > 4]").status, 0)

    def test_the_examples_of_the_documents_run(self):
        page = (pathlib.Path(__file__).resolve().parents[3] / "docs" / "tav.md").read_text(encoding="utf-8")
        lines = page.split("## Paths")[1].split("```sh\n")[1].split("```")[0].splitlines()
        made = self.stream({"system": {"db_conn_time": 5, "host": [
            {"hostName": "ada", "cpu": {"cpuOnline": 8}, "memory": {"memFree": 7, "memTotal": 2 ** 64}}]}})
        for name in ("x.tav", "y.tav"):
            (self.folder / name).write_bytes(made)
        for line in lines:
            with self.subTest(line=line):
                words = shlex.split(line, comments=True)
                result = tav(*words[1:], cwd=self.folder)
                self.assertEqual((result.status, result.err), (0, ""))
                self.assertEqual(result.out != "", words[1] == "get")

    def test_several_paths_give_values_in_the_order_of_the_stream(self):
        path = self.snapshot()
        name, system = (tav("get", path, one).out for one in ("//hostName", "//osName"))
        self.assertEqual(tav("get", path, "//osName", "//hostName").out, name + system)

    def test_each_root_counts_and_damage_is_passed_over(self):
        path = self.folder / "roots.tav"
        roots = [self.stream({"system": {"host": [{"hostName": name}]}}) for name in ("ada", "bob", "eve")]
        path.write_bytes(b"".join(roots))
        self.assertEqual(tav("get", path, "-a", "/system[2]//hostName").out, "bob\n")
        self.assertEqual(tav("get", path, "-a", "/system[last()]//hostName").out, "eve\n")
        self.assertEqual(tav("get", path, "-a", "//hostName[../../..]").status, 1)
        broken = bytearray(roots[0])
        broken[32:48] = b"\xee" * 16
        path.write_bytes(bytes(broken) + roots[1])
        found = tav("get", path, "-a", "//host[hostName='bob']/hostName")
        self.assertEqual((found.out, found.status), ("bob\n", 1))
        self.assertIn("0x20", found.err)

    # Paths that somebody made to keep a program busy, and whether they are paths. 128 KiB are as long as a word can be.
    HOSTILE = (("/host" * 10000, True), ("//*" * 5000, True), ("[" * 120000, False), ("host[" * 20000, False),
               ("//*[.//*" * 30 + "]" * 30, True), ("//.." * 100, False), ("host[" + "(" * 120000, False),
               ("//host[" + "not(" * 30 + "cpu" + ")" * 30 + "]/nothing", None), ("host[" + "a or " * 20000 + "a]", None),
               ("//*[" + "*[" * 60 + "cpu" + "]" * 61, True), ("host" + "[1]" * 30000, None), ("*" * 100000, False))

    def test_hostile_paths_end_in_a_sentence_in_every_command(self):
        path = self.snapshot()
        out = self.folder / "out.tav"
        commands = {"get": ("get", path, "{}"), "get --all": ("get", path, "--all", "{}"), "set": ("set", path, "{}", "1"),
                    "table --each": ("table", path, "--each", "{}", "--col", "cpu"), "hex --path": ("hex", path, "--path", "{}"),
                    "table --col": ("table", path, "--each", "/system", "--col", "{}"),
                    "extract": ("extract", path, "{}", "-o", out), "diff --path-a": ("diff", path, "--path-a", "{}", "--path-b", "/"),
                    "diff --path-b": ("diff", path, path, "--path-b", "{}"), "diff --ignore": ("diff", path, path, "--ignore", "{}")}
        content = path.read_bytes()
        for hostile, is_path in self.HOSTILE:
            for name, words in commands.items():
                with self.subTest(path=hostile[:20], command=name):
                    before = processor_time()
                    result = tav(*[hostile if word == "{}" else word for word in words])
                    used = processor_time() - before
                    # A column without values, and nothing to leave out, are no findings.
                    fine = (0,) if name in ("table --col", "diff --ignore") else ()
                    self.assertIn(result.status, (2,) if is_path is False else (1, 2, *fine) if is_path is None else (1, *fine),
                                  result.err[:500])
                    self.assertTrue(result.err.startswith("tav: ") or result.status in fine or name.startswith("table"),
                                    result.err[:500])
                    self.assertFalse(out.exists())
                    self.assertLess(used, 20 if SANITIZED else 1)
        self.assertEqual(path.read_bytes(), content)

    def test_a_misspelt_name_gets_a_hint(self):
        self.assertIn("did you mean host?", tav("get", self.snapshot(), "/system/hostt").err)


if __name__ == "__main__":
    unittest.main()
