"""Hierarchical, self-describing binary streams: read, searched, checked, written.

    with tav.open("day.tav") as r:
        for host in r.findall("//host"):
            print(host.find("hostName").value)

See docs/python.md. Offsets and sizes are bytes; `dictionary=` names own elements: a Dictionary, or a path. Failures are
TavError, but for arguments of a wrong type (TypeError) or word (ValueError).
"""
from __future__ import annotations

import datetime
import importlib
import os
import tempfile
from typing import Any, Callable, Iterable, Mapping, Optional, Union

from . import _tav
from ._follow import Follow, follow
from ._results import (Arrival, Change, Damage, Difference, Doubt, Extracted, Finding, Form, Loss, OwnElement, Report,
                       SchemaEntry, Side)
from ._parts import Part, check_word, plan
from ._table import read_table
from ._tav import Dictionary, Group, Node, Reader, Table, TavError, Writer, __version__

__all__ = [
    "Arrival", "Change", "Damage", "Dictionary", "Difference", "Doubt", "Extracted", "Finding", "Follow", "Form",
    "Group", "Loss", "Node", "OwnElement", "Part", "Reader", "Report", "SchemaEntry", "Side", "Table", "TavError",
    "Writer", "__version__", "check", "diff", "extract", "follow", "from_json", "open", "plan", "read_table",
    "recognise", "recover", "schema", "set", "to_json",
]

Path = Union[str, "os.PathLike[str]"]
Source = Union[Path, bytes, bytearray, memoryview, Any]
Progress = Optional[Callable[[int, int], object]]
Names = Union[Dictionary, Path, None]  # of own elements


def open(source: Source, *, byte_order: Optional[str] = None, root: Optional[int] = None,
         align: Optional[bool] = None, on_damage: str = "stop", dictionary: Names = None) -> Reader:
    """Opens a file or bytes for reading: see Reader."""
    return Reader(source, byte_order=byte_order, root=root, align=align, on_damage=on_damage, dictionary=dictionary)


def __getattr__(name: str) -> Any:
    """tav.dask, which needs dask, is imported when it is asked for."""
    if name == "dask":
        return importlib.import_module("tav.dask")
    raise AttributeError(f"module 'tav' has no attribute {name!r}")


def _skips(on_damage: str) -> bool:
    check_word(on_damage)
    return on_damage == "skip"


def recognise(source: Source, *, byte_order: Optional[str] = None, root: Optional[int] = None,
              align: Optional[bool] = None) -> Form:
    """How a stream is to be read: the likeliest form, others that explain the bytes as well, and the reasons.

    TavError TAV_RC_NOT_FOUND where it is no stream.
    """
    form, others, because = _tav.recognise(source, (byte_order, root, align, None))
    return Form(*form, [Form(*other) for other in others], because)


def check(source: Source, *, rules: Optional[Iterable[str]] = None, notes: bool = False,
          byte_order: Optional[str] = None, root: Optional[int] = None, align: Optional[bool] = None,
          dictionary: Names = None, progress: Progress = None) -> list[Finding]:
    """Every defect, in the order in which it is certain. An empty list: the stream is sound.

    rules: ids of docs/check-rules.md to look for, all by default; notes: also what is remarkable but no defect.
    """
    wanted = None if rules is None else list(rules)
    form = (byte_order, root, align, dictionary)
    return [Finding(*each) for each in _tav.check(source, form, wanted, notes, progress)]


def diff(a: Source, b: Source, *, path_a: Optional[str] = None, path_b: Optional[str] = None,
         ignore: Iterable[str] = (), tolerance: Union[float, str] = 0, contents: bool = False,
         on_damage: str = "stop", byte_order: Optional[str] = None, root: Optional[int] = None,
         align: Optional[bool] = None, dictionary: Names = None, progress: Progress = None) -> list[Difference]:
    """What two streams do not have in common, whatever their forms.

    path_a, path_b: compare only the first node that each leads to; ignore: paths of what is left out
    tolerance: how far numbers may be apart: 10, or '0.5%' of the larger one
    contents: tell each node of a group that only one side has
    """
    text = str(tolerance)
    percent = text.endswith("%")
    amount = float(text.rstrip("%"))
    found = _tav.diff(a, b, (byte_order, root, align, dictionary), path_a, path_b, list(ignore), amount, percent,
                      contents, _skips(on_damage), progress)
    return [Difference(Change(change), before and Side(*before), after and Side(*after), message)
            for change, before, after, message in found]


def _bound(text: Optional[str]) -> Union[int, datetime.datetime, str, None]:
    """A least or greatest value, which is a number or a moment."""
    if text is None:
        return None
    try:
        return int(text)
    except ValueError:
        pass
    try:
        return datetime.datetime.fromisoformat(text).astimezone(datetime.timezone.utc)
    except ValueError:
        return text


