# SPDX-License-Identifier: GPL-2.0-or-later
"""The state's disk fails, or is full from the beginning: the index is whole again afterwards."""

import os
import re

from harness import main, namespace
from harness.filesystems import (
    CREATE,
    REINDEX,
    FilesystemTest,
    can_use_loop_devices,
    run,
)
from harness.machine import PID_FILE

FILES = 2000
IMAGE_SIZE = 64 << 20
BELOW = "/run/below"  # what the image lies on


def fill(path):
    """Takes all space of the file system at `path`; the file that holds it."""
    filler = f"{path}/filler"
    with open(filler, "wb", buffering=0) as file:
        for size in (1 << 20, 4096, 1):
            try:
                while True:
                    file.write(b"\1" * size)
            except OSError:
                pass
    return filler


class FailingStateDiskTest(FilesystemTest):
    """The state lies in an image with holes; without space for them, writing them is an error."""

    def setUp(self):
        super().setUp()
        if not can_use_loop_devices():
            self.skipTest("no loop devices here")
        os.mkdir(BELOW)
        namespace.mount("tmpfs", BELOW, "tmpfs", options="size=128m")
        image = f"{BELOW}/image"
        with open(image, "wb") as file:
            file.truncate(IMAGE_SIZE)
        # Without a journal: its failure would end all writing until the next mount.
        run("mkfs.ext4", "-q", "-F", "-O", "^has_journal", "-E", "lazy_itable_init=0", image)
        os.mkdir(namespace.STATE, 0o700)
        run("mount", "-o", "loop,errors=continue", image, namespace.STATE)

    def test_writes_fail_for_a_while(self):
        self.add_share()
        self.start()
        self.await_drained("alpha")
        filler = fill(BELOW)
        self.make_files(self.root, *(f"d{n % 40}/name of file {n}.txt" for n in range(FILES)))

        after = self.log.mark()
        self.append("alpha", {"event": REINDEX, "path": self.root})
        self.await_line("Worker[alpha] failed to commit db", after)
        os.unlink(filler)

        self.make_files(self.root, "late.txt")
        after = self.log.mark()
        self.append("alpha", {"event": CREATE, "path": f"{self.root}/late.txt"})
        # The queue is gone when a reindex begins, so its end is awaited.
        self.await_lines(
            ["Worker[alpha] fileindex db committed", "Worker[alpha] finished all task, stopping"],
            after,
        )
        self.check()


class FullAtTheStartTest(FilesystemTest):
    state_size = "8m"

    def test_daemon_says_so_and_indexes_once_there_is_space(self):
        self.make_files(self.root, "a.txt")
        self.add_share()
        self.stop(self.start())
        filler = fill(namespace.DISK)
        after = self.log.mark()

        self.launch()

        # What its files are given up for may just suffice for the state database.
        self.await_line(re.compile(r"DoUpdate failed|Search daemon launched \.\.\."), after)
        told = [
            text
            for text in self.log.texts(after)
            if "Failed to open the state database: " in text
            or "Share[alpha] is running out space" in text
        ]
        self.assertNotEqual(told, [])
        os.unlink(filler)
        if "DoUpdate failed" in "".join(self.log.texts(after)):
            self.await_gone(PID_FILE)
            self.start()
        else:
            self.ctl("worker", "revive", "alpha")
        self.make_files(self.root, "late.txt")
        self.event(CREATE, "late.txt")
        self.check()


if __name__ == "__main__":
    main()
