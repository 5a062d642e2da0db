# SPDX-License-Identifier: GPL-2.0-or-later
"""The state's disk gets full at each point of a batch: once there is space again, all is made good."""

import os
import shutil
import sqlite3

from harness import main, namespace
from harness.batch_load import ENDED
from harness.filesystems import (
    CREATE,
    DELETE,
    REINDEX,
    RENAME,
    FilesystemTest,
    need_loop_devices,
    run,
)
from harness.scale import IS_LONG

KIB = 1 << 10
MIB = 1 << 20
PIECE = 4 * MIB
SMALLEST_PIECE = 4 * KIB
SIZE = 16 * MIB
STEP = (32 if IS_LONG else 256) * KIB  # while commits fail
WIDE_STEP = (128 if IS_LONG else 512) * KIB  # while the daemon stops for too little space
FIRST_STEPS = (0, 4 * KIB, 16 * KIB, 64 * KIB)
ENTRIES = f"{namespace.STATE}/shares/alpha/index/entries.db"
COMMIT_FAILED = "Worker[alpha] failed to commit db"
NO_SPACE = "Share[alpha] is running out space"


def empty_log(path):
    """The next change needs space again, whatever space its log had before."""
    with sqlite3.connect(path) as db:
        db.execute("PRAGMA wal_checkpoint(TRUNCATE)")
    db.close()


def leave_free(path, count):
    """Takes all space of the file system at `path` but `count` bytes; the file that holds it."""
    filler = f"{path}/filler"
    with open(filler, "wb") as file:
        # In pieces: the map of a large file takes space of its own, and others write meanwhile.
        piece = PIECE
        while True:
            space = os.statvfs(path)
            excess = space.f_bfree * space.f_frsize - count
            if excess <= 0:
                return filler
            size = min(excess, piece)
            try:
                os.posix_fallocate(file.fileno(), os.fstat(file.fileno()).st_size, size)
            except OSError:
                if size <= SMALLEST_PIECE:
                    return filler
                piece = max(piece // 2, SMALLEST_PIECE)


class FullDiskSteps:
    def make_batch(self, number):
        """Changes the share; the events of it."""
        old = f"{self.root}/r{number - 1}"
        new = f"{self.root}/r{number}"
        names = [f"r{number}/d{n % 9}/a long enough name of file {n}.txt" for n in range(250)]
        self.make_files(self.root, *names)
        events = [{"event": CREATE, "path": new}, {"event": REINDEX, "path": f"{new}/d8"}]
        for folder in range(8):
            events.append({"event": CREATE, "path": f"{new}/d{folder}"})
        events += [{"event": CREATE, "path": f"{self.root}/{name}"} for name in names]

        for n in range(0, 250, 3):
            path = f"{old}/d{n % 9}/a long enough name of file {n}.txt"
            if os.path.exists(path):
                os.unlink(path)
                events.append({"event": DELETE, "path": path})
        shutil.rmtree(f"{old}/d7")
        events.append({"event": DELETE, "path": f"{old}/d7"})
        os.rename(f"{old}/d5", f"{new}/moved")
        events.append({"event": RENAME, "path": f"{new}/moved", "path_old": f"{old}/d5"})
        return events

    def fill_and_free(self, number, free):
        """One batch with `free` bytes of space, made good afterwards. What its pass said."""
        self.hold_in_pause("alpha", *self.make_batch(number))
        empty_log(ENTRIES)
        filler = leave_free(self.state_disk, free)
        after = self.log.mark()
        self.command("resume")
        ended = self.await_line(ENDED, after)
        said = set(self.log.texts(after, ended))
        os.unlink(filler)

        name = f"late {number}.txt"
        self.make_files(self.root, name)
        after = self.log.mark()
        self.ctl("event", "alpha", str(CREATE), f"{self.root}/{name}")
        self.settle(after)
        self.check()
        self.assertEqual(self.daemon_pid(), self.pid)
        os.kill(self.pid, 0)
        return said

    def test_each_amount_of_space(self):
        self.make_files(self.root, *(f"r0/d{n}/{n}.txt" for n in range(9)))
        self.add_share()
        self.pid = self.start()
        self.await_drained("alpha")

        number = 0
        free = 0
        failed = 0
        while True:
            number += 1
            said = self.fill_and_free(number, free)
            print(f"{free} bytes: {sorted(said & {COMMIT_FAILED, NO_SPACE})}", flush=True)
            failed += COMMIT_FAILED in said
            if not said & {COMMIT_FAILED, NO_SPACE}:
                break
            self.assertLess(free, SIZE)
            if not IS_LONG and number < len(FIRST_STEPS):
                free = FIRST_STEPS[number]
            else:
                free += STEP if COMMIT_FAILED in said else WIDE_STEP
        self.assertGreater(failed, 1)


class FullTmpfsStepsTest(FullDiskSteps, FilesystemTest):
    state_size = str(SIZE)
    state_disk = namespace.DISK


class FullExt4StepsTest(FullDiskSteps, FilesystemTest):
    state_disk = namespace.STATE

    def setUp(self):
        super().setUp()
        need_loop_devices(self)
        image = f"{namespace.RUN}/state.image"
        with open(image, "wb") as file:
            file.truncate(SIZE)
        run("mkfs.ext4", "-q", "-F", "-m", "0", image)
        os.mkdir(namespace.STATE, 0o700)
        run("mount", "-o", "loop", image, namespace.STATE)


if __name__ == "__main__":
    main()
