# SPDX-License-Identifier: GPL-2.0-or-later
"""What is done to a state database, and what has to become of it."""

import contextlib
import os
import re
import sqlite3
import time

from harness import IndexTest, namespace
from harness.awaiting import LIMIT
from harness.pages import try_to_copy_log_back
from harness.standing_in import remove
from harness.stopped import stopped

CREATE = 0x40
FILE = f"{namespace.STATE}/state.db"
COPY = f"{FILE}.copy"
USED = re.compile(r".*state\.db.*its last copy is used instead.*")


def remove_all_of(path):
    for ending in ("-wal", "-shm", ""):  # the last is what programs look for, and make anew
        remove(path + ending)


def truncate(part):
    os.truncate(FILE, int(os.path.getsize(FILE) * part))


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
        with stopped(self.service_pid()):
            damage()

    def in_place(self, damage):
        """To the file that the programs have open and have to read again, as its log is in it."""
        done = False
        deadline = time.monotonic() + LIMIT
        while not done:
            self.assertLess(time.monotonic(), deadline)
            # One may have been stopped as it used the file.
            with stopped(self.pid, self.service_pid()), contextlib.suppress(sqlite3.OperationalError):
                done = try_to_copy_log_back(FILE)
                if done:
                    damage()

    def damaged_while_running(self, damage):
        self.prepare()
        after = self.log.mark()
        self.at_once(damage)

        self.check_works()

        self.stop(self.pid)
        self.start()
        self.check_works()
        self.assertEqual(len(self.told(USED, after)), 1)
