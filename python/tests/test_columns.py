"""Columns against the nodes that they are of."""
from __future__ import annotations

import datetime

import numpy as np
import pandas as pd
import pytest

import streams
import tav

UTC = datetime.timezone.utc


@pytest.mark.parametrize("form", streams.FORMS, ids=lambda form: "-".join(map(str, form.values())))
@pytest.mark.parametrize("how", ["stop", "skip"])
def test_rows_are_the_nodes_in_their_order(form, how):
    with tav.open(streams.snapshot(7, **form), on_damage=how) as reader:
        nodes = streams.all_nodes(reader)
        table = reader.columns(path=True)
        assert list(table) == ["ord", "parent", "parent_valid", "depth", "offset", "size", "id", "tag", "type", "key",
                               "number", "number_valid", "text", "text_valid", "time", "time_valid", "bytes",
                               "bytes_valid", "path"]
        assert {len(column) for column in table.values()} == {len(nodes)}
        assert list(table["ord"]) == list(range(len(nodes)))
        for name in ("offset", "size", "id", "key"):
            assert list(table[name]) == [getattr(n, name) for n in nodes]
        assert list(table["tag"]) == [n.tag for n in nodes] and list(table["type"]) == [n.type for n in nodes]
        assert list(table["path"]) == [n.path for n in nodes]
        places = {n.offset: i for i, n in enumerate(nodes)}
        assert list(table["parent"]) == [places[n.parent.offset] if n.parent else -1 for n in nodes]
        assert list(table["depth"]) == [n.path.count("/") - 1 for n in nodes]
        assert "path" not in reader.columns()


def test_values_are_in_the_column_of_their_kind():
    moment = datetime.datetime(2024, 2, 29, 10, 30, 0, 123456, UTC)
    late = (2**60).to_bytes(8, "little") + bytes(8)
    values = [5, -7, "ada", "é", moment, b"\0\1", [1, 2]]
    writer = tav.Writer()
    with writer, writer.group("system") as group:
        for value in values:
            group.add(1000, value)
        group.add(1000, late, type="UTC Timestamp")
        group.add(1000, b"abc", type="Uint32")
    table = tav.open(writer.bytes()).columns()
    row = dict(zip(range(10), zip(*(table[name] for name in ("number", "text", "bytes")))))
    assert table["number"].dtype == np.int64 and table["time"].dtype == "datetime64[ns]"
    assert [row[i + 1][0] for i in range(2)] == [5, -7] and [row[i + 1][1] for i in (2, 3)] == ["ada", "é"]
    assert table["time"][5] == np.datetime64("2024-02-29T10:30:00.123456")
    assert [row[i][2] for i in (6, 7, 9)] == [b"\0\1", np.array([1, 2], "uint64").tobytes(), b"abc"]
    expected = {"number": [1, 2], "text": [3, 4], "time": [5], "bytes": [6, 7, 9]}
    for name, rows in expected.items():
        assert list(np.flatnonzero(table[name + "_valid"])) == rows
    assert all(np.isnat(table["time"][i]) for i in range(10) if i != 5)
    pd.DataFrame(table)


@pytest.mark.parametrize("values, dtype", [
    ([1, 2**63 - 1, -2**63], "int64"), ([1, 2**63], "uint64"), ([-1, 2**63], "object"), ([1, 2**64], "object"),
    ([-2**100], "object"), ([], "int64"), ([2**64 - 1, 0], "uint64")])
def test_numbers_are_exact_in_whatever_type_holds_them(values, dtype):
    writer = tav.Writer()
    with writer, writer.group("system") as group:
        for value in values:
            group.add(1000, value)
    table = tav.open(writer.bytes()).columns()
    assert table["number"].dtype == dtype
    assert [int(each) for each in table["number"][1:]] == values and list(table["number_valid"][1:]) == [True] * len(values)


def test_many_rows_of_32_bit_headers_find_room():
    count = 200_000
    writer = tav.Writer(root=32)
    with writer, writer.group("system") as group:
        for i in range(count):
            group.add(1000, i % 256, type="Uint8")
    table = tav.open(writer.bytes()).columns()
    assert len(table["ord"]) == count + 1
    assert np.array_equal(table["number"][1:], np.arange(count) % 256)
    assert (table["parent"][1:] == 0).all() and (np.diff(table["offset"][1:].astype("int64")) == 9).all()


def test_arrays_outlive_reader_and_module_objects():
    reader = tav.open(streams.snapshot(100))
    table = reader.columns()
    reader.close()
    del reader
    assert int(table["number"].sum()) == 5050 and table["text"][2] == "host0"


def test_paths_below_each_of_several_roots_tell_which_root():
    writer = tav.Writer()
    with writer:
        for i in range(3):
            with writer.group("system") as system:
                system.add("cpuOnline", i)
    with tav.open(writer.bytes()) as reader:
        assert list(reader.columns(path=True)["path"]) == [
            "/system", "/system/cpuOnline", "/system[2]", "/system[2]/cpuOnline", "/system[3]", "/system[3]/cpuOnline"]


def test_what_is_empty_at_the_end_of_a_file_is_empty_bytes():
    writer = tav.Writer(byte_order="little", root=64, align=False)
    with writer, writer.group("system") as system:
        system.add(1001, 7)
        system.add(1002, b"")
    data = bytearray(writer.bytes())
    for more in (0, 5):  # what a writer was about to add
        data[0] += more
        with tav.open(bytes(data), on_damage="skip") as reader:
            rows = reader.columns()
            assert len(reader.damage) == (more != 0)
        assert list(rows["bytes_valid"]) == [False, False, True] and rows["bytes"][2] == b""


def test_damage_is_told_in_the_order_of_the_stream():
    data = bytearray(streams.snapshot(3, byte_order="little", root=64, align=False))
    with tav.open(bytes(data)) as reader:
        name = reader.find("//hostName")
    data[name.offset:name.offset + 8] = b"\xff" * 8  # a size of 4 GB
    data += b"\xff" * 9  # and no root follows
    for path in (False, True):
        with tav.open(bytes(data)) as reader, pytest.raises(tav.TavError) as raised:
            reader.columns(path=path)
        assert raised.value.offset == name.offset and raised.value.path == "/system/host"
