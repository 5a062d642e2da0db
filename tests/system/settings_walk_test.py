# SPDX-License-Identifier: GPL-2.0-or-later
"""Folders inside folders, each with its own settings, switched while the daemon runs."""

import os

from harness import main
from harness.filesystems import FilesystemTest, on_each

FILES = [
    f"{folder}{name}"
    for folder in ("", "outer/", "outer/inner/", "outer/inner/deep/", "beside/")
    for name in ("t.txt", "a.mp3", "v.mp4", "p.jpg", "x.unknown")
]


@on_each("ext4", "btrfs")
class SettingsWalk(FilesystemTest):
    def setUp(self):
        super().setUp()
        self.make_files(self.root, *FILES)

    def wanted(self):
        flags = self.flags().items()
        return sorted(os.path.relpath(path, self.root) for path, on in flags if on)

    def begin(self, flags=()):
        self.add_share(flags=flags)
        self.start()
        self.await_drained("alpha")

    def set(self, folder, *flags):
        self.ctl("folder", "set", os.path.join(self.root, folder), *flags)
        self.await_drained("alpha")
        self.check()

    def with_ending(self, *endings, below=""):
        return sorted(name for name in FILES if name.endswith(endings) and name.startswith(below))

    def test_one_folder_switched_on_and_off(self):
        self.begin()
        self.assertEqual(self.wanted(), [])

        for kind, ending in (("audio", "mp3"), ("video", "mp4"), ("photo", "jpg")):
            with self.subTest(kind=kind):
                self.set("", f"--{kind}=on")
                self.assertLessEqual(set(self.with_ending(ending)), set(self.wanted()))
                self.assertLessEqual(set(self.wanted()), set(self.with_ending(ending, "unknown")))

                self.set("", f"--{kind}=off")
                self.assertEqual(self.wanted(), [])

    def test_inner_folder_keeps_its_settings(self):
        self.begin()
        self.ctl("folder", "add", f"{self.root}/outer/inner", "--photo")
        self.await_drained("alpha")
        inner = "outer/inner/"

        self.set("", "--audio=on")

        wanted = self.wanted()
        for name in self.with_ending("mp3"):
            self.assertEqual(name in wanted, not name.startswith(inner), name)
        for name in self.with_ending("jpg"):
            self.assertEqual(name in wanted, name.startswith(inner), name)

        self.set("outer/inner", "--photo=off", "--video=on")

        wanted = self.wanted()
        for name in self.with_ending("mp4"):
            self.assertEqual(name in wanted, name.startswith(inner), name)
        self.assertFalse(set(self.with_ending("jpg")) & set(wanted))

    def test_folders_come_and_go_one_inside_the_other(self):
        self.begin(("--document",))

        self.ctl("folder", "add", f"{self.root}/outer", "--audio")
        self.ctl("folder", "add", f"{self.root}/outer/inner", "--photo")
        self.await_drained("alpha")
        self.check()
        self.ctl("folder", "remove", f"{self.root}/outer")
        self.await_drained("alpha")
        self.check()
        self.assertIn("outer/t.txt", self.wanted())
        self.assertIn("outer/inner/p.jpg", self.wanted())
        self.assertNotIn("outer/inner/t.txt", self.wanted())

        self.ctl("folder", "remove", f"{self.root}/outer/inner")
        self.await_drained("alpha")
        self.check()
        self.assertIn("outer/inner/t.txt", self.wanted())
        self.assertNotIn("outer/inner/p.jpg", self.wanted())

    def test_outer_folder_goes_and_the_inner_stays(self):
        self.begin()
        self.ctl("folder", "add", f"{self.root}/outer/inner")
        self.await_drained("alpha")

        self.ctl("folder", "remove", self.root)

        self.await_drained("alpha")
        self.check(folders=[f"{self.root}/outer/inner"])


if __name__ == "__main__":
    main()
