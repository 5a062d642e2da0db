# SPDX-License-Identifier: GPL-2.0-or-later
"""A kernel without Landlock and namespaces: formats that need files at run time are left out."""

import ctypes
import os
import shutil
import unittest

from harness import main
from search.library import ContentsTest

RTF = r"{\rtf1\ansi harbour words}"
LEFT_OUT = "not read on this host: "


LANDLOCK_CREATE_RULESET, LANDLOCK_CREATE_RULESET_VERSION = 444, 1


def has_landlock():
    version = ctypes.c_uint32(LANDLOCK_CREATE_RULESET_VERSION)
    return ctypes.CDLL(None).syscall(LANDLOCK_CREATE_RULESET, None, ctypes.c_size_t(0), version) > 0


class LeftOutTest(ContentsTest):
    def start_with(self, helper, **counts):
        """A share with a file of a format that needs nothing, and one of a format that does."""
        own = os.path.abspath(os.path.join(os.environ["FILEINDEXD_BIN_DIR"], helper))
        shutil.copy(own, self.use_own_programs())
        root = self.make_share(folders=())
        self.write(f"{root}/plain.txt", "lighthouse words")
        self.write(f"{root}/rich.rtf", RTF)
        self.start()
        self.service_pid()
        self.log.program = "talocontentsearchd"
        self.ctl("folder", "add", root, "--document")
        self.await_counts(waiting=0, **counts)
        self.assertEqual(self.hits("lighthouse"), ["plain.txt"])

    def left_out(self):
        """As `status` shows it, to people and to programs."""
        shown = [line for line in self.ctl("status").out.decode().splitlines() if LEFT_OUT in line]
        return shown, self.ctl("status", "--json").json()["contents_left_out"]

    def test_status_names_what_is_left_out(self):
        self.start_with("../tests-bin/extract_without_walls", done=1, failed=1)

        shown, told = self.left_out()
        self.assertIn("RTF", told)
        self.assertEqual(shown, [LEFT_OUT + told])
        self.await_line(LEFT_OUT + told)
        self.assertEqual(self.hits("harbour"), [])
        self.assertEqual(self.hits("rich"), ["rich.rtf"])  # its name is found all the same

    @unittest.skipUnless(has_landlock(), "no Landlock here")
    def test_with_landlock_nothing_is_left_out(self):
        self.start_with("fileindex-extract", done=2, failed=0)

        self.assertEqual(self.left_out(), ([], ""))
        self.assertEqual(self.hits("harbour"), ["rich.rtf"])


if __name__ == "__main__":
    main()
