# SPDX-License-Identifier: GPL-2.0-or-later
"""A known file is found at every moment while its share is indexed again or repaired."""

import os

from harness import main
from harness.sampling import SamplingTest
from harness.scale import IS_LONG

FILES = 200_000 if IS_LONG else 3_000
IN_A_FOLDER = 500
EACH = FILES // 30  # every so many files, one is known


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

    def check_while_worked_on(self):
        def sample(_):
            self.assertEqual(sorted(self.found("keepsake")), self.known)

        count = self.sample_until_drained(sample)
        print(f"{count} questions meanwhile, each found all {len(self.known)} known files")

    def damage(self):
        """Changes the disk without an event, beside the known files."""
        for number in range(1, FILES, EACH):
            os.rename(f"{self.root}/{self.name(number)}", f"{self.root}/moved {number}.txt")
            os.unlink(f"{self.root}/{self.name(number + 1)}")

    def test_share_is_indexed_again(self):
        self.damage()

        self.append("alpha", {"event": 0x10000, "path": self.root})

        self.check_while_worked_on()
        self.assert_index(self.root)

    def test_share_is_indexed_again_after_it_was_flagged(self):
        self.damage()

        self.append("alpha", {"event": 0x200, "path": self.root})

        self.check_while_worked_on()
        self.assert_index(self.root)

    def test_share_is_repaired(self):
        if b"--repair" not in self.ctl("verify", "--help").out:
            self.skipTest("verify cannot repair")
        self.damage()

        self.ctl("verify", "--repair", "alpha")

        self.check_while_worked_on()
        self.assert_index(self.root)


if __name__ == "__main__":
    main()
