"""info and tree find exactly what was written, in every form."""
import itertools
import unittest

from encode import END
from support import ToolTest, generate, tav, tree_rows

FORMS = list(itertools.product((False, True), repeat=3))
CONTENTS = [(), ("--pairs",), ("--strings",), ("--utf8", "--pairs"), ("--strings", "--utf8", "--pairs", "--mixed"),
            ("--open", "--pairs"), ("--unfinished", "--pairs"), ("--unfinished", "--strings"),
            ("--open", "--unfinished", "--pairs", "--strings", "--mixed")]


def options(form):
    return [name for name, on in zip(("--swap", "--align", "--root32"), form) if on]


def info_fields(text):
    fields = {}
    for line in text.splitlines():
        fields.setdefault(line[:18].strip(), line[18:])
    return fields


def node_counts(made):
    """Nodes but for end elements, and these, as info counts them."""
    ends = sum(node[4] == END for node in made["nodes"])
    return str(len(made["nodes"]) - ends), str(ends) if ends else "none"


class Forms(ToolTest):
    def everything(self):
        path = self.folder / "g.tav"
        for form, contents in itertools.product(FORMS, CONTENTS):
            for seed, nodes in ((1, 12), (2, 60), (3, 200), (4, 30)):
                arguments = [*options(form), *contents, "--seed", seed, "--nodes", nodes]
                with self.subTest(arguments=arguments):
                    yield path, generate(path, *arguments)

    def test_info_recognises_every_form(self):
        for path, made in self.everything():
            result = tav("info", path)
            found = info_fields(result.out)
            self.assertEqual(result.status, 0, result.out)
            self.assertTrue(found["byte order"].endswith("not this machine's" if made["swapped"] else ", this machine's"))
            self.assertEqual("not" in found["byte order"], made["swapped"])
            self.assertEqual(found["root header"], f"{made['root']}-bit")
            if "the same nodes are found" not in result.out:
                self.assertEqual(found["alignment"], "padded to 8" if made["aligned"] else "none")
            self.assertEqual(found["eye/size pairs"], str(made["pairs"] or "none"))
            self.assertEqual(int(found.get("UTF-8 strings", "0").split()[0]), made["strings"])
            self.assertEqual((found["nodes"].split(",")[0], found["end elements"]), node_counts(made))
            self.assertEqual(found["open groups"].split(",")[0], str(made["open"] or "none"))
            self.assertEqual(found["depth"], str(1 + max(node[5] for node in made["nodes"] if node[4] != END)))
            self.assertEqual(found["damaged"], "none found")

    def test_tree_lists_every_node_that_was_written(self):
        for path, made in self.everything():
            result = tav("tree", path, "--paths", "--width", "0", "--ends")
            nodes, damaged = tree_rows(result.out)
            self.assertEqual((result.status, damaged), (0, []))
            self.assertEqual([(node[0], node[2].count("/") - 1) for node in nodes],
                             [(node[0], node[5]) for node in made["nodes"]])

    def test_zeros_behind_the_stream_are_no_damage(self):
        path = self.folder / "g.tav"
        for form in FORMS:
            with self.subTest(form=form):
                made = generate(path, *options(form), "--zeros", 5000, "--pairs")
                result = tav("info", path)
                self.assertEqual(result.status, 0, result.out)
                self.assertEqual(info_fields(result.out)["zeros at the end"], "5000 bytes")
                found = info_fields(result.out)
                self.assertEqual((found["nodes"].split(",")[0], found["end elements"]), node_counts(made))

    def test_options_override_what_is_recognised(self):
        path = self.folder / "g.tav"
        generate(path, "--swap")
        self.assertEqual(tav("tree", path, "--byte-order", "swapped").status, 0)
        self.assertEqual(tav("tree", path, "--byte-order", "native").status, 3)
        self.assertNotEqual(tav("info", path, "--root", "32").status, 0)
        self.assertNotEqual(tav("info", path, "--align").status, 0)
        self.assertEqual(tav("info", path, "--align", "--no-align").status, 2)


if __name__ == "__main__":
    unittest.main()
