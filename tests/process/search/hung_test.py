# SPDX-License-Identifier: GPL-2.0-or-later
"""A file whose opening is never answered: its own share waits, and nobody else does."""

import ctypes
import os
import unittest

from harness import main
from search.library import ScriptedTest

FAN_CLASS_CONTENT, FAN_CLOEXEC = 4, 1
FAN_MARK_ADD, FAN_OPEN_PERM = 1, 0x10000
AT_FDCWD = -100

libc = ctypes.CDLL(None, use_errno=True)


class HungFileTest(ScriptedTest):
    def hold_openings_of(self, path):
        """Whoever opens that file waits in the kernel, until the descriptor is closed."""
        held = libc.fanotify_init(FAN_CLASS_CONTENT | FAN_CLOEXEC, os.O_RDONLY)
        mask = ctypes.c_uint64(FAN_OPEN_PERM)
        if held < 0 or libc.fanotify_mark(held, FAN_MARK_ADD, mask, AT_FDCWD, path.encode()) != 0:
            raise unittest.SkipTest("openings cannot be held here")
        return held

    def setUp(self):
        super().setUp()
        self.roots = {name: self.make_share(name, folders=()) for name in ("stuck", "free")}
        self.write(f"{self.roots['stuck']}/held.txt", "held words")
        self.held = self.hold_openings_of(f"{self.roots['stuck']}/held.txt")
        self.addCleanup(lambda: self.held < 0 or os.close(self.held))
        self.daemon = self.start()
        self.service_pid()
        self.log.program = "talocontentsearchd"
        for root in self.roots.values():
            self.ctl("folder", "add", root, "--document")
        os.read(self.held, 4096)  # somebody opens it

    def write_free(self, name):
        self.write(f"{self.roots['free']}/{name}.txt", f"{name} words")
        self.ctl("reindex", self.roots["free"])

    def test_other_shares_go_on_and_the_share_is_named(self):
        self.write_free("before")
        self.await_hits("before", ["before.txt"], "free")

        self.await_line("Share[stuck] contents rest, reason=its file system does not answer")
        self.write_free("after")
        self.await_hits("after", ["after.txt"], "free")

        os.close(self.held)
        self.held = -1
        self.await_hits("held", ["held.txt"], "stuck")
        self.assertEqual(self.failed(), {})

    def test_pause_and_stop_do_not_wait(self):
        self.ctl("pause")
        self.await_line("stops reading")
        self.ctl("resume")
        self.await_line("reads", count=2)
        self.write_free("resumed")
        self.await_hits("resumed", ["resumed.txt"], "free")

        self.stop(self.daemon)


if __name__ == "__main__":
    main()
