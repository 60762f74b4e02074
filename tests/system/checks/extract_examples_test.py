"""The programs of a Markdown page are found, and blocks that are no programs are refused."""
import importlib.util
import pathlib
import tempfile
import unittest

ROOT = pathlib.Path(__file__).resolve().parents[3]
SPEC = importlib.util.spec_from_file_location("extract_examples", ROOT / "tests" / "system" / "docs" / "extract_examples.py")
extract_examples = importlib.util.module_from_spec(SPEC)
SPEC.loader.exec_module(extract_examples)

PROGRAM = "int main()\n{\n  return 0;\n}\n"


def page(*infos_and_bodies):
    return "text\n\n" + "\n".join(f"```{info}\n{body}```\n" for info, body in infos_and_bodies)


class ExtractExamples(unittest.TestCase):
    def test_takes_programs_with_their_line(self):
        found = list(extract_examples.programs(page(("sh", "./demo.sh\n"), ("cpp", PROGRAM))))
        self.assertEqual(found, [(8, PROGRAM, ".cpp")])

    def test_takes_programs_in_c_as_such(self):
        self.assertEqual(list(extract_examples.programs(page(("c", PROGRAM)))), [(4, PROGRAM, ".c")])

    def test_passes_over_fragments_and_other_languages(self):
        text = page(("cpp fragment", "f(x);\n"), ("cpp-fragment", "f(x);\n"), ("c fragment", "f(x);\n"), ("", "int main()\n"), ("text", "x\n"))
        self.assertEqual(list(extract_examples.programs(text)), [])

    def test_refuses_what_is_not_a_program(self):
        for text in (page(("cpp", "f(x);\n")), page(("c++", PROGRAM)), page(("cpp snippet", PROGRAM)), page(("c", "f(x);\n")), "```cpp\nint main()\n"):
            with self.subTest(text=text), self.assertRaises(extract_examples.BadBlock):
                list(extract_examples.programs(text))

    def test_takes_a_longer_fence_whole(self):
        text = "````cpp\n// ```\n" + PROGRAM + "````\n"
        self.assertEqual(list(extract_examples.programs(text)), [(2, "// ```\n" + PROGRAM, ".cpp")])

    def test_writes_and_cleans_the_folder(self):
        with tempfile.TemporaryDirectory() as folder:
            root = pathlib.Path(folder)
            (root / "README.md").write_text(page(("cpp", PROGRAM), ("cpp", PROGRAM)))
            out = root / "out"
            self.assertEqual([path.name for path in extract_examples.extract(out, [root / "README.md"])],
                             ["README_1.cpp", "README_2.cpp"])
            self.assertTrue((out / "README_1.cpp").read_text().startswith('#line 4 "README.md"\n'))
            (root / "README.md").write_text(page(("cpp", PROGRAM)))
            extract_examples.extract(out, [root / "README.md"])
            self.assertEqual([path.name for path in out.iterdir()], ["README_1.cpp"])


if __name__ == "__main__":
    unittest.main()
