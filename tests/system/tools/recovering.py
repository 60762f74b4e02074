"""Runs recover and reads what it saved."""
import json
import unittest

from layout import END, EYE, EYE_SIZE, GROUP32, GROUP64, UTF8, header_length
from oracle import ELEMENTS, KINDS
from planted import HOST, NAMED, SIZES
from support import tav


def identity(node):
    return (node.elm, node.kind, None if node.is_group else bytes(node.payload))


class Unsound(AssertionError):
    """The saved stream cannot be read by its sizes."""


def read_back(made, form):
    """The nodes of a sound stream, by their sizes alone."""
    def begins(at, end, wide, info):
        """Whether a pair, a node or the end is here, not two bytes farther on."""
        if info & EYE_SIZE:
            return EYE in (form.number_at(made, at, 8), form.number_at(made, at, 8, HOST))
        if at == end or at + 2 == end:
            return at == end
        return likeness(at, wide) >= likeness(at + 2, wide)

    def likeness(at, wide):
        size, _, kind, elm = form.header_at(made, at, wide)
        if kind not in KINDS or size != SIZES.get(kind, size) or size > len(made) - at:
            return 0
        return 2 if elm in (*NAMED, END) else 1 if elm in ELEMENTS else 0

    def nodes(at, end, wide):
        """The nodes between two places. Where a string leaves open whether two bytes stand behind it and the likelier way
        leads past the end, the other way is gone."""
        found, others = [], []
        while at < end:
            try:
                at, node, other = node_at(at, end, wide)
                if other is not None:
                    others.append((other, len(found) + len(node)))
                found += node
            except Unsound:
                if not others:
                    raise
                at, count = others.pop()
                del found[count:]
        return found

    def node_at(at, end, wide):
        """Where the next node begins, the node with what is inside, and where else the next one could begin."""
        size, info, kind, elm = form.header_at(made, at, wide)
        start = at + header_length(wide)
        if start + size > end:
            raise Unsound(f"the node at {at:#x} of the saved stream ends outside its parent")
        if kind in (GROUP32, GROUP64):
            return start + size, [(elm, kind, None), *nodes(start, start + size, wide and kind == GROUP64)], None
        node = [(elm, kind, bytes(made[start:start + size]))] if elm != END else []
        plain = start + size + len(form.padding(size, info))
        pair = 16 if info & EYE_SIZE else 0
        if kind != UTF8:
            return plain + pair, node, None
        ways = [plain + pair, plain + 2 + pair]
        likely = 0 if begins(plain, end, wide, info) else 1
        return ways[likely], node, ways[1 - likely] if ways[1 - likely] <= end else None
    return nodes(0, len(made), form.wide)


def missing(due, back):
    """Nodes that are due and did not come back, in their order."""
    counts = {}
    for node in back:
        counts[node] = counts.get(node, 0) + 1
    lacking = []
    for node in due:
        counts[identity(node)] = counts.get(identity(node), 0) - 1
        if counts[identity(node)] < 0:
            lacking.append(node)
    return lacking


def recovered(folder, made, form):
    """What comes back: the report, and the bytes of the saved stream; none where nothing is whole. Raises AssertionError
    where the account is wrong."""
    check = unittest.TestCase()
    source, target = folder / "damaged.tav", folder / "saved.tav"
    source.write_bytes(made)
    result = tav("recover", source, "-o", target, "--force", "--json", *(form.options() if form else []))
    if result.status == 3:
        return None, b""
    check.assertEqual(result.err, "")
    report = json.loads(result.out)
    check.assertEqual(report["kept"] + report["lost"] + report["unread"], len(made))
    if len(report["list"]) == report["losses"]:  # not all are listed where there are very many
        check.assertEqual(sum(loss["length"] for loss in report["list"]), report["lost"])
    repaired = sum(report[name] for name in ("lost", "unread", "groupsClosed", "groupsMade", "pairsMade"))
    check.assertEqual(result.status, 1 if repaired else 0)
    saved = target.read_bytes()
    check.assertEqual(report["written"], len(saved))
    return report, saved
