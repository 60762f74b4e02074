"""The recipe for Conan 2, which builds the checkout that it lies in: conan create packaging/conan"""

import os
import re

from conan import ConanFile
from conan.tools.build import check_min_cppstd
from conan.tools.cmake import CMake, CMakeToolchain, cmake_layout
from conan.tools.files import copy, load


class TavConan(ConanFile):
    name = "tav"
    description = "Hierarchical, self-describing binary streams: built, stored, walked, validated and printed"
    license = "MIT"
    topics = ("serialization", "binary", "streams")
    settings = "os", "arch", "compiler", "build_type"
    options = {"shared": [True, False]}
    default_options = {"shared": True}

    def set_version(self):
        lists = load(self, os.path.join(self.recipe_folder, "..", "..", "CMakeLists.txt"))
        self.version = re.search(r"^ *VERSION ([0-9.]+)$", lists, re.MULTILINE).group(1)

    def export_sources(self):
        root = os.path.join(self.recipe_folder, "..", "..")
        for pattern in ("CMakeLists.txt", "LICENSE", "*.cmake", "*.in", "*.map", "*.h", "*.hpp", "*.cppm", "*.def", "*.cpp"):
            copy(self, pattern, src=root, dst=self.export_sources_folder, excludes=("build/*", "tests/*", "bench/*", "fuzz/*"))

    def layout(self):
        cmake_layout(self)

    def validate(self):
        check_min_cppstd(self, 20)

    def generate(self):
        toolchain = CMakeToolchain(self)
        for part in ("TESTS", "TOOLS", "EXAMPLES"):
            toolchain.variables[f"TAV_BUILD_{part}"] = False
        toolchain.variables["TAV_INSTALL"] = True
        toolchain.variables["TAV_WERROR"] = False
        toolchain.generate()

    def build(self):
        cmake = CMake(self)
        cmake.configure()
        cmake.build()

    def package(self):
        copy(self, "LICENSE", src=self.source_folder, dst=os.path.join(self.package_folder, "licenses"))
        CMake(self).install()

    def package_info(self):
        self.cpp_info.set_property("cmake_find_mode", "none")
        self.cpp_info.builddirs = [os.path.join("lib", "cmake", "tav")]
