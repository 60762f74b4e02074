"""How the bytes of a stream are laid out, stated without the library for the tests in Python. What writes streams for them
(encode, planted) and what reads them (oracle, recovering) takes it from here."""
from typing import NamedTuple

from support import BIG_ENDIAN

EYE = 0xC0DED5EEDDEC0DED
EYE_SIZE = 0x00400000
ALIGNED = 0x00100000
GROUP32, GROUP64 = 1, 2
ASCII, UINT32, UINT64, STAMP, BINARY, UTF8, ARRAY = 50, 55, 57, 100, 101, 102, 106
MARKER, END = 65000, 65001


class Header(NamedTuple):
    """As it is in a file; without bits where it has 32 bits."""
    size: int
    info: int
    kind: int
    elm: int


class Form:
    """What nothing in a stream says of it."""

    def __init__(self, big=BIG_ENDIAN, wide=True, align=False):
        self.big, self.wide, self.align = big, wide, align

    @staticmethod
    def all():
        return [Form(big, wide, align) for big in (False, True) for wide in (True, False) for align in (False, True)]

    def __repr__(self):
        return f"{self.order}-endian, root {64 if self.wide else 32}{', aligned' if self.align else ''}"

    @property
    def order(self):
        return "big" if self.big else "little"

    def options(self):
        return ["--byte-order", self.order, "--root", "64" if self.wide else "32",
                "--align" if self.align else "--no-align"]

    def number(self, value, width, order=None):
        return (value & ((1 << 8 * width) - 1)).to_bytes(width, order or self.order)

    def header(self, wide, size, kind, elm, info=0):
        """`info` as in the file."""
        if wide:
            return self.number(size, 8) + self.number(info, 4) + self.number(kind, 2) + self.number(elm, 2)
        return self.number(size, 4) + self.number(kind, 2) + self.number(elm, 2)

    def number_at(self, made, at, width, order=None):
        return int.from_bytes(made[at:at + width], order or self.order)

    def header_at(self, made, at, wide):
        """The header in these bytes, whatever they are."""
        fields = ((0, 8), (8, 4), (12, 2), (14, 2)) if wide else ((0, 4), (4, 0), (4, 2), (6, 2))
        return Header(*(self.number_at(made, at + place, width) for place, width in fields))

    def info(self, flags):
        """As a writer of this form has it in the file."""
        return flags | (ALIGNED if self.align else 0)

    def padding(self, length, info=0):
        """What is behind a payload of so many bytes; `info` as in the file."""
        return bytes(-length % 8 if self.align or info & ALIGNED else 0)

    def pair(self, length, order=None):
        """Behind a data element whose payload has so many bytes."""
        return self.number(EYE, 8, order) + self.number(length + 16, 8, order)

    def end_pair(self, length, wide):
        """The payload of the element that ends a group with so many bytes before it; `wide`: that has a 64-bit header."""
        return self.pair(length + (16 if wide else 0))


def header_length(wide):
    return 16 if wide else 8
