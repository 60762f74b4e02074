"""recover brings back every node whose own bytes are whole and to which whole bytes lead, and accounts for every byte."""
import functools
import json
import multiprocessing
import os
import pathlib
import random
import tempfile
import unittest

from oracle import ELEMENTS
from planted import ARRAY, BINARY, END, EYE, EYE_SIZE, NAMED, Form, Node, encode, random_form, random_tree, recorded
from recovering import identity, missing, read_back, recovered
from support import ToolTest, generate, tav

# Damages of each kind of stream, and the first of them: with 1 and 7, the eighth alone.
DAMAGES = int(os.environ.get("TAV_DAMAGES", "400"))
FIRST = int(os.environ.get("TAV_FIRST_DAMAGE", "0"))
PROCESSES = min(2, os.cpu_count() or 1)
KILOBYTE = 1024
PAGE = 512
FORMS = [Form(big, wide, align) for big in (False, True) for wide in (False, True) for align in (False, True)]
UNNAMED = next(elm for elm in range(30000, 60000) if elm not in ELEMENTS)


def zeroed(rng, made):
    length = rng.randrange(1, min(KILOBYTE, len(made)) + 1) if rng.random() < 0.5 else KILOBYTE
    start = rng.randrange(len(made))
    made[start:start + length] = bytes(len(made[start:start + length]))
    return made


def cut(rng, made):
    return made[:rng.randrange(1, len(made))]


def flipped(rng, made):
    for _ in range(rng.choice((1, 1, 2, 8))):
        made[rng.randrange(len(made))] ^= 1 << rng.randrange(8)
    return made


def swapped_pages(rng, made):
    pages = len(made) // PAGE
    if pages < 2:
        return flipped(rng, made)
    one, two = (PAGE * page for page in rng.sample(range(pages), 2))
    made[one:one + PAGE], made[two:two + PAGE] = made[two:two + PAGE], made[one:one + PAGE]
    return made


DAMAGE = (zeroed, cut, flipped, swapped_pages)


class Judge:
    """Tells from the tree that was written, and from where the bytes differ, which nodes have to come back. It looks at
    no header and searches for nothing."""

    def __init__(self, form, root, made, damaged):
        self.form, self.made, self.damaged = form, made, damaged
        self.wrong = [0]
        for i, byte in enumerate(made):
            self.wrong.append(self.wrong[-1] + (i >= len(damaged) or damaged[i] != byte))
        self.root = root

    def whole(self, start, end):
        return self.wrong[end] == self.wrong[start]

    def own(self, node):
        """A data element's header, payload and pair; padding says nothing. A group's header."""
        if node.is_group:
            return self.whole(node.offset, node.payload_offset)
        return (self.whole(node.offset, node.payload_offset + len(node.payload) + len(node.extra)) and
                self.whole(node.pair_offset, node.end))

    def due(self):
        """The nodes that have to come back: whole ones whose enclosing pairs are all whole. A group without a pair has its
        header instead."""
        due = []
        self.visit(self.root, due)
        hidden = self.swallowed()
        return [node for node in due if not any(start <= node.offset < end for start, end in hidden)]

    def swallowed(self):
        """What a damaged size covers when it leads exactly to another node of the same group, and the node with that size is
        whole by all its bytes: bytes that may hold anything, without a pair. The file is then, byte for byte, what a writer
        makes of a tree in which these bytes are the payload; a sound stream has to come back as it is, so this one, too.
        A string holds text and no nodes, other types have one size, and a pair stands behind the true payload alone."""
        places = {place for node in self.root.walk() for place in (node.offset, node.end)}
        hidden = []
        for node in self.root.walk():
            if node.is_group or self.whole(node.offset, node.payload_offset) or node.payload_offset > len(self.damaged):
                continue
            size, info, kind, _ = self.form.header_at(self.damaged, node.offset, node.wide)
            if info & EYE_SIZE or not (kind == BINARY or (kind == ARRAY and size % 8 == 0)):
                continue
            end = node.payload_offset + size + len(self.form.padding(size, info))
            group = node.parent
            inside = group is None or end <= (group.end_element.offset if group.end_element else group.end)
            if node.end < end and end in places and inside:
                hidden.append((node.end, end))
        return hidden

    def visit(self, node, due):
        if self.own(node):
            due.append(node)
        if not node.is_group:
            return
        end = node.end_element
        if self.whole(end.offset, end.end) if end else self.whole(node.offset, node.payload_offset):
            for child in node.children:
                self.visit(child, due)


