"""tav schema: the shape of any number of streams."""
import json
import random
import unittest

from damage_test import STREAM, host, overwritten
from json_test import Folder
from support import tav, tav_in_little_memory

RANGES = {"Uint8": (0, 2**8), "Sint8": (-2**7, 2**7), "Uint16": (0, 2**16), "Sint16": (-2**15, 2**15), "Uint32": (0, 2**32),
          "Sint32": (-2**31, 2**31), "Uint64": (0, 2**64), "Sint64": (-2**63, 2**63), "Uint128": (0, 2**128),
          "Sint128": (-2**127, 2**127)}
TAGS = ("hostName", "cpuOnline", "memTotal", "osName", "cpuConfig")
FORMS = ((), ("--byte-order", "big"), ("--byte-order", "little", "--align"), ("--root", "32"), ("--eye-size",))


class Expected:
    """What is in a document, counted here."""

    def __init__(self):
        self.paths = {}

    def seen(self, path, kind, value=None):
        line = self.paths.setdefault(path, {"path": path, "count": 0, "types": set(), "numbers": [], "texts": set()})
        line["count"] += 1
        line["types"].add(kind)
        if value is not None:
            line["numbers"].append(value) if isinstance(value, int) else line["texts"].add(value)

    def lines(self):
        for line in self.paths.values():
            numbers, texts = line.pop("numbers"), line.pop("texts")
            if numbers:
                line |= {"min": min(numbers), "max": max(numbers)}
            if texts:
                line["distinct"] = len(texts)
            yield line


def random_group(chance, expected, path, depth, kind):
    """Children of a group for `tav build`, each counted."""
    items = []
    for _ in range(chance.randrange(1, 7)):
        if depth and chance.random() < 0.4:
            tag = chance.choice(("host", "cpu", "memory"))
            expected.seen(f"{path}/{tag}", kind)
            items.append({"element": tag, "children": random_group(chance, expected, f"{path}/{tag}", depth - 1, kind)})
            continue
        tag = chance.choice(TAGS)
        if chance.random() < 0.3:
            name, value = "ASCII String", chance.choice("abcdefgh") * chance.randrange(3)
        else:
            name = chance.choice(list(RANGES))
            low, high = RANGES[name]
            value = chance.choice((low, high - 1, max(low, -1), 0, chance.randrange(low, high)))
        expected.seen(f"{path}/{tag}", name, value)
        items.append({"element": tag, "type": name, "value": value})
    return items


