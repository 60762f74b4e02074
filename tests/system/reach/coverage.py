#!/usr/bin/env python3
"""Tells what the tests reach, folder by folder, from gcovr's JSON, and compares what they do not with a document.

    tests/system/reach/coverage.py COVERAGE.json DOCUMENT.md

In the document, each line of the rooms that is not reached stands in a table row: | `file` | `code` | reason |.
"""
import collections
import json
import pathlib
import re
import sys

LEAST_LINES = 98.0
LEAST_BRANCHES = 90.0
# The installed headers are templates: each type that a test uses makes all branches and many lines of them anew, of
# which it takes its own. So only their lines are held, and only in total.
HEADERS = "include"
# Some of the inspection library is reached by the program's tests alone, which are not run here: its lines are not named.
INSPECT = "inspect"
ROOT = pathlib.Path(__file__).resolve().parents[3]


def percent(reached, all_of_them):
    return 100.0 * reached / all_of_them if all_of_them else 100.0


def totals_of(file):
    """The names under which a file is counted: its room and all rooms, or its folder of headers and all headers."""
    room = file.split("/")[0]
    if room == HEADERS:
        return HEADERS, file.rsplit("/", 1)[0]
    return (room,) if room == INSPECT else (room, "rooms")


def limits_of(name):
    """The least percents of lines and of branches; folders of headers are only printed."""
    if name.startswith(HEADERS):
        return LEAST_LINES if name == HEADERS else 0, 0
    return LEAST_LINES, LEAST_BRANCHES


def count(files):
    """Lines and branches of each folder: [lines reached, lines, branches reached, branches]."""
    totals = collections.defaultdict(lambda: [0, 0, 0, 0])
    for file in files:
        for line in file["lines"]:
            if line.get("gcovr/noncode"):
                continue
            for name in totals_of(file["file"]):
                total = totals[name]
                total[0] += line["count"] > 0
                total[1] += 1
                total[2] += sum(branch["count"] > 0 for branch in line["branches"])
                total[3] += len(line["branches"])
    return totals


def unreached(files):
    """(file, code) of the rooms' lines that were never run, with their numbers."""
    found = {}
    for file in files:
        if file["file"].split("/")[0] in (HEADERS, INSPECT):
            continue
        text = (ROOT / file["file"]).read_text().split("\n")
        for line in file["lines"]:
            if line["count"] == 0 and not line.get("gcovr/noncode"):
                code = " ".join(text[line["line_number"] - 1].split())
                found.setdefault((file["file"], code), []).append(line["line_number"])
    return found


def told(document):
    """(file, code) of the document's rows."""
    rows = re.findall(r"^\| `([^`]+)` \| `([^`]+)` \| [^|]*\w[^|]* \|$", document.replace("\\|", "\v"), flags=re.M)
    return {(file, " ".join(code.replace("\v", "|").split())) for file, code in rows}


def main():
    files = json.loads(pathlib.Path(sys.argv[1]).read_text())["files"]
    totals = count(files)
    print(f"{'folder':19} {'lines':>7} {'reached':>8} {'branches':>9} {'reached':>8}")
    for name in sorted(totals, key=lambda one: (one.startswith(HEADERS), one == "rooms", one)):
        lines_reached, lines, branches_reached, branches = totals[name]
        print(f"{name:19} {lines:7} {percent(lines_reached, lines):7.2f}% {branches:9} "
              f"{percent(branches_reached, branches):7.2f}%")
    found = unreached(files)
    rows = told(pathlib.Path(sys.argv[2]).read_text())
    good = True
    for (file, code), numbers in sorted(found.items()):
        if (file, code) not in rows:
            print(f"{file}:{','.join(map(str, numbers))}: not reached, and {sys.argv[2]} does not say why: {code}")
            good = False
    for file, code in sorted(rows - found.keys()):
        print(f"{sys.argv[2]}: {file} is said not to be reached at, but is: {code}")
        good = False
    for name, total in totals.items():
        lines, branches = limits_of(name)
        if percent(total[0], total[1]) < lines or percent(total[2], total[3]) < branches:
            print(f"{name}: below {lines:g} % of lines or {branches:g} % of branches")
            good = False
    return 0 if good else 1


if __name__ == "__main__":
    sys.exit(main())
