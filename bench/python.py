#!/usr/bin/python3
"""How fast the package reads, beside other formats with the same tree: millions of leaves a second, medians. A table has a
column for each of the 30 metrics: its leaves are its values.

    PYTHONPATH=build/release/python bench/python.py [ROUNDS]

The tree is that of bench/: 8 databases of 100 applications with 30 metrics each, 24,000 leaves, in memory. Formats that
are not installed are left out.
"""
from __future__ import annotations

import datetime
import json
import statistics
import struct
import sys
import time
from typing import Any, Callable

import tav

DATABASES, APPLICATIONS = 8, 100
SCHEMA = "uUusuUtuUsuUuUtuUsuUusUutuUUsu"  # as in bench/workload.hpp
LEAVES = DATABASES * APPLICATIONS * len(SCHEMA)
ALPHABET = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789_."
MASK = 2**64 - 1


class SplitMix64:
    """The random numbers of bench/workload.cpp."""

    def __init__(self, seed: int) -> None:
        self.state = seed

    def __call__(self) -> int:
        self.state = z = (self.state + 0x9E3779B97F4A7C15) & MASK
        z = (z ^ (z >> 30)) * 0xBF58476D1CE4E5B9 & MASK
        z = (z ^ (z >> 27)) * 0x94D049BB133111EB & MASK
        return z ^ (z >> 31)


def leaf(kind: str, random: SplitMix64) -> tuple[str, Any]:
    """A type and a value; of a timestamp its 16 bytes."""
    r = random()
    if kind == "u":
        return "Uint32", (random() >> 32) >> (r % 32)
    if kind == "U":
        return "Uint64", random() >> (r % 64)
    if kind == "t":
        return "UTC Timestamp", struct.pack("=QQ", 1600000000 + (r & 0x0FFFFFFF), random())
    return "ASCII String", "".join(ALPHABET[random() & 63] for _ in range(8 + r % 33))


def make_stream() -> bytes:
    random = SplitMix64(0x5EED)
    writer = tav.Writer()
    with writer, writer.group(5000) as root, root.group(4000) as host:
        for k in range(DATABASES):
            with host.group(3000 + k) as database:
                for j in range(APPLICATIONS):
                    with database.group(2000 + j) as application:
                        for m, kind in enumerate(SCHEMA):
                            name, value = leaf(kind, random)
                            application.add(1000 + m, value, type=name)
    return writer.bytes()


def median(work: Callable[[], Any], rounds: int) -> float:
    work()
    times = []
    for _ in range(rounds):
        start = time.perf_counter()
        work()
        times.append(time.perf_counter() - start)
    return statistics.median(times)


def iterate(reader: tav.Reader) -> None:
    for root in reader:
        for host in root:
            for database in host:
                for application in database:
                    for metric in application:
                        metric.value


def table(reader: tav.Reader) -> tav.Table:
    made = reader.table("/#5000/#4000/*/*", {f"m{m}": f"#{1000 + m}" for m in range(len(SCHEMA))})
    assert len(made) == DATABASES * APPLICATIONS
    return made


def unpack(data: bytes) -> list[Any]:
    """A reader in Python alone, for this one form."""
    at = 0
    values = []
    while at < len(data):
        size, _, kind, _ = struct.unpack_from("<QIHH", data, at)
        at += 16
        if kind == 2:
            continue
        payload = data[at:at + size]
        at += size
        values.append(int.from_bytes(payload, "little") if kind in (55, 57) else
                      payload.decode() if kind == 50 else payload)
    return values


def timestamp(value: Any) -> Any:
    return value.timestamp() if isinstance(value, datetime.datetime) else value.hex()


def main() -> None:
    rounds = int(sys.argv[1]) if len(sys.argv) > 1 else 31
    data = make_stream()
    reader = tav.open(data)
    tree = reader.load()
    works: dict[str, Callable[[], Any]] = {"columns()": reader.columns, "table(), 30 columns": lambda: table(reader),
                                           "iteration with values": lambda: iterate(reader),
                                           "load()": reader.load, "struct, in Python": lambda: unpack(data)}
    # The others have no moments of their own, or slower ones: a number of seconds stands for each.
    text = json.dumps(tree, default=timestamp)
    plain = json.loads(text)
    works["json.loads"] = lambda: json.loads(text)
    try:
        import msgpack
        packed = msgpack.packb(plain)
        works["msgpack.unpackb"] = lambda: msgpack.unpackb(packed)
        moments = msgpack.packb(tree, datetime=True)
        works["msgpack.unpackb, moments"] = lambda: msgpack.unpackb(moments, timestamp=3)
    except ImportError:
        pass
    try:
        import cbor2
        cbor = cbor2.dumps(plain)
        works["cbor2.loads"] = lambda: cbor2.loads(cbor)
    except ImportError:
        pass
    print(f"{len(data)} bytes, {LEAVES} leaves, median of {rounds}")
    for name, work in works.items():
        seconds = median(work, rounds)
        print(f"{name:26} {LEAVES / seconds / 1e6:6.1f} M leaves/s")


if __name__ == "__main__":
    main()
