"""Following files that grow."""
from __future__ import annotations

import gc
import os
import pathlib
import signal
import subprocess
import sys
import tempfile
import threading
import weakref

import pytest
from hypothesis import given, settings
from hypothesis import strategies as st

import streams
import tav

SOON = 0.01  # seconds: nothing more is written when this is waited for


def told(path: os.PathLike[str], **how: object) -> list[tuple[str, object]]:
    """All that is there, by path and value."""
    with tav.follow(path, timeout=SOON, **how) as nodes:  # type: ignore[arg-type]
        return [(node.path, node.value) for node in nodes]


def read(path: os.PathLike[str]) -> list[tuple[str, object]]:
    with tav.open(path) as reader:
        return [(node.path, node.value) for node in streams.all_nodes(reader)]


def take(follow: tav.Follow, count: int) -> list[object]:
    """The next values that are no groups."""
    values: list[object] = []
    while len(values) < count:
        node = next(follow)
        if not node.is_group:
            values.append(node.value)
    return values


@pytest.mark.parametrize("form", streams.FORMS, ids=str)
def test_what_is_there_is_told_as_a_reader_reads_it(tmp_path, form):
    path = tmp_path / "a.tav"
    path.write_bytes(streams.snapshot(300, **form) + streams.snapshot(2, **form))
    assert told(path, **form) == read(path)
    with tav.follow(path, timeout=SOON, **form) as nodes, tav.open(path) as reader:
        for came, node in zip(nodes, streams.all_nodes(reader), strict=True):
            assert came == (node.path, node.id, node.tag, node.type, node.value, node.offset, node.size,
                            node.path.count("/") - 1, node.is_group)


def test_what_is_written_comes_once_and_in_order(tmp_path):
    path = tmp_path / "a.tav"
    with tav.follow(path) as nodes:  # of no file yet
        for i in range(3):
            with tav.Writer(path, append=True) as writer, writer.group("system") as group:
                group.add("cpuOnline", 2 * i)
                writer.flush()
                assert take(nodes, 1) == [2 * i]
                group.add("cpuOnline", 2 * i + 1)
            assert take(nodes, 1) == [2 * i + 1]


def test_a_writer_of_another_process_is_followed(tmp_path):
    path = tmp_path / "a.tav"
    script = ("import sys, tav\n"
              "for i in range(20):\n"
              "    with tav.Writer(sys.argv[1], append=True) as w, w.group('system') as g:\n"
              "        for k in range(50):\n"
              "            g.add('cpuOnline', 50 * i + k)\n"
              "            w.flush() if k % 7 == 0 else w.sync() if k % 11 == 0 else None\n")
    with subprocess.Popen([sys.executable, "-c", script, str(path)]) as writer, tav.follow(path) as nodes:
        assert take(nodes, 1000) == list(range(1000))
    assert writer.returncode == 0


