# SPDX-License-Identifier: GPL-2.0-or-later
"""A state database that was damaged, removed or replaced: its copy is used, or all say what is wrong."""

import fcntl
import os
import re
import shutil
import sqlite3

from damaged_state import (
    COPY,
    CREATE,
    FILE,
    USED,
    StateDamageTest,
    remove_all_of,
    truncate,
)
from harness import main, namespace
from harness.pages import scribble
from harness.standing_in import make_full_folder, remove, replace

NEWER = re.compile(r".*state\.db has version 99, made by a newer program; .*")
UPGRADED = re.compile(r".*state\.db is upgraded from version 1 to \d+")
UNREAD = re.compile(r"Failed to (read|store) .*")
REINDEX = 0x10000


def version():
    with sqlite3.connect(FILE) as db:
        (number,) = db.execute("PRAGMA user_version").fetchone()
    db.close()
    return number


def set_version(number):
    with sqlite3.connect(FILE) as db:
        db.execute(f"PRAGMA user_version = {number}")
    db.close()


# As the first version made it, with what the share and its folder are now.
VERSION_1 = """
CREATE TABLE old.share(name BLOB PRIMARY KEY, path BLOB NOT NULL UNIQUE, filesystem TEXT NOT NULL)
    WITHOUT ROWID;
CREATE TABLE old.folder(path BLOB PRIMARY KEY, share BLOB NOT NULL, document INT NOT NULL,
    audio INT NOT NULL, video INT NOT NULL, photo INT NOT NULL) WITHOUT ROWID;
CREATE TABLE old.status(share BLOB PRIMARY KEY, needs_reindex INT NOT NULL,
    reindex_begun INT NOT NULL, no_space INT NOT NULL, missing INT NOT NULL,
    rebuild_wanted INT NOT NULL) WITHOUT ROWID;
CREATE TABLE old.number(name TEXT PRIMARY KEY, value INT NOT NULL) WITHOUT ROWID;
CREATE TABLE old.marker(name BLOB PRIMARY KEY) WITHOUT ROWID;
INSERT INTO old.share SELECT name, path, filesystem FROM share;
INSERT INTO old.folder SELECT path, share, document, audio, video, photo FROM folder;
INSERT INTO old.marker SELECT name FROM marker;
PRAGMA old.user_version = 1;
"""


def replace_by_version_1():
    with sqlite3.connect(FILE) as db:
        db.execute("ATTACH ? AS old", (f"{FILE}.old",))
        db.executescript(VERSION_1)
    db.close()
    remove_all_of(FILE)
    remove(COPY)
    os.rename(f"{FILE}.old", FILE)


# The copy makes these good.
DAMAGES = (
    ("removed", lambda: remove(FILE)),
    ("removed with its log", lambda: remove_all_of(FILE)),
    ("truncated to nothing", lambda: (remove(FILE + "-wal"), truncate(0))),
    ("truncated to half", lambda: (remove(FILE + "-wal"), truncate(0.5))),
    ("truncated inside a page", lambda: (remove(FILE + "-wal"), os.truncate(FILE, 4096 * 2 + 77))),
    ("header overwritten", lambda: (remove(FILE + "-wal"), scribble(FILE))),
    ("middle overwritten", lambda: (remove(FILE + "-wal"), scribble(FILE, 4096))),
    ("folder in its place", lambda: replace(FILE, make_full_folder)),
    ("pipe in its place", lambda: replace(FILE, os.mkfifo)),
)
# These too, in the file that the programs have open: each finds out by itself.
IN_PLACE = (
    ("truncated to nothing", lambda: os.truncate(FILE, 0)),
    ("truncated to half", lambda: truncate(0.5)),
    ("header overwritten", lambda: scribble(FILE)),
    ("middle overwritten", lambda: scribble(FILE, 4096)),
)


