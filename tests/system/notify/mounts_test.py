# SPDX-License-Identifier: GPL-2.0-or-later
"""Mounts come and go, at shares, above them and inside them; shares lie on several file systems."""

import os
import shutil
import signal
import time

from harness import main, namespace
from harness.awaiting import LIMIT
from harness.filesystems import run, unmount
from harness.watched_disks import WatchedDiskTest


class Mounts(WatchedDiskTest):
    kind = "ext4"

    def setUp(self):
        super().setUp()
        self.make_files(self.root, "a.txt", "d/in/x.txt", "point/")

    def test_mounted_and_unmounted_inside_a_share(self):
        self.begin()

        namespace.mount("tmpfs", f"{self.root}/d", "tmpfs")
        self.make_files(self.root, "d/hidden.txt")
        self.assert_converged(self.root)
        self.assertNotIn(f"{self.root}/d/in".encode(), self.dump())

        unmount(f"{self.root}/d")
        self.assert_converged(self.root)
        self.assertIn(f"{self.root}/d/in/x.txt".encode(), self.dump())

    def test_unmounted_share_keeps_its_index_and_is_compared_when_it_is_back(self):
        self.begin()
        before = self.dump()

        self.unmount_disk()
        self.sync()
        self.assertIsNone(self.watched()["watched_by"])
        self.assertEqual(self.dump(), before)

        self.mount_disk()
        self.make_files(self.root, "while_away.txt")
        self.assert_converged(self.root)
        self.assertEqual(self.watched()["watched_by"], "fanotify")
        self.make_files(self.root, "after.txt")
        self.assert_converged(self.root)

    def test_device_is_free_once_it_is_unmounted(self):
        self.begin()
        self.unmount_disk()
        self.sync()  # by then it has followed the mount table

        run("mkfs.ext4", "-q", "-F", self.image)
        run("mount", "-o", "loop", self.image, self.disk)

    def test_share_that_appears_after_the_daemon_started(self):
        self.add_share()
        self.unmount_disk()
        self.start(debug=False)
        self.start_notifier()
        self.assertIsNone(self.watched()["watched_by"])

        self.mount_disk()

        self.assert_converged(self.root)
        self.assertEqual(len(self.dump()), 6)

    def test_root_moved_away_and_back(self):
        self.begin()
        os.rename(self.root, f"{self.disk}/away")
        self.sync()
        self.assertIsNone(self.watched()["watched_by"])
        self.make_files(f"{self.disk}/away", "d/meanwhile.txt")
        os.rename(f"{self.disk}/away", self.root)
        self.assert_converged(self.root)

    def test_root_moved_away_and_back_before_anybody_looked(self):
        self.begin()
        self.notifier.send_signal(signal.SIGSTOP)
        os.rename(self.root, f"{self.disk}/away")
        self.make_files(f"{self.disk}/away", "d/meanwhile.txt")
        os.rename(f"{self.disk}/away", self.root)
        self.notifier.send_signal(signal.SIGCONT)
        self.assert_converged(self.root)

    def test_state_folder_shown_by_another_path_is_no_endless_story(self):
        self.begin()
        shown = f"{namespace.DATA}/shown"
        os.mkdir(shown)
        namespace.mount(namespace.DISK, shown, flags=namespace.MS_BIND)
        self.ctl("share", "add", "shown", shown)
        self.ctl("folder", "add", shown)
        self.sync("shown")
        before = self.watched("shown")["lines"]
        for _ in range(3):
            self.make_files(self.root, "a.txt")
            self.sync("alpha", "shown")
        self.assertEqual(self.watched("shown")["lines"], before)

    def test_queue_that_is_a_link_is_not_followed(self):
        self.begin()
        for target in ("nowhere", f"{self.disk}/victim"):
            self.make_files(self.disk, "victim")
            os.symlink(target, self.queue("alpha"))
            self.make_files(self.root, "new.txt")
            self.await_problem("cannot open")
            with open(f"{self.disk}/victim", encoding="ascii") as file:
                self.assertEqual(file.read(), "victim")
            os.unlink(self.queue("alpha"))
            self.assert_converged(self.root)
            os.unlink(f"{self.root}/new.txt")
            self.assert_converged(self.root)

    def await_problem(self, text):
        deadline = time.monotonic() + LIMIT
        while text not in self.watched()["problem"]:
            self.assertIsNone(self.notifier.poll())
            self.assertLess(time.monotonic(), deadline)

    def test_moves_between_shares_and_file_systems(self):
        self.begin()
        other = self.make_share("beta", files=("x/",))  # on another file system
        near = f"{self.disk}/near"
        os.mkdir(near)
        self.ctl("share", "add", "near", near)
        self.ctl("folder", "add", near)
        self.assert_converged(other, "beta")
        self.assert_converged(near, "near")

        os.rename(f"{self.root}/d", f"{near}/d")
        os.rename(f"{self.root}/a.txt", f"{near}/d/a.txt")
        shutil.move(f"{near}/d", f"{other}/x/d")
        shutil.copytree(f"{other}/x", f"{self.root}/back")

        self.assert_converged(self.root)
        self.assert_converged(near, "near")
        self.assert_converged(other, "beta")

    def test_event_queue_overflown(self):
        self.begin()
        self.notifier.send_signal(signal.SIGSTOP)
        for number in range(20_000):
            name = f"{self.root}/many/{number // 500}/{number}"
            if number % 500 == 0:
                os.makedirs(os.path.dirname(name))
            os.close(os.open(name, os.O_CREAT | os.O_WRONLY))
        self.notifier.send_signal(signal.SIGCONT)

        self.assert_converged(self.root)
        self.assertGreater(self.watched()["overflows"], 0)


