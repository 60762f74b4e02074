"""Nothing in a stream says how to read it: what is guessed has to be right, also of what damage left of a stream."""
import json
import os
import random
import unittest

from planted import BINARY, END, EYE, EYE_SIZE, HOST, NAMED, Form, Node, encode, random_form, random_tree, recorded
from support import ToolTest, generate, tav

STREAMS = int(os.environ.get("TAV_GUESSES", "150"))
FORMS = [Form(big, wide, align) for big in (False, True) for wide in (False, True) for align in (False, True)]
HEADER = 16  # of a 64-bit root; of a 32-bit one, the first child's is in it as well


def cut(rng, made):
    return made[:rng.randrange(max(4 * HEADER, len(made) // 4), len(made))]


def inserted(rng, made):
    at = rng.randrange(HEADER, len(made))
    return made[:at] + rng.randbytes(rng.choice((1, 2, 4, 8, 16, rng.randrange(1, 64)))) + made[at:]


def deleted(rng, made):
    at = rng.randrange(HEADER, len(made))
    return made[:at] + made[at + rng.choice((1, 2, 4, 8, 16, rng.randrange(1, 64))):]


def stream(rng):
    """A random tree in a random form. Without children there is nothing to guess by."""
    form = random_form(rng)
    while True:
        made = encode(form, random_tree(rng, form, depth=3, pairs=rng.choice((0, 0.5, 1))))
        if len(made) > 100:
            return form, made


class Guess(ToolTest):
    def write(self, made):
        path = self.folder / "x.tav"
        path.write_bytes(made)
        return path

    def guess(self, made):
        """Byte order and width of the root, and whether they are told as a doubt."""
        lines = tav("info", self.write(made)).out.splitlines()
        fields = {}
        for line in lines:
            fields.setdefault(line[:18].strip(), line[18:])
        order, root = fields["byte order"], fields["root header"]
        return "big" if "big-endian" in order else "little", "64" in root, "ambiguous" in order + root

    def wrong_guesses(self, damage):
        wrong = []
        for seed in range(STREAMS):
            rng = random.Random(f"{damage.__name__} {seed}")
            form, made = stream(rng)
            made = damage(rng, made)
            if tav("info", self.write(made), *form.options()).status == 3:  # nothing of it is whole
                continue
            order, wide, _ = self.guess(made)
            wrong += [(seed, form.options())] if (order, wide) != (form.order, form.wide) else []
        return wrong

    def test_a_stream_that_is_cut_is_read_in_its_form(self):
        self.assertEqual(self.wrong_guesses(cut), [])

    def test_a_stream_with_bytes_too_many_behind_its_root_header_is_read_in_its_form(self):
        self.assertEqual(self.wrong_guesses(inserted), [])

    def test_a_stream_that_lacks_bytes_behind_its_root_header_is_read_in_its_form(self):
        self.assertEqual(self.wrong_guesses(deleted), [])

    def test_a_stream_of_32_bit_headers_is_read_as_one_wherever_it_is_cut(self):
        made = recorded(Form(wide=False))
        for length in range(28, len(made)):
            with self.subTest(length=length):
                self.assertEqual(self.guess(made[:length]), (Form().order, False, False))

    def test_a_32_bit_root_with_a_damaged_type_is_not_taken_for_a_64_bit_one_together_with_its_child(self):
        for count in (1, 4, 20):
            inside = [Node(NAMED[1], 57, bytes(range(8))) for _ in range(count)]
            form = Form(wide=False)
            children = [Node(NAMED[2], 1, children=inside), Node(NAMED[3], 50, b"last")]
            made = encode(form, Node(NAMED[0], 1, children=children))
            made[4] ^= 0x80
            with self.subTest(count=count):
                self.assertEqual(self.guess(made)[:2], ("little", False))

    def test_every_command_finds_the_nodes_before_the_cut(self):
        path = self.write(recorded(Form(wide=False))[:200])
        self.assertEqual(tav("get", path, "/system/host/hostName").status, 0)
        self.assertIn("system", tav("tree", path).out.splitlines()[0])

    def test_a_sound_stream_is_read_without_a_doubt(self):
        path = self.folder / "g.tav"
        for seed in range(STREAMS):
            rng = random.Random(seed)
            names = ("--swap", "--align", "--root32", "--pairs", "--mixed", "--open")
            options = [name for name in names if rng.random() < 0.5]
            made = generate(path, *options, "--seed", seed, "--nodes", rng.choice((8, 40)))
            with self.subTest(seed=seed, options=options):
                order, wide, doubt = self.guess(path.read_bytes())
                self.assertEqual((order == "big", wide, doubt), (made["swapped"], made["root"] == 64, False))

    def test_a_stream_in_another_form_behind_the_first_is_told(self):
        for first, second in ((Form(), Form(big=True)), (Form(wide=False), Form()), (Form(big=True), Form(wide=False))):
            made = bytearray()
            for form in (first, second):
                begin = len(made)
                children = [Node(NAMED[1], 57, bytes(range(8))), Node(NAMED[2], 50, b"abc")]
                made += encode(form, Node(NAMED[0], 2 if form.wide else 1, children=children))
            name = f"{second.order}-endian, {64 if second.wide else 32}-bit root header"
            with self.subTest(first=first.options(), second=second.options()):
                path = self.write(made)
                self.assertIn(f"at {begin:#x} a stream in another form seems to begin: {name}", tav("info", path).out)
                told = tav("recover", path, "-o", self.folder / "y.tav", "--force").out
                line = next(line for line in told.splitlines() if f"{begin:#x}: " in line)
                self.assertTrue(line.endswith(f"a stream in another form seems to begin: {name}"), line)


class RecoverGuess(ToolTest):
    """Where the form is in doubt, recover tries the next best one and takes what keeps more."""

    def recover(self, made, *options):
        path = self.folder / "x.tav"
        path.write_bytes(made)
        result = tav("recover", path, "-o", self.folder / "y.tav", "--force", "--json", *options)
        return json.loads(result.out) if result.status != 3 else None

    def test_a_plain_stream_without_its_first_8_bytes_keeps_all_the_rest(self):
        made = recorded()[8:]
        report = self.recover(made)
        self.assertEqual((report["form"]["root"], report["kept"], report["lost"]), (64, len(made) - 8, 8))
        self.assertNotIn(" 0    hostName", tav("tree", self.folder / "y.tav").out)

    def test_without_the_first_8_bytes_the_guess_keeps_as_many_nodes_as_the_true_form(self):
        for seed in range(STREAMS):
            rng = random.Random(seed)
            form, made = stream(rng)
            made = made[8:]
            true = self.recover(made, *form.options())
            with self.subTest(seed=seed, form=form.options()):
                if true is not None:
                    self.assertGreaterEqual(self.recover(made)["nodes"], true["nodes"])

    def test_the_form_that_was_tried_as_well_is_named_with_what_it_keeps(self):
        made = recorded()[8:]
        report = self.recover(made)
        other = report["otherForm"]
        self.assertEqual((other["byteOrder"], other["root"]), (f"{Form().order}-endian", 32))
        self.assertLess(other["nodes"], report["nodes"])
        text = tav("recover", self.folder / "x.tav", "-o", self.folder / "y.tav", "--force").out
        kept = f"{other['nodes']} nodes and {other['kept']} bytes would be kept"
        self.assertIn(f"the form is a guess: read as {Form().order}-endian, 32-bit root header, not padded, {kept}", text)

    def test_what_info_calls_ambiguous_is_a_guess_to_check_and_to_recover(self):
        doubts = 0
        for seed in range(STREAMS):
            rng = random.Random(seed)
            _, made = stream(rng)
            path = self.folder / "x.tav"
            path.write_bytes(cut(rng, made))
            doubt = "ambiguous" in tav("info", path).out
            doubts += doubt
            with self.subTest(seed=seed):
                self.assertEqual(json.loads(tav("check", path, "--json").out)["ambiguous"], doubt)
                if doubt:
                    told = tav("recover", path, "-o", self.folder / "y.tav", "--force").out
                    self.assertIn("the form is a guess", told)
        if STREAMS >= 100:
            self.assertGreater(doubts, 0)

    def test_where_the_form_is_given_no_other_is_tried(self):
        made = recorded()[8:]
        self.assertNotIn("otherForm", self.recover(made, *Form().options()))

    def test_damage_far_behind_a_sound_start_leaves_no_doubt(self):
        made = bytearray(recorded())
        made[len(made) // 2:len(made) // 2 + 20] = b"\xff" * 20
        report = self.recover(made)
        self.assertGreater(report["lost"], 0)
        self.assertNotIn("otherForm", report)

    def test_the_guess_is_the_same_each_time(self):
        made = recorded()[8:]
        self.assertEqual(self.recover(made), self.recover(made))


class Unsaid(ToolTest):
    """What is not written is lost, and told."""

    def recover(self, made, form):
        path = self.folder / "x.tav"
        path.write_bytes(made)
        report = json.loads(tav("recover", path, "-o", self.folder / "y.tav", "--force", "--json", *form.options()).out)
        self.assertEqual(report["kept"] + report["lost"], len(made))
        self.assertEqual(tav("check", self.folder / "y.tav", *form.options()).status, 0)
        return report

    def test_open_groups_deeper_than_readers_go_are_lost(self):
        for form in FORMS:
            header = 16 if form.wide else 8
            group = encode(form, Node(NAMED[0], 2 if form.wide else 1, children=[]))
            group[:header // 2] = b"\xff" * (header // 2)
            for depth in (4000, 4001, 4100):
                with self.subTest(form=form.options(), depth=depth):
                    report = self.recover(group * depth, form)
                    self.assertEqual((report["nodes"], report["written"]), (4000, 4000 * header))
                    self.assertEqual(report["kept"], 4000 * header)
                    self.assertEqual([(loss["offset"], loss["length"]) for loss in report["list"]],
                                     [(header * level, header) for level in range(4000, depth)])
                    self.assertTrue(all("more than 4000 deep" in loss["reason"] for loss in report["list"]))

    def nested(self, form, depth, innermost, info):
        node = innermost
        for _ in range(depth):
            node = Node(NAMED[0], 2 if form.wide else 1, children=[node], info=info)
        return node

    def test_closed_groups_deeper_than_readers_go_are_lost_and_their_nodes_are_not(self):
        for info in (0, EYE_SIZE):
            form = Form()
            made = flat(form, self.nested(form, 4010, Node(NAMED[1], 57, bytes(range(8))), info))
            with self.subTest(info=info):
                report = self.recover(made, form)
                self.assertEqual((report["nodes"], report["lost"]), (4001, 10 * (16 + (32 if info else 0))))
                self.assertEqual(report["groupsClosed"], 0)

    def test_a_group_of_other_headers_deeper_than_readers_go_is_lost_whole(self):
        form = Form()
        narrow = Node(NAMED[2], 1, children=[Node(NAMED[1], 57, bytes(range(8)))])
        report = self.recover(flat(form, self.nested(form, 4000, narrow, 0)), form)
        self.assertEqual((report["nodes"], report["lost"]), (4000, 16 + 16))

    def test_an_end_element_whose_group_began_before_the_file_is_told(self):
        for kind in (1, 2):
            form = Form()
            children = [Node(NAMED[1], 57, bytes(range(8))), Node(NAMED[2], 55, b"last")]
            made = encode(form, Node(NAMED[0], kind, children=children, info=EYE_SIZE))[16:]
            with self.subTest(kind=kind):
                report = self.recover(made, form)
                self.assertEqual(report["nodes"], 2)
                self.assertIn("an end element whose group began 16 bytes before the file", report["list"][-1]["reason"])


def flat(form, root):
    """As encode, of one group with a 64-bit header in another, deeper than Python calls go."""
    groups = [root]
    while groups[-1].children[0].is_group:
        groups.append(groups[-1].children[0])
    made = encode(form, groups.pop())
    for group in reversed(groups):
        end = b""
        if group.eye:
            pair = EYE.to_bytes(8, form.order) + (len(made) + 32).to_bytes(8, form.order)
            end = encode(form, Node(END, BINARY, pair))
        size = (len(made) + len(end)).to_bytes(8, form.order)
        made = bytearray(size) + encode(form, Node(group.elm, 2, children=[]))[8:] + made + end
        made[8:12] = group.info.to_bytes(4, form.order)
    return made


if __name__ == "__main__":
    unittest.main()
