"""Nodes as arrays of NumPy."""
from __future__ import annotations

from typing import TYPE_CHECKING, Any, Callable, Optional

if TYPE_CHECKING:
    from ._tav import Reader

# The kinds of values, as tav::inspect::ValueKind numbers them.
_NUMBER, _WIDE, _TEXT, _TIME, _BYTES = 1, 2, 3, 4, 5


def columns(reader: Reader, *, path: bool = False,
            progress: Optional[Callable[[int, int], object]] = None) -> dict[str, Any]:
    """See Reader.columns."""
    import numpy as np

    rows = reader._columns(path=path, progress=progress)
    count = rows.count

    def plain(name: str, dtype: str) -> Any:
        return np.frombuffer(rows.column(name), dtype)

    def objects(name: str) -> Any:
        array = np.empty(count, object)
        rows.fill(name, array)
        return array

    kind = plain("kind", "uint8")
    parent = plain("parent", "int64")
    number_type = rows.number_type
    is_number = kind == _NUMBER
    result = {
        "ord": np.arange(count),
        "parent": parent,
        "parent_valid": parent >= 0,
        "depth": plain("depth", "uint32"),
        "offset": plain("offset", "uint64"),
        "size": plain("size", "uint64"),
        "id": plain("id", "uint16"),
        "tag": objects("tag"),
        "type": objects("type"),
        "key": plain("key", "uint16"),
        "number": objects("number") if number_type == "object" else plain("number", number_type),
        "number_valid": is_number | (kind == _WIDE) if number_type == "object" else is_number,
        "text": objects("text"),
        "text_valid": kind == _TEXT,
        "time": plain("time", "datetime64[ns]"),
        "time_valid": kind == _TIME,
        "bytes": objects("bytes"),
        "bytes_valid": kind == _BYTES,
    }
    if path:
        result["path"] = objects("path")
    return result
