"""Tables against the nodes that they are of, as arrays, frames and by Arrow."""
from __future__ import annotations

import ctypes
import datetime

import numpy as np
import pandas as pd
import pytest

import streams
import tav

UTC = datetime.timezone.utc
COLUMNS = {"name": "hostName", "cpus": "cpuOnline"}


@pytest.fixture
def gaps() -> bytes:
    """Hosts of which some lack some of their values."""
    moment = datetime.datetime(2024, 2, 29, tzinfo=UTC)
    writer = tav.Writer()
    with writer, writer.group("system") as system:
        for i in range(6):
            with system.group("host") as host:
                if i % 2:
                    host.add("hostName", f"é{i}")
                if i % 3:
                    host.add("cpuOnline", 2**63 + i)
                if i != 4:
                    host.add(1001, -(2**62) - i, type="Sint64")
                host.add(1002, moment + datetime.timedelta(microseconds=i))
                if i == 2:
                    host.add(1003, 2**100)
                    host.add(1004, b"\0\xff")
    return writer.bytes()


ALL = {"name": "hostName", "cpus": "cpuOnline", "signed": "#1001", "when": "#1002", "long": "#1003", "raw": "#1004",
       "none": "osName"}


def test_a_row_is_a_node_and_a_column_a_path():
    with tav.open(streams.snapshot(3)) as reader:
        table = reader.table(each="/system/host", columns=COLUMNS)
    assert len(table) == 3 and table.columns == {"name": "text", "cpus": "uint64"}
    assert "3 rows" in repr(table)
    frame = table.to_pandas()
    assert list(frame.columns) == ["name", "cpus"]
    assert frame["cpus"].dtype == "UInt64" and list(frame["cpus"]) == [1, 2, 3]
    assert list(frame["name"]) == ["host0", "host1", "host2"]


def test_gaps_stay_gaps_and_numbers_stay_whole(gaps):
    table = tav.open(gaps).table("//host", ALL)
    frame = table.to_pandas()
    assert list(frame.dtypes.astype(str)) == ["object", "UInt64", "Int64", "datetime64[ns, UTC]", "object", "object",
                                              "object"]
    assert [None if pd.isna(v) else int(v) for v in frame["cpus"]] == [None, 2**63 + 1, 2**63 + 2, None, 2**63 + 4,
                                                                       2**63 + 5]
    assert [None if pd.isna(v) else int(v) for v in frame["signed"]] == [
        -(2**62) - i if i != 4 else None for i in range(6)]
    assert list(frame["name"]) == [None, "é1", None, "é3", None, "é5"]
    assert frame["long"][2] == 2**100 and frame["raw"][2] == b"\0\xff" and frame["long"][1] is None
    assert frame["when"][5] == pd.Timestamp("2024-02-29T00:00:00.000005Z") and frame["none"].isna().all()
    arrays = table.to_numpy()
    assert arrays["cpus"].dtype == np.uint64 and list(arrays["cpus"].mask) == [True, False, False, True, False, False]
    assert arrays["when"].dtype == "datetime64[ns]" and not np.ma.isMaskedArray(arrays["when"])
    assert list(arrays["name"]) == list(frame["name"])


def test_several_values_are_joined_or_the_first_is_taken():
    with tav.open(streams.snapshot(3)) as reader:
        assert list(reader.table("/system", {"names": "host/hostName"}).to_pandas()["names"]) == ["host0"]
        joined = reader.table("/system", {"names": "host/hostName"}, join=" ")
        assert list(joined.to_pandas()["names"]) == ["host0 host1 host2"]


def test_files_follow_each_other(tmp_path):
    for i, hosts in enumerate((2, 3, 1)):
        (tmp_path / f"{i}.tav").write_bytes(streams.snapshot(hosts, byte_order=("little", "big")[i % 2]))
    for paths in (str(tmp_path / "*.tav"), sorted(tmp_path.iterdir()), [tmp_path / "0.tav", str(tmp_path / "[12].tav")]):
        frame = tav.read_table(paths, each="//host", columns=COLUMNS)
        assert list(frame["cpus"]) == [1, 2, 1, 2, 3, 1] and frame["cpus"].dtype == "UInt64"
    with pytest.raises(FileNotFoundError):
        tav.read_table(tmp_path / "*.nothing", each="//host", columns=COLUMNS)
    with pytest.raises(tav.TavError):
        tav.read_table(tmp_path / "nothing.tav", each="//host", columns=COLUMNS)


def test_damage_stops_or_is_passed_over(tmp_path):
    data = bytearray(streams.snapshot(4))
    data[tav.open(bytes(data)).find("/system/host[2]/hostName").offset + 7] = 0xFF
    with pytest.raises(tav.TavError) as caught:
        tav.read_table(bytes(data), each="//host", columns=COLUMNS)
    assert caught.value.offset is not None and caught.value.code
    frame = tav.read_table([bytes(data)], each="//host", columns=COLUMNS, on_damage="skip")
    assert list(frame["name"]) == ["host0", None, "host2", "host3"]
    with tav.open(bytes(data), on_damage="skip") as reader:
        reader.table("//host", COLUMNS)
        assert len(reader.damage) == 1


