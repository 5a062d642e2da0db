# SPDX-License-Identifier: GPL-2.0-or-later
"""An index that was damaged, removed or replaced: it is noticed, told once, and made anew."""

import glob
import os
import re
import shutil
import signal
import sqlite3

from harness import IndexTest, main, namespace
from harness.pages import PAGE, copy_log_back, scribble, scribble_leaf
from harness.standing_in import make_full_folder, remove, replace
from harness.stopped import stopped

CREATE = 0x40
MS_RDONLY = 1
MS_REMOUNT = 32
FOLDER = f"{namespace.STATE}/shares/alpha/index"
FILE = f"{FOLDER}/entries.db"
COPY = f"{FOLDER}.damaged"
ENDED = re.compile(
    r"Worker\[alpha\] (finished all task, stopping|stopped while processing command queue)"
)
# What is told of an index that cannot be used; and of one that is gone, by a Worker at work and by
# one that begins.
SET_ASIDE = re.compile(
    r"index (damaged|made by another version|made by another program) and (set aside|removed), path=.*"
)
MADE_ANEW = re.compile(r"index missing and made anew, path=.*")
TOLD = re.compile(f"{SET_ASIDE.pattern}|{MADE_ANEW.pattern}")
NOT_FOUND = "Failed to initiate indexer due to path not found, try re-create db"


def contents(path):
    """Bytes of a file, {name: contents} of a folder; None where neither is."""
    if os.path.isdir(path):
        return {name: contents(f"{path}/{name}") for name in os.listdir(path)}
    if not os.path.isfile(path):
        return None
    with open(path, "rb") as file:
        return file.read()


def remove_log():
    remove(FILE + "-wal")
    remove(FILE + "-shm")


def remove_by_pattern():
    for path in glob.glob(f"{FILE}-*"):
        remove(path)


def drop_column():
    with sqlite3.connect(FILE) as db:
        db.execute("ALTER TABLE meta DROP COLUMN last_written")
    db.close()


def cut_off(size):
    copy_log_back(FILE)
    os.truncate(FILE, size)


def truncate(part):
    copy_log_back(FILE)
    os.truncate(FILE, int(os.path.getsize(FILE) * part))


def scribble_pages(start, end):
    copy_log_back(FILE)
    scribble(FILE, start, end)


def set_version(number):
    with sqlite3.connect(FILE) as db:
        db.execute(f"PRAGMA user_version = {number}")
    db.close()


def write_file(path):
    with open(path, "wb") as file:
        file.write(b"no database" * 1000)


def foreign_database(path):
    remove_log()
    with sqlite3.connect(path) as db:
        db.execute("CREATE TABLE entries(name)")
    db.close()


# What becomes of an index that was damaged: it is kept, and told of as set aside; it is told of as
# missing, since nothing is there to be kept; it is whole without anybody's doing.
KEPT = "kept"
GONE = "gone"
UNSEEN = "unseen"  # of its shared memory alone, which SQLite makes anew

# Name, what is done, what becomes of it while the daemon is stopped and while it runs.
DAMAGES = (
    ("file removed", lambda: remove(FILE), GONE, GONE),
    ("file and log removed", lambda: (remove(FILE), remove_log()), GONE, GONE),
    ("truncated to nothing", lambda: truncate(0), GONE, GONE),
    ("truncated to half", lambda: truncate(0.5), KEPT, KEPT),
    ("truncated to a page", lambda: os.truncate(FILE, PAGE), KEPT, KEPT),
    ("truncated inside a page", lambda: cut_off(5 * PAGE + 77), KEPT, KEPT),
    ("header overwritten", lambda: scribble_pages(0, 100), KEPT, KEPT),
    ("first page overwritten", lambda: scribble_pages(0, PAGE), KEPT, KEPT),
    ("middle overwritten", lambda: scribble_pages(4 * PAGE, None), KEPT, KEPT),
    ("all overwritten", lambda: (scribble_pages(0, None)), KEPT, KEPT),
    ("log and memory removed", remove_log, KEPT, KEPT),
    ("log alone removed", lambda: remove(FILE + "-wal"), KEPT, KEPT),
    ("all that is called like it removed", remove_by_pattern, KEPT, KEPT),
    ("column missing", drop_column, KEPT, KEPT),
    ("empty folder in its place", lambda: replace(FILE, os.mkdir), GONE, GONE),
    ("log overwritten", lambda: scribble(FILE + "-wal", 0, None), KEPT, KEPT),
    ("log's middle overwritten", lambda: scribble(FILE + "-wal", 9 * PAGE, 12 * PAGE), KEPT, KEPT),
    ("older schema", lambda: set_version(0), KEPT, KEPT),
    ("newer schema", lambda: set_version(99), KEPT, KEPT),
    ("foreign database", lambda: replace(FILE, foreign_database), KEPT, KEPT),
    ("folder in its place", lambda: replace(FILE, make_full_folder), KEPT, KEPT),
    ("pipe in its place", lambda: replace(FILE, os.mkfifo), GONE, GONE),
    ("link into nowhere", lambda: replace(FILE, lambda path: os.symlink("gone", path)), GONE, GONE),
    ("index removed", lambda: remove(FOLDER), GONE, GONE),
    ("file in the index's place", lambda: replace(FOLDER, write_file), KEPT, KEPT),
    ("pipe in the index's place", lambda: replace(FOLDER, os.mkfifo), GONE, GONE),
    ("log replaced by a folder", lambda: replace(FILE + "-wal", make_full_folder), KEPT, KEPT),
    ("log replaced by a pipe", lambda: replace(FILE + "-wal", os.mkfifo), KEPT, KEPT),
    ("memory replaced by a folder", lambda: replace(FILE + "-shm", make_full_folder), KEPT, KEPT),
    ("memory overwritten", lambda: scribble(FILE + "-shm", 0, None), UNSEEN, UNSEEN),
)

