# SPDX-License-Identifier: GPL-2.0-or-later
"""Lines that wait for a daemon that does not run: none of them swallows what is asked for later."""

import os
import shutil

from harness import IndexTest, main, namespace

DELETE = 0x80


class WaitingTest(IndexTest):
    def prepare(self, *files, folders=("",)):
        self.root = self.make_share(files=files, folders=folders, flags=("--all",))
        pid = self.start(debug=False)
        self.await_drained("alpha")
        self.stop(pid)

    def at(self, name):
        return f"{self.root}/{name}"

    def assert_mended(self):
        self.start(debug=False)
        self.await_drained("alpha")
        verified = self.ctl("verify", "alpha")
        self.assertEqual((verified.out, verified.err), (b"", b""))

    def test_a_reindex_behind_other_flags(self):
        self.prepare("f/x.txt", folders=("f",))
        os.unlink(self.at("f/x.txt"))
        self.ctl("folder", "set", self.at("f"), "--audio=off")
        self.ctl("reindex", self.at("f"))
        self.assert_mended()

    def test_other_excludes_behind_other_flags(self):
        self.prepare("f/x.txt", "f/y.mp3", folders=("f",))
        self.ctl("folder", "set", self.at("f"), "--audio=off")
        self.ctl("folder", "set", self.at("f"), "--document=off", "--exclude", "*.o")
        self.assert_mended()

    def test_a_folder_that_is_removed_and_added_again(self):
        self.prepare("f/x.txt", "g/y.txt", folders=("f", "g"))
        self.ctl("folder", "remove", self.at("f"))
        os.unlink(self.at("f/x.txt"))
        self.ctl("folder", "add", self.at("f"), "--photo")
        self.assert_mended()

    def test_an_index_that_is_lost_while_an_update_of_the_root_waits(self):
        self.prepare("g/x.txt", "y.txt", folders=("", "g"))
        self.ctl("folder", "set", self.root, "--audio=off")
        shutil.rmtree(f"{namespace.STATE}/shares/alpha/index")
        self.assert_mended()

    def test_a_repair_behind_a_delete_of_what_came_back(self):
        self.prepare("x.txt", "d/y.txt")
        for name in ("x.txt", "d", "gone.txt"):
            self.ctl("event", "alpha", str(DELETE), self.at(name))
        self.assertEqual(self.ctl("verify", "alpha", "--repair").out, b"")
        self.assert_mended()


if __name__ == "__main__":
    main()