def test_a_table_outlives_its_reader_and_empty_ones_have_no_rows():
    with tav.open(streams.snapshot(2)) as reader:
        table = reader.table("//host", COLUMNS)
        empty = reader.table("//osName", COLUMNS)
    assert list(table.to_pandas()["name"]) == ["host0", "host1"]
    assert len(empty) == 0 and list(empty.to_pandas().columns) == ["name", "cpus"] and len(empty.to_pandas()) == 0
    with pytest.raises(tav.TavError):
        reader.table("//host", COLUMNS)


def test_wrong_paths_and_columns_are_refused():
    with tav.open(streams.snapshot(2)) as reader:
        for each, columns in (("//hostNam", COLUMNS), ("//host", {"a": "hostNam"}), ("//host[", COLUMNS)):
            with pytest.raises(tav.TavError):
                reader.table(each, columns)
        with pytest.raises((TypeError, AttributeError)):
            reader.table("//host", {"a": 5})


class Schema(ctypes.Structure):
    """A structure of the Arrow C data interface, as any program declares it."""


Schema._fields_ = [("format", ctypes.c_char_p), ("name", ctypes.c_char_p), ("metadata", ctypes.c_char_p),
                   ("flags", ctypes.c_int64), ("n_children", ctypes.c_int64),
                   ("children", ctypes.POINTER(ctypes.POINTER(Schema))), ("dictionary", ctypes.c_void_p),
                   ("release", ctypes.c_void_p), ("private_data", ctypes.c_void_p)]


class Array(ctypes.Structure):
    pass


Array._fields_ = [("length", ctypes.c_int64), ("null_count", ctypes.c_int64), ("offset", ctypes.c_int64),
                  ("n_buffers", ctypes.c_int64), ("n_children", ctypes.c_int64),
                  ("buffers", ctypes.POINTER(ctypes.c_void_p)), ("children", ctypes.POINTER(ctypes.POINTER(Array))),
                  ("dictionary", ctypes.c_void_p), ("release", ctypes.c_void_p), ("private_data", ctypes.c_void_p)]


class Stream(ctypes.Structure):
    _fields_ = [("get_schema", ctypes.CFUNCTYPE(ctypes.c_int, ctypes.c_void_p, ctypes.POINTER(Schema))),
                ("get_next", ctypes.CFUNCTYPE(ctypes.c_int, ctypes.c_void_p, ctypes.POINTER(Array))),
                ("get_last_error", ctypes.c_void_p), ("release", ctypes.CFUNCTYPE(None, ctypes.c_void_p)),
                ("private_data", ctypes.c_void_p)]


def pointer(capsule: object, name: bytes) -> int:
    get = ctypes.pythonapi.PyCapsule_GetPointer
    get.restype, get.argtypes = ctypes.c_void_p, [ctypes.py_object, ctypes.c_char_p]
    return get(capsule, name)


def numbers(array: Array, column: int) -> list[int | None]:
    child = array.children[column].contents
    values = (ctypes.c_uint64 * child.length).from_address(child.buffers[1])
    bits = child.buffers[0]
    valid = (ctypes.c_uint8 * ((child.length + 7) // 8)).from_address(bits) if bits else None
    return [values[i] if valid is None or valid[i // 8] >> i % 8 & 1 else None for i in range(child.length)]


def test_a_consumer_of_arrow_reads_the_stream(gaps):
    table = tav.open(gaps).table("//host", {"cpus": "cpuOnline"})
    capsule = table.__arrow_c_stream__()
    address = pointer(capsule, b"arrow_array_stream")
    stream = Stream.from_address(address)
    schema, array = Schema(), Array()
    assert stream.get_schema(address, ctypes.byref(schema)) == 0
    assert schema.format == b"+s" and schema.children[0].contents.format == b"L"
    assert schema.children[0].contents.name == b"cpus"
    assert stream.get_next(address, ctypes.byref(array)) == 0
    assert numbers(array, 0) == [None, 2**63 + 1, 2**63 + 2, None, 2**63 + 4, 2**63 + 5]
    end = Array()
    assert stream.get_next(address, ctypes.byref(end)) == 0 and not end.release
    for each in (schema, array):
        ctypes.CFUNCTYPE(None, ctypes.c_void_p)(each.release)(ctypes.addressof(each))
    stream.release(address)
    assert not ctypes.c_void_p.from_buffer(stream, Stream.release.offset).value  # the capsule has nothing to release
    del capsule


def test_a_consumer_of_arrow_reads_one_array(gaps):
    table = tav.open(gaps).table("//host", {"cpus": "cpuOnline"})
    schema, array = table.__arrow_c_array__(requested_schema=None)
    assert Schema.from_address(pointer(schema, b"arrow_schema")).format == b"+s"
    found = Array.from_address(pointer(array, b"arrow_array"))
    assert found.length == 6 and numbers(found, 0)[1] == 2**63 + 1
    with pytest.raises(tav.TavError):
        tav.open(gaps).table("//osName", {"cpus": "cpuOnline"}).__arrow_c_array__()


def test_what_is_not_taken_over_is_released():
    with tav.open(streams.snapshot(50)) as reader:
        for _ in range(200):
            table = reader.table("//host", COLUMNS)
            table.__arrow_c_stream__()
            table.__arrow_c_array__()