def damaged_stream(pairs, number):
    """The stream of this number of a kind, as it was and damaged."""
    rng = random.Random(f"{pairs} {number}")
    form = random_form(rng)
    form.wide = form.wide or pairs == 1
    root = random_tree(rng, form, depth=4, pairs=pairs, nodes=rng.choice((4, 8)))
    made = encode(form, root)
    damage = DAMAGE[number % len(DAMAGE)]
    return form, root, made, damage.__name__, damage(rng, bytearray(made))


def judged(pairs, number):
    """How many nodes are due in one damaged stream, and what is wrong with the one that was saved of it."""
    form, root, made, damage, damaged = damaged_stream(pairs, number)
    due = Judge(form, root, made, damaged).due()
    title = f"{pairs} {number} {damage} {' '.join(form.options())}"
    with tempfile.TemporaryDirectory(prefix="tav-test-") as name:
        folder = pathlib.Path(name)
        try:
            report, saved = recovered(folder, damaged, form)
            lacking = [(node.offset, *identity(node)) for node in missing(due, read_back(saved, form))]
        except AssertionError as error:
            return title, len(due), str(error)
        if lacking:
            return title, len(due), f"lacks {lacking}"
        sound = tav("check", folder / "saved.tav", *form.options()) if report is not None else None
        return title, len(due), sound.out if sound is not None and sound.status != 0 else ""


class Recover(ToolTest):
    def test_a_sound_stream_comes_back_byte_for_byte(self):
        for seed in range(200):
            rng = random.Random(seed)
            form = random_form(rng)
            made = encode(form, random_tree(rng, form, depth=4))
            with self.subTest(seed=seed):
                report, saved = recovered(self.folder, made, form)
                self.assertEqual((saved, report["kept"], report["losses"]), (made, len(made), 0))

    def check(self, pairs):
        due_count, bad = 0, []
        with multiprocessing.Pool(PROCESSES) as pool:
            for title, due, wrong in pool.imap_unordered(functools.partial(judged, pairs), range(FIRST, FIRST + DAMAGES),
                                                       chunksize=16):
                due_count += due
                bad += [f"{title}: {wrong}"] if wrong else []
        self.assertEqual(bad, [])
        if DAMAGES >= 100:  # a few may be streams of which nothing is left
            self.assertGreater(due_count, DAMAGES * 10)

    def test_what_is_whole_comes_back_from_streams_with_pairs(self):
        self.check(1)

    def test_what_is_whole_comes_back_from_streams_without_pairs(self):
        self.check(0)

    def test_what_is_whole_comes_back_from_streams_with_some_pairs(self):
        self.check(0.5)


