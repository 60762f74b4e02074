#!/usr/bin/env python3
"""Adds what fuzz/run.sh printed to the sums in docs/fuzzing.md.

    fuzz/run.sh SECONDS | fuzz/tally.py [RECORD]

A target's sum begins anew with a finding. What is read is printed again, so that nothing is lost to the eye.
"""
import datetime
import pathlib
import re
import sys

RECORD = pathlib.Path(__file__).resolve().parents[1] / "docs" / "fuzzing.md"
RAN = re.compile(r"(\w+): (\d+) executions, (\d+) s, cov: (\d+) ft: (\d+) corp: \S+, no finding")
FOUND = re.compile(r"(\w+): FOUND, ")
ROW = re.compile(r"\| (\w+) \| ([\d,]+) \| ([\d,]+) \| ([\d,]+) \| ([\d,]+) \| ([\d-]+) \|")


def number(text):
    return int(text.replace(",", ""))


def added(row, line, today):
    """A target's row, by what a line says of it: seconds, executions, edges, features, day."""
    seconds, executions, edges, features, _ = row
    if match := RAN.match(line):
        return (seconds + int(match[3]), executions + int(match[2]), max(edges, int(match[4])),
                max(features, int(match[5])), today)
    return 0, 0, edges, features, today


def main():
    record = pathlib.Path(sys.argv[1]) if len(sys.argv) > 1 else RECORD
    text = record.read_text()
    rows = {match[1]: (*map(number, match.groups()[1:5]), match[6]) for match in ROW.finditer(text)}
    today = datetime.datetime.now(datetime.timezone.utc).date().isoformat()
    for line in sys.stdin:
        print(line, end="", flush=True)
        if match := RAN.match(line) or FOUND.match(line):
            rows[match[1]] = added(rows.get(match[1], (0, 0, 0, 0, "")), line, today)
    table = "".join(f"| {target} | {seconds:,} | {executions:,} | {edges:,} | {features:,} | {day} |\n"
                    for target, (seconds, executions, edges, features, day) in sorted(rows.items()))
    head = text[:text.index("| --- |")]
    record.write_text(head + "| --- | ---: | ---: | ---: | ---: | --- |\n" + table)


if __name__ == "__main__":
    main()