# What is asked of an index that cannot be opened, and the code it exits with.
ASKED = (
    (("dump", "alpha"), 1),
    (("verify", "alpha"), 1),
    (("stats",), 1),
    (("search", "txt"), 1),
    (("info", f"{namespace.DATA}/alpha"), 0),
    (("status",), 0),
)


class DamagedIndexTest(IndexTest):
    def make_index(self):
        self.root = self.make_share(files=[f"d{i % 7}/{i}.txt" for i in range(400)])
        pid = self.start()
        self.await_drained("alpha")
        # A log of its own on top of a file that is whole.
        copy_log_back(FILE)
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

    def assert_told_once(self, after, fate, begun):
        """By whoever noticed: a Worker that has begun since, or one that was at work."""
        texts = self.logged(after)
        told = {
            "set aside": len(list(filter(SET_ASIDE.fullmatch, texts))),
            "made anew": len(list(filter(MADE_ANEW.fullmatch, texts))),
            "not found": texts.count(NOT_FOUND),
        }
        is_lost = fate != UNSEEN
        if begun is None:  # whichever of the two came first
            begun = told["not found"] > 0
        wanted = {
            "set aside": int(fate == KEPT),
            "made anew": int(fate == GONE and not begun),
            "not found": int(is_lost and begun),
        }
        self.assertEqual(told, wanted, texts)
        self.assertIs(self.is_made_anew(), is_lost)

    def assert_kept(self, fate, found):
        """What is kept is what was found, to the byte; a log may have grown behind it."""
        self.assertEqual(glob.glob(f"{FOLDER}.*"), [COPY] if fate == KEPT else [])
        if fate != KEPT:
            return
        kept = contents(COPY)
        if isinstance(found, bytes):
            self.assertEqual(kept, found)
            return
        self.assertEqual(kept["entries.db"], found["entries.db"])
        log = found.get("entries.db-wal")
        if isinstance(log, bytes):
            self.assertEqual(kept["entries.db-wal"][: len(log)], log)
        elif log is not None:
            self.assertEqual(kept["entries.db-wal"], log)

    def is_made_anew(self):
        """The first one is held open: no other can have its number."""
        return not os.path.samestat(os.fstat(self.first.fileno()), os.stat(FILE))

    def check(self, after, fate, begun=True, found=None):
        self.assert_index(self.root)
        self.assert_told_once(after, fate, begun)
        self.assert_kept(fate, found)
        (share,) = self.ctl("status", "--json").json()["shares"]
        self.assertNotIn("index_problem", share)

    def damaged_while_stopped(self, damage, fate):
        self.stop(self.make_index())
        damage()
        found = contents(FOLDER)
        self.ask()
        after = self.log.mark()

        self.start()
        self.settle(after)
        self.touch()

        self.check(after, fate, True, found)

    def damaged_while_running(self, damage, fate):
        self.make_index()
        after = self.log.mark()
        with stopped(self.daemon_pid()):  # whoever reads may tell it at once
            damage()
            found = contents(FOLDER)
        self.ask()
        self.settle(after)

        self.touch()
        # What the daemon does not look at is told by whoever reads it.
        asked = self.log.mark()
        if self.try_ctl("dump", "alpha").code != 0:
            self.await_line(TOLD, asked)
            self.touch()

        self.check(after, fate, None, found)

    def damaged_and_only_asked(self, damage, asked, fate=KEPT, code=1):
        self.damaged_and_only_met_by(damage, lambda: self.ctl(*asked, code=code), fate)

    def damaged_and_only_met_by(self, damage, ask, fate=KEPT):
        self.await_alone(self.make_index())
        after = self.log.mark()
        damage()
        found = contents(FOLDER)

        ask()
        self.await_line(TOLD, after)
        self.settle(after)

        self.check(after, fate, None, found)
        self.assertFalse(os.path.exists(f"{FOLDER}/suspected"))

    def test_rows_that_only_a_comparison_reads_are_told_of_and_made_anew(self):
        self.damaged_and_only_asked(lambda: scribble_leaf(FILE, "entries"), ("verify", "alpha"))

    def test_rows_that_only_a_dump_reads_are_told_of_and_made_anew(self):
        self.damaged_and_only_asked(lambda: scribble_leaf(FILE, "entries"), ("dump", "alpha"))

    def test_rows_that_only_statistics_read_are_told_of_and_made_anew(self):
        self.damaged_and_only_asked(lambda: scribble_leaf(FILE, "entries"), ("stats",))

    def test_rows_that_only_info_reads_are_told_of_and_made_anew(self):
        def ask():
            paths = (f"{self.root}/d{i % 7}/{i}.txt" for i in range(400))
            self.assertTrue(
                any(b"cannot be read" in self.ctl("info", path).out for path in paths)
            )

        self.damaged_and_only_met_by(lambda: scribble_leaf(FILE, "entries"), ask)

    def test_rows_that_only_status_counts_are_told_of_and_made_anew(self):
        def damage():
            os.kill(self.service_pid(), signal.SIGSTOP)  # it follows them
            scribble_leaf(FILE, "entries_wanted")

        self.damaged_and_only_asked(damage, ("status",), code=0)

    def test_an_older_file_below_its_log_is_told_of_by_whoever_reads_it(self):
        pid = self.make_index()
        shutil.copyfile(FILE, f"{namespace.RUN}/older.db")
        self.make_files(self.root, *(f"later/{i}.txt" for i in range(200)))
        self.ctl("reindex", self.root)
        self.await_drained("alpha")
        copy_log_back(FILE)
        self.touch()
        self.stop(pid)
        shutil.copyfile(f"{namespace.RUN}/older.db", FILE)
        found = contents(FOLDER)
        after = self.log.mark()

        self.start()
        self.ask()
        self.settle(after)
        self.touch()

        self.check(after, KEPT, None, found)

    def test_words_that_only_a_search_reads_are_told_of_and_made_anew(self):
        self.damaged_and_only_asked(lambda: scribble_leaf(FILE, "names_data"), ("search", "txt"))

    def test_a_log_that_went_is_told_of_by_a_search_alone(self):
        self.damaged_and_only_asked(lambda: remove(FILE + "-wal"), ("search", "txt"))

    def test_a_database_that_went_is_told_of_by_a_search_alone(self):
        self.damaged_and_only_asked(lambda: remove(FILE), ("search", "txt"), GONE)

    def test_an_index_that_only_seemed_damaged_is_kept(self):
        self.make_index()
        note = f"{FOLDER}/suspected"
        for suspect in (lambda: open(note, "wb").close(), lambda: make_full_folder(note)):
            suspect()
            after = self.log.mark()

            self.touch()

            self.assertFalse(os.path.lexists(note))
            self.check(after, UNSEEN)

    def test_damage_is_told_of_whatever_stands_in_the_place_of_the_note(self):
        def damage():
            scribble_leaf(FILE, "names_data")
            os.mkfifo(f"{FOLDER}/suspected")
            os.utime(f"{FOLDER}/suspected", (0, 0))

        self.damaged_and_only_asked(damage, ("search", "txt"))

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

        self.check(after, UNSEEN)

    def test_removed_folder_of_the_share_while_stopped(self):
        self.damaged_while_stopped(lambda: remove(os.path.dirname(FOLDER)), GONE)

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

        self.check(after, GONE, begun=None)


def add_cases():
    for name, damage, stopped, running in DAMAGES:
        for state, fate in (("stopped", stopped), ("running", running)):
            def test(self, damage=damage, fate=fate, state=state):
                getattr(self, f"damaged_while_{state}")(damage, fate)

            words = re.sub(r"\W+", "_", name)
            setattr(DamagedIndexTest, f"test_{words}_while_{state}", test)

    for asked, code in ASKED:
        def test_asked(self, asked=asked, code=code):
            def damage():
                os.kill(self.service_pid(), signal.SIGSTOP)  # it reads, too
                scribble_pages(0, PAGE)

            self.damaged_and_only_asked(damage, asked, code=code)

        name = f"test_index_that_cannot_be_opened_is_told_of_by_{asked[0]}"
        setattr(DamagedIndexTest, name, test_asked)


add_cases()


if __name__ == "__main__":
    main()
