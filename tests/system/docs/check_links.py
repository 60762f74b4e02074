#!/usr/bin/env python3
"""Every link of the documents leads to a file, and to a heading in it where it names one.

  check_links.py FOLDER        the project's root
"""

import pathlib
import re
import sys

LINK = re.compile(r"\[[^\]]*\]\(([^)\s]+)\)")
FENCE = re.compile(r"^```.*?^```", re.MULTILINE | re.DOTALL)


def anchors(page):
    """The anchors of a page's headings, as they are made from headings: lower case, blanks to hyphens."""
    text = FENCE.sub("", page.read_text(encoding="utf-8"))
    headings = re.findall(r"^#+ +(.*)$", text, re.MULTILINE)
    return {re.sub(r"[^\w\- ]", "", heading.lower()).replace(" ", "-") for heading in headings}


def broken(page):
    """The links of a page that lead nowhere."""
    text = FENCE.sub("", page.read_text(encoding="utf-8"))
    for target in LINK.findall(text):
        if re.match(r"[a-z]+:", target):
            continue
        path, _, anchor = target.partition("#")
        there = (page.parent / path).resolve() if path else page
        if not there.exists():
            yield target
        elif anchor and anchor not in anchors(there):
            yield target


def main():
    root = pathlib.Path(sys.argv[1]).resolve()
    pages = [page for page in [*root.glob("*.md"), *root.glob("docs/**/*.md")] if page.is_file()]
    failures = [f"{page.relative_to(root)}: {target}" for page in pages for target in broken(page)]
    print(*failures, sep="\n", end="\n" if failures else "")
    links = sum(len(LINK.findall(page.read_text(encoding="utf-8"))) for page in pages)
    print(f"{len(pages)} pages, {links} links, {len(failures)} broken")
    return 1 if failures or links == 0 else 0


if __name__ == "__main__":
    sys.exit(main())
