# SPDX-License-Identifier: GPL-2.0-or-later
"""What is done to a state database, and what has to become of it."""

import ctypes
import os
import re
import shutil
import signal
import sqlite3

from harness import IndexTest, namespace

CREATE = 0x40
FILE = f"{namespace.STATE}/state.db"
COPY = f"{FILE}.copy"
USED = re.compile(r".*state\.db.*its last copy is used instead.*")
AT_FDCWD = -100
RENAME_EXCHANGE = 2


def remove(path):
    if os.path.isdir(path) and not os.path.islink(path):
        shutil.rmtree(path)
    elif os.path.lexists(path):
        os.unlink(path)


def remove_all_of(path):
    for ending in ("-wal", "-shm", ""):  # the last is what programs look for, and make anew
        remove(path + ending)


def scribble(path, start=0):
    with open(path, "r+b") as file:
        file.seek(start)
        file.write(b"\xa5" * max(os.fstat(file.fileno()).st_size - start, 5000))


def truncate(part):
    os.truncate(FILE, int(os.path.getsize(FILE) * part))


def make_full_folder(path):
    made = f"{path}.folder"
    os.makedirs(f"{made}/in/its/place")
    if not os.path.lexists(path):
        os.rename(made, path)
        return
    libc = ctypes.CDLL(None, use_errno=True)
    names = (AT_FDCWD, os.fsencode(made), AT_FDCWD, os.fsencode(path))
    if libc.renameat2(*names, RENAME_EXCHANGE) != 0:
        raise OSError(ctypes.get_errno(), "renameat2", path)
    os.unlink(made)


def make_pipe(path):
    os.mkfifo(f"{path}.pipe")
    os.rename(f"{path}.pipe", path)  # programs make the file anew where it is missing


def copy_log_back():
    """So that the main file alone holds the state, for those too who have it open."""
    with sqlite3.connect(FILE) as db:
        while db.execute("PRAGMA wal_checkpoint(TRUNCATE)").fetchone()[0] != 0:
            pass  # a reader was in the way
    db.close()


def thread_states(pid):
    for thread in os.listdir(f"/proc/{pid}/task"):
        with open(f"/proc/{pid}/task/{thread}/stat", encoding="utf-8") as file:
            yield file.read().rpartition(") ")[2]


class StateDamageTest(IndexTest):
    def prepare(self):
        self.root = self.make_share(files=("a.txt", "d/b.txt"))
        self.pid = self.start()
        self.await_drained("alpha")
        self.log.program, daemon = "talocontentsearchd", self.log.program
        self.await_line("reads")  # nobody opens the database meanwhile
        self.log.program = daemon

    def told(self, pattern, after):
        """The lines that match, of all programs."""
        self.log.mark()
        return [line for line in self.log.lines[after:] if pattern.fullmatch(line.text)]

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

        self.assertEqual(len(self.told(USED, after)), 1)
        self.check_works()

    def at_once(self, damage):
        """In one step, to the content service: it opens the database when it likes."""
        service = self.service_pid()
        os.kill(service, signal.SIGSTOP)
        while not all(state.startswith("T") for state in thread_states(service)):
            os.sched_yield()
        damage()
        os.kill(service, signal.SIGCONT)

    def damaged_while_running(self, damage):
        self.prepare()
        after = self.log.mark()
        self.at_once(damage)

        self.check_works()

        self.stop(self.pid)
        self.start()
        self.check_works()
        self.assertEqual(len(self.told(USED, after)), 1)
