# SPDX-License-Identifier: GPL-2.0-or-later
"""Files with several hard links that change by a name of which nobody tells their index."""

import os

from harness import main
from harness.awaiting import await_in_folder
from harness.stopped import stopped
from harness.watched_disks import WatchedDiskTest


class LinkedFiles(WatchedDiskTest):
    """Two shares on one disk; `held` is the name that an index holds, in the share beta."""

    kind = "ext4"

    def setUp(self):
        super().setUp()
        self.beta = f"{self.disk}/beta"
        self.held = f"{self.beta}/d/held.txt"
        self.make_files(self.root, "a.txt", "d/")
        self.make_files(self.beta, "d/held.txt")
        self.add_share(flags=("--all", "--exclude", "*.o"))
        self.ctl("share", "add", "beta", self.beta)
        self.ctl("folder", "add", self.beta, "--all", "--exclude", "*.o")

    def begin(self, **more):
        super().begin(**more)
        self.sync("beta")

    def link(self, name):
        os.link(self.held, name)
        return name

    def grow(self, path):
        with open(path, "ab") as file:
            file.write(b"more")

    def excluded(self, root):
        paths = (os.path.join(at, name) for at, _, names in os.walk(root) for name in names)
        return [os.fsencode(path) for path in paths if path.endswith(".o")]

    def held_back(self):
        """The service reads what happens in the block when all of it has happened."""
        return stopped(self.notifier.pid)

    def assert_followed(self):
        self.assert_converged(self.root, left_out=self.excluded(self.root))
        self.assert_converged(self.beta, "beta", left_out=self.excluded(self.beta))

    def test_changed_by_a_name_outside_of_every_share(self):
        outside = self.link(f"{self.elsewhere}/x.txt")
        self.begin()
        self.grow(outside)
        self.assert_followed()
        os.chmod(outside, 0o600)
        self.assert_followed()
        os.truncate(outside, 1)
        self.assert_followed()
        os.utime(outside, (1, 1))
        self.assert_followed()

    def test_changed_by_a_name_that_does_not_belong(self):
        os.mkdir(f"{self.beta}/#snapshot")
        names = [
            self.link(f"{self.beta}/d/{name}")
            for name in ("held.o", "~$held.docx", "../#snapshot/held.txt")
        ]
        self.begin()
        for name in names:
            self.grow(name)
            self.assert_followed()

    def test_changed_by_a_name_in_another_share(self):
        other = self.link(f"{self.root}/d/other.txt")
        self.begin()
        self.grow(other)
        self.assert_followed()
        os.chmod(other, 0o600)
        self.assert_followed()
        with open(other, "ab") as file:  # held open
            file.write(b"more")
            file.flush()
            self.assert_followed()

    def test_changed_by_a_name_that_is_removed_at_once(self):
        for folder in (f"{self.root}/d", f"{self.beta}/d", self.elsewhere):
            self.link(f"{folder}/passing.txt")
        self.begin()
        for folder in (f"{self.root}/d", f"{self.beta}/d", self.elsewhere):
            with self.held_back():
                self.grow(f"{folder}/passing.txt")
                os.unlink(f"{folder}/passing.txt")
            self.assert_followed()

    def test_changed_by_a_name_whose_folder_is_removed_at_once(self):
        folders = [f"{self.root}/gone", f"{self.beta}/gone", f"{self.elsewhere}/gone"]
        for folder in folders:
            os.mkdir(folder)
            self.link(f"{folder}/passing.txt")
        self.begin()
        for folder in folders:
            with self.held_back():
                self.grow(f"{folder}/passing.txt")
                os.unlink(f"{folder}/passing.txt")
                os.rmdir(folder)
            self.assert_followed()

    def test_changed_by_a_name_that_is_replaced_at_once(self):
        for folder in (f"{self.root}/d", f"{self.beta}/d", self.elsewhere):
            self.link(f"{folder}/passing.txt")
        self.begin()
        for folder in (f"{self.root}/d", f"{self.beta}/d", self.elsewhere):
            self.make_files(folder, "new.txt")
            self.sync()
            self.sync("beta")
            with self.held_back():
                self.grow(f"{folder}/passing.txt")
                os.rename(f"{folder}/new.txt", f"{folder}/passing.txt")
            self.assert_followed()

    def test_changed_by_a_name_that_then_does_not_belong(self):
        for folder in (f"{self.root}/d", f"{self.beta}/d"):
            self.link(f"{folder}/passing.txt")
        self.begin()
        for folder in (f"{self.root}/d", f"{self.beta}/d"):
            with self.held_back():
                self.grow(f"{folder}/passing.txt")
                os.rename(f"{folder}/passing.txt", f"{folder}/passing.o")
            self.assert_followed()

    def test_changed_by_a_name_that_then_is_another(self):
        self.link(f"{self.root}/d/first.txt")
        self.begin()
        with self.held_back():
            self.grow(f"{self.root}/d/first.txt")
            os.rename(f"{self.root}/d/first.txt", f"{self.root}/d/second.txt")
        self.assert_followed()

    def test_changed_by_a_name_that_is_gone_when_the_daemon_looks(self):
        near = self.link(f"{self.beta}/d/near.txt")
        self.begin()
        self.assertEqual(self.command("pause"), 0)
        for change in (self.grow, os.unlink):
            before = self.watched("beta")["lines"]
            change(near)
            self.assertTrue(
                await_in_folder(
                    self.queue("beta"), lambda: self.watched("beta")["lines"] > before
                )
            )
        self.ctl("resume")
        self.assert_followed()

    def test_many_files_changed_from_outside(self):
        for number in range(2000):
            name = f"many/{number // 100}/{number}.txt"
            self.make_files(self.beta, name)
            os.makedirs(os.path.dirname(f"{self.elsewhere}/{name}"), exist_ok=True)
            os.link(f"{self.beta}/{name}", f"{self.elsewhere}/{name}")
        self.begin()
        for number in range(2000):
            self.grow(f"{self.elsewhere}/many/{number // 100}/{number}.txt")
        self.assert_followed()


class LinkedFilesOnBtrfs(LinkedFiles):
    kind = "btrfs"


del WatchedDiskTest

if __name__ == "__main__":
    main()
