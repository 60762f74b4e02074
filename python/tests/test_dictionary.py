"""Names of own elements."""
from __future__ import annotations

import json
import pathlib
import pickle

import pytest

import streams
import tav

NAMES = {"40001": {"tag": "queueDepth", "kind": "gauge", "unit": "1", "text": "jobs that wait"},
         "40002": {"tag": "jobs", "kind": "counter"}}


@pytest.fixture
def names(tmp_path) -> pathlib.Path:
    path = tmp_path / "own.json"
    path.write_text(json.dumps(NAMES))
    return path


@pytest.fixture
def day(tmp_path, names) -> pathlib.Path:
    """Two roots with own elements, a group among them, written by their names."""
    path = tmp_path / "day.tav"
    for i in range(2):
        with tav.Writer(path, append=True, dictionary=names) as writer, writer.group("system") as system:
            system.add("queueDepth", 10 + i)
            with system.group("jobs") as jobs:
                jobs.add("hostName", f"host{i}")
    return path


def test_nodes_paths_and_tables_have_the_names(day, names):
    with tav.open(day, dictionary=names) as reader:
        node = reader.find("/system[2]/queueDepth")
        assert (node.tag, node.id, node.value, node.path) == ("queueDepth", 40001, 11, "/system[2]/queueDepth")
        assert [each.path for each in reader.findall("//jobs[hostName = 'host1']/hostName")] == [
            "/system[2]/jobs/hostName"]
        assert reader.load()[0] == {"system": {"queueDepth": 10, "jobs": {"hostName": "host0"}}}
        assert list(reader.columns()["tag"][:4]) == ["system", "queueDepth", "jobs", "hostName"]
        rows = reader.table("/system", {"depth": "queueDepth", "host": "jobs/hostName"}).to_pandas()
        assert rows.values.tolist() == [[10, "host0"], [11, "host1"]]
        assert reader.dictionary == tav.Dictionary(names)
    frame = tav.read_table(day, "/system", {"depth": "queueDepth"}, dictionary=names)
    assert frame["depth"].tolist() == [10, 11]
    with tav.open(day) as reader:
        assert reader.dictionary is None
        assert reader.find("/system/#40001").tag is None
        with pytest.raises(tav.TavError, match="queueDepth"):
            reader.find("/system/queueDepth")


def test_the_program_says_the_same(day, names):
    told = [(node["id"], node["path"]) for node in streams.program_nodes(day, "--dictionary", str(names))]
    with tav.open(day, dictionary=names) as reader:
        assert [(node.id, node.path) for node in streams.all_nodes(reader)] == told


def test_passes_have_the_names(day, names, tmp_path):
    assert "/system/queueDepth" in [entry.path for entry in tav.schema(day, dictionary=names)]
    text = tav.to_json(day, dictionary=names)
    assert "queueDepth" in text and "queueDepth" not in tav.to_json(day)
    assert tav.from_json(text) == tav.from_json(text, dictionary=names) == day.read_bytes()
    other = tmp_path / "other.tav"
    assert tav.set(day, {"//queueDepth": 7}, other, dictionary=names) == 2
    assert {found.message for found in tav.diff(day, other, ignore=["//queueDepth"], dictionary=names)} == set()
    assert [found.before.path for found in tav.diff(day, other, dictionary=names)] == [
        "/system/queueDepth", "/system[2]/queueDepth"]
    assert tav.extract(day, "/system[2]/jobs", dictionary=names).data is not None
    assert tav.recover(day, dictionary=names).data == day.read_bytes()
    assert tav.check(day, dictionary=names) == []
    parts = tav.plan(day, "1MB", each="/system", columns={"depth": "queueDepth"}, dictionary=names)
    with tav.open(day, dictionary=names) as reader:
        tables = [reader.table("/system", {"depth": "queueDepth"}, part=part) for part in parts]
    assert sum(len(table) for table in tables) == 2


def test_what_follows_has_the_names(day, names):
    with tav.follow(day, timeout=0, dictionary=names) as nodes:
        found = [(node.tag, node.path) for node in nodes]
    assert found[:3] == [("system", "/system"), ("queueDepth", "/system/queueDepth"), ("jobs", "/system/jobs")]
    with tav.follow(day, roots=True, timeout=0, dictionary=names) as roots:
        assert [root.find("queueDepth").value for root in roots] == [10, 11]


def test_frames_of_dask_have_the_names(day, names):
    dask = pytest.importorskip("dask")
    with dask.config.set(scheduler="synchronous"):
        frame = tav.dask.read_table(str(day), "/system", {"depth": "queueDepth"}, dictionary=names).compute()
    assert frame["depth"].tolist() == [10, 11]


def test_a_dictionary_tells_its_elements(names, tmp_path):
    own = tav.Dictionary(names)
    assert own.elements == [(40001, "queueDepth", "gauge", "1", "jobs that wait"), (40002, "jobs", "counter", None, None)]
    assert len(own) == 2 and own == pickle.loads(pickle.dumps(own)) and own != tav.Dictionary()
    more = tmp_path / "more.json"
    more.write_text('{"40003": {"tag": "other"}}')
    assert [element.id for element in tav.Dictionary(names, more).elements] == [40001, 40002, 40003]


def test_what_is_no_dictionary_is_refused(names, tmp_path):
    bad = tmp_path / "bad.json"
    bad.write_text('{"40001": {"tag": "elsewhere"}}')
    with pytest.raises(tav.TavError, match="40001"):
        tav.Dictionary(names, bad)
    bad.write_text("{")
    with pytest.raises(tav.TavError, match="line 1"):
        tav.open(streams.snapshot(), dictionary=bad)
    with pytest.raises(tav.TavError):
        tav.open(streams.snapshot(), dictionary=tmp_path / "none.json")
    with pytest.raises(TypeError):
        tav.open(streams.snapshot(), dictionary=5)  # type: ignore[arg-type]
    with tav.Writer(dictionary=names) as writer, pytest.raises(tav.TavError, match="queueDepth"):
        writer.group("queueDept")
