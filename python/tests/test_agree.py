"""What Python writes and what the program writes is the same to both; golden streams, random ones, findings."""
from __future__ import annotations

import datetime
import os
import pathlib
import tempfile

import hypothesis
import pytest
from hypothesis import strategies as st

import streams
import tav

UTC = datetime.timezone.utc
GOLDEN = sorted((streams.ROOT / "tests" / "golden").glob("*.hex"))
FINDINGS = sorted(path for path in (streams.ROOT / "fuzz" / "findings").rglob("*") if path.is_file())

integers = st.integers(-(2**127), 2**128 - 1)
texts = st.text(st.characters(blacklist_categories=["Cs"]), max_size=20)
moments = st.datetimes(datetime.datetime(1970, 1, 1), datetime.datetime(9999, 12, 31), timezones=st.just(UTC))
words = st.lists(st.integers(0, 2**64 - 1), max_size=5)
values = st.one_of(integers, texts, st.binary(max_size=20), moments, words)
elements = st.sampled_from(["hostName", "cpuOnline", "osName", 1000, 40001, 60104])
trees = st.recursive(st.tuples(elements, values),
                     lambda inner: st.tuples(st.sampled_from(["host", "cpu", 40000]), st.lists(inner, max_size=4),
                                             st.booleans()), max_leaves=12)
forms = st.sampled_from(streams.FORMS)


def write(group: tav.Group, tree) -> None:
    if len(tree) == 2:
        group.add(*tree)
        return
    name, children, eye_size = tree
    with group.group(name, eye_size=eye_size) as inner:
        for child in children:
            write(inner, child)


def make(children, form) -> bytes:
    writer = tav.Writer(**form)
    with writer, writer.group("system") as root:
        for child in children:
            write(root, child)
    return writer.bytes()


def without_pairs(tree):
    """32-bit headers have none."""
    return tree if len(tree) == 2 else (tree[0], [without_pairs(child) for child in tree[1]], False)


def shown(node: tav.Node):
    """The value as JSON of the program has it."""
    value = node.value
    if node.type in ("Uint128", "Sint128"):
        return str(value)
    if node.type == "Binary":
        return value.hex()
    if node.type == "Uint64 array":
        return list(value)
    if isinstance(value, datetime.datetime):
        return value.isoformat(timespec="microseconds")
    return value


@hypothesis.settings(max_examples=int(os.environ.get("TAV_TEST_CASES", "60")), deadline=None,
                     suppress_health_check=list(hypothesis.HealthCheck))
@hypothesis.given(st.lists(trees, max_size=6), forms)
def test_the_program_reads_what_python_wrote(children, form):
    if form["root"] == 32:
        children = [without_pairs(child) for child in children]
    data = make(children, form)
    with tempfile.TemporaryDirectory() as folder:
        path = pathlib.Path(folder, "a.tav")
        path.write_bytes(data)
        options = ["--byte-order", form["byte_order"], "--root", str(form["root"]),
                   "--align" if form["align"] else "--no-align"]
        told = streams.program_nodes(path, *options)
        with tav.open(path, **form) as reader:
            nodes = streams.all_nodes(reader)
            assert [(n.offset, n.id, n.type) for n in nodes] == [(t["offset"], t["id"], t["type"]) for t in told]
            for node, each in zip(nodes, told):
                assert node.path == each["path"]
                if not node.is_group:
                    assert ("bytes" if node.type == "Binary" else "value") in each
                    assert shown(node) == each.get("value", each.get("bytes"))
            columns = reader.columns(path=True)
            assert list(columns["offset"]) == [n.offset for n in nodes]
            assert list(columns["path"]) == [n.path for n in nodes]
            assert [columns["number"][i] if columns["number_valid"][i] else None for i in range(len(nodes))] == [
                n.value if isinstance(n.value, int) else None for n in nodes]
            assert list(columns["text"]) == [n.value if isinstance(n.value, str) else None for n in nodes]


@hypothesis.settings(max_examples=int(os.environ.get("TAV_TEST_CASES", "60")), deadline=None)
@hypothesis.given(st.lists(trees, max_size=6), forms)
def test_python_reads_what_it_wrote(children, form):
    children = [without_pairs(child) for child in children]
    with tav.open(make(children, form), **form) as reader:
        expected = []

        def flatten(tree):
            expected.append(tree[1] if len(tree) == 2 else None)
            for child in tree[1] if len(tree) == 3 else ():
                flatten(child)

        for child in children:
            flatten(child)
        found = [list(n.value) if n.type == "Uint64 array" else n.value for n in streams.all_nodes(reader)[1:]]
        assert found == expected


@pytest.mark.parametrize("path", GOLDEN, ids=lambda path: path.stem)
def test_golden_streams_are_read_as_the_program_reads_them(path, tmp_path):
    text = "".join(line.split("#")[0] for line in path.read_text().splitlines())
    file = tmp_path / "golden.tav"
    file.write_bytes(bytes.fromhex("".join(text.split())))
    told = streams.program_nodes(file)
    with tav.open(file, on_damage="skip") as reader:
        nodes = streams.all_nodes(reader)
        assert [(n.offset, n.id, n.type) for n in nodes] == [(t["offset"], t["id"], t["type"]) for t in told]
        assert list(reader.columns()["offset"]) == [n.offset for n in nodes]


@pytest.mark.parametrize("path", FINDINGS, ids=lambda path: path.name)
def test_what_fuzzing_has_found_ends_with_an_answer(path):
    data = path.read_bytes()
    for cut in (data, data[1:]):
        for how in ("stop", "skip"):
            try:
                with tav.open(cut, on_damage=how) as reader:
                    for node in list(reader.findall("//*"))[:200]:
                        node.value, node.path, node.parent, list(node)
                    reader.load(), reader.columns(path=True), tav.check(cut), tav.schema(cut, on_damage=how)
            except tav.TavError as error:
                assert error.name
