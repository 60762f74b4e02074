"""Rounds of every operation, after each of which a debug Python must hold as many references as before.

    PYTHONPATH=FOLDER python3-dbg python/tests/references.py

Without NumPy: modules that were built for the other interpreter change counts without this one noticing.
"""
from __future__ import annotations

import array
import ctypes
import datetime
import gc
import pathlib
import sys
import tempfile
from typing import Callable

import streams
import tav

ROUNDS = 40
MEASURES = 6
MOMENT = datetime.datetime(2024, 2, 29, 10, 30, 0, 5, datetime.timezone.utc)
VALUES = (5, -5, 2**40, 2**100, -2**100, "a", "é", b"x", [1, 2], (3,), array.array("Q", [4]), True, MOMENT)
DATA = streams.snapshot(5)
LARGE = streams.snapshot(20_000)  # long enough for progress to be told
FOLDER = tempfile.TemporaryDirectory()
FILE = pathlib.Path(FOLDER.name, "a.tav")
FILE.write_bytes(DATA)
NAMES = pathlib.Path(FOLDER.name, "own.json")
NAMES.write_text('{"40001": {"tag": "queue"}}')


def damaged() -> bytes:
    data = bytearray(DATA)
    with tav.open(DATA) as reader:
        data[reader.find("/system/host[2]/hostName").offset + 7] = 0xFF
    return bytes(data)


def refused(work: Callable[[], object]) -> None:
    try:
        work()
    except (tav.TavError, TypeError, ValueError, KeyError, FileExistsError, ZeroDivisionError):
        return
    raise AssertionError("an error is expected")


def reading() -> None:
    for source in (DATA, bytearray(DATA), memoryview(DATA), FILE, str(FILE)):
        with tav.open(source) as reader:
            for node in streams.all_nodes(reader):
                node.value, node.payload, node.tag, node.type, node.path, node.parent, node.time_ns, node.zone, node.key
                node.size, node.info, node.offset, node.reader, hash(node), repr(node), node == node, node.load()
            reader.load(), reader.damage, reader.form, reader.name, reader.memory, reader.closed
            repr(reader), len(reader)


def following() -> None:
    for roots in (False, True):
        with tav.follow(FILE, roots=roots, timeout=0, on_change=print) as nodes:
            for node in nodes:
                node.path, node.value, node.offset
            repr(nodes), nodes.damage
    refused(lambda: next(tav.follow(FOLDER.name)))
    refused(lambda: tav.follow(FILE, byte_order="up"))


def naming() -> None:
    own = tav.Dictionary(NAMES)
    own.elements, len(own), own == tav.Dictionary(), hash(FILE)
    for names in (own, NAMES):
        with tav.Writer(dictionary=names) as writer, writer.group("queue") as group:
            group.add("cpuOnline", 1)
        with tav.open(writer.bytes(), dictionary=names) as reader:
            for node in streams.all_nodes(reader):
                node.tag, node.path
            reader.load(), reader.dictionary
        tav.to_json(writer.bytes(), dictionary=names), tav.schema(writer.bytes(), dictionary=names)
    refused(lambda: tav.Dictionary(FILE))
    refused(lambda: tav.open(DATA, dictionary=5))


def searching() -> None:
    with tav.open(DATA) as reader:
        list(reader.findall("//hostName")), reader.find("/system/host[2]").find("hostName"), reader.find("//osName")
        walks = [reader.findall("//host"), iter(reader), iter(reader.find("/system"))]
        for walk in walks:
            next(walk)
        refused(lambda: reader.find("//nonsense"))
        refused(lambda: reader.find("/system["))
        refused(lambda: reader.find("/", progress=5))
    for walk in walks:
        refused(lambda: next(walk))


def skipping() -> None:
    data = damaged()
    with tav.open(data) as reader:
        refused(reader.load)
        refused(reader._columns)
        refused(lambda: list(reader.findall("//hostName")))
    with tav.open(data, on_damage="skip") as reader:
        reader.load(), reader._columns(), streams.all_nodes(reader), reader.damage


