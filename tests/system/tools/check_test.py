"""check finds what is planted, at its exact offset, and nothing in sound streams."""
import itertools
import json
import os
import pathlib
import random
import re
import unittest

from planted import (ALIGNED, EYE_SIZE, END, MARKER, NAMED, SIZES, Form, Node, encode, random_data, random_form,
                     random_group, random_tree, text)
from support import ToolTest, generate, tav

PLANTED = int(os.environ.get("TAV_PLANTED", "100"))
RULES = {rule["rule"]: rule for rule in json.loads(tav("check", "--rules", "--json").out)}
DOCUMENT = pathlib.Path(__file__).resolve().parents[3] / "docs" / "check-rules.md"
GOLDEN = pathlib.Path(__file__).resolve().parents[2] / "golden"


def example(rule):
    """The bytes of a rule's smallest file."""
    made = b""
    for run, _, many in re.findall(r"(\([^)]*\)|[0-9A-Fa-f]+)(\*(\d+))?", rule["bytes"]):
        made += bytes.fromhex(run.strip("()")) * int(many or 1)
    return made


class Retry(Exception):
    """The random tree has no place for the defect."""


def pick(rng, nodes):
    nodes = list(nodes)
    if not nodes:
        raise Retry
    return rng.choice(nodes)


def data_of(root):
    return [node for node in root.walk() if not node.is_group]


def groups_of(root):
    return [node for node in root.walk() if node.is_group]


def parents(root):
    for node in root.walk():
        for child in node.children or []:
            child.parent = node


