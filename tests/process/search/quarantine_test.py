# SPDX-License-Identifier: GPL-2.0-or-later
"""Files that cannot be read, and those that end whoever reads them."""

import contextlib
import os
import sqlite3

from harness import main
from search.library import ScriptedTest


class QuarantineTest(ScriptedTest):
    def setUp(self):
        super().setUp()
        self.root = self.make_share(folders=())
        for name in ("crash.txt", "bad.txt", "nonsense.txt", "good.txt"):
            self.write(f"{self.root}/{name}", "lighthouse")
        self.daemon = self.start()
        self.ctl("folder", "add", self.root, "--document")
        self.await_counts(done=1, failed=3, waiting=0)

    def test_what_killed_a_helper_twice_is_not_tried_again(self):
        self.assertEqual(
            self.given(),
            ["bad.txt", "crash.txt", "crash.txt", "good.txt", "nonsense.txt", "nonsense.txt"],
        )

        failed = self.failed()
        self.assertEqual(sorted(failed), ["bad.txt", "crash.txt", "nonsense.txt"])
        self.assertEqual(failed["bad.txt"], ("damaged", 1))
        self.assertEqual(failed["crash.txt"], ("the helper ended with SIGABRT", 2))
        self.assertEqual(failed["nonsense.txt"][1], 2)
        self.assertEqual(sorted(self.failed("alpha")), sorted(failed))
        self.assertIn(b"crash.txt: the helper ended with SIGABRT (2 tries)", self.ctl("failed").out)
        self.assertIn(b"1 read, 3 failed", self.ctl("status").out)
        (share,) = self.ctl("status", "--json").json()["shares"]
        by_kind = share["contents_by_kind"]
        self.assertEqual(by_kind["document"], {"waiting": 0, "done": 1, "failed": 3})
        self.assertEqual(by_kind["photo"], {"waiting": 0, "done": 0, "failed": 0})
        self.ctl("failed", "beta", code=1)

    def test_retry_reads_it_once_more(self):
        self.write(f"{os.path.dirname(self.diary_path)}/mended", "")

        self.ctl("failed", "alpha", "--retry")

        self.await_counts(done=2, failed=2, waiting=0)
        self.assertEqual(self.hits("lighthouse"), ["crash.txt", "good.txt"])
        self.assertEqual(sorted(self.failed()), ["bad.txt", "nonsense.txt"])

    def test_retry_says_what_it_does_and_who_does_not(self):
        self.assertEqual(self.ctl("failed", "--retry").out, b"3 files will be tried again\n")
        self.await_diary(lambda given: given.count("bad.txt") == 2)
        self.await_counts(failed=3, waiting=0)

        self.ctl("pause")
        self.assertIn(b"3 files will be tried again when", self.ctl("failed", "--retry").out)
        for one in self.ctl("failed", "--retry", "--json").json():
            self.assertTrue(one["retry"] and one["paused"])
        self.ctl("resume")
        self.await_diary(lambda given: given.count("bad.txt") == 3)
        self.await_counts(failed=3, waiting=0)

        self.stop(self.daemon)
        self.assertIn(b"content service", self.ctl("failed", "alpha", "--retry").out)
        for one in self.ctl("failed", "--retry", "--json").json():
            self.assertEqual((one["retry"], one["service_runs"], one["paused"]), (True, False, False))
        self.start()
        self.await_diary(lambda given: given.count("bad.txt") == 4)

    def test_what_an_older_extractor_failed_at_is_tried_again(self):
        self.write(f"{os.path.dirname(self.diary_path)}/mended", "")
        self.stop(self.daemon)
        with contextlib.closing(sqlite3.connect(self.contents())) as contents, contents:
            for table in ("files", "meta"):
                contents.execute(f"UPDATE {table} SET extractor = extractor - 1")

        self.start()

        self.await_counts(done=2, failed=2, waiting=0)
        self.assertEqual(self.hits("lighthouse"), ["crash.txt", "good.txt"])
        self.assertEqual(self.failed()["nonsense.txt"][1], 2)
        # What had been read is read anew as well, behind these: see renewal_test.py.
        self.await_diary(lambda given: given.count("good.txt") == 2)

    def test_a_changed_file_is_tried_again(self):
        self.write(f"{os.path.dirname(self.diary_path)}/mended", "")
        self.write(f"{self.root}/crash.txt", "another harbour")

        self.append("alpha", {"event": 8, "path": f"{self.root}/crash.txt"})

        self.await_hits("harbour", ["crash.txt"])
        self.assertEqual(sorted(self.failed()), ["bad.txt", "nonsense.txt"])


if __name__ == "__main__":
    main()
