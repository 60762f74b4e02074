"""The tables of the benchmarks: medians, ratios, goals, and the place for them in the document."""
import pathlib
import sys
import unittest

sys.path.insert(0, str(pathlib.Path(__file__).resolve().parents[3] / "bench"))
import measure  # noqa: E402
import report  # noqa: E402


def entry(name, nanoseconds, **more):
    return {"run_name": name, "run_type": "iteration", "cpu_time": nanoseconds, "time_unit": "ns", **more}


def taken(**nanoseconds):
    return {f"W1/{name}": {"pass_ns": value, "item_ns": value, "spread": 0.0} for name, value in nanoseconds.items()}


W1 = next(work for work in report.WORKS if work.name == "W1")
W6 = next(work for work in report.WORKS if work.name == "W6")


class Summaries(unittest.TestCase):
    def test_take_the_median_of_the_repetitions(self):
        found = measure.summarize([entry("W1/floor", value) for value in (5, 1, 3)])
        self.assertEqual(found["W1/floor"]["pass_ns"], 3)

    def test_bring_all_units_to_nanoseconds(self):
        found = measure.summarize([entry("W7read/x/real_time", 2, time_unit="ms")])
        self.assertEqual(found["W7read/x"]["pass_ns"], 2e6)

    def test_count_time_by_the_item(self):
        found = measure.summarize([entry("W1/floor", 100, items_per_second=1e8)])
        self.assertAlmostEqual(found["W1/floor"]["item_ns"], 10)

    def test_end_the_run_when_an_entry_failed(self):
        with self.assertRaisesRegex(SystemExit, "W1/bad: wrong value"):
            measure.summarize([entry("W1/floor", 1), entry("W1/bad", 1, error_occurred=True,
                                                           error_message="wrong value")])

    def test_end_the_run_when_nothing_ran(self):
        with self.assertRaises(SystemExit):
            measure.summarize([])


class Tables(unittest.TestCase):
    def test_sort_entries_by_time_and_relate_them_to_the_floor(self):
        found = report.rows(W1, taken(tavAddElement=6, floor=2, bson=8))
        self.assertEqual([(row.entry, row.kind, row.ratio) for row in found],
                         [("floor", "floor", 1), ("tavAddElement", "library", 3), ("bson", "peer", 4)])

    def test_show_rates_where_bytes_count(self):
        times = {name: {"pass_ns": value, "spread": 0.0} for name, value in
                 {"W6/both_avx2": W6.pass_bytes / 32, "W6/tavFindEyeSizeComboInt": W6.pass_bytes / 16}.items()}
        self.assertEqual([(row.value, row.ratio) for row in report.rows(W6, times)], [(32, 1), (16, 2)])

    def test_tell_the_own_page_of_a_peer_from_the_floor(self):
        self.assertEqual(report.kind("pread_1MiB"), "floor")
        self.assertEqual(report.kind("pread_1MiB_40B_pieces"), "peer")
        self.assertEqual(report.kind("pread_1MiB_40B_floor_api"), "floor")

    def test_relate_goals_that_are_rates_to_the_floor_of_the_same_run(self):
        self.assertAlmostEqual(W6.goal[0], 33.7 / 25)

    def test_judge_an_entry_by_its_own_goal(self):
        lines = report.goal_table({"times": taken(floor=1, layer=2.3, tavAddElement=2.3)})
        judged = {line.split("`")[1]: line.split("|")[-2].strip() for line in lines[2:]}
        self.assertEqual(judged, {"layer": "missed", "tavAddElement": "aim met"})

    def test_judge_by_the_ratio(self):
        self.assertEqual([report.verdict(ratio, (4, 2)) for ratio in (1.9, 2, 2.1, 4, 4.1)],
                         ["aim met", "aim met", "must met", "must met", "missed"])

    def test_do_not_judge_without_a_floor(self):
        found = report.rows(W1, taken(tavAddElement=6))
        self.assertEqual(report.verdict(found[0].ratio, W1.goal), "no floor")

    def test_find_the_step_that_is_furthest_from_doubling(self):
        self.assertAlmostEqual(report.steepest([100, 200, 440, 880]), 0.1)


class Program(unittest.TestCase):
    def test_relate_commands_to_print_and_judge_those_with_a_goal(self):
        program = {"quick": False, "machine": {"cpu": "one", "cores": 2, "compiler": "g++"}, "leaves": 24000,
                   "bytes": {"s": 1, "json": 2, "xml": 3}, "missing": {"jq of the JSON": "jq"}, "instructions": {},
                   "times": {name: {"seconds": seconds, "spread": 0.0, "peak": 1 << 20} for name, seconds in
                             {"print": 2.0, "tree": 2.9, "hex": 9.0, "info": 0.1}.items()}}
        text = report.program_figures(program)
        cells = {line.split(" | ")[0]: line.split(" | ")[2:5] for line in text if line.startswith("| `")}
        self.assertEqual(cells, {"| `print`": ["1.00", "", ""], "| `tree`": ["1.45", "1.50", "must met"],
                                 "| `hex`": ["4.50", "4.00", "missed"], "| `info`": ["0.05", "", ""]})
        self.assertIn("Left out: jq of the JSON, since jq is not here.", text)


class Documents(unittest.TestCase):
    def test_replace_what_is_between_the_marks(self):
        begin, end = report.PROGRAM
        page = f"before\n{begin}\nold\n{end}\nafter\n"
        self.assertEqual(report.with_figures(page, report.PROGRAM, "new"), f"before\n{begin}\n\nnew\n\n{end}\nafter\n")

    def test_refuse_a_page_without_marks(self):
        with self.assertRaises(ValueError):
            report.with_figures("no place", report.FIGURES, "new")


if __name__ == "__main__":
    unittest.main()
