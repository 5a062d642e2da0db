# SPDX-License-Identifier: GPL-2.0-or-later
"""After an upgrade of the readers."""

import contextlib
import os
import shutil
import sqlite3

from harness import main
from search.library import ContentsTest, ScriptedTest


def pretend_upgrade(path):
    """What was read becomes the work of older readers."""
    with contextlib.closing(sqlite3.connect(path)) as database, database:
        database.execute("UPDATE files SET extractor = 1")
        database.execute("UPDATE meta SET extractor = 1")


class RenewalTest(ScriptedTest):
    def read_now(self, root, name):
        """A file that appears now, and is found: its name is its text."""
        self.write(f"{root}/{name}.txt", name)
        self.append("alpha", {"event": 8, "path": f"{root}/{name}.txt"})
        self.await_hits(f"text:{name}", [f"{name}.txt"])

    def test_what_older_readers_read_is_read_anew_once(self):
        root = self.make_share(folders=())
        for name in ("one", "two"):
            self.write(f"{root}/{name}.txt", "lighthouse")
        daemon = self.start()
        self.ctl("folder", "add", root, "--document")
        self.await_counts(done=2, waiting=0)
        self.stop(daemon)
        pretend_upgrade(self.contents())

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


class RebuildTest(ContentsTest):
    FILES = 600

    def ask(self, sql):
        with contextlib.closing(sqlite3.connect(self.contents())) as database:
            return database.execute(sql).fetchone()

    def test_nothing_is_lost_while_entries_are_made_anew_at_the_same_time(self):
        root = self.make_share(folders=())
        for number in range(self.FILES):
            self.write(f"{root}/{number}.txt", "lighthouse")
        daemon = self.start()
        self.ctl("folder", "add", root, "--document")
        self.await_counts(done=self.FILES, waiting=0)
        self.stop(daemon)
        last, version = self.ask("SELECT max(id), max(extractor) FROM files")
        pretend_upgrade(self.contents())
        shutil.rmtree(f"{os.path.dirname(self.queue('alpha'))}/index")

        self.start()
        self.ctl("reindex", root)

        anew = f"SELECT count(*) FROM files WHERE extractor = {version} AND state = 1"
        self.await_contents(lambda: self.ask(anew) == (self.FILES,))
        self.assertEqual(self.ask("SELECT max(id) FROM files"), (last,), "files came as new ones")


if __name__ == "__main__":
    main()
