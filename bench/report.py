#!/usr/bin/env python3
"""Prints what measure.py and program.py found as tables, and puts them into the documents.

    report.py RESULT                       tables to standard output
    report.py RESULT --documents FOLDER    the same, and FOLDER/performance.{md,json,svg}

A ratio is to the floor of the same run, and so are the goals: what is a must and what is aimed at was fixed as times
beside the time of the floor on one machine.
"""
import argparse
import json
import pathlib
from dataclasses import dataclass

FIGURES = "<!-- figures: written by ./bench.sh -->", "<!-- end of the figures -->"
PROGRAM = "<!-- the program: written by ./bench.sh --program -->", "<!-- end of the program -->"


@dataclass(frozen=True)
class Work:
    """One kind of work. A goal is a pair: the ratio to the floor that is a must, and the one that is the aim."""
    name: str
    title: str
    floor: str
    goal: tuple = ()
    unit: str = "ns a leaf"
    pass_bytes: int = 0  # counts in GB/s when not 0


def slower(floor, must, aim):
    """Goals given as times."""
    return must / floor, aim / floor


def faster(floor, must, aim):
    """Goals given as rates."""
    return floor / must, floor / aim


GIB = 1 << 30
WORKS = [
    Work("W1", "encode", "floor", slower(1.16, 5, 3.3)),
    Work("W2", "walk and sum", "floor", slower(1.18, 4.8, 3.5)),
    Work("W3", "path look-up", "floor", slower(132, 300, 160), "ns a look-up"),
    Work("W4file", "the whole tree as text, to a stream", "floor_to_chars_xml", slower(15.6, 26, 12)),
    Work("W5", "validate", "floor", slower(0.84, 4, 2)),
    Work("W6", "scan for the eye catcher, 256 MiB", "both_avx2", faster(33.7, 25, 32), "GB/s", 256 << 20),
    Work("W7write", "write a file of 1 GiB over", "pwrite_1MiB", faster(1, 0.6, 0.9), "GB/s", GIB),
    Work("W7read", "read a file of 1 GiB", "pread_1MiB", faster(1, 0.6, 0.9), "GB/s", GIB),
    Work("W1cold", "encode 1 GiB", "floor"),
    Work("W2cold", "walk and sum 1 GiB", "floor"),
    Work("W5cold", "validate 1 GiB", "floor"),
    Work("W2dom", "walk a tree that was parsed before", "W2/floor"),
    Work("W2table", "a table of all leaves", "W2/tavGetNextChild"),
    Work("W3dom", "path look-up in a tree that was parsed before", "W3/floor", (), "ns a look-up"),
    Work("W4mem", "the whole tree as text, into memory", "floor_to_chars_xml"),
    Work("W6cache", "scan for the eye catcher, 512 KiB", "both_avx2", (), "GB/s", 512 << 10),
    Work("W7new", "write a new file of 1 GiB", "pwrite_1MiB", (), "GB/s", GIB),
    Work("W9write_1MB", "write 48,000 leaves as users do first", "layer_block"),
    Work("W9write_25MB", "write 960,000 leaves as users do first", "layer_block"),
    Work("W9read_1MB", "read 48,000 leaves as users do first", "layer_memory"),
    Work("W9read_25MB", "read 960,000 leaves as users do first", "layer_memory"),
    Work("call", "a single call", "", (), "ns"),
]
# W8: the most that a command of the program may take, as a ratio to `print`.
PROGRAM_GOALS = {"check": 0.35, "tree": 1.5, "json": 1.5, "json --lines": 2, "xml": 1.5, "hex": 4,
                 "diff with itself": 1.5, "recover": 1, "json | build": 4}
LIBRARY = ("tav", "layer", "open_close_", "header_stack_")
FLOORS = ("floor", "both_", "read_bandwidth", "memcpy", "pread_", "pwrite_", "mmap")
# Entries that show something beside the goal's own work.
BESIDE = ("_traced", "tavPrintSubtree_text", "layer_index_made", "tavTable_condition", "tavTable_walker_alone")


def kind(entry):
    """Whether an entry is the library's, a floor, or a peer."""
    if entry.startswith(LIBRARY):
        return "library"
    own_page = "_40B_" in entry and not entry.endswith(("_floor_api", "_floor_api_tuned", "_in_place"))
    return "floor" if entry.startswith(FLOORS) and not own_page else "peer"


@dataclass(frozen=True)
class Row:
    entry: str
    kind: str
    value: float
    ratio: float  # to the floor, in time; 0 without one
    spread: float


