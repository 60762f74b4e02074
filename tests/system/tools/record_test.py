"""tav snapshot --append: a series in a file, that ends at any moment and is gone on with."""
import pathlib
import re
import subprocess
import unittest

from support import PATIENCE, TAV, WINDOWS, ToolTest, running, tav, until

README = next(folder / "README.md" for folder in pathlib.Path(__file__).resolve().parents if (folder / "README.md").exists())
TIME = re.compile(r"\d{4}-\d\d-\d\dT\d\d:\d\d:\d\d\.\d{6}\+00:00")


def times(path):
    result = tav("get", "--all", path, "/system/timestamp")
    return result.out.split()


class Record(ToolTest):
    def test_each_run_goes_on_behind_the_last_in_every_form(self):
        for form in ([], ["--eye-size"], ["--hdr32"], ["--align"], ["--byte-order", "big"],
                     ["--root", "32", "--align", "--byte-order", "swapped"]):
            with self.subTest(form=form):
                path = self.folder / "x.tav"
                path.unlink(missing_ok=True)
                before = []
                for count in range(1, 4):
                    result = tav("snapshot", "--append", *form, "-o", path)
                    self.assertEqual((result.status, result.err), (0, ""))
                    reading = [word for word in form if word not in ("--eye-size", "--hdr32")]
                    reading += ["--root", "32"] if "--hdr32" in form else []
                    result = tav("get", "--all", path, "/system/timestamp", *reading)
                    found = result.out.split()
                    self.assertEqual(len(found), count, result.err)
                    self.assertEqual(found[:-1], before)  # the time of day may have been set back
                    before = found
                    self.assertTrue(all(TIME.fullmatch(time) for time in found), found)
                self.assertEqual(tav("check", path, *reading).status, 0)

    def test_a_series_ends_when_it_has_its_number(self):
        path = self.folder / "x.tav"
        self.assertEqual(tav("snapshot", "--append", "--every", "1ms", "--count", "4", "-o", path).status, 0)
        self.assertEqual(len(times(path)), 4)

    def test_a_series_that_is_killed_is_gone_on_with(self):
        path = self.folder / "x.tav"
        with running([*TAV, "snapshot", "--append", "--every", "5ms", "-o", str(path)]) as series:
            self.assertTrue(until(lambda: path.exists() and path.stat().st_size and len(times(path)) > 2))
            second = tav("snapshot", "--append", "-o", path)
            self.assertEqual(second.status, 2)
            self.assertIn("KOR_RC_LOCKED", second.err)
            series.kill()
        before = times(path)
        self.assertEqual(tav("snapshot", "--append", "-o", path).status, 0)
        after = times(path)
        self.assertEqual(after[:-1], before)
        self.assertEqual(tav("check", path).status, 0)

    def test_files_change_by_their_size(self):
        path = self.folder / "r-%n.tav"
        result = tav("snapshot", "--append", "--rotate", "1", "--every", "1ms", "--count", "3", "-o", path)
        self.assertEqual(result.status, 0, result.err)
        self.assertEqual(sorted(file.name for file in self.folder.iterdir()), ["r-1.tav", "r-2.tav", "r-3.tav"])

    def test_the_last_files_are_kept(self):
        path = self.folder / "r-%n.tav"
        for _ in range(2):
            result = tav("snapshot", "--append", "--rotate", "1", "--keep", "2", "--every", "1ms", "--count", "4", "-o", path)
            self.assertEqual(result.status, 0, result.err)
        self.assertEqual(sorted(file.name for file in self.folder.iterdir()), ["r-7.tav", "r-8.tav"])

    def test_what_cannot_be_gone_on_with_stays_as_it_is(self):
        path = self.folder / "x.tav"
        for content in (b"no stream at all, but long enough", bytes(100)):
            path.write_bytes(content)
            result = tav("snapshot", "--append", "-o", path)
            self.assertEqual(result.status, 2)
            self.assertIn("the file is no stream", result.err)
            self.assertEqual(path.read_bytes(), content)
        path.unlink()
        tav("snapshot", "-o", path)
        content = path.read_bytes()
        result = tav("snapshot", "--append", "--hdr32", "-o", path)
        self.assertEqual(result.status, 2)
        self.assertIn("the options say", result.err)
        self.assertEqual(path.read_bytes(), content)

    def test_options_that_have_no_meaning_are_refused(self):
        path = self.folder / "x.tav"
        for options, told in ((["--every", "5s", "-o", path], "--every needs --append"),
                              (["--count", "5", "-o", path], "--count needs --append"),
                              (["--append"], "--append needs -o FILE"),
                              (["--append", "--count", "5", "-o", path], "--count needs --every"),
                              (["--append", "--every", "1s", "--count", "0", "-o", path], "a number above 0"),
                              (["--append", "--rotate", "5K", "-o", path], "needs a FILE with %n"),
                              (["--append", "--keep", "5", "-o", path], "--keep needs --rotate"),
                              (["--keep", "5", "-o", path], "--keep needs --append"),
                              (["--append", "--rotate", "1", "--keep", "0", "-o", self.folder / "%n"], "a number above 0"),
                              (["--append", "--every", "5", "-o", path], "'5' is no time"),
                              (["--append", "--every", "0s", "-o", path], "'0s' is no time")):
            with self.subTest(options=options):
                result = tav("snapshot", *options)
                self.assertEqual(result.status, 2)
                self.assertIn(told, result.err)
                self.assertFalse(path.exists())

    @unittest.skipIf(WINDOWS, "a shell")
    def test_the_readme_says_what_happens(self):
        block = next(block for block in re.findall(r"```sh\n(.*?)```", README.read_text(), re.DOTALL) if "kill -9" in block)
        self.assertIn("\nsleep 2\n", block)  # a busy machine takes longer: the first one is waited for
        first = "for _ in {1..2000}; do tav get day.tav /system/timestamp >/dev/null 2>&1 && break; sleep 0.1; done"
        block = block.replace("\nsleep 2\n", f"\n{first}\n")
        script = "set -e\ntav() { " + " ".join(f"'{word}'" for word in TAV) + ' "$@"; }\n' + block.replace(
            "tav snapshot --append --every 500ms -o day.tav &", " ".join(f"'{word}'" for word in TAV) +
            " snapshot --append --every 500ms -o day.tav &")
        done = subprocess.run(["bash", "-c", script], cwd=self.folder, capture_output=True, check=False, text=True,
                              timeout=PATIENCE)
        self.assertEqual(done.returncode, 0, done.stderr)
        found = TIME.findall(done.stdout)
        self.assertGreater(len(found), 3, done.stdout)
        self.assertIn("no defects", done.stdout + done.stderr)
        self.assertTrue((self.folder / "day-1.tav").exists())


if __name__ == "__main__":
    unittest.main()
