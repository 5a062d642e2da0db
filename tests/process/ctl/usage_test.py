# SPDX-License-Identifier: GPL-2.0-or-later
"""Wrong command lines end with 2 and one line; help ends with 0; broken surroundings with 1."""

import os
import subprocess

from harness import IndexTest, main, namespace
from harness.awaiting import LIMIT
from harness.machine import environment, program

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
