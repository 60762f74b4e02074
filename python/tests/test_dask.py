"""Frames of dask against those of one pass: by worker processes of a real cluster on this machine."""
from __future__ import annotations

import os
import pickle
import random
import signal
import time

import pandas as pd
import pytest

import streams
import tav

pytest.importorskip("dask.dataframe")
distributed = pytest.importorskip("distributed")
import dask  # noqa: E402  (behind the question whether it is there)
import tav.dask  # noqa: E402  (behind what it needs)

COLUMNS = {"name": "hostName", "cpus": "cpuOnline", "signed": "#1001"}
EACH = "/system/host"
PATIENCE = 600  # ends what hangs


# A worker asks the address of one that was killed until its own time for that is over, and does nothing with what it
# waits for meanwhile.
WORKERS = {"distributed.comm.timeouts.connect": "5s"}


@pytest.fixture(scope="module")
def cluster():
    patient = dask.config.set({"distributed.comm.timeouts.connect": PATIENCE,  # a busy machine starts processes slowly
                               "distributed.deploy.lost-worker-timeout": PATIENCE})
    with patient, distributed.LocalCluster(n_workers=2, threads_per_worker=1, processes=True, host="127.0.0.1",
                                           dashboard_address=None, config=WORKERS) as made:
        with distributed.Client(made, timeout=PATIENCE) as client:
            yield client


def make(path, hosts: int, roots: int = 1, forge: bool = False) -> None:
    with tav.Writer() as inner:
        for i in range(60):
            with inner.group("host", eye_size=True) as host:
                host.add("hostName", "forged")
                host.add("cpuOnline", 99)
    rng = random.Random(hosts)
    with tav.Writer() as w:
        for _ in range(roots):
            with w.group("system") as system:
                for i in range(hosts):
                    with system.group("host", eye_size=i % 3 == 0) as host:
                        host.add("hostName", f"host{i}" * rng.randrange(1, 4))
                        if i % 5:
                            host.add("cpuOnline", i, type="Uint64")
                        host.add(1001, -i, type="Sint64")
                        if forge and i % 50 == 7:
                            host.add(1002, inner.bytes())
    path.write_bytes(w.bytes())


def same(frame, paths, **options) -> pd.DataFrame:
    found = frame.compute().reset_index(drop=True)
    expected = tav.read_table(paths, each=EACH, columns=COLUMNS, **options)
    pd.testing.assert_frame_equal(found, expected)
    assert list(frame.dtypes.astype(str)) == list(expected.dtypes.astype(str))
    return found


