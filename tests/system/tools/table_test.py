"""tav table: rows by a path, columns by paths from there, as CSV, TSV, JSON lines and metrics."""
import csv
import io
import itertools
import json
import os
import random
import shutil
import sqlite3
import subprocess
import unittest
from xml.etree import ElementTree

from damage_test import KINDS, SOUND, STREAM, group, header, number, overwritten, host, system
from json_test import GOLDEN, Folder, golden_bytes
from support import EMULATOR, TAV, WINDOWS, tav, tav_in_little_memory, until

HOSTS = ("--each", "/system/host", "--col", "n=#60111")
FORMS = ((), ("--byte-order", "big"), ("--byte-order", "little", "--align"), ("--root", "32"), ("--eye-size",))


def leaf(element, value, kind=None):
    return {"element": element, "value": value} | ({"type": kind} if kind else {})


def sample(time, read, name="ada"):
    return {"element": "system", "children": [leaf("timestamp", time, "UTC Timestamp"), leaf("hostName", name),
                                              leaf("cpuOnline", read, "Uint64")]}


class Table(Folder):
    def stream(self, document, name="a.tav", *options):
        path = self.folder / name
        document = document if isinstance(document, list) else [document]
        result = tav("build", *options, "-o", path, "--force", stdin=json.dumps(document).encode())
        self.assertEqual((result.status, result.err), (0, ""))
        return path

    def table(self, *arguments, status=0, **more):
        result = tav("table", *arguments, **more)
        self.assertEqual(result.status, status, result.err)
        return result

    def in_python(self, needed, code, text):
        """What the system's Python, which has the system's packages, prints of a text."""
        if not os.path.exists("/usr/bin/python3"):
            self.skipTest("there is no system's Python")
        begin = f"import sys\ntry:\n    {needed}\nexcept ImportError:\n    sys.exit(77)\n"
        done = subprocess.run(["/usr/bin/python3", "-c", begin + code], input=text, capture_output=True, check=False)
        if done.returncode == 77:
            self.skipTest(f"there is nothing to {needed}")
        self.assertEqual(done.returncode, 0, done.stderr.decode())
        return done.stdout.decode()

    def rows(self, *arguments, status=0):
        return list(csv.reader(io.StringIO(self.table(*arguments, status=status).raw.decode(), newline="")))


