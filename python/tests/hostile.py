"""Hostile bytes: what fuzzers keep, and golden streams whose nodes are damaged, cut, doubled and put elsewhere.

    PYTHONPATH=FOLDER python3 python/tests/hostile.py ROUNDS

python/hostile.sh runs it with sanitizers; test_hostile.py asks the same of a part of it in each build.
"""
from __future__ import annotations

import pathlib
import random
import sys
import tempfile
from collections.abc import Callable, Iterator

import streams
import tav

COLUMNS = {"own": ".", "below": "*", "deep": "*//*", "above": "../hostName"}
MOST = 1 << 20  # bytes that recovery may search


def kept() -> Iterator[tuple[str, bytes]]:
    """What the fuzzers' targets keep, and all that ever showed a defect."""
    for path in sorted(streams.ROOT.glob("fuzz/corpus/*/*")) + sorted(streams.ROOT.glob("fuzz/findings/*/*")):
        yield str(path.relative_to(streams.ROOT)), path.read_bytes()


def golden() -> dict[str, bytes]:
    found = {}
    for path in sorted((streams.ROOT / "tests" / "golden").glob("*.hex")):
        lines = path.read_text().splitlines()
        found[path.stem] = bytes.fromhex("".join(line.split("#")[0] for line in lines))
    return found


def spans(data: bytes) -> list[tuple[int, int]]:
    """Where nodes begin, and where the next one does."""
    with tav.open(data, on_damage="skip") as reader:
        places = sorted(node.offset for node in streams.all_nodes(reader))
    return list(zip(places, places[1:] + [len(data)]))


def damaged(data: bytes, rng: random.Random) -> bytes:
    """A stream with something done to its nodes: to a header's byte, to a whole header, to where a node is."""
    changed = bytearray(data)
    places = spans(data)
    for _ in range(rng.randrange(1, 4)):
        begin, end = rng.choice(places)
        other, behind = rng.choice(places)
        way = rng.randrange(6)
        if way == 0:
            changed[min(begin + rng.randrange(16), len(changed) - 1)] = rng.choice((0, 1, 0x7F, 0x80, 0xFF))
        elif way == 1:
            changed[begin:begin + 16] = changed[other:other + 16]
        elif way == 2:
            changed[other:other] = changed[begin:end]
        elif way == 3:
            del changed[begin:end]
        elif way == 4:
            changed[begin:end], changed[other:behind] = changed[other:behind], changed[begin:end]
        else:
            del changed[rng.randrange(len(changed)) + 1:]
        changed = changed or bytearray(1)
        places = [(at, to) for at, to in places if at < len(changed)] or [(0, len(changed))]
    return bytes(changed)


class Looking:
    """Reads each input in every way. What goes wrong ends in tav.TavError, whatever the bytes are."""

    def __init__(self, folder: pathlib.Path) -> None:
        self.path = folder / "hostile.tav"
        self.inputs = 0
        self.read = 0
        self.refused = 0
        self._rng = random.Random(1)

    def _try(self, work: Callable[[], object]) -> None:
        try:
            work()
            self.read += 1
        except tav.TavError:
            self.refused += 1

    def look(self, data: bytes) -> None:
        self.path.write_bytes(data)
        source = self.path if self.inputs % 2 else data
        form = self._rng.choice(streams.FORMS) if self.inputs % 5 == 0 else {}
        self.inputs += 1
        for damage in ("stop", "skip"):
            self._try(lambda: self._read(source, on_damage=damage, **form))
        for work in (tav.check, tav.schema, tav.to_json, tav.recognise):
            self._try(lambda: work(source, **form))
        self._try(lambda: tav.recover(source, search=MOST))
        self._try(lambda: tav.diff(source, data))
        self._try(lambda: tav.extract(source, "//*[1]", on_damage="skip"))
        self._try(lambda: tav.set(source, {"//cpuOnline": 7}))
        self._try(lambda: tav.plan(self.path, 64))

    def _read(self, source: bytes | pathlib.Path, **options: object) -> None:
        with tav.open(source, **options) as reader:  # type: ignore[arg-type]
            for work in (reader.load, reader._repr_html_, lambda: reader.columns(path=True),
                         lambda: len(reader.table("//*", COLUMNS)), lambda: reader.table("//*", COLUMNS, join=",").columns,
                         lambda: [node.path for node in reader.findall("//*[. > 1 or @id = 60102]")],
                         lambda: [self._node(node) for node in streams.all_nodes(reader)]):
                self._try(work)
            len(reader.damage), reader.form
            if options["on_damage"] == "skip":
                self._try(lambda: self._compare(reader))

    @staticmethod
    def _compare(reader: tav.Reader) -> None:
        """Node by node and by columns there are the same nodes. Of groups that no dictionary knows nobody can be sure:
        asked by itself, such a one may be read with a header of the other width."""
        nodes = streams.all_nodes(reader)
        if all(node.tag or not node.is_group for node in nodes):
            assert list(reader.columns()["offset"]) == [node.offset for node in nodes], bytes(reader.memory).hex()

    @staticmethod
    def _node(node: tav.Node) -> None:
        node.value, node.payload, node.tag, node.type, node.path, node.parent, node.size, node.info, node.key
        if node.type == "UTC Timestamp":
            node.time_ns, node.zone


def main() -> int:
    if len(sys.argv) != 2:
        print(__doc__, file=sys.stderr)
        return 2
    rng = random.Random(7)
    with tempfile.TemporaryDirectory() as folder:
        looking = Looking(pathlib.Path(folder))
        for _, data in kept():
            looking.look(data)
        vectors = golden()
        for _ in range(int(sys.argv[1])):
            for data in vectors.values():
                looking.look(damaged(data, rng))
    print(f"{looking.inputs} inputs, read in {looking.read} ways, refused in {looking.refused}")
    return 0


if __name__ == "__main__":
    sys.exit(main())
