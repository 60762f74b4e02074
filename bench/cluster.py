#!/usr/bin/python3
"""From which size on a cluster pays: seconds for one table, in one pass and by worker processes of dask on this machine.

    PYTHONPATH=build/release/python bench/cluster.py [WORKERS] [MEGABYTES...]      default: 2 workers, 8 to 512 MB

The files hold roots with hosts of four values each. Starting the cluster is not in the figures.
"""
from __future__ import annotations

import os
import pathlib
import sys
import tempfile
import time
from typing import Any, Callable

import distributed

import tav
import tav.dask

COLUMNS = {"name": "hostName", "cpus": "cpuOnline", "first": "#1001", "second": "#1002"}


def root() -> bytes:
    writer = tav.Writer()
    with writer, writer.group("system") as system:
        for i in range(10_000):
            with system.group("host") as host:
                host.add("hostName", f"host{i}")
                host.add("cpuOnline", i)
                host.add(1001, i * 7)
                host.add(1002, i << 33)
    return writer.bytes()


def seconds(work: Callable[[], Any]) -> float:
    best = float("inf")
    for _ in range(3):
        start = time.perf_counter()
        work()
        best = min(best, time.perf_counter() - start)
    return best


def main() -> None:
    workers = int(sys.argv[1]) if len(sys.argv) > 1 else 2
    sizes = [int(each) for each in sys.argv[2:]] or [8, 32, 128, 512]
    one = root()
    with tempfile.TemporaryDirectory() as folder, \
            distributed.LocalCluster(n_workers=workers, threads_per_worker=1, processes=True, host="127.0.0.1",
                                     dashboard_address=None) as cluster, distributed.Client(cluster):
        path = pathlib.Path(folder) / "x.tav"
        print(f"{workers} workers, {os.cpu_count()} processors; the mean of a column, best of 3")
        for size in sizes:
            with path.open("wb") as file:
                for _ in range(size * 10**6 // len(one) + 1):
                    file.write(one)
            block = max(size * 10**6 // (4 * workers), 10**6)
            alone = seconds(lambda: tav.read_table(path, "/system/host", COLUMNS)["cpus"].mean())
            spread = seconds(lambda: tav.dask.read_table(path, "/system/host", COLUMNS,
                                                         blocksize=block)["cpus"].mean().compute())
            print(f"{size:6} MB   one pass {alone:7.2f} s   dask {spread:7.2f} s   {alone / spread:5.2f} times as fast",
                  flush=True)


if __name__ == "__main__":
    main()
