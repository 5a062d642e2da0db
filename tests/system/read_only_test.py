# SPDX-License-Identifier: GPL-2.0-or-later
"""The state's disk turns read-only in the middle of a pass: what the pass was told of is kept."""

import os
import re
import subprocess

from harness import main, namespace
from harness.awaiting import LIMIT
from harness.batch_load import CHANGED, ENDED
from harness.filesystems import CREATE, REINDEX, FilesystemTest, need_loop_devices, run, unmount

IMAGE_SIZE = 64 << 20
FSCK_MENDED = 1
FILES = 600
FIRST_CHANGES = 50  # are logged while the disk can still be written to
KEPT = re.compile(r"Kept, as its changes are not stored: .*\.tmp")


class ReadOnlyState:
    def setUp(self):
        super().setUp()
        self.make_state_disk()
        self.make_files(self.root, *(f"d{n % 9}/old {n}.txt" for n in range(FILES)))
        self.add_share()
        self.pid = self.start()
        self.await_drained("alpha")
        self.make_files(self.root, *(f"d{n % 9}/new {n}.txt" for n in range(FILES)))

    def begin_pass(self, *lines):
        """Until its thread waits for its log in the middle of its work. The position in the log."""
        after = self.log.mark()
        self.log.hold_at(CHANGED, FIRST_CHANGES)
        self.append("alpha", *lines)
        self.await_held()
        return self.await_line(CHANGED, after, FIRST_CHANGES)

    def end_pass(self, after):
        """It goes on with the disk read-only, to its end. What it said meanwhile."""
        self.make_read_only()
        with self.assertRaisesRegex(OSError, "Read-only"):
            os.mkdir(f"{namespace.STATE}/new")
        self.log.go_on()
        ended = self.await_line(ENDED, after)
        return self.log.texts(after, ended)

    def assert_kept(self):
        """The daemon lives, and will read again what it was told; what is known is told."""
        self.ctl("log-level", "debug")  # which it answers itself
        self.assertIn(f"{self.root}/d1/old 1.txt".encode(), self.dump())
        self.assertTrue(os.path.exists(self.queue("alpha") + ".tmp"))
        (share,) = self.ctl("status", "--json").json()["shares"]
        self.assertGreater(share["waiting"], 0)

    def check_pass(self, *lines):
        self.assert_said(self.end_pass(self.begin_pass(*lines)))
        self.assert_kept()
        self.make_writable()
        self.await_drained("alpha")
        self.check()

    def test_in_a_batch(self):
        names = (f"{self.root}/d{n % 9}/new {n}.txt" for n in range(FILES))
        self.check_pass(*({"event": CREATE, "path": name} for name in names))

    def test_in_a_walk(self):
        self.check_pass({"event": REINDEX, "path": self.root})


class ReadOnlyMountTest(ReadOnlyState, FilesystemTest):
    """What is open already can still be written to; nothing can be made or removed."""

    def make_state_disk(self):
        pass

    def make_read_only(self):
        run("mount", "-o", "bind,ro", namespace.STATE, namespace.STATE)

    def assert_said(self, said):
        self.assertNotIn("Worker[alpha] failed to commit db", said)

    def make_writable(self):
        namespace.unmount(namespace.STATE, namespace.MNT_DETACH)
        self.make_files(self.root, "late.txt")
        self.ctl("event", "alpha", str(CREATE), f"{self.root}/late.txt")


class ReadOnlyDiskTest(ReadOnlyState, FilesystemTest):
    """The kernel found an error of the file system, and lets nobody write there any more."""

    def make_state_disk(self):
        need_loop_devices(self)
        self.state_image = f"{namespace.RUN}/state.image"
        with open(self.state_image, "wb") as file:
            file.truncate(IMAGE_SIZE)
        run("mkfs.ext4", "-q", "-F", self.state_image)
        os.mkdir(namespace.STATE, 0o700)
        self.mount_state()

    def mount_state(self):
        run("mount", "-o", "loop,errors=remount-ro", self.state_image, namespace.STATE)

    def make_read_only(self):
        run("sync", "-f", namespace.STATE)  # the line that tells of the batch is on the disk
        device = os.path.realpath(f"/sys/dev/block/{self.device_number()}")
        with open(f"/sys/fs/ext4/{os.path.basename(device)}/trigger_fs_error", "wb") as file:
            file.write(b"found by a test")

    def device_number(self):
        number = os.stat(namespace.STATE).st_dev
        return f"{os.major(number)}:{os.minor(number)}"

    def assert_said(self, said):
        self.assertIn("Worker[alpha] failed to commit db", said)
        self.assertTrue(list(filter(KEPT.fullmatch, said)), said[-20:])

    def make_writable(self):
        self.stop(self.pid)
        unmount(namespace.STATE)
        checked = subprocess.run(
            ["fsck.ext4", "-p", self.state_image], capture_output=True, check=False, timeout=LIMIT
        )
        self.assertIn(checked.returncode, (0, FSCK_MENDED), checked)
        self.mount_state()
        self.start()


if __name__ == "__main__":
    main()
