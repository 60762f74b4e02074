"""A release is refused where it could not be made again, and what it is made of is told."""

import datetime
import email.utils
import json
import os
import pathlib
import re
import shutil
import subprocess
import sys
import tempfile
import unittest
import zipfile

ROOT = pathlib.Path(__file__).resolve().parents[3]
RECORDED = "tests/system/abi/released"
NAMED = {"GIT_AUTHOR_NAME": "a", "GIT_AUTHOR_EMAIL": "a@b", "GIT_COMMITTER_NAME": "a", "GIT_COMMITTER_EMAIL": "a@b"}


def run(folder, *command):
    return subprocess.run(command, cwd=folder, capture_output=True, text=True, timeout=600, env={**os.environ, **NAMED})


@unittest.skipUnless(shutil.which("git"), "a history needs git")
class Refusals(unittest.TestCase):
    """On a copy of the tree's scripts, with a history of its own."""

    def setUp(self):
        self.folder = tempfile.TemporaryDirectory()
        self.addCleanup(self.folder.cleanup)
        self.tree = pathlib.Path(self.folder.name) / "tree"
        for name in ("packaging", "cmake", RECORDED):
            (self.tree / name).parent.mkdir(parents=True, exist_ok=True)
            self.assertEqual(run(ROOT, "cp", "-r", name, self.tree / name).returncode, 0)
        (self.tree / "CMakeLists.txt").write_text((ROOT / "CMakeLists.txt").read_text())
        self.version = run(self.tree, "cmake/version.sh").stdout.strip()
        self.assertRegex(self.version, r"^\d+\.\d+\.\d+$")
        (self.tree / "CHANGELOG.md").write_text(f"# Changelog\n\n## [{self.version}] - 2026-01-02\n")
        for command in (["init", "-q"], ["add", "-A"], ["commit", "-qm", "all"]):
            self.assertEqual(run(self.tree, "git", *command).returncode, 0)

    def refused(self, why, *arguments):
        out = self.tree.parent / "out"
        found = run(self.tree, "packaging/release.sh", out, *arguments)
        self.assertEqual(found.returncode, 1, found.stderr[-400:])
        self.assertIn(why, found.stderr)
        self.assertFalse(out.exists())

    def commit(self):
        self.assertEqual(run(self.tree, "git", "commit", "-qam", "more").returncode, 0)

    def test_a_tree_with_changes(self):
        (self.tree / "new").write_text("")
        self.refused("changes that are in no commit")

    def test_a_changelog_without_the_version(self):
        (self.tree / "CHANGELOG.md").write_text("# Changelog\n\n## [Unreleased]\n")
        self.commit()
        self.refused("no dated section")

    def test_changes_that_are_in_no_version(self):
        (self.tree / "CHANGELOG.md").write_text(
            f"# Changelog\n\n## [Unreleased]\n\n### Fixed\n\n- One more.\n\n## [{self.version}] - 2026-01-02\n\n- All.\n")
        self.commit()
        self.refused("changes that are in no version")

    def test_versions_that_differ(self):
        for name in ("packaging/vcpkg/vcpkg.json", f"{RECORDED}/VERSION"):
            with self.subTest(place=name):
                place = self.tree / name
                text = place.read_text()
                self.assertEqual(text.count(self.version), 1)
                place.write_text(text.replace(self.version, "9.9.9"))
                self.commit()
                self.refused("the version is not the same everywhere")
                place.write_text(text)
                self.commit()

    def test_a_release_that_is_not_the_last_one_of_the_changelog(self):
        log = self.tree / "CHANGELOG.md"
        log.write_text(f"# Changelog\n\n## [9.9.9] - 2026-02-03\n\n## [{self.version}] - 2026-01-02\n")
        self.commit()
        self.refused("the version is not the same everywhere")

    def test_a_missing_key(self):
        self.refused("there is no key", "/nowhere/key")

    def test_a_key_that_nothing_could_sign_with(self):
        """Before anything is built: a release that ends without its signature would have cost its whole time."""
        key = self.tree.parent / "key"
        key.write_text("")
        bare = self.tree.parent / "bare"
        bare.mkdir()
        for name in ("bash", "env", "dirname", "sed", "git", "grep", "cat", "head"):
            (bare / name).symlink_to(shutil.which(name))
        found = subprocess.run([self.tree / "packaging/release.sh", self.tree.parent / "out", key], cwd=self.tree,
                               capture_output=True, text=True, timeout=120, env={**os.environ, **NAMED, "PATH": str(bare)})
        self.assertEqual(found.returncode, 1, found.stderr[-400:])
        self.assertIn("minisign", found.stderr)
        self.assertFalse((self.tree.parent / "out").exists())

    def test_a_folder_that_is_there(self):
        found = run(self.tree, "packaging/release.sh", self.tree)
        self.assertEqual(found.returncode, 1)
        self.assertIn("exists already", found.stderr)


