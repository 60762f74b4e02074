"""The programs in docs/python.md do what they say."""
from __future__ import annotations

import importlib.util
import re

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


def test_every_public_name_has_a_docstring():
    for name in tav.__all__:
        if name != "__version__":
            assert getattr(tav, name).__doc__, name
    for kind in (tav.Reader, tav.Node, tav.Writer, tav.Group):
        for name, value in vars(kind).items():
            assert name.startswith("_") or value.__doc__, f"{kind.__name__}.{name}"
