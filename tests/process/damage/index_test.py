# SPDX-License-Identifier: GPL-2.0-or-later
"""An index that was damaged, removed or replaced: it is noticed, told once, and made anew."""

import errno
import glob
import os
import re
import shutil
import sqlite3

from harness import IndexTest, main, namespace

CREATE = 0x40
MS_RDONLY = 1
MS_REMOUNT = 32
FOLDER = f"{namespace.STATE}/shares/alpha/index"
FILE = f"{FOLDER}/entries.db"
COPY = f"{FOLDER}.damaged"
PAGE = 4096
ENDED = re.compile(
    r"Worker\[alpha\] (finished all task, stopping|stopped while processing command queue)"
)
# What is told of an index that cannot be used; and of one that is gone, by a Worker at work and by
# one that begins.
SET_ASIDE = re.compile(
    r"index (damaged|made by another version|made by another program) and (set aside|removed), path=.*"
)
MADE_ANEW = re.compile(r"index missing and made anew, path=.*")
NOT_FOUND = "Failed to initiate indexer due to path not found, try re-create db"


def remove(path):
    if os.path.isdir(path) and not os.path.islink(path):
        while os.path.isdir(path):
            try:
                shutil.rmtree(path)
            except OSError as error:  # the content service may be making a folder there
                if error.errno not in (errno.ENOTEMPTY, errno.ENOENT):
                    raise
    elif os.path.lexists(path):
        os.unlink(path)


def remove_log():
    remove(FILE + "-wal")
    remove(FILE + "-shm")


def copy_log_back():
    """So that the main file alone holds the index."""
    with sqlite3.connect(FILE) as db:
        db.execute("PRAGMA wal_checkpoint(TRUNCATE)")
    db.close()


def truncate(part):
    copy_log_back()
    os.truncate(FILE, int(os.path.getsize(FILE) * part))


def scribble(path, start, end):
    with open(path, "r+b") as file:
        size = os.fstat(file.fileno()).st_size
        file.seek(start)
        file.write(b"\xa5" * ((size if end is None else min(end, size)) - start))


def scribble_pages(start, end):
    copy_log_back()
    scribble(FILE, start, end)


def set_version(number):
    with sqlite3.connect(FILE) as db:
        db.execute(f"PRAGMA user_version = {number}")
    db.close()


def replace(path, make):
    remove(path)
    make(path)


def write_file(path):
    with open(path, "wb") as file:
        file.write(b"no database" * 1000)


def make_full_folder(path):
    os.makedirs(f"{path}/in/its/place")


def foreign_database(path):
    remove_log()
    with sqlite3.connect(path) as db:
        db.execute("CREATE TABLE entries(name)")
    db.close()


# Name, what is done, whether a copy has to be kept (None: when it is noticed decides).
DAMAGES = (
    ("file removed", lambda: remove(FILE), False),
    ("file and log removed", lambda: (remove(FILE), remove_log()), False),
    ("truncated to nothing", lambda: truncate(0), None),
    ("truncated to half", lambda: truncate(0.5), True),
    ("truncated to a page", lambda: os.truncate(FILE, PAGE), None),
    ("truncated inside a page", lambda: (copy_log_back(), os.truncate(FILE, 5 * PAGE + 77)), True),
    ("header overwritten", lambda: scribble_pages(0, 100), True),
    ("first page overwritten", lambda: scribble_pages(0, PAGE), True),
    ("middle overwritten", lambda: scribble_pages(4 * PAGE, None), True),
    ("all overwritten", lambda: (scribble_pages(0, None)), True),
    ("log overwritten", lambda: scribble(FILE + "-wal", 0, None), None),
    ("log's middle overwritten", lambda: scribble(FILE + "-wal", 9 * PAGE, 12 * PAGE), None),
    ("older schema", lambda: set_version(0), True),
    ("newer schema", lambda: set_version(99), True),
    ("foreign database", lambda: replace(FILE, foreign_database), True),
    ("folder in its place", lambda: replace(FILE, make_full_folder), False),
    ("pipe in its place", lambda: replace(FILE, os.mkfifo), False),
    ("link into nowhere", lambda: replace(FILE, lambda path: os.symlink("gone", path)), False),
    ("index removed", lambda: remove(FOLDER), False),
    ("file in the index's place", lambda: replace(FOLDER, write_file), None),
    ("pipe in the index's place", lambda: replace(FOLDER, os.mkfifo), False),
    ("log replaced by a folder", lambda: replace(FILE + "-wal", make_full_folder), None),
    ("log replaced by a pipe", lambda: replace(FILE + "-wal", os.mkfifo), None),
    ("shared memory replaced by a folder", lambda: replace(FILE + "-shm", make_full_folder), None),
    ("shared memory overwritten", lambda: scribble(FILE + "-shm", 0, None), None),
)


