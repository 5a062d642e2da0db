# SPDX-License-Identifier: GPL-2.0-or-later
"""A share's folder is empty where it was not: what is believed, and what waits."""

import os
import sqlite3

from harness import main, namespace
from harness.awaiting import IN_CHANGE, await_in_folder
from harness.checks import IndexTest
from harness.standing_in import empty

ATTRIBUTES = 0x4
CREATE = 0x40
DELETE = 0x80


class EmptyRoot(IndexTest):
    def setUp(self):
        super().setUp()
        self.root = self.make_share(files=("a.txt", "b.txt", "d/c.txt"))
        self.start()
        self.await_drained("alpha")
        self.assert_index(self.root)

    def reindex(self):
        self.ctl("reindex", self.root)
        self.await_drained("alpha")

    def delete(self, *names):
        self.append("alpha", *({"event": DELETE, "path": f"{self.root}/{name}"} for name in names))
        self.await_drained("alpha")

    def make_folders(self, names):
        """Another share, of which only these are indexed; they are empty."""
        self.other = self.make_share("beta", folders=())
        for name in names:
            os.mkdir(f"{self.other}/{name}")
            self.ctl("folder", "add", f"{self.other}/{name}")
        self.await_drained("beta")

    def share(self):
        (share,) = self.ctl("status", "--json").json()["shares"]
        return share

    def assert_in_step(self):
        """Nothing waits any more, and nothing is missed."""
        self.await_drained("alpha")
        store = f"{namespace.STATE}/state.db"
        made_up = await_in_folder(store, lambda: not self.share()["needs_reindex"], mask=IN_CHANGE)
        self.assertTrue(made_up)
        self.await_drained("alpha")
        self.assert_index(self.root)
        self.assertEqual(self.share()["root"], "sound")

    def test_single_deletes_are_believed_after_a_reindex_that_was_refused(self):
        empty(self.root)
        self.reindex()
        self.assert_paths(self.root, ["a.txt", "b.txt", "d", "d/c.txt"])

        self.delete("a.txt", "b.txt")
        self.assert_paths(self.root, ["d", "d/c.txt"])
        self.assertEqual(self.share()["root"], "empty")
        self.assertIn(b"folder is empty", self.ctl("verify", "alpha", code=1).err)

        self.delete("d")
        self.assert_in_step()

    def test_a_reindex_that_was_refused_is_made_up_for_when_the_files_are_back(self):
        os.rename(self.root, f"{self.root}.away")
        os.mkdir(self.root)
        self.reindex()
        self.delete("nothing")
        self.assertEqual(self.share()["root"], "empty")

        os.rmdir(self.root)
        os.rename(f"{self.root}.away", self.root)
        self.make_files(self.root, "d/new.txt")
        self.delete("nothing")

        self.assert_in_step()

    def test_a_reindex_that_was_interrupted_is_made_up_for_when_the_files_are_back(self):
        self.stop(self.daemon_pid())
        with sqlite3.connect(f"{namespace.STATE}/state.db") as state:
            changed = state.execute("UPDATE status SET needs_reindex = 0, reindex_begun = 1")
            self.assertEqual(changed.rowcount, 1)
            state.execute("UPDATE number SET value = value + 1 WHERE name = 'changes'")
        state.close()
        os.rename(self.root, f"{self.root}.away")
        os.mkdir(self.root)
        self.start()
        self.delete("nothing")
        self.assertTrue(self.share()["needs_reindex"])

        os.rmdir(self.root)
        os.rename(f"{self.root}.away", self.root)
        self.make_files(self.root, "d/new.txt")
        self.delete("nothing")

        self.assert_in_step()

    def test_a_touched_root_and_its_last_deletes_in_one_batch_leave_nothing_to_be_done(self):
        names = ("a.txt", "b.txt", "d/c.txt", "d")
        empty(self.root)
        os.chmod(self.root, 0o700)
        self.append("alpha", {"event": ATTRIBUTES, "path": self.root},
                    *({"event": DELETE, "path": f"{self.root}/{name}"} for name in names))

        self.assert_in_step()

    def test_acceptance_goes_on_after_a_reindex_that_was_refused(self):
        empty(self.root)
        self.reindex()
        self.delete("a.txt")

        self.ctl("share", "accept", "alpha")

        self.assert_in_step()

    def test_acceptance_ends_when_something_is_in_the_folder_again(self):
        empty(self.root)
        self.ctl("share", "accept", "alpha")
        self.assert_in_step()

        self.make_files(self.root, "new.txt")
        self.append("alpha", {"event": CREATE, "path": f"{self.root}/new.txt"})
        self.await_drained("alpha")
        empty(self.root)
        self.reindex()

        self.assert_paths(self.root, ["new.txt"])
        self.assertEqual(self.share()["root"], "empty")

    def test_of_folders_alone_nothing_is_missed(self):
        self.make_folders(("p", "q"))
        for name in ("p", "q"):
            os.rmdir(f"{self.other}/{name}")

        (share,) = [s for s in self.ctl("status", "--json").json()["shares"] if s["name"] == "beta"]
        self.assertEqual(share["root"], "sound")
        self.assertEqual(self.ctl("share", "accept", "beta").out, b"nothing to accept\n")

        self.append("beta", *({"event": DELETE, "path": f"{self.other}/{n}"} for n in ("p", "q")))
        self.await_drained("beta")
        self.assertEqual(self.dump("beta"), [])


if __name__ == "__main__":
    main()
