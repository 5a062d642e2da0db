# SPDX-License-Identifier: GPL-2.0-or-later
"""Users remove all that lies directly in a share's folder."""

from harness import main
from harness.standing_in import empty
from harness.watching import WatchedTest

CROWD = [f"file {number}.txt" for number in range(6000)]  # more than a queue file takes at once


class Emptied(WatchedTest):
    def assert_emptied(self, root):
        self.assert_converged(root)
        self.assert_paths(root, [])
        (share,) = self.ctl("status", "--json").json()["shares"]
        self.assertEqual((share["root"], share["needs_reindex"]), ("sound", False))

    def test_files_of_a_flat_root_leave_the_index(self):
        root = self.make_share(files=CROWD)
        self.begin()

        empty(root)

        self.assert_emptied(root)

    def test_files_that_are_removed_in_a_pause_leave_the_index(self):
        root = self.make_share(files=CROWD)
        self.begin()
        self.assertEqual(self.command("pause"), 0)

        empty(root)
        self.await_file(self.queue("alpha"))
        self.ctl("resume")

        self.assert_emptied(root)

    def test_folders_directly_in_the_root_leave_the_index(self):
        root = self.make_share(files=[f"folder {number}/a.txt" for number in range(1500)])
        self.begin()

        empty(root)

        self.assert_emptied(root)


class EmptiedByInotify(Emptied):
    watch_by = "inotify"


if __name__ == "__main__":
    main()