class Unfinished(ToolTest):
    """Streams of a writer that was killed: groups open, the last bytes missing."""

    def saved(self, path, *options):
        target = self.folder / "saved.tav"
        result = tav("recover", path, "-o", target, "--force", "--json", *options)
        self.assertEqual((result.status, result.err), (1, ""))
        self.assertEqual(tav("check", target, *options).status, 0)
        return json.loads(result.out), target.read_bytes()

    def test_open_groups_are_closed_and_all_nodes_come_back(self):
        path = self.folder / "g.tav"
        for seed in range(1, 30):
            form = Form(wide=seed % 3 != 0, align=seed % 2 == 0)
            options = [*(["--align"] if form.align else []), *([] if form.wide else ["--root32"])]
            with self.subTest(seed=seed):
                made = generate(path, *options, "--unfinished", "--seed", seed, "--nodes", 80)
                report, _ = self.saved(path, *form.options())
                self.assertEqual((report["lost"], report["nodes"]), (0, len(made["nodes"])))
                self.assertGreater(report["groupsClosed"], 0)

    def test_a_file_without_its_last_page_keeps_what_is_before(self):
        for seed in range(40):
            rng = random.Random(seed)
            form = random_form(rng)
            root = random_tree(rng, form, depth=3, pairs=0, nodes=8)
            for node in root.walk():
                if node.is_group:
                    node.force_size = -1 if seed % 2 else None
            root.force_size = -1
            made = encode(form, root)
            if len(made) < 2 * PAGE:
                continue
            path = self.folder / "cut.tav"
            end = len(made) // PAGE * PAGE
            path.write_bytes(made[:end])
            with self.subTest(seed=seed):
                report, saved = self.saved(path, *form.options())
                due = [node for node in root.walk()
                       if (node.payload_offset if node.is_group else node.padding_offset) <= end]
                self.assertEqual([node.offset for node in missing(due, read_back(saved, form))], [])
                self.assertEqual(report["kept"] + report["lost"], end)

    def test_a_group_whose_header_is_lost_comes_back_by_its_end_element(self):
        children = [Node(NAMED[4], 55, b"abcd"), Node(NAMED[5], 50, b"text")]
        group = Node(NAMED[3], 1, children=children, info=EYE_SIZE)
        root = Node(NAMED[0], 2, children=[Node(NAMED[1], 57, bytes(8)), group, Node(NAMED[2], 57, bytes(8))], info=EYE_SIZE)
        form = Form()
        made = encode(form, root)
        made[group.offset:group.payload_offset] = b"\xff" * 16
        path = self.folder / "x.tav"
        path.write_bytes(made)
        report, saved = self.saved(path, *form.options())
        self.assertEqual((report["groupsMade"], report["lost"], len(saved)), (1, 16, len(made)))
        self.assertEqual(tav("get", self.folder / "saved.tav", *form.options(), "/docRoot/docRoot/*", "--all").out.splitlines()[0],
                         str(int.from_bytes(b"abcd", "little")))

    def test_nodes_that_lost_all_groups_come_back_under_a_root_of_their_own(self):
        form = Form()
        root = Node(NAMED[3], 2, children=[Node(NAMED[1], 57, bytes(range(8))), Node(NAMED[2], 57, bytes(range(8, 16)))])
        made = encode(form, root)
        made[0:16] = bytes(16)
        path = self.folder / "x.tav"
        path.write_bytes(made)
        report, saved = self.saved(path, *form.options())
        self.assertEqual((report["groupsMade"], report["lost"], report["nodes"]), (1, 16, 2))
        self.assertEqual(saved[12:16], bytes([2, 0, 20, 0]))


