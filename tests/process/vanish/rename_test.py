# SPDX-License-Identifier: GPL-2.0-or-later
"""After a rename of a folder nothing is found under both paths, whatever order its events come in.

Asked is at moments before and behind the first commit of what the events need, too. How long a file
is found under neither path is printed: only while the events are worked on.
"""

import os
import time

from harness import main
from harness.sampling import SamplingTest, moments_of
from harness.scale import IS_LONG

FILES = 200_000 if IS_LONG else 3_000
IN_A_FOLDER = 500
EACH = FILES // 30

CREATE = 0x40
DELETE = 0x80
RENAME = 0x100
REINDEX = 0x10000


def name(number):
    word = "keepsake" if number % EACH == 0 else "other"
    return f"d{number // IN_A_FOLDER}/{word} {number}.txt"


class RenameTest(SamplingTest):
    def setUp(self):
        super().setUp()
        self.root = self.make_share(files=(f"m/{name(i)}" for i in range(FILES)))
        self.known = {name(i) for i in range(0, FILES, EACH)}
        self.start(debug=False)
        self.await_all_drained()

    def at(self, below):
        return f"{self.root}/{below}"

    def event(self, code, below, **more):
        return {"event": code, "path": self.at(below), **more}

    def indexed(self, top):
        """How many entries the index has at and below the path."""
        top = os.fsencode(self.at(top))
        return sum(path == top or path.startswith(top + b"/") for path in self.dump())

    def check(self, old, new, *lines, over=True, changes=FILES):
        """Appends the lines and asks until they are worked off.

        `over`: they tell everything. `changes`: about so many documents are added; where it is
        none, the work has one commit, and is not held.
        """
        indexed = []  # under the new path, at the moments
        left = {}  # file: when it was last found under its old path
        arrived = {}  # file: when it was first found under its new path

        def sample(drained):
            asked = time.monotonic()
            found = self.found("keepsake")
            under = {
                top: {
                    path.removeprefix(self.at(top) + "/")
                    for path in found
                    if path.startswith(self.at(top) + "/")
                }
                for top in (old, new)
            }
            self.assertEqual(under[old] & under[new], set(), "found under both paths")
            if self.is_held:
                indexed.append(self.indexed(new))
            if not self.has_begun():
                self.assertEqual(under[old] | under[new], self.known, "gone before its pass")
            if drained and over:
                self.assertEqual(under[new], self.known, "not there after its pass")
            left.update(dict.fromkeys(under[old], asked))
            for file in under[new] - arrived.keys():
                arrived[file] = time.monotonic()

        before = self.indexed(new)
        if changes > 0:
            self.hold_at(*moments_of(changes))
        self.append("alpha", *lines)
        count = self.sample_until_drained(sample)
        if changes > 0:
            self.assertEqual(indexed[0], before)
            self.assertGreater(indexed[1], before)
        gaps = [arrived[file] - left[file] for file in arrived.keys() & left.keys()]
        longest = max(gaps, default=0)
        print(f"{count} questions, at most {longest:.3f} s under neither path", flush=True)

    def move(self, new):
        os.rename(self.at("m"), self.at(new))

    def test_one_event_of_a_rename(self):
        self.move("n")
        self.check("m", "n", self.event(RENAME, "n", path_old=self.at("m")))
        self.assert_index(self.root)

    def test_deletion_comes_first(self):
        self.move("n")
        self.check("m", "n", self.event(DELETE, "m"), self.event(REINDEX, "n"))
        self.assert_index(self.root)

    def test_addition_comes_first(self):
        self.move("n")
        self.check("m", "n", self.event(REINDEX, "n"), self.event(DELETE, "m"))
        self.assert_index(self.root)

    def test_addition_comes_a_pass_earlier(self):
        self.move("n")
        self.check("m", "n", self.event(REINDEX, "n"))
        self.check("m", "n", self.event(DELETE, "m"), changes=0)
        self.assert_index(self.root)

    def test_files_come_one_by_one_before_the_folder_is_told(self):
        self.move("n")
        files = (self.event(CREATE, f"n/{file}") for file in sorted(self.known))
        self.check("m", "n", *files, over=False, changes=0)
        self.check("m", "n", self.event(RENAME, "n", path_old=self.at("m")))
        self.assert_index(self.root)

    def test_new_folder_was_told_of_before_the_rename(self):
        self.move("n")
        self.check(
            "m", "n", self.event(CREATE, "n"), self.event(RENAME, "n", path_old=self.at("m"))
        )
        self.assert_index(self.root)

    def test_folder_moves_below_another_and_the_old_name_is_taken_again(self):
        self.make_files(self.root, "a/")
        self.move("a/n")
        self.make_files(self.root, "m/fresh.txt")
        self.check("m", "a/n", self.event(REINDEX, "a"), self.event(REINDEX, "m"))
        self.assert_index(self.root)


if __name__ == "__main__":
    main()
