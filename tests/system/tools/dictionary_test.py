"""Names of own elements: every command shows and takes them, from every place that they can come from."""
import json
import os
import unittest

from json_test import Folder
from support import tav

DOCUMENT = {"system": {"hostName": "ada", "#40001": 7, "#40002": [{"#40003": "x"}, {"#40003": "y"}]}}
NAMES = {"40001": {"tag": "queueDepth", "kind": "gauge", "unit": "1", "text": "waiting jobs"},
         "40002": {"tag": "jobs"}, "40003": {"tag": "job_owner", "kind": "text"}}


class OwnNames(Folder):
    def setUp(self):
        super().setUp()
        self.stream = self.folder / "x.tav"
        self.names = self.folder / "own.json"
        self.names.write_text(json.dumps(NAMES))
        self.run_tav("build", "-o", self.stream, stdin=json.dumps(DOCUMENT).encode())

    def run_tav(self, *arguments, status=0, **more):
        result = tav(*arguments, **more)
        self.assertEqual((result.status, result.err), (status, ""))
        return result

    def out(self, *arguments, **more):
        return self.run_tav(*arguments, "--dictionary", self.names, **more).out

    def test_every_command_shows_them(self):
        tree = [line.split()[2] for line in self.out("tree", self.stream).splitlines()]
        self.assertEqual(tree, ["system", "hostName", "queueDepth", "jobs", "job_owner", "jobs[2]", "job_owner"])
        self.assertEqual(self.out("get", self.stream, "--all", "--paths", "//job_*"),
                         "/system/jobs/job_owner\tx\n/system/jobs[2]/job_owner\ty\n")
        self.assertEqual(json.loads(self.out("get", self.stream, "--json", "//queueDepth"))["path"], "/system/queueDepth")
        self.assertIn("<queueDepth type=\"Uint32\">7</queueDepth>", self.out("xml", self.stream))
        self.assertIn("queueDepth", self.out("hex", self.stream, "--path", "/system/queueDepth"))
        self.assertIn("/system/jobs/job_owner", self.out("schema", self.stream))
        self.assertIn("\n  job_owner ", self.out("info", self.stream))
        self.assertIn({"element": "jobs", "id": 40002, "nodes": 2, "bytes": 32},
                      json.loads(self.out("info", "--json", self.stream))["elements"])
        only = self.out("tree", self.stream, "--only", "job_owner").splitlines()
        self.assertEqual([line.split()[2] for line in only], ["/system/jobs/job_owner", "/system/jobs[2]/job_owner"])

    def test_tables_take_them_and_know_what_counts(self):
        self.assertEqual(self.out("table", self.stream, "--each", "//jobs", "--col", "job_owner"),
                         "job_owner\nx\ny\n")
        names = {**NAMES, "40001": {**NAMES["40001"], "kind": "counter", "unit": "jobs"}}
        self.names.write_text(json.dumps(names))
        page = self.out("table", self.stream, "--each", "/system", "--col", "waiting_jobs=queueDepth",
                        "--format", "openmetrics")
        self.assertEqual(page.splitlines(), ["# TYPE waiting_jobs counter", "# UNIT waiting_jobs jobs",
                                             "# HELP waiting_jobs waiting jobs", "waiting_jobs_total 7", "# EOF"])
        result = tav("table", self.stream, "--each", "//jobs", "--col", "job_owner")
        self.assertEqual((result.status, result.out), (1, ""))
        self.assertIn("no element is called 'jobs'", result.err)

    def test_in_a_table_of_many_files_each_has_the_names_beside_it(self):
        files = []
        for i, tag in enumerate(("40001", "40002", "40001", None, "40001")):
            files.append(self.folder / f"{i}.tav")
            document = {"system": {"#40001": 1, "#40002": 2, "hostName": f"host{i}"}}
            self.run_tav("build", "-o", files[-1], stdin=json.dumps(document).encode())
            if tag:
                (self.folder / f"{i}.tav.names.json").write_text(json.dumps({tag: {"tag": "queueDepth"}}))
        result = tav("table", *files, "--each", "/system", "--col", "hostName", "--col", "queueDepth")
        self.assertEqual((result.status, result.out), (1, "hostName,queueDepth\nhost0,1\nhost1,2\nhost2,1\nhost4,1\n"))
        self.assertIn("no element is called 'queueDepth'", result.err)

    def test_what_cannot_be_read_is_told_with_what_helps(self):
        for command in (("table", "--each", "/system", "--col", "hostName"), ("schema",)):
            with self.subTest(command=command):
                many, one = tav(*command, self.stream, "-", "--spool-limit", 1, stdin=b"xx"), tav("tree", "-", "--spool-limit", 1, stdin=b"xx")
                self.assertEqual((many.status, many.err), (2, one.err))
                self.assertEqual(many.out, tav(*command, self.stream).out)

    def test_paths_lead_to_them(self):
        self.assertEqual(self.out("get", self.stream, "/system[queueDepth > 6]/jobs[job_owner='y']/job_owner"), "y\n")
        self.out("extract", self.stream, "//jobs", "-o", self.folder / "jobs.tav")
        self.assertEqual(self.out("get", self.folder / "jobs.tav", "--all", "--paths", "//job_owner"),
                         "/jobs/job_owner\tx\n/jobs[2]/job_owner\ty\n")
        self.assertEqual(self.out("set", self.stream, "/system/queueDepth", "9"), f"tav: {self.stream}: 1 node changed\n")
        self.assertEqual(self.out("get", self.stream, "/system/#40001"), "9\n")

    def test_attributes_are_those_of_the_xml(self):
        self.assertEqual(self.out("get", self.stream, "//*[not(@id)]", "--all", "--paths").count("\n"), 7)
        self.assertEqual(self.run_tav("get", self.stream, "//*[@id = 40001]").out, "7\n")
        self.assertEqual(tav("get", self.stream, "//*[@id = 40001]", "--dictionary", self.names).status, 1)

    def test_diff_names_them_and_matches_by_them(self):
        other = self.folder / "y.tav"
        document = {"system": {"hostName": "ada", "#40001": 8, "#40002": [{"#40003": "y"}, {"#40003": "z"}]}}
        self.run_tav("build", "-o", other, stdin=json.dumps(document).encode())
        lines = self.out("diff", self.stream, other, "--key", "job_owner", status=1).splitlines()
        self.assertEqual(sorted(line.split()[:2] for line in lines),
                         [["+", "/system/jobs[2]"], ["-", "/system/jobs"], ["~", "/system/queueDepth"]])
        ignoring = ("--key", "job_owner", "--ignore", "//jobs")
        self.assertEqual(len(self.out("diff", self.stream, other, *ignoring, status=1).splitlines()), 1)

    def test_check_names_them(self):
        broken = bytearray(self.stream.read_bytes())
        broken[-1 - 16 + 4] = 0xFF  # the size of the last text
        path = self.folder / "broken.tav"
        path.write_bytes(broken)
        result = tav("check", path, "--dictionary", self.names)
        self.assertEqual(result.status, 1)
        self.assertIn("/system/jobs[2]", result.out)

    def test_json_is_read_back_with_them_and_without(self):
        for style in ((), ("--compact",), ("--lines",)):
            text = self.out("json", self.stream, *style)
            self.assertIn("queueDepth", text)
            for names in ((), ("--dictionary", self.names)):
                made = self.folder / "made.tav"
                self.run_tav("build", "-o", made, "--force", *names, stdin=text.encode())
                self.assertEqual(made.read_bytes(), self.stream.read_bytes())

    def test_documents_by_hand_use_them(self):
        text = {"system": {"hostName": "ada", "queueDepth": 7, "jobs": [{"job_owner": "x"}, {"job_owner": "y"}]}}
        made = self.folder / "made.tav"
        self.out("build", "-o", made, stdin=json.dumps(text).encode())
        self.assertEqual(made.read_bytes(), self.stream.read_bytes())
        without = tav("build", "-o", made, "--force", stdin=json.dumps(text).encode())
        self.assertEqual(without.status, 2)
        self.assertIn('no element has the name "queueDepth"', without.err)

    def test_a_name_that_is_wrong_is_not_covered_by_an_id(self):
        for node, says in (({"element": "hostNme", "id": 60103}, 'no element has the name "hostNme"; did you mean hostName'),
                           ({"id": 60103, "element": "hostNme"}, 'no element has the name "hostNme"; did you mean hostName'),
                           ({"element": "hostName", "id": 40001}, "element and id do not agree: #60103 and #40001"),
                           ({"element": "queueDepth"}, 'no element has the name "queueDepth"')):
            result = tav("build", "-o", self.folder / "made.tav", stdin=json.dumps([{**node, "value": 7}]).encode())
            self.assertEqual(result.status, 2, node)
            self.assertIn(says, result.err)

    def test_the_nearest_name_is_of_either_kind(self):
        for name, near in (("queueDept", "queueDepth"), ("hostNme", "hostName")):
            result = tav("get", self.stream, f"/system/{name}", "--dictionary", self.names)
            self.assertEqual(result.status, 1)
            self.assertIn(f"did you mean {near}?", result.err)

    def test_options_go_before_the_environment_and_that_before_the_file_beside(self):
        def names(path, tag):
            (self.folder / path).write_text(json.dumps({"40001": {"tag": tag}}))
            return self.folder / path

        def shown(*options, **environment):
            result = tav("tree", self.stream, *options, env={**os.environ, **environment})
            self.assertEqual(result.status, 0, result.err)
            return result.out.splitlines()[2].split()[2]

        option, variable = names("option.json", "byOption"), names("variable.json", "byVariable")
        self.assertEqual(shown(), "#40001")
        names("tav-names.json", "byFolder")
        self.assertEqual(shown(), "byFolder")
        names("x.tav.names.json", "byFile")
        self.assertEqual(shown(), "byFile")
        self.assertEqual(shown(TAV_DICTIONARY=str(variable)), "byVariable")
        self.assertEqual(shown("--dictionary", option, TAV_DICTIONARY=str(variable)), "byOption")
        listed = os.pathsep.join(("", str(self.names), str(self.folder / "more.json")))
        (self.folder / "more.json").write_text('{"40009": {"tag": "more"}}')
        self.assertEqual(shown(TAV_DICTIONARY=listed), "queueDepth")

    def test_contradictions_of_one_rank_are_told_with_both_places(self):
        other = self.folder / "other.json"
        other.write_text('{\n "40001": {"tag": "depth"}}')
        both = ("--dictionary", self.names, "--dictionary", other)
        result = tav("tree", self.stream, *both)
        self.assertEqual((result.status, result.out), (2, ""))
        self.assertEqual(result.err, f"tav: {other}: line 2, column 2: the id 40001 is given otherwise at {self.names}: "
                                     "line 1, column 2\n")
        self.assertEqual(tav("tree", self.stream, "--dictionary", self.names, "--dictionary", self.names).status, 0)
        self.assertEqual(tav("tree", self.stream, "--dictionary", self.names,
                             env={**os.environ, "TAV_DICTIONARY": str(other)}).status, 0)

    def test_what_is_no_dictionary_ends_every_command(self):
        wrong = self.folder / "wrong.json"
        wrong.write_text('{"60103": {"tag": "a"}}')
        for command in (("tree", self.stream), ("info", self.stream), ("get", self.stream, "/system"), ("elements",),
                        ("build", "-"), ("diff", self.stream, self.stream), ("check", self.stream)):
            for path, says in ((wrong, "line 1, column 2"), (self.folder / "none.json", "none.json"), (self.folder, "")):
                result = tav(*command, "--dictionary", path, stdin=b"{}")
                self.assertEqual((result.status, result.out), (2, ""), (command, path))
                self.assertIn(says, result.err)

    def test_it_is_never_written_over(self):
        result = tav("json", self.stream, "--dictionary", self.names, "-o", self.names, "--force")
        self.assertEqual(result.status, 2)
        self.assertIn("is a file that is read", result.err)
        self.assertEqual(json.loads(self.names.read_text()), NAMES)

    def test_elements_lists_them_beside_the_others(self):
        line = self.out("elements", "queuedep*").splitlines()
        self.assertEqual(len(line), 1)
        self.assertEqual(line[0].split(maxsplit=3), ["40001", "-", "queueDepth", "gauge, 1: waiting jobs"])
        self.assertEqual(self.out("elements", "40003").split(), ["40003", "-", "job_owner", "text"])
        found = [json.loads(line) for line in self.out("elements", "--json", "job").splitlines()]
        self.assertEqual([entry["tag"] for entry in found if entry["id"] in (40002, 40003)], ["jobs", "job_owner"])
        one = json.loads(self.out("elements", "--json", "queueDepth"))
        self.assertEqual(one, {"id": 40001, **NAMES["40001"], "from": f"{self.names}: line 1, column 2"})
        self.assertEqual(json.loads(self.out("elements", "--json", "60103")),
                         {"id": 60103, "tag": "hostName", "name": "TAV_ELM_CMN_HOST_NAME",
                          "constant": "TAV_ELM_CMN_HOST_NAME"})
        without = tav("elements", "queueDepth")
        self.assertEqual((without.status, without.out), (1, ""))

    def test_the_one_that_ships_is_one(self):
        shipped = os.path.join(os.path.dirname(__file__), "../../../packaging/snapshot-names.json")
        with open(shipped, encoding="utf-8") as file:
            given = json.load(file)
        listed = [json.loads(line) for line in tav("elements", "--json", "--dictionary", shipped).out.splitlines()]
        self.assertEqual({str(entry["id"]): entry["tag"] for entry in listed if "from" in entry},
                         {id: entry["tag"] for id, entry in given.items()})


if __name__ == "__main__":
    unittest.main()
