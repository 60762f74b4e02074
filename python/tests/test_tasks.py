"""Functions over whole streams, against the program."""
from __future__ import annotations

import json

import pytest

import streams
import tav


@pytest.fixture
def file(tmp_path):
    path = tmp_path / "a.tav"
    path.write_bytes(streams.snapshot(3))
    return path


@pytest.fixture
def damaged(tmp_path):
    data = bytearray(streams.snapshot(3))
    data[tav.open(bytes(data)).find("/system/host[2]/hostName").offset + 7] = 0xFF
    path = tmp_path / "damaged.tav"
    path.write_bytes(data)
    return path


def test_recognise_tells_form_and_reasons(file):
    form = tav.recognise(file)
    assert tuple(form)[:3] == ("little", 64, False) and form.alternatives == [] and form.because
    assert tav.recognise(file, align=True).align
    with pytest.raises(tav.TavError):
        tav.recognise(b"nothing")


def test_check_finds_what_the_program_finds(file, damaged):
    assert tav.check(file) == []
    found = tav.check(damaged)
    told = json.loads(streams.program("check", "--json", str(damaged), status=1))["findings"]
    assert [(each.rule, each.offset, each.path) for each in found] == [
        (each["rule"], each["offset"], each["path"]) for each in told] != []
    assert tav.check(damaged, rules=[found[0].rule])[0] == found[0]
    with pytest.raises(tav.TavError, match="no rule"):
        tav.check(file, rules=["no-such-rule"])


def test_recover_makes_what_the_program_makes(damaged, tmp_path):
    streams.program("recover", str(damaged), "-o", str(tmp_path / "tool.tav"), status=1)
    out = tmp_path / "python.tav"
    report = tav.recover(damaged, out)
    assert out.read_bytes() == (tmp_path / "tool.tav").read_bytes() == tav.recover(damaged.read_bytes()).data
    assert report.kept + report.lost + report.unread == report.size and report.lost_places and report.data is None
    with pytest.raises(FileExistsError):
        tav.recover(damaged, out)
    tav.recover(damaged, out, overwrite=True)
    with pytest.raises(tav.TavError):
        tav.recover(b"nothing is whole here", tmp_path / "none.tav")
    assert sorted(each.name for each in tmp_path.iterdir()) == ["damaged.tav", "python.tav", "tool.tav"]


def test_diff_tells_what_is_different(file):
    other = streams.snapshot(4, byte_order="big")
    assert tav.diff(file, file) == []
    found = tav.diff(file, other)
    assert [(each.change, each.before, each.after.path) for each in found] == [
        (tav.Change.ADDED, None, "/system/host[4]")]
    assert tav.diff(file, other, ignore=["/system/host[4]"]) == []
    inside = tav.diff(file, file, path_a="/system/host", path_b="/system/host[2]")
    assert {each.after.value for each in inside} == {'"host1"', "2"}
    assert tav.diff(file, file, path_a="//cpuOnline", path_b="//host[2]/cpuOnline", tolerance="50%") == []
    with pytest.raises(ValueError):
        tav.diff(file, file, tolerance=-1)


def test_json_goes_there_and_back(file, damaged, tmp_path):
    for path in (file, damaged):
        text = tav.to_json(path)
        assert text.encode() == streams.program("json", str(path), status=0 if path == file else 1)
        assert tav.from_json(text) == path.read_bytes()
        assert tav.from_json(tav.to_json(path, lines=True)) == path.read_bytes()
    assert tav.from_json('{"system": {"cpuOnline": 8}}', tmp_path / "made.tav", byte_order="big") is None
    assert tav.open(tmp_path / "made.tav").find("//cpuOnline").value == 8
    with pytest.raises(tav.TavError):
        tav.from_json("{")


def test_set_changes_a_file_or_makes_a_new_one(file, tmp_path):
    assert tav.set(file, {"//cpuOnline": 9, "/system/host/hostName": "adele"}) == 6
    assert [n.value for n in tav.open(file).findall("//cpuOnline")] == [9, 9, 9]
    with pytest.raises(tav.TavError):
        tav.set(file, {"//hostName": "of another length"})
    assert tav.set(file, {"//hostName": "longer than before"}, tmp_path / "b.tav") == 3
    assert tav.open(tmp_path / "b.tav").find("//hostName").value == "longer than before"
    made = tav.set(file.read_bytes(), {"//cpuOnline": -1}, type="Sint64")
    assert [n.type for n in tav.open(made).findall("//cpuOnline")] == ["Sint64"] * 3
    with pytest.raises(tav.TavError) as caught:
        tav.set(file, {"//osName": "x"})
    assert caught.value.name == "TAV_RC_NOT_FOUND" or "no" in str(caught.value)


def test_schema_counts_paths(file):
    entries = {each.path: each for each in tav.schema(file, file)}
    assert entries["/system/host"].count == 6
    cpus = entries["/system/host/cpuOnline"]
    assert (cpus.least, cpus.greatest, cpus.types) == (1, 3, ["Uint32"])
    assert entries["/system/host/hostName"].distinct == 3


def test_extract_makes_streams_of_subtrees(file, tmp_path):
    result = tav.extract(file, "/system/host[2]")
    assert (result.roots, result.nodes) == (1, 3)
    assert tav.open(result.data).load() == {"host": {"hostName": "host1", "cpuOnline": 2}}
    assert tav.extract(file, "//host", tmp_path / "hosts.tav").roots == 3
    with pytest.raises(tav.TavError):
        tav.extract(file, "//cpuOnline")


@pytest.mark.parametrize("work", [
    lambda path, how: tav.diff(path, path, on_damage=how), lambda path, how: tav.schema(path, on_damage=how),
    lambda path, how: tav.extract(path, "/system", on_damage=how),
    lambda path, how: tav.set(path.read_bytes(), {"//cpuOnline": 9}, on_damage=how)])
def test_damage_stops_functions_unless_it_is_skipped(damaged, work):
    work(damaged, "skip")
    with pytest.raises(tav.TavError) as caught:
        work(damaged, "stop")
    assert caught.value.offset is not None
    with pytest.raises(ValueError):
        work(damaged, "hide")
