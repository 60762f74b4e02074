"""Tables of many files, and of parts of large ones, as frames of dask: one partition each.

Schedulers and workers are dask's; the workers open the files by the names that are given here.
"""
from __future__ import annotations

import os
from typing import TYPE_CHECKING, Any, Iterable, Mapping, Optional, Union

from . import _tav
from ._parts import bytes_of, check_word
from ._table import names_of, paths_of, to_pandas

if TYPE_CHECKING:
    import pandas  # type: ignore[import]

_SAMPLE = 10_000  # rows by which the types of columns are judged
_ALL = 2**64 - 1
_End = tuple[tuple[int, ...], bool, int]
_Tail = Union[tuple[tuple[int, ...], _End], Exception]  # a part as it was read, and where it ended; or why not


class _Query:
    """What is read of each file."""

    def __init__(self, each: str, columns: Mapping[str, str], join: Optional[str], on_damage: str,
                 form: tuple[Optional[str], Optional[int], Optional[bool]],
                 dictionary: Optional[_tav.Dictionary] = None) -> None:
        self.each = each
        self.columns = list(columns.items())
        self.join = join
        self.on_damage = on_damage
        self.form = form
        self.dictionary = dictionary
        self.types: dict[str, str] = {}

    def open(self, path: str) -> _tav.Reader:
        order, root, align = self.form
        return _tav.Reader(path, byte_order=order, root=root, align=align, on_damage=self.on_damage,
                           dictionary=self.dictionary)

    def plan(self, path: str, blocksize: int) -> list[tuple[int, ...]]:
        if os.path.getsize(path) <= blocksize:
            return []
        return _tav.plan(path, (*self.form, self.dictionary), blocksize, self.each, self.columns, self.join)

    def frame(self, table: _tav.Table, path: str) -> pandas.DataFrame:
        try:
            return to_pandas(table, self.types)
        except ValueError as error:
            raise ValueError(f"{path}: {error}") from None

    def __dask_tokenize__(self) -> tuple[Any, ...]:
        names = self.dictionary.elements if self.dictionary is not None else None
        return (self.each, self.columns, self.join, self.on_damage, self.form, names, self.types)


def _read_file(query: _Query, path: str) -> pandas.DataFrame:
    with query.open(path) as reader:
        found = _tav.read_table([reader], query.each, query.columns, query.join, None, _ALL, query.dictionary)
        return query.frame(found, path)


def _read_part(query: _Query, path: str, part: tuple[int, ...]) -> tuple[Any, Optional[_End]]:
    """The part's frame and its end; or a failure, which counts only if the walk over the file comes by the part."""
    try:
        with query.open(path) as reader:
            table, end = _tav.read_part(reader, part, query.each, query.columns, query.join, None)
            return query.frame(table, path), end
    except (_tav.TavError, ValueError) as error:
        return error, None


def _join(query: _Query, path: str, part: tuple[int, ...], found: tuple[Any, Optional[_End]],
          tail: Optional[_Tail]) -> tuple[Any, _Tail]:
    """What a part is, now that is known where the one before it ended: read again where it does not begin there."""
    if isinstance(tail, Exception):
        return tail, tail  # nobody knows where this part begins
    if tail is not None:
        behind = _tav.behind_of(*tail)
        holds = _tav.holds_behind(behind, part, found[1])
        end = max(part[0] + part[1], behind[0])
        part = (behind[0], end - behind[0], *behind[2:])
        if not holds:
            found = _read_part(query, path, part)
    frame, reached = found
    return frame, frame if reached is None else (part, reached)


def _partition(joined: tuple[Any, _Tail]) -> pandas.DataFrame:
    frame = joined[0]
    if isinstance(frame, Exception):
        raise frame
    return frame


def _tail(joined: tuple[Any, _Tail]) -> _Tail:
    return joined[1]


def _graph_of(query: _Query, name: str, files: list[tuple[str, list[tuple[int, ...]]]]) -> dict[Any, Any]:
    """A file of several parts takes three steps each: reading them, which nothing waits for; joining each to the part
    before it, which is little work unless it has to be read again; and giving out the frame."""
    graph: dict[Any, Any] = {}
    count = 0
    for path, parts in files:
        if len(parts) < 2:
            graph[name, count] = (_read_file, query, path)
            count += 1
        for i, part in enumerate(parts if len(parts) > 1 else []):
            before = (f"tail-{name}", count - 1) if i else None
            graph[f"read-{name}", count] = (_read_part, query, path, part)
            graph[f"join-{name}", count] = (_join, query, path, part, (f"read-{name}", count), before)
            graph[f"tail-{name}", count] = (_tail, (f"join-{name}", count))
            graph[name, count] = (_partition, (f"join-{name}", count))
            count += 1
    return graph


def read_table(paths: Union[str, "os.PathLike[str]", Iterable[Union[str, "os.PathLike[str]"]]], each: str,
               columns: Mapping[str, str], *, blocksize: Union[int, str, None] = "64MB", join: Optional[str] = None,
               on_damage: str = "stop", types: Optional[Mapping[str, str]] = None, byte_order: Optional[str] = None,
               root: Optional[int] = None, align: Optional[bool] = None,
               dictionary: Union[_tav.Dictionary, str, "os.PathLike[str]", None] = None) -> Any:
    """As tav.read_table, but a dask.dataframe.DataFrame: a partition for each file, and for each part of a large one.

    paths, and that of a dictionary: names that mean the same files here and where the workers run
    blocksize: about how long parts are, in bytes or as '64MB'; None: files are not cut
    types: {column: type} as Table.columns names them, for columns whose type the first 10,000 rows, which are read
    here, do not tell; a value that does not fit is a ValueError that says so

    Rows by names alone are cut anywhere between rows; rows or columns with predicates or '..' only between roots. The
    index begins anew in each partition.
    """
    import dask.base
    import dask.dataframe
    import dask.highlevelgraph

    base: Any = dask.base
    core: Any = dask.dataframe.core
    graphs: Any = dask.highlevelgraph.HighLevelGraph
    check_word(on_damage)
    files = [os.path.abspath(os.fsdecode(path)) for path in paths_of(paths)]
    query = _Query(each, columns, join, on_damage, (byte_order, root, align), names_of(dictionary))
    given = dict(types or {})
    unknown = set(given) - set(columns)
    if unknown:
        raise ValueError(f"types names no column: {', '.join(sorted(unknown))}")
    sample = _tav.read_table(map(query.open, files), each, query.columns, join, None, _SAMPLE, query.dictionary)
    query.types = {**sample.columns, **given}
    size = 0 if blocksize is None else bytes_of(blocksize)
    planned = [(path, query.plan(path, size) if size else []) for path in files]
    seen = [(path, os.path.getsize(path), os.stat(path).st_mtime_ns) for path in files]
    name = f"tav-{base.tokenize(query, planned, seen)}"
    graph = _graph_of(query, name, planned)
    partitions = sum(max(len(parts), 1) for _, parts in planned)
    meta = to_pandas(_tav.read_table([], each, query.columns, join, None, 0, query.dictionary), query.types)
    return core.new_dd_object(graphs.from_collections(name, graph), name, meta, [None] * (partitions + 1))
