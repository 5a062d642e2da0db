# SPDX-License-Identifier: GPL-2.0-or-later
"""After an upgrade of the readers."""

import contextlib
import sqlite3

from harness import main
from search.library import ScriptedTest


class RenewalTest(ScriptedTest):
    def read_now(self, root, name):
        """A file that appears now, and is found: its name is its text."""
        self.write(f"{root}/{name}.txt", name)
        self.append("alpha", {"event": 8, "path": f"{root}/{name}.txt"})
        self.await_hits(f"text:{name}", [f"{name}.txt"])

    def pretend_upgrade(self):
        """What was read becomes the work of older readers."""
        with contextlib.closing(sqlite3.connect(self.contents())) as database, database:
            database.execute("UPDATE files SET extractor = 1")
            database.execute("UPDATE meta SET extractor = 1")

    def test_what_older_readers_read_is_read_anew_once(self):
        root = self.make_share(folders=())
        for name in ("one", "two"):
            self.write(f"{root}/{name}.txt", "lighthouse")
        daemon = self.start()
        self.ctl("folder", "add", root, "--document")
        self.await_counts(done=2, waiting=0)
        self.stop(daemon)
        self.pretend_upgrade()

        daemon = self.start()
        self.assertEqual(self.hits("lighthouse"), ["one.txt", "two.txt"])
        twice = ["one.txt", "one.txt", "two.txt", "two.txt"]
        self.await_diary(lambda given: given == twice)
        self.read_now(root, "afterwards")
        self.await_hits("lighthouse", ["one.txt", "two.txt"])
        self.stop(daemon)

        self.start()
        self.read_now(root, "again")
        self.assertEqual(self.given(), ["afterwards.txt", "again.txt", *twice])


if __name__ == "__main__":
    main()
