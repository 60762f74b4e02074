"""What functions of the package give."""
from __future__ import annotations

import dataclasses
import datetime
import enum
from typing import Any, NamedTuple, Optional, Union


class Form(NamedTuple):
    """How a stream is read: what nothing in it says."""

    byte_order: str
    """'little' or 'big'"""
    root: int
    """32 or 64, bits of the first node's header"""
    align: bool
    """whether payloads are padded to multiples of 8 bytes"""
    alternatives: list[Form] = []
    """of recognise: other forms that explain the bytes as well"""
    because: list[str] = []
    """of recognise: why"""


class Damage(NamedTuple):
    """Bytes that a walk has passed over."""

    offset: int
    size: int
    """of the bytes that are there; 0: a group begins at `offset` that announces more than there is"""
    rule: str
    """an id of docs/check-rules.md"""


class Arrival(NamedTuple):
    """A node that has come into a file, as it was then."""

    path: str
    id: int
    tag: Optional[str]
    type: Union[str, int]
    value: Any
    """as Node.value; None for a group"""
    offset: int
    size: Optional[int]
    """of the payload; None for a group that is open"""
    depth: int
    """0: a root"""
    is_group: bool


class Finding(NamedTuple):
    """One defect."""

    rule: str
    offset: int
    path: str
    message: str
    code: int
    size: int
    """of the bytes concerned; 0: no run of bytes is meant"""
    is_note: bool
    """remarkable, but no defect"""


class OwnElement(NamedTuple):
    """An element of a dictionary."""

    id: int
    tag: str
    kind: Optional[str]
    """'gauge', 'counter' or 'text'"""
    unit: Optional[str]
    text: Optional[str]
    """what it means"""


class Change(enum.Enum):
    """What became of a node from the first stream to the second."""

    REMOVED = "removed"
    ADDED = "added"
    CHANGED = "changed"


class Side(NamedTuple):
    """A node, or damaged bytes, on one side of a difference."""

    path: str
    offset: int
    type: str
    """'Uint32', 'group', 'damaged'"""
    value: Optional[str]
    """as text; None for a group"""


class Difference(NamedTuple):
    """What two streams do not have in common."""

    change: Change
    before: Optional[Side]
    after: Optional[Side]
    message: str


@dataclasses.dataclass(frozen=True)
class SchemaEntry:
    """All nodes of one path."""

    path: str
    count: int
    types: list[Union[str, int]]
    least: Union[int, datetime.datetime, str, None]
    """of numbers and moments; a moment that datetime cannot hold is its text"""
    greatest: Union[int, datetime.datetime, str, None]
    distinct: Optional[int]
    """different texts, or bytes"""
    more: bool
    """there are more than `distinct`, where counting ended"""


class Loss(NamedTuple):
    """Bytes that did not come back."""

    offset: int
    size: int
    reason: str


class Doubt(NamedTuple):
    """A node that came back from beside lost bytes, of which something says that it may be none."""

    offset: int
    size: int
    reason: str


class Report(NamedTuple):
    """Where every byte went: kept + lost + unread is size."""

    form: Form
    size: int
    kept: int
    lost: int
    unread: int
    zeros: int
    """of the kept: behind the stream"""
    written: int
    nodes: int
    """that came back, end elements not counted"""
    ends: int
    closed: int
    """groups that were open, or whose size was wrong"""
    made: int
    """groups made for what has lost its own"""
    losses: int
    doubts: int
    lost_places: list[Loss]
    """the first thousand"""
    doubtful_nodes: list[Doubt]
    """likewise"""
    data: Optional[bytes]
    """the stream, where no file was named"""


class Extracted(NamedTuple):
    """What was extracted."""

    roots: int
    nodes: int
    data: Optional[bytes]
    """the stream, where no file was named"""