class StateTest(StateDamageTest):
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

    def damaged_in_place(self, damage):
        self.prepare()
        after = self.log.mark()
        self.in_place(damage)

        # No tool comes to its help.
        self.append("alpha", {"event": REINDEX, "path": self.root})
        self.await_drained("alpha")

        self.assertEqual(len(self.told(USED, after)), 1)
        self.assertLessEqual(len(self.told(UNREAD, after)), 1)
        self.check_works()

    def test_what_was_set_aside_stays_while_there_is_nothing_else_to_set_aside(self):
        self.prepare()
        self.stop(self.pid)
        remove(FILE + "-wal")
        scribble(FILE)
        self.ctl("share", "list")
        with open(FILE + ".damaged", "rb") as file:
            damaged = file.read()

        remove_all_of(FILE)
        self.ctl("share", "list")

        with open(FILE + ".damaged", "rb") as file:
            self.assertEqual(file.read(), damaged)

    def test_a_log_that_was_set_aside_does_not_stay_beside_another_database(self):
        self.prepare()
        self.stop(self.pid)
        remove(FILE + "-wal")
        scribble(FILE)
        with open(FILE + ".damaged-wal", "wb") as log:
            log.write(b"of an older one")

        self.ctl("share", "list")

        self.assertTrue(os.path.exists(FILE + ".damaged"))
        self.assertFalse(os.path.exists(FILE + ".damaged-wal"))

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

    def assert_newer_told(self, times, after):
        """By the daemon: after each of several batches, in each of which it reads the settings."""
        for number in range(3):
            name = f"{version()} {times} {number}.txt"
            self.make_files(self.root, name)
            self.append("alpha", {"event": CREATE, "path": f"{self.root}/{name}"})
            self.await_drained("alpha")
            told = [line for line in self.told(NEWER, after) if line.program == "fileindexd"]
            self.assertEqual(len(told), times)

    def test_newer_version_while_running_is_told_once_and_used_until_the_end(self):
        self.prepare()
        after = self.log.mark()
        current = version()

        set_version(99)
        self.assert_newer_told(1, after)
        set_version(current)
        self.assert_newer_told(1, after)
        set_version(99)
        self.assert_newer_told(2, after)

        self.assert_all_said(r"state\.db has version 99")
        self.stop(self.pid)
        set_version(current)
        self.start()
        self.assert_index(self.root)

    def test_older_version_is_upgraded_and_told_once(self):
        self.prepare()
        self.stop(self.pid)
        replace_by_version_1()
        after = self.log.mark()

        self.start()

        self.check_works()
        self.assertEqual(len(self.told(UPGRADED, after)), 1)
        self.assertEqual(self.told(USED, after), [])

    def test_both_damaged_while_running_is_told_once(self):
        self.prepare()
        after = self.log.mark()
        self.in_place(lambda: (scribble(COPY), scribble(FILE)))

        for _ in range(2):
            ended = self.log.mark()
            self.append("alpha", {"event": REINDEX, "path": self.root})
            self.await_line("Worker[alpha] failed to commit db", ended)

        told = [line.text for line in self.told(UNREAD, after) if line.program == "fileindexd"]
        self.assertGreater(len(told), 0)
        self.assertEqual(len(set(told)), len(told), told)
        self.assert_all_said(r"state\.db.*no sound copy")

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
        pipe = lambda: replace(COPY, os.mkfifo)
        for damage in (lambda: scribble(COPY), lambda: remove(COPY), pipe):
            damage()
            self.ctl("pause")
            self.ctl("resume")
            with sqlite3.connect(COPY) as db:
                self.assertEqual(db.execute("PRAGMA quick_check").fetchall(), [("ok",)])
            db.close()
        self.check_works()

    def test_a_program_that_stands_still_with_the_lock_keeps_no_reader_out(self):
        self.prepare()
        root = os.open(namespace.STATE, os.O_RDONLY | os.O_DIRECTORY)
        self.addCleanup(os.close, root)
        fcntl.flock(root, fcntl.LOCK_EX)

        (share,) = self.ctl("share", "list", "--json").json()
        self.assertEqual(share["name"], "alpha")
        self.assertIn("a.txt", self.ctl("search", "txt").out.decode())
        error = self.ctl("share", "set", "alpha", "--language", "german", code=1).err.decode()
        self.assertRegex(error, "cannot lock .*state: ")

        fcntl.flock(root, fcntl.LOCK_UN)
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
    for name, damage in IN_PLACE:
        def test_in_place(self, damage=damage):
            self.damaged_in_place(damage)

        words = re.sub(r"\W+", "_", name)
        setattr(StateTest, f"test_{words}_in_place_while_running", test_in_place)


add_cases()


if __name__ == "__main__":
    main()
