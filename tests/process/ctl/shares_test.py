# SPDX-License-Identifier: GPL-2.0-or-later
"""share add, remove, set, list."""

import os
import subprocess

from harness import IndexTest, main, namespace
from harness.awaiting import LIMIT

# Makes files until their folder is gone.
WRITER = """
import itertools, os, sys
for number in itertools.count():
    try:
        os.close(os.open(f"{sys.argv[1]}{number}", os.O_CREAT))
    except FileNotFoundError:
        break
"""


class SharesTest(IndexTest):
    def setUp(self):
        super().setUp()
        self.root = f"{namespace.DATA}/alpha"
        os.mkdir(self.root)

    def listed(self):
        shares = self.ctl("share", "list", "--json").json()
        return [(share["name"], share["path"]) for share in shares]

    def test_no_shares_at_first(self):
        self.assertEqual(self.listed(), [])
        self.assertEqual(self.ctl("share", "list").out, b"")

    def test_added_shares_are_listed(self):
        os.mkdir(f"{namespace.DATA}/beta")

        self.ctl("share", "add", "beta", f"{namespace.DATA}/beta")
        self.ctl("share", "add", "alpha", self.root)

        self.assertEqual(
            sorted(self.listed()), [("alpha", self.root), ("beta", f"{namespace.DATA}/beta")]
        )
        plain = self.ctl("share", "list").out
        self.assertIn(b"alpha", plain)
        self.assertIn(self.root.encode(), plain)
        self.assertEqual(plain.count(b"\n"), 2)

    def test_path_is_made_absolute_and_resolved(self):
        os.symlink(namespace.DATA, f"{namespace.RUN}/link")

        self.ctl("share", "add", "alpha", f"{namespace.RUN}/link//alpha/.")

        self.assertEqual(self.listed(), [("alpha", self.root)])

    def test_names_that_are_taken(self):
        for number, name in enumerate(("a", "x" * 64, "two words", "é", "-", "a.b", "#1", '"')):
            with self.subTest(name=name):
                path = f"{namespace.DATA}/s{number}"
                os.mkdir(path)

                self.ctl("share", "add", "--", name, path)

                self.assertIn((name, path), self.listed())

    def test_names_that_are_refused(self):
        for name in ("", "x" * 65, ".", "..", ".hidden", "a/b", "/", "a\nb", "a\x1fb", "a\x7fb"):
            with self.subTest(name=name):
                result = self.ctl("share", "add", "--", name, self.root, code=None)

                self.assertIn(result.code, (1, 2))
                self.assertEqual(self.listed(), [])

    def test_paths_that_are_refused(self):
        self.make_files(self.root, "file", "in/")
        os.symlink(f"{self.root}/nowhere", f"{self.root}/broken")
        self.ctl("share", "add", "alpha", self.root)

        for path in (
            f"{namespace.DATA}/missing",
            f"{self.root}/file",
            f"{self.root}/broken",
            self.root,
            f"{self.root}/in",
            namespace.DATA,
            "/",
            "/proc",
            namespace.STATE,
        ):
            with self.subTest(path=path):
                self.ctl("share", "add", "beta", path, code=1)

        self.assertEqual(self.listed(), [("alpha", self.root)])

    def test_name_twice_is_refused(self):
        os.mkdir(f"{namespace.DATA}/beta")
        self.ctl("share", "add", "alpha", self.root)

        self.ctl("share", "add", "alpha", f"{namespace.DATA}/beta", code=1)

        self.assertEqual(self.listed(), [("alpha", self.root)])

    def test_path_that_is_not_utf8(self):
        path = os.fsencode(namespace.DATA) + b"/\xff\xfe"
        os.mkdir(path)

        self.ctl("share", "add", "odd", path)

        (share,) = self.ctl("share", "list", "--json").json()
        self.assertEqual(bytes.fromhex(share["path_hex"]), path)
        self.assertEqual(share["path"], f"{namespace.DATA}/\ufffd\ufffd")

    def test_language_is_kept_under_its_name(self):
        self.ctl("share", "add", "alpha", self.root)
        for given, kept in (("de", "german"), ("French", "french"), ("none", "none")):
            self.ctl("share", "set", "alpha", "--language", given)
            (share,) = self.ctl("share", "list", "--json").json()
            self.assertEqual(share["language"], kept)

        self.ctl("share", "set", "beta", "--language", "german", code=1)

    def check_remove(self):
        self.ctl("share", "remove", "alpha")

        self.assertEqual(self.listed(), [])
        self.assertEqual(self.ctl("folder", "list", "--json").json(), [])
        self.assertFalse(os.path.lexists(f"{namespace.STATE}/shares/alpha"))
        self.assertTrue(os.path.exists(f"{self.root}/a.txt"))
        self.ctl("dump", "alpha", code=1)

    def test_remove_with_the_daemon_stopped(self):
        self.make_share(files=("a.txt",))

        self.check_remove()

    def test_remove_with_the_daemon_running(self):
        self.make_share(files=("a.txt",))
        self.start()
        self.await_drained("alpha")

        self.check_remove()

        self.await_line("Worker[alpha] deleted")

    def test_remove_while_another_program_still_writes_there(self):
        self.make_share(files=("a.txt",))
        folder = f"{namespace.STATE}/shares/alpha"
        writers = [subprocess.Popen(("python3", "-c", WRITER, f"{folder}/{name}")) for name in "ab"]
        for writer, name in zip(writers, "ab"):
            self.addCleanup(writer.kill)
            self.await_file(f"{folder}/{name}2000")

        self.check_remove()

        for writer in writers:
            self.assertEqual(writer.wait(LIMIT), 0)

    def test_remove_where_the_share_s_folder_is_a_mount_point(self):
        self.make_share(files=("a.txt",))
        folder = f"{namespace.STATE}/shares/alpha"
        namespace.mount("tmpfs", folder, "tmpfs")
        with open(f"{folder}/left", "wb"):
            pass

        self.ctl("share", "remove", "alpha")

        self.assertEqual(os.listdir(folder), [])
        self.make_share(files=("b.txt",))
        self.start()
        self.await_drained("alpha")
        self.assert_index(self.root)

    def test_removed_share_can_be_added_again(self):
        self.make_share(files=("a.txt",))
        self.start()
        self.await_drained("alpha")
        self.check_remove()

        self.make_share(files=("b.txt",))

        self.await_drained("alpha")
        self.assert_index(self.root)

    def test_what_a_removal_left_that_was_cut_short_goes_with_the_next_one(self):
        self.make_share(files=("a.txt",))
        left = f"{namespace.STATE}/shares/.other.removed"
        os.makedirs(f"{left}/index")

        self.ctl("share", "remove", "alpha")

        self.assertEqual(os.listdir(f"{namespace.STATE}/shares"), [])

    def test_remove_of_an_unknown_share(self):
        self.ctl("share", "remove", "nope", code=1)


if __name__ == "__main__":
    main()