def rows(work, times):
    """The entries of a kind of work, the fastest first."""
    floor = times.get(work.floor if "/" in work.floor else f"{work.name}/{work.floor}")
    found = []
    for name, taken in times.items():
        group, entry = name.split("/", 1)
        if group == work.name:
            value = work.pass_bytes / taken["pass_ns"] if work.pass_bytes else taken["item_ns"]
            own = "item_ns" if "item_ns" in taken else "pass_ns"
            found.append((taken[own], Row(entry, kind(entry), value, taken[own] / floor[own] if floor else 0,
                                          taken["spread"])))
    return [row for _, row in sorted(found, key=lambda pair: pair[0])]


def best_peer(entries):
    return next((row for row in entries if row.kind == "peer"), None)


def verdict(ratio, goal):
    must, aim = goal
    if not ratio:
        return "no floor"
    return "aim met" if ratio <= aim else "must met" if ratio <= must else "missed"


def table(head, lines):
    """A Markdown table; all columns but the first hold numbers unless their head begins with a blank."""
    marks = ["---" if i == 0 or column.startswith(" ") else "---:" for i, column in enumerate(head)]
    return ["| " + " | ".join(cells) + " |" for cells in [[column.strip() for column in head], marks, *lines]]


def goal_table(result):
    lines = []
    for work in WORKS:
        entries = rows(work, result["times"])
        peer = best_peer(entries)
        for row in entries:
            if not work.goal or row.kind != "library" or row.entry.endswith(BESIDE):
                continue
            to_peer = f"{row.ratio / peer.ratio:.2f}" if peer and peer.ratio else ""
            must, aim = work.goal
            lines.append([f"{work.name} {work.title}", f"`{row.entry}`", f"{row.value:.2f} {work.unit}",
                          f"{row.ratio:.2f}", f"{must:.2f}", f"{aim:.2f}", to_peer, verdict(row.ratio, work.goal)])
    return table(["work", " entry", "here", "ratio", "must", "aim", "to the best peer", " goal"], lines)


def mib(count):
    return f"{count / (1 << 20):.1f} MiB"


def steepest(counts):
    """How far a doubling of the stream is from doubling the instructions, at the worst."""
    return max(abs(after / before / 2 - 1) for before, after in zip(counts, counts[1:]))


def doublings(count):
    return f"{count} doubling" + ("s" if count != 1 else "")


def limit(value, text, most):
    return [text, "yes" if value <= most else "no"]


def other_table(result):
    memory, start, counts = result["memory"], result["startup"], result["instructions"]
    times = result["times"]
    lines = []
    compiled = result["compile"]
    lines.append(["compiling the README's example with `g++ -c`, processor time", f"{compiled['program_s']:.2f} s",
                  *limit(compiled["program_s"], "1 s", 1)])
    lines.append(["of it `tav.hpp` alone", f"{compiled['header_s']:.2f} s", "", ""])
    lines.append(["the same in lines after the preprocessor", f"{compiled['lines']:,}", "", ""])
    for part, ratio in counts["layer"].items():
        lines.append([f"instructions of the C++ layer, `{part}`, to the plain operations", f"{ratio:.3f}",
                      *limit(ratio, "1.05", 1.05)])
    for part, series in counts["growth"].items():
        worst = steepest(series)
        lines.append([f"growth of `{part}` over {doublings(len(series) - 1)}, instructions: furthest from linear",
                      f"{worst * 100:.2f} %", *limit(worst, "5 %", 0.05)])
    size = result["library"]
    lines.append(["libtav, stripped, with the dictionary", f"{size['libtav.so'] / 1024:.1f} KiB",
                  *limit(size["libtav.so"], "250 KiB", 250 * 1024)])
    lines.append(["libkor, stripped", f"{size['libkor.so'] / 1024:.1f} KiB", "", ""])
    stream = f"{memory['stream_bytes'] / GIB:.2f} GiB"
    for part, title in [("nothing", "a program that does nothing"), ("write", f"writing a file of {stream}"),
                        ("walk", f"walking a file of {stream}"), ("handles_100", "100 handles opened and closed"),
                        ("handles_100000", "100,000 handles opened and closed")]:
        lines.append([f"peak memory: {title}", mib(memory[part]), "", ""])
    for name in sorted(name for name in times if name.endswith("_traced")):
        off = times[name.removesuffix("_traced")]
        lines.append([f"`{name}`: {times[name]['records']:.0f} records a leaf, time to that without a trace",
                      f"{times[name]['pass_ns'] / off['pass_ns']:.1f}", "", ""])
    lines.append(["a program that opens and closes a handle: time beside an empty one",
                  f"{start['opens_ms'] - start['empty_ms']:+.2f} ms", "", ""])
    lines.append(["the same in instructions, dynamic linking included",
                  f"{start['opens_instructions'] - start['empty_instructions']:+,}", "", ""])
    return table(["what", "here", "at the most", " kept"], lines)


