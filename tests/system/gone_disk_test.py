# SPDX-License-Identifier: GPL-2.0-or-later
"""The state's disk goes away in the middle of a batch and comes back."""

import fcntl
import os
import re
import struct

from harness import main, namespace
from harness.batch_load import ENDED
from harness.filesystems import CREATE, REINDEX, FilesystemTest, can_use_loop_devices, run

FILES = 1500
IMAGE_SIZE = 320 << 20  # xfs wants 300 MB
GOING_DOWN = 0x8004587D  # of xfs, and understood by ext4 alike
GO_DOWN_SYNCED = 0  # what was written before is on the disk
MAKE = {"ext4": ["mkfs.ext4", "-q", "-F"], "xfs": ["mkfs.xfs", "-q", "-f"]}
AMID = re.compile(r"\[alpha\] Document\[.*\] added", re.S)
FAILED = re.compile(r"Worker\[alpha\] failed to commit db|.*(disk I/O error|Input/output error).*")


class StateDiskTest(FilesystemTest):
    state_kind = "ext4"

    def setUp(self):
        super().setUp()
        if not can_use_loop_devices():
            self.skipTest("no loop devices here")
        self.state_image = f"{namespace.RUN}/state.image"
        with open(self.state_image, "wb") as file:
            file.truncate(IMAGE_SIZE)
        run(*MAKE[self.state_kind], self.state_image)
        os.mkdir(namespace.STATE, 0o700)
        self.mount_state()
        self.make_files(self.root, "a.txt")
        self.add_share()
        self.pid = self.start()
        self.await_drained("alpha")

    def mount_state(self):
        run("mount", "-o", "loop", self.state_image, namespace.STATE)

    def begin_batch(self):
        """Until the batch is under way; where its log begins."""
        self.make_files(self.root, *(f"d{n % 40}/name of file {n}.txt" for n in range(FILES)))
        after = self.log.mark()
        self.append("alpha", {"event": REINDEX, "path": self.root})
        self.await_line(AMID, after, count=FILES // 10)
        return after

    def touch(self):
        self.make_files(self.root, "touched.txt")
        self.event(CREATE, "touched.txt")
        while True:
            (share,) = self.ctl("status", "--json").json()["shares"]
            if not share["needs_reindex"]:
                break
            self.await_line(ENDED, self.log.mark())
        self.await_drained("alpha")

    def assert_healed(self):
        self.check()
        self.assertEqual(self.daemon_pid(), self.pid)
        os.kill(self.pid, 0)


class GoneDisk:
    def shut_down(self):
        """Every later call on the file system fails, until it is mounted anew."""
        fd = os.open(namespace.STATE, os.O_RDONLY)
        fcntl.ioctl(fd, GOING_DOWN, struct.pack("I", GO_DOWN_SYNCED))
        os.close(fd)

    def bring_back(self):
        namespace.unmount(namespace.STATE, namespace.MNT_DETACH)
        self.mount_state()

    def test_disk_that_goes_in_a_batch_and_comes_back(self):
        after = self.begin_batch()
        self.shut_down()
        self.await_line(FAILED, after)
        self.await_line(ENDED, after)

        self.bring_back()
        # The folder's watch went with the old mount.
        self.ctl("worker", "drop", "alpha")
        self.ctl("worker", "revive", "alpha")

        self.touch()
        self.assert_healed()


class GoneExt4Test(GoneDisk, StateDiskTest):
    pass


class GoneXfsTest(GoneDisk, StateDiskTest):
    state_kind = "xfs"


if __name__ == "__main__":
    main()
