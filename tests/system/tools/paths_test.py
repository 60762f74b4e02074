"""Every path that is printed leads back to its node; bad paths are explained."""
import json
import struct
import unittest

from support import ToolTest, generate, tav, tree_rows


class Paths(ToolTest):
    def test_every_printed_path_leads_back_to_its_node(self):
        path = self.folder / "g.tav"
        for seed in range(6):
            generate(path, "--seed", seed, "--nodes", 60, "--pairs", "--mixed", *(["--wild"] if seed % 2 else []))
            nodes, _ = tree_rows(tav("tree", path, "--paths", "--width", "0").out)
            result = tav("get", path, "--json", *[node[2] for node in nodes])
            found = [json.loads(line) for line in result.out.splitlines()]
            self.assertEqual(sorted((one["offset"], one["path"]) for one in found),
                             sorted((node[0], node[2]) for node in nodes))

    def test_more_different_siblings_than_are_counted_are_named_by_offset(self):
        path = self.folder / "many.tav"
        children = b"".join(struct.pack("<QIHHB", 1, 0, 51, 40000 + i, i % 256) for i in range(300)) * 2
        path.write_bytes(struct.pack("<QIHH", len(children), 0, 2, 60100) + children)
        nodes, _ = tree_rows(tav("tree", path, "--paths", "--width", "0").out)
        self.assertEqual(len(nodes), 601)
        self.assertIn("[@0x", nodes[-1][2])
        for node in (nodes[1], nodes[300], nodes[301], nodes[600]):
            found = json.loads(tav("get", path, "--json", node[2]).out)
            self.assertEqual(found["offset"], node[0])

    def test_stars_stand_for_nodes_and_levels(self):
        path = self.snapshot()
        everything = tav("get", path, "--all", "--paths", "**").out.splitlines()
        self.assertEqual(len(everything), 16)
        self.assertEqual(len(tav("get", path, "--all", "--paths", "/system/*/*").out.splitlines()), 5)
        self.assertEqual(tav("get", path, "**/cpuOnline").out, tav("get", path, "/system/host/cpu/cpuOnline").out)
        self.assertEqual(tav("get", path, "/TAV_ELM_CMN_SYSTEM/#60102/60103").out,
                         tav("get", path, "/system/host/hostName").out)

    def test_bad_paths_are_wrong_usage(self):
        path = self.snapshot()
        for bad in ("", "//host", "/system/", "/system[0]", "/system[", "/system[x]",
                    "/system[@]", "/**[2]", "/#70000", "/system]"):
            with self.subTest(path=bad):
                result = tav("get", path, bad)
                self.assertEqual((result.status, result.out), (2, ""))
                self.assertTrue(result.err.startswith("tav: path '"), result.err)

    def test_a_path_that_leads_nowhere_does_not_keep_the_others_back(self):
        path = self.snapshot()
        name = tav("get", path, "/system/host/os/osName").out
        for nowhere in ("/nope", "/system/hots", "/system/host/node", "/system/host[2]"):
            with self.subTest(path=nowhere):
                result = tav("get", path, nowhere, "/system/host/os/osName", nowhere)
                self.assertEqual((result.status, result.out), (1, name))
                self.assertIn(f"tav: {path}: {nowhere}: no match", result.err)
                self.assertEqual(tav("hex", path, "--path", nowhere).status, 1)

    def test_a_difference_is_not_sought_with_a_name_that_no_element_has(self):
        path = self.snapshot()
        for ignored in ("/nope", "/"):
            result = tav("diff", path, path, "--ignore", ignored)
            self.assertEqual((result.status, result.out), (2, ""))

    def test_a_slash_alone_leads_to_the_roots(self):
        path = self.folder / "roots.tav"
        root = struct.pack("<QIHHQIHHI", 20, 0, 2, 60100, 4, 0, 55, 307, 7)
        path.write_bytes(root * 2)
        found = [json.loads(line) for line in tav("get", path, "--all", "--json", "/").out.splitlines()]
        self.assertEqual([(one["path"], one["offset"]) for one in found], [("/system", 0), ("/system[2]", 36)])
        self.assertEqual(tav("get", path, "/").out, "/system: group of 20 bytes\n")
        self.assertEqual(tav("hex", path, "--path", "/").raw, tav("hex", path, "--at", 0).raw)

    def test_a_misspelt_name_gets_a_hint(self):
        self.assertIn("did you mean host?", tav("get", self.snapshot(), "/system/hostt").err)


if __name__ == "__main__":
    unittest.main()
