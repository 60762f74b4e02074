"""Tables of nodes as arrays of NumPy and frames of pandas."""
from __future__ import annotations

import glob
import os
from typing import TYPE_CHECKING, Any, Callable, Iterable, Iterator, Mapping, Optional, Union

from . import _tav
from ._parts import Part

if TYPE_CHECKING:
    import pandas  # type: ignore[import]

_ALL = 2**64 - 1
_Progress = Optional[Callable[[int, int], object]]
_PLAIN = {"uint64": "uint64", "int64": "int64", "time": "datetime64[ns]"}


def table(reader: _tav.Reader, each: str, columns: Mapping[str, str], *, join: Optional[str] = None,
          part: Optional[Part] = None, progress: _Progress = None) -> _tav.Table:
    """See Reader.table."""
    if part is not None:
        return _tav.read_part(reader, part.numbers, each, list(columns.items()), join, progress)[0]
    return _tav.read_table([reader], each, list(columns.items()), join, progress, _ALL, reader.dictionary)


def _kind_as(name: str, kind: str, wanted: str, values: Any, valid: Any) -> str:
    """The type that a column is given out in; ValueError where its values do not fit it."""
    if kind == wanted or wanted == "text":
        return wanted
    if not valid.any():
        return wanted
    numbers = ("uint64", "int64", "uint128", "int128")
    if {kind, wanted} == {"uint64", "int64"} and not ((values.view("int64") < 0) & valid).any():
        return wanted
    if kind in numbers[:2] and (wanted == "int128" or (wanted == "uint128" and kind == "uint64")):
        return wanted
    raise ValueError(f"the column {name!r} has values of the type {kind}, not {wanted}: types={{{name!r}: ...}} names "
                     f"one that suits all rows, such as 'text'")


def _arrays(of: _tav.Table, types: Optional[Mapping[str, str]] = None) -> Iterator[tuple[str, str, Any, Any]]:
    """Name, type, values and whether each is there; of objects None says that it is not."""
    import numpy as np

    for i, (name, kind) in enumerate(of.columns.items()):
        wanted = (types or {}).get(name, kind)
        values: Any = None
        valid: Any = None
        if kind in _PLAIN:
            values, valid = of._plain(i)
            values, valid = np.frombuffer(values, _PLAIN[kind]), np.frombuffer(valid, bool)
        elif kind != wanted and wanted != "text":
            values = np.empty(len(of), object)
            of._fill(i, values, kind)
            valid = np.fromiter((value is not None for value in values), bool, len(of))
        wanted = _kind_as(name, kind, wanted, values, valid)
        if wanted not in _PLAIN:
            values = np.empty(len(of), object)
            of._fill(i, values, wanted)
            valid = None
        elif kind not in _PLAIN:  # which has no values
            values = np.full(len(of), "NaT", _PLAIN[wanted]) if wanted == "time" else np.zeros(len(of), _PLAIN[wanted])
        elif kind != wanted:
            values = np.full(len(of), "NaT", _PLAIN[wanted]) if wanted == "time" else values.view("uint64").view(
                _PLAIN[wanted])
        yield name, wanted, values, valid


def to_numpy(of: _tav.Table) -> dict[str, Any]:
    """See Table.to_numpy."""
    import numpy as np

    result = {}
    for name, kind, values, valid in _arrays(of):
        has_gaps = kind in ("uint64", "int64") and not valid.all()
        masked: Any = np.ma.masked_array
        result[name] = masked(values, ~valid) if has_gaps else values
    return result


def to_pandas(of: _tav.Table, types: Optional[Mapping[str, str]] = None) -> pandas.DataFrame:
    """See Table.to_pandas. types: of columns, where they are not to follow from the values."""
    import pandas as pd

    series: dict[str, Any] = {}
    for name, kind, values, valid in _arrays(of, types):
        if kind in ("uint64", "int64"):
            series[name] = pd.arrays.IntegerArray(values, ~valid)
        elif kind == "time":
            series[name] = pd.DatetimeIndex(values, tz="UTC")
        else:
            series[name] = values
    return pd.DataFrame(series, index=pd.RangeIndex(len(of)))


def paths_of(paths: Union[str, os.PathLike[str], Iterable[Any]]) -> list[Any]:
    """Files of a path, of a pattern or of several of them, each pattern's in the order of their names."""
    given = [paths] if isinstance(paths, (str, bytes, bytearray, memoryview, os.PathLike)) else list(paths)
    found: list[Any] = []
    for each in given:
        pattern = os.fsdecode(each) if isinstance(each, (str, os.PathLike)) else ""
        if not glob.has_magic(pattern) or os.path.exists(pattern):
            found.append(each)
            continue
        matches = sorted(glob.glob(pattern, recursive=True))
        if not matches:
            raise FileNotFoundError(f"no file is called {pattern}")
        found += matches
    return found


def names_of(dictionary: Union[_tav.Dictionary, str, os.PathLike[str], None]) -> Optional[_tav.Dictionary]:
    """A dictionary that is read once."""
    return dictionary if dictionary is None or isinstance(dictionary, _tav.Dictionary) else _tav.Dictionary(dictionary)


def read_table(paths: Union[str, os.PathLike[str], Iterable[Any]], each: str, columns: Mapping[str, str], *,
               join: Optional[str] = None, on_damage: str = "stop", byte_order: Optional[str] = None,
               root: Optional[int] = None, align: Optional[bool] = None,
               dictionary: Union[_tav.Dictionary, str, os.PathLike[str], None] = None,
               progress: _Progress = None) -> pandas.DataFrame:
    """A row for each node that the path `each` leads to, of any number of files one after the other.

    paths: a path, a pattern as of glob, or several of them; columns: {name: path from the row's node}
    join: the text between the values where a path leads to several; without it the first is taken
    """
    names = names_of(dictionary)

    def readers() -> Iterator[_tav.Reader]:
        for path in paths_of(paths):
            with _tav.Reader(path, byte_order=byte_order, root=root, align=align, on_damage=on_damage,
                             dictionary=names) as reader:
                yield reader

    return to_pandas(_tav.read_table(readers(), each, list(columns.items()), join, progress, _ALL, names))
