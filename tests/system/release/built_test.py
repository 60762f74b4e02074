"""What is built does not depend on where: the libraries and the program name no folder of this machine.

TAV_BUILT has their paths, TAV_FOLDERS those of the sources and the build, each between semicolons.
"""
import os
import pathlib
import re
import subprocess
import unittest

BUILT = [pathlib.Path(path) for path in os.environ["TAV_BUILT"].split(";")]
FOLDERS = [os.path.realpath(path) for path in os.environ["TAV_FOLDERS"].split(";")]


class Built(unittest.TestCase):
    def test_no_folder_of_the_build_is_named(self):
        for path in BUILT:
            content = path.read_bytes()
            for folder in FOLDERS:
                self.assertFalse(folder.encode() in content, f"{path.name} names {folder}")

    def test_libraries_are_found_from_where_a_file_lies(self):
        """The place of such a text stays in an installed file, as zeros as long as the text."""
        programs = 0
        for path in BUILT:
            run = subprocess.run(["readelf", "--dynamic", "--wide", path], check=True, capture_output=True, text=True)
            for places in re.findall(r"\((?:RUNPATH|RPATH)\).*\[(.*)\]", run.stdout):
                programs += 1
                for place in places.split(":"):
                    self.assertTrue(place == "" or place.startswith("$ORIGIN"), f"{path.name} looks in {place}")
        self.assertGreater(programs, 0)


if __name__ == "__main__":
    unittest.main()
