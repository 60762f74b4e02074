#!/usr/bin/env python3
"""Takes the C++ and C programs out of Markdown files.

    extract_examples.py OUTPUT_FOLDER FILE.md...

Every fenced block marked `cpp` or `c` has to be a complete program; it is written to OUTPUT_FOLDER under the name of its
page and a running number, and the paths are printed. What is not meant to be compiled is marked `cpp fragment` or
`c fragment`.
"""
import pathlib
import re
import sys

FENCE = re.compile(r"^ {0,3}(?P<fence>`{3,}|~{3,})\s*(?P<info>[^`]*)$")
MAIN = re.compile(r"\bint\s+main\s*\(")


class BadBlock(Exception):
    """A block that is neither a program nor marked as a fragment."""


def blocks(text):
    """Yields (info words, line number of the first line, lines) of each fenced block."""
    fence = None
    for number, line in enumerate(text.splitlines(), start=1):
        match = FENCE.match(line)
        if fence is None:
            if match:
                fence, info, first, lines = match["fence"], match["info"].split(), number + 1, []
        elif match and not match["info"] and match["fence"].startswith(fence):
            yield info, first, lines
            fence = None
        else:
            lines.append(line)
    if fence is not None:
        raise BadBlock(f"{first - 1}: the block is not closed")


def programs(text):
    """Yields (line number, source, suffix) of each complete program."""
    for info, first, lines in blocks(text):
        if not info or info[0] not in ("c", "cpp", "c++", "cxx") or info in (["cpp", "fragment"], ["c", "fragment"]):
            continue
        if info not in (["cpp"], ["c"]):
            raise BadBlock(f"{first - 1}: '{' '.join(info)}' is neither 'cpp' nor 'cpp fragment'")
        source = "\n".join(lines) + "\n"
        if not MAIN.search(source):
            raise BadBlock(f"{first - 1}: a {info[0]} block without main: make it a program, or mark it "
                           f"'{info[0]} fragment'")
        yield first, source, "." + info[0]


def write_if_changed(path, text):
    """Leaves an unchanged file alone, so that nothing is built again for it."""
    if not path.exists() or path.read_text(encoding="utf-8") != text:
        path.write_text(text, encoding="utf-8")


def extract(folder, pages):
    """Writes the programs of all pages and returns their paths."""
    folder.mkdir(parents=True, exist_ok=True)
    written = []
    for page in pages:
        try:
            for count, (line, source, suffix) in enumerate(programs(page.read_text(encoding="utf-8")), start=1):
                path = folder / f"{page.stem}_{count}{suffix}"
                write_if_changed(path, f'#line {line} "{page.name}"\n{source}')
                written.append(path)
        except BadBlock as error:
            raise BadBlock(f"{page}:{error}") from None
    if len(set(written)) != len(written):
        raise BadBlock("two pages have the same name")
    for path in {*folder.glob("*.cpp"), *folder.glob("*.c")} - set(written):
        path.unlink()
    return written


def main(arguments):
    if len(arguments) < 2:
        print(__doc__, file=sys.stderr)
        return 2
    try:
        for path in extract(pathlib.Path(arguments[0]), [pathlib.Path(page) for page in arguments[1:]]):
            print(path)
    except BadBlock as error:
        print(error, file=sys.stderr)
        return 1
    return 0


if __name__ == "__main__":
    sys.exit(main(sys.argv[1:]))
