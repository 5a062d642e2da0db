# SPDX-License-Identifier: GPL-2.0-or-later
"""Wrong command lines end with 2 and one line; help ends with 0; broken surroundings with 1."""

import os
import shutil
import subprocess

from harness import IndexTest, main, namespace
from harness.awaiting import LIMIT
from harness.machine import environment, program

NOBODY = 65534

WRONG = [
    (),
    ("nope",),
    ("--nope",),
    ("share",),
    ("share", "nope"),
    ("share", "add"),
    ("share", "add", "a"),
    ("share", "add", "a", "/b", "c"),
    ("share", "remove"),
    ("share", "list", "x"),
    ("share", "accept"),
    ("share", "set", "a"),
    ("share", "set", "--language", "german"),
    ("share", "set", "a", "--language", "klingon"),
    ("status", "--follow", "x"),
    ("folder",),
    ("folder", "add"),
    ("folder", "add", "/a", "--text"),
    ("folder", "add", "/a", "--all", "--audio"),
    ("folder", "set"),
    ("folder", "remove"),
    ("reindex",),
    ("reindex", "/a", "/b"),
    ("event",),
    ("event", "a"),
    ("event", "a", "64"),
    ("event", "a", "64", "/x", "/y"),
    ("event", "a", "64", "/x", "--path-old"),
    ("pause", "x"),
    ("resume", "x"),
    ("log-level",),
    ("search", "x", "--timeout", "5"),
    ("search", "x", "--wait", "--timeout", "0"),
    ("search", "--wait"),
    ("worker",),
    ("worker", "drop"),
    ("worker", "revive", "a", "b"),
    ("status", "x"),
    ("status", "--nope"),
    ("info",),
    ("info", "a", "b"),
    ("info", ""),
    ("reindex", ""),
    ("dump", ""),
    ("dump", "a", "b"),
    ("verify", "a", "b"),
]
COMMANDS = [
    ("share",),
    ("share", "add"),
    ("share", "set"),
    ("folder", "add"),
    ("folder", "set"),
    ("event",),
    ("pause",),
    ("worker", "drop"),
    ("status",),
    ("search",),
    ("info",),
    ("dump",),
    ("verify",),
]