class ForcedInotify(WatchedDiskTest):
    watch_by = "inotify"
    expected = "inotify"
    kind = "ext4"

    def test_tree_that_moves_about(self):
        self.make_files(self.root, "a/b/c/d.txt", "x/y.txt")
        self.begin()
        os.rename(f"{self.root}/a/b", f"{self.root}/x/b")
        self.make_files(self.root, "x/b/c/new.txt", "n/e/s/t/e/d.txt")
        self.assert_converged(self.root)
        os.rename(f"{self.root}/x", f"{self.elsewhere}/x")
        self.make_files(self.elsewhere, "x/b/unseen.txt")
        self.assert_converged(self.root)
        os.rename(f"{self.elsewhere}/x", f"{self.root}/n/x")
        self.make_files(self.root, "n/x/b/c/seen.txt")
        self.assert_converged(self.root)

    def test_event_queue_overflown(self):
        self.begin()
        self.notifier.send_signal(signal.SIGSTOP)
        self.make_files(self.root, *(f"m/{n // 100}/{n}" for n in range(20_000)))
        for n in range(0, 20_000, 3):
            os.unlink(f"{self.root}/m/{n // 100}/{n}")
        self.notifier.send_signal(signal.SIGCONT)
        self.assert_converged(self.root)


class ForcedComparison(WatchedDiskTest):
    watch_by = "comparison"
    expected = "comparison"

    def test_found_at_the_next_interval(self):
        self.make_files(self.root, "a.txt", "d/b.txt")
        self.add_share()
        self.start(debug=False)
        self.start_notifier("--interval", "1s")
        self.sync()

        self.make_files(self.root, "later.txt")
        os.unlink(f"{self.root}/a.txt")

        self.await_entry(f"{self.root}/later.txt")
        self.assert_converged(self.root)

    def await_entry(self, path):
        """Without asking the service, which would compare at once."""
        deadline = time.monotonic() + LIMIT
        while os.fsencode(path) not in self.dump():
            self.assertLess(time.monotonic(), deadline)
            self.await_taken("alpha")


del WatchedDiskTest

if __name__ == "__main__":
    main()
