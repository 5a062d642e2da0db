# SPDX-License-Identifier: GPL-2.0-or-later
"""After half of the entries are removed, the database's file shrinks without a further event."""

import contextlib
import os
import shutil
import sqlite3

from harness import main, namespace
from harness.sampling import SamplingTest
from harness.scale import IS_LONG

FILES = 200_000 if IS_LONG else 4_000
IN_A_FOLDER = 500
DELETE = 0x80


class ShrinkTest(SamplingTest):
    def setUp(self):
        super().setUp()
        names = (f"{'ab'[i % 2]}/d{i // IN_A_FOLDER}/picture {i}.jpg" for i in range(FILES))
        self.root = self.make_share(files=names)
        self.file = f"{namespace.STATE}/shares/alpha/index/entries.db"
        self.start(debug=False)
        self.await_all_drained()
        self.append("alpha", {"event": 0x8, "path": self.root})  # what it has to do is done
        self.await_all_drained()
        # The file, once all of the log is copied back.
        with contextlib.closing(sqlite3.connect(f"file:{self.file}?mode=ro", uri=True)) as db:
            (pages,) = db.execute("PRAGMA page_count").fetchone()
            (page_size,) = db.execute("PRAGMA page_size").fetchone()
        self.before = pages * page_size

    def check(self):
        self.await_all_drained()
        after = os.stat(self.file).st_size
        print(f"{self.before} bytes became {after}", flush=True)
        self.assertLessEqual(after, self.before * 0.7)
        self.assert_index(self.root)

    def remove_half(self):
        for folder in os.listdir(f"{self.root}/a"):
            shutil.rmtree(f"{self.root}/a/{folder}")

    def test_one_event_for_half_of_all(self):
        self.remove_half()
        self.append("alpha", {"event": 0x10000, "path": f"{self.root}/a"})
        self.check()

    def test_an_event_for_each_file(self):
        below = [
            os.path.join(folder, name)
            for folder, folders, files in os.walk(f"{self.root}/a")
            for name in folders + files
        ]
        self.remove_half()
        for start in range(0, len(below), 5000):
            lines = ({"event": DELETE, "path": path} for path in below[start : start + 5000])
            self.append("alpha", *lines)
            self.await_all_drained()
        self.check()

    def test_killed_on_the_way(self):
        self.remove_half()
        pid = self.daemon_pid()
        self.append("alpha", {"event": 0x10000, "path": f"{self.root}/a"})
        self.await_taken("alpha")
        self.kill(pid)
        self.start(debug=False)
        self.check()


if __name__ == "__main__":
    main()
