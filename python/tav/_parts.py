"""Parts of files, which are read apart."""
from __future__ import annotations

import re
from typing import Any, Mapping, NamedTuple, Optional, Union

from . import _tav

_UNITS = {"": 1, "b": 1, "kb": 10**3, "mb": 10**6, "gb": 10**9, "kib": 2**10, "mib": 2**20, "gib": 2**30}


class Part(NamedTuple):
    """A part of a file, which knows the groups around it: for Reader.table, also in another process."""

    start: int
    """offset of its first byte"""
    end: int
    """offset behind its last byte; a row that begins before it is read to its end"""
    numbers: tuple[int, ...]
    """all that a walk has to know to begin there"""


def bytes_of(size: Union[int, str]) -> int:
    """A number of bytes, also written as '64MB' or '1 GiB'."""
    found = re.fullmatch(r"\s*(\d+)\s*([A-Za-z]*)\s*", str(size))
    if found is None or found[2].lower() not in _UNITS or int(found[1]) == 0:
        raise ValueError(f"a size is a number of bytes, or as '64MB': {size!r}")
    return int(found[1]) * _UNITS[found[2].lower()]


def check_word(on_damage: str) -> None:
    """What on_damage= may say."""
    if on_damage not in ("stop", "skip"):
        raise ValueError("on_damage is 'stop' or 'skip'")


def plan(source: Any, blocksize: Union[int, str] = "64MB", *, each: Optional[str] = None,
         columns: Optional[Mapping[str, str]] = None, join: Optional[str] = None, byte_order: Optional[str] = None,
         root: Optional[int] = None, align: Optional[bool] = None, dictionary: Any = None) -> list[Part]:
    """Cuts a file into parts of about `blocksize` bytes without reading it.

    each, columns, join: parts that a table of these can be read by, with Reader.table(part=). Without them a part can
    begin inside of a row.

    In long runs of small nodes a part begins where bytes look like a node of the same group, which can be a mistake,
    also one that somebody made. tav.dask finds it out and reads such a part again from the right place.
    """
    found = _tav.plan(source, (byte_order, root, align, dictionary), bytes_of(blocksize), each,
                      list((columns or {}).items()), join)
    return [Part(numbers[0], numbers[0] + numbers[1], numbers) for numbers in found]
