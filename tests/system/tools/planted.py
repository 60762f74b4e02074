"""Writes streams byte by byte, without the library, so that defects can be planted at known places.

A tree of Node objects is encoded by Encoder; afterwards every node knows where its parts are. Fields that begin with
`force` make it wrong."""
import random

from layout import ALIGNED, ARRAY, BINARY, END, EYE, EYE_SIZE, MARKER, Form, header_length  # noqa: F401

NAMED = [20, 307, 321, 60001, 60002, 60003, 60004, 60005, 60006, 60007, 60008, 60103]
SIZES = {51: 1, 52: 1, 53: 2, 54: 2, 55: 4, 56: 4, 57: 8, 58: 8, 100: 16, 103: 16, 104: 16, 105: 1}
FREE = [50, BINARY, 102, ARRAY]
HOST = "little"


def random_form(rng):
    return Form(rng.random() < 0.5, rng.random() < 0.6, rng.random() < 0.4)


class Node:
    """A group when `children` is a list, else a data element."""

    def __init__(self, elm, kind, payload=b"", children=None, info=0, extra=b""):
        self.elm, self.kind, self.payload, self.children, self.info, self.extra = elm, kind, payload, children, info, extra
        self.by_string = bool(extra)   # the writer's string operation: its pair is in the host's order
        self.force_size = None         # in the header
        self.add_size = 0              # to the right size, in the header
        self.force_bits = None         # info as in the file
        self.force_pair = None         # 16 bytes, or b"" for none
        self.force_padding = None
        self.force_end = None          # an own Node instead of the end element; False: none
        self.after_end = []            # nodes behind the end element
        self.tail = b""                # behind the last child
        self.offset = self.payload_offset = self.pair_offset = self.padding_offset = self.end = None
        self.end_element = None
        self.parent = None

    @property
    def is_group(self):
        return self.children is not None

    @property
    def eye(self):
        return bool(self.info & EYE_SIZE)

    def walk(self):
        yield self
        for child in self.children or []:
            yield from child.walk()


class Encoder:
    def __init__(self, form):
        self.form = form
        self.out = bytearray()

    def put(self, node, wide, parent=None):
        node.parent, node.wide, node.offset = parent, wide, len(self.out)
        self.out += bytes(header_length(wide))
        node.payload_offset = len(self.out)
        self.put_children(node, wide) if node.is_group else self.put_payload(node, wide)
        node.end = len(self.out)
        if node.is_group:
            right = node.end - node.payload_offset
        else:
            right = len(node.payload)
        size = right + node.add_size if node.force_size is None else node.force_size
        bits = self.form.info(node.info) if node.force_bits is None else node.force_bits
        head = self.form.header(wide, size, node.kind, node.elm, bits)
        self.out[node.offset:node.offset + len(head)] = head

    def put_payload(self, node, wide):
        self.out += node.payload + node.extra
        node.padding_offset = len(self.out)
        padding = self.form.padding(len(node.payload))
        self.out += padding if node.force_padding is None else node.force_padding
        node.pair_offset = len(self.out)
        if wide and node.eye:
            pair = self.form.pair(len(node.payload), HOST if node.by_string else None)
            self.out += pair if node.force_pair is None else node.force_pair

    def put_children(self, node, wide):
        inner = wide and node.kind == 2
        for child in node.children:
            self.put(child, inner, node)
        if wide and node.eye and node.force_end is not False:
            length = len(self.out) - node.payload_offset
            end = node.force_end or Node(END, BINARY, self.form.end_pair(length, inner))
            self.put(end, inner, node)
            node.end_element = end
        for child in node.after_end:
            self.put(child, inner, node)
        self.out += node.tail


def encode(form, root):
    encoder = Encoder(form)
    encoder.put(root, form.wide)
    return encoder.out


def text(rng, length):
    return bytes(rng.randrange(97, 123) for _ in range(length))