class EmptyRoot(ToolTest):
    """A root of size 0 is closed, or was never closed: what follows shows which."""

    def saved(self, made, form):
        report, saved = recovered(self.folder, made, form)
        result = tav("check", self.folder / "saved.tav", *form.options())
        self.assertEqual(result.status, 0, result.out)
        return report, saved

    def test_a_root_that_lost_all_it_held_takes_what_follows(self):
        for form in FORMS:
            root = Node(NAMED[0], 2 if form.wide else 1, children=[Node(NAMED[1], 57, bytes(range(8)))])
            next_root = Node(NAMED[2], root.kind, children=[Node(NAMED[3], 57, bytes(range(8, 16)))])
            made, behind = encode(form, root), encode(form, next_root)
            made[root.payload_offset:] = b"\xff" * (root.end - root.payload_offset)
            with self.subTest(form=form.options()):
                report, saved = self.saved(made + behind, form)
                self.assertEqual((report["lost"], report["groupsClosed"]), (root.end - root.payload_offset, 1))
                width = 8 if form.wide else 4
                size = form.number(len(behind), width)
                self.assertEqual(saved, size + made[width:root.payload_offset] + behind)

    def test_a_root_with_a_damaged_end_element_takes_what_follows_when_it_lost_all_it_held(self):
        for form in FORMS:
            root = Node(NAMED[0], 2 if form.wide else 1, children=[Node(END, BINARY, b"\xff" * 16)])
            root.force_size = -1
            node = Node(NAMED[1], 57, bytes(range(8)))
            made, behind = encode(form, root), encode(form, node)
            with self.subTest(form=form.options()):
                report, saved = self.saved(made + behind, form)
                self.assertEqual((report["lost"], report["groupsMade"]), (16, 0))
                width = 8 if form.wide else 4
                size = form.number(len(behind), width)
                self.assertEqual(saved, size + made[width:root.payload_offset] + behind)

    def test_a_root_that_asks_for_no_end_element_takes_what_follows_the_one_it_has(self):
        for form in (form for form in FORMS if form.wide):
            pair = form.pair(16)
            root = Node(NAMED[0], 2, children=[Node(END, BINARY, pair)])
            node = Node(NAMED[1], 57, bytes(range(8)))
            made, behind = encode(form, root), encode(form, node)
            with self.subTest(form=form.options()):
                report, saved = self.saved(made + behind, form)
                self.assertEqual((report["lost"], report["groupsMade"]), (0, 0))
                self.assertEqual(saved, form.number(len(behind), 8) + made[8:root.payload_offset] + behind)

    def test_an_empty_root_is_closed_where_a_surer_root_of_another_width_follows_whatever_its_name(self):
        """Read with 32-bit headers, what follows are nodes, too, of a kind: their sizes lead to the end."""
        form = Form(align=True)
        group_of_nothing = bytes.fromhex("0000000001000000")
        for elm in (NAMED[0], UNNAMED):
            holder = Node(elm, 1, children=[Node(NAMED[4], 51, b"Z"), Node(NAMED[5], 57, group_of_nothing)])
            made = encode(form, Node(NAMED[3], 1, children=[])) + encode(form, holder)
            with self.subTest(elm=elm):
                report, saved = self.saved(made, form)
                self.assertEqual((saved, report["lost"], report["groupsClosed"]), (made, 0, 0))


class Strangers(ToolTest):
    """Nodes that no reader takes, for their type or for a size that their type does not have, in a stream without damage."""

    UNKNOWN_TYPE = 2353

    def tree(self, form, info, strangers):
        def unnamed(kind, payload):
            return Node(UNNAMED, kind, payload, info=info)

        children = [Node(NAMED[1], 57, bytes(range(8))), *strangers, unnamed(51, b"Z"), unnamed(55, b"abcd"), *strangers[:1],
                    unnamed(BINARY, b"0123456789"), Node(NAMED[2], 55, b"last")]
        return Node(NAMED[0], 2 if form.wide else 1, children=children)

    def check(self, reason, kind, payload):
        for form in FORMS:
            for info in (0, EYE_SIZE) if form.wide else (0,):
                one, two = (Node(elm, kind, payload, info=info) for elm in (NAMED[3], UNNAMED))
                with self.subTest(form=form.options(), info=info):
                    report, saved = recovered(self.folder, encode(form, self.tree(form, info, [one, two])), form)
                    self.assertEqual(saved, encode(form, self.tree(form, info, [])))
                    self.assertEqual({loss["length"] for loss in report["list"]}, {one.end - one.offset})
                    self.assertEqual([loss["reason"] for loss in report["list"]], [reason] * 3)

    def test_one_of_an_unknown_type_goes_alone_whatever_the_names_behind_it(self):
        self.check("a node of an unknown type", self.UNKNOWN_TYPE, b"0123456789abc")

    def test_one_of_a_size_that_its_type_does_not_have_goes_alone(self):
        self.check("a node of a size that its type does not have", 58, b"1234567")

    def test_the_second_half_of_a_pair_is_not_one_that_holds_a_whole_node(self):
        self.assertEqual(judged(1, 699)[2], "")

    def test_what_is_in_a_group_whose_type_is_damaged_comes_back(self):
        for form in FORMS:
            inside = [Node(NAMED[4], 57, bytes(range(8))), Node(NAMED[5], 55, b"abcd")]
            group = Node(NAMED[3], 2 if form.wide else 1, children=inside)
            root = Node(NAMED[0], group.kind, children=[Node(NAMED[1], 57, bytes(8)), group, Node(NAMED[2], 55, b"last")])
            made = encode(form, root)
            kind_at = group.offset + (12 if form.wide else 4)
            made[kind_at:kind_at + 2] = self.UNKNOWN_TYPE.to_bytes(2, form.order)
            with self.subTest(form=form.options()):
                report, saved = recovered(self.folder, made, form)
                self.assertEqual(missing(inside, read_back(saved, form)), [])
                self.assertEqual(report["lost"], group.payload_offset - group.offset)


