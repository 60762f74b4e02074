"""Readers, nodes, walks."""
from __future__ import annotations

import array
import datetime
import gc
import pathlib
import struct

import pytest

import streams
import tav

UTC = datetime.timezone.utc


@pytest.fixture(params=streams.FORMS, ids=lambda form: "-".join(map(str, form.values())))
def form(request):
    return request.param


def one(value, **options):
    """The node of a value in a stream of its own."""
    writer = tav.Writer()
    with writer, writer.group("system") as group:
        group.add(1000, value, **options)
    reader = tav.open(writer.bytes())
    return next(iter(next(iter(reader))))


def test_a_stream_of_each_form_is_found_out_and_read(form):
    with tav.open(streams.snapshot(**form)) as reader:
        assert tuple(reader.form)[:3] == tuple(form.values())
        assert [n.value for n in reader.findall("//hostName")] == ["host0", "host1", "host2"]
        assert [n.value for n in reader.findall("/system/host/cpuOnline")] == [1, 2, 3]
        assert reader.load() == {"system": {"host": [{"hostName": f"host{i}", "cpuOnline": i + 1} for i in range(3)]}}
        nodes = streams.all_nodes(reader)
        assert [n.tag for n in nodes[:4]] == ["system", "host", "hostName", "cpuOnline"]
        assert [n.offset for n in nodes] == sorted(n.offset for n in nodes)


def test_a_file_is_opened_by_str_and_path_and_buffers_of_any_kind(tmp_path):
    data = streams.snapshot()
    path = tmp_path / "a.tav"
    path.write_bytes(data)
    for source in (str(path), path, data, bytearray(data), memoryview(data), array.array("B", data)):
        with tav.open(source) as reader:
            assert reader.find("/system/host[2]/hostName").value == "host1"
            assert len(reader) == 1


def test_a_node_tells_what_it_is():
    with tav.open(streams.snapshot()) as reader:
        name = reader.find("/system/host[3]/hostName")
        assert (name.tag, name.id, name.type, name.value) == ("hostName", 60103, "ASCII String", "host2")
        assert bytes(name.payload) == b"host2" and name.size == 5 and not name.is_group
        assert name.path == "/system/host[3]/hostName"
        assert name.parent.tag == "host" and name.parent.parent.tag == "system" and name.parent.parent.parent is None
        host = name.parent
        assert host.is_group and host.type == "group64" and host.value is None and host.payload is None
        assert len(host) == 2 and bool(name) and len(name) == 0 and list(name) == []
        assert repr(name) == "<tav.Node hostName at 0xa8: 'host2'>" or "hostName" in repr(name)
        assert host.find("hostName") == name and hash(host.find("hostName")) == hash(name) and host != name
        assert host.find("osName") is None and reader.find("//osName") is None
        assert [n.tag for n in host.findall("*")] == ["hostName", "cpuOnline"]


def test_the_parent_of_an_iterated_node_is_the_group_that_was_iterated():
    with tav.open(streams.snapshot()) as reader:
        system = next(iter(reader))
        assert all(host.parent is system for host in system)
        assert [host.path for host in system] == ["/system/host", "/system/host[2]", "/system/host[3]"]


@pytest.mark.parametrize("value, kind", [
    (0, "Uint32"), (2**32 - 1, "Uint32"), (2**32, "Uint64"), (2**64, "Uint128"), (2**128 - 1, "Uint128"),
    (-1, "Sint32"), (-2**31, "Sint32"), (-2**31 - 1, "Sint64"), (-2**63 - 1, "Sint128"), (-2**127, "Sint128"),
    ("ada", "ASCII String"), ("", "ASCII String"), ("é", "UTF8 String"), (b"", "Binary"), (b"\0\xff", "Binary"),
    (datetime.datetime(2024, 2, 29, 10, 30, 0, 123456, UTC), "UTC Timestamp"),
    (datetime.datetime(9999, 12, 31, 23, 59, 59, 999999, UTC), "UTC Timestamp"),
    (array.array("Q", [1, 2**64 - 1]), "Uint64 array"),
])
def test_a_value_comes_back_with_the_type_that_it_says(value, kind):
    node = one(value)
    assert (node.value, node.type) == (value, kind)


@pytest.mark.parametrize("kind, least, greatest", [
    (f"{sign}int{bits}", -(2 ** (bits - 1)) if sign == "S" else 0, 2 ** (bits - (sign == "S")) - 1)
    for sign in ("U", "S") for bits in (8, 16, 32, 64, 128)])
def test_an_integer_type_holds_its_range_and_nothing_else(kind, least, greatest):
    for value in (least, 0, 1, greatest):
        node = one(value, type=kind)
        assert (node.value, node.type) == (value, kind)
    for value in (least - 1, greatest + 1):
        with pytest.raises(tav.TavError) as caught:
            one(value, type=kind)
        assert caught.value.name == "TAV_RC_OUTSIDE_PARENT"


