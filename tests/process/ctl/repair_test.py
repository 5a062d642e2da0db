# SPDX-License-Identifier: GPL-2.0-or-later
"""verify --repair: whatever differs is queued, worked off, and then nothing differs."""

import json
import os
import shutil
import sqlite3
import subprocess

from harness import IndexTest, main, namespace
from harness.machine import full_path

QUEUE_LINES = 5000
MANY = 20000
MODIFY, DELETE, REINDEX, UPDATE = 0x2, 0x80, 0x10000, 0x20000
ODD_NAMES = (b"\xff\xfe", b"line\nend", b'quo"te', b"back\\slash", b"\x01\x7f", b" ", b"{}", b"a'b")


class RepairTest(IndexTest):
    def setUp(self):
        super().setUp()
        self.root = self.make_share(
            files=("a.txt", "b.jpg", "d/e/f.txt", "d/g", "d!/h", "x/y/z"), flags=("--document",)
        )
        self.pid = self.start(debug=False)
        self.await_drained("alpha")
        self.stop(self.pid)

    def path(self, name):
        return os.path.join(os.fsencode(self.root), os.fsencode(name))

    def write(self, name, text=b""):
        os.makedirs(os.path.dirname(self.path(name)), exist_ok=True)
        with open(self.path(name), "wb") as file:
            file.write(text)

    def alter(self, statement, *values):
        """Changes rows behind the writer's back."""
        database = sqlite3.connect(f"{namespace.STATE}/shares/alpha/index/entries.db")
        with database:
            database.execute(statement, values)
        database.close()

    def differences(self):
        """{name: kinds of difference}."""
        result = self.ctl("verify", "alpha", "--json", code=1)
        found = {}
        for item in result.objects():
            name = os.path.relpath(full_path(item), os.fsencode(self.root))
            found.setdefault(name, []).append(item["difference"])
        return found

    def queued(self):
        """[(event, name)] of the queue file."""
        if not os.path.exists(self.queue("alpha")):
            return []
        with open(self.queue("alpha"), "rb") as file:
            objects = [json.loads(line.decode("utf-8", "surrogateescape")) for line in file]
        root = os.fsencode(self.root)
        return [
            (item["event"], os.path.relpath(item["path"].encode("utf-8", "surrogateescape"), root))
            for item in objects
        ]

    def repair(self):
        """Queues, with the daemon stopped; returns what waits then."""
        before = self.queued()
        self.ctl("verify", "alpha", "--repair", "--json", code=0)
        lines = self.queued()
        self.assertEqual(lines[: len(before)], before)
        self.assertLessEqual(len(lines), max(QUEUE_LINES, len(before) + 1))
        return lines

    def drain(self):
        self.pid = self.start(debug=False)
        self.await_drained("alpha")
        self.stop(self.pid)

    def mend(self, **settings):
        self.assertNotEqual(self.differences(), {})
        lines = self.repair()
        self.assertNotEqual(lines, [])
        self.drain()
        self.assert_index(self.root, **settings)
        return lines

    def test_nothing_differs_and_nothing_is_queued(self):
        self.assertEqual(self.ctl("verify", "alpha", "--repair").out, b"")
        self.assertFalse(os.path.exists(self.queue("alpha")))

    def test_what_is_missing(self):
        self.write("new.txt")
        self.write("d/new")
        self.write("n/e/w/file")
        os.symlink("a.txt", self.path("link"))

        lines = self.mend()

        # A new directory is looked at as a whole.
        self.assertEqual(
            lines, [(MODIFY, b"link"), (REINDEX, b"n"), (MODIFY, b"new.txt"),
                    (MODIFY, b"d/new")]
        )

    def test_what_is_left_over(self):
        os.unlink(self.path("a.txt"))
        shutil.rmtree(self.path("d"))
        os.unlink(self.path("x/y/z"))

        lines = self.mend()

        self.assertEqual(lines, [(MODIFY, b"a.txt"), (REINDEX, b"d"), (MODIFY, b"x/y/z")])

    def test_a_file_that_comes_back_after_the_comparison_is_kept(self):
        os.unlink(self.path("a.txt"))
        self.repair()
        self.write("a.txt", b"again")

        self.drain()

        self.assert_index(self.root)

    def test_attributes_that_were_altered(self):
        for column in ("size", "mtime", "inode", "birth_time"):
            with self.subTest(column):
                self.alter(f"UPDATE entries SET {column} = {column} + 1 WHERE path = ?",
                           self.path("a.txt"))
                self.assertEqual(self.differences(), {b"a.txt": ["stale"]})
                self.assertEqual(self.mend(), [(MODIFY, b"a.txt")])

    def test_the_kind_was_altered(self):
        self.alter("UPDATE entries SET kind = 4 WHERE path = ?", self.path("a.txt"))
        self.assertEqual(self.differences(), {b"a.txt": ["stale", "content"]})
        self.assertEqual(self.mend(), [(REINDEX, b"a.txt")])

    def test_the_kind_of_thing_was_altered(self):
        for name, thing in ((b"a.txt", 2), (b"a.txt", 3), (b"d", 1), (b"d/e", 3)):
            with self.subTest(name):
                self.alter("UPDATE entries SET thing = ? WHERE path = ?", thing, self.path(name))
                self.assertIn("stale", self.differences()[name])
                self.mend()

    def test_rows_that_were_removed_and_made_up(self):
        self.alter("DELETE FROM entries WHERE path IN (?, ?)", self.path("d"), self.path("x/y/z"))
        for name in ("d/none", "a.txt/below", "x/y/z/below", "none/none/none"):
            self.alter(
                "INSERT INTO entries SELECT NULL, ?, 1, 0, 0, 5, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0",
                self.path(name),
            )

        self.mend()

    def test_content_that_is_wanted_or_not(self):
        self.alter("UPDATE entries SET content_wanted = 1 - content_wanted")
        differences = self.differences()
        self.assertEqual({kind for kinds in differences.values() for kind in kinds}, {"content"})
        self.assertIn((REINDEX, b"a.txt"), self.mend())

    def test_stale_with_content_that_differs_is_one_line(self):
        self.alter("UPDATE entries SET content_wanted = 0, size = 77 WHERE path = ?",
                   self.path("a.txt"))
        self.assertEqual(self.differences(), {b"a.txt": ["stale", "content"]})
        self.assertEqual(self.mend(), [(REINDEX, b"a.txt")])

    def test_names_of_any_bytes(self):
        for name in ODD_NAMES:
            self.write(b"odd/" + name)
            self.write(name + b"/file")
        self.mend()
        for name in ODD_NAMES[::2]:
            os.unlink(self.path(b"odd/" + name))
            shutil.rmtree(self.path(name))
        for name in ODD_NAMES[1::2]:
            self.write(b"odd/" + name, b"more")
        self.mend()

    def test_file_becomes_directory_and_directory_file(self):
        shutil.rmtree(self.path("d"))
        self.write("d", b"now a file")
        os.unlink(self.path("a.txt"))
        self.write("a.txt/deep/er", b"now below a folder")
        os.unlink(self.path("x/y/z"))
        os.symlink("../../d!", self.path("x/y/z"))

        self.mend()

    def test_left_over_below_a_directory_that_vanished_from_both(self):
        self.write("gone/deep/file")
        self.write("gone/deep/other")
        self.mend()
        shutil.rmtree(self.path("gone"))
        self.alter("DELETE FROM entries WHERE path = ? OR path = ?", self.path("gone"),
                   self.path("gone/deep"))
        self.assertEqual(set(self.differences()), {b"gone/deep/file", b"gone/deep/other"})

        self.mend()

    def test_hard_links(self):
        os.link(self.path("a.txt"), self.path("d/link.txt"))
        os.link(self.path("a.txt"), self.path("other.jpg"))
        self.mend()
        with open(self.path("other.jpg"), "ab") as file:
            file.write(b"seen through all names")
        self.assertEqual(len(self.differences()), 3)
        self.mend()
        os.unlink(self.path("a.txt"))

        self.mend()

    def test_an_inode_that_was_given_to_another(self):
        info = os.stat(self.path("a.txt"))
        other = os.stat(self.path("d/g"))
        self.alter("UPDATE entries SET inode = ? WHERE path = ?", other.st_ino, self.path("a.txt"))
        self.alter("UPDATE entries SET inode = ? WHERE path = ?", info.st_ino, self.path("d/g"))
        self.alter("UPDATE entries SET inode = ? WHERE path = ?", info.st_ino, self.path("d"))
        self.assertEqual(self.differences(), {b"a.txt": ["stale"], b"d/g": ["stale"]})

        self.mend()

    def test_folder_settings_that_changed(self):
        self.ctl("folder", "set", self.root, "--document=off", "--photo=on")
        os.unlink(self.queue("alpha"))  # what told of it is lost
        self.assertEqual(set(self.differences()), {b"a.txt", b"b.jpg", b"d/e/f.txt"})
        self.mend()

        self.ctl("folder", "add", f"{self.root}/d")
        self.ctl("folder", "remove", self.root)
        os.unlink(self.queue("alpha"))
        self.assertEqual(self.differences()[b"x"], ["left-over"])
        self.assertNotIn(b"d", self.differences())
        lines = self.mend(folders=[f"{self.root}/d"])
        # What is there and does not belong takes along all below it; nothing is walked for it.
        walked = {path for event, path in lines if event == REINDEX}
        self.assertEqual({path for path in walked if path.startswith((b".", b"x"))}, set())
        self.assertNotIn((MODIFY, b"x/y"), lines)

    def test_lines_that_wait_are_counted(self):
        waiting = [{"event": MODIFY, "path": f"{self.root}/none/{i}"} for i in range(4990)]
        self.append("alpha", *waiting)
        for i in range(50):
            self.write(f"d/new-{i}")

        lines = self.mend()

        self.assertIn((REINDEX, b"d"), lines)

    def test_lines_that_are_queued_twice_count_as_two(self):
        names = [f"n{i}/x" for i in range(8)]
        for name in names:
            self.write(name)
        waiting = [{"event": DELETE, "path": f"{self.root}/{name}"} for name in names]
        waiting += [{"event": MODIFY, "path": f"{self.root}/none/{i}"} for i in range(4982)]
        self.append("alpha", *waiting)

        self.assertLessEqual(len(self.mend()), QUEUE_LINES)

    def test_what_fits_beside_a_delete_of_what_came_back_is_queued_as_it_is(self):
        waiting = [{"event": DELETE, "path": f"{self.root}/d/g"}]
        waiting += [{"event": MODIFY, "path": f"{self.root}/none/{i}"} for i in range(4990)]
        self.append("alpha", *waiting)
        names = [b"1", b"2", b"d!/3", b"d/4", b"d/e/5", b"x/6", b"x/y/7"]
        for name in names:
            self.write(name)

        lines = self.mend()

        self.assertCountEqual(
            lines[len(waiting) :], [(MODIFY, name) for name in (*names, b"d/g")]
        )

    def test_a_reindex_that_waits_above_such_deletes_takes_in_what_is_below_it(self):
        names = ("d/1/x", "d/2/x")
        waiting = [{"event": DELETE, "path": f"{self.root}/{name}"} for name in names]
        waiting.append({"event": REINDEX, "path": f"{self.root}/d"})
        self.append("alpha", *waiting)
        for name in ("b", "d/3", *names):
            self.write(name)

        lines = self.mend()

        self.assertEqual(lines[len(waiting) :], [(MODIFY, b"b"), *[(REINDEX, b"d")] * 2])

    def test_a_full_queue_is_given_one_line(self):
        self.append("alpha", *[{"event": MODIFY, "path": f"{self.root}/none"}] * QUEUE_LINES)
        self.write("d/new")
        self.write("x/new")

        lines = self.mend()

        self.assertEqual(lines[QUEUE_LINES:], [(REINDEX, b".")])

    def test_an_update_that_waits_at_the_same_path_does_not_swallow_the_reindex(self):
        self.ctl("folder", "set", self.root, "--document=off")
        self.assertEqual(self.queued(), [(UPDATE, b".")])
        self.append("alpha", *[{"event": MODIFY, "path": f"{self.root}/n"}] * QUEUE_LINES)
        shutil.rmtree(self.path("d"))
        self.write("x/new")

        self.mend()

    def test_an_update_that_waits_does_the_work_of_what_it_swallows(self):
        for name, replace in (("a.txt", None), ("d", None), ("x", os.mkfifo)):
            with self.subTest(name=name):
                path = self.path(name)
                self.ctl("event", "alpha", "CUSTOM_EVENT_UPDATE", path,
                         "--data", '{"audio":true}')
                remove = shutil.rmtree if os.path.isdir(path) else os.unlink
                remove(path)
                if replace:
                    replace(path)

                self.mend()

    def test_repair_while_the_daemon_runs(self):
        self.pid = self.start(debug=False)
        self.write("new")
        os.unlink(self.path("a.txt"))

        self.ctl("verify", "alpha", "--repair", code=0)

        self.await_drained("alpha")
        self.assert_index(self.root)

    def test_many_files_in_many_directories(self):
        for i in range(MANY):
            self.write(f"many/{i % 40}/{i % 400}/{i}")
        self.mend()
        for i in range(MANY):
            with open(self.path(f"many/{i % 40}/{i % 400}/{i}"), "wb") as file:
                file.write(b"changed")

        lines = self.mend()

        # What is changed everywhere is looked at directory by directory, not as one share.
        self.assertNotIn((REINDEX, b"."), lines)
        self.assertIn(REINDEX, {event for event, _ in lines})

    def test_many_files_in_one_directory(self):
        for i in range(MANY):
            self.write(f"many/{i}")
        self.mend()
        for i in range(0, MANY, 2):
            os.unlink(self.path(f"many/{i}"))

        lines = self.mend()

        self.assertEqual(lines, [(REINDEX, b"many")])

    def test_many_scattered_files_that_are_gone(self):
        for i in range(MANY // 2):
            self.write(f"many/{i // 100}/{i}/file")
        self.mend()
        for i in range(MANY // 2):
            os.unlink(self.path(f"many/{i // 100}/{i}/file"))

        self.mend()


class RefusalTest(IndexTest):
    def setUp(self):
        super().setUp()
        self.root = self.make_share(files=("a.txt", "d/e/f.txt"))
        self.pid = self.start(debug=False)
        self.await_drained("alpha")
        self.held = self.dump()

    def assert_refused(self, *words):
        for more in ([], ["--repair"], ["--json"], ["--repair", "--json"]):
            result = self.ctl("verify", "alpha", *more, code=1)
            self.assertEqual(result.out, b"")
            for word in (self.root, *words):
                self.assertIn(word.encode(), result.err)
        self.assertFalse(os.path.exists(self.queue("alpha")))
        self.assertEqual(self.dump(), self.held)

    def test_root_is_missing(self):
        os.rename(self.root, self.root + ".away")
        self.assert_refused("missing")
        os.rename(self.root + ".away", self.root)
        self.assert_index(self.root)

    def test_root_is_on_another_file_system(self):
        subprocess.run(["mount", "-t", "ramfs", "none", self.root], check=True)
        self.assert_refused("another file system")
        self.make_files(self.root, "other.txt")
        self.assert_refused("another file system")
        subprocess.run(["umount", self.root], check=True)
        self.assert_index(self.root)

    def test_root_is_empty_and_was_not(self):
        shutil.rmtree(f"{self.root}/d")
        os.rename(f"{self.root}/a.txt", f"{namespace.DATA}/a.txt")
        self.assert_refused("empty")
        os.rename(f"{namespace.DATA}/a.txt", f"{self.root}/a.txt")
        self.ctl("verify", "alpha", "--repair")
        self.await_drained("alpha")
        self.assert_index(self.root)

    def test_an_empty_share_was_always_empty(self):
        root = self.make_share("empty")
        self.await_drained("empty")
        self.assert_index(root, share="empty")
        self.assertEqual(self.ctl("verify", "empty", "--repair").out, b"")


if __name__ == "__main__":
    main()
