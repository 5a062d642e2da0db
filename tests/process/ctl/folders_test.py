# SPDX-License-Identifier: GPL-2.0-or-later
"""folder add, set, remove, list: with the daemon running and stopped."""

import json
import os

from harness import IndexTest, main, namespace

KINDS = ("document", "audio", "video", "photo")


class FoldersTest(IndexTest):
    def setUp(self):
        super().setUp()
        self.root = self.make_share(
            files=("a.txt", "in/b.txt", "in/c.mp3", "out/d.txt"), folders=()
        )

    def listed(self):
        return {
            folder["path"]: [kind for kind in KINDS if folder[kind]]
            for folder in self.ctl("folder", "list", "--json").json()
        }

    def queued(self):
        with open(self.queue("alpha"), encoding="utf-8") as file:
            return [json.loads(line) for line in file]

    def test_flags(self):
        for name, flags, kinds in (
            ("a", (), []),
            ("b", ("--document",), ["document"]),
            ("c", ("--photo", "--audio"), ["audio", "photo"]),
            ("d", ("--all",), list(KINDS)),
            ("e", tuple(f"--{kind}" for kind in KINDS), list(KINDS)),
        ):
            with self.subTest(flags=flags):
                path = f"{self.root}/{name}"
                os.mkdir(path)

                self.ctl("folder", "add", path, *flags)

                self.assertEqual(self.listed()[path], kinds)

        (folder,) = [
            folder
            for folder in self.ctl("folder", "list", "--json").json()
            if folder["path"] == f"{self.root}/b"
        ]
        self.assertEqual(folder["share"], "alpha")
        plain = self.ctl("folder", "list").out
        self.assertEqual(plain.count(b"\n"), 5)
        self.assertIn(f"{self.root}/b".encode(), plain)

    def test_add_is_refused(self):
        self.ctl("folder", "add", f"{self.root}/in")
        os.symlink("in", f"{self.root}/link")
        for path in (
            f"{self.root}/in",
            f"{self.root}/missing",
            f"{self.root}/a.txt",
            namespace.DATA,
            "/",
            f"{namespace.DATA}/alpha2",
        ):
            with self.subTest(path=path):
                self.ctl("folder", "add", path, code=1)

        self.assertEqual(list(self.listed()), [f"{self.root}/in"])

    def test_add_queues_the_first_indexing_while_stopped(self):
        self.ctl("folder", "add", f"{self.root}/in")

        (line,) = self.queued()
        self.assertEqual((line["event"], line["path"]), (0x10000, f"{self.root}/in"))
        self.start()
        self.await_drained("alpha")
        self.assert_index(self.root, folders=[f"{self.root}/in"])

    def test_add_while_running(self):
        self.start()

        self.ctl("folder", "add", f"{self.root}/in")
        self.await_line("Worker[alpha] created:")
        self.await_drained("alpha")
        self.assert_index(self.root, folders=[f"{self.root}/in"])

        self.ctl("folder", "add", f"{self.root}/out")
        self.await_line("Worker[alpha] reload setting")
        self.await_drained("alpha")
        self.assert_index(self.root, folders=[f"{self.root}/in", f"{self.root}/out"])

    def test_set_changes_only_what_is_named(self):
        self.ctl("folder", "add", self.root, "--document", "--audio")

        self.ctl("folder", "set", self.root, "--audio=off", "--video=on")

        self.assertEqual(self.listed(), {self.root: ["document", "video"]})

    def test_set_changes_the_index(self):
        self.ctl("folder", "add", self.root)
        self.start()
        self.await_drained("alpha")
        self.assertFalse(any(self.flags().values()))

        self.ctl("folder", "set", self.root, "--audio=on")
        self.await_drained("alpha")
        wanted = [path for path, content in self.flags().items() if content]
        self.assertEqual(wanted, [f"{self.root}/in/c.mp3"])

        self.ctl("folder", "set", self.root, "--audio=off")
        self.await_drained("alpha")
        self.assertFalse(any(self.flags().values()))
        self.assert_index(self.root)

    def test_set_is_refused(self):
        self.ctl("folder", "add", self.root)

        self.ctl("folder", "set", f"{self.root}/in", "--audio=on", code=1)
        self.ctl("folder", "set", "/nowhere", "--audio=on", code=1)
        for flags in ((), ("--audio",), ("--audio=yes",), ("--audio=",), ("--text=on",)):
            self.ctl("folder", "set", self.root, *flags, code=2)

        self.assertEqual(self.listed(), {self.root: []})

    def test_remove_of_one_of_two(self):
        folders = [f"{self.root}/in", f"{self.root}/out"]
        for folder in folders:
            self.ctl("folder", "add", folder)
        self.start()
        self.await_drained("alpha")

        self.ctl("folder", "remove", folders[0])

        self.await_line("Worker[alpha] reload setting")
        self.await_drained("alpha")
        self.assertEqual(list(self.listed()), folders[1:])
        self.assert_index(self.root, folders=folders[1:])

    def test_remove_of_an_inner_folder_leaves_the_outer_ones_settings(self):
        self.ctl("folder", "add", self.root)
        self.ctl("folder", "add", f"{self.root}/in", "--all")
        self.start()
        self.await_drained("alpha")
        self.assertTrue(self.flags()[f"{self.root}/in/b.txt"])
        self.assertFalse(self.flags()[f"{self.root}/out/d.txt"])

        self.ctl("folder", "remove", f"{self.root}/in")

        self.await_drained("alpha")
        self.assertFalse(any(self.flags().values()))
        self.assert_index(self.root)

    def check_nothing_left(self):
        share = f"{namespace.STATE}/shares/alpha"
        self.assertEqual(self.ctl("dump", "alpha").out, b"")
        for name in ("index", "contents", "index.damaged", "contents.damaged",
                     "TALO@file_index_queue", "TALO@file_index_queue.tmp"):
            self.assertFalse(os.path.lexists(f"{share}/{name}"), name)

    def test_remove_of_the_last_while_running(self):
        self.ctl("folder", "add", self.root)
        self.start()
        self.await_drained("alpha")

        self.ctl("folder", "remove", self.root)

        self.await_line("Worker[alpha] deleted")
        self.assertEqual(self.listed(), {})
        self.check_nothing_left()

    def test_remove_of_the_last_while_stopped(self):
        self.ctl("folder", "add", self.root)
        self.stop(self.start())
        for name in ("index.damaged", "contents.damaged"):
            os.mkdir(f"{namespace.STATE}/shares/alpha/{name}")

        self.ctl("folder", "remove", self.root)

        self.assertEqual(self.listed(), {})
        self.check_nothing_left()

    def test_folder_that_is_gone_keeps_its_setting(self):
        self.ctl("folder", "add", f"{self.root}/in")
        os.rename(f"{self.root}/in", f"{self.root}/away")

        self.assertEqual(list(self.listed()), [f"{self.root}/in"])
        self.assertIn(b"gone", self.ctl("folder", "list").out)
        self.ctl("folder", "remove", f"{self.root}/in")
        self.assertEqual(self.listed(), {})

    def test_remove_is_refused(self):
        self.ctl("folder", "add", self.root)

        self.ctl("folder", "remove", f"{self.root}/in", code=1)
        self.ctl("folder", "remove", "/nowhere", code=1)

        self.assertEqual(list(self.listed()), [self.root])


if __name__ == "__main__":
    main()