def test_a_moment_has_nanoseconds_and_a_zone():
    east = datetime.timezone(datetime.timedelta(hours=-3, minutes=-30))
    moment = datetime.datetime(1980, 1, 1, 0, 0, 0, 7, east)
    node = one(moment)
    assert node.value == moment and node.value.tzinfo is UTC
    assert node.time_ns == 315545400000007000 and node.zone == -210
    raw = (2**40).to_bytes(8, "little") + b"\xff\xff\xff\xff\0\0\0\0"
    late = one(raw, type="UTC Timestamp")
    assert late.value == late.time_ns == 2**40 * 10**9 + 65535 * 10**6 + 65535 * 10**3
    early = one((5).to_bytes(8, "little") + b"\xd0\x07\x01\0\0\0\0\0", type="UTC Timestamp")  # 2000 ms, 1 us
    assert early.value == datetime.datetime(1970, 1, 1, 0, 0, 7, 1, UTC)
    assert one(5).time_ns is None and one(5).zone is None


def test_what_suits_no_type_is_bytes():
    assert one(b"abc", type="Uint32").value == b"abc"
    assert one(b"abc", type=12345).value == b"abc" and one(b"abc", type=12345).type == 12345
    assert one(b"a", type="UTF8 String").value == b"a"
    assert one(b"\xff\xe9", type="ASCII String").value == "\udcff\udce9"


def test_a_payload_is_no_copy_and_outlives_its_reader(tmp_path):
    path = tmp_path / "a.tav"
    path.write_bytes(streams.snapshot())
    reader = tav.open(path)
    payload = reader.find("//hostName").payload
    assert payload.readonly and payload.obj is reader.memory.obj
    reader.close()
    del reader
    gc.collect()
    assert bytes(payload) == b"host0"


def test_a_closed_reader_gives_errors_and_no_crash():
    reader = tav.open(streams.snapshot())
    node = reader.find("/system/host")
    walks = [iter(node), iter(reader), reader.findall("//hostName")]
    for walk in walks:
        next(walk)
    reader.close()
    reader.close()
    assert reader.closed and repr(reader) == "<tav.Reader, closed>" and "closed" in repr(node)
    uses = [lambda: node.value, lambda: node.payload, lambda: node.path, lambda: node.parent, lambda: list(node),
            lambda: len(node), lambda: node.find("*"), lambda: node.load(), lambda: reader.find("/"),
            lambda: list(reader), lambda: len(reader), reader.load, lambda: reader.form, lambda: reader.damage,
            lambda: reader.columns(), lambda: reader.__enter__(), lambda: node.time_ns]
    uses += [lambda walk=walk: next(walk) for walk in walks]
    for use in uses:
        with pytest.raises(tav.TavError, match="closed"):
            use()
    assert (node.tag, node.id, node.is_group) == ("host", 60102, True)
    assert node._repr_html_() and reader._repr_html_()


def test_a_buffer_cannot_be_resized_under_a_reader():
    data = bytearray(streams.snapshot())
    reader = tav.open(data)
    with pytest.raises(BufferError):
        data.append(0)
    reader.close()
    data.append(0)


def test_damage_stops_or_is_passed_over_and_told():
    data = bytearray(streams.snapshot(3))
    second = tav.open(bytes(data)).find("/system/host[2]/hostName").offset
    data[second + 7] = 0xFF  # a size
    with tav.open(bytes(data)) as reader:
        host = reader.find("/system/host[2]")
        for work in (lambda: list(host), lambda: list(reader.findall("//hostName")), reader.load, reader.columns):
            with pytest.raises(tav.TavError) as caught:
                work()
            assert caught.value.offset == second and caught.value.code != 0
            assert caught.value.path == "/system/host[2]" and caught.value.file == "memory"
        assert reader.damage == []
    with tav.open(bytes(data), on_damage="skip") as reader:
        assert [n.value for n in reader.findall("//hostName")] == ["host0", "host2"]
        assert [damage.offset for damage in reader.damage] == [second]
        loaded = reader.load()
        assert [host.get("hostName") for host in loaded["system"]["host"]] == ["host0", None, "host2"]
        assert "hostName" not in [n.tag for n in reader.find("/system/host[2]")]
        assert len(reader.columns()["ord"]) == len(streams.all_nodes(reader))
        assert len(reader.damage) == 1


def test_several_streams_of_several_forms_follow_each_other():
    data = b"".join(streams.snapshot(2, **form) for form in streams.FORMS if form["root"] == 64 and not form["align"])
    with tav.open(data) as reader:
        assert len(reader) == 2 and len(reader.load()) == 2
        assert [n.value for n in reader.findall("//cpuOnline")] == [1, 2, 1, 2]
        for root in reader:
            assert [host.find("cpuOnline").value for host in root] == [1, 2]


