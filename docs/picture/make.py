#!/usr/bin/env python3
"""Makes docs/picture/session.svg, the picture of the README: a session with the program, as it answers.

    docs/picture/make.py TAV        TAV: the program, such as build/release/tools/tav
"""

import json
import os
import pathlib
import re
import subprocess
import sys
import tempfile

from rich.console import Console
from rich.text import Text

HERE = pathlib.Path(__file__).resolve().parent
COMMANDS = [
    "tav tree day.tav",
    "tav table day.tav --each /system --col time=timestamp --col load=host/cpu/cpuTotalUsage",
    "tav check damaged.tav",
    "tav recover damaged.tav -o whole.tav",
]


def node(element, kind, **more):
    return {"element": element, "header": 64, "type": kind, **more}


def system(second, load):
    eye = {"eyeSize": True}
    cpu = [node("cpuOnline", "Uint32", value=8), node("cpuTotalUsage", "Uint32", value=load)]
    host = [node("hostName", "ASCII String", value="ada"), node("cpu", "group64", children=cpu, **eye)]
    stamp = node("timestamp", "UTC Timestamp", value=f"2026-11-22T12:00:{second:02}Z")
    return node("system", "group64", children=[stamp, node("host", "group64", children=host, **eye)], **eye)


def session(tav, folder):
    """What a terminal shows, with its colours."""
    document = {"tav": 1, "nodes": [system(5 * i, load) for i, load in enumerate((12, 57))]}
    (folder / "day.json").write_text(json.dumps(document))
    search = {**os.environ, "PATH": f"{tav.parent}:{os.environ['PATH']}", "TERM": "xterm-256color"}
    search.pop("NO_COLOR", None)

    def run(command):
        return subprocess.run(command, shell=True, cwd=folder, env=search, text=True, stdout=subprocess.PIPE,
                              stderr=subprocess.STDOUT, check=False)

    made = run("tav build day.json -o day.tav")
    if made.returncode != 0:
        sys.exit(made.stdout)
    stream = bytearray((folder / "day.tav").read_bytes())
    stream[len(stream) // 2:len(stream) // 2 + 24] = b"#" * 24
    (folder / "damaged.tav").write_bytes(stream)
    for command in COMMANDS:
        yield f"\x1b[1m$ {command}\x1b[0m"
        coloured = command + (" --color always" if command.startswith("tav tree") else "")
        yield run(coloured).stdout.rstrip("\n")


def main():
    tav = pathlib.Path(sys.argv[1]).resolve()
    console = Console(record=True, width=112, force_terminal=True, color_system="256", file=open(os.devnull, "w"))
    with tempfile.TemporaryDirectory() as folder:
        for text in session(tav, pathlib.Path(folder)):
            console.print(Text.from_ansi(text))
    svg = re.sub(r"<!--.*?-->", "", console.export_svg(title="tav", unique_id="session"), flags=re.DOTALL)
    # Nothing is loaded from elsewhere: the reader's own fixed-width font will do.
    svg = re.sub(r"@font-face \{.*?\}\s*", "", svg, flags=re.DOTALL).replace("Fira Code, monospace", "monospace")
    (HERE / "session.svg").write_text(svg, encoding="utf-8")
    return 0


if __name__ == "__main__":
    sys.exit(main())
