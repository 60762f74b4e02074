"""Following a file that grows."""
from __future__ import annotations

import collections
import os
import time
from types import TracebackType
from typing import Any, Callable, Deque, Iterator, Optional, Type, Union

from . import _tav
from ._results import Arrival, Damage

Path = Union[str, "os.PathLike[str]"]

_AT_ONCE = 256  # nodes of a look: others wait in the file, not in memory
_LONGEST_WAIT = 100  # milliseconds until a close, or an interrupt, is seen


class Follow(Iterator[Any]):
    """What comes into a file, as long as it grows: see follow."""

    def __init__(self, path: Path, *, existing: bool = True, roots: bool = False, timeout: Optional[float] = None,
                 on_change: Optional[Callable[[str], object]] = None, byte_order: Optional[str] = None,
                 root: Optional[int] = None, align: Optional[bool] = None,
                 dictionary: Union[_tav.Dictionary, Path, None] = None) -> None:
        if timeout is not None and timeout < 0:
            raise ValueError("timeout is a number of seconds, not below 0")
        if on_change is not None and not callable(on_change):
            raise TypeError("on_change is called with a word: a callable is expected")
        self.name = os.fspath(path)
        """the path that is followed"""
        self.damage: list[Damage] = []
        """what was passed over so far, in the order in which it was come to"""
        form = (byte_order, root, align, dictionary)
        self._following: Optional[_tav._Following] = _tav._Following(path, form, existing, roots)
        self._dictionary = dictionary
        self._timeout = timeout
        self._on_change = on_change
        self._news: Deque[tuple[str, Any]] = collections.deque()
        self._error: Optional[BaseException] = None
        self._last = time.monotonic()
        self._has_all = False  # at the last look

    def __iter__(self) -> Follow:
        return self

    def __next__(self) -> Any:
        while True:
            while self._news:
                found = self._take(*self._news.popleft())
                if found is not None:
                    return found
            if self._error is not None:
                error, self._error = self._error, None
                self.close()
                raise error
            following = self._following
            if following is None or not self._go_on(following):
                self.close()
                raise StopIteration

    def _ready(self) -> list[Any]:
        """All that is there now, without a wait."""
        found: list[Any] = []
        while True:
            while self._news:
                one = self._take(*self._news.popleft())
                if one is not None:
                    found.append(one)
            if self._error is not None or self._following is None:
                return found
            if self._look(self._following) < _AT_ONCE and not self._news:
                return found

    def _look(self, following: _tav._Following) -> int:
        count, news, self._error = following.look(_AT_ONCE)
        self._has_all = count < _AT_ONCE
        self._news.extend(news)
        if count:
            self._last = time.monotonic()
        return count

    def _go_on(self, following: _tav._Following) -> bool:
        """Looks, and waits before that where the last look found all. False when nothing has come for too long."""
        if self._has_all:
            if self._timeout is not None:
                left = self._last + self._timeout - time.monotonic()
                if left <= 0:
                    return False
                following.wait(max(1, min(_LONGEST_WAIT, int(left * 1000))))
            else:
                following.wait(_LONGEST_WAIT)
        if self._following is None:
            return False
        self._look(following)
        return True

    def _take(self, kind: str, what: Any) -> Any:
        if kind == "node":
            return Arrival(*what)
        if kind == "root":
            data, (order, bits, align) = what
            reader = _tav.Reader(data, byte_order=order, root=bits, align=align, on_damage="skip",
                                 dictionary=self._dictionary)
            return next(iter(reader))
        if kind == "damage":
            self.damage.append(Damage(*what))
        elif self._on_change is not None:
            self._on_change(what)
        return None

    @property
    def closed(self) -> bool:
        """Whether nothing comes any more: bool"""
        return self._following is None

    def close(self) -> None:
        """Lets go of the file. Another thread that waits for the next node ends its loop within a tenth of a second."""
        self._following = None
        self._news.clear()

    def __enter__(self) -> Follow:
        return self

    def __exit__(self, type: Optional[Type[BaseException]], value: Optional[BaseException],
                 traceback: Optional[TracebackType]) -> None:
        self.close()

    def __repr__(self) -> str:
        return f"<tav.Follow {self.name!r}{', closed' if self.closed else ''}>"


def follow(path: Path, *, existing: bool = True, roots: bool = False, timeout: Optional[float] = None,
           on_change: Optional[Callable[[str], object]] = None, byte_order: Optional[str] = None,
           root: Optional[int] = None, align: Optional[bool] = None,
           dictionary: Union[_tav.Dictionary, Path, None] = None) -> Follow:
    """An iterator over what comes into a file, as `tail -F` shows it: first what is there, then what is written.

    With roots=False each node as an Arrival, in stream order: a group when it was opened, a data element when it is
    whole. With roots=True each root when it has ended, as a Node with all below it, which is kept in memory of its own
    and stays as it is; offsets in it count from the root's first byte. Elements that only end a group are left out.

    existing: begin with what is in the file already; timeout: seconds without a node after which the loop ends
    on_change: called in between with what became of the file: 'missing', 'appeared', 'replaced' by another one, which
    is read from its start, or 'shortened', which is read anew; what a writer took back may have been told
    byte_order, root, align, dictionary: as of open

    The path is followed, not the file: one that is not there is waited for. Damaged places are passed over, and are in
    `damage`. Ctrl-C and close() end a wait within a tenth of a second. A node of more bytes than memory has raises
    MemoryError; what cannot be read TavError, behind all that came before.

        with tav.follow("day.tav") as nodes:
            for node in nodes:
                print(node.path, node.value)
    """
    return Follow(path, existing=existing, roots=roots, timeout=timeout, on_change=on_change, byte_order=byte_order,
                  root=root, align=align, dictionary=dictionary)