def schema(*sources: Source, on_damage: str = "stop", byte_order: Optional[str] = None, root: Optional[int] = None,
           align: Optional[bool] = None, dictionary: Names = None, progress: Progress = None) -> list[SchemaEntry]:
    """All paths of some streams: how often, with which types, least and greatest values, how many different texts."""
    found = _tav.schema(sources, (byte_order, root, align, dictionary), _skips(on_damage), progress)
    return [SchemaEntry(path, count, types, _bound(least), _bound(greatest), distinct, more)
            for path, count, types, least, greatest, distinct, more in found]


def to_json(source: Source, *, lines: bool = False, safe: bool = False, byte_order: Optional[str] = None,
            root: Optional[int] = None, align: Optional[bool] = None, dictionary: Names = None,
            progress: Progress = None) -> str:
    """The stream as JSON that loses nothing, damage included: see docs/json.md.

    lines: an object a node, each in a line of its own; safe: numbers that a double cannot hold are texts.
    """
    return _tav.to_json(source, (byte_order, root, align, dictionary), lines, safe, progress)


def _into(dst: Optional[Path], overwrite: bool, make: Callable[[Optional[str]], Any]) -> Any:
    """Calls `make` with an empty file beside `dst`, which then takes its place; without `dst` with None."""
    if dst is None:
        return make(None)
    target = os.fspath(dst)
    if not overwrite and os.path.lexists(target):
        raise FileExistsError(f"{target} is there: overwrite=True replaces it")
    number, beside = tempfile.mkstemp(dir=os.path.dirname(target) or ".", prefix=os.path.basename(target) + ".")
    os.close(number)
    try:
        result = make(beside)
        mask = os.umask(0)
        os.umask(mask)
        os.chmod(beside, os.stat(target).st_mode & 0o7777 if os.path.exists(target) else 0o666 & ~mask)
        if overwrite:
            os.replace(beside, target)
        else:
            os.link(beside, target)  # which refuses a file that came meanwhile
    finally:
        if os.path.lexists(beside):
            os.unlink(beside)
    return result


def from_json(document: str, dst: Optional[Path] = None, *, overwrite: bool = False,
              byte_order: Optional[str] = None, root: Optional[int] = None,
              align: Optional[bool] = None, dictionary: Names = None) -> Optional[bytes]:
    """The stream that a JSON document describes: bytes, or None where it went to the file `dst`.

    A form that is given makes sizes, pairs and paddings anew.
    """
    data: Optional[bytes] = _into(
        dst, overwrite, lambda beside: _tav.from_json(document, (byte_order, root, align, dictionary), beside))
    return data


def recover(src: Source, dst: Optional[Path] = None, *, overwrite: bool = False, search: Optional[int] = None,
            byte_order: Optional[str] = None, root: Optional[int] = None, align: Optional[bool] = None,
            dictionary: Names = None, progress: Progress = None) -> Report:
    """Makes a sound stream of what is whole in a damaged or unfinished one, and accounts for every byte.

    dst: where it goes; None: into the report's `data`. search: bytes to search for nodes; the rest is unread.
    """
    fields, data = _into(
        dst, overwrite,
        lambda beside: _tav.recover(src, (byte_order, root, align, dictionary), beside, search, progress))
    return Report._make([Form(*fields[0]), *fields[1:-2], [Loss(*each) for each in fields[-2]],
                         [Doubt(*each) for each in fields[-1]], data])


def set(source: Source, values: Mapping[str, Any], dst: Optional[Path] = None, *, type: Union[str, int, None] = None,
        overwrite: bool = False, on_damage: str = "stop", byte_order: Optional[str] = None, root: Optional[int] = None,
        align: Optional[bool] = None, dictionary: Names = None, progress: Progress = None) -> Union[int, bytes]:
    """Gives every node that a path leads to another value: all of {path: value}, or nothing.

    A file is changed where it is, when all payloads keep their sizes; with `dst` a new file is written. The nodes that
    changed are counted. Of bytes without `dst` the new stream is returned instead.
    """
    pairs = list(values.items())
    is_file = isinstance(source, str) or hasattr(source, "__fspath__")
    in_place = is_file and dst is None
    result: tuple[int, int, Optional[bytes]] = _into(
        dst, overwrite, lambda beside: _tav.set(source, (byte_order, root, align, dictionary), pairs, type, beside,
                                                in_place, _skips(on_damage), progress))
    changed, _, data = result
    return changed if data is None else data


def extract(source: Source, path: str, dst: Optional[Path] = None, *, overwrite: bool = False,
            on_damage: str = "stop", byte_order: Optional[str] = None, root: Optional[int] = None,
            align: Optional[bool] = None, dictionary: Names = None, progress: Progress = None) -> Extracted:
    """The groups that a path leads to, as the roots of a stream of their own: in `dst`, or in the result's `data`."""
    return Extracted(*_into(
        dst, overwrite, lambda beside: _tav.extract(source, (byte_order, root, align, dictionary), path, beside,
                                                    _skips(on_damage), progress)))
