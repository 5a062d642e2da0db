# SPDX-License-Identifier: GPL-2.0-or-later
"""The first index of a folder: everything that belongs, and nothing else."""

import os
import socket

from harness import main
from harness.filesystems import FilesystemTest, on_each

TREE = [
    "readme.md",
    "docs/report.pdf",
    "docs/old/report.odt",
    "docs/empty/",
    "music/song.mp3",
    "film.mkv",
    "photo.JPG",
    "no ending",
    ".hidden/file",
    "many.dots.in.name.txt",
]
LEFT_OUT = [
    "#snapshot/a.txt",
    ".snapshots/a.txt",
    "lost+found/a.txt",
    "docs/#snapshot/a.txt",
    "docs/.nfs0001",
    ".fuse_hidden00",
    "~$report.docx",
    "docs/.~lock.report.odt#",
    ".nfsfolder/a.txt",
]
NEARLY_LEFT_OUT = ["snapshot/a", "#snapshots/a", "x.nfs", "~x", ".~lock.x", "lost+found2/a"]


@on_each("ext4", "btrfs", "tmpfs")
class FirstIndex(FilesystemTest):
    def test_daemon_is_started_later(self):
        self.make_files(self.root, *TREE)
        self.add_share()

        self.start()

        self.await_drained("alpha")
        self.check()

    def test_daemon_is_running(self):
        self.make_files(self.root, *TREE)
        self.start()

        self.add_share()

        self.await_drained("alpha")
        self.check()

    def test_names_that_are_left_out(self):
        self.make_files(self.root, *TREE, *LEFT_OUT, *NEARLY_LEFT_OUT)
        self.add_share()

        self.start()

        self.await_drained("alpha")
        self.check()
        self.assertEqual([path for path in self.dump() if b"/#snapshot/" in path], [])

    def test_only_the_indexed_folders(self):
        self.make_files(self.root, *TREE)
        self.add_share("docs", "music")

        self.start()

        self.await_drained("alpha")
        self.check(folders=[f"{self.root}/docs", f"{self.root}/music"])

    def test_share_is_the_root_of_its_disk(self):
        self.root = self.disk
        self.make_files(self.root, *TREE)
        self.add_share()

        self.start()

        self.await_drained("alpha")
        self.check()

    def test_sockets_pipes_and_devices_do_not_belong(self):
        self.make_files(self.root, *TREE)
        os.mkfifo(f"{self.root}/pipe")
        os.mknod(f"{self.root}/device", 0o020600, os.makedev(1, 3))
        with socket.socket(socket.AF_UNIX) as sock:
            sock.bind(f"{self.root}/docs/socket")
        self.add_share()

        self.start()

        self.await_drained("alpha")
        self.check()
        self.event(0x40, "pipe")
        self.event(0x40, "docs/socket")
        self.check()

    def test_times_and_sizes_far_out(self):
        self.make_files(self.root, "old", "new", "big")
        os.utime(f"{self.root}/old", ns=(0, 1))
        os.utime(f"{self.root}/new", ns=(0, 4_000_000_000 * 10**9 + 999_999_999))
        os.truncate(f"{self.root}/big", 5 << 30)
        self.add_share()

        self.start()

        self.await_drained("alpha")
        self.check()


if __name__ == "__main__":
    main()