class Planter:
    """Plants one defect into a random stream; `plant_x(rng)` returns form, bytes and the offset of what is wrong."""

    def tree(self, rng, wide=None, align=None, **more):
        form = random_form(rng)
        form.wide = form.wide if wide is None else wide
        form.align = form.align if align is None else align
        root = random_tree(rng, form, **more)
        parents(root)
        return form, root

    def no_string(self, node):
        """The last data element of a node must be no UTF-8 string."""
        while node.is_group:
            node = node.children[-1]
        if node.kind == 102:
            raise Retry

    def plant_header_cut(self, rng):
        form, root = self.tree(rng)
        root.info = 0
        # Whether a string's two uncounted bytes are there cannot be told when no node follows.
        self.no_string(root.children[-1])
        root.tail = rng.randbytes(rng.randrange(1, 16 if root.kind == 2 else 8))
        made = encode(form, root)
        return form, made, len(made) - len(root.tail)

    def plant_type_unknown(self, rng):
        form, root = self.tree(rng)
        node = pick(rng, [node for node in data_of(root) if not node.extra and not node.by_string])
        node.kind = rng.choice([*range(3, 50), *range(59, 100), *range(107, 2000)])
        made = encode(form, root)
        return form, made, node.offset

    def plant_element_unknown(self, rng):
        form, root = self.tree(rng)
        node = pick(rng, root.walk())
        encode(form, root)
        if any(other.extra and other.end == node.offset for other in data_of(root)):
            raise Retry  # with the dictionary on neither side, the string's two extra bytes may be read as the node's
        node.elm = rng.randrange(58000, 60000)
        made = encode(form, root)
        return form, made, node.offset

    def plant_size_type(self, rng):
        form, root = self.tree(rng)
        node = pick(rng, [node for node in data_of(root) if node.kind in SIZES])
        wrong = [size for size in range(1, 20) if size != SIZES[node.kind]]
        node.payload = rng.randbytes(rng.choice(wrong))
        made = encode(form, root)
        return form, made, node.offset

    def plant_past_parent(self, rng):
        form, root = self.tree(rng)
        plain = [node for node in groups_of(root)
                 if node.parent and not node.eye and not node.children[-1].is_group and node.parent.children[-1] is not node]
        node = pick(rng, plain).children[-1]
        node.kind, node.payload, node.extra, node.info, node.by_string = 101, rng.randbytes(rng.randrange(1, 20)), b"", 0, False
        if len(node.parent.children) > 1:
            self.no_string(node.parent.children[-2])
        encode(form, root)
        node.add_size = rng.randrange(1, 60) + (-len(node.payload) % 8 if form.align else 0)
        made = encode(form, root)
        return form, made, node.offset

    def plant_past_file(self, rng):
        form, root = self.tree(rng)
        root.info = 0
        root.add_size = rng.randrange(1, 2000)
        return form, encode(form, root), 0

    def plant_group_type(self, rng):
        form, root = self.tree(rng, wide=False)
        node = pick(rng, groups_of(root))
        node.kind = 2
        return form, encode(form, root), node.offset

    def plant_root_no_group(self, rng):
        form, root = self.tree(rng)
        made = encode(form, root)
        data = random_data(rng, form, form.wide)
        data.by_string = False
        return form, made + encode(form, data), len(made)

    def plant_group_open(self, rng):
        form, root = self.tree(rng, pairs=0)
        node = pick(rng, [node for node in groups_of(root)
                          if node is root or (node.kind == node.parent.kind and node.parent is root)])
        node.force_size = -1
        if node is root and rng.random() < 0.5:
            node.force_size = 0
        return form, encode(form, root), node.offset

    def with_end(self, rng, **more):
        form, root = self.tree(rng, wide=True, **more)
        return form, root, pick(rng, [node for node in groups_of(root) if node.eye and
                                      (node.parent is None or node.parent.kind == 2)])

    def plant_size_unknown(self, rng):
        form, root, node = self.with_end(rng)
        node.force_size = -1
        return form, encode(form, root), node.offset

    def plant_group_size(self, rng):
        form, root, node = self.with_end(rng)
        if node is root or (node.parent.children[-1] is node and not node.parent.eye):
            raise Retry
        node.add_size = rng.randrange(1, 8)
        return form, encode(form, root), node.offset

    def plant_end_missing(self, rng):
        form, root, node = self.with_end(rng)
        node.force_end = False
        return form, encode(form, root), node.offset

    def plant_end_form(self, rng):
        form, root, node = self.with_end(rng)
        encode(form, root)
        pair = node.end_element.payload
        end = Node(END, 101, pair)
        wrong = rng.randrange(3)
        if wrong == 0:
            end.kind = 50
        elif wrong == 1:
            end.payload = pair[:8]
        elif node.kind == 2:
            end.force_bits = 0x8 | (ALIGNED if form.align else 0)
        else:
            raise Retry
        node.force_end = end
        return form, encode(form, root), end.offset

    def plant_after_end(self, rng):
        if rng.random() < 0.5:
            form, root, node = self.with_end(rng)
            late = random_data(rng, form, node.kind == 2, strings=0)
            node.after_end = [late]
        else:
            form, root = self.tree(rng, pairs=0)
            node = pick(rng, groups_of(root))
            late = random_data(rng, form, form.wide and node.kind == 2, strings=0, pairs=0)
            node.children += [Node(MARKER, 101), late]
        made = encode(form, root)
        return form, made, late.offset

    def with_pair(self, rng, **more):
        form, root = self.tree(rng, wide=True, **more)
        parents(root)
        node = pick(rng, [node for node in data_of(root) if node.eye and node.parent.kind == 2])
        return form, root, node

    def plant_pair_missing(self, rng):
        form, root, node = self.with_pair(rng)
        node.force_pair = b""
        made = encode(form, root)
        return form, made, node.pair_offset

    def a_pair(self, rng):
        """Any pair, of data or of a group: form, bytes, offset, whether it may stand in either order."""
        if rng.random() < 0.5:
            form, root, node = self.with_pair(rng)
            made = encode(form, root)
            return form, made, node.pair_offset, node.by_string or node.kind == 50
        form, root, node = self.with_end(rng)
        made = encode(form, root)
        return form, made, node.end_element.payload_offset, False

    def plant_eye_damaged(self, rng):
        form, made, offset, _ = self.a_pair(rng)
        made[offset + rng.randrange(8)] ^= 1 << rng.randrange(8)
        return form, made, offset

    def plant_pair_distance(self, rng):
        form, made, offset, _ = self.a_pair(rng)
        made[offset + 8 + rng.randrange(8)] ^= 1 << rng.randrange(8)
        return form, made, offset

    def plant_pair_order(self, rng):
        form, made, offset, either = self.a_pair(rng)
        if either:
            raise Retry
        for word in (offset, offset + 8):
            made[word:word + 8] = made[word:word + 8][::-1]
        return form, made, offset

    def plant_align_flag(self, rng):
        form, root = self.tree(rng, wide=True)
        node = pick(rng, [node for node in root.walk() if node.parent is None or node.parent.kind == 2])
        if form.align:
            node.force_bits = node.info
        else:
            node.force_bits = node.info | ALIGNED
            if not node.is_group and len(node.payload) % 8 != 0:
                raise Retry
        made = encode(form, root)
        return form, made, node.offset

    def plant_padding_missing(self, rng):
        form, root = self.tree(rng, align=True, pairs=0)
        node = root
        while node.is_group:
            node = node.children[-1]
        self.no_string(node)
        made = encode(form, root)
        padding = len(made) - node.padding_offset
        if padding == 0:
            raise Retry
        return form, made[:len(made) - rng.randrange(1, padding + 1)], node.padding_offset

    def plant_padding_dirty(self, rng):
        form, root = self.tree(rng, align=True)
        node = pick(rng, [node for node in data_of(root) if len(node.payload) % 8 != 0])
        made = encode(form, root)
        made[node.padding_offset + rng.randrange(-len(node.payload) % 8)] = rng.randrange(1, 256)
        return form, made, node.padding_offset

    def plant_string_extra(self, rng):
        form, root = self.tree(rng, strings=0)
        node = pick(rng, [node for node in data_of(root) if node.kind == 102])
        node.extra, node.by_string = b"~~", True
        made = encode(form, root)
        return form, made, node.payload_offset + len(node.payload)

    def in_text(self, rng, kinds, least):
        form, root = self.tree(rng)
        node = pick(rng, [node for node in data_of(root) if node.kind in kinds and len(node.payload) >= least])
        made = encode(form, root)
        first = node.payload_offset + (2 if node.kind == 102 else 0)
        return form, made, rng.randrange(first, node.payload_offset + len(node.payload))

    def plant_utf8_invalid(self, rng):
        form, made, offset = self.in_text(rng, [102], 3)
        made[offset] = rng.choice([0x80, 0xBF, 0xC0, 0xC3, 0xE2, 0xF0, 0xF5, 0xFF])
        return form, made, offset

    def plant_string_nul(self, rng):
        form, made, offset = self.in_text(rng, [50, 102], 3)
        made[offset] = 0
        return form, made, offset

    def plant_string_high(self, rng):
        form, made, offset = self.in_text(rng, [50], 1)
        made[offset] = rng.randrange(128, 256)
        return form, made, offset

    def plant_damaged(self, rng):
        form, root = self.tree(rng, strings=0)
        node = pick(rng, data_of(root))
        made = encode(form, root)
        made[node.offset:node.end] = bytes(node.end - node.offset)
        return form, made, node.offset

    def plant_behind_stream(self, rng):
        form, root = self.tree(rng)
        made = encode(form, root)
        return form, made + bytes(rng.randrange(3)) + bytes([rng.randrange(1, 256)]) + rng.randbytes(rng.randrange(40)), len(made)

    def plant_zeros_between(self, rng):
        form, root = self.tree(rng)
        made = encode(form, root)
        zeros = bytes(16 + rng.randrange(9000))
        return form, made + zeros + encode(form, random_group(rng, form, form.wide)), len(made)

    def plant_zeros_long(self, rng):
        form, root = self.tree(rng)
        made = encode(form, root)
        return form, made + bytes(2 * 1024 * 1024 + 1 + rng.randrange(100000)), len(made)

    def plant_too_deep(self, rng):
        form = random_form(rng)
        kind = 2 if form.wide else 1
        node = random_group(rng, form, form.wide, depth=0)
        for _ in range(4000 + rng.randrange(60)):
            node.deep, node = True, Node(rng.choice(NAMED), kind, children=[node])
        return self.deep(form, node)

    def deep(self, form, root):
        """Encoded from the inside: the encoder goes by recursion."""
        chain = [root]
        while chain[-1].children and chain[-1].children[0].is_group:
            chain.append(chain[-1].children[0])
        made = encode(form, chain[-1])
        length = 16 if form.wide else 8
        for group in reversed(chain[:-1]):
            head = Node(group.elm, group.kind, children=[])
            head.force_size = len(made)
            made = encode(form, head) + made
        return form, made, 4000 * length


