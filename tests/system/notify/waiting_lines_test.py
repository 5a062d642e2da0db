# SPDX-License-Identifier: GPL-2.0-or-later
"""Lines that wait for the daemon, or for the queue, while their paths change again."""

import fcntl
import os
import shutil
import time

from harness import main, namespace
from harness.awaiting import LIMIT, await_in_folder
from harness.stopped import stopped
from harness.watched_disks import WatchedDiskTest
from harness.watching import ask_notifier, raise_more_events_than_are_kept


class WaitingLines(WatchedDiskTest):
    kind = "ext4"

    def at(self, name):
        return f"{self.root}/{name}"

    def await_written(self):
        """Until the service has written down what happened before."""
        self.assertTrue(ask_notifier(type="sync")["ok"])

    def await_backlog(self, lines):
        deadline = time.monotonic() + LIMIT
        while self.watched()["backlog"] < lines:
            self.assertLess(time.monotonic(), deadline, self.watched())
            await_in_folder(namespace.RUN, lambda: False, 0.05)  # nothing tells of it

    def begin_with(self, *files, folders=()):
        self.make_files(self.root, *files)
        self.folders = [self.at(folder) for folder in folders] or None
        self.add_share(*folders, flags=("--all",))
        self.begin()

    def begin_with_update(self, *files, folders=("f",)):
        """Of the first folder: it waits, and the daemon does not run."""
        self.begin_with(*files, folders=folders)
        self.stop(self.daemon_pid())
        self.ctl("folder", "set", self.at(folders[0]), "--audio=off")
        self.await_written()

    def assert_converges_once_started(self):
        self.start(debug=False)
        self.assert_converged(self.root, folders=self.folders)

    def go_and_come_back(self, away):
        os.rename(self.at("f"), away)
        self.await_written()
        os.unlink(f"{away}/x.txt")
        os.rename(away, self.at("f"))
        self.await_written()
        self.assert_converges_once_started()

    def await_found(self, word):
        deadline = time.monotonic() + LIMIT
        while self.ctl("search", "--count", word).out != b"1\n":
            self.assertLess(time.monotonic(), deadline)
            await_in_folder(namespace.RUN, lambda: False, 0.05)  # nothing tells of it

    def test_a_renamed_folder_that_is_changed_before_it_was_indexed(self):
        self.begin_with("q/deep/x.txt")

        with stopped(self.daemon_pid()):
            os.rename(self.at("q"), self.at("p"))
            self.await_written()
            os.chmod(self.at("p"), 0o700)
            self.await_written()

        self.assert_converged(self.root)

    def test_a_folder_that_returns_by_another_name_while_its_delete_waits(self):
        self.begin_with("d/gone.txt", "d/kept.txt", "z.txt")
        away = f"{self.elsewhere}/away"

        with stopped(self.daemon_pid()):
            os.unlink(self.at("z.txt"))
            os.rename(self.at("d"), away)
            os.unlink(f"{away}/gone.txt")
            self.await_written()
            with stopped(self.notifier.pid):
                os.rename(away, self.at("t"))
                os.rename(self.at("t"), self.at("d"))
            self.await_written()

        self.assert_converged(self.root)

    def test_a_folder_that_returns_while_an_update_of_it_has_swallowed_its_delete(self):
        self.begin_with_update("f/x.txt", "f/y.txt")
        away = f"{self.elsewhere}/f"
        os.rename(self.at("f"), away)
        self.await_written()
        os.unlink(f"{away}/x.txt")
        os.rename(self.queue("alpha"), self.queue("alpha") + ".tmp")  # as the daemon takes it
        with stopped(self.notifier.pid):
            os.rename(away, self.at("t"))
            os.rename(self.at("t"), self.at("f"))
        self.await_written()
        self.assert_converges_once_started()

    def test_deletes_that_an_earlier_service_queued_and_that_came_back_with_their_folder(self):
        self.begin_with("d/a.txt", "z.txt")

        with stopped(self.daemon_pid()):
            os.unlink(self.at("z.txt"))
            with stopped(self.notifier.pid):
                self.make_files(self.root, "d/x.txt")
                os.unlink(self.at("d/x.txt"))
            self.await_written()
            self.stop_notifier()
            self.start_notifier()
            self.await_written()
            with stopped(self.notifier.pid):
                shutil.rmtree(self.at("d"))
                self.make_files(self.root, "d/x.txt")
            self.await_written()

        self.assert_converged(self.root)

    def test_a_crowd_that_is_removed_behind_an_update_of_its_folder(self):
        self.begin_with_update(*(f"f/{n}.txt" for n in range(1500)))
        with stopped(self.notifier.pid):
            for n in range(1400):
                os.unlink(self.at(f"f/{n}.txt"))
        self.await_written()
        self.assert_converges_once_started()

    def test_a_folder_that_is_away_for_a_while_behind_an_update_of_it(self):
        self.begin_with_update("f/x.txt", "f/y.txt")
        self.go_and_come_back(f"{self.elsewhere}/f")

    def test_a_folder_that_is_elsewhere_in_the_share_behind_an_update_of_it(self):
        self.begin_with_update("f/x.txt", "f/y.txt", "g/z.txt", folders=("f", "g"))
        self.go_and_come_back(self.at("g/f"))

    def test_folders_that_change_places_behind_an_update_of_one(self):
        self.begin_with_update("f/x.txt", "f/y.txt", "g/k/k.txt", folders=("f", "g"))
        for step in (
            lambda: os.rename(self.at("f"), self.at("g/a")),
            lambda: os.unlink(self.at("g/a/x.txt")),
            lambda: os.rename(self.at("g/k"), self.at("f")),
        ):
            step()
            self.await_written()
        with stopped(self.notifier.pid):
            os.rename(self.at("f"), self.at("g/z"))
            os.rename(self.at("g/a"), self.at("f"))
        self.await_written()
        self.assert_converges_once_started()

    def test_a_folder_within_another_that_comes_back_behind_an_update_of_that(self):
        self.begin_with("f/g/x.txt", "f/y.txt", folders=("f", "f/g"))
        os.rename(self.at("f"), f"{self.elsewhere}/f")
        self.sync()
        self.stop(self.daemon_pid())
        self.ctl("folder", "set", self.at("f"), "--audio=off")
        self.await_written()
        os.rename(f"{self.elsewhere}/f", self.at("f"))
        self.await_written()
        self.assert_converges_once_started()

    def test_a_text_that_is_written_and_then_set_back_to_its_old_time(self):
        self.begin_with("x.txt")
        path = self.at("x.txt")
        with open(path, "w", encoding="ascii") as file:
            file.write("aardvark")
        self.await_found("aardvark")
        self.sync()
        before = os.stat(path)
        with stopped(self.daemon_pid()):
            with open(path, "r+", encoding="ascii") as file:
                file.write("buffalos")
            self.await_written()
            os.utime(path, ns=(before.st_atime_ns, before.st_mtime_ns))
            self.await_written()
        self.await_found("buffalos")

    def test_the_target_of_a_rename_that_waits_is_removed_and_the_event_is_lost(self):
        self.begin_with("p.txt", "q.txt", "stays.txt")

        with open(self.queue("alpha"), "ab") as queue:
            fcntl.flock(queue, fcntl.LOCK_EX)
            os.rename(self.at("q.txt"), self.at("p.txt"))
            self.await_backlog(1)
            with stopped(self.notifier.pid):
                raise_more_events_than_are_kept(self.elsewhere)
                os.unlink(self.at("p.txt"))
            self.await_backlog(2)
            self.assertGreater(self.watched()["overflows"], 0)

        self.assert_converged(self.root)


del WatchedDiskTest

if __name__ == "__main__":
    main()