class Formats(Table):
    TEXTS = ["ada", "", 'a"b', "a,b", "a\nb", "a\r\nb", "\\n\t\\", " x ", "1.5e3", "gr\u00e4ce", "=1+2"]

    def texts(self):
        return self.stream({"element": "system", "children": [
            {"element": "host", "children": [leaf("hostName", text), leaf("cpuOnline", i, "Uint32")]}
            for i, text in enumerate(self.TEXTS)] + [{"element": "host", "children": [leaf("memTotal", 2**100, "Uint128")]}]})

    ARGUMENTS = ("--each", "/system/host", "--col", "name=hostName", "--col", "cpuOnline", "--col", "memTotal")

    def test_csv_is_read_by_what_reads_csv(self):
        for options, end in (((), "\n"), (("--crlf",), "\r\n")):
            text = self.table(self.texts(), *self.ARGUMENTS, *options).raw.decode()
            self.assertTrue(text.startswith("name,cpuOnline,memTotal" + end))
            rows = list(csv.reader(io.StringIO(text, newline="")))
            self.assertEqual(rows[1:-1], [[name, str(i), ""] for i, name in enumerate(self.TEXTS)])
            self.assertEqual(rows[-1], ["", "", str(2**100)])
            self.assertIn(end + '"",1,' + end, text)  # an empty text, and nothing
            self.assertTrue(text.endswith(end + ",," + str(2**100) + end))

    def test_a_database_takes_it(self):
        rows = self.rows(self.texts(), *self.ARGUMENTS)
        base = sqlite3.connect(":memory:")
        self.addCleanup(base.close)
        base.execute("create table t(name text, n integer, m text)")
        base.executemany("insert into t values (?, nullif(?, ''), ?)", rows[1:])
        self.assertEqual(base.execute("select sum(n), count(n), count(*) from t").fetchone(),
                         (sum(range(len(self.TEXTS))), len(self.TEXTS), len(self.TEXTS) + 1))

    def test_pandas_takes_it(self):
        self.assertEqual(self.in_python("import pandas", """
t = pandas.read_csv(sys.stdin.buffer, dtype={'cpuOnline': 'Int64'}, keep_default_na=False, na_values={'cpuOnline': ['']})
print(list(t.columns), int(t.cpuOnline.sum()), int(t.cpuOnline.isna().sum()), t.name[2])
""", self.table(self.texts(), *self.ARGUMENTS).raw), f"['name', 'cpuOnline', 'memTotal'] {sum(range(len(self.TEXTS)))} 1 a\"b\n")

    def numbers(self):
        """Numbers of 64 and 128 bits at their ends, times, missing and empty texts."""
        return self.stream({"element": "system", "children": [{"element": "host", "children": children} for children in (
            [leaf("cpuOnline", 2**64 - 1, "Uint64"), leaf("memTotal", 2**128 - 1, "Uint128"), leaf("memFree", -2**63, "Sint64"),
             leaf("timestamp", "2024-02-29T23:59:59.000001Z", "UTC Timestamp"), leaf("hostName", "")],
            [leaf("cpuOnline", 2**53 + 1, "Uint64"), leaf("memFree", 2**63 - 1, "Sint64"),
             leaf("timestamp", "1970-01-01T01:00:00+01:00", "UTC Timestamp")],
            [leaf("cpuOnline", 0), leaf("hostName", "007"), leaf("memTotal", 2**64, "Uint128")])]}, "numbers.tav")

    NUMBERS = ("--each", "/system/host", *(word for name in ("cpuOnline", "memTotal", "memFree", "timestamp", "hostName")
                                           for word in ("--col", name)))

    def test_pandas_reads_numbers_and_times_exactly(self):
        # Numbers beyond 64 bits stay texts, and so do columns of large ones with gaps, which pandas reads as floating ones.
        code = """
for options in ({}, {'sep': '\\t'}):
    if options: text = text.replace(',', '\\t')
    t = pandas.read_csv(io.StringIO(text), dtype={'cpuOnline': 'uint64', 'memTotal': str, 'memFree': str, 'hostName': str},
                        parse_dates=['timestamp'], **options)
    print([int(x) for x in t.cpuOnline], [None if pandas.isna(x) else int(x) for x in t.memTotal],
          [None if pandas.isna(x) else int(x) for x in t.memFree], t.timestamp[0].isoformat(), t.timestamp[1].isoformat(),
          pandas.isna(t.timestamp[2]), t.hostName[2])
"""
        code = "import io\ntext = sys.stdin.read()\n" + code
        line = (f"[{2**64 - 1}, {2**53 + 1}, 0] [{2**128 - 1}, None, {2**64}] [{-2**63}, {2**63 - 1}, None] "
                "2024-02-29T23:59:59.000001+00:00 1970-01-01T00:00:00+00:00 True 007\n")
        self.assertEqual(self.in_python("import pandas", code, self.table(self.numbers(), *self.NUMBERS).raw), line * 2)

    def test_spreadsheets_tell_missing_from_empty(self):
        # What a spreadsheet takes for CSV; without quotation marks, an empty cell is a missing one.
        text = self.table(self.numbers(), *self.NUMBERS, "--crlf").raw.decode()
        self.assertEqual(csv.Sniffer().sniff(text).delimiter, ",")
        rows = list(csv.DictReader(io.StringIO(text, newline=""), dialect="excel", strict=True))
        self.assertEqual([row["hostName"] for row in rows], ["", "", "007"])
        self.assertEqual([line.split(",")[-1] for line in text.split("\r\n")[1:3]], ['""', ""])
        self.assertEqual([row["timestamp"] for row in rows],
                         ["2024-02-29T23:59:59.000001Z", "1970-01-01T00:00:00.000000Z", ""])
        tabs = list(csv.reader(io.StringIO(self.table(self.numbers(), *self.NUMBERS, "--format", "tsv").out, newline=""),
                               delimiter="\t", quoting=csv.QUOTE_NONE, strict=True))
        self.assertEqual(tabs[1:], [[cell or "" for cell in row.values()] for row in rows])

    @unittest.skipUnless(shutil.which("ssconvert"), "Gnumeric is not installed")
    def test_a_spreadsheet_reads_every_text(self):
        (self.folder / "t.csv").write_bytes(self.table(self.texts(), *self.ARGUMENTS).raw)
        done = subprocess.run(["ssconvert", "-T", "Gnumeric_XmlIO:sax:0", self.folder / "t.csv", self.folder / "t.xml"],
                              capture_output=True, check=False)
        self.assertEqual(done.returncode, 0, done.stderr)
        cells = ElementTree.parse(self.folder / "t.xml").iter("{http://www.gnumeric.org/v10.dtd}Cell")
        names = {int(cell.get("Row")): cell.text or "" for cell in cells if cell.get("Col") == "0"}
        # It takes what looks like a number for one, and has one kind of line ends.
        wanted = [{"1.5e3": "1500"}.get(text, text).replace("\r\n", "\n") for text in self.TEXTS]
        self.assertEqual([names.get(row + 1, "") for row in range(len(self.TEXTS))], wanted)

    def test_a_database_reads_numbers_and_times_exactly(self):
        rows = self.rows(self.numbers(), *self.NUMBERS)
        base = sqlite3.connect(":memory:")
        self.addCleanup(base.close)
        base.execute("create table t(n numeric, m text, f integer, time text, name text)")
        base.executemany("insert into t values (nullif(?, ''), nullif(?, ''), nullif(?, ''), nullif(?, ''), ?)", rows[1:])
        self.assertEqual(base.execute("select min(f), max(f), count(f) from t").fetchone(), (-2**63, 2**63 - 1, 2))
        self.assertEqual(base.execute("select m from t where m is not null").fetchall(), [(str(2**128 - 1),), (str(2**64),)])
        self.assertEqual(base.execute("select strftime('%s', max(time)), count(time) from t").fetchone(), ("1709251199", 2))

    def test_tsv_escapes_what_ends_cells(self):
        lines = self.table(self.texts(), *self.ARGUMENTS, "--format", "tsv").raw.decode().split("\n")
        self.assertEqual(lines[0], "name\tcpuOnline\tmemTotal")
        back = []
        for line in lines[1:-2]:
            name, count, rest = line.split("\t")
            self.assertEqual((count, rest), (str(len(back)), ""))
            back.append(name.replace("\\\\", "\0").replace("\\t", "\t").replace("\\n", "\n").replace("\\r", "\r")
                        .replace("\0", "\\"))
        self.assertEqual(back, self.TEXTS)

    def test_json_lines_are_objects(self):
        lines = [json.loads(line) for line in self.table(self.texts(), *self.ARGUMENTS, "--format", "jsonl").out.splitlines()]
        self.assertEqual(lines[:-1], [{"name": name, "cpuOnline": i, "memTotal": None} for i, name in enumerate(self.TEXTS)])
        self.assertEqual(lines[-1], {"name": None, "cpuOnline": None, "memTotal": str(2**100)})

    def test_times_are_in_utc(self):
        path = self.stream(sample("2024-05-01T10:20:30.123456+02:00", 1))
        self.assertEqual(self.rows(path, "--each", "/system", "--col", "t=timestamp")[1], ["2024-05-01T08:20:30.123456Z"])

    def test_columns_that_are_there_anyway(self):
        path = self.stream([sample("2024-05-01T10:20:30Z", 1)])
        self.assertEqual(self.rows(path, path, "--each", "/system", "--col", "cpuOnline", "--label", "a=x=y", "--file",
                                   "--label", "b="),
                         [["file", "a", "b", "cpuOnline"], [str(path), "x=y", "", "1"], [str(path), "x=y", "", "1"]])

    def test_names_and_paths(self):
        path = self.stream(sample("2024-05-01T10:20:30Z", 7))
        self.assertEqual(self.rows(path, "--each", "/system[hostName='ada']", "--col", "a_1=cpuOnline",
                                   "--col", "../system[hostName='ada']/cpuOnline", "--col", "hostName|osName"),
                         [["a_1", "../system[hostName='ada']/cpuOnline", "hostName|osName"], ["7", "", "ada"]])
        self.assertEqual(self.rows(path, "--each", "/system", "--col", "x=*", "--join", "; ")[1],
                         ["2024-05-01T10:20:30.000000Z; ada; 7"])

    def test_out_is_a_file(self):
        out = self.folder / "out.csv"
        path = self.stream(sample("2024-05-01T10:20:30Z", 7))
        arguments = (path, "--each", "/system", "--col", "cpuOnline", "-o", out)
        self.table(*arguments)
        self.assertEqual(out.read_text(), "cpuOnline\n7\n")
        self.table(*arguments, status=2)
        self.table(*arguments, "--force")

    def test_values_are_those_of_json(self):
        chance = random.Random(11)
        for number_ in range(20):
            hosts = [[chance.randrange(2**chance.randrange(1, 64)) for _ in range(chance.randrange(3))] for _ in range(20)]
            path = self.stream({"element": "system", "children": [
                {"element": "host", "children": [leaf("cpuOnline", value, "Uint64") for value in values]} for values in hosts]},
                "a.tav", *FORMS[number_ % len(FORMS)])
            rows = self.rows(path, "--each", "/system/host", "--col", "cpuOnline")[1:]
            self.assertEqual([row or [""] for row in rows], [[str(values[0]) if values else ""] for values in hosts])


