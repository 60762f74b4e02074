"""Streams that tests read, and the program that reads and writes them, too."""
from __future__ import annotations

import json
import os
import pathlib
import subprocess

import tav

ROOT = pathlib.Path(__file__).resolve().parents[2]
TOOL = os.environ.get("TAV_TOOL", str(ROOT / "build" / "release" / "tools" / "tav"))

FORMS = [{"byte_order": order, "root": root, "align": align}
         for order in ("little", "big") for root in (32, 64) for align in (False, True)]


def snapshot(hosts: int = 3, **form: object) -> bytes:
    """Some hosts with names and numbers."""
    writer = tav.Writer(**form)  # type: ignore[arg-type]
    with writer:
        with writer.group("system") as system:
            for i in range(hosts):
                with system.group("host") as host:
                    host.add("hostName", f"host{i}")
                    host.add("cpuOnline", i + 1)
    return writer.bytes()


def program(*arguments: str, status: int = 0, stdin: bytes = b"") -> bytes:
    """What the program prints."""
    done = subprocess.run([TOOL, *arguments], input=stdin, capture_output=True, check=False)
    assert done.returncode == status, done.stderr
    return done.stdout


def program_nodes(path: str | os.PathLike[str], *options: str) -> list[dict[str, object]]:
    """The nodes of a file, as the program tells them: no end elements, no other parts."""
    lines = program("json", str(path), "--lines", *options).decode().split("\n")  # of which texts have others, too
    nodes = [json.loads(line) for line in lines[1:] if line]
    return [node for node in nodes if node.get("id", 65000) < 65000]


def all_nodes(reader: tav.Reader) -> list[tav.Node]:
    """All nodes by iterating, in stream order."""
    found: list[tav.Node] = []

    def walk(node: tav.Node) -> None:
        found.append(node)
        for child in node:
            walk(child)

    for root in reader:
        walk(root)
    return found
