"""recover brings back every node that is due by oracle.py, from streams whose form it has to find out. A share of the damages
that damages.py makes; it is a command, which prints the figures."""
import os
import unittest

import damages

# The first of them cover every kind with and without pairs.
SHARE = int(os.environ.get("TAV_DAMAGES", "660"))
FIRST = int(os.environ.get("TAV_FIRST_DAMAGE", "0"))


class Damages(unittest.TestCase):
    def test_no_node_is_lost_whose_enclosing_groups_can_be_known(self):
        due, bad = 0, []
        for found in damages.verdicts(range(FIRST, FIRST + SHARE)):
            due += found.due
            bad += [damages.complaint(found)] if damages.complaint(found) else []
        self.assertEqual(bad, [])
        if SHARE >= 100:  # a few may be streams of which nothing is left
            self.assertGreater(due, SHARE * 100)


if __name__ == "__main__":
    unittest.main()
