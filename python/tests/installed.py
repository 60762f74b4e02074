"""A small program by an installed package: writes a stream, reads it, and makes columns and a table of it.

    installed.py FOLDER     FOLDER: where the package must come from
"""
from __future__ import annotations

import datetime
import pathlib
import sys
import tempfile

import tav


def main() -> None:
    folder = pathlib.Path(sys.argv[1]).resolve()
    for module in (tav, tav._tav):
        assert pathlib.Path(module.__file__ or "").resolve().is_relative_to(folder), module.__file__
    start = datetime.datetime(2024, 2, 29, tzinfo=datetime.timezone.utc)
    with tempfile.TemporaryDirectory() as work:
        path = pathlib.Path(work) / "day.tav"
        with tav.Writer(path) as writer:
            for hour in range(24):
                with writer.group("system") as system:
                    system.add("timestamp", start + datetime.timedelta(hours=hour))
                    system.add("cpuOnline", hour + 1)
        assert tav.check(path) == []
        with tav.open(path) as reader:
            assert [node.value for node in reader.findall("/system/cpuOnline")] == list(range(1, 25))
            assert reader.find("/system[24]/timestamp").value == start + datetime.timedelta(hours=23)
            columns = reader.columns()
            assert len(columns["tag"]) == 3 * 24, {name: len(column) for name, column in columns.items()}
            table = reader.table("/system", columns={"time": "timestamp", "cpus": "cpuOnline"}).to_pandas()
        assert list(table["cpus"]) == list(range(1, 25))
        assert table["time"].iloc[-1] == start + datetime.timedelta(hours=23)


if __name__ == "__main__":
    main()