def random_data(rng, form, wide, pairs=0.5, strings=0.5, kinds=None, empty=0):
    """`empty`: how many of the texts and of the bytes have none."""
    kind = rng.choice(kinds or list(SIZES) + FREE * 2)
    extra = b""
    if kind in SIZES:
        payload = rng.randbytes(SIZES[kind])
    elif kind == 106:
        payload = rng.randbytes(8 * rng.randrange(4))
    elif kind == 102:
        payload = (1208).to_bytes(2, form.order) + text(rng, rng.randrange(20))
        extra = b"~~" if rng.random() < strings else b""
    else:
        payload = text(rng, rng.randrange(24)) if kind == 50 else rng.randbytes(rng.randrange(40))
        payload = b"" if empty and rng.random() < empty else payload
    info = EYE_SIZE if wide and rng.random() < pairs else 0
    return Node(rng.choice(NAMED), kind, payload, info=info, extra=extra)


def random_group(rng, form, wide, depth=3, pairs=0.5, strings=0.5, nodes=6, mixed=0.25, **data):
    inner = wide and rng.random() >= mixed
    children = []
    for _ in range(rng.randrange(2, nodes + 2)):
        if depth > 0 and rng.random() < 0.35:
            children.append(random_group(rng, form, inner, depth - 1, pairs, strings, nodes, mixed, **data))
        else:
            children.append(random_data(rng, form, inner, pairs, strings, **data))
    info = EYE_SIZE if wide and rng.random() < pairs else 0
    return Node(rng.choice(NAMED), 2 if inner else 1, children=children, info=info)


def random_tree(rng, form, **more):
    return random_group(rng, form, form.wide, **more)


# What a snapshot of some machine has; those of the machine that runs the tests have something else in each place each time.
RECORDED = (60100, [(60102, [
    (60103, "ada"), (60101, "x86_64"),
    (60104, [(60105, "Linux"), (60107, "6.1.0-18-amd64"), (60106, "#1 SMP PREEMPT_DYNAMIC 6.1.76-1 (2024-02-01)")]),
    (60109, [(60112, 4), (60111, 4), (60113, 2596), (60114, 2), (60116, 2), (60127, 61), (44010, 37805280), (44011, 36874330),
             (44012, 11780680), (44013, 13214110), (44014, 95000), (44015, 46860), (44016, 55430)]),
    (60117, [(60118, 25276518400), (60119, 12297949184), (60120, 22864396288), (60121, 0), (60122, 0), (60123, 25276518400),
             (60124, 1942118400), (60125, 22864396288), (60126, 12297949184), (44017, 262963200), (44019, 38621184)]),
    (44000, [(44001, 50123), (44002, 851), (44003, 902), (44004, 603), (44005, 6), (44006, 181), (44007, 72817404)]),
    (44020, [(44021, "vda"), (44022, 1350221), (44023, 17314021376), (44024, 4060171), (44025, 93411020800)]),
    (44027, [(44028, "/"), (44029, "ext4"), (44030, 265936306176)]),
    *[(44032, [(44033, name), (44034, 512 * count), (44035, count)]) for name, count in (("lo", 70041), ("eth0", 811))],
    *[(44042, [(44043, 4000 + 13 * i), (44044, name), (44045, 7000 // (i + 1)), (44046, 70000 >> i)])
      for i, name in enumerate(("compiler", "linker", "editor", "a longer name", "sh"))]])])


def recorded(form=None, pairs=False):
    """A stream as a snapshot is one, with and without pairs, in a form; the same each time."""
    form = form or Form()

    def node(elm, value):
        info = EYE_SIZE if pairs and form.wide else 0
        if isinstance(value, list):
            return Node(elm, 2 if form.wide else 1, children=[node(*child) for child in value], info=info)
        return Node(elm, 50, value.encode(), info=info) if isinstance(value, str) else Node(
            elm, 57, form.number(value, 8), info=info)
    return bytes(encode(form, node(*RECORDED)))
