# SPDX-License-Identifier: GPL-2.0-or-later
"""The state's disk fails, or is full from the beginning: the index is whole again afterwards."""

import os
import re
import sqlite3

from harness import main, namespace
from harness.filesystems import CREATE, REINDEX, FilesystemTest, need_loop_devices, run
from harness.machine import PID_FILE

FILES = 2000
IMAGE_SIZE = 64 << 20
STATE_FILE = f"{namespace.STATE}/state.db"
BELOW = "/run/below"  # what the image lies on
FULL_STATE = re.compile(
    r"cannot .*state\.db: .*; its disk is full: nothing is changed there until it has space|"
    r"Failed to open the state database: .*state\.db: database or disk is full"
)
FIRST_FAILS = re.compile(r"Failed to open the state database: cannot .*(is full|No space left on device)")


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
        need_loop_devices(self)
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


class FullAtTheStart:
    """The daemon serves without a Worker and says why once; the share comes back with the space."""

    def assert_full_told(self, times, after):
        """By the daemon, which asks for the state each time that it is to revive the Worker."""
        for _ in range(3):
            self.ctl("worker", "revive", "alpha", code=1)
            said = self.logged(after)
            self.assertEqual(len(list(filter(FULL_STATE.fullmatch, said))), times, said)

    def assert_lives_and_heals(self):
        filler = fill(self.state_disk)
        after = self.log.mark()

        self.start()

        self.await_line("CreateWorker failed, share=alpha", after)
        self.assertIn("Share[alpha] is running out space", self.log.texts(after))
        self.assert_full_told(1, after)
        (share,) = self.ctl("status", "--json").json()["shares"]
        self.assertEqual(share["entries"], 2)
        self.assert_heals(filler)

    def assert_heals(self, filler):
        os.unlink(filler)
        self.ctl("worker", "revive", "alpha")
        self.make_files(self.root, "late.txt")
        self.event(CREATE, "late.txt")
        self.check()
        (share,) = self.ctl("status", "--json").json()["shares"]
        self.assertIs(share["no_space"], False)

    def prepare(self):
        self.make_files(self.root, "a.txt")
        self.add_share()
        self.pid = self.start()
        self.await_drained("alpha")

    def tidy(self):
        """The last program that closes the state database takes its log away."""
        self.ctl("share", "list")
        self.assertFalse(os.path.exists(STATE_FILE + "-wal"))

    def fill_and_lose_log(self):
        """Another program puts the state in its own place, without a log. The disk's filler.

        What was there keeps its space, or whoever closes it could make the new one's log.
        """
        spare = f"{namespace.STATE}/spare.db"
        with sqlite3.connect(STATE_FILE) as old, sqlite3.connect(spare) as new:
            old.backup(new)
        old.close()
        new.close()
        for ending in ("-wal", "-shm", ""):
            self.enterContext(open(STATE_FILE + ending, "rb"))
        filler = fill(self.state_disk)
        for ending in ("-wal", "-shm"):
            os.unlink(STATE_FILE + ending)
        os.rename(spare, STATE_FILE)
        return filler

    def test_without_a_log_of_the_state(self):
        self.prepare()
        self.stop(self.pid)
        self.tidy()

        self.assert_lives_and_heals()

    def test_full_again_while_running_is_told_again(self):
        self.prepare()
        self.stop(self.pid)
        self.tidy()
        filler = fill(self.state_disk)
        after = self.log.mark()
        self.start()
        self.assert_full_told(1, after)
        self.assert_heals(filler)

        filler = self.fill_and_lose_log()
        self.assert_full_told(2, after)
        self.assert_heals(filler)

    def test_with_a_log_of_the_state(self):
        self.prepare()
        self.stop(self.pid)
        self.assertTrue(os.path.exists(STATE_FILE + "-wal"))

        self.assert_lives_and_heals()

    def test_first_start_of_all_ends_and_says_why(self):
        os.makedirs(namespace.STATE, exist_ok=True)
        filler = fill(self.state_disk)
        after = self.log.mark()

        self.launch()

        self.await_lines([FIRST_FAILS, "DoUpdate failed"], after)
        self.await_gone(PID_FILE)
        os.unlink(filler)
        self.start()


class FullTmpfsAtTheStartTest(FullAtTheStart, FilesystemTest):
    state_size = "8m"
    state_disk = namespace.DISK


class FullExt4AtTheStartTest(FullAtTheStart, FilesystemTest):
    state_disk = namespace.STATE

    def setUp(self):
        super().setUp()
        need_loop_devices(self)
        image = f"{namespace.RUN}/state.image"
        with open(image, "wb") as file:
            file.truncate(16 << 20)
        # Blocks as large as a page: in smaller ones SQLite's shared memory gets only a part of its
        # page, and whoever writes to another part of it on a full disk is killed.
        run("mkfs.ext4", "-q", "-F", "-b", "4096", "-m", "0", image)
        os.mkdir(namespace.STATE, 0o700)
        run("mount", "-o", "loop", image, namespace.STATE)


class UnreadableDirectoryTest(FilesystemTest):
    """A directory of the share is lost to a damage of its disk."""

    kind = "ext4"

    def setUp(self):
        super().setUp()
        self.make_files(self.root, "bad/inside/a.txt", "bad!.txt", "good/gone.txt", "good/b.txt")
        self.add_share()
        self.start()
        self.await_drained("alpha")
        self.unmount_disk()
        # Its inode is wiped, and its name stays.
        run("debugfs", "-w", "-R", "clri /share/bad", self.image)
        self.mount_disk()

    def test_it_is_named_and_the_rest_is_compared_and_mended(self):
        os.unlink(f"{self.root}/good/gone.txt")
        self.make_files(self.root, "new.txt")
        unreadable = f"fileindexctl: cannot look at {self.root}/bad: ".encode()
        differences = [
            f"left-over\t{self.root}/good/gone.txt".encode(),
            f"missing\t{self.root}/new.txt".encode(),
        ]

        told = self.ctl("verify", "alpha", code=1)
        self.assertEqual(told.out.splitlines(), differences)
        self.assertTrue(told.err.startswith(unreadable), told.err)
        self.assertEqual(told.err.count(b"\n"), 1)

        mended = self.ctl("verify", "alpha", "--repair", code=1)
        self.assertEqual(mended.out.splitlines(), differences)
        self.assertTrue(mended.err.startswith(unreadable), mended.err)
        self.await_drained("alpha")
        self.assertEqual(self.ctl("verify", "alpha", code=1).out, b"")
        self.assertIn(f"{self.root}/bad/inside/a.txt".encode(), self.dump())


if __name__ == "__main__":
    main()