class UsageTest(IndexTest):
    def test_wrong_lines(self):
        for arguments in WRONG:
            with self.subTest(arguments=arguments):
                self.assertEqual(self.ctl(*arguments, code=2).out, b"")

        self.assertFalse(os.path.lexists(namespace.STATE))

    def test_help(self):
        self.assertIn(b"search", self.ctl("--help").out)
        for arguments in COMMANDS:
            with self.subTest(arguments=arguments):
                self.assertIn(arguments[-1].encode(), self.ctl(*arguments, "--help").out)

    def test_state_folder_that_cannot_be_made(self):
        with open(f"{namespace.RUN}/file", "w", encoding="ascii"):
            pass

        for arguments in (("share", "list"), ("status",), ("dump", "a")):
            self.ctl(*arguments, code=1, FILEINDEXD_STATE_DIR=f"{namespace.RUN}/file/state")

    def test_a_question_makes_no_state_and_answers_as_without_shares(self):
        nowhere = f"{namespace.RUN}/no/state"
        empty = f"{namespace.RUN}/empty"
        os.mkdir(empty)
        self.ctl("share", "remove", "alpha", code=1)  # makes one
        for arguments in (("search", "x"), ("search", "--count", "x"), ("search", "x", "share:a"),
                          ("search", "--json", "x"), ("search", "--share", "a", "x"),
                          ("info", "/x"), ("stats",), ("stats", "--json"),
                          ("stats", "--share", "a"), ("status",), ("status", "--json"),
                          ("dump", "a"), ("failed",), ("failed", "--json"), ("failed", "a"),
                          ("verify", "a"), ("share", "list"), ("share", "list", "--json"),
                          ("folder", "list"),
                          ("folder", "list", "--json")):
            with self.subTest(arguments=arguments):
                self.assertEqual(self.try_ctl(*arguments, FILEINDEXD_STATE_DIR=nowhere),
                                 self.try_ctl(*arguments))
                self.assertFalse(os.path.lexists(f"{namespace.RUN}/no"))
                self.assertEqual(self.try_ctl(*arguments, FILEINDEXD_STATE_DIR=empty),
                                 self.try_ctl(*arguments))
                self.assertEqual(os.listdir(empty), [])

        self.ctl("resume", FILEINDEXD_STATE_DIR=nowhere)
        self.assertTrue(os.path.exists(f"{nowhere}/state.db"))

    def by_another_user(self, *arguments, **more):
        copy = f"{namespace.RUN}/open/fileindexctl"
        if not os.path.exists(copy):
            os.mkdir(f"{namespace.RUN}/open")
            shutil.copy(program("fileindexctl"), copy)
        try:
            return subprocess.run(
                [copy, *arguments],
                env=environment(**more),
                user=NOBODY,
                cwd="/",
                capture_output=True,
                check=False,
                timeout=LIMIT,
            )
        except OSError as error:  # where only one user is mapped
            self.skipTest(f"no other user here: {error}")

    def test_another_user_is_told_that_root_is_needed(self):
        self.make_share()
        for state in (namespace.STATE, f"{namespace.STATE}/below", f"{namespace.RUN}/no/state"):
            told = f"fileindexctl: cannot read the state folder {state}: root is needed\n"
            for arguments in (("search", "x"), ("info", "/x"), ("stats",), ("status",),
                              ("dump", "alpha"), ("failed",), ("verify", "alpha"),
                              ("share", "list"), ("folder", "list"), ("share", "add", "b", "/")):
                with self.subTest(state=state, arguments=arguments):
                    done = self.by_another_user(*arguments, FILEINDEXD_STATE_DIR=state)
                    self.assertEqual((done.returncode, done.stdout, done.stderr.decode()),
                                     (1, b"", told))

    def test_what_else_is_wrong_is_told_to_another_user_too(self):
        with open(f"{namespace.RUN}/file", "w", encoding="ascii"):
            pass
        for state, told in (("x", b"FILEINDEXD_STATE_DIR is not an absolute path: x"),
                            (f"{namespace.RUN}/file", b"cannot create")):
            done = self.by_another_user("share", "list", FILEINDEXD_STATE_DIR=state)
            self.assertEqual(done.returncode, 1)
            self.assertIn(told, done.stderr)

    def test_output_that_cannot_be_written(self):
        self.make_share()
        with open("/dev/full", "wb") as full:
            done = subprocess.run(
                [program("fileindexctl"), "share", "list"],
                stdout=full,
                stderr=subprocess.PIPE,
                env=environment(),
                check=False,
                timeout=LIMIT,
            )

        self.assertEqual(done.returncode, 1)
        self.assertRegex(done.stderr, rb"\Afileindexctl: [^\n]+\n\Z")

    def test_a_reader_that_has_enough_is_no_failure(self):
        self.make_share()
        for arguments in (("share", "list"), ("share", "list", "--json"), ("status",),
                          ("search", "--help"), ("folder", "list")):
            with self.subTest(arguments=arguments):
                read_end, write_end = os.pipe()
                os.close(read_end)
                done = subprocess.run(
                    [program("fileindexctl"), *arguments],
                    stdout=write_end,
                    stderr=subprocess.PIPE,
                    env=environment(),
                    check=False,
                    timeout=LIMIT,
                )
                os.close(write_end)
                self.assertEqual((done.returncode, done.stderr), (0, b""))

    def test_state_folder_is_private(self):
        self.make_share()

        for path in (namespace.STATE, f"{namespace.STATE}/shares"):
            self.assertEqual(os.stat(path).st_mode & 0o777, 0o700, path)
        self.assertEqual(os.stat(f"{namespace.STATE}/state.db").st_mode & 0o777, 0o600)


if __name__ == "__main__":
    main()