@pytest.mark.parametrize("forge", [False, True])
@pytest.mark.parametrize("roots", [1, 7])
def test_any_number_of_parts_is_the_whole(cluster, tmp_path, roots, forge):
    path = tmp_path / "day.tav"
    make(path, 6000 // roots, roots, forge)
    size = path.stat().st_size
    counts = []
    for parts in (1, 2, 5, 16, 64):
        frame = tav.dask.read_table(path, EACH, COLUMNS, blocksize=size // parts + 1)
        counts.append(frame.npartitions)
        assert len(same(frame, path)) == 6000 // roots * roots
    assert counts[0] == 1 and counts[-1] > 40 and counts == sorted(counts)


def test_a_forged_part_is_read_again(tmp_path):
    path = tmp_path / "forged.tav"
    make(path, 3000, forge=True)
    query = tav.dask._Query(EACH, COLUMNS, None, "stop", (None, None, None))
    again = 0
    for size in (900, 2000, 3000, 5000):
        parts = query.plan(str(path), size)
        tail = None
        frames = []
        for part in parts:
            found = tav.dask._read_part(query, str(path), part)
            frame, tail = tav.dask._join(query, str(path), part, found, tail)
            again += frame is not found[0]
            frames.append(frame)
        joined = pd.concat(frames, ignore_index=True)
        assert list(joined["name"]) == list(tav.read_table(path, EACH, COLUMNS)["name"])
    assert again > 0


def test_a_thousand_small_files(cluster, tmp_path):
    for i in range(1000):
        (tmp_path / f"{i:04}.tav").write_bytes(streams.snapshot(i % 3, byte_order=("little", "big")[i % 2]))
    frame = tav.dask.read_table(tmp_path / "*.tav", "//host", COLUMNS)
    assert frame.npartitions == 1000
    expected = tav.read_table(tmp_path / "*.tav", each="//host", columns=COLUMNS)
    pd.testing.assert_frame_equal(frame.compute().reset_index(drop=True), expected)


def test_damage_is_passed_over_or_raised(cluster, tmp_path):
    path = tmp_path / "damaged.tav"
    make(path, 2000)
    data = bytearray(path.read_bytes())
    rng = random.Random(5)
    for _ in range(12):
        data[rng.randrange(1000, len(data))] ^= 1 << rng.randrange(8)
    path.write_bytes(data)
    for size in (len(data) // 3, len(data) // 40):
        frame = tav.dask.read_table(path, EACH, COLUMNS, blocksize=size, on_damage="skip", types={"cpus": "uint64"})
        same(frame, path, on_damage="skip")
    data[5000:5008] = b"\xff" * 8
    path.write_bytes(data)
    with pytest.raises(tav.TavError) as caught:
        tav.dask.read_table(path, EACH, COLUMNS, blocksize=len(data) // 40).compute()
    assert caught.value.offset is not None and caught.value.file == str(path)


def test_a_worker_that_is_killed_takes_no_rows_away(cluster, tmp_path):
    path = tmp_path / "day.tav"
    make(path, 4000)
    frame = tav.dask.read_table(path, EACH, COLUMNS, blocksize=path.stat().st_size // 40)
    begun, go = tmp_path / "begun", tmp_path / "go"
    begun.mkdir()

    def held(part):
        """The part, when it may go on."""
        (begun / str(os.getpid())).touch()
        while not go.exists():
            time.sleep(0.005)
        return part

    future = cluster.compute(frame.map_partitions(held, meta=frame._meta))
    deadline = time.monotonic() + PATIENCE
    while not (at_work := list(begun.iterdir())):
        assert time.monotonic() < deadline
        time.sleep(0.005)
    assert not future.done()
    os.kill(int(at_work[0].name), signal.SIGKILL)
    go.touch()
    expected = tav.read_table(path, each=EACH, columns=COLUMNS)
    pd.testing.assert_frame_equal(future.result(timeout=PATIENCE).reset_index(drop=True), expected)


def test_a_type_that_only_later_rows_have_is_told(tmp_path, monkeypatch):
    monkeypatch.setattr(tav.dask, "_SAMPLE", 1)
    first, second = tmp_path / "0.tav", tmp_path / "1.tav"
    for path, value, kind in ((first, 5, "Uint32"), (second, -5, "Sint32")):
        with tav.Writer(path) as w, w.group("system") as g:
            g.add("cpuOnline", value, type=kind)
    columns = {"cpus": "cpuOnline"}
    with pytest.raises(ValueError, match="types="):
        tav.dask.read_table([first, second], "/system", columns).compute(scheduler="sync")
    for kind, dtype, values in (("int64", "Int64", [5, -5]), ("text", "object", ["5", "-5"]),
                                ("int128", "object", [5, -5])):
        frame = tav.dask.read_table([first, second], "/system", columns, types={"cpus": kind})
        found = frame.compute(scheduler="sync")
        assert list(found["cpus"]) == values and str(found["cpus"].dtype) == dtype == str(frame.dtypes["cpus"])
    with pytest.raises(ValueError):
        tav.dask.read_table(first, "/system", columns, types={"cpu": "int64"})


def test_a_part_is_read_by_itself_and_can_be_sent(tmp_path):
    path = tmp_path / "day.tav"
    make(path, 500)
    parts = tav.plan(path, 4000, each=EACH, columns=COLUMNS)
    assert len(parts) > 5 and parts[0].start == 0 and parts[-1].end == path.stat().st_size
    assert all(a.end == b.start for a, b in zip(parts, parts[1:]))
    assert pickle.loads(pickle.dumps(parts)) == parts
    with tav.open(path) as reader:
        rows = [len(reader.table(EACH, COLUMNS, part=part)) for part in parts]
        assert sum(rows) == 500 and min(rows) > 0
        with pytest.raises(tav.TavError):
            reader.table("/system", COLUMNS, part=parts[1])
    assert len(tav.plan(path, "1MB")) == 1
    for wrong in (0, "-1", "5 parsecs"):
        with pytest.raises(ValueError):
            tav.plan(path, wrong)


def test_an_error_can_be_sent(tmp_path):
    with pytest.raises(tav.TavError) as caught:
        tav.open(b"no stream at all, but text")
    sent = pickle.loads(pickle.dumps(caught.value))
    assert str(sent) == str(caught.value) and sent.code == caught.value.code and sent.name == caught.value.name