def columns() -> None:
    for values in ((), VALUES):
        with tav.open(written(values)) as reader:
            rows = reader._columns(path=True)
            for name in ("parent", "depth", "offset", "size", "id", "key", "kind", "number", "time"):
                memoryview(rows.column(name))
            rows.number_type
            refused(lambda: rows.column("none"))
            refused(lambda: rows.fill("tag", (ctypes.c_int * rows.count)()))


def tables() -> None:
    with tav.open(DATA) as reader:
        for _ in range(2):
            table = reader.table("//host", {"name": "hostName", "cpus": "cpuOnline"})
            table.columns, len(table), repr(table), table.__arrow_c_stream__(), table.__arrow_c_array__()
        refused(lambda: reader.table("//host[", {"name": "hostName"}))
        for part in tav.plan(FILE, 64):
            repr(part)


def written(values: object, **form: object) -> bytes:
    writer = tav.Writer(**form)  # type: ignore[arg-type]
    with writer, writer.group("system") as group:
        for value in values:  # type: ignore[attr-defined]
            group.add(1000, value)
        with group.group("host", eye_size=form.get("root") != 32) as host:
            host.add("hostName", "ada", type="UTF8 String")
        gone = group.group("cpu")
        gone.add("cpuOnline", 5)
        gone.abandon()
    return writer.bytes()


def writing() -> None:
    for form in streams.FORMS:
        for node in streams.all_nodes(tav.open(written(VALUES, **form), **form)):
            node.value, node.payload
    path = pathlib.Path(FOLDER.name, "written.tav")
    with tav.Writer(path, overwrite=True) as writer, writer.group("system") as group:
        group.add("hostName", "ada")
        writer.flush(), writer.sync(), writer.size, group.is_open, repr(writer), repr(group)
        refused(lambda: group.add("hostName", 1.5))
        refused(lambda: group.add("hostNam", 1))
        refused(lambda: group.add("hostName", 2**130))
    with tav.Writer(path, append=True) as writer:
        writer.group("system").close()
    refused(lambda: tav.Writer(path))
    tav.Writer().discard()


def functions() -> None:
    progress = [0]

    def tell(done: int, total: int) -> None:
        progress[0] = done

    for work in (tav.check, tav.schema, tav.to_json, tav.recover):
        repr(work(DATA, progress=tell))
    with tav.open(LARGE) as reader:
        refused(lambda: reader.find("//osName", progress=lambda done, total: 1 // 0))
    refused(lambda: tav.check(DATA, rules=["no-such-rule"]))
    tav.recognise(DATA), tav.check(damaged()), tav.recover(damaged()), tav.diff(DATA, written(VALUES))
    tav.from_json(tav.to_json(DATA)), tav.extract(DATA, "//host"), tav.set(DATA, {"//cpuOnline": 7})
    for work in (tav.open, tav.check, tav.recover, tav.recognise, tav.to_json, tav.from_json):
        refused(lambda: work(b"none" if work is not tav.from_json else "none"))
    refused(lambda: tav.open(5))


OPERATIONS = (reading, following, naming, searching, skipping, columns, tables, writing, functions)


def growth(work: Callable[[], None]) -> int:
    """The least that some rounds left behind. Objects are kept for their next use at first."""
    least = sys.maxsize
    for _ in range(MEASURES):
        gc.collect()
        before = sys.gettotalrefcount()  # type: ignore[attr-defined]
        for _ in range(ROUNDS):
            work()
        gc.collect()
        least = min(least, sys.gettotalrefcount() - before)  # type: ignore[attr-defined]
    return least


def main() -> int:
    counts = hasattr(sys, "gettotalrefcount")
    bad = 0
    for work in OPERATIONS:
        for _ in range(3):
            work()
        if counts:
            left = growth(work)
            bad += abs(left) >= ROUNDS // 2
            print(f"{work.__name__}: {left} references left by {ROUNDS} rounds")
    FOLDER.cleanup()
    return 1 if bad else 0


if __name__ == "__main__":
    sys.exit(main())