class Rules(ToolTest):
    def findings(self, path, *options):
        result = tav("check", "--json", path, *options)
        self.assertEqual(result.err, "")
        found = json.loads(result.out)
        self.assertEqual(result.status, 1 if found["defects"] else 0)
        return [(finding["rule"], finding["offset"]) for finding in found["findings"]]

    def test_the_smallest_file_of_every_rule_breaks_it_and_no_other(self):
        path = self.folder / "x.tav"
        for name, rule in RULES.items():
            with self.subTest(rule=name):
                path.write_bytes(example(rule))
                form = rule["form"].split()
                self.assertEqual(self.findings(path, "--rule", name, *form), [(name, rule["offset"])])
                others = set(self.findings(path, *([] if not rule["note"] else ["--strict"]), *form)) - {(name, rule["offset"])}
                if name == "too-deep":
                    others = {other for other in others if other[0] != "group-open"}
                self.assertEqual(others, set())

    def test_the_document_is_made_from_the_table(self):
        self.assertEqual(DOCUMENT.read_text(), tav("check", "--rules").out)

    def test_every_defect_is_found_once_at_its_offset(self):
        path = self.folder / "x.tav"
        planter = Planter()
        for name, rule in RULES.items():
            plant = getattr(planter, "plant_" + name.replace("-", "_"))
            planted, seed = 0, 0
            while planted < PLANTED:
                seed += 1
                try:
                    form, made, offset = plant(random.Random(f"{name} {seed}"))
                except Retry:
                    continue
                planted += 1
                path.write_bytes(made)
                with self.subTest(rule=name, seed=seed):
                    wanted = ["--rule", name] if rule["note"] else []
                    self.assertEqual(self.findings(path, *wanted, *form.options()), [(name, offset)])

    def test_a_hundred_defects_in_one_file_are_all_found(self):
        path = self.folder / "x.tav"
        for rule in ("size-type", "type-unknown", "pair-distance", "damaged"):
            rng = random.Random(rule)
            form = Form()
            wrong, children = [], []
            for _ in range(100):
                children += [Node(NAMED[1], 55, b"good"), Node(NAMED[2], 101, rng.randbytes(9), info=EYE_SIZE)]
                wrong.append(children[-1])
                if rule == "size-type":
                    wrong[-1].kind = 57
                elif rule == "type-unknown":
                    wrong[-1].kind = 999
            made = encode(form, Node(20, 2, children=[*children, Node(NAMED[3], 55, b"last")]))
            for node in wrong:
                if rule == "pair-distance":
                    made[node.pair_offset + 8] ^= 4
                elif rule == "damaged":
                    made[node.offset:node.end] = bytes(node.end - node.offset)
            path.write_bytes(made)
            where = "pair_offset" if rule == "pair-distance" else "offset"
            self.assertEqual(self.findings(path, *form.options()), [(rule, getattr(node, where)) for node in wrong])