class Statuses(Table):
    def test_golden_vectors_have_the_values_of_get(self):
        for vector in sorted(GOLDEN.glob("*.hex")):
            with self.subTest(vector=vector.name):
                path = self.file(golden_bytes(vector))
                lines = self.table(path, "--each", "//*", "--col", "v=.", "--format", "jsonl", "--on-damage", "skip",
                                   status=tav("get", path, "--all", "--json", "//*").status).out.splitlines()
                found = [json.loads(line)["v"] for line in lines]
                wanted = [json.loads(line) for line in tav("get", path, "--all", "--json", "//*").out.splitlines()]
                self.assertEqual(len(found), len(wanted))
                for value, node in zip(found, wanted):
                    if node["type"] != "UTC Timestamp":
                        self.assertEqual(value, node.get("value"))

    def test_damage_ends_the_rows_of_its_file(self):
        for kind, (content, offset, place, sentence, left) in KINDS.items():
            if "another form" in kind or "first header" in kind:
                continue
            with self.subTest(kind=kind):
                path = self.file(content)
                result = self.table(path, *HOSTS, status=1)
                begin = f"tav: {path}: {offset:#x} {place}: "
                self.assertEqual([line[:len(begin)] for line in result.err.splitlines()][:1], [begin])
                stopped = len(result.out.splitlines()) - 1
                skipped = self.table(path, *HOSTS, "--on-damage", "skip", status=1)
                self.assertIn(begin, skipped.err)
                self.assertIn(sentence, skipped.err)
                rows = skipped.out.splitlines()[1:]
                self.assertEqual(rows[:stopped], result.out.splitlines()[1:])
                stray = kind in ("a header of a group", "a value that ends past its parent",
                                 "a group that ends past its parent")  # one value is in no host
                self.assertEqual(len([row for row in rows if row]), left - stray)

    def test_each_stream_is_read_in_its_own_form(self):
        for kind, (content, *_) in KINDS.items():
            if "another form" in kind:
                with self.subTest(kind=kind):
                    result = self.table(self.file(content), *HOSTS)
                    self.assertEqual(len(result.out.splitlines()), 1 + 40)
        for kind, content in SOUND.items():
            with self.subTest(kind=kind):
                self.assertEqual(self.table(self.file(content), "--each", "/*", "--col", "*", status=0).err, "")

    def test_the_next_file_is_read(self):
        sound = self.file(STREAM, "sound.tav")
        damaged = self.file(overwritten(STREAM, host(3), 40), "damaged.tav")
        text = self.file(b"no stream at all, whatever is done with it, or so", "text.tav")
        empty = self.file(b"", "empty.tav")
        rows = len(self.table(sound, *HOSTS).out.splitlines()) - 1
        self.assertEqual(rows, 20)
        for files, status, count in (((damaged, sound), 1, 23), ((text, sound), 3, 20), ((empty, sound), 3, 20),
                                     ((self.folder / "none", sound), 2, 20), ((sound, damaged, empty), 3, 23)):
            with self.subTest(files=files):
                result = self.table(*files, *HOSTS, status=status)
                self.assertEqual(len(result.out.splitlines()), 1 + count)
                self.assertNotEqual(result.err, "")

    def test_no_row_is_the_header_and_a_finding(self):
        path = self.file(STREAM)
        self.assertEqual(self.table(path, "--each", "/host", "--col", "a=#60111", status=1).out, "a\n")
        self.assertEqual(self.table(path, "--each", "/host", "--col", "a=#60111", "--format", "jsonl", status=1).out, "")

    def test_wrong_usage(self):
        path = self.file(STREAM)
        for arguments in (("--col", "x"), ("--each", "/system"), ("--each", "/system", "--col", "a["),
                          ("--each", "/[", "--col", "host"), (*HOSTS, "--format", "xls"),
                          (*HOSTS, "--on-damage", "hope"), (*HOSTS, "--label", "x"), (*HOSTS, "--label", "a b=x"),
                          (*HOSTS, "--col", "n=host"), (*HOSTS, "--file", "--label", "file=x"), (*HOSTS, "--rate"),
                          (*HOSTS, "--counter", "m", "--rate"), (*HOSTS, "--crlf", "--format", "jsonl"),
                          (*HOSTS, "--rate", "--counter", "n", "--format", "openmetrics"), ("-", "-", *HOSTS)):
            with self.subTest(arguments=arguments):
                self.table(path, *arguments, status=2)
        self.table(path, "--each", "/system", "--col", "hostNam", status=1)  # a name that no element has
        self.assertEqual(len(self.table("-", *HOSTS, stdin=STREAM).out.splitlines()), 21)

    def test_a_file_larger_than_its_memory(self):
        path = self.folder / "large.tav"
        one = system(hosts=1000)
        with open(path, "wb") as file:
            for _ in range(2000):
                file.write(one)
        result = tav_in_little_memory("table", path, *HOSTS, "-o", self.folder / "out.csv")
        self.assertEqual((result.status, result.err), (0, ""))
        with open(self.folder / "out.csv", encoding="ascii") as file:
            self.assertEqual(sum(1 for _ in file), 2_000_001)


