# SPDX-License-Identifier: GPL-2.0-or-later
"""A file whose opening is never answered: its own share waits, and nobody else does."""

from harness import main
from search.held_files import HeldFiles
from search.library import ScriptedTest


class HungFileTest(ScriptedTest):
    def setUp(self):
        super().setUp()
        self.roots = {name: self.make_share(name, folders=()) for name in ("stuck", "free")}
        self.write(f"{self.roots['stuck']}/held.txt", "held words")
        self.held = HeldFiles(f"{self.roots['stuck']}/held.txt")
        self.addCleanup(self.held.let_all_go)
        self.daemon = self.start()
        self.service_pid()
        self.log.program = "talocontentsearchd"
        for root in self.roots.values():
            self.ctl("folder", "add", root, "--document")
        self.held.await_next()

    def write_free(self, name):
        self.write(f"{self.roots['free']}/{name}.txt", f"{name} words")
        self.ctl("reindex", self.roots["free"])

    def test_other_shares_go_on_and_the_share_is_named(self):
        self.write_free("before")
        self.await_hits("before", ["before.txt"], "free")

        self.await_line("Share[stuck] contents rest, reason=its file system does not answer")
        self.write_free("after")
        self.await_hits("after", ["after.txt"], "free")

        self.held.let_all_go()
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