class Report(ToolTest):
    """What is told of a recovery is what was done."""

    def tree(self, form):
        info = EYE_SIZE if form.wide else 0
        inside = [Node(NAMED[1], 57, bytes(range(8))), Node(NAMED[2], 55, b"abcd")]
        group = Node(NAMED[3], 2 if form.wide else 1, children=inside, info=info)
        return Node(NAMED[0], group.kind, children=[group, Node(NAMED[4], 55, b"last")])

    def test_garbage_behind_a_sound_stream_closes_no_group(self):
        for form in FORMS:
            made = encode(form, self.tree(form))
            with self.subTest(form=form.options()):
                report, saved = recovered(self.folder, made + random.Random(1).randbytes(200), form)
                self.assertEqual((report["groupsClosed"], report["lost"], saved), (0, 200, bytes(made)))

    def test_a_root_whose_size_is_too_small_is_closed(self):
        for form in FORMS:
            root = self.tree(form)
            root.add_size = -5
            made = encode(form, root)
            with self.subTest(form=form.options()):
                report, saved = recovered(self.folder, made, form)
                self.assertEqual((report["groupsClosed"], report["lost"], saved), (1, 0, encode(form, self.tree(form))))

    def test_nodes_are_counted_alike_by_every_command_and_end_elements_apart(self):
        for form in FORMS:
            path = self.folder / "x.tav"
            path.write_bytes(encode(form, self.tree(form)))
            ends = 1 if form.wide else 0
            with self.subTest(form=form.options()):
                report, _ = recovered(self.folder, path.read_bytes(), form)
                checked = json.loads(tav("check", path, "--json", *form.options()).out)
                self.assertEqual([(found["nodes"], found["endElements"]) for found in (report, checked)], [(5, ends)] * 2)
                text = tav("info", path, *form.options()).out
                self.assertIn("nodes             5, of them 2 groups\n", text)
                self.assertIn(f"end elements      {ends or 'none'}\n", text)
                self.assertIn("no defects in 5 nodes" + (" and 1 end element\n" if ends else "\n"),
                              tav("check", path, *form.options()).out)

    def test_nodes_beside_damage_that_may_be_none_are_told(self):
        for form in FORMS:
            eyes = Node(NAMED[2], BINARY, EYE.to_bytes(8, form.order) * 3)
            stranger, plain = Node(UNNAMED, 55, b"abcd"), Node(NAMED[5], 55, b"last")
            far = Node(UNNAMED, 55, b"efgh")
            hit, hit_too = Node(NAMED[4], 57, bytes(8)), Node(NAMED[4], 57, bytes(8))
            children = [eyes, hit, plain, far, Node(NAMED[1], 57, bytes(range(8))), stranger, hit_too, Node(NAMED[6], 55, b"LAST")]
            made = encode(form, Node(NAMED[0], 2 if form.wide else 1, children=children))
            for node in (hit, hit_too):
                made[node.offset:node.end] = b"\xff" * (node.end - node.offset)
            with self.subTest(form=form.options()):
                report, _ = recovered(self.folder, made, form)
                told = [(doubt["offset"], doubt["reason"].split(", and ")[1]) for doubt in report["doubtful"]]
                self.assertEqual(told, [(eyes.offset, "most of its payload is eye catchers"),
                                        (stranger.offset, "its element is not in the dictionary")])
                self.assertEqual(report["doubts"], 2)
                text = tav("recover", self.folder / "damaged.tav", "-o", self.folder / "y.tav", "--force", *form.options()).out
                self.assertIn(f"{eyes.offset:#x}: the node of {eyes.payload_offset + 24 - eyes.offset} bytes is doubtful: it stands", text)
                self.assertIn(f"nodes            {report['nodes']}, 2 of them doubtful\n", text)

    def test_a_group_in_bytes_whose_announced_pair_is_gone_comes_back(self):
        for form in (form for form in FORMS if form.wide):
            for kind, info, pair in ((kind, info, pair) for kind in (1, 2) for info in (0, EYE_SIZE)
                                     for pair in (bytes(16), b"\xff" * 16, b"")):
                inside = [Node(NAMED[4], 57, bytes(range(8))), Node(NAMED[5], 55, b"abcd"), Node(NAMED[6], 55, b"efgh")]
                group = Node(NAMED[3], kind, children=inside, info=info)
                holder = Node(NAMED[2], BINARY, bytes(encode(form, group)), info=EYE_SIZE)
                holder.force_pair = pair
                others = [Node(NAMED[1], 57, bytes(8)), Node(NAMED[7], 55, b"last"), Node(NAMED[8], 55, b"LAST")]
                made = encode(form, Node(NAMED[0], 2, children=[others[0], holder, *others[1:]]))
                with self.subTest(form=form.options(), kind=kind, info=info, pair=pair[:1]):
                    _, saved = recovered(self.folder, made, form)
                    self.assertEqual(missing([group, *inside, *others], read_back(saved, form)), [])


