# SPDX-License-Identifier: GPL-2.0-or-later
"""Power cuts: the disk of the state folder as it was at one moment, and a daemon that starts on it.

The disk is an image in a btrfs, mounted through a loop device. Its copy shares the image's extents
(FICLONE), and that is atomic: each request of the loop device is a write to the image under the
inode's lock, which the copying holds from end to end. So the copy has every request that the guest
file system was told of as done, and none that came later. What the guest holds in its own page
cache was never written to the image, and is not in the copy: just as with a disk that lost power.

The share's own disk stays as it is.
"""

import contextlib
import fcntl
import os
import re
import signal

from harness import LoadTest, main, namespace
from harness.awaiting import children
from harness.filesystems import CREATE, REINDEX, need_loop_devices, on_each, run, unmount
from harness.scale import IS_LONG

CUTS = 34 if IS_LONG else 4
FIRST_CUTS = 4 if IS_LONG else 1

CARRIER = f"{namespace.RUN}/carrier"
FICLONE = 0x40049409
IMAGE_SIZE = 320 << 20  # xfs wants 300 MB
# What any program tells of a database that it cannot use, or that is gone.
LOST = re.compile(r"index .* and (set aside|removed), .*|index missing .*|.*copy is used instead.*")
MAKE = {
    "ext4": ["mkfs.ext4", "-q", "-F"],
    "xfs": ["mkfs.xfs", "-q", "-f"],
    "btrfs": ["mkfs.btrfs", "-q", "-f"],
}


def make_file(path, size):
    with open(path, "wb") as file:
        file.truncate(size)


def clone(source, target):
    with open(source, "rb") as old, open(target, "wb") as new:
        fcntl.ioctl(new, FICLONE, old.fileno())


@on_each("ext4", "xfs", "btrfs")
class PowerCut(LoadTest):
    def setUp(self):
        super().setUp()
        need_loop_devices(self)
        make_file(f"{namespace.RUN}/carrier.image", 2 << 30)
        run(*MAKE["btrfs"], f"{namespace.RUN}/carrier.image")
        os.mkdir(CARRIER)
        run("mount", "-o", "loop", f"{namespace.RUN}/carrier.image", CARRIER)
        self.image = f"{CARRIER}/disk0"
        make_file(self.image, IMAGE_SIZE)
        run(*MAKE[self.kind], self.image)
        self.mount_image()
        self.cuts = 0
        self.shares = []

    def mount_image(self):
        run("mount", "-t", self.kind, "-o", "loop", self.image, namespace.DISK)

    def cut(self):
        """The power goes, and comes back: nothing runs, /run is empty, the disk is the copy."""
        self.cuts += 1
        copy = f"{CARRIER}/disk{self.cuts}"
        clone(self.image, copy)

        while left := children():
            for pid in left:
                with contextlib.suppress(ProcessLookupError):
                    os.kill(pid, signal.SIGKILL)
                os.waitpid(pid, 0)
        for name in ("fileindexd.pid", "fileindexd.sock", "talocontentsearchd.pid"):
            with contextlib.suppress(FileNotFoundError):
                os.unlink(f"{namespace.RUN}/{name}")
        unmount(namespace.DISK)
        os.unlink(self.image)
        self.image = copy
        self.mount_image()
        self.sent = self.cut_at = self.log.mark()

    def change_state(self):
        """Changes that are acknowledged by the end of their command."""
        name = f"s{len(self.shares)}"
        path = f"{namespace.DATA}/{name}"
        os.mkdir(path)
        self.ctl("share", "add", name, path)
        self.ctl("folder", "add", path)
        self.shares.append(name)

    def assert_opens(self):
        """What was acknowledged is there, whether the daemon has opened it yet or nothing runs."""
        names = sorted(["alpha", *self.shares])
        shown = [share["name"] for share in self.ctl("share", "list", "--json").json()]
        self.assertEqual(shown, names)
        folders = [folder["path"] for folder in self.ctl("folder", "list", "--json").json()]
        self.assertEqual(folders, [f"{namespace.DATA}/{name}" for name in names])
        for share in self.ctl("status", "--json").json()["shares"]:
            self.assertNotIn("index_problem", share)
        self.assert_acknowledged()

    def commit_to_each(self):
        """Only who writes to an index sets aside what is left of it."""
        for name in ("alpha", *self.shares):
            path = f"{namespace.DATA}/{name}/after cut {self.cuts}.txt"
            self.make_files(os.path.dirname(path), os.path.basename(path))
            self.append(name, {"event": CREATE, "path": path})
        for name in ("alpha", *self.shares):
            self.await_drained(name)
        for name in self.shares:
            self.assert_index(f"{namespace.DATA}/{name}", name)

    def assert_nothing_was_lost(self):
        """By no program, since the cut."""
        damaged = [
            os.path.join(folder, name)
            for folder, folders, files in os.walk(namespace.STATE)
            for name in folders + files
            if "damaged" in name
        ]
        self.assertEqual(damaged, [])
        self.log.mark()
        told = [line.text for line in self.log.lines[self.cut_at :] if LOST.fullmatch(line.text)]
        self.assertEqual(told, [])

    def sync_queue(self):
        """As a writer does whose lines shall outlive the cut."""
        for ending in ("", ".tmp"):
            with contextlib.suppress(FileNotFoundError):
                fd = os.open(self.queue("alpha") + ending, os.O_RDONLY)
                os.fsync(fd)
                os.close(fd)

    def touch(self, code, *name):
        self.ctl("event", "alpha", str(code), os.path.join(self.root, *name))
        self.await_drained("alpha")

    def test_under_load(self):
        self.begin(self.make_share(files=("d00000/a.txt",)))
        self.start()
        self.settle()

        for _ in range(CUTS):
            for _ in range(self.choice.randrange(2)):
                self.work_batch()
            events = self.send_batch()
            synced = self.choice.randrange(2) == 0
            if synced:
                self.sync_queue()
            self.await_moment(events)
            self.change_state()
            self.take_acknowledged()
            self.cut()

            self.assert_opens()
            self.start()
            self.assert_opens()
            self.settle()
            if not synced:  # lines of the queue may be lost: their writer compares
                self.touch(REINDEX)
            self.commit_to_each()
            self.assert_index(self.root)
            self.assert_nothing_was_lost()

    def test_at_the_first_index_of_all(self):
        for number in range(FIRST_CUTS):
            with self.subTest(number=number):
                if number > 0:
                    self.tearDown()
                    self.setUp()
                root = f"{namespace.DATA}/alpha"
                self.make_files(root, *(f"d{n % 10}/{n}.txt" for n in range(500)))
                self.begin(self.make_share())
                self.launch()
                self.await_moment(600)
                self.cut()

                self.assert_opens()
                self.start()
                self.assert_opens()
                self.settle()
                self.make_files(root, "late.txt")
                self.touch(CREATE, "late.txt")
                self.assert_index(self.root)
                self.assert_nothing_was_lost()


if __name__ == "__main__":
    main()
