# SPDX-License-Identifier: GPL-2.0-or-later
"""Every event code, as the notification service queues it after the change on disk."""

import json
import os
import shutil

from harness import main
from harness.filesystems import (
    ATTRIB,
    CLOSE_WRITE,
    CREATE,
    DELETE,
    MODIFY,
    QUEUE_RESET,
    REINDEX,
    RENAME,
    RENAME_FULL,
    UPDATE,
    FilesystemTest,
    on_each,
)


@on_each("ext4", "btrfs", "tmpfs")
class Events(FilesystemTest):
    def setUp(self):
        super().setUp()
        self.make_files(self.root, "a.txt", "in/b.txt", "in/deep/c.txt", "out/d.mp3")
        self.add_share()
        self.start()
        self.await_drained("alpha")

    def test_create_and_close_write(self):
        for code in (CREATE, CLOSE_WRITE):
            name = f"new{code}.txt"
            self.make_files(self.root, name, f"folder{code}/")

            self.event(code, name)
            self.event(code, f"folder{code}")

            self.check()

    def test_changes_of_a_file(self):
        for code in (MODIFY, ATTRIB, CLOSE_WRITE, CREATE, REINDEX, UPDATE):
            with self.subTest(code=hex(code)):
                with open(f"{self.root}/in/b.txt", "a", encoding="ascii") as file:
                    file.write("more")

                self.event(code, "in/b.txt")

                self.check()

    def test_delete_of_a_file_and_of_a_tree(self):
        os.unlink(f"{self.root}/a.txt")
        self.event(DELETE, "a.txt")
        self.check()

        shutil.rmtree(f"{self.root}/in")
        self.event(DELETE, "in")
        self.check()

    def test_delete_of_what_is_there_or_never_was(self):
        self.event(DELETE, "never/was")
        self.check()

        self.event(DELETE, "in")
        self.event(CREATE, "in")
        self.check()

    def test_events_about_what_is_gone(self):
        shutil.rmtree(f"{self.root}/in")
        self.event(DELETE, "in")

        for code in (CREATE, CLOSE_WRITE, MODIFY, ATTRIB, REINDEX, UPDATE, QUEUE_RESET):
            self.event(code, "in/b.txt")
            self.event(code, "in")

        self.check()

    def test_file_becomes_folder_and_back(self):
        os.unlink(f"{self.root}/a.txt")
        self.make_files(self.root, "a.txt/inside.txt")
        self.event(DELETE, "a.txt")
        self.event(REINDEX, "a.txt")
        self.check()

        shutil.rmtree(f"{self.root}/a.txt")
        self.make_files(self.root, "a.txt")
        self.event(CLOSE_WRITE, "a.txt")
        self.check()

    def test_folder_replaced_by_another(self):
        self.make_files(self.root, "spare/other.txt")
        self.event(REINDEX, "spare")
        shutil.rmtree(f"{self.root}/in")
        os.rename(f"{self.root}/spare", f"{self.root}/in")

        self.event(MODIFY, "in")
        self.event(DELETE, "spare")

        self.check()

    def test_rename_of_a_file(self):
        os.rename(f"{self.root}/a.txt", f"{self.root}/in/z.mp3")

        self.event(RENAME, "in/z.mp3", "--path-old", f"{self.root}/a.txt")

        self.check()

    def test_rename_of_a_tree(self):
        os.rename(f"{self.root}/in", f"{self.root}/out/moved")

        self.event(RENAME, "out/moved", "--path-old", f"{self.root}/in")

        self.check()

    def test_rename_over_what_was_there(self):
        os.rename(f"{self.root}/a.txt", f"{self.root}/in/b.txt")

        self.event(RENAME, "in/b.txt", "--path-old", f"{self.root}/a.txt")

        self.check()

    def test_two_folders_change_places(self):
        for old, new in (("in", "x"), ("out", "in"), ("x", "out")):
            os.rename(f"{self.root}/{old}", f"{self.root}/{new}")

        self.event(RENAME, "out", "--path-old", f"{self.root}/in")
        self.event(RENAME, "in", "--path-old", f"{self.root}/out")

        self.check()

    def test_full_rename(self):
        shutil.rmtree(f"{self.root}/out")
        self.make_files(self.root, "unseen/e.txt")

        self.event(RENAME_FULL, "anything")

        self.check()

    def test_update_switches_flags(self):
        self.ctl("folder", "set", self.root, "--document=on")
        self.await_drained("alpha")

        self.event(UPDATE, "", "--data", json.dumps({"document": True, "audio": True}))

        wanted = [os.path.relpath(path, self.root) for path, on in self.flags().items() if on]
        self.assertEqual(wanted, ["a.txt", "in/b.txt", "in/deep/c.txt"])
        self.check()

    def test_all_codes_at_once(self):
        shutil.rmtree(f"{self.root}/out")
        os.rename(f"{self.root}/a.txt", f"{self.root}/in/a2.txt")
        self.make_files(self.root, "new/e.txt", "f.txt")
        everything = (
            MODIFY, ATTRIB, CLOSE_WRITE, CREATE, DELETE, RENAME, QUEUE_RESET, REINDEX, UPDATE,
        )  # fmt: skip
        lines = [
            {"event": code, "path": f"{self.root}/{name}", "path_old": f"{self.root}/a.txt"}
            for code in everything
            for name in ("out", "out/d.mp3", "in/a2.txt", "new/e.txt", "f.txt", "in")
        ]

        self.append("alpha", *lines, {"event": REINDEX, "path": f"{self.root}/new"})
        self.await_drained("alpha")
        self.event(DELETE, "out")
        self.event(CLOSE_WRITE, "f.txt")

        self.check()


if __name__ == "__main__":
    main()
