"""Builds the compiled part of the package by the project's CMake, with its libraries inside."""
import os
import pathlib
import re
import shutil
import subprocess
import sys

from setuptools import Extension, setup
from setuptools.command.build_ext import build_ext

ROOT = pathlib.Path(__file__).resolve().parent.parent


def version() -> str:
    text = (ROOT / "CMakeLists.txt").read_text(encoding="utf-8")
    return re.search(r"^ *VERSION ([0-9.]+)$", text, re.MULTILINE)[1]


class BuildByCMake(build_ext):
    def build_extension(self, ext: Extension) -> None:
        build = ROOT / "build" / "wheel"
        options = {"CMAKE_BUILD_TYPE": "Release", "BUILD_SHARED_LIBS": "OFF", "TAV_BUILD_PYTHON": "ON",
                   "TAV_BUILD_TESTS": "OFF", "TAV_BUILD_TOOLS": "OFF", "TAV_BUILD_EXAMPLES": "OFF", "TAV_INSTALL": "OFF",
                   "Python3_EXECUTABLE": sys.executable,
                   "CMAKE_MODULE_LINKER_FLAGS": "-static-libstdc++ -static-libgcc -s"}
        given = [f"-D{name}={value}" for name, value in options.items()]
        subprocess.run(["cmake", "-S", str(ROOT), "-B", str(build), *given], check=True)
        jobs = str(self.parallel or os.cpu_count() or 1)
        subprocess.run(["cmake", "--build", str(build), "--target", "tav_python", "--parallel", jobs], check=True)
        made = build / "python" / self.get_ext_filename(ext.name)
        target = pathlib.Path(self.get_ext_fullpath(ext.name))
        target.parent.mkdir(parents=True, exist_ok=True)
        shutil.copyfile(made, target)


setup(version=version(), ext_modules=[Extension("tav._tav", [])], cmdclass={"build_ext": BuildByCMake})
