"""tav diff: what is told, and what is not."""
import json
import random
import unittest

import encode
from json_test import Folder
from support import *


class Diff(Folder):
    def stream(self, document, name="a.tav", *options):
        path = self.folder / name
        result = tav("build", *options, "-o", path, "--force", stdin=json.dumps(document).encode())
        self.assertEqual((result.status, result.err), (0, ""))
        return path

    def diff(self, a, b, *options):
        return tav("diff", self.stream(a), self.stream(b, "b.tav"), *options)

    def rows(self, a, b, *options):
        result = self.diff(a, b, *options)
        self.assertEqual(result.err, "")
        self.assertEqual(result.status, 1 if result.out else 0)
        return result.out.splitlines()

    def test_equal_streams_have_no_difference(self):
        for seed in range(40):
            data = encode.RandomStream(seed, wild=True).bytes()
            a, b = self.file(data, "a.tav"), self.file(data, "b.tav")
            with self.subTest(seed=seed):
                self.assertEqual((tav("diff", a, b).status, tav("diff", a, b).out), (0, ""))

    def test_the_form_is_no_difference(self):
        document = {"system": {"host": {"hostName": "ada", "cpuOnline": 8, "osName": "gr\u00fcn"},
                               "appl": {"id": {"$type": "Uint64 array", "$value": [1, 2 ** 60]}}}}
        path = self.stream(document)
        for options in [("--byte-order", "big"), ("--root", "32"), ("--align",), ("--eye-size", "--align")]:
            with self.subTest(options=options):
                other = self.stream(document, "b.tav", *options)
                self.assertEqual((tav("diff", path, other).out, tav("diff", path, other).status), ("", 0))

    def test_a_changed_value_is_told_with_both(self):
        self.assertEqual(self.rows({"system": {"cpuOnline": 8}}, {"system": {"cpuOnline": 9}}),
                         ["~ /system/cpuOnline  Uint32  8 -> 9"])

    def test_a_changed_type_is_told(self):
        rows = self.rows({"system": {"cpuOnline": 8}}, {"system": {"cpuOnline": "8"}})
        self.assertEqual(rows, ['~ /system/cpuOnline  Uint32  8 -> ASCII String  "8"'])

    def test_what_only_one_has_is_told(self):
        self.assertEqual(self.rows({"system": {"cpuOnline": 8}}, {"system": {"osName": "x"}}),
                         ["- /system/cpuOnline  Uint32  8", '+ /system/osName  ASCII String  "x"'])

    def test_a_group_is_told_once_with_the_number_of_its_nodes(self):
        self.assertEqual(self.rows({"system": {"host": {"os": {"osName": "x"}}}}, {"system": {}}),
                         ["- /system/host  group of 2 nodes"])

    def test_groups_are_matched_by_their_keys(self):
        for key in ("hostName", "node_number", "db_name"):
            def host(name, cpus):
                return {"cpuOnline": cpus, key: name}
            with self.subTest(key=key):
                rows = self.rows({"system": {"host": [host("a", 1), host("b", 2), host("c", 3)]}},
                                 {"system": {"host": [host("c", 3), host("d", 4), host("a", 7)]}})
                self.assertEqual(rows, ["~ /system/host/cpuOnline (/system/host[3]/cpuOnline)  Uint32  1 -> 7",
                                        "- /system/host[2]  group of 2 nodes", "+ /system/host[2]  group of 2 nodes"])

    def test_elements_without_keys_are_matched_by_what_is_equal(self):
        self.assertEqual(self.rows({"system": {"osName": ["a", "b", "c", "d"]}},
                                   {"system": {"osName": ["b", "c", "x", "d"]}}),
                         ['- /system/osName  ASCII String  "a"', '+ /system/osName[3]  ASCII String  "x"'])

    def test_the_order_of_different_elements_is_no_difference(self):
        self.assertEqual(self.rows({"system": {"osName": "a", "cpuOnline": 1}}, {"system": {"cpuOnline": 1, "osName": "a"}}), [])

    def test_ignored_paths_are_left_out(self):
        a = {"system": {"host": {"hostName": "a", "memory": {"memFree": 1}, "cpuOnline": 1}}}
        b = {"system": {"host": {"hostName": "a", "memory": {"memFree": 2}, "cpuOnline": 2}}}
        self.assertEqual(self.rows(a, b, "--ignore", "**/memory"), ["~ /system/host/cpuOnline  Uint32  1 -> 2"])
        self.assertEqual(self.rows(a, b, "--ignore", "**/memory", "--ignore", "/system/host/cpuOnline"), [])

    def test_tolerance(self):
        for a, b, tolerance, same in [(100, 101, "1", True), (100, 102, "1", False), (-1, 1, "2", True), (-1, 1, "1", False),
                                      (1000, 1009, "1%", True), (1000, 1020, "1%", False), (100, 101, "0", False),
                                      (100, 101, "1.5", True)]:
            kind = {"$type": "Sint64"}
            rows = self.rows({"system": {"memFree": {**kind, "$value": a}}}, {"system": {"memFree": {**kind, "$value": b}}},
                             "--tolerance", tolerance)
            with self.subTest(a=a, b=b, tolerance=tolerance):
                self.assertEqual(rows == [], same)

    def test_json_tells_the_same(self):
        result = self.diff({"system": {"cpuOnline": 8, "osName": "x"}}, {"system": {"cpuOnline": 9}}, "--json")
        rows = [json.loads(line) for line in result.out.splitlines()]
        self.assertEqual(rows, [
            {"change": "changed", "path": "/system/cpuOnline", "offset": 16, "type": "Uint32", "value": "8",
             "pathNow": "/system/cpuOnline", "offsetNow": 16, "typeNow": "Uint32", "valueNow": "9"},
            {"change": "removed", "path": "/system/osName", "offset": 36, "type": "ASCII String", "value": '"x"'}])

    def test_every_planted_change_of_a_number_is_found_at_its_path(self):
        draw = random.Random(1)
        for seed in range(30):
            path = self.file(encode.RandomStream(seed, encode.Form(), nodes=60).bytes(), "a.tav")
            rows = [json.loads(line) for line in tav("json", path, "--lines").raw.splitlines()]
            numbers = [row for row in rows if row.get("type") in ("Uint32", "Uint64")]
            if not numbers:
                continue
            changed = draw.choice(numbers)
            changed["value"] ^= 1
            text = "\n".join(map(json.dumps, rows)).encode()
            other = self.file(tav("build", stdin=text).raw, "b.tav")
            told = [json.loads(line) for line in tav("diff", path, other, "--json").raw.splitlines()]
            with self.subTest(seed=seed):
                self.assertEqual([(row["change"], row["offset"]) for row in told], [("changed", changed["offset"])])
                self.assertEqual(tav("get", path, told[0]["path"]).out.strip(), told[0]["value"])

    def test_colour_only_when_it_is_asked_for(self):
        a, b = {"system": {"cpuOnline": 8}}, {"system": {"cpuOnline": 9}}
        self.assertNotIn("\033", self.diff(a, b).out)
        self.assertIn("\033[33m", self.diff(a, b, "--color", "always").out)

    def test_bad_input_is_told(self):
        path = self.stream({"system": {}})
        self.assertEqual(tav("diff", path, self.folder / "none").status, 2)
        self.assertEqual(tav("diff", "-", "-").status, 2)
        self.assertEqual(tav("diff", path, path, "--tolerance", "much").status, 2)
        self.assertEqual(tav("diff", path, path, "--ignore", "/nosuchname").status, 1)
        self.assertEqual(tav("diff", path, self.file(b"no stream at all\n")).status, 3)
        self.assertEqual(tav("diff", path, "-", stdin=path.read_bytes()).status, 0)

    def test_damaged_streams_are_compared_to_their_end(self):
        for seed in range(60):
            draw = random.Random(seed)
            data = encode.RandomStream(seed, encode.Form()).bytes()
            hurt = encode.damaged(data, encode.DAMAGES[seed % len(encode.DAMAGES)], draw)
            with self.subTest(seed=seed):
                self.assertIn(tav("diff", self.file(data, "a.tav"), self.file(hurt, "b.tav")).status, (0, 1, 3))

    def test_many_children_and_many_levels(self):
        writer = encode.Writer(encode.Form())
        writer.open(60100)
        for i in range(30000):
            writer.data(60103, encode.UINT32, encode.words(i, size=4))
        for _ in range(20000):
            writer.open(60102)
        while writer.groups:
            writer.close()
        path = self.file(bytes(writer.bytes), "a.tav")
        writer.bytes[16 + 20 * 15000 + 16] ^= 0xFF
        other = self.file(bytes(writer.bytes), "b.tav")
        result = tav_in_little_memory("diff", path, other)
        self.assertEqual(len(result.out.splitlines()), 1)
        self.assertTrue(result.out.startswith("~ /system/hostName[15001]  Uint32  15000 -> "), result.out)

    def test_subtrees_of_one_file_are_compared(self):
        week = {"system": [{"host": {"hostName": "ada", "cpuOnline": 8}}, {"host": {"hostName": "ada", "cpuOnline": 9}}]}
        path = self.stream({"nodes": [{"element": "system", "children": []}]})
        days = [tav("build", stdin=json.dumps({"system": day}).encode()).raw for day in week["system"]]
        path.write_bytes(b"".join(days))
        result = tav("diff", path, "--path-a", "/system[1]", "--path-b", "/system[2]")
        self.assertEqual((result.status, result.out, result.err),
                         (1, "~ /system/host/cpuOnline (/system[2]/host/cpuOnline)  Uint32  8 -> 9\n", ""))
        self.assertEqual(tav("diff", path, "--path-a", "/system[2]").status, 0)
        self.assertEqual(tav("diff", path).status, 2)

    def test_subtrees_stand_for_each_other_whatever_their_names(self):
        a = {"system": {"host": {"hostName": "ada", "cpuOnline": 8}}}
        b = {"system": {"appl": {"os": {"cpuOnline": 8, "hostName": "ada"}}, "cpuOnline": 8}}
        self.assertEqual(self.rows(a, b, "--path-a", "/system/host", "--path-b", "/system/appl/os"), [])
        self.assertEqual(self.rows(a, b, "--path-a", "/system/host", "--path-b", "/system/appl/os", "--ignore", "**/cpuOnline"), [])
        self.assertEqual(self.rows(a, b, "--path-a", "**/host/cpuOnline", "--path-b", "/system/cpuOnline"), [])
        self.assertEqual(self.rows(a, b, "--path-a", "**/host", "--path-b", "/system/cpuOnline"),
                         ["~ /system/host (/system/cpuOnline)  group of 2 nodes -> Uint32  8"])
        self.assertEqual(self.rows(a, b, "--path-a", "/system/host", "--path-b", "/system"),
                         ["- /system/host/hostName  ASCII String  \"ada\"", "+ /system/appl  group of 3 nodes"])

    def test_a_path_that_leads_nowhere_is_told(self):
        document = {"system": {"cpuOnline": 8}}
        for what, *options in (("no match", "--path-a", "/system/host"),
                               ("no element is called 'sytem'", "--path-a", "/system", "--path-b", "/sytem")):
            result = self.diff(document, document, *options)
            self.assertEqual((result.status, result.out), (1, ""))
            self.assertIn(what, result.err)
        self.assertEqual(self.diff(document, document, "--path-a", "/system[").status, 2)

    def test_deep_subtrees_are_compared(self):
        deep = '{"system": ' * 80 + '{"cpuOnline": %d}' + "}" * 80
        path = "/".join([""] + ["system"] * 70)
        rows = self.rows(json.loads(deep % 8), json.loads(deep % 9), "--path-a", path)
        self.assertEqual(len(rows), 1)
        self.assertRegex(rows[0], r"^~ /\*\*/cpuOnline\[@0x[0-9a-f]+\]  Uint32  8 -> 9$")
        self.assertEqual(self.rows(json.loads(deep % 8), json.loads(deep % 8), "--path-a", path), [])

    def test_groups_are_matched_by_the_keys_that_are_named(self):
        a = {"system": {"host": [{"osName": "x", "cpuOnline": 1}, {"osName": "y", "cpuOnline": 2}]}}
        b = {"system": {"host": [{"osName": "y", "cpuOnline": 2}, {"osName": "z", "cpuOnline": 7}, {"osName": "x", "cpuOnline": 9}]}}
        self.assertEqual(self.rows(a, b, "--key", "osName"),
                         ["~ /system/host/cpuOnline (/system/host[3]/cpuOnline)  Uint32  1 -> 9", "+ /system/host[2]  group of 2 nodes"])
        self.assertNotEqual(self.rows(a, b), self.rows(a, b, "--key", "osName"))
        result = self.diff(a, b, "--key", "osNmae")
        self.assertEqual(result.status, 2)
        self.assertIn("did you mean osName", result.err)

    def test_the_contents_of_what_one_side_has_are_told_when_asked(self):
        a = {"system": {"host": {"os": {"osName": "x"}, "cpuOnline": 8}}}
        rows = self.rows(a, {"system": {}}, "--contents")
        self.assertEqual(rows, ["- /system/host  group of 3 nodes", "- /system/host/os  group of 1 node",
                                '- /system/host/os/osName  ASCII String  "x"', "- /system/host/cpuOnline  Uint32  8"])
        self.assertEqual([row.replace("-", "+", 1) for row in rows], self.rows({"system": {}}, a, "--contents"))


if __name__ == "__main__":
    unittest.main()
