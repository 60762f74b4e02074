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
COMPILERS = "<!-- compilers: written by ./bench.sh -->", "<!-- end of the compilers -->"
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


def faster(floor, must, aim):
    """Goals given as rates."""
    return floor / must, floor / aim


GIB = 1 << 30
RING_ELEMENTS = GIB / 40  # of W7
# Where entries of one kind of work have goals of their own: must and aim.
ENTRY_GOALS = {
    "W1/layer": (2.2, 1.6), "W1/layer_growing": (3.0, 2.4), "W1/tavAddElement": (3.9, 3.4),
    "W1/tavAddElement_kept_descriptor": (4.0, 3.4), "W1/tavAddElement_zeroed_descriptor": (4.0, 3.4),
    "W1/tavAddElement_initialized_descriptor": (4.0, 3.4),
    "W2/tavGetNextChild": (2.2, 1.9), "W2/layer_children": (1.5, 1.2), "W2/layer_descendants": (1.5, 1.2),
    "W3/layer_path_text": (2.0, 1.5), "W3/layer_index": (0.2, 0.12),
}
WORKS = [
    Work("W1", "encode", "floor", (3.9, 3.4)),
    Work("W2", "walk and sum", "floor", (2.2, 1.9)),
    Work("W3", "path look-up", "floor", (1.7, 1.5), "ns a look-up"),
    Work("W4file", "the whole tree as text, to a stream", "floor_to_chars_xml", (1.5, 0.9)),
    Work("W5", "validate", "floor", (3.2, 2.0)),
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
            must, aim = ENTRY_GOALS.get(f"{work.name}/{row.entry}", work.goal)
            lines.append([f"{work.name} {work.title}", f"`{row.entry}`", f"{row.value:.2f} {work.unit}",
                          f"{row.ratio:.2f}", f"{must:.2f}", f"{aim:.2f}", to_peer, verdict(row.ratio, (must, aim))])
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


def way_goals(result):
    """What a way may take beside the block, the memory or the own page of the same run."""
    times = result["times"]
    lines = []
    for work, base, plain, ways in [("W9write", "layer_block", "pwrite_1MiB", ("layer_growing", "layer_file")),
                                    ("W9read", "layer_memory", "pread_1MiB", ("layer_file",))]:
        for size in ("1MB", "25MB"):
            taken = {entry: times.get(f"{work}_{size}/{entry}", {}).get("item_ns") for entry in (base, plain, *ways)}
            for way in ways:
                if None in taken.values():
                    continue
                most = 1.5 * taken[base] if way == "layer_growing" else taken[base] + 1.5 * taken[plain]
                rule = f"1.5 `{base}`" if way == "layer_growing" else f"`{base}` + 1.5 `{plain}`"
                lines.append([f"{work}_{size}", f"`{way}`", f"{taken[way]:.2f}", f"{most:.2f}", rule,
                              "must met" if taken[way] <= most else "missed"])
    for work, base in [("W7write", "pread_pwrite_1MiB_40B_in_place"), ("W7read", "pread_1MiB_40B_in_place")]:
        own = times.get(f"{work}/{base}")
        for name, taken in times.items():
            if own is not None and name.startswith(f"{work}/layer"):
                value, most = taken["pass_ns"] / RING_ELEMENTS, 1.3 * own["pass_ns"] / RING_ELEMENTS
                lines.append([work, f"`{name.split('/')[1]}`", f"{value:.2f}", f"{most:.2f}", f"1.3 `{base}`",
                              "must met" if value <= most else "missed"])
    return table(["work", " entry", "ns a leaf", "must", " which is", " goal"], lines) if lines else []


def processor_table(result):
    lines = []
    for name, taken in result["processors"]["ways"].items():
        if "ms_a_gb" in taken:
            lines.append([f"`{name}`", f"{taken['ms']:.2f}", "", "", f"{taken['ms_a_gb']:.2f} ms a GB, {taken['parts']} parts",
                          "must met" if taken["ms_a_gb"] < 10 else "missed"])
        else:
            lines.append([f"`{name}`", f"{taken['one_ms']:.1f}", f"{taken['two_ms']:.1f}", f"{taken['faster']:.2f}",
                          f"work in all {taken['work']:.3f} times as much",
                          "must met" if taken["faster"] >= 1.7 else "missed"])
    return table([f"{result['processors']['mebibytes']} MiB", "one thread, ms", "two, ms", "times as fast", " beside", " goal"], lines)


def compiler_figures(compilers):
    """Each variant's entries as ratios to its own floor."""
    names = list(compilers["times"])
    entries = sorted({entry for times in compilers["times"].values() for entry in times})
    lines = []
    for entry in entries:
        cells = []
        for name in names:
            times = compilers["times"][name]
            floor = times.get(entry.split("/")[0] + "/floor")
            taken = times.get(entry)
            if taken is None:
                cells.append("")
            elif entry.endswith("/floor") or floor is None:
                cells.append(f"{taken['item_ns']:.2f} ns")
            else:
                cells.append(f"{taken['item_ns'] / floor['item_ns']:.2f}")
        lines.append([f"`{entry}`", *cells])
    return [*measured_on(compilers), "", *table(["entry", *names], lines)]


def measured_on(result):
    machine = result["machine"]
    note = ["", "A quick run: the times mean little."] if result["quick"] else []
    return [f"Measured on: {machine['cpu']}, {machine['cores']} cores, {machine['compiler']}.", *note]


def figures(result):
    files = result["files"]
    return [*measured_on(result), "", "### Goals", "", *goal_table(result), "",
            "### Beside the same work done another way (W7, W9)", "", *way_goals(result), "",
            "### One processor and two (W10)", "", *processor_table(result), "",
            f"### A file of {files['mebibytes']} MiB", "", *table(files["head"], files["rows"]), "", "### Beside the goals", "",
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
    parts += [(COMPILERS, compiler_figures(result["compilers"]))] if "compilers" in result else []
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
