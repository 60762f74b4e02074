"""Paths against an XPath 1.0 engine on the output of `tav xml`: random streams, random paths, the same nodes in the same
order, by the inspection library and by the layer.

    xpath_test.py [PAIRS [SEED]]   as many pairs of stream and path as are asked for, and how many of them found nodes
"""
import os
import random
import subprocess
import sys
import unittest

try:
    from lxml import etree
except ImportError:
    etree = None

import encode
from support import EMULATOR, ToolTest, tav

GROUPS = {"system": 60100, "host": 60102, "os": 60104, "cpu": 60109, "memory": 60117}
DATA = {"hostName": 60103, "osName": 60105, "cpuOnline": 60111, "memTotal": 60118, "memFree": 60119}
INTEGERS = (*encode.INTEGERS, 103, 104)
TEXTS = ("ada", "bob", "5", "12", " 7 ", "x y", "-3", "1.5", "", "abba", "008")
TYPES = ("Uint32", "Sint32", "Uint64", "ASCII String", "UTF8 String", "Uint128", "group64", "group32")
ENDS = ("endHdrMarker", "endHdrEyeSize")
PATHS = 200  # for each stream


class Stream:
    """Groups and data elements have names of their own: XPath gives a group a value, the texts of all that is in it."""

    def __init__(self, draw):
        self.draw = draw
        self.writer = encode.Writer(draw.choice(encode.Form.all()))
        self.pairs = draw.random() < 0.4
        self.writer.open(GROUPS["system"], draw.random() < 0.2, self.pairs)
        for _ in range(draw.randrange(10, 60)):
            kind = draw.random()
            if kind < 0.35 and len(self.writer.groups) < 6:
                self.writer.open(draw.choice(list(GROUPS.values())), draw.random() < 0.2, self.pairs and draw.random() < 0.5)
            elif kind < 0.55 and len(self.writer.groups) > 1:
                self.writer.close()
            else:
                self.data()
        while self.writer.groups:
            self.writer.close()

    def data(self):
        draw, order = self.draw, "big" if self.writer.form.big else "little"
        elm, kind = draw.choice(list(DATA.values())), draw.choice((*INTEGERS, encode.ASCII, encode.ASCII, encode.UTF8))
        if kind == encode.ASCII:
            payload = draw.choice(TEXTS).encode()
        elif kind == encode.UTF8:
            payload = (1208).to_bytes(2, order) + draw.choice(TEXTS).encode()
        else:
            size = {51: 1, 52: 1, 53: 2, 54: 2, 55: 4, 56: 4, 57: 8, 58: 8, 105: 1}.get(kind, 16)
            signed = kind in (52, 54, 56, 58, 104)
            kind = 51 if kind == 105 else kind
            payload = draw.choice((0, 1, 5, 12, -3 if signed else 3)).to_bytes(size, order, signed=signed)
        self.writer.data(elm, kind, payload, self.pairs and draw.random() < 0.3)

    def bytes(self):
        return bytes(self.writer.bytes)


class Paths:
    """Random paths; `up` stands for the parent: what is above the roots is no node for a path, but one in the XML."""

    UP = "<up>"

    def __init__(self, draw):
        self.draw = draw

    def path(self):
        branches = [self.branch() for _ in range(2 if self.draw.random() < 0.12 else 1)]
        return " | ".join(branches).replace(self.UP, ".."), " | ".join("/tav" + one for one in branches).replace(
            self.UP, "parent::*[parent::*]")

    def branch(self):
        start = self.draw.choice(("/", "//", "//", "/system/", "/system//"))
        return start + self.steps(self.draw.randrange(1, 4), 2)

    def steps(self, count, depth, last=None):
        text = ""
        for i in range(count):
            text += self.draw.choice(("/", "/", "//")) if i else ""
            text += last(depth) if last and i == count - 1 else self.step(depth)
        return text

    def step(self, depth):
        kind = self.draw.random()
        if kind < 0.10:
            return self.UP
        if kind < 0.16:
            return "."
        if kind < 0.40:
            return "*" + self.brackets(depth, False)
        if kind < 0.75:
            return self.draw.choice(list(GROUPS)) + self.brackets(depth, False)
        return self.value(depth)

    def value(self, depth):
        return self.draw.choice(list(DATA)) + self.brackets(depth, True)

    def brackets(self, depth, is_value):
        count = self.draw.choice((0, 0, 0, 1, 1, 2)) if depth else 0
        return "".join(f"[{self.condition(depth - 1, is_value)}]" for _ in range(count))

    def number(self):
        return self.draw.choice(("0", "1", "2", "3", "5", "-3", "7", "8", "12", "1.5", "4.5"))

    def literal(self):
        return self.draw.choice((self.number(), "'" + self.draw.choice(TEXTS) + "'"))

    def operator(self):
        return self.draw.choice((" = ", "=", " != ", " < ", "<=", " > ", ">="))

    def values(self, depth):
        """What leads to values: to data elements or attributes alone."""
        if self.draw.random() < 0.15:
            return self.draw.choice(("", "../", "*/")).replace("..", self.UP) + "@type"
        start = self.draw.choice(("", "", ".//", "../", "../../")).replace("..", self.UP)
        return start + self.steps(self.draw.randrange(1, 3), depth, self.value)

    def condition(self, depth, is_value):
        draw, kind = self.draw, self.draw.randrange(13)
        if kind == 0:
            return draw.choice(("1", "2", "3", "last()", "last()-1", "last() - 2"))
        if kind == 1:
            return f"position(){self.operator()}{draw.choice(('1', '2', '3', 'last()', 'last()-1'))}"
        if kind in (2, 3):
            return draw.choice(("", ".//", "../")).replace("..", self.UP) + self.steps(draw.randrange(1, 3), depth)
        if kind in (4, 5):
            return self.values(depth) + self.operator() + self.literal()
        if kind == 6:
            return self.literal() + self.operator() + self.values(depth)
        if kind == 7:
            return self.values(depth) + self.operator() + self.values(depth)
        if kind == 8:
            return f"not({self.condition(depth, is_value)})"
        if kind == 9:
            word = draw.choice((" and ", " or "))
            parts = [self.truth(depth, is_value) for _ in range(draw.randrange(2, 4))]
            return word.join(parts)
        if kind == 10:
            function = draw.choice(("contains", "starts-with"))
            return f"{function}({self.values(depth)}, '{draw.choice(('a', 'b', 'bb', '1', '', 'x ', 'int'))}')"
        if kind == 11 or not is_value:
            return draw.choice((f"@type='{draw.choice(TYPES)}'", "@header", "@eyeSize", "@eyeSize='true'", "@id"))
        return draw.choice((f".{self.operator()}{self.literal()}", f"contains(., '{draw.choice('ab15')}')"))

    def truth(self, depth, is_value):
        condition = self.condition(depth, is_value)
        return f"({condition})" if " and " in condition or " or " in condition else condition


