#!/usr/bin/env python3
"""Makes an extension of a library: puts the footer behind it by which DuckDB knows what it loads.

    footer.py LIBRARY EXTENSION --platform linux_amd64 --version v0.1.0

Behind the library stands a custom section of WebAssembly, which other readers do not look at, with 512 bytes in it: eight
fields of 32 bytes, the last one first, and 256 bytes for a signature, which are zeros here.
"""
import argparse
import pathlib

API = "v1.2.0"  # of the C interface: the least that an engine has to have
FIELD = 32
SIGNATURE = 256


def field(text):
    data = text.encode("ascii")
    if len(data) > FIELD:
        raise SystemExit(f"footer.py: '{text}' is longer than {FIELD} bytes")
    return data.ljust(FIELD, b"\0")


def footer(platform, version):
    """The section: its name, the length of what follows, the fields from the eighth to the first, the signature."""
    name = b"duckdb_signature"
    section = bytes([0, 0x93, 0x04, len(name)]) + name + bytes([0x80, 0x04])
    fields = ["4", platform, API, version, "C_STRUCT", "", "", ""]
    return section + b"".join(field(text) for text in reversed(fields)) + bytes(SIGNATURE)


def main():
    parser = argparse.ArgumentParser()
    parser.add_argument("library", type=pathlib.Path)
    parser.add_argument("extension", type=pathlib.Path)
    parser.add_argument("--platform", required=True)
    parser.add_argument("--version", required=True)
    given = parser.parse_args()
    given.extension.write_bytes(given.library.read_bytes() + footer(given.platform, given.version))


if __name__ == "__main__":
    main()
