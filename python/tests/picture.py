#!/usr/bin/python3
"""Makes the picture in docs/python.md, by the programs that stand there.

    PYTHONPATH=build/release/python python/tests/picture.py [OUT]        default: docs/python.svg
"""
from __future__ import annotations

import os
import pathlib
import re
import shutil
import sys
import tempfile

import matplotlib

PAGE = pathlib.Path(__file__).resolve().parents[2] / "docs" / "python.md"


def main() -> None:
    out = pathlib.Path(sys.argv[1] if len(sys.argv) > 1 else PAGE.with_suffix(".svg")).resolve()
    section = PAGE.read_text(encoding="utf-8").split("## Ten lines to a plot")[1].split("\n## ")[0]
    blocks = re.findall(r"^```python.*\n((?:.*\n)*?)```$", section, re.MULTILINE)
    matplotlib.rcParams["svg.hashsalt"] = "tav"  # the same picture gets the same names inside
    os.environ["SOURCE_DATE_EPOCH"] = "0"
    with tempfile.TemporaryDirectory() as folder:
        os.chdir(folder)
        names: dict[str, object] = {}
        for block in blocks:
            exec(compile(block, str(PAGE), "exec"), names)
        shutil.move("cpus.svg", out)
        os.chdir("/")


if __name__ == "__main__":
    main()
