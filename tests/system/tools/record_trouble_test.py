"""tav snapshot --append while the clock is set, the disk is full, and the file vanishes."""
import os
import resource
import signal
import subprocess
import time
import unittest

from support import EMULATOR, PATIENCE, TAV, WINDOWS, ToolTest, running, tav, until

CLOCK = os.environ.get("TAV_CLOCK_LIBRARY", "")
TEN_YEARS = 10 * 365 * 24 * 3600


def times(path):
    return tav("get", "--all", path, "/system/timestamp").out.split()


def with_room_for(size):
    """Options of a process whose files cannot grow beyond a size."""
    return {"preexec_fn": lambda: resource.setrlimit(resource.RLIMIT_FSIZE, (size, resource.RLIM_INFINITY))}


@unittest.skipIf(WINDOWS or EMULATOR, "limits, signals and clocks of other processes")
class RecordTrouble(ToolTest):
    @unittest.skipUnless(CLOCK, "no library stands in front of the system's")
    def test_a_time_of_day_that_jumps_neither_stops_nor_hurries_a_series(self):
        environment = {**os.environ, "LD_PRELOAD": CLOCK, "TAV_CLOCK_JUMP": str(TEN_YEARS)}
        path = self.folder / "x.tav"
        begin = time.monotonic()
        result = tav("snapshot", "--append", "--every", "100ms", "--count", "7", "-o", path, env=environment)
        self.assertEqual((result.status, result.err), (0, ""))
        self.assertGreaterEqual(time.monotonic() - begin, 0.6)
        found = times(path)
        self.assertEqual(len(found), 7)
        years = [int(moment[:4]) for moment in found]
        self.assertGreater(max(years) - min(years), 18, "what is recorded is the time of day as it was set")
        self.assertEqual(tav("check", path).status, 0)

    def test_a_full_disk_is_told_and_nothing_that_was_stored_is_lost(self):
        path = self.folder / "x.tav"
        for pairs in ([], ["--eye-size"]):
            for share in (0, 1, 40, 90, 150, 260):  # of a snapshot, for which there is room
                with self.subTest(pairs=pairs, share=share):
                    path.unlink(missing_ok=True)
                    series = ["snapshot", "--append", *pairs, "--every", "1ms", "-o", path]
                    self.assertEqual(tav(*series, "--count", "3").status, 0)
                    size, stored = path.stat().st_size, times(path)
                    result = tav(*series, **with_room_for(size + size // 3 * share // 100))
                    self.assertEqual((result.status, result.out), (2, ""))
                    self.assertIn(f"tav: {path}: ", result.err)
                    self.assertIn("KOR_RC_FILE_TOO_LARGE: the file would grow beyond the size that is allowed", result.err)
                    kept = times(path)
                    self.assertEqual(kept[:3], stored)
                    self.assertEqual(tav(*series, "--count", "1").status, 0, "there is room again")
                    self.assertEqual(times(path)[:len(kept)], kept)
                    self.assertEqual(tav("check", path).status, 0)

    def test_a_full_disk_is_told_where_files_change(self):
        series = ["snapshot", "--append", "--every", "1ms", "-o", self.folder / "r-%n.tav"]
        self.assertEqual(tav(*series, "--rotate", "1", "--count", "3").status, 0)
        stored = [times(self.folder / f"r-{number}.tav") for number in (1, 2, 3)]
        size = (self.folder / "r-1.tav").stat().st_size
        result = tav(*series, "--rotate", "1", **with_room_for(size * 3 // 4))
        self.assertEqual(result.status, 2)
        self.assertIn("r-4.tav: ", result.err)
        self.assertIn("KOR_RC_FILE_TOO_LARGE", result.err)
        result = tav(*series, "--rotate", "1", "--count", "2")
        self.assertEqual((result.status, result.err), (0, ""))
        self.assertEqual([times(self.folder / f"r-{number}.tav") for number in (1, 2, 3)], stored)
        self.assertGreaterEqual(sum(len(times(file)) for file in self.folder.glob("r-*.tav")), 5)
        for file in self.folder.glob("r-*.tav"):
            self.assertEqual(tav("check", file).status, 0)

    def test_a_file_that_vanishes_is_made_anew(self):
        path = self.folder / "x.tav"
        with running([*TAV, "snapshot", "--append", "--every", "10ms", "-o", str(path)]) as series:
            for _ in range(3):
                self.assertTrue(until(lambda: path.exists() and path.stat().st_size and len(times(path)) > 1))
                path.unlink()
            self.assertTrue(until(lambda: path.exists() and path.stat().st_size and times(path)))
            moved = self.folder / "moved.tav"
            path.rename(moved)
            self.assertTrue(until(lambda: path.exists() and path.stat().st_size and times(path)))
            left = moved.read_bytes()
            self.assertTrue(until(lambda: len(times(path)) > 2))
            series.send_signal(signal.SIGINT)
            series.wait(timeout=PATIENCE)
        for file in (path, moved):
            self.assertEqual(tav("check", file).status, 0)
        self.assertEqual(moved.read_bytes(), left, "what comes is in the new file")

    def test_behind_a_numbered_file_that_vanishes_the_next_number_begins(self):
        with running([*TAV, "snapshot", "--append", "--every", "10ms", "--rotate", "100M", "-o",
                      str(self.folder / "r-%n.tav")]) as series:
            for number in range(1, 4):
                path = self.folder / f"r-{number}.tav"
                self.assertTrue(until(lambda: path.exists() and path.stat().st_size))
                path.unlink()
            self.assertTrue(until((self.folder / "r-4.tav").exists))
            series.kill()

    def test_a_folder_that_vanishes_is_told(self):
        folder = self.folder / "inner"
        folder.mkdir()
        with running([*TAV, "snapshot", "--append", "--every", "10ms", "-o", str(folder / "x.tav")],
                     stderr=subprocess.PIPE, text=True) as series:
            path = folder / "x.tav"
            self.assertTrue(until(lambda: path.exists() and path.stat().st_size and times(path)))
            folder.rename(self.folder / "other")
            self.assertEqual(series.wait(timeout=PATIENCE), 2)
            self.assertIn("KOR_RC_NO_SUCH_FILE", series.stderr.read())
        self.assertEqual(tav("check", self.folder / "other" / "x.tav").status, 0)  # what was stored stays whole


if __name__ == "__main__":
    unittest.main()