class DamagedIndexTest(IndexTest):
    def make_index(self):
        self.root = self.make_share(files=[f"d{i % 7}/{i}.txt" for i in range(400)])
        pid = self.start()
        self.await_drained("alpha")
        # A log of its own on top of a file that is whole.
        copy_log_back()
        self.make_files(self.root, *(f"late/{i}.txt" for i in range(100)))
        self.ctl("reindex", self.root)
        self.await_drained("alpha")
        for number in range(5):  # with commits behind what is damaged
            self.make_files(self.root, f"d0/last {number}.txt")
            self.ctl("event", "alpha", str(CREATE), f"{self.root}/d0/last {number}.txt")
            self.await_drained("alpha")
        self.first = self.enterContext(open(FILE, "rb"))
        # Nothing is amiss with a share that is new.
        self.assert_not_logged(f"({SET_ASIDE.pattern}|{MADE_ANEW.pattern})")
        return pid

    def ask(self):
        """An answer, or one line that says what is wrong; never a crash."""
        for command in (("search", "txt"), ("dump", "alpha"), ("verify", "alpha"), ("status",)):
            result = self.try_ctl(*command)
            self.assertIn(result.code, (0, 1), (command, result))
            if result.err:
                self.assertRegex(result.err, rb"\Afileindexctl: [^\n]+\n\Z")

    def settle(self, after):
        """Until nothing is queued and no reindex is asked for."""
        while True:
            self.await_drained("alpha")
            (share,) = self.ctl("status", "--json").json()["shares"]
            if not share["needs_reindex"]:
                break
            after = self.await_line(ENDED, after)
        self.await_drained("alpha")

    def touch(self):
        self.make_files(self.root, "touched.txt")
        after = self.log.mark()
        self.ctl("event", "alpha", str(CREATE), f"{self.root}/touched.txt")
        self.settle(after)

    def assert_told_once(self, after, kept):
        """What was made anew is told of once, by whoever noticed; what was not, by nobody."""
        self.log.mark()
        texts = self.log.texts(after)
        aside = [text for text in texts if SET_ASIDE.fullmatch(text)]
        if kept is not None:
            self.assertEqual(len(aside), int(kept))
            self.assertEqual(os.path.exists(COPY), kept)
        anew = [text for text in texts if MADE_ANEW.fullmatch(text)]
        told = aside + anew or [text for text in texts if text == NOT_FOUND]
        self.assertEqual(len(told), int(self.is_made_anew()), told)
        self.assertLessEqual(len(glob.glob(f"{FOLDER}.*")), 1)

    def is_made_anew(self):
        """The first one is held open: no other can have its number."""
        return not os.path.samestat(os.fstat(self.first.fileno()), os.stat(FILE))

    def check(self, after, kept):
        self.assert_index(self.root)
        self.assert_told_once(after, kept)
        (share,) = self.ctl("status", "--json").json()["shares"]
        self.assertNotIn("index_problem", share)

    def damaged_while_stopped(self, damage, kept):
        self.stop(self.make_index())
        damage()
        self.ask()
        after = self.log.mark()

        self.start()
        self.settle(after)
        self.touch()

        self.check(after, kept)

    def damaged_while_running(self, damage, kept):
        self.make_index()
        after = self.log.mark()
        damage()
        self.ask()

        self.touch()
        # With a reader at the log, a damaged page stays unseen until it is read.
        if self.try_ctl("dump", "alpha").code != 0:
            asked = self.log.mark()
            self.ctl("reindex", self.root)
            self.settle(asked)

        self.check(after, kept)

    def make_read_only(self, folder):
        namespace.mount(folder, folder, flags=namespace.MS_BIND)
        namespace.mount(folder, folder, flags=namespace.MS_BIND | MS_REMOUNT | MS_RDONLY)

    def test_unwritable_folder_of_the_share_is_said_and_made_good_by_the_next_event(self):
        self.make_index()
        after = self.log.mark()
        folder = os.path.dirname(FOLDER)
        self.make_read_only(folder)
        self.make_files(self.root, "missed.txt")

        result = self.ctl("event", "alpha", str(CREATE), f"{self.root}/missed.txt", code=1)
        self.assertIn(b"Read-only", result.err)
        self.ask()
        namespace.unmount(folder, namespace.MNT_DETACH)
        self.ctl("event", "alpha", str(CREATE), f"{self.root}/missed.txt")
        self.touch()

        self.check(after, False)

    def test_removed_folder_of_the_share_while_stopped(self):
        self.damaged_while_stopped(lambda: remove(os.path.dirname(FOLDER)), False)

    def test_removed_folder_of_the_share_while_running_is_healed_by_a_new_worker(self):
        self.make_index()
        after = self.log.mark()
        # The daemon loses sight of the queue with it: inotify watches the folder itself.
        remove(os.path.dirname(FOLDER))
        self.ask()
        self.make_files(self.root, "missed.txt")
        self.ctl("event", "alpha", str(CREATE), f"{self.root}/missed.txt")
        self.ctl("worker", "drop", "alpha")
        self.ctl("worker", "revive", "alpha")
        self.touch()

        self.check(after, False)


def add_cases():
    for name, damage, kept in DAMAGES:
        for state in ("stopped", "running"):
            def test(self, damage=damage, kept=kept, state=state):
                getattr(self, f"damaged_while_{state}")(damage, kept)

            words = re.sub(r"\W+", "_", name)
            setattr(DamagedIndexTest, f"test_{words}_while_{state}", test)


add_cases()


if __name__ == "__main__":
    main()
