"""What recover brings back of damaged streams whose form it is not told.

    TAV_TOOL=build/release/tools/tav python3 -B tests/system/tools/damages.py [DAMAGES [FIRST]]

Prints a line for each kind of damage: files; intact nodes; those of them that are due, which oracle.py defines, how many of
these came back and how many are lost; how many of the others came back; files of which nothing came back although
something is intact. Exit status 1 when a node that is due is lost."""
import collections
import multiprocessing
import os
import pathlib
import random
import sys
import tempfile

from oracle import ELEMENTS, Damaged, Oracle
from planted import END, EYE_SIZE, FREE, MARKER, NAMED, SIZES, Encoder, Form, Node, random_form, random_group
from recovering import missing, read_back, recovered

NAMES = [*NAMED, *sorted(ELEMENTS - {END, MARKER})[::20]]
SECTOR, LARGE_SECTOR = 512, 4096
PROCESSES = min(2, os.cpu_count() or 1)


def burst(rng, made):
    start = rng.randrange(len(made))
    end = min(len(made), start + rng.randrange(1, 1024))
    return [(0, start), rng.randbytes(end - start), (end, len(made))]


def zeroed(rng, made, size):
    start = size * rng.randrange((len(made) + size - 1) // size)
    end = min(len(made), start + size)
    return [(0, start), bytes(end - start), (end, len(made))]


def zeroed_sector(rng, made):
    return zeroed(rng, made, SECTOR)


def zeroed_large_sector(rng, made):
    return zeroed(rng, made, LARGE_SECTOR)


def exchanged(made, one, two, size):
    one, two = sorted((one, two))
    return [(0, one), (two, two + size), (one + size, two), (one, one + size), (two + size, len(made))]


def swapped(rng, made):
    one, two = rng.sample(range(1, max(3, len(made) // SECTOR)), 2)
    return exchanged(made, one * SECTOR, two * SECTOR, SECTOR)


def first_swapped(rng, made):
    size = LARGE_SECTOR if rng.random() < 0.2 and len(made) >= 2 * LARGE_SECTOR else SECTOR
    return exchanged(made, 0, size * rng.randrange(1, len(made) // size), size)


def some_bytes(rng):
    return rng.choice((1, 2, 4, 8, 16, rng.randrange(1, 64), rng.randrange(1, 1024)))


def inserted(rng, made):
    at = rng.randrange(len(made))
    return [(0, at), rng.randbytes(some_bytes(rng)), (at, len(made))]


def deleted(rng, made):
    at = rng.randrange(len(made))
    return [(0, at), (min(len(made), at + some_bytes(rng)), len(made))]


def cut(rng, made):
    return [(0, rng.randrange(1, len(made)))]


def garbage_behind(rng, made):
    return [(0, len(made)), rng.randbytes(rng.randrange(1, 1024))]


def bits(rng, made):
    places = sorted(rng.sample(range(len(made)), rng.choice((1, 1, 2, 8))))
    pieces, at = [], 0
    for place in places:
        pieces += [(at, place), bytes([made[place] ^ 1 << rng.randrange(8)])]
        at = place + 1
    return [*pieces, (at, len(made))]


def joined(rng, made, second):
    """The first stream, whole or cut, and the second from its start or from the middle."""
    end = rng.choice((second, rng.randrange(1, second)))
    start = rng.choice((second, rng.randrange(second, len(made))))
    return [(0, end), (start, len(made))]


DAMAGES = (burst, zeroed_sector, zeroed_large_sector, swapped, inserted, deleted, cut, garbage_behind, joined, bits, first_swapped)


def random_root(rng, form, pairs):
    """A root with groups of some habit: one writer makes few types, another many, some leave many texts empty."""
    habit = rng.random()
    if habit < 0.3:
        kinds = list(SIZES)
    elif habit < 0.45:
        kinds = [50, 50, 102, 57]
    else:
        kinds = list(SIZES) + FREE * 2
    root = Node(rng.choice(NAMED), 2 if form.wide and rng.random() < 0.9 else 1, children=[])
    root.info = EYE_SIZE if form.wide and rng.random() < pairs else 0
    inner = form.wide and root.kind == 2
    length, wanted = 0, rng.choice((1500, 4000, 12000, 24000))
    while length < wanted:
        group = random_group(rng, form, inner, depth=rng.randrange(4), pairs=pairs, nodes=rng.choice((6, 20)), kinds=kinds,
                             empty=0.5 if habit > 0.9 else 0)
        root.children.append(group)
        encoder = Encoder(form)
        encoder.put(group, inner)
        length += len(encoder.out)
    for node in root.walk():
        node.elm = rng.choice(NAMES)
    return root


def damaged_stream(number):
    """The stream of this number: its form, its roots, and what is left of it."""
    rng = random.Random(f"damages {number}")
    damage = DAMAGES[number % len(DAMAGES)]
    pairs = (0, 1, 0.5)[number // len(DAMAGES) % 3]
    form = random_form(rng)
    form.wide = form.wide or (pairs == 1 and rng.random() < 0.8)
    encoder = Encoder(form)
    roots = [random_root(rng, form, pairs)]
    encoder.put(roots[0], form.wide)
    if damage is joined:
        second = len(encoder.out)
        roots.append(random_root(rng, form, pairs))
        encoder.put(roots[1], form.wide)
        pieces = joined(rng, encoder.out, second)
    else:
        pieces = damage(rng, encoder.out)
    return damage.__name__, pairs, form, roots, Damaged(encoder.out, pieces)


Verdict = collections.namedtuple("Verdict", "title damage intact due lost others others_back nothing wrong")


def form_of(report):
    form = report["form"]
    return Form(form["byteOrder"] == "big-endian", form["root"] == 64, form["aligned"])


def verdict(number):
    """What comes back of one damaged stream whose form is not given."""
    damage, pairs, form, roots, damaged = damaged_stream(number)
    intact, due = Oracle(form, roots, damaged).judge()
    title = f"{number} {damage} pairs {pairs} {' '.join(form.options())}"
    back, wrong = [], ""
    with tempfile.TemporaryDirectory(prefix="tav-test-") as name:
        try:
            report, saved = recovered(pathlib.Path(name), damaged.bytes, None)
            back = read_back(saved, form_of(report)) if report else []
        except AssertionError as error:
            wrong = str(error)
    lost = missing(due, back)
    ids = {id(node) for node in due}
    others = [node for node in intact if id(node) not in ids]
    others_lost = len(missing(due + others, back)) - len(lost)
    return Verdict(title, damage, len(intact), len(due), [node.offset for node in lost], len(others), len(others) - others_lost,
                   bool(intact) and not back, wrong)


def verdicts(numbers):
    with multiprocessing.Pool(PROCESSES) as pool:
        yield from pool.imap(verdict, numbers, chunksize=8)


def complaint(found):
    """What is to be said of one; nothing when all is well."""
    if found.wrong:
        return f"{found.title}: {found.wrong[:500]}"
    return f"{found.title}: lost {len(found.lost)} of {found.due} that are due, at {found.lost[:5]}" if found.lost else ""


def main(count=2000, first=0):
    rows, bad = {damage.__name__: [0] * 8 for damage in DAMAGES}, False
    for found in verdicts(range(first, first + count)):
        row = (1, found.intact, found.due, found.due - len(found.lost), len(found.lost), found.others, found.others_back, found.nothing)
        rows[found.damage] = [one + two for one, two in zip(rows[found.damage], row)]
        if complaint(found):
            bad = True
            print(complaint(found))
    rows["all"] = [sum(column) for column in zip(*rows.values())]
    print(f"{'damage':20}" + "".join(f"{title:>9}" for title in ("files", "intact", "due", "back", "lost", "others", "back", "nothing")))
    for name, row in rows.items():
        print(f"{name:20}" + "".join(f"{number:9}" for number in row))
    return 1 if bad else 0


if __name__ == "__main__":
    sys.exit(main(*map(int, sys.argv[1:])))