class Series(Table):
    numbers = itertools.count()

    def series(self, *samples):
        return self.stream([sample(*each) for each in samples], f"{next(self.numbers)}.tav")

    ARGUMENTS = ("--each", "/system", "--col", "time=timestamp", "--col", "n=cpuOnline", "--counter", "n", "--rate")

    def rates(self, *arguments):
        return [row[1] for row in self.rows(*arguments)[1:]]

    def test_a_rate_is_by_the_second_and_begins_anew_where_a_counter_does(self):
        day = "2024-05-01T10:20:"
        path = self.series((day + "00Z", 100), (day + "10Z", 150), (day + "10.5Z", 151), (day + "20Z", 7), (day + "21Z", 9),
                           (day + "21Z", 12), (day + "23Z", 13))
        self.assertEqual(self.rates(path, *self.ARGUMENTS), ["", "5", "2", "", "2", "", "2"])

    def test_it_goes_on_from_file_to_file(self):
        first = self.series(("2024-05-01T10:20:00Z", 2**64 - 2))
        second = self.series(("2024-05-01T10:20:02Z", 2**64 - 1), ("2024-05-01T10:20:03Z", 0))
        self.assertEqual(self.rates(first, second, *self.ARGUMENTS), ["", "0.5", ""])


class Metrics(Table):
    def metrics(self, document, *arguments, status=0):
        return self.table(self.stream(document), *arguments, "--format", "openmetrics", status=status)

    HOST = ("--each", "/system/host", "--col", "hostName", "--col", "up=cpuOnline", "--col", "read_total=memTotal")

    def test_a_snapshot_is_a_page_of_metrics(self):
        document = {"element": "system", "children": [{"element": "host", "children": [
            leaf("hostName", name), leaf("cpuOnline", i, "Sint32"), leaf("memTotal", 2**63 + i, "Uint64")]}
            for i, name in enumerate(("ada", 'g"r\\a\nce', "h\u00e4"))]}
        text = self.metrics(document, *self.HOST, "--label", "job=x").raw.decode()
        labels = ('job="x",hostName="ada"', 'job="x",hostName="g\\"r\\\\a\\nce"', 'job="x",hostName="h\u00e4"')
        self.assertEqual(text.split("\n"), [
            "# TYPE up gauge", "# HELP up cpuOnline", *[f"up{{{label}}} {i}" for i, label in enumerate(labels)],
            "# TYPE read counter", "# HELP read memTotal",
            *[f"read_total{{{label}}} {2**63 + i}" for i, label in enumerate(labels)], "# EOF", ""])

    def page(self):
        """A page with everything on it: counters, gauges, units, times, labels and helps that have to be escaped."""
        names = {"40001": {"tag": "queue_depth", "kind": "gauge", "unit": "1", "text": "jobs that\nwait in \\ order"},
                 "40002": {"tag": "jobs_done", "kind": "counter"}, "40003": {"tag": "up_seconds", "kind": "gauge", "unit": "seconds"}}
        (self.folder / "own.json").write_text(json.dumps(names))
        document = {"element": "system", "children": [{"element": "host", "children": [
            leaf("hostName", name), leaf("#40001", -i, "Sint32"), leaf("#40002", 2**53 + 2 * i, "Uint64"), leaf("#40003", i),
            leaf("memTotal", 2**100, "Uint128"), leaf("timestamp", "2024-05-01T10:20:30.5Z", "UTC Timestamp")]}
            for i, name in enumerate(("ada", 'g"r\\a\nce', "h\u00e4", ""))]}
        return self.metrics(document, "--dictionary", self.folder / "own.json", "--each", "/system/host", "--col", "host=hostName",
                            "--col", "queue_depth", "--col", "jobs_done", "--col", "up_seconds", "--col", "mem=memTotal",
                            "--col", "seen=timestamp", "--label", "job=x").raw

    def test_a_parser_of_metrics_takes_it(self):
        found = self.in_python("from prometheus_client.openmetrics import parser", """
import json
families = parser.text_string_to_metric_families(sys.stdin.read())
print(json.dumps([[f.name, f.type, f.unit, f.documentation, [[s.name, s.labels, s.value] for s in f.samples]] for f in families]))
""", self.page())
        labels = [{"job": "x", "host": name} for name in ("ada", 'g"r\\a\nce', "h\u00e4", "")]

        def samples(name, values):
            return [[name, label, value] for label, value in zip(labels, values)]
        self.assertEqual(json.loads(found), [
            ["queue_depth", "gauge", "", "jobs that\nwait in \\ order", samples("queue_depth", [-i for i in range(4)])],
            ["jobs_done", "counter", "", "jobs_done", samples("jobs_done_total", [2**53 + 2 * i for i in range(4)])],
            ["up_seconds", "gauge", "seconds", "up_seconds", samples("up_seconds", range(4))],
            ["mem", "gauge", "", "memTotal", samples("mem", [2**100] * 4)],
            ["seen", "gauge", "", "timestamp", samples("seen", [1714558830.5] * 4)]])

    @unittest.skipUnless(shutil.which("promtool"), "promtool is not installed")
    def test_promtool_reads_it(self):
        # 3: it was read, and something is not as its authors would name it.
        done = subprocess.run(["promtool", "check", "metrics"], input=self.page(), capture_output=True, check=False)
        self.assertIn(done.returncode, (0, 3), done.stderr)
        self.assertNotIn(b"error", done.stderr)
        broken = subprocess.run(["promtool", "check", "metrics"], input=self.page().replace(b"} ", b" "), capture_output=True,
                                check=False)
        self.assertEqual(broken.returncode, 1, broken.stderr)

    def test_rows_that_nothing_tells_apart_are_refused(self):
        document = {"element": "system", "children": [{"element": "host", "children": [leaf("cpuOnline", 1)]}] * 2}
        result = self.metrics(document, *self.HOST, status=2)
        self.assertIn("two rows have the same labels", result.err)
        self.assertEqual(result.out, "")
        self.metrics(document, "--each", "//host", "--col", "a/b=cpuOnline", status=2)
        self.metrics(document, "--each", "//host", "--col", "#60111", status=2)


