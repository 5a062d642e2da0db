# SPDX-License-Identifier: GPL-2.0-or-later
"""dump and verify: the whole index, and what differs from the disk."""

import json
import os
import shutil

from harness import IndexTest, main, namespace
from harness.machine import full_path


class DumpTest(IndexTest):
    def test_nothing_was_indexed_yet(self):
        self.make_share(folders=())

        self.assertEqual(self.ctl("dump", "alpha").out, b"")
        self.assertEqual(self.ctl("dump", "alpha", "--json").out, b"")

    def test_order_is_that_of_the_bytes(self):
        root = self.make_share(files=("a/z", "a-b", "a.b", "a0", "B", "é", "a/a/a"))
        self.start()
        self.await_drained("alpha")

        lines = self.ctl("dump", "alpha").out.splitlines()

        self.assertEqual(lines, sorted(lines))
        self.assertEqual(lines, self.dump())
        self.assert_index(root)

    def test_json_of_names_that_are_no_text(self):
        root = self.make_share()
        path = root.encode() + b"/\xffx\n.jpg"
        os.close(os.open(path, os.O_CREAT | os.O_WRONLY))
        self.start()
        self.await_drained("alpha")

        entries = self.ctl("dump", "alpha", "--json").objects()

        self.assertEqual([full_path(entry) for entry in entries], [root.encode(), path])
        self.assertEqual(entries[1]["path"], f"{root}/\ufffdx\n.jpg")
        self.assertEqual(entries[1]["kind"], "photo")
        self.assert_index(root)

    def test_what_is_refused(self):
        self.make_share()

        self.ctl("dump", "nope", code=1)
        self.ctl("verify", "nope", code=1)
        self.ctl("dump", "alpha", "--json", "-0", code=2)
        self.ctl("dump", code=2)
        self.ctl("verify", code=2)


class NeverIndexedTest(IndexTest):
    def setUp(self):
        super().setUp()
        self.root = self.make_share(
            files=("in/a.txt", "in/b/c.txt", "also/d.txt", "out/e.txt"), folders=()
        )

    def make_folders(self, *names):
        for name in names:
            self.ctl("folder", "add", f"{self.root}/{name}")
        os.unlink(self.queue("alpha"))  # as if its lines had been lost

    def test_without_folders_there_is_nothing_to_say(self):
        self.assertEqual(self.ctl("verify", "alpha").out, b"")
        self.assertEqual(self.ctl("verify", "alpha", "--repair").out, b"")

    def test_all_that_belongs_is_missing(self):
        self.make_folders("in", "also")

        result = self.ctl("verify", "alpha", code=1)

        names = ("also", "also/d.txt", "in", "in/a.txt", "in/b", "in/b/c.txt")
        missing = [f"missing\t{self.root}/{name}" for name in names]
        self.assertEqual(result.out.decode().splitlines(), missing)
        self.assertEqual(result.err, b"")
        self.assertFalse(os.path.exists(self.queue("alpha")))

    def test_repair_says_the_same_and_has_each_folder_indexed(self):
        self.make_folders("in", "in/b", "also", "out")
        shutil.rmtree(f"{self.root}/out")
        told = self.ctl("verify", "alpha", code=1)

        result = self.ctl("verify", "alpha", "--repair")

        self.assertEqual(len(told.out.splitlines()), 6)
        self.assertEqual(result.out, told.out)
        with open(self.queue("alpha"), encoding="utf-8") as queue:
            paths = [json.loads(line)["path"] for line in queue]
        # What is in them comes along.
        self.assertEqual(paths, [f"{self.root}/{name}" for name in ("also", "in")])
        self.start()
        self.await_drained("alpha")
        self.assertEqual(
            [os.path.relpath(path.decode(), self.root) for path in self.dump()],
            ["also", "also/d.txt", "in", "in/a.txt", "in/b", "in/b/c.txt"],
        )
        self.ctl("verify", "alpha")

    def test_root_that_is_missing_is_what_is_told(self):
        self.make_folders("in")
        os.rename(self.root, self.root + ".away")

        for arguments in ((), ("--repair",)):
            result = self.ctl("verify", "alpha", *arguments, code=1)
            self.assertEqual(result.out, b"")
            self.assertIn(b"missing", result.err)


class VerifyTest(IndexTest):
    def setUp(self):
        super().setUp()
        self.root = self.make_share(
            files=("stays.txt", "changes.txt", "goes/a.txt"), flags=("--document",)
        )
        self.pid = self.start()
        self.await_drained("alpha")
        self.assert_index(self.root)

    def differences(self):
        found = self.ctl("verify", "alpha", "--json", code=1).objects()
        return {
            os.path.relpath(full_path(item).decode(), self.root): item["difference"]
            for item in found
        }

    def test_every_difference(self):
        self.make_files(self.root, "new/b.txt")
        with open(f"{self.root}/changes.txt", "a", encoding="ascii") as file:
            file.write("more")
        shutil.rmtree(f"{self.root}/goes")

        self.assertEqual(
            self.differences(),
            {
                "new": "missing",
                "new/b.txt": "missing",
                "changes.txt": "stale",
                "goes": "left-over",
                "goes/a.txt": "left-over",
            },
        )
        plain = self.ctl("verify", "alpha", code=1).out.splitlines()
        self.assertEqual(len(plain), 5)
        self.assertIn(b"missing", plain[[b"/new/" in line for line in plain].index(True)])

    def test_wanted_content_that_differs(self):
        self.assertEqual(self.command("pause"), 0)

        self.ctl("folder", "set", self.root, "--document=off")

        self.assertEqual(set(self.differences().values()), {"content"})
        self.ctl("resume")
        self.await_drained("alpha")
        self.assert_index(self.root)

    def test_works_with_the_daemon_stopped(self):
        self.stop(self.pid)
        self.make_files(self.root, "new.txt")

        self.assertEqual(self.differences(), {"new.txt": "missing"})

    def test_missing_root_cannot_be_compared(self):
        os.rename(self.root, self.root + ".away")

        result = self.ctl("verify", "alpha", code=1)

        self.assertEqual(result.out, b"")
        self.assertIn(b"alpha", result.err)
        self.assertEqual(len(self.dump()), 5)

    def test_state_of_another_folder_is_another_world(self):
        other = f"{namespace.RUN}/other-state"

        self.assertEqual(self.ctl("share", "list", "--json", FILEINDEXD_STATE_DIR=other).json(), [])


if __name__ == "__main__":
    main()
