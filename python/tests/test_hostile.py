"""Whatever the bytes are, what goes wrong is a tav.TavError, and each way to read finds the same nodes."""
from __future__ import annotations

import random

import hostile


def test_what_fuzzers_keep_is_read_or_refused(tmp_path):
    looking = hostile.Looking(tmp_path)
    for _, data in hostile.kept():
        looking.look(data)
    assert looking.inputs > 1000 and looking.read > 1000 and looking.refused > 1000


def test_golden_streams_whose_nodes_are_damaged_are_read_or_refused(tmp_path):
    looking = hostile.Looking(tmp_path)
    rng = random.Random(3)
    vectors = hostile.golden()
    for _ in range(5):
        for data in vectors.values():
            looking.look(hostile.damaged(data, rng))
    assert looking.inputs == 5 * len(vectors) and looking.read > looking.inputs
