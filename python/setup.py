"""Builds the compiled part of the package by the project's CMake, with its libraries inside.

In the repository the sources are one folder up; an sdist has them beside this file. CMAKE_ARGS in the environment are
further arguments for CMake.
"""
import os
import pathlib
import re
import shlex
import shutil
import subprocess
import sys

from setuptools import Extension, setup
from setuptools.command.build_ext import build_ext
from setuptools.command.sdist import sdist

HERE = pathlib.Path(__file__).resolve().parent
INSIDE = HERE / "source"  # of an sdist
ROOT = INSIDE if INSIDE.is_dir() else HERE.parent

# What the compiled part is built of, in the repository.
PARTS = ["CMakeLists.txt", "LICENSE", "api", "cmake", "core", "dictionary", "format", "include", "inspect", "kor",
         "layer", "storage", "trace", "tools/host", "python/CMakeLists.txt", "python/src"]


def version() -> str:
    text = (ROOT / "CMakeLists.txt").read_text(encoding="utf-8")
    return re.search(r"^ *VERSION ([0-9.]+)$", text, re.MULTILINE)[1]


class BuildByCMake(build_ext):
    def build_extension(self, ext: Extension) -> None:
        build = ROOT / "build" / "wheel"
        options = {"CMAKE_BUILD_TYPE": "Release", "BUILD_SHARED_LIBS": "OFF", "TAV_BUILD_PYTHON": "ON",
                   "TAV_BUILD_TESTS": "OFF", "TAV_BUILD_TOOLS": "OFF", "TAV_BUILD_EXAMPLES": "OFF", "TAV_INSTALL": "OFF",
                   "TAV_WERROR": "OFF",  # of compilers that nobody has tried
                   "Python3_EXECUTABLE": sys.executable,
                   "CMAKE_MODULE_LINKER_FLAGS": "-static-libstdc++ -static-libgcc -s"}
        given = [f"-D{name}={value}" for name, value in options.items()]
        given += shlex.split(os.environ.get("CMAKE_ARGS", ""))
        if shutil.which("ninja"):
            given += ["-G", "Ninja"]
        subprocess.run(["cmake", "-S", str(ROOT), "-B", str(build), *given], check=True)
        jobs = str(self.parallel or os.cpu_count() or 1)
        subprocess.run(["cmake", "--build", str(build), "--target", "tav_python", "--parallel", jobs], check=True)
        made = build / "python" / self.get_ext_filename(ext.name)
        target = pathlib.Path(self.get_ext_fullpath(ext.name))
        target.parent.mkdir(parents=True, exist_ok=True)
        shutil.copyfile(made, target)


class WithSources(sdist):
    def make_release_tree(self, base_dir: str, files: list) -> None:
        super().make_release_tree(base_dir, files)
        for part in PARTS:
            source, target = ROOT / part, pathlib.Path(base_dir) / "source" / part
            target.parent.mkdir(parents=True, exist_ok=True)
            if source.is_dir():
                shutil.copytree(source, target, ignore=shutil.ignore_patterns("__pycache__"))
            else:
                shutil.copyfile(source, target)
        shutil.copyfile(ROOT / "LICENSE", pathlib.Path(base_dir) / "LICENSE")  # from where wheels have it


setup(version=version(), ext_modules=[Extension("tav._tav", [])],
      cmdclass={"build_ext": BuildByCMake, "sdist": WithSources})
