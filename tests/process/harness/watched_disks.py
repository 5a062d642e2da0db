# SPDX-License-Identifier: GPL-2.0-or-later
"""Shares that the notification service watches, on every kind of file system."""

import os
import shutil

from harness import namespace
from harness.filesystems import FilesystemTest, run, unmount
from harness.watching import WatchedTest


class WatchedDiskTest(WatchedTest, FilesystemTest):
    """The share is `root`; `elsewhere` is on the same file system and outside the share."""

    expected = "fanotify"  # how the share is to be watched

    def setUp(self):
        super().setUp()
        self.elsewhere = os.path.join(os.path.dirname(self.root), "elsewhere")
        os.makedirs(self.elsewhere, exist_ok=True)

    def begin(self, **more):
        if not self.ctl("share", "list").out:
            self.add_share(flags=("--all",))
        super().begin(**more)
        self.assertEqual(self.watched()["watched_by"], self.expected, self.watched())


class SubvolumeTest(WatchedDiskTest):
    """A btrfs of which only one subvolume is mounted."""

    kind = "btrfs"

    def mount_disk(self):
        run("mount", "-o", "loop", self.image, self.disk)
        run("btrfs", "subvolume", "create", f"{self.disk}/volume")
        unmount(self.disk)
        run("mount", "-o", "loop,subvol=volume", self.image, self.disk)


class NestedSubvolumeTest(WatchedDiskTest):
    """A share that holds a subvolume of its own."""

    kind = "btrfs"

    def setUp(self):
        super().setUp()
        run("btrfs", "subvolume", "create", f"{self.root}/nested")


class BoundTest(WatchedDiskTest):
    """A bind mount of a folder inside a file system of which nothing else is to be seen."""

    kind = "ext4"

    def mount_disk(self):
        run("mount", "-o", "loop", self.image, self.disk)
        os.makedirs(f"{self.disk}/inside/here")
        hidden = f"{namespace.RUN}/bound"
        os.mkdir(hidden)
        namespace.mount(f"{self.disk}/inside", hidden, flags=namespace.MS_BIND)
        unmount(self.disk)
        namespace.mount(hidden, self.disk, flags=namespace.MS_BIND)


class OverlayTest(WatchedDiskTest):
    expected = "inotify"

    def mount_disk(self):
        for name in ("lower", "upper", "work"):
            os.makedirs(f"{namespace.DATA}/{name}")
        with open(f"{namespace.DATA}/lower/below.txt", "w", encoding="ascii") as file:
            file.write("below")
        options = ",".join(
            f"{option}dir={namespace.DATA}/{option}" for option in ("lower", "upper", "work")
        )
        namespace.mount("overlay", self.disk, "overlay", options=options)


class FuseTest(WatchedDiskTest):
    """Others may change what a FUSE file system shows: it is compared."""

    expected = "comparison"

    def mount_disk(self):
        if not shutil.which("bindfs") or not os.path.exists("/dev/fuse"):
            self.skipTest("no FUSE here")
        behind = f"{namespace.DATA}/behind"
        os.mkdir(behind)
        # The kernel may believe for a second what it knew of a file's other names. A removed file that
        # somebody has open would stay in its folder under another name.
        run("bindfs", "-o", "attr_timeout=0,hard_remove", behind, self.disk)

    def tearDown(self):
        super().tearDown()