def instruction_table(result):
    items = result["instructions"]["items"]
    lines = []
    for part, count in items.items():
        floor = items.get(part.split("/")[0] + "/floor")
        lines.append([f"`{part}`", f"{count:,.1f}", f"{count / floor:.2f}" if floor else ""])
    return table(["entry", "instructions", "ratio to the floor"], lines)


def work_tables(result):
    text = []
    for work in WORKS:
        entries = rows(work, result["times"])
        if entries:
            lines = [[f"**{row.entry}**" if row.kind == "library" else row.entry, row.kind, f"{row.value:.2f}",
                      f"{row.ratio:.2f}" if row.ratio else "", f"{row.spread * 100:.1f} %"] for row in entries]
            text += ["", f"### {work.name}: {work.title}", ""]
            text += table(["entry", " kind", work.unit, "ratio", "spread"], lines)
    return text


def program_figures(program):
    """W8, with ratios to `print`. A command without a goal has none."""
    first = program["times"]["print"]["seconds"]
    lines = []
    for name, taken in program["times"].items():
        ratio, must = taken["seconds"] / first, PROGRAM_GOALS.get(name)
        count = program["instructions"].get(name)
        lines.append([name if " of the " in name else f"`{name}`", f"{taken['seconds']:.3f}", f"{ratio:.2f}",
                      f"{must:.2f}" if must else "", verdict(ratio, (must, 0)) if must else "",
                      f"{taken['spread'] * 100:.1f} %", f"{count:,.0f}" if count is not None else "",
                      mib(taken["peak"])])
    size = program["bytes"]
    about = (f"{program['leaves']:,} leaves, {mib(size['s'])}; as JSON {mib(size['json'])}, as XML {mib(size['xml'])}.")
    left_out = [f"Left out: {name}, since {tool} is not here." for name, tool in program["missing"].items()]
    return [*measured_on(program), *left_out, about, "",
            *table(["command", "seconds", "ratio", "must", " goal", "spread", "instructions a leaf", "peak memory"], lines)]


def measured_on(result):
    machine = result["machine"]
    note = ["", "A quick run: the times mean little."] if result["quick"] else []
    return [f"Measured on: {machine['cpu']}, {machine['cores']} cores, {machine['compiler']}.", *note]


def figures(result):
    return [*measured_on(result), "", "### Goals", "", *goal_table(result), "", "### Beside the goals", "",
            *other_table(result), "", "### Instructions a leaf (W3: a look-up)", "", *instruction_table(result),
            *work_tables(result)]


def with_figures(document, marks, text):
    """The document with what is between the marks replaced."""
    before, begin, rest = document.partition(marks[0])
    _, end, after = rest.partition(marks[1])
    if not begin or not end:
        raise ValueError(f"the document has no place for {marks[0]}")
    return f"{before}{begin}\n\n{text}\n\n{end}{after}"


def main():
    parser = argparse.ArgumentParser()
    parser.add_argument("result", type=pathlib.Path)
    parser.add_argument("--documents", type=pathlib.Path)
    arguments = parser.parse_args()
    result = json.loads(arguments.result.read_text())
    parts = [(FIGURES, figures(result))] if "times" in result else []
    parts += [(PROGRAM, program_figures(result["program"]))] if "program" in result else []
    page, store = (arguments.documents / f"performance.{kind}" if arguments.documents else None for kind in ("md", "json"))
    for marks, lines in parts:
        text = "\n".join(lines)
        print(text)
        if page:
            page.write_text(with_figures(page.read_text(), marks, text))
    if store:
        store.write_text(json.dumps({**json.loads(store.read_text()), **result}, indent=1) + "\n")
    if page and "times" in result:
        import plot  # needs a package that the tables do not
        plot.draw([(work, rows(work, result["times"])) for work in WORKS if work.goal], BESIDE,
                  arguments.documents / "performance.svg")


if __name__ == "__main__":
    main()
