# SPDX-License-Identifier: GPL-2.0-or-later
"""Names that would act on a terminal: shown in digits there, byte for byte elsewhere."""

import json
import os

from ctl.terminal import Terminal
from harness import IndexTest, main, namespace
from harness.machine import full_path, program

SHARE = "sh\u202e\u2066are"
FOLDER = b"fo\x1b[2J\x9blder"
NAMES = [b"bell\x07", b"line\nbreak", b"c1\xc2\x9b31m", "turned\u202egpj.exe".encode(),
         "held\u2068back".encode(), b"bytes\xff\xfe", b"long" + b"\x1b" * 251]


class HostileNamesTest(IndexTest):
    def setUp(self):
        super().setUp()
        self.root = f"{namespace.DATA}/{SHARE}"
        self.folder = os.fsencode(self.root) + b"/" + FOLDER
        os.makedirs(self.folder)
        self.ctl("share", "add", SHARE, self.root)
        self.ctl("folder", "add", self.folder, "--document", b"--exclude=*.\x1b1m")

    def fill(self):
        for name in NAMES:
            with open(self.folder + b"/" + name, "wb"):
                pass

    def show(self, *arguments, code=0, err_too=False):
        """What is seen on a terminal; each line of it is harmless."""
        command = [program("fileindexctl"), *arguments]
        shown = Terminal(command, 120, err_too=err_too, NO_COLOR="1")
        self.assertEqual(shown.code, code, shown.out)
        for line in shown.out.split("\n"):
            self.assertTrue(line.replace("\t", "").isprintable(), ascii(line))
        return shown.out

    def piped(self, *arguments, code=0):
        result = self.try_ctl(*arguments)
        self.assertEqual(result.code, code, result)
        return result.out

    def test_lists_of_shares_and_folders(self):
        self.assertIn("sh\\u202e\\u2066are", self.show("share", "list"))
        self.assertIn("fo\\x1b[2J\\x9blder", self.show("folder", "list"))

        share, root = os.fsencode(SHARE), os.fsencode(self.root)
        self.assertEqual(self.piped("share", "list"), share + b"\t" + root + b"\n")
        self.assertEqual(self.piped("folder", "list"), share + b"\t" + self.folder
                         + b"\tdocument\texclude *.\x1b1m\n")

    def test_dump_and_verify(self):
        self.stop(self.start_and_drain())
        self.fill()
        paths = sorted(self.folder + b"/" + name for name in NAMES)
        missing = b"".join(b"missing\t" + path + b"\n" for path in paths)

        self.assertEqual(len(self.show("verify", SHARE, code=1).splitlines()), len(NAMES))
        self.assertEqual(self.piped("verify", SHARE, code=1), missing)

        self.ctl("reindex", self.folder)
        self.start_and_drain()
        shown = self.show("dump", SHARE)
        for digits in ("\\x07", "\\x0a", "\\xc2\\x9b31m", "\\u202egpj", "\\u2068", "\\xff\\xfe"):
            self.assertIn(digits, shown)
        self.assertEqual(self.piped("dump", SHARE),
                         b"".join(path + b"\n" for path in [self.folder, *paths]))
        self.assertEqual(self.piped("dump", SHARE, "-0"),
                         b"".join(path + b"\0" for path in [self.folder, *paths]))

    def start_and_drain(self):
        pid = self.start()
        self.await_drained(SHARE)
        return pid

    def test_what_is_told_of_one_path_and_of_all(self):
        self.fill()
        self.start_and_drain()

        for name in NAMES:
            with self.subTest(name=name):
                self.show("info", self.folder + b"/" + name)
                self.show("info", self.folder + b"/" + name, "--query", "x\u202ey OR \u009bz")
        self.show("status")
        self.show("failed")
        self.show("search", "bytes")
        for options in ((), ("--by", "folder"), ("--largest", "9")):
            self.show("stats", *options)

    def test_errors(self):
        for arguments in (("dump", "\u202ename\u009b"), ("reindex", b"/\xff\xe2\x80\xae\n"),
                          ("failed", b"\xff\x1b[2J")):
            with self.subTest(arguments=arguments):
                self.assertIn("\\x", self.show(*arguments, code=1, err_too=True))
        self.assertEqual(self.try_ctl("dump", "\u202ename").err,
                         "fileindexctl: \u202ename: no such share\n".encode())

    def test_json_on_a_terminal_means_the_same(self):
        self.fill()
        self.start_and_drain()

        for arguments in (("share", "list"), ("folder", "list"), ("dump", SHARE),
                          ("info", self.folder), ("search", "name:*e*")):
            with self.subTest(arguments=arguments):
                shown = [json.loads(line) for line in self.show(*arguments, "--json").splitlines()]
                piped = self.ctl(*arguments, "--json").objects()
                self.assertEqual(shown, piped)
        paths = {full_path(one) for one in self.ctl("dump", SHARE, "--json").objects()}
        self.assertEqual(paths, {self.folder, *(self.folder + b"/" + name for name in NAMES)})


if __name__ == "__main__":
    main()
