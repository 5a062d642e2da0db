# SPDX-License-Identifier: GPL-2.0-or-later
"""A state database that was damaged, removed or replaced: its copy is used, or all say what is wrong."""

import contextlib
import os
import re
import shutil
import sqlite3

from harness import IndexTest, main, namespace

CREATE = 0x40
FILE = f"{namespace.STATE}/state.db"
COPY = f"{FILE}.copy"
USED = re.compile(r".*state\.db.*its last copy is used instead, and it is kept as .*\.damaged")


def remove(path):
    if os.path.isdir(path) and not os.path.islink(path):
        shutil.rmtree(path)
    elif os.path.lexists(path):
        os.unlink(path)


def remove_all_of(path):
    for ending in ("", "-wal", "-shm"):
        remove(path + ending)


def scribble(path, start=0):
    with open(path, "r+b") as file:
        file.seek(start)
        file.write(b"\xa5" * max(os.fstat(file.fileno()).st_size - start, 5000))


def truncate(part):
    os.truncate(FILE, int(os.path.getsize(FILE) * part))


def make_full_folder(path):
    os.makedirs(f"{path}.folder/in/its/place")
    while True:
        remove(path)
        with contextlib.suppress(NotADirectoryError):  # a program has made it anew meanwhile
            os.rename(f"{path}.folder", path)
            return


def make_pipe(path):
    os.mkfifo(f"{path}.pipe")
    os.rename(f"{path}.pipe", path)  # programs make the file anew where it is missing


def set_version(number):
    with sqlite3.connect(FILE) as db:
        db.execute(f"PRAGMA user_version = {number}")
    db.close()


# The copy makes these good.
DAMAGES = (
    ("removed", lambda: remove(FILE)),
    ("removed with its log", lambda: remove_all_of(FILE)),
    ("truncated to nothing", lambda: (remove(FILE + "-wal"), truncate(0))),
    ("truncated to half", lambda: (remove(FILE + "-wal"), truncate(0.5))),
    ("truncated inside a page", lambda: (remove(FILE + "-wal"), os.truncate(FILE, 4096 * 2 + 77))),
    ("header overwritten", lambda: (remove(FILE + "-wal"), scribble(FILE))),
    ("middle overwritten", lambda: (remove(FILE + "-wal"), scribble(FILE, 4096))),
    ("folder in its place", lambda: make_full_folder(FILE)),
    ("pipe in its place", lambda: make_pipe(FILE)),
)


class StateTest(IndexTest):
    def prepare(self):
        self.root = self.make_share(files=("a.txt", "d/b.txt"))
        self.pid = self.start()
        self.await_drained("alpha")

    def assert_all_said(self, pattern):
        """Every tool ends with one line that tells."""
        for command in (
            ("search", "txt"),
            ("dump", "alpha"),
            ("verify", "alpha"),
            ("status",),
            ("share", "list"),
            ("folder", "list"),
            ("reindex", self.root),
            ("event", "alpha", str(CREATE), self.root),
        ):
            self.assertRegex(self.ctl(*command, code=1).err.decode(), pattern)

    def check_works(self):
        self.make_files(self.root, "touched.txt")
        self.ctl("event", "alpha", str(CREATE), f"{self.root}/touched.txt")
        self.await_drained("alpha")
        self.assert_index(self.root)
        (share,) = self.ctl("share", "list", "--json").json()
        self.assertEqual(share["name"], "alpha")

    def damaged_while_stopped(self, damage):
        self.prepare()
        self.stop(self.pid)
        damage()

        after = self.log.mark()
        self.start()

        told = [text for text in self.log.texts(after) if USED.fullmatch(text)]
        self.assertEqual(len(told), 1)
        self.check_works()

    def damaged_while_running(self, damage):
        self.prepare()
        damage()

        self.check_works()

        self.stop(self.pid)
        self.start()
        self.check_works()

    def test_newer_version_is_refused_by_name(self):
        self.prepare()
        self.stop(self.pid)
        set_version(99)
        with open(FILE, "rb") as file:
            before = file.read()
        after = self.log.mark()

        self.launch()

        self.await_line(re.compile(r"Failed to open the state database: .*state\.db has version 99.*"), after)
        self.assert_all_said(r"state\.db has version 99")
        with open(FILE, "rb") as file:
            self.assertEqual(file.read(), before)

    def test_both_damaged(self):
        self.prepare()
        self.stop(self.pid)
        remove(FILE + "-wal")
        scribble(FILE)
        scribble(COPY)
        after = self.log.mark()

        self.launch()

        self.await_line(re.compile(r"Failed to open the state database: .*state\.db.*no sound copy.*"), after)
        self.assert_all_said(r"state\.db.*no sound copy")
        self.assertFalse(os.path.exists(f"{FILE}.damaged"))

    def test_copy_that_is_damaged_is_made_anew_by_the_next_change(self):
        self.prepare()
        for damage in (lambda: scribble(COPY), lambda: remove(COPY), lambda: make_pipe(COPY)):
            damage()
            self.ctl("pause")
            self.ctl("resume")
            with sqlite3.connect(COPY) as db:
                self.assertEqual(db.execute("PRAGMA quick_check").fetchall(), [("ok",)])
            db.close()
        self.check_works()

    def test_state_folder_removed_while_stopped_is_a_first_start(self):
        self.prepare()
        self.stop(self.pid)
        shutil.rmtree(namespace.STATE)

        self.start()

        self.assertEqual(self.ctl("share", "list", "--json").json(), [])


def add_cases():
    for name, damage in DAMAGES:
        for state in ("stopped", "running"):
            def test(self, damage=damage, state=state):
                getattr(self, f"damaged_while_{state}")(damage)

            words = re.sub(r"\W+", "_", name)
            setattr(StateTest, f"test_{words}_while_{state}", test)


add_cases()


if __name__ == "__main__":
    main()