@settings(max_examples=40, deadline=None)
@given(st.lists(st.integers(1, 6), max_size=8), st.booleans())
def test_pieces_of_any_length_give_the_same(counts, align):
    stream = b"".join(streams.snapshot(count, align=align) for count in counts)
    with tempfile.TemporaryDirectory() as folder:
        path = pathlib.Path(folder, "a.tav")
        path.write_bytes(b"")
        found: list[tuple[str, object]] = []
        with tav.follow(path, timeout=SOON, byte_order=sys.byteorder, root=64, align=align) as nodes:
            step = max(1, len(stream) // 7)
            for at in range(0, len(stream), step):
                with open(path, "ab") as file:
                    file.write(stream[at:at + step])
                found += [(node.path, node.value) for node in nodes._ready()]
            found += [(node.path, node.value) for node in nodes]
        assert found == (read(path) if stream else [])


def test_roots_come_whole_when_they_have_ended(tmp_path):
    path = tmp_path / "a.tav"
    path.write_bytes(streams.snapshot(2))
    with tav.follow(path, roots=True) as roots:
        first = next(roots)
        writer = tav.Writer(path, append=True)
        group = writer.group("system")
        group.add("cpuOnline", 7)
        writer.flush()
        assert roots._ready() == []
        group.close()
        writer.finish()
        second = next(roots)
    assert [node.value for node in first.findall("host/hostName")] == ["host0", "host1"]
    assert (second.path, second.load()) == ("/system", {"cpuOnline": 7})
    os.unlink(path)
    assert first.find("host[2]/cpuOnline").value == 2


def test_only_what_is_new_is_told_without_existing(tmp_path):
    path = tmp_path / "a.tav"
    path.write_bytes(streams.snapshot(400))
    with tav.follow(path, existing=False) as nodes:
        assert nodes._ready() == []
        with tav.Writer(path, append=True) as writer, writer.group("system") as group:
            group.add("cpuOnline", 9)
        assert take(nodes, 1) == [9]


def test_a_file_that_is_cut_replaced_or_missing_is_told_of(tmp_path):
    path = tmp_path / "a.tav"
    changes: list[str] = []
    with tav.follow(path, on_change=changes.append) as nodes:
        assert nodes._ready() == []
        assert changes == ["missing"]
        path.write_bytes(streams.snapshot(1))
        assert take(nodes, 2) == ["host0", 1]
        assert changes == ["missing", "appeared"]
        other = tmp_path / "b.tav"
        other.write_bytes(streams.snapshot(2))
        os.replace(other, path)
        assert take(nodes, 4) == ["host0", 1, "host1", 2]
        assert changes == ["missing", "appeared", "replaced"]
        os.truncate(path, 0)
        assert nodes._ready() == []
        assert changes == ["missing", "appeared", "replaced", "shortened"]
        with open(path, "ab") as file:
            file.write(streams.snapshot(1))
        assert take(nodes, 2) == ["host0", 1]


def test_damage_is_passed_over_and_listed(tmp_path):
    data = bytearray(streams.snapshot(3))
    with tav.open(bytes(data)) as reader:
        at = reader.find("/system/host[2]/hostName").offset
    data[at:at + 3] = b"\xff\xff\xff"
    path = tmp_path / "a.tav"
    path.write_bytes(data)
    with tav.follow(path, timeout=SOON) as nodes:
        values = [node.value for node in nodes if not node.is_group]
        assert values == ["host0", 1, "host2", 3]
        assert [damage.offset for damage in nodes.damage] == [at]


def test_the_loop_ends_when_nothing_comes_for_as_long_as_is_said(tmp_path):
    path = tmp_path / "a.tav"
    path.write_bytes(streams.snapshot(1))
    nodes = tav.follow(path, timeout=0)
    assert len(list(nodes)) == 4
    assert nodes.closed and list(nodes) == []


def test_another_thread_closes_it(tmp_path):
    nodes = tav.follow(tmp_path / "a.tav")
    ended = threading.Event()

    def loop() -> None:
        list(nodes)
        ended.set()

    thread = threading.Thread(target=loop)
    thread.start()
    nodes.close()
    assert ended.wait(60)
    thread.join()
    assert nodes.closed


def test_an_interrupt_ends_a_wait(tmp_path):
    script = ("import signal, sys, tav\n"
              "signal.signal(signal.SIGINT, signal.default_int_handler)\n"
              "nodes = tav.follow(sys.argv[1])\n"
              "nodes._ready()\n"
              "try:\n    print('waits', flush=True)\n    next(nodes)\n"
              "except KeyboardInterrupt:\n    print('interrupted', nodes.closed)\n")
    with subprocess.Popen([sys.executable, "-c", script, str(tmp_path / "a.tav")], stdout=subprocess.PIPE) as process:
        assert process.stdout is not None and process.stdout.readline() == b"waits\n"
        process.send_signal(signal.SIGINT)
        assert process.communicate(timeout=60)[0] == b"interrupted False\n"


def test_an_exception_of_a_callback_goes_through(tmp_path):
    def refuse(change: str) -> None:
        raise KeyError(change)

    with pytest.raises(KeyError, match="missing"):
        next(tav.follow(tmp_path / "a.tav", on_change=refuse))


def test_a_folder_and_bad_arguments_are_refused(tmp_path):
    with pytest.raises(tav.TavError):
        next(tav.follow(tmp_path))
    with pytest.raises(ValueError):
        tav.follow(tmp_path / "a", timeout=-1)
    with pytest.raises(TypeError):
        tav.follow(tmp_path / "a", on_change="missing")  # type: ignore[arg-type]
    with pytest.raises(TypeError):
        tav.follow(5)  # type: ignore[arg-type]


def test_nothing_is_left_behind(tmp_path):
    path = tmp_path / "a.tav"
    path.write_bytes(streams.snapshot(3))
    gc.collect()
    files = len(os.listdir("/proc/self/fd")) if os.path.isdir("/proc/self/fd") else 0
    nodes = tav.follow(path)
    next(nodes)
    gone = weakref.ref(nodes)
    del nodes
    gc.collect()
    assert gone() is None
    assert not files or len(os.listdir("/proc/self/fd")) == files
