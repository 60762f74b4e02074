#!/usr/bin/env python3
"""Lays the documents out for the site: the README is its first page, and every page is in its list.

    lay_out.py ROOT FOLDER
"""

import pathlib
import re
import shutil
import sys

LINK = re.compile(r"\]\(([^)\s#]+)(#[^)\s]*)?\)")
FENCE = re.compile(r"(^```.*?^```)", re.MULTILINE | re.DOTALL)
ABOUT = ["CONTRIBUTING.md", "CHANGELOG.md", "SECURITY.md"]


def outside_fences(text, change):
    """The text with `change` applied to what is no example."""
    parts = FENCE.split(text)
    return "".join(part if part.startswith("```") else change(part) for part in parts)


def copied(text, place, root, folder):
    """The page's text, with the README's new name; the files that it links to are copied beside it."""

    def link(found):
        target, anchor = found.group(1), found.group(2) or ""
        if re.match(r"[a-z]+:", target):
            return found.group(0)
        there = (root / place).parent / target
        if there.resolve() == (root / "README.md").resolve():
            return f"]({target[:-len('README.md')]}index.md{anchor})"
        if there.is_file() and there.suffix != ".md":
            copy = folder / there.resolve().relative_to(root)
            copy.parent.mkdir(parents=True, exist_ok=True)
            shutil.copyfile(there, copy)
        return found.group(0)

    return outside_fences(text, lambda part: LINK.sub(link, part))


REFERENCE = """# Reference

* <a href="../reference/index.html">The headers of C and C++</a>: every operation, the layer `tav.hpp`, the inspection library, `tav_c.h`.
* [The program](tav.md), and its manual pages by `man tav`.
* [Python](python.md), and `help(tav)`.
"""


def contents(caption, pages):
    return "\n```{toctree}\n:hidden:\n:caption: " + caption + "\n\n" + "\n".join(pages) + "\n```\n"


def main():
    root, folder = pathlib.Path(sys.argv[1]).resolve(), pathlib.Path(sys.argv[2]).resolve()
    pages = [path.relative_to(root) for path in sorted((root / "docs").glob("*.md"))]
    for page in [pathlib.Path("README.md"), *map(pathlib.Path, ABOUT), *pages]:
        text = copied((root / page).read_text(encoding="utf-8"), page, root, folder)
        there = folder / ("index.md" if page.name == "README.md" else page)
        there.parent.mkdir(parents=True, exist_ok=True)
        there.write_text(text, encoding="utf-8")
    (folder / "docs" / "reference.md").write_text(REFERENCE, encoding="utf-8")
    index = folder / "index.md"
    text = index.read_text(encoding="utf-8")
    table = text[text.index("## Where to go"):text.index("## Limits")]
    told = list(dict.fromkeys(re.findall(r"\]\((docs/[a-z0-9_-]+\.md)\)", table)))
    rest = sorted({str(page) for page in pages} - set(told))
    text += contents("Documents", told) + contents("More", ["docs/reference", *rest, *ABOUT])
    index.write_text(text, encoding="utf-8")
    return 0


if __name__ == "__main__":
    sys.exit(main())
