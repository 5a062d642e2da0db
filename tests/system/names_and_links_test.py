# SPDX-License-Identifier: GPL-2.0-or-later
"""Odd names, deep paths, symbolic and hard links."""

import os

from harness import main, namespace
from harness.filesystems import (
    ATTRIB,
    CLOSE_WRITE,
    CREATE,
    DELETE,
    MODIFY,
    REINDEX,
    RENAME,
    FilesystemTest,
    on_each,
)

ANY_BYTE = [bytes([number]) for number in range(1, 256) if number not in b"/."]
LONGEST = 4000  # bytes of a path


@on_each("ext4", "btrfs", "tmpfs")
class Names(FilesystemTest):
    def begin(self):
        self.add_share()
        self.start()
        self.await_drained("alpha")

    def make(self, name):
        os.close(os.open(os.fsencode(self.root) + b"/" + name, os.O_CREAT | os.O_WRONLY))

    def test_every_byte_in_names(self):
        for byte in ANY_BYTE:
            self.make(b"x" + byte)
            self.make(byte)
        self.make(b"".join(ANY_BYTE[:127]))
        self.make(b"".join(ANY_BYTE[127:]))

        self.begin()

        self.check()

    def test_every_byte_by_events(self):
        self.begin()
        names = [b"e" + byte for byte in ANY_BYTE]
        for name in names:
            self.make(name)
            path = os.fsencode(self.root) + b"/" + name
            self.ctl("event", "alpha", str(CREATE), path)
        self.await_drained("alpha")
        self.check()

        for name in names[::2]:
            os.unlink(os.fsencode(self.root) + b"/" + name)
            self.ctl("event", "alpha", str(DELETE), os.fsencode(self.root) + b"/" + name)
        self.await_drained("alpha")
        self.check()

    def test_names_that_look_like_something_else(self):
        for name in (
            b"...",
            b"..a",
            b"-0",
            b"--json",
            b"%s%n",
            b"*",
            b"\\",
            b"'",
            b'"',
            b"\xc0\x80",
        ):
            self.make(name)
        self.make_files(self.root, "TALO@file_index_queue", "state.db", "index/x", "contents/y")

        self.begin()

        self.check()

    def test_long_paths(self):
        folder = os.fsencode(self.root)
        while len(folder) + 201 < LONGEST:
            folder += b"/" + b"d" * 200
            os.mkdir(folder)
        path = folder + b"/" + b"f" * (LONGEST - len(folder) - 1)
        self.assertEqual(len(path), LONGEST)
        os.close(os.open(path, os.O_CREAT | os.O_WRONLY))

        self.begin()

        self.check()
        self.assertIn(path, self.dump())
        os.unlink(path)
        self.event(DELETE, os.path.relpath(path, os.fsencode(self.root)))
        self.check()

    def test_deep_paths_of_short_names(self):
        path = self.root
        while len(path) < LONGEST:
            path += "/d"
            os.mkdir(path)

        self.begin()

        self.check()


@on_each("ext4", "btrfs", "tmpfs")
class Links(FilesystemTest):
    def setUp(self):
        super().setUp()
        self.make_files(self.root, "a.txt", "in/b.txt")
        self.make_files(self.disk, "outside/secret.txt")

    def begin(self):
        self.add_share()
        self.start()
        self.await_drained("alpha")

    def link(self, target, name):
        os.symlink(target, f"{self.root}/{name}")

    def test_symbolic_links_are_entries_and_never_followed(self):
        self.link("a.txt", "to-file.txt")
        self.link("in", "to-folder")
        self.link(f"{self.disk}/outside", "to-outside")
        self.link("missing", "broken")
        self.link(".", "in/loop")
        self.link("..", "up.jpg")

        self.begin()

        self.check()
        for name in ("to-folder/b.txt", "to-outside/secret.txt", "in/loop/in/b.txt"):
            self.event(CREATE, name)
            self.event(REINDEX, name)
        self.event(REINDEX, "to-outside")
        self.check()

    def test_folder_replaced_by_a_link(self):
        self.begin()
        os.rename(f"{self.root}/in", f"{self.disk}/moved")
        self.link(f"{self.disk}/moved", "in")

        self.event(CREATE, "in")

        self.check()

    def test_link_replaced_by_a_folder(self):
        self.link(f"{self.disk}/outside", "point")
        self.begin()
        os.unlink(f"{self.root}/point")
        self.make_files(self.root, "point/x.txt")

        self.event(REINDEX, "point")

        self.check()

    def test_share_reached_through_a_link(self):
        os.symlink(self.disk, f"{namespace.RUN}/way")
        self.ctl("share", "add", "alpha", f"{namespace.RUN}/way/share")
        self.ctl("folder", "add", f"{namespace.RUN}/way/share/in")
        self.start()

        self.await_drained("alpha")

        self.check(folders=[f"{self.root}/in"])

    def test_hard_links_are_refreshed_together(self):
        for name in ("one.txt", "in/two.txt", "three.mp3"):
            os.link(f"{self.root}/a.txt", f"{self.root}/{name}")
        self.begin()

        for code in (MODIFY, ATTRIB, CLOSE_WRITE):
            with open(f"{self.root}/one.txt", "a", encoding="ascii") as file:
                file.write("more")
            self.event(code, "one.txt")
            self.check()

        os.unlink(f"{self.root}/a.txt")
        self.event(DELETE, "a.txt")
        self.check()

    def test_rename_between_hard_links_and_other_files(self):
        os.link(f"{self.root}/a.txt", f"{self.root}/one.txt")
        self.begin()
        os.rename(f"{self.root}/one.txt", f"{self.root}/in/b.txt")

        self.event(RENAME, "in/b.txt", "--path-old", f"{self.root}/one.txt")

        self.check()


if __name__ == "__main__":
    main()
