# SPDX-License-Identifier: GPL-2.0-or-later
"""Lines that wait for the daemon, or for the queue, while their paths change again."""

import fcntl
import os
import shutil
import signal
import time

from harness import main, namespace
from harness.awaiting import LIMIT, await_in_folder
from harness.watched_disks import WatchedDiskTest
from harness.watching import ask_notifier

with open("/proc/sys/fs/fanotify/max_queued_events", encoding="ascii") as limit:
    MORE_THAN_KEPT = int(limit.read()) + 600


class Stopped:
    """A process that does nothing in the block."""

    def __init__(self, pid):
        self.pid = pid

    def __enter__(self):
        os.kill(self.pid, signal.SIGSTOP)

    def __exit__(self, *ignored):
        os.kill(self.pid, signal.SIGCONT)


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

        with Stopped(self.daemon_pid()):
            os.rename(self.at("q"), self.at("p"))
            self.await_written()
            os.chmod(self.at("p"), 0o700)
            self.await_written()

        self.assert_converged(self.root)

    def test_deletes_that_an_earlier_service_queued_and_that_came_back_with_their_folder(self):
        self.begin_with("d/a.txt", "z.txt")

        with Stopped(self.daemon_pid()):
            os.unlink(self.at("z.txt"))
            with Stopped(self.notifier.pid):
                self.make_files(self.root, "d/x.txt")
                os.unlink(self.at("d/x.txt"))
            self.await_written()
            self.stop_notifier()
            self.start_notifier()
            self.await_written()
            with Stopped(self.notifier.pid):
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
            with Stopped(self.notifier.pid):
                os.mknod(f"{self.elsewhere}/0", 0o600)
                for number in range(MORE_THAN_KEPT):  # each with a name of its own
                    os.rename(f"{self.elsewhere}/{number}", f"{self.elsewhere}/{number + 1}")
                os.unlink(self.at("p.txt"))
            self.await_backlog(2)
            self.assertGreater(self.watched()["overflows"], 0)

        self.assert_converged(self.root)


del WatchedDiskTest

if __name__ == "__main__":
    main()
