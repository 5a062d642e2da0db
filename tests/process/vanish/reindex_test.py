# SPDX-License-Identifier: GPL-2.0-or-later
"""A known file is found at every moment while its share is indexed again or repaired."""

import itertools
import os

from harness import main
from harness.oracle import expected_entries
from harness.sampling import SamplingTest, moments_of
from harness.scale import IS_LONG

FILES = 200_000 if IS_LONG else 3_000
IN_A_FOLDER = 500
EACH = FILES // 30  # every so many files, one is known
STALE = 2_700  # of the others
NEW = 6_000
MOST_LINES = 5_000  # that a repair queues


class ReindexTest(SamplingTest):
    def setUp(self):
        super().setUp()
        self.root = self.make_share(files=map(self.name, range(FILES)))
        self.start(debug=False)
        self.await_all_drained()
        self.known = sorted(f"{self.root}/{self.name(i)}" for i in range(0, FILES, EACH))

    def name(self, number):
        word = "keepsake" if number % EACH == 0 else "other"
        return f"d{number // IN_A_FOLDER}/{word} {number}.txt"

    def undone(self):
        """How many paths the index does not have as the disk has them."""
        wanted, held = expected_entries(self.root), self.entries()
        return sum(wanted.get(path) != held.get(path) for path in wanted.keys() | held.keys())

    def check_while(self, begin, changes):
        """Asks while what `begin` queues is worked off: about so many changes.

        At chosen moments it is seen that the index is as it was, or half done.
        """
        at_first = self.undone()
        undone = []  # at the moments
        self.hold_at(*moments_of(changes))
        begin()

        def sample(_):
            self.assertEqual(sorted(self.found("keepsake")), self.known)
            if self.is_held:
                undone.append(self.undone())

        count = self.sample_until_drained(sample)
        print(f"{count} questions meanwhile, each found all {len(self.known)} known files")
        self.assertEqual(undone[0], at_first)
        self.assertEqual(undone, sorted(undone, reverse=True))
        self.assertIn(undone[-1], range(1, at_first))
        self.assert_index(self.root)

    def damage(self):
        """Changes the disk without an event, beside the known files."""
        for number in range(1, FILES, EACH):
            os.rename(f"{self.root}/{self.name(number)}", f"{self.root}/moved {number}.txt")
            os.unlink(f"{self.root}/{self.name(number + 1)}")
        others = (number for number in range(FILES) if number % EACH > 2)
        for number in itertools.islice(others, STALE):
            os.utime(f"{self.root}/{self.name(number)}", (0, 0))

    def test_share_is_indexed_again(self):
        self.damage()
        self.check_while(lambda: self.append("alpha", {"event": 0x10000, "path": self.root}), FILES)

    def test_share_is_indexed_again_after_it_was_flagged(self):
        self.damage()
        self.check_while(lambda: self.append("alpha", {"event": 0x200, "path": self.root}), FILES)

    def repair(self):
        """The number of differences that it found."""
        return self.ctl("verify", "--repair", "alpha").out.count(b"\n")

    def test_share_is_repaired(self):
        self.damage()

        def begin():
            differences = self.repair()
            self.assertGreater(differences, STALE)
            self.assertLess(differences, MOST_LINES)

        self.check_while(begin, STALE)

    def test_share_is_repaired_where_too_much_differs_for_a_line_each(self):
        self.damage()
        names = (f"d{number % (FILES // IN_A_FOLDER)}/new {number}.txt" for number in range(NEW))
        self.make_files(self.root, *names)

        self.check_while(lambda: self.assertGreater(self.repair(), MOST_LINES), NEW + STALE)


if __name__ == "__main__":
    main()
