"""What check_site.py takes for a site, and what it finds wrong with one."""
import pathlib
import subprocess
import tempfile
import unittest

CHECK = pathlib.Path(__file__).resolve().parents[3] / "docs" / "site" / "check_site.py"


class Site(unittest.TestCase):
    def setUp(self):
        folder = tempfile.TemporaryDirectory()
        self.addCleanup(folder.cleanup)
        self.site = pathlib.Path(folder.name).resolve() / "site"
        self.write("index.html", '<a href="docs/tav.html#names">names</a>')
        self.write("docs/tav.html", '<h1 id="names">names</h1>')
        self.write("searchindex.js", 'Search.setIndex({"docnames": ["docs/tav", "docs/producers"]})')

    def write(self, name, text):
        path = self.site / name
        path.parent.mkdir(parents=True, exist_ok=True)
        path.write_text(text)

    def check(self):
        done = subprocess.run([CHECK, self.site], capture_output=True, text=True, timeout=60)
        return done.returncode, done.stdout

    def test_a_whole_site_passes(self):
        self.assertEqual(self.check(), (0, "2 pages, 1 links, 0 failures\n"))

    def test_a_link_that_leads_nowhere_is_found(self):
        self.write("index.html", '<a href="docs/tav.html#other">names</a>')
        status, out = self.check()
        self.assertEqual(status, 1)
        self.assertIn("has no such place", out)

    def test_what_only_the_build_needed_is_found(self):
        self.write(".doctrees/index.doctree", "")
        status, out = self.check()
        self.assertEqual(status, 1)
        self.assertIn(".doctrees/index.doctree is nothing for readers", out)

    def test_the_folder_of_the_build_is_found(self):
        self.write("docs/tav.html", f'<h1 id="names">{self.site.parent}/source/docs/tav.md</h1>')
        status, out = self.check()
        self.assertEqual(status, 1)
        self.assertIn("names the folder that it was built from", out)


if __name__ == "__main__":
    unittest.main()
