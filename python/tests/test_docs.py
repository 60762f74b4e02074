"""The programs in docs/python.md do what they say."""
from __future__ import annotations

import importlib.util
import re
import subprocess
import sys

import pytest

import streams
import tav

PAGE = (streams.ROOT / "docs" / "python.md").read_text(encoding="utf-8")
BLOCKS = re.findall(r"^```python *(.*)\n((?:.*\n)*?)```$", PAGE, re.MULTILINE)


def test_the_programs_of_the_page_run_one_after_the_other(tmp_path, monkeypatch):
    monkeypatch.chdir(tmp_path)
    names: dict[str, object] = {"tav": tav}
    assert len(BLOCKS) >= 6
    for module, block in BLOCKS:
        if not module or importlib.util.find_spec(module):
            exec(compile(block, "docs/python.md", "exec"), names)
    assert len(names["times"]) == len(names["cpus"]) == 60 or len(names["cpus"]) >= 60
    assert tav.open("last.tav").load()["system"]["cpuOnline"] == 8 + 59 % 5
    assert tav.check("day.tav") == [] and len(tav.open("day.tav")) == 61
    assert tav.open("day.tav").find("//hostName").value == "bob"


def test_the_picture_of_the_page_is_made_by_its_programs(tmp_path):
    pytest.importorskip("matplotlib")
    made = tmp_path / "made.svg"
    subprocess.run([sys.executable, str(streams.ROOT / "python" / "tests" / "picture.py"), str(made)], check=True)
    there = (streams.ROOT / "docs" / "python.svg").read_text(encoding="utf-8")
    # The line itself; fonts and versions differ between machines.
    steps = [max(re.findall(r' d="(M[^"]*)"', text), key=len).count("L") for text in (made.read_text(), there)]
    assert "<svg" in there and "python.svg" in PAGE and steps[0] == steps[1]


def test_the_notebook_runs_from_top_to_bottom(tmp_path):
    nbformat = pytest.importorskip("nbformat")
    nbclient = pytest.importorskip("nbclient")
    pytest.importorskip("ipykernel")
    pytest.importorskip("matplotlib")
    notebook = nbformat.read(streams.ROOT / "docs" / "python.ipynb", as_version=4)
    nbclient.NotebookClient(notebook, timeout=120, resources={"metadata": {"path": str(tmp_path)}}).execute()
    outputs = [output for cell in notebook.cells if cell.cell_type == "code" for output in cell.outputs]
    shown = "".join(str(output) for output in outputs)
    assert "<details>" in shown and "image/png" in shown and "grace" in shown


def test_every_public_name_has_a_docstring_and_is_in_the_page():
    named = set(re.findall(r"\w+", PAGE))
    for name in tav.__all__:
        if name != "__version__":
            assert getattr(tav, name).__doc__, name
            assert name in named, name
    for kind in (tav.Reader, tav.Node, tav.Writer, tav.Group, tav.Table):
        for name, value in vars(kind).items():
            assert name.startswith("_") or value.__doc__, f"{kind.__name__}.{name}"
            assert name.startswith("_") or name in named, f"{kind.__name__}.{name}"
