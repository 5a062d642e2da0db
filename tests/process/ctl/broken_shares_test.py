# SPDX-License-Identifier: GPL-2.0-or-later
"""Several shares of which some cannot be read: one line names these, the rest is answered."""

import os
import shutil

from harness import main, namespace
from search.library import ContentsTest

SHARES = ("alpha", "beta", "gamma")


class BrokenSharesTest(ContentsTest):
    def setUp(self):
        super().setUp()
        self.start()
        for share in SHARES:
            root = self.make_share(share, folders=())
            self.write(f"{root}/lighthouse.txt", "lighthouse")
            self.ctl("folder", "add", root, "--document")
            self.await_counts(share, done=1)
        service = self.service_pid()
        self.stop(self.daemon_pid())
        self.await_exit(service)

    def index(self, share):
        return f"{namespace.STATE}/shares/{share}/index/entries.db"

    def spoil(self, database):
        for ending in ("-wal", "-shm", ""):
            self.write(database + ending, "no database at all")

    def check_named(self, result, shares):
        """One line of errors, which `ctl` has seen to, and in it these."""
        named = [share for share in SHARES if share in result.err.decode()]
        self.assertEqual(named, list(shares), result.err)

    def test_those_that_are_broken_are_named_in_one_line(self):
        for share in ("alpha", "gamma"):
            self.spoil(self.contents(share))
            self.spoil(self.index(share))

        for command in (
            ("failed",),
            ("failed", "--json"),
            ("search", "lighthouse"),
            ("search", "lighthouse", "--json"),
            ("stats",),
            ("stats", "--json"),
            ("stats", "--by", "kind"),
        ):
            with self.subTest(command):
                result = self.ctl(*command, code=1)
                self.check_named(result, ("alpha", "gamma"))
                if command[0] != "failed":
                    self.assertNotEqual(result.out, b"")
        self.assertEqual(self.ctl("failed", "--json", code=1).json(), [])

    def test_an_index_that_is_gone_is_told_of_by_info(self):
        shutil.rmtree(os.path.dirname(self.index("beta")))
        for share, problem in (("alpha", ""), ("beta", "the index cannot be read: there is no index")):
            path = f"{namespace.DATA}/{share}/lighthouse.txt"
            told = self.ctl("info", path, "--json").json()
            self.assertEqual(told["index_problem"], problem)
            self.assertEqual(told["state"], "unknown" if problem else "current")

    def test_where_nobody_answers_there_is_no_document(self):
        for share in SHARES:
            self.spoil(self.contents(share))
            self.spoil(self.index(share))

        for command in ("failed", "stats", "stats --by kind", "stats --duplicates"):
            for options in ("", " --json"):
                with self.subTest(command + options):
                    result = self.ctl(*(command + options).split(), code=1)
                    self.check_named(result, SHARES)
                    self.assertEqual(result.out, b"")

    def test_where_one_share_is_asked_and_broken_there_is_no_document(self):
        self.spoil(self.contents("beta"))
        self.spoil(self.index("beta"))

        for command in (("failed", "beta", "--json"), ("stats", "--share", "beta", "--json")):
            result = self.ctl(*command, code=1)
            self.check_named(result, ("beta",))
            self.assertEqual(result.out, b"")


if __name__ == "__main__":
    main()
