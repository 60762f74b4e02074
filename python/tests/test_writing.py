"""Writers and groups."""
from __future__ import annotations

import array
import datetime

import pytest

import streams
import tav


def test_a_file_that_is_there_is_refused_overwritten_or_gone_on_with(tmp_path):
    path = tmp_path / "a.tav"
    for i, how in enumerate([{}, {"append": True}, {"append": True}]):
        with tav.Writer(path, **how) as writer, writer.group("system") as group:
            group.add("cpuOnline", i)
    with pytest.raises(tav.TavError) as caught:
        tav.Writer(path)
    assert caught.value.name == "KOR_RC_FILE_EXISTS"
    assert [n.value for n in tav.open(path).findall("//cpuOnline")] == [0, 1, 2]
    with tav.Writer(path, overwrite=True) as writer, writer.group("system"):
        pass
    assert tav.open(path).load() == {"system": {}}


def test_an_exception_leaves_a_file_that_is_overwritten_as_it_was(tmp_path):
    path = tmp_path / "a.tav"
    path.write_bytes(streams.snapshot())
    with pytest.raises(KeyError):
        with tav.Writer(path, overwrite=True) as writer, writer.group("system"):
            raise KeyError
    assert path.read_bytes() == streams.snapshot()
    assert [each.name for each in tmp_path.iterdir()] == ["a.tav"]


def test_a_file_of_another_form_is_not_gone_on_with(tmp_path):
    path = tmp_path / "a.tav"
    path.write_bytes(streams.snapshot(byte_order="big"))
    with tav.Writer(path, append=True) as writer, writer.group("system"):
        pass
    assert tav.recognise(path).byte_order == "big"
    with pytest.raises(tav.TavError):
        tav.Writer(path, append=True, byte_order="little")


def test_flush_lets_another_reader_see_it(tmp_path):
    path = tmp_path / "a.tav"
    writer = tav.Writer(path)
    group = writer.group("system")
    group.add("cpuOnline", 1)
    writer.flush()
    assert tav.open(path).find("//cpuOnline").value == 1
    group.add("cpuOnline", 2)
    writer.sync()
    assert [n.value for n in tav.open(path).findall("//cpuOnline")] == [1, 2]
    group.close()
    writer.finish()
    writer.finish()


def test_groups_are_closed_abandoned_and_refused():
    writer = tav.Writer()
    root = writer.group("system")
    with root.group("host") as host:
        host.add("cpuOnline", 1)
        with pytest.raises(tav.TavError, match="host"):
            root.add("cpuOnline", 2)
        host.abandon()
        assert not host.is_open
    with pytest.raises(tav.TavError):
        host.add("cpuOnline", 3)
    with pytest.raises(tav.TavError, match="system"):
        writer.finish()
    root.group("host", eye_size=True, key=5).close()
    del host, root  # which closes itself
    writer.finish()
    reader = tav.open(writer.bytes())
    assert reader.load() == {"system": {"host": {}}}
    assert reader.find("//host").key == 5
    with pytest.raises(tav.TavError):
        writer.group("system")


def test_a_group_inside_keeps_those_around_it():
    writer = tav.Writer()
    inner = writer.group("system").group("host")
    inner.add("cpuOnline", 1)
    del inner
    writer.finish()
    assert tav.open(writer.bytes()).load() == {"system": {"host": {"cpuOnline": 1}}}


def test_groups_outlive_their_writer_without_harm(tmp_path):
    writer = tav.Writer(tmp_path / "a.tav")
    group = writer.group("system")
    writer.discard()
    writer.discard()
    for work in (lambda: group.add("cpuOnline", 1), group.close, writer.finish, lambda: writer.group("system"),
                 writer.bytes, lambda: writer.size):
        with pytest.raises(tav.TavError):
            work()
    assert not group.is_open
    other = tav.Writer()
    group = other.group("system")
    del other
    group.add("cpuOnline", 1)


def test_names_are_tags_constants_and_ids():
    writer = tav.Writer()
    with writer, writer.group(60100) as group:
        for name in ("hostName", "TAV_ELM_CMN_HOST_NAME", "#60103", 60103):
            group.add(name, "x")
        for name in ("hostNam", -1, 65536, 2**70):
            with pytest.raises(tav.TavError):
                group.add(name, "x")
        for name in (1.5, None):
            with pytest.raises(TypeError):
                group.add(name, "x")
    assert tav.open(writer.bytes()).load() == {"system": {"hostName": ["x"] * 4}}


@pytest.mark.parametrize("value, options", [
    (1.5, {}), (None, {}), ({}, {}), (object(), {}), (["a"], {}), (array.array("d", [1.0]), {}), ("a", {"type": "Uint32"}),
    (5, {"type": "Binary"}), (b"x", {"type": "group64"}), (memoryview(b"abcd")[::2], {})])
def test_values_without_a_type_are_refused(value, options):
    writer = tav.Writer()
    group = writer.group("system")
    with pytest.raises((TypeError, BufferError)):
        group.add(1000, value, **options)
    group.close()
    writer.finish()
    assert tav.open(writer.bytes()).load() == {"system": {}}


@pytest.mark.parametrize("value, options, error", [
    (datetime.datetime(2024, 1, 1), {}, ValueError),
    (datetime.datetime(1969, 12, 31, tzinfo=datetime.timezone.utc), {}, tav.TavError),
    (-1, {"type": "UTC Timestamp"}, tav.TavError), ([-1], {}, tav.TavError), (2**128, {}, tav.TavError),
    ("é", {"type": "ASCII String"}, tav.TavError), ("\udcff", {}, tav.TavError), ("\ud800", {}, ValueError),
    (5, {"type": "Uint33"}, tav.TavError), (5, {"key": 2048}, tav.TavError), (5, {"kee": 1}, TypeError)])
def test_values_that_do_not_fit_are_refused(value, options, error):
    writer = tav.Writer()
    with writer.group("system") as group, pytest.raises(error):
        group.add(1000, value, **options)


def test_memory_has_no_files_arguments():
    for arguments in ({"append": True}, {"overwrite": True}):
        with pytest.raises(ValueError):
            tav.Writer(**arguments)
    with pytest.raises(ValueError):
        tav.Writer("x", append=True, overwrite=True)


def test_the_bytes_of_a_file_are_in_the_file(tmp_path):
    with tav.Writer(tmp_path / "a.tav") as writer, writer.group("system"):
        with pytest.raises(tav.TavError):
            writer.bytes()
        assert writer.size == 16
