"""What nodes and readers look like at a prompt and in a notebook."""
from __future__ import annotations

import html
import itertools
from typing import Iterable

from ._tav import Node, Reader, TavError

_SHOWN = 200  # children of a group in a tree
_LEVELS = 6
_CHARACTERS = 60


def _name(node: Node) -> str:
    return node.tag or f"#{node.id}"


def _value(node: Node) -> str:
    if node.is_group:
        return "group"
    text = repr(node.value) if node.size is not None and node.size <= 4096 else f"{node.size} bytes"
    return text if len(text) <= _CHARACTERS else text[: _CHARACTERS - 3] + "..."


def node_repr(node: Node) -> str:
    """<tav.Node hostName at 0x28: 'ada'>"""
    value = "closed" if node.reader.closed else _value(node)
    return f"<tav.Node {_name(node)} at {node.offset:#x}: {value}>"


def reader_repr(reader: Reader) -> str:
    """<tav.Reader 'day.tav', little-endian, 64-bit root, 1.2 MB>"""
    if reader.closed:
        return "<tav.Reader, closed>"
    form = reader.form
    padded = ", padded to 8" if form.align else ""
    return (f"<tav.Reader {reader.name!r}, {form.byte_order}-endian, {form.root}-bit root{padded}, "
            f"{len(reader.memory)} bytes>")


def _items(nodes: Iterable[Node], levels: int) -> str:
    parts: list[str] = []
    try:
        walk = iter(nodes)
        parts += [f"<li>{_tree(node, levels)}</li>" for node in itertools.islice(walk, _SHOWN)]
        if next(walk, None) is not None:
            parts.append("<li>...</li>")
    except TavError as error:
        parts.append(f"<li><em>{html.escape(str(error))}</em></li>")
    return f"<ul>{''.join(parts)}</ul>"


def _tree(node: Node, levels: int) -> str:
    name = html.escape(_name(node))
    if not node.is_group:
        return f"{name} <code>{html.escape(_value(node))}</code> <small>{html.escape(str(node.type))}</small>"
    if levels == 0:
        return f"{name} ..."
    return f"<details><summary>{name}</summary>{_items(node, levels - 1)}</details>"


def node_html(node: Node) -> str:
    """A tree that unfolds."""
    return node_repr(node) if node.reader.closed else _tree(node, _LEVELS)


def reader_html(reader: Reader) -> str:
    """All roots, the way down to their children shown."""
    title = html.escape(reader_repr(reader))
    return title if reader.closed else f"<div>{title}{_items(reader, _LEVELS)}</div>"
