#!/usr/bin/env python3
"""Every link inside the built site leads to a file of it and to an anchor there; no page loads anything from elsewhere;
the search knows words of each page; and nothing in it is only the build's, or names the folder of the build, `source` beside
it, which would make each build another one.

    check_site.py FOLDER
"""

import html.parser
import pathlib
import sys
import urllib.parse

LOADING = {("script", "src"), ("link", "href"), ("img", "src"), ("iframe", "src")}


class Page(html.parser.HTMLParser):
    """The links and anchors of a page."""

    def __init__(self, text):
        super().__init__()
        self.links, self.loaded, self.anchors = [], [], set()
        self.feed(text)

    def handle_starttag(self, tag, attrs):
        values = dict(attrs)
        self.anchors.update(value for name, value in attrs if name in ("id", "name") and value)
        if tag == "a" and values.get("href"):
            self.links.append(values["href"])
        for name, value in attrs:
            if (tag, name) in LOADING and value and "canonical" not in (values.get("rel") or ""):
                self.loaded.append(value)


def failures_of(path, page, pages):
    for target in page.loaded:
        if urllib.parse.urlparse(target).scheme in ("http", "https") or target.startswith("//"):
            yield f"{path}: loads {target}"
    for target in page.links + page.loaded:
        url = urllib.parse.urlparse(target)
        if url.scheme or target.startswith("//"):
            continue
        there = (path.parent / urllib.parse.unquote(url.path)).resolve() if url.path else path
        if not there.exists():
            yield f"{path}: {target} is not there"
        elif url.fragment and there in pages and urllib.parse.unquote(url.fragment) not in pages[there].anchors:
            yield f"{path}: {target} has no such place"


def leftovers(root):
    """What the build left in the site."""
    source = str(root.parent / "source").encode()
    for path in sorted(path for path in root.rglob("*") if path.is_file()):
        name = path.relative_to(root)
        if any(part.startswith(".") and part != ".buildinfo" for part in name.parts):
            yield f"{name} is nothing for readers"
        elif source in path.read_bytes():
            yield f"{name} names the folder that it was built from"


def main():
    root = pathlib.Path(sys.argv[1]).resolve()
    own = [path for path in root.rglob("*.html") if "reference" not in path.relative_to(root).parts[:1]]
    pages = {path: Page(path.read_text(encoding="utf-8")) for path in own if path != root / "tav.html"}
    failures = [line for path, page in pages.items() for line in failures_of(path, page, pages)]
    failures += leftovers(root)
    words = (root / "searchindex.js").read_text(encoding="utf-8")
    failures += [f"the search does not know {name}" for name in ("docs/tav", "docs/producers") if f'"{name}"' not in words]
    print(*failures, sep="\n", end="\n" if failures else "")
    links = sum(len(page.links) for page in pages.values())
    print(f"{len(pages)} pages, {links} links, {len(failures)} failures")
    return 1 if failures or links == 0 else 0


if __name__ == "__main__":
    sys.exit(main())