def expected(root, path, places):
    found = root.xpath(path)
    return [places[one] for one in found if one in places]


def compare(folder, pairs, seed):
    """Compares so many pairs, and returns how many there were, how many of them found nodes, and what differs."""
    done = useful = 0
    wrong = []
    file = folder / "paths.tav"
    while done < pairs:
        draw = random.Random(seed)
        file.write_bytes(Stream(draw).bytes())
        xml = tav("xml", file)
        offsets = [int(line.split()[0], 16) for line in tav("tree", file, "--paths", "--width", "0").out.splitlines()
                   if not any(end in line for end in ENDS)]
        root = etree.fromstring(xml.raw).getroottree()
        elements = [one for one in root.iter() if one is not root.getroot()]
        if xml.status != 0 or len(elements) != len(offsets):
            return done, useful, [(seed, "nodes", len(elements), len(offsets), xml.err)]
        places = dict(zip(elements, offsets))
        paths = [Paths(draw).path() for _ in range(PATHS)]
        asked = "".join(path + "\n" for path, _ in paths)
        result = subprocess.run([*EMULATOR, os.environ["TAV_PATHS"], file], input=asked.encode(), capture_output=True)
        if result.returncode != 0:
            return done, useful, [(seed, result.stderr.decode())]
        for (path, xpath), line in zip(paths, result.stdout.decode().splitlines(), strict=True):
            want = expected(root, xpath, places)
            for face, text in zip(("inspect", "layer"), line.split("|"), strict=True):
                if [int(one) for one in text.split()] != want:
                    wrong.append((seed, face, path, want, text))
            done, useful = done + 1, useful + (1 if want else 0)
        seed += 1
    return done, useful, wrong


@unittest.skipUnless(etree, "lxml is not installed")
class AgainstXPath(ToolTest):
    def test_random_paths_lead_to_the_same_nodes_in_the_same_order(self):
        done, useful, wrong = compare(self.folder, 4000, 1)
        self.assertEqual(wrong[:3], [])
        self.assertGreater(useful, done // 5, "too few of the paths lead anywhere")

    def test_numbers_that_a_double_does_not_hold_are_told_apart(self):
        # Where an XPath engine rounds, exactness is what is wanted.
        writer = encode.Writer(encode.Form())
        writer.open(60100)
        for number in (2 ** 53, 2 ** 53 + 1, 2 ** 64 - 1):
            writer.data(60118, encode.UINT64, encode.words(number))
        writer.close()
        path = self.folder / "large.tav"
        path.write_bytes(writer.bytes)
        self.assertEqual(tav("get", path, "-a", f"//memTotal[. > {2 ** 53}]").out.split(), [str(2 ** 53 + 1), str(2 ** 64 - 1)])
        self.assertEqual(tav("get", path, f"//memTotal[. = {2 ** 53 + 1}]").out.split(), [str(2 ** 53 + 1)])


def main(arguments):
    import pathlib
    import tempfile
    pairs, seed = (int(one) for one in [*arguments, *["100000", "1"][len(arguments):]])
    with tempfile.TemporaryDirectory() as folder:
        done, useful, wrong = compare(pathlib.Path(folder), pairs, seed)
    for one in wrong[:20]:
        print(*one)
    print(f"{done} pairs from seed {seed} on, {useful} of them with nodes, {len(wrong)} differences")
    return 1 if wrong else 0


if __name__ == "__main__":
    unittest.main() if "--unit" in sys.argv else sys.exit(main(sys.argv[1:]))