class ThisTree(unittest.TestCase):
    def test_the_version_is_the_same_everywhere(self):
        found = run(ROOT, "cmake/check-version.sh")
        self.assertEqual((found.returncode, found.stdout), (0, ""))

    def test_the_changelog_has_room_for_what_comes(self):
        headings = [line for line in (ROOT / "CHANGELOG.md").read_text().splitlines() if line.startswith("## ")]
        self.assertEqual(headings[0], "## [Unreleased]")

    @unittest.skipUnless(shutil.which("cmake"), "needs cmake")
    def test_the_packages_are_dated_by_the_changelog(self):
        days = (datetime.date(2026, 11, 22), datetime.date(2028, 2, 29), datetime.date(2027, 3, 1), datetime.date(2031, 1, 9),
                datetime.date(2029, 12, 31))
        with tempfile.TemporaryDirectory() as name:
            (pathlib.Path(name) / "cmake").mkdir()
            script = shutil.copy(ROOT / "cmake" / "TavReleased.cmake", pathlib.Path(name) / "cmake")
            ask = pathlib.Path(name) / "ask.cmake"
            ask.write_text(f'include("{script}")\nmessage("${{TAV_RELEASED}}")\n')
            for day in days:
                log = pathlib.Path(name) / "CHANGELOG.md"
                log.write_text(f"## [Unreleased]\n\n## [1.2.3] - {day}\n\n## [1.2.2] - 2001-02-03\n")
                noon = datetime.datetime.combine(day, datetime.time(12), datetime.timezone.utc)
                for epoch in ({}, {"SOURCE_DATE_EPOCH": "1000000000"}):
                    found = subprocess.run(["cmake", "-P", ask], capture_output=True, text=True, env={**os.environ, **epoch})
                    self.assertEqual(found.stderr.strip(), email.utils.format_datetime(noon))


class Contents(unittest.TestCase):
    def test_an_artefact_is_told_with_its_digest_and_its_parts(self):
        with tempfile.TemporaryDirectory() as name:
            folder = pathlib.Path(name)
            (folder / "tav-1.2.3.tar.gz").write_bytes(b"abc")
            found = subprocess.run([ROOT / "packaging" / "sbom.py", "1.2.3", folder], capture_output=True, text=True)
            self.assertEqual(found.returncode, 0, found.stderr)
            told = json.loads((folder / "tav-1.2.3.tar.gz.spdx.json").read_text())
        self.assertEqual(told["spdxVersion"], "SPDX-2.3")
        self.assertEqual(told["packages"][0]["checksums"][0]["checksumValue"],
                         "ba7816bf8f01cfea414140de5dae2223b00361a396177a9cb410ff61f20015ad")
        identities = {package["SPDXID"] for package in told["packages"]} | {"SPDXRef-DOCUMENT"}
        for relation in told["relationships"]:
            self.assertIn(relation["spdxElementId"], identities)
            self.assertIn(relation["relatedSpdxElement"], identities)

    @unittest.skipUnless(shutil.which("readelf") and sys.platform == "linux", "no dynamic sections")
    def test_a_library_is_told_with_what_the_loader_has_to_find_for_it(self):
        with tempfile.TemporaryDirectory() as name:
            folder = pathlib.Path(name)
            shutil.copy(os.path.realpath("/proc/self/exe"), folder / "tav.duckdb_extension")
            found = subprocess.run([ROOT / "packaging" / "sbom.py", "1.2.3", folder], capture_output=True, text=True)
            self.assertEqual(found.returncode, 0, found.stderr)
            told = json.loads((folder / "tav.duckdb_extension.spdx.json").read_text())
        needed = [relation["relatedSpdxElement"] for relation in told["relationships"]
                  if relation["relationshipType"] == "DEPENDS_ON"]
        self.assertTrue(any(name.startswith("SPDXRef-needs-libc.") for name in needed), needed)

    def test_what_is_bundled_has_a_version_or_a_package_that_has_one(self):
        told = json.loads((ROOT / "packaging" / "bundled.json").read_text())
        parts = [part for found in told.values() for part in found]
        self.assertTrue(parts)
        for part in parts:
            self.assertEqual(len({"version", "package"} & set(part)), 1, part)
            self.assertTrue(part["name"] and part["licence"], part)

    def test_every_artefact_that_holds_parts_of_others_has_them_told(self):
        patterns = json.loads((ROOT / "packaging" / "bundled.json").read_text())
        for name in ("tav-1.2.3-cp311-cp311-linux_x86_64.whl", "tav-tools_1.2.3-1_amd64.deb", "tav.html",
                     "tav-site-1.2.3.tar.gz", "tav.duckdb_extension"):
            with self.subTest(name=name):
                self.assertTrue([pattern for pattern in patterns if re.fullmatch(pattern, name)])

    @unittest.skipUnless(shutil.which("dpkg-query") and run("/", "dpkg-query", "-W", "libstdc++-12-dev").returncode == 0,
                         "the library that is in the wheel is not of a package here")
    def test_a_wheel_is_told_with_what_it_asks_for_and_what_is_in_it(self):
        with tempfile.TemporaryDirectory() as name:
            wheel = pathlib.Path(name) / "tav-1.2.3-cp311-cp311-linux_x86_64.whl"
            with zipfile.ZipFile(wheel, "w") as archive:
                archive.writestr("tav-1.2.3.dist-info/METADATA", "Name: tav\nRequires-Dist: numpy (>=1.20)\n")
            found = subprocess.run([ROOT / "packaging" / "sbom.py", "1.2.3", name], capture_output=True, text=True)
            self.assertEqual(found.returncode, 0, found.stderr)
            told = json.loads(wheel.with_name(wheel.name + ".spdx.json").read_text())
        self.assertEqual({(relation["relationshipType"], relation["relatedSpdxElement"]) for relation in told["relationships"]},
                         {("DESCRIBES", "SPDXRef-artefact"), ("DEPENDS_ON", "SPDXRef-needs-numpy"),
                          ("CONTAINS", "SPDXRef-in-libstdc---and-libgcc")})

    def test_nothing_to_tell_of_is_a_failure(self):
        with tempfile.TemporaryDirectory() as name:
            found = subprocess.run([ROOT / "packaging" / "sbom.py", "1.2.3", name], capture_output=True, text=True)
            self.assertEqual(found.returncode, 1)


if __name__ == "__main__":
    unittest.main()
