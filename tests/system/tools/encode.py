"""Writes streams byte by byte, without the library, so that tests of the program have something of their own to compare
with. Random streams come from a seed and are the same on every machine."""
import random
import struct

from layout import (ARRAY, ASCII, BINARY, END, EYE_SIZE, GROUP32, GROUP64, STAMP, UINT32, UINT64,  # noqa: F401
                    UTF8, ALIGNED, Form, header_length)
from support import BIG_ENDIAN

INTEGERS = {51: "B", 52: "b", 53: "H", 54: "h", 55: "I", 56: "i", 57: "Q", 58: "q", 105: "B"}
NAMES = [60100, 60102, 60103, 60101, 60104, 60105, 60109, 60111, 60117, 60118, 307, 321, 20, 1003, 1004, 45307]


HOST = "big" if BIG_ENDIAN else "little"


def words(*numbers, size=8):
    """Numbers as a stream in the order of the program's machine has them."""
    return b"".join(number.to_bytes(size, HOST) for number in numbers)


class Writer:
    """Appends nodes; groups are closed with `close`."""

    def __init__(self, form):
        self.form = form
        self.bytes = bytearray()
        self.groups = []  # [offset, wide, children wide, eye size]

    def pack(self, codes, *values):
        return struct.pack((">" if self.form.big else "<") + codes, *values)

    def wide(self):
        return self.groups[-1][2] if self.groups else self.form.wide

    def header(self, wide, size, kind, elm, info=0):
        return self.form.header(wide, size, kind, elm, self.form.info(info))

    def open(self, elm, narrow_children=False, eye=False, info=0, size=0):
        wide = self.wide()
        children = wide and not narrow_children
        self.groups.append([len(self.bytes), wide, children, wide and eye])
        self.bytes += self.header(wide, size, GROUP64 if children else GROUP32, elm, info | (EYE_SIZE if eye else 0))

    def close(self, keep_size=False):
        offset, wide, children, eye = self.groups.pop()
        start = offset + header_length(wide)
        if eye:
            pair = self.form.end_pair(len(self.bytes) - start, children)
            self.bytes += self.header(children, len(pair), BINARY, END) + pair
        if not keep_size:
            width = 8 if wide else 4
            self.bytes[offset:offset + width] = self.form.number(len(self.bytes) - start, width)

    def data(self, elm, kind, payload, eye=False, info=0, extra=b""):
        wide = self.wide()
        self.bytes += self.header(wide, len(payload), kind, elm, info | (EYE_SIZE if eye else 0)) + payload + extra
        self.bytes += self.form.padding(len(payload))
        if wide and eye:
            self.bytes += self.form.pair(len(payload), "little" if extra else None)


class RandomStream:
    """A stream with everything a writer can make, and with `wild` some things that none would."""

    def __init__(self, seed, form=None, nodes=40, wild=False):
        self.random = random.Random(seed)
        self.form = form or self.random.choice(Form.all())
        self.nodes, self.wild = nodes, wild
        self.writer = Writer(self.form)
        self.make()

    def chance(self, one_in):
        return self.random.randrange(one_in) == 0

    def element(self):
        return self.random.randrange(65000) if self.wild and self.chance(3) else self.random.choice(NAMES)

    def info(self):
        return self.random.getrandbits(32) & ~(EYE_SIZE | ALIGNED) if self.wild and self.chance(3) else 0

    def make(self):
        writer, eyes = self.writer, self.chance(2)
        sizes = self.random.choice([0, -1])
        writer.open(self.element(), self.chance(4), eyes, size=sizes)
        for _ in range(self.random.randrange(self.nodes)):
            kind = self.random.randrange(10)
            if kind < 2 and len(writer.groups) < 7:
                writer.open(self.element(), self.chance(4), eyes and self.chance(2), self.info(), sizes)
            elif kind == 2 and len(writer.groups) > 1:
                self.close()
            else:
                self.data(eyes and self.chance(2))
        leave = self.random.randrange(1, len(writer.groups) + 1) if self.chance(6) else 0
        while len(writer.groups) > leave:
            self.close()
        if self.chance(5):
            writer.bytes += bytes(self.random.choice([1, 16, 100, 8192]))

    def close(self):
        self.writer.close(keep_size=self.writer.groups[-1][3] and self.chance(8))

    def data(self, eye):
        draw, writer, extra = self.random, self.writer, b""
        kind = draw.choice(list(INTEGERS) + [ASCII, ASCII, UTF8, UTF8, STAMP, BINARY, 103, 104, ARRAY])
        if kind in INTEGERS:
            bits = 8 * struct.calcsize("<" + INTEGERS[kind])
            value = draw.choice([0, 1, draw.getrandbits(bits), 2 ** bits - 1, 2 ** (bits - 1)])
            payload = value.to_bytes(bits // 8, "big" if self.form.big else "little")
        elif kind == ASCII:
            payload = self.text()
        elif kind == UTF8:
            page = draw.choice([1208, 1208, 437])
            payload = writer.pack("H", page) + self.text()
            extra = draw.choice([b"", b"\0\0", b"\xff\x41"]) if self.chance(2) else b""
        elif kind == STAMP:
            payload = writer.pack("QHHHh", draw.choice([0, 1709202600, 253402300799, 2 ** 40, 2 ** 64 - 1]),
                                  draw.choice([0, 0, 0, 999]), draw.randrange(65536), draw.choice([0, 0, 7]),
                                  draw.choice([0, 60, -90, 1439, -32768]))
        elif kind == ARRAY:
            payload = draw.randbytes(8 * draw.randrange(5))
        else:
            payload = draw.randbytes(16 if kind in (103, 104) else draw.randrange(40))
        if self.wild and self.chance(8):
            kind, payload = draw.choice([kind, draw.randrange(3, 65536)]), draw.randbytes(draw.randrange(30))
            extra = extra if kind == UTF8 else b""  # behind other types they would be damage
        writer.data(self.element(), kind, payload, eye, self.info(), extra)

    def text(self):
        draw = self.random
        if self.chance(6):
            return draw.randbytes(draw.randrange(12))
        letters = "abc XYZ09\"\\/<>&'\u00e9\u20ac\U0001f600\n\t\r\0\x1b\x7f\u0085\ufffe"
        return "".join(draw.choice(letters) for _ in range(draw.randrange(14))).encode()

    def bytes(self):
        return bytes(self.writer.bytes)


def damaged(data, kind, draw):
    """A copy of a stream with damage of one kind."""
    data = bytearray(data)
    if not data:
        return bytes(data)
    at = draw.randrange(len(data))
    if kind == "cut":
        del data[at:]
    elif kind == "zeros":
        length = min(draw.choice([1, 8, 64, 1024]), len(data) - at)
        data[at:at + length] = bytes(length)
    elif kind == "bits":
        for _ in range(draw.randrange(1, 6)):
            data[draw.randrange(len(data))] ^= 1 << draw.randrange(8)
    elif kind == "swap":
        page = draw.choice([8, 64, 256])
        other = draw.randrange(len(data))
        a, b = (x // page * page for x in (at, other))
        length = min(page, len(data) - a, len(data) - b)
        data[a:a + length], data[b:b + length] = data[b:b + length], data[a:a + length]
    elif kind == "noise":
        length = min(draw.randrange(1, 40), len(data) - at)
        data[at:at + length] = draw.randbytes(length)
    elif kind == "insert":
        data[at:at] = draw.randbytes(draw.randrange(1, 20))
    return bytes(data)


DAMAGES = ("cut", "zeros", "bits", "swap", "noise", "insert")