class Cost(ToolTest):
    def bytes_read(self, *arguments):
        result = tav(*arguments, "--stats", "--ring", "64K")
        return int(next(line for line in result.err.splitlines() if "bytes read" in line).split(": ")[-1].split()[0])

    def test_at_most_three_times_a_plain_walk(self):
        """The walk is that of the sound stream, which reads every byte once; what damage costs comes on top of it."""
        path = self.folder / "big.tav"
        form = ["--byte-order", "little", "--root", "64", "--no-align"]
        for pairs in (["--pairs"], []):
            generate(path, *pairs, "--mixed", "--nodes", 20000, "--depth", 6, "--seed", 3)
            made = path.read_bytes()
            walk = self.bytes_read("tree", path, *form)
            self.assertEqual(walk, len(made))
            rng = random.Random(1)
            for damage in (None, zeroed, flipped, swapped_pages):
                damaged = bytearray(made)
                for _ in range(20 if damage else 0):
                    damaged = damage(rng, damaged)
                path.write_bytes(damaged)
                with self.subTest(pairs=pairs, damage=damage and damage.__name__):
                    cost = self.bytes_read("recover", path, "-o", self.folder / "saved.tav", "--force", *form)
                    self.assertLessEqual(cost, 3 * walk)

    def test_hostile_streams_end_soon(self):
        path = self.folder / "x.tav"
        nest = bytes.fromhex("FFFFFFFF01001400")
        eye = bytes.fromhex("ED0DECDDEED5DEC0")
        for name, made in (("nested", nest * 100000), ("nested with data", nest * 50000 + bytes.fromhex("040000003700140007000000") * 50000),
                           ("claims", bytes.fromhex("0000001001001400") + bytes.fromhex("005ED0B265001400") * 100000),
                           ("eyes", (eye + bytes([16]) + bytes(7)) * 100000), ("headers", bytes.fromhex("FFFF000066001400") * 100000)):
            path.write_bytes(made)
            with self.subTest(stream=name):
                for command in (["check"], ["recover", "-o", self.folder / "saved.tav", "--force"]):
                    result = tav(*command, path)
                    self.assertIn(result.status, (1, 3), result.err)


