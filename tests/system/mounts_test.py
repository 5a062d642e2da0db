# SPDX-License-Identifier: GPL-2.0-or-later
"""Mounts inside a share: the mount point is an entry, what lies below is not."""

import os

from harness import main, namespace
from harness.filesystems import CREATE, DELETE, REINDEX, FilesystemTest, on_each, unmount


@on_each("ext4", "btrfs", "tmpfs")
class Mounts(FilesystemTest):
    def setUp(self):
        super().setUp()
        self.make_files(self.root, "a.txt", "in/point/", "bound/b.txt", "there/")

    def begin(self):
        self.add_share()
        self.start()
        self.await_drained("alpha")

    def mount_tmpfs(self, name):
        namespace.mount("tmpfs", f"{self.root}/{name}", "tmpfs")
        self.make_files(f"{self.root}/{name}", "below.txt", "deep/below.txt")

    def bind(self, source, name):
        namespace.mount(f"{self.root}/{source}", f"{self.root}/{name}", flags=namespace.MS_BIND)

    def test_mounted_before_the_first_index(self):
        self.mount_tmpfs("in/point")
        self.bind("bound", "there")

        self.begin()

        self.check()
        paths = self.dump()
        self.assertIn(f"{self.root}/in/point".encode(), paths)
        self.assertNotIn(f"{self.root}/there/b.txt".encode(), paths)
        self.assertIn(f"{self.root}/bound/b.txt".encode(), paths)

    def test_file_bound_over_a_file(self):
        self.make_files(self.root, "target.txt")
        self.bind("a.txt", "target.txt")

        self.begin()

        self.check()

    def test_flags_of_a_bound_file_follow_a_reindex_and_a_repair(self):
        self.make_files(self.root, "target.txt")
        self.bind("a.txt", "target.txt")
        self.begin()
        target = f"{self.root}/target.txt"
        for wanted, mend in (
            (True, lambda: self.event(REINDEX, "target.txt")),
            (False, lambda: self.ctl("verify", "alpha", "--repair")),
        ):
            self.kill(self.daemon_pid())
            self.ctl("folder", "set", self.root, f"--document={'on' if wanted else 'off'}")
            os.unlink(self.queue("alpha"))  # so that nothing tells of it
            self.start()

            mend()
            self.await_drained("alpha")

            self.assertEqual(self.flags()[target], wanted)

    def test_events_below_a_mount_add_nothing(self):
        self.mount_tmpfs("in/point")
        self.begin()

        for name in ("in/point/below.txt", "in/point/deep", "in/point/deep/below.txt"):
            self.event(CREATE, name)
            self.event(REINDEX, name)

        self.check()

    def test_mounted_later_hides_what_was_indexed(self):
        self.make_files(self.root, "in/point/hidden.txt")
        self.begin()
        self.mount_tmpfs("in/point")

        self.event(REINDEX, "in")

        self.check()

    def test_unmounted_later_shows_what_was_hidden(self):
        self.make_files(self.root, "in/point/hidden.txt")
        self.mount_tmpfs("in/point")
        self.begin()
        unmount(f"{self.root}/in/point")

        self.event(REINDEX, "in")

        self.check()

    def test_mount_point_removed(self):
        self.mount_tmpfs("in/point")
        self.begin()
        unmount(f"{self.root}/in/point")
        os.rmdir(f"{self.root}/in/point")

        self.event(DELETE, "in/point")

        self.check()


if __name__ == "__main__":
    main()
