"""Tells which nodes of a damaged stream have to come back: from the tree that was written, and from what became of its
bytes. It searches for nothing and knows nothing of the program."""
from planted import ARRAY, BINARY, END, EYE_SIZE, FREE, SIZES
from support import tav

KINDS = (1, 2, *SIZES, *FREE)
ELEMENTS = {int(line.split()[0]) for line in tav("elements").out.splitlines() if line.split()[0].isdigit()}


class Damaged:
    """The bytes that are left of a stream, as pieces: (from, to) of the stream as it was written, or other bytes."""

    def __init__(self, made, pieces):
        self.made, self.bytes, self.shifts = bytes(made), bytearray(), []
        for piece in pieces:
            if isinstance(piece, tuple):
                start, end = piece
                if start < end and len(self.bytes) - start not in self.shifts:
                    self.shifts.append(len(self.bytes) - start)
                self.bytes += self.made[start:end]
            else:
                self.bytes += piece
        self.bytes = bytes(self.bytes)

    def stands(self, start, end, shift):
        """Whether bytes of the stream stand in the file, moved by so many bytes."""
        return start + shift >= 0 and self.bytes[start + shift:end + shift] == self.made[start:end]


class Oracle:
    """An intact node is one whose header, payload and pair stand in the file in one piece, wherever; padding says nothing,
    and of a group only the header counts.

    A group can be known where its header is intact: it reaches from there as far as its size says. It can be known as well
    where its end element is intact: it reaches back from there as far as the pair says. Damage between the two moves one of
    them, so that they tell different places; each is believed.

    The enclosing groups of an intact node can be known when each group around it can be, reaches over the node's place in
    the file, and begins inside of the group around it. Then the node is due.

    Not due is what a file shows as the payload of another node, byte for byte as a writer makes it: see `covered`."""

    def __init__(self, form, roots, damaged):
        self.form, self.roots, self.damaged = form, roots, damaged

    def intact(self, node):
        """The shifts by which it is in the file."""
        if node.is_group:
            parts = [(node.offset, node.payload_offset)]
        else:
            parts = [(node.offset, node.payload_offset + len(node.payload) + len(node.extra)), (node.pair_offset, node.end)]
        return [shift for shift in self.damaged.shifts if all(self.damaged.stands(*part, shift) for part in parts)]

    def claims(self, group):
        """Where the group begins and ends in the file, by all that can be known of it."""
        size = len(self.damaged.bytes)
        claims = []
        for shift in self.intact(group):
            end = size if group.force_size == -1 else group.end + shift
            claims.append((group.offset + shift, end))
        end = group.end_element
        for shift in self.damaged.shifts if end else []:
            if self.damaged.stands(end.offset, end.end, shift) and group.offset + shift >= 0:
                claims.append((group.offset + shift, end.end + shift))
        return list(dict.fromkeys(claims))

    def judge(self):
        """The intact nodes, and those of them that are due."""
        intact, due, places = [], [], {}
        for root in self.roots:
            self.visit(root, [(-1, len(self.damaged.bytes))], intact, due, places)
        hidden = self.covered({place for some in places.values() for place in some}) + self.shared(intact)
        due = [node for node in due
               if not all(any(start <= place < end for start, end in hidden) for place in places[id(node)])]
        return intact, due

    def shared(self, intact):
        """Where two nodes seem to stand that have bytes in common: what came behind damage can look like what it hit. No
        stream holds both."""
        spans = sorted((node.offset + shift, (node.payload_offset if node.is_group else node.end) + shift)
                       for node in intact for shift in self.intact(node))
        return [(min(one[0], two[0]), max(one[0], two[0]) + 1) for one, two in zip(spans, spans[1:]) if two[0] < one[1]]

    def visit(self, node, around, intact, due, places):
        """`around`: what can be known of the group around, cut to what can be known of those around it."""
        shifts = self.intact(node)
        if shifts and node.elm != END:
            intact.append(node)
        end = node.offset if node.is_group else node.end
        known = [node.offset + shift for shift in shifts
                 if any(a < node.offset + shift and end + shift <= b for a, b in around)]
        if known and node.elm != END:
            due.append(node)
            places[id(node)] = known
        if not node.is_group:
            return
        inner = []
        for start, stop in self.claims(node):
            inner += [(start, min(stop, b)) for a, b in around if a < start < b]
        for child in node.children:
            self.visit(child, inner, intact, due, places)

    def covered(self, places):
        """Where bytes are, by the file, the payload of a node: the size of a data element without a pair leads exactly from
        its header to another node or to the end of a group, and either the size is damaged or the payload. The file is then,
        byte for byte, what a writer makes of a tree in which these bytes are the payload; a sound stream has to come back as
        it is, so this one, too. A string holds text and no nodes, other types have one size or hold bytes, and where a pair is
        announced it stands behind the true payload."""
        nodes = [node for root in self.roots for node in root.walk()]
        ends = set(places) | {len(self.damaged.bytes)}
        for node in nodes:
            if node.is_group:
                ends |= {end for _, end in self.claims(node)}
                if node.end_element:
                    ends |= {node.end_element.offset + shift for shift in self.damaged.shifts}
        hidden = []
        for node in nodes:
            if node.is_group:
                continue
            for shift in self.damaged.shifts:
                place = node.offset + shift
                if shift in self.intact(node) or place < 0 or node.payload_offset + shift > len(self.damaged.bytes):
                    continue
                size, info, kind, _ = self.form.header_at(self.damaged.bytes, place, node.wide)
                if info & EYE_SIZE or not (kind == BINARY or (kind == ARRAY and size % 8 == 0) or SIZES.get(kind) == size):
                    continue
                end = node.payload_offset + shift + size + len(self.form.padding(size, info))
                if end in ends:
                    hidden.append((node.payload_offset + shift, end))
        return hidden