class Command(ToolTest):
    def damaged(self):
        path = self.folder / "x.tav"
        made = bytearray(recorded(pairs=True))
        made[len(made) // 2:len(made) // 2 + 30] = bytes(30)
        path.write_bytes(made)
        return path, made

    def test_the_report_accounts_for_every_byte(self):
        path, made = self.damaged()
        result = tav("recover", path, "-o", self.folder / "y.tav")
        self.assertEqual((result.status, result.err), (1, ""))
        numbers = [int(word) for word in result.out.split("bytes  ")[1].split("\n")[0].split() if word.isdigit()]
        self.assertEqual(numbers[0], len(made))
        self.assertEqual(sum(numbers[1:4]), len(made))
        self.assertEqual(tav("check", self.folder / "y.tav").status, 0)

    def test_a_sound_stream_is_copied_and_nothing_is_told(self):
        path = self.snapshot()
        result = tav("recover", path, "-o", self.folder / "y.tav")
        self.assertEqual((result.status, result.err), (0, ""))
        self.assertEqual((self.folder / "y.tav").read_bytes(), path.read_bytes())

    def test_standard_input_and_output_work(self):
        path, made = self.damaged()
        result = tav("recover", "-", "-o", "-", stdin=bytes(made))
        self.assertIn("kept", result.err)
        tav("recover", path, "-o", self.folder / "y.tav")
        self.assertEqual(result.raw, (self.folder / "y.tav").read_bytes())

    def test_the_report_goes_to_a_file_when_asked(self):
        path, made = self.damaged()
        result = tav("recover", path, "-o", self.folder / "y.tav", "--json", "--report", self.folder / "r.json")
        self.assertEqual((result.status, result.out, result.err), (1, "", ""))
        report = json.loads((self.folder / "r.json").read_text())
        self.assertEqual(report["kept"] + report["lost"] + report["unread"], len(made))

    def test_an_existing_file_is_not_replaced_without_force(self):
        path, _ = self.damaged()
        (self.folder / "y.tav").write_bytes(b"mine")
        result = tav("recover", path, "-o", self.folder / "y.tav")
        self.assertEqual((result.status, (self.folder / "y.tav").read_bytes()), (2, b"mine"))
        self.assertIn("KOR_RC_FILE_EXISTS", result.err)

    def test_nothing_is_written_when_nothing_is_whole(self):
        path = self.folder / "x.tav"
        path.write_bytes(b"no stream at all, but text" * 10)
        result = tav("recover", path, "-o", self.folder / "y.tav")
        self.assertEqual((result.status, [entry.name for entry in self.folder.iterdir()]), (3, ["x.tav"]))

    def test_a_full_disk_is_told(self):
        path, _ = self.damaged()
        result = tav("recover", path, "-o", "/dev/full")
        self.assertEqual(result.status, 2)
        self.assertIn("KOR_RC_NO_SPACE", result.err)

    def test_what_was_not_searched_is_unread(self):
        path = self.folder / "x.tav"
        form = Form()
        made = encode(form, Node(20, 2, children=[Node(NAMED[1], 57, bytes(8))]))
        path.write_bytes(made + b"\xff" * 200000)
        result = tav("recover", path, "-o", self.folder / "y.tav", "--json", "--search", "20000", *form.options())
        report = json.loads(result.out)
        self.assertGreater(report["unread"], 0)
        self.assertEqual(report["kept"] + report["lost"] + report["unread"], len(made) + 200000)

    def test_wrong_usage_is_told(self):
        path, _ = self.damaged()
        for arguments in ([path], [], ["/nonexistent/x.tav", "-o", self.folder / "y.tav"]):
            result = tav("recover", *arguments)
            self.assertEqual(result.status, 2)
            self.assertTrue(result.err.startswith("tav: "), result.err)


if __name__ == "__main__":
    unittest.main()