def test_an_open_group_has_no_size(tmp_path):
    path = tmp_path / "open.tav"
    writer = tav.Writer(path)
    group = writer.group("system")
    group.add("hostName", "ada")
    writer.flush()
    with tav.open(path) as reader:
        root = next(iter(reader))
        assert root.size is None and [n.value for n in root] == ["ada"]
    group.close()
    writer.finish()


@pytest.mark.parametrize("how", ["stop", "skip"])
def test_a_root_of_size_0_that_was_never_closed_has_the_children_that_follow(form, how):
    data = bytearray(streams.snapshot(3, **form))
    size = 8 if form["root"] == 64 else 4
    data[:size] = bytes(size)  # the root's
    with tav.open(bytes(data), on_damage=how, **form) as reader:
        root = next(iter(reader))
        assert [child.tag for child in root] == ["host"] * 3 and len(root) == 3
        assert root.load() == reader.load()["system"] and len(root.load()["host"]) == 3
        nodes = streams.all_nodes(reader)
        assert [n.offset for n in nodes] == list(reader.columns()["offset"])
        assert nodes[1].parent == root and nodes == [root, *reader.findall("//system//*")]


@pytest.mark.parametrize("how", ["stop", "skip"])
def test_an_empty_group_that_was_closed_has_nothing_of_what_follows(form, how):
    writer = tav.Writer(**form)
    with writer, writer.group("system") as system:
        with system.group("cpu"):
            pass
        system.add("hostName", "ada")
    with tav.open(writer.bytes(), on_damage=how, **form) as reader:
        empty = reader.find("/system/cpu")
        assert (empty.size, list(empty), empty.load()) == (0, [], {})
        assert reader.load() == {"system": {"cpu": {}, "hostName": "ada"}}
        assert [n.tag for n in streams.all_nodes(reader)] == list(reader.columns()["tag"])


def test_names_that_mean_nothing_are_told():
    with tav.open(streams.snapshot()) as reader:
        with pytest.raises(tav.TavError, match="did you mean hostName") as caught:
            reader.find("//hostNam")
        assert caught.value.name == "TAV_RC_BAD_PARAM"
        with pytest.raises(tav.TavError, match="column"):
            list(reader.findall("/system["))


@pytest.mark.parametrize("make, name", [
    (lambda path: path / "nowhere", "KOR_RC_NO_SUCH_FILE"), (lambda path: path, "KOR_RC_IS_FOLDER"),
    (lambda path: b"", "TAV_RC_NOT_FOUND"), (lambda path: b"no stream at all, surely", "TAV_RC_NOT_FOUND")])
def test_what_is_no_stream_is_refused(tmp_path, make, name):
    with pytest.raises(tav.TavError) as caught:
        tav.open(make(tmp_path))
    assert caught.value.name == name


def test_wrong_arguments_are_refused_as_python_does_it():
    data = streams.snapshot()
    for arguments in ({"byte_order": "middle"}, {"root": 16}, {"on_damage": "hide"}):
        with pytest.raises(ValueError):
            tav.open(data, **arguments)
    for source in (5, None, ["a"]):
        with pytest.raises(TypeError):
            tav.open(source)
    with pytest.raises(TypeError):
        tav.Node()


def test_a_tree_for_notebooks_escapes_what_it_shows():
    writer = tav.Writer()
    with writer, writer.group("system") as group:
        group.add("hostName", "<b>&")
    with tav.open(writer.bytes()) as reader:
        page = reader._repr_html_()
        assert "&lt;b&gt;&amp;" in page and "<b>" not in page and "<details>" in page
        assert next(iter(reader))._repr_html_() in page


def test_deep_nesting_needs_no_deep_stack():
    levels = 50_000
    leaf = struct.pack("<QIHHI", 4, 0, 55, 60111, 7)
    groups = (struct.pack("<QIHH", 16 * below + len(leaf), 0, 2, 60102) for below in reversed(range(levels)))
    data = b"".join(groups) + leaf
    with tav.open(data, byte_order="little", root=64, align=False) as reader:
        node = next(iter(reader))
        for _ in range(levels):
            node = next(iter(node))
        assert node.value == 7
        del node
        loaded = reader.load()
        for _ in range(levels):
            loaded = loaded["host"]
        assert loaded == {"cpuOnline": 7}
        assert reader.columns()["depth"][-1] == levels


def test_the_packages_files_are_there():
    assert (pathlib.Path(tav.__file__).parent / "py.typed").exists()
    assert tav.__version__.count(".") == 2
