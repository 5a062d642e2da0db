# SPDX-License-Identifier: GPL-2.0-or-later
"""Going on with another disk, or with an empty one; what is missed while a disk is away."""

import os
import shutil

from harness import main, namespace
from harness.filesystems import CREATE, FilesystemTest, on_each, run

ENDED = "Worker[alpha] finished all task, stopping"


@on_each("ext4")
class Accept(FilesystemTest):
    def setUp(self):
        super().setUp()
        self.make_files(self.root, "a.txt", "in/b.txt", "in/deep/c.txt")
        self.add_share()
        self.pid = self.start()
        self.await_drained("alpha")
        self.check()
        self.before = self.dump()

    def share(self):
        (share,) = self.ctl("status", "--json").json()["shares"]
        return share

    def bring_copy(self):
        """Another disk with a copy of the files, one of which is gone and one new."""
        self.unmount_disk()
        copy = f"{namespace.RUN}/copy.image"
        shutil.copyfile(self.image, copy)
        # Another number is given only to what was checked in no earlier second than it was mounted.
        run("e2fsck", "-f", "-p", copy)
        run("tune2fs", "-f", "-U", "random", copy)
        self.image = copy
        self.mount_disk()
        os.unlink(f"{self.root}/a.txt")
        self.make_files(self.root, "in/new.txt")

    def accept(self):
        """Until what was missed is made up for."""
        after = self.log.mark()
        self.ctl("share", "accept", "alpha")
        self.await_line(ENDED, after)

    def settle(self):
        """What is on record is done with the next pass."""
        after = self.log.mark()
        self.append("alpha", b"")
        self.await_line(ENDED, after)

    def test_copy_of_the_disk_is_accepted(self):
        self.bring_copy()
        self.assertEqual(self.share()["root"], "foreign")
        self.assertIn(b"share accept alpha", self.ctl("status").out)
        self.event(CREATE, "in/new.txt")
        self.assertEqual(self.dump(), self.before)

        self.accept()

        self.check()
        self.assertEqual(self.share()["root"], "sound")
        self.assertFalse(self.share()["needs_reindex"])
        self.assertEqual(self.ctl("share", "accept", "alpha").out, b"nothing to accept\n")

    def test_copy_is_accepted_by_a_daemon_that_has_no_worker_for_it(self):
        self.stop(self.pid)
        self.bring_copy()
        after = self.log.mark()
        self.start()
        self.await_line("Skip share[alpha] which cannot be indexed", after)

        self.accept()

        self.check()

    def test_emptied_root_is_told_of_until_it_is_accepted(self):
        shutil.rmtree(f"{self.root}/in")
        os.unlink(f"{self.root}/a.txt")
        self.assertEqual(self.share()["root"], "empty")
        self.assertIn(b"share accept alpha", self.ctl("status").out)
        after = self.log.mark()
        self.ctl("reindex", self.root)
        self.await_line(ENDED, after)
        self.assertEqual(self.dump(), self.before)
        self.assertEqual(self.share()["root"], "empty")

        self.accept()

        self.check()
        self.assertEqual(self.share()["root"], "sound")

    def test_missing_root_is_refused(self):
        self.unmount_disk()

        self.assertEqual(self.share()["root"], "missing")
        self.ctl("share", "accept", "alpha", code=1)
        self.make_files(self.disk, "share")
        self.ctl("share", "accept", "alpha", code=1)
        self.ctl("share", "accept", "nope", code=1)
        self.assertEqual(self.dump(), self.before)

    def test_what_is_drained_while_the_disk_is_away_is_made_up_for(self):
        self.make_files(self.root, "new.txt")
        self.unmount_disk()
        self.event(CREATE, "new.txt")
        self.event(CREATE, "in/b.txt")
        self.assertEqual(self.dump(), self.before)
        self.assertTrue(self.share()["needs_reindex"])

        self.mount_disk()
        self.settle()

        self.check()
        self.assertFalse(self.share()["needs_reindex"])

    def test_reindex_on_a_disk_that_is_away_stands(self):
        self.unmount_disk()
        for _ in range(3):
            self.event(CREATE, "in/b.txt")
            self.assertTrue(self.share()["needs_reindex"])
            self.assertEqual(self.dump(), self.before)


class AnotherTmpfs(FilesystemTest):
    """It has the type and the root's inode number of the one before."""

    def test_its_files_are_taken_in_once_it_is_accepted(self):
        self.make_files(self.root, "a.txt", "in/b.txt")
        self.add_share()
        self.start()
        self.await_drained("alpha")
        before = self.dump()
        self.unmount_disk()
        self.mount_disk()
        self.make_files(self.root, "new.txt")

        self.event(CREATE, "new.txt")

        self.assertEqual(self.dump(), before)
        (share,) = self.ctl("status", "--json").json()["shares"]
        self.assertEqual(share["root"], "foreign")
        after = self.log.mark()
        self.ctl("share", "accept", "alpha")
        self.await_line(ENDED, after)
        self.check()


if __name__ == "__main__":
    main()