@unittest.skipIf(EMULATOR, "an emulator is slow to begin")
@unittest.skipIf(WINDOWS or EMULATOR, "the engine is started on systems that name open files")
class Parquet(Table):
    """What becomes of it without the engine, and with one that does not do what it should; with it: duckdb/tests."""

    def parquet(self, engine, *arguments, status=2):
        env = {**os.environ, "TAV_DUCKDB": str(engine), "TAV_DUCKDB_EXTENSION": "x"}
        path = self.folder / "a.tav"
        path.write_bytes(STREAM)
        out = self.folder / "out.parquet"
        result = self.table(path, *HOSTS, *arguments, "--format", "parquet", "-o", out, status=status, env=env)
        self.assertEqual(sorted(os.listdir(self.folder)), sorted({"a.tav", "engine"} & set(os.listdir(self.folder))))
        return result

    def engine(self, script):
        path = self.folder / "engine"
        path.write_text("#!/bin/sh\n" + script)
        path.chmod(0o755)
        return path

    def test_without_the_engine(self):
        for engine in ("", "no-program-has-this-name"):
            self.assertIn("'duckdb' is not there", self.parquet(engine).err)
        self.assertIn("KOR_RC_NO_SUCH_FILE", self.parquet(self.folder / "none").err)
        self.assertIn("the extension is not there", self.parquet(self.engine("exit 1")).err)

    def test_an_engine_that_fails(self):
        begin = "statement=$(cat)\ncase $statement in *COPY*) ;; *) exit 0 ;; esac\n"
        for script, told in (("exit 0", "without a table"), ("printf PAR1xyz >&3", "without a table"),
                             ("printf xyzPAR1 >&3", "without a table"), ("printf PAR1 >&3", "without a table"),
                             ("printf PAR1abcdPAR1 >&3; exit 5", "status 5"),
                             ("printf PAR1abcdPAR1 >&3; kill -9 $$", "status 137"), ("echo PAR1abcdPAR1; exit 0", "without a table")):
            with self.subTest(script=script):
                self.assertIn(told, self.parquet(self.engine(begin + script)).err)

    def test_what_it_is_asked_for(self):
        """A statement of one line, file numbers 3 and 4, and no signal that this program ignores."""
        script = f"cat > {self.folder}/asked; printf PAR1; printf PAR1abcdPAR1 >&3; grep SigIgn /proc/self/status > {self.folder}/signals"
        env = {**os.environ, "TAV_DUCKDB": str(self.engine(script)), "TAV_DUCKDB_EXTENSION": "a'\\b\n"}
        path = self.folder / "a.tav"
        path.write_bytes(STREAM)
        names = self.folder / "names.json"
        names.write_text('{"40001": {"tag": "own"}}')
        for jobs, threads in (((), 1), (("-j", "3"), 3)):
            result = self.table(path, *HOSTS, "--format", "parquet", "--dictionary", names, *jobs, env=env)
            self.assertEqual(result.out, "PAR1abcdPAR1")
            asked = (self.folder / "asked").read_text().splitlines()
            self.assertEqual(asked[0], r"LOAD E'a''\\b\x0a';")
            self.assertEqual(asked[1:], [
                f"SET threads = 1; COPY (SELECT c0 AS \"n\" FROM read_tav_table([E'{path}'], each := E'/system/host', "
                f"columns := {{'c0': E'#60111'}}, threads := {threads}, dictionary := '/dev/fd/4')) TO '/dev/fd/3' "
                "(FORMAT parquet, USE_TMP_FILE false);"])
        if os.path.exists("/proc/self/status"):
            ignored = int((self.folder / "signals").read_text().split()[1], 16)
            self.assertEqual(ignored & (1 << 12 | 1 << 24), 0)  # SIGPIPE, SIGXFSZ

    def test_what_does_not_go_with_it(self):
        for arguments in (("-",), ("/dev/null",), ("--rate", "--counter", "n"), ("--from", "8"), ("--crlf",)):
            with self.subTest(arguments=arguments):
                self.parquet(self.engine("exit 0"), *arguments)


class Growing(Table):
    def test_what_is_there_is_read(self):
        path = self.folder / "g.tav"
        whole = system(hosts=3)
        path.write_bytes(b"\xff" * 8 + whole[8:])  # its root was never closed
        self.assertEqual(len(self.table(path, *HOSTS).out.splitlines()), 4)
        path.write_bytes(b"\xff" * 8 + whole[8:-5])
        result = self.table(path, *HOSTS, status=1)
        self.assertEqual(len(result.out.splitlines()), 3)


if __name__ == "__main__":
    unittest.main()
