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

    def begin_with(self, *files):
        self.make_files(self.root, *files)
        self.begin()

    def test_a_renamed_folder_that_is_changed_before_it_was_indexed(self):
        self.begin_with("q/deep/x.txt")

        with stopped(self.daemon_pid()):
            os.rename(self.at("q"), self.at("p"))
            self.await_written()
            os.chmod(self.at("p"), 0o700)
            self.await_written()

        self.assert_converged(self.root)

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
