"""One stream has the same nodes by every face: the plain operations, the C++ layer, the C interface and the program find
what was written, in every form."""
import itertools
import json
import os
import pathlib
import subprocess
import sys
import tempfile
import unittest

sys.path.insert(0, str(pathlib.Path(__file__).resolve().parent.parent / "tools"))
from support import BIG_ENDIAN, generate, tav  # noqa: E402  (behind the path that leads to it)

FACE = os.environ["TAV_NODES_FACE"]
FORMS = list(itertools.product(("native", "swapped"), (32, 64), ("plain", "padded")))
# Closed groups, and no uncounted bytes: what the plain operations see of others is a matter of its own.
KINDS = [(), ("--pairs",), ("--pairs", "--mixed"), ("--pairs", "--utf8"), ("--wild", "--pairs", "--mixed")]
ENDS = (65000, 65001)
HEADERS = {32: 8, 64: 16}


def written(path, form, seed, kind):
    """Writes a stream; the nodes in it as rows of offset, bits of the header, type, element and depth."""
    order, bits, padding = form
    options = [*kind, "--seed", seed, "--nodes", 60]
    options += ["--swap"] * (order == "swapped") + ["--root32"] * (bits == 32) + ["--align"] * (padding == "padded")
    told = generate(path, *options)
    return [(offset, 64 if header == 16 else 32, type_, elm, depth)
            for offset, header, _, type_, elm, depth in told["nodes"] if elm not in ENDS]


def told_by(face, path, form):
    """What a face tells of a file: rows as `written` has them, and sizes and payloads apart."""
    done = subprocess.run([FACE, face, str(path), *map(str, form)], capture_output=True, timeout=60)
    if done.returncode != 0:
        raise AssertionError(done.stderr.decode())
    rows, payloads = [], []
    for line in done.stdout.decode().splitlines():
        offset, bits, size, type_, elm, depth, payload = line.split(" ")
        rows.append((int(offset), int(bits), int(type_), int(elm), int(depth)))
        payloads.append((int(size), payload))
    return rows, payloads


def told_by_program(path, form):
    order, bits, padding = form
    big = (order == "swapped") != BIG_ENDIAN
    result = tav("json", "--lines", path, "--byte-order", "big" if big else "little", "--root", bits,
                 "--align" if padding == "padded" else "--no-align")
    if result.status != 0:
        raise AssertionError(result.err)
    lines = [json.loads(line) for line in result.raw.split(b"\n")[1:-1]]
    return [(line["offset"], line["header"], line["id"], line["depth"])
            for line in lines if "id" in line and line["id"] not in ENDS]


class Nodes(unittest.TestCase):
    def setUp(self):
        folder = tempfile.TemporaryDirectory(prefix="tav-nodes-")
        self.addCleanup(folder.cleanup)
        self.file = pathlib.Path(folder.name) / "x.tav"

    def payloads_in(self, rows, payloads):
        """The bytes that the file has where each payload is said to be."""
        whole = self.file.read_bytes()
        return [(size, whole[row[0] + HEADERS[row[1]]:][:size].hex() if payload or row[2] not in (1, 2) else "")
                for row, (size, payload) in zip(rows, payloads)]

    def test_every_face_has_the_nodes_that_were_written(self):
        for seed, (form, kind) in enumerate(itertools.product(FORMS, KINDS), 1):
            with self.subTest(form=form, kind=kind, seed=seed):
                expected = written(self.file, form, seed, kind)
                rows, payloads = told_by("operations", self.file, form)
                self.assertEqual(rows, expected)
                self.assertEqual(payloads, self.payloads_in(rows, payloads))
                self.assertTrue(any(payload for _, payload in payloads))
                for face in ("layer", "c"):
                    self.assertEqual(told_by(face, self.file, form), (rows, payloads), face)
                self.assertEqual(told_by_program(self.file, form),
                                 [(offset, bits, elm, depth) for offset, bits, _, elm, depth in expected])


if __name__ == "__main__":
    unittest.main()