class Schema(Folder):
    def stream(self, document, name="a.tav", *options):
        path = self.folder / name
        result = tav("build", *options, "-o", path, "--force", stdin=json.dumps(document).encode())
        self.assertEqual((result.status, result.err), (0, ""))
        return path

    def lines(self, *arguments):
        result = tav("schema", "--json", *arguments)
        self.assertEqual((result.status, result.err), (0, ""))
        return [json.loads(line) for line in result.out.splitlines()]

    def test_it_finds_what_was_written(self):
        chance = random.Random(4711)
        for number in range(30):
            expected = Expected()
            paths = []
            for file in range(chance.randrange(1, 4)):
                options = chance.choice(FORMS)
                kind = "group32" if "32" in options else "group64"
                expected.seen("/system", kind)
                root = {"element": "system", "children": random_group(chance, expected, "/system", 3, kind)}
                paths.append(self.stream({"nodes": [root]}, f"{file}.tav", *options))
            with self.subTest(number=number):
                found = {}
                for line in self.lines(*paths):
                    line["types"] = set(line["types"])
                    for bound in ("min", "max"):
                        if bound in line:
                            line[bound] = int(line[bound])  # 128-bit ones are texts
                    found[line["path"]] = line
                self.assertEqual(found, {line["path"]: line for line in expected.lines()})

    def test_paths_come_in_the_order_of_the_tree(self):
        a = self.stream({"system": {"host": {"hostName": "x"}, "cpuOnline": 1}})
        b = self.stream({"system": {"host": {"osName": "y"}, "memTotal": 2}}, "b.tav")
        self.assertEqual([line["path"] for line in self.lines(a, b)],
                         ["/system", "/system/host", "/system/host/hostName", "/system/host/osName", "/system/cpuOnline",
                          "/system/memTotal"])

    def test_a_line_tells_range_and_number_of_texts(self):
        path = self.stream({"system": {"cpuOnline": [3, 8, 3], "hostName": ["a", "b", "a"], "memTotal": [7, 7]}})
        self.assertEqual(tav("schema", path).out,
                         "         1  /system            group\n"
                         "         3  /system/cpuOnline  Uint32  3 .. 8\n"
                         "         3  /system/hostName   ASCII String  2 distinct\n"
                         "         2  /system/memTotal   Uint32  7\n")

    def test_times_are_ordered_by_what_they_stand_for(self):
        early = {"$type": "UTC Timestamp", "$value": {"seconds": 100, "fractionA": 999, "fractionB": 0, "further": 0,
                                                      "offsetMinutes": 0}}
        late = {"$type": "UTC Timestamp", "$value": {"seconds": 99, "fractionA": 2001, "fractionB": 0, "further": 0,
                                                     "offsetMinutes": 60}}
        path = self.stream({"system": {"timestamp": [late, early]}})
        line = self.lines(path)[1]
        self.assertEqual((line["min"], line["max"]), ("1970-01-01T00:01:40.999000+00:00", "1970-01-01T01:01:41.001000+01:00"))

    def test_texts_are_counted_up_to_a_bound(self):
        path = self.stream({"system": {"hostName": [f"host{i}" for i in range(20)] * 2}})
        for bound, expected in (("19", (19, True)), ("20", (20, None)), ("0", (0, True))):
            line = self.lines(path, "--distinct", bound)[1]
            self.assertEqual((line["distinct"], line.get("more")), expected)
        self.assertIn("more than 19 distinct\n", tav("schema", path, "--distinct", "19").out)

    def test_long_texts_are_not_kept(self):
        path = self.stream({"system": {"hostName": [str(i) * (3 << 20) for i in range(5)]}})
        result = tav_in_little_memory("schema", path, "--json")
        self.assertEqual((result.status, json.loads(result.out.splitlines()[1])["more"]), (0, True))

    def test_end_elements_are_counted_when_asked_for(self):
        path = self.stream({"system": {"host": {"hostName": "x"}}}, "a.tav", "--eye-size")
        self.assertNotIn("endHdr", tav("schema", path).out)
        self.assertEqual(tav("schema", path, "--ends").out.count("endHdrEyeSize"), 2)

    def test_damage_is_told_and_the_rest_is_counted(self):
        path = self.file(overwritten(STREAM, host(3), host(4) - host(3)))
        result = tav("schema", path)
        self.assertEqual(result.status, 1)
        self.assertIn(f"{host(3):#x} /system: passed over", result.err)
        self.assertIn("        19  /system/host/cpuOnline  Uint64  0 .. 19\n", result.out)

    def test_what_cannot_be_read_does_not_end_it(self):
        path = self.file(STREAM)
        empty = self.file(b"", "empty.tav")
        for other, status in ((empty, 3), (self.folder / "none", 2)):
            result = tav("schema", path, other, path)
            self.assertEqual((result.status, result.err[:5], result.err.count("\ntav: ")), (status, "tav: ", 0))
            self.assertIn("        40  /system/host/cpuOnline", result.out)
        self.assertEqual(tav("schema", "-", "-").status, 2)
        self.assertIn("/system", tav("schema", "-", stdin=STREAM).out)

    def test_deep_streams_stay_in_proportion(self):
        document = '{"system": ' * 30 + '{"cpuOnline": 1}' + "}" * 30
        path = self.file(tav("build", stdin=document.encode()).raw)
        self.assertEqual(self.lines(path)[-1]["path"], "/system" * 30 + "/cpuOnline")
        self.assertIn("\u2026/system", tav("schema", path).out.splitlines()[-1])


if __name__ == "__main__":
    unittest.main()
