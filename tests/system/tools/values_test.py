"""Values as text: numbers, dates, texts, bytes, in both byte orders."""
import json
import struct
import unittest

from support import BIG_ENDIAN, WINDOWS, ToolTest, bytes_of_hex, tav


def stream(order, *nodes):
    body = b"".join(struct.pack(order + "QIHH", len(payload), 0, kind, elm) + payload for kind, elm, payload in nodes)
    return struct.pack(order + "QIHH", len(body), 0, 2, 60100) + body


def stamp(order, seconds, a=0, b=0, zone=0):
    return struct.pack(order + "QHHHh", seconds, a, b, 0, zone)


def wide(order, value):
    return value.to_bytes(16, "little" if order == "<" else "big", signed=value < 0)


class Values(ToolTest):
    def value(self, order, kind, payload):
        path = self.folder / "v.tav"
        path.write_bytes(stream(order, (kind, 60103, payload), (55, 307, struct.pack(order + "I", 7))))
        result = tav("get", path, "/system/hostName")
        self.assertEqual((result.status, result.err), (0, ""))
        return result.out[:-1]

    def test_numbers_are_decimal(self):
        for order in "<>":
            for kind, code, value in ((51, "B", 200), (52, "b", -3), (53, "H", 65535), (54, "h", -32768),
                                      (55, "I", 4294967295), (56, "i", -5), (57, "Q", 2**64 - 1), (58, "q", -2**63)):
                with self.subTest(order=order, kind=kind):
                    self.assertEqual(self.value(order, kind, struct.pack(order + code, value)), str(value))
            for value in (0, 1, 2**64, 2**128 - 1, 10**38):
                self.assertEqual(self.value(order, 103, wide(order, value)), str(value))
            for value in (-1, -2**127, -10**38, 2**127 - 1):
                self.assertEqual(self.value(order, 104, wide(order, value)), str(value))
            self.assertEqual(self.value(order, 106, struct.pack(order + "3Q", 1, 2, 2**63)), f"[1 2 {2**63}]")

    def test_dates_are_those_of_the_calendar(self):
        for order in "<>":
            for seconds, zone, text in ((0, 0, "1970-01-01T00:00:00.000000+00:00"),
                                        (68169600, 0, "1972-02-29T00:00:00.000000+00:00"),
                                        (951782400, 0, "2000-02-29T00:00:00.000000+00:00"),
                                        (1735603200, 0, "2024-12-31T00:00:00.000000+00:00"),
                                        (4107542400, 0, "2100-03-01T00:00:00.000000+00:00"),
                                        (3600, -60, "1970-01-01T00:00:00.000000-01:00"),
                                        (0, -90, "1969-12-31T22:30:00.000000-01:30"),
                                        (253402300799, 0, "9999-12-31T23:59:59.000000+00:00"),
                                        (253402300800, 0, "253402300800 s"), (2**64 - 1, 5, f"{2**64 - 1} s")):
                with self.subTest(order=order, seconds=seconds):
                    self.assertEqual(self.value(order, 100, stamp(order, seconds, zone=zone)), text)
            self.assertEqual(self.value(order, 100, stamp(order, 0, 2500, 7)), "1970-01-01T00:00:02.500007+00:00")

    def test_texts_are_plain_in_get_and_escaped_in_tree(self):
        text = "a\"b\\c\n\x1b[31m".encode() + "é€😀".encode()
        for order in "<>":
            self.assertEqual(self.value(order, 102, struct.pack(order + "H", 1208) + text), text.decode())
            tree = tav("tree", self.folder / "v.tav").out
            self.assertIn('"a\\"b\\\\c\\n\\x1b[31mé€😀"', tree)
            self.assertNotIn("\x1b", tree)
        self.value("<", 50, b"\xff\xc0\x80ok")
        self.assertIn('"\\xff\\xc0\\x80ok"', tav("tree", self.folder / "v.tav").out)

    def test_values_of_the_wrong_size_and_bytes_are_hexadecimal(self):
        self.assertEqual(self.value("<", 55, b"\x01\x02\x03"), "010203")
        self.assertEqual(self.value("<", 101, bytes(range(5))), "0001020304")
        self.assertEqual(self.value("<", 107, b"\xab"), "ab")
        self.assertEqual(self.value("<", 101, b""), "")

    def test_raw_gives_the_bytes_as_they_stand(self):
        payload = struct.pack(">I", 0x01020304)
        self.value(">", 55, payload)
        self.assertEqual(tav("get", self.folder / "v.tav", "/system/hostName", "--raw").raw, payload)
        large = bytes(range(256)) * 9000
        self.value("<", 101, large)
        self.assertEqual(tav("get", self.folder / "v.tav", "/system/hostName", "--raw").raw, large)

    def test_json_is_read_by_a_parser(self):
        self.value("<", 50, b'a"\n\xff')
        lines = tav("get", self.folder / "v.tav", "--all", "--json", "**").out.splitlines()
        found = [json.loads(line) for line in lines]
        self.assertEqual([one["path"] for one in found], ["/system", "/system/hostName", "/system/node_number"])
        self.assertEqual(found[2]["value"], 7)

    def test_a_path_that_leads_nowhere_is_status_1(self):
        self.value("<", 50, b"x")
        result = tav("get", self.folder / "v.tav", "/system/hostName", "/system/host")
        self.assertEqual((result.status, result.out), (1, "x\n"))
        self.assertIn("/system/host: no match", result.err)

    def test_elements_are_found_by_pattern_and_id(self):
        self.assertEqual(tav("elements", "60103").out.split(), ["60103", "TAV_ELM_CMN_HOST_NAME", "hostName"])
        self.assertEqual(tav("elements", "#60103").out, tav("elements", "TAV_ELM_CMN_HOST_NAME").out)
        self.assertGreater(len(tav("elements").out.splitlines()), 2000)
        nothing = tav("elements", "zzzz")
        self.assertEqual((nothing.status, nothing.out), (1, ""))

    def test_snapshots_of_every_form_are_recognised(self):
        for options in ((), ("--byte-order", "big"), ("--byte-order", "little", "--align"), ("--hdr32",),
                        ("--eye-size",), ("--eye-size", "--byte-order", "big", "--align"), ("--hdr32", "--align")):
            with self.subTest(options=options):
                path = self.snapshot(*options)
                info = tav("info", path)
                self.assertEqual(info.status, 0, info.out)
                big = "big" in options or (BIG_ENDIAN and "little" not in options)
                self.assertIn("byte order        " + ("big" if big else "little") + "-endian", info.out)
                self.assertIn("root header       " + ("32" if "--hdr32" in options else "64") + "-bit", info.out)
                self.assertEqual(tav("get", path, "/system/host/os/osName").out,
                                 "Windows\n" if WINDOWS else "Linux\n")
                self.assertEqual(bytes_of_hex(tav("hex", path).out), path.read_bytes())

    def test_print_is_the_librarys_own_form(self):
        path = self.snapshot()
        text = tav("print", path)
        self.assertEqual(text.status, 0)
        self.assertIn("TAV_ELM_CMN_HOST_NAME\n", text.out)
        self.assertTrue(tav("print", "--xml", path).out.startswith('<?xml version="1.0" encoding="UTF-8" ?>\n<system>\n'))
        self.assertIn("nodeOffset", tav("print", "--headers", path).out)
        self.value("<", 102, b"\xb8\x04text")
        refused = tav("print", self.folder / "v.tav")
        self.assertEqual(refused.status, 3)
        self.assertIn("TAV_RC_NOT_SUPPORTED", refused.err)


if __name__ == "__main__":
    unittest.main()
