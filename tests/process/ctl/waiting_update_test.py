# SPDX-License-Identifier: GPL-2.0-or-later
"""Lines that wait for a daemon that does not run: none of them swallows what is asked for later."""

import json
import os
import shutil

from harness import IndexTest, main, namespace

MODIFY = 0x2
CREATE = 0x40
DELETE = 0x80
UPDATE = 0x20000


class WaitingTest(IndexTest):
    def prepare(self, *files, folders=("",)):
        self.root = self.make_share(files=files, folders=folders, flags=("--all",))
        self.drain()

    def drain(self):
        pid = self.start(debug=False)
        self.await_drained("alpha")
        self.stop(pid)

    def at(self, name):
        return f"{self.root}/{name}"

    def delete(self, *names):
        """Of what is there, or came back. With the one elsewhere a reindex above them is executed
        before them, and not behind."""
        for name in ("elsewhere.txt", *names):
            self.ctl("event", "alpha", str(DELETE), self.at(name))

    def assert_mended(self):
        self.drain()
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
        self.delete("x.txt", "d")
        self.assertEqual(self.ctl("verify", "alpha", "--repair").out, b"")
        self.assert_mended()

    def test_a_repair_of_a_folder_above_a_delete_of_what_came_back(self):
        self.prepare("z.txt")
        self.make_files(self.root, "d/x.txt", "d/y.txt")
        self.delete("d/x.txt")
        self.ctl("verify", "alpha", "--repair")
        self.assert_mended()

    def test_a_reindex_above_a_delete_of_what_came_back(self):
        self.prepare("d/x.txt", "d/e/y.txt", "d/z.txt")
        self.delete("d/x.txt", "d/e", "d/gone.txt")
        self.ctl("reindex", self.at("d"))
        self.assert_mended()

    def test_below_a_reindex_that_waits_above_a_delete_of_what_came_back(self):
        self.prepare(*(f"{number}/d/y.txt" for number in range(4)), folders=("", "2/d", "3/d"))
        for number, command in enumerate(
            (
                ("verify", "alpha", "--repair"),
                ("reindex", self.at("1/d")),
                ("folder", "set", self.at("2/d"), "--audio=off"),
                ("folder", "remove", self.at("3/d")),
            )
        ):
            with self.subTest(command=command):
                self.delete(f"{number}/d/e/x.txt")
                self.ctl("reindex", self.at(str(number)))
                self.make_files(self.root, f"{number}/d/e/x.txt")
                self.ctl(*command)
                self.assert_mended()

    def test_a_reindex_above_such_a_delete_behind_an_update_that_was_dropped(self):
        self.prepare("q/p/x.txt", "q/o", "e")
        for event, name in (
            (UPDATE, "q/p"),
            (MODIFY, "q/o"),
            (MODIFY, "e"),
            (DELETE, "q"),
            (CREATE, "q"),
            (DELETE, "q/p/x.txt"),
        ):
            self.ctl("event", "alpha", str(event), self.at(name))
        self.ctl("reindex", self.at("q/p"))
        self.assert_mended()

    def test_deletes_whose_paths_are_spelled_in_other_ways(self):
        self.prepare("d/x.txt", "y.txt")
        for below in ("d//x.txt", "d/"):
            for command in (("verify", "alpha", "--repair"), ("reindex", self.at("d"))):
                with self.subTest(below=below, command=command[0]):
                    self.delete(below)
                    self.ctl(*command)
                    self.assert_mended()

    def test_an_update_above_a_delete_of_what_belongs_again(self):
        self.prepare("f/build/x.txt", "f/y.txt", folders=("", "f"))
        self.ctl("folder", "set", self.at("f"), "--exclude", "build/")
        self.drain()
        self.delete("f/build", "f/gone.txt")
        self.ctl("folder", "remove", self.at("f"))
        self.assert_mended()

    def test_other_excludes_above_a_delete_of_what_came_back(self):
        self.prepare("f/x.txt", "f/y.o", folders=("f",))
        self.delete("f/x.txt", "f/y.o")
        self.ctl("folder", "set", self.at("f"), "--exclude", "*.o")
        self.assert_mended()

    def test_a_folder_that_is_added_above_a_delete_of_what_came_back(self):
        self.prepare("f/x.txt", "g/y.txt", folders=("g",))
        self.delete("f/x.txt")
        self.ctl("folder", "add", self.at("f"))
        self.assert_mended()

    def test_a_delete_whose_line_has_no_newline(self):
        self.prepare("d/x.txt", "d/y.txt")
        with open(self.queue("alpha"), "w", encoding="ascii") as queue:
            lines = [{"event": DELETE, "path": self.at(n)} for n in ("elsewhere.txt", "d/x.txt")]
            queue.write("\n".join(map(json.dumps, lines)))
        self.ctl("reindex", self.at("d"))
        self.assert_mended()


if __name__ == "__main__":
    main()