class Sound(ToolTest):
    def assertSound(self, path, *options):
        result = tav("check", path, *options)
        self.assertEqual((result.status, result.err), (0, ""), result.out)
        self.assertIn("no defects", result.out)

    def test_nothing_is_found_in_generated_streams(self):
        path = self.folder / "g.tav"
        contents = [(), ("--pairs",), ("--strings",), ("--utf8", "--pairs"), ("--pairs", "--mixed", "--strings"),
                    ("--open", "--pairs"), ("--open", "--pairs", "--mixed", "--utf8", "--strings"), ("--zeros", "100000")]
        for swap, align, root32 in itertools.product((False, True), repeat=3):
            form = [name for name, on in (("--swap", swap), ("--align", align), ("--root32", root32)) if on]
            for seed, content in itertools.product((1, 2, 3), contents):
                with self.subTest(form=form, content=content, seed=seed):
                    generate(path, *form, *content, "--seed", seed, "--nodes", 40 * seed)
                    self.assertSound(path)

    def test_nothing_is_found_in_streams_made_byte_by_byte(self):
        path = self.folder / "x.tav"
        for seed in range(200):
            rng = random.Random(seed)
            form = random_form(rng)
            path.write_bytes(encode(form, random_tree(rng, form)))
            with self.subTest(seed=seed):
                self.assertSound(path, *form.options())

    def test_nothing_is_found_in_snapshots(self):
        for options in itertools.product(([], ["--byte-order", "swapped"]), ([], ["--align"]), ([], ["--eye-size"])):
            with self.subTest(options=options):
                self.assertSound(self.snapshot(*itertools.chain(*options)))


class Command(ToolTest):
    def broken(self):
        path = self.folder / "x.tav"
        path.write_bytes(example(RULES["past-parent"]))
        return path, RULES["past-parent"]["form"].split()

    def test_a_finding_is_one_line_with_offset_path_rule_and_code(self):
        path, form = self.broken()
        result = tav("check", path, *form)
        self.assertEqual(result.status, 1)
        self.assertEqual(result.out.splitlines()[0],
                         f"tav: {path}: 0x10 /docRoot/docRoot: ends 2 bytes past its parent [past-parent] "
                         "(TAV_RC_OUTSIDE_PARENT)")

    def test_standard_input_is_checked(self):
        path, form = self.broken()
        self.assertEqual(tav("check", "-", *form, stdin=path.read_bytes()).status, 1)

    def test_a_file_that_is_no_stream_is_too_damaged(self):
        path = self.folder / "x.tav"
        for content in (b"", b"x", b"no stream at all, but text" * 10):
            path.write_bytes(content)
            result = tav("check", path)
            self.assertEqual(result.status, 3)
            self.assertIn("no stream", result.out)

    def test_notes_count_only_when_asked_for(self):
        path = self.folder / "x.tav"
        path.write_bytes(example(RULES["string-nul"]))
        form = RULES["string-nul"]["form"].split()
        self.assertEqual(tav("check", path, *form).status, 0)
        told = tav("check", path, "--notes", *form)
        self.assertEqual((told.status, "note: the string holds a NUL" in told.out), (0, True))
        self.assertEqual(tav("check", path, "--strict", *form).status, 1)
        self.assertEqual(tav("check", path, "--rule", "string-nul", *form).status, 1)

    def test_wrong_usage_is_told(self):
        for arguments in (["x", "--rule", "nothing"], [], ["/nonexistent/x.tav"], ["a", "b"]):
            result = tav("check", *arguments)
            self.assertEqual(result.status, 2)
            self.assertTrue(result.err.startswith("tav: "), result.err)


if __name__ == "__main__":
    unittest.main()
