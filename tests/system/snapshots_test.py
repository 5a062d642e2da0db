# SPDX-License-Identifier: GPL-2.0-or-later
"""Snapshots do not belong; subvolumes that are no snapshots do."""

import os

from harness import main
from harness.filesystems import CREATE, REINDEX, FilesystemTest, run


class SnapshotsTest(FilesystemTest):
    kind = "btrfs"

    def setUp(self):
        super().setUp()
        os.rmdir(self.root)
        run("btrfs", "subvolume", "create", self.root)
        self.make_files(self.root, "a.txt", "in/b.txt")

    def snapshot(self, name, *options):
        path = f"{self.root}/{name}"
        os.makedirs(os.path.dirname(path), exist_ok=True)
        run("btrfs", "subvolume", "snapshot", *options, self.root, path)
        return path

    def begin(self):
        self.add_share()
        self.start()
        self.await_drained("alpha")

    def test_read_only_snapshots_below_the_root(self):
        taken = self.snapshot("taken", "-r")
        deep = self.snapshot("in/deep", "-r")

        self.begin()

        self.check(left_out=[taken, deep])

    def test_nothing_in_a_read_only_snapshot_is_walked(self):
        taken = self.snapshot("taken", "-r")

        self.begin()
        self.event(REINDEX, "")
        self.ctl("folder", "set", self.root, "--document=on")
        self.await_drained("alpha")

        for walk in ("IndexDirAdd", "IndexDirUpdate", "IndexDirClean"):
            self.await_line(f"{walk}: {self.root}")
        self.assert_not_logged(rf"IndexDir[A-Za-z]+: {taken}(/.*)?")
        self.assert_not_logged(rf".*Document\[{taken}/.*")

    def test_folder_of_snapshots_by_name(self):
        self.snapshot("#snapshot/monday", "-r")
        self.snapshot("in/#snapshot/tuesday")

        self.begin()

        self.check()

    def test_subvolumes_that_are_no_snapshots(self):
        run("btrfs", "subvolume", "create", f"{self.root}/sub")
        self.make_files(self.root, "sub/c.txt", "sub/deep/d.txt")
        self.snapshot("copy")  # writable: a place to work in

        self.begin()

        self.check()

    def test_snapshot_taken_while_running(self):
        self.begin()
        taken = self.snapshot("taken", "-r")

        self.event(CREATE, "taken")
        self.event(CREATE, "taken/a.txt")
        self.event(REINDEX, "taken")
        self.event(REINDEX, "")

        self.check(left_out=[taken])

    def test_snapshot_that_becomes_writable_and_back(self):
        taken = self.snapshot("taken", "-r")
        self.begin()

        run("btrfs", "property", "set", "-f", taken, "ro", "false")
        self.event(REINDEX, "taken")
        self.check()

        run("btrfs", "property", "set", "-f", taken, "ro", "true")
        self.event(REINDEX, "taken")
        self.check(left_out=[taken])

    def test_snapshot_deleted(self):
        taken = self.snapshot("taken", "-r")
        self.begin()

        run("btrfs", "subvolume", "delete", taken)
        self.event(REINDEX, "")

        self.check()


if __name__ == "__main__":
    main()
