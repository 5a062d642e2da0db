# SPDX-License-Identifier: GPL-2.0-or-later
"""The wall clock is set by a day, ahead and back, while the daemon pauses, walks, stops, starts.

The clock is the daemon's alone: fileindexctl and the test keep the machine's.
"""

import os
import re
import time

from harness import IndexTest, control, main, namespace
from harness.machine import PID_FILE
from harness.preload import Page

DAY = 86400
STEPS = (DAY, 0, -DAY, 0, DAY, -DAY)
FILES = 4000
ADDED_BETWEEN_STEPS = 150
CREATE = 0x40
ADDED = re.compile(r"\[alpha\] Document\[.*\] added")
COMMITTED = "Worker[alpha] fileindex db committed"
PAUSED = "SetPaused: true"
RESUMED = "SetPaused: false"
NOT_ENDED = re.compile(r"Failed to wait thread\[alpha\].*")


class ClockTest(IndexTest):
    def setUp(self):
        super().setUp()
        self.clock = Page("clock_offset", "CLOCK_OFFSET")

    def start_at(self, offset):
        self.set_clock(offset)
        return self.start(**self.clock.environment)

    def set_clock(self, offset):
        self.clock.set_number(0, offset)

    def hold_a_line(self, root):
        """A file whose event waits in the pause that this begins."""
        self.make_files(root, "held.txt")
        self.hold_in_pause("alpha", {"event": CREATE, "path": f"{root}/held.txt"})

    def await_resumed(self, after):
        """Queues are not touched meanwhile: the resume comes when it has been quiet for 10 s."""
        self.assertIsNotNone(self.log.find(RESUMED, after), "still paused")

    def last_commit(self):
        (share,) = self.ctl("status", "--json").json()["shares"]
        return share["last_commit"]

    def assert_commit_at(self, offset, began):
        last = self.last_commit() - offset
        self.assertGreaterEqual(last, int(began))
        self.assertLessEqual(last, time.time())


class PauseClockTest(ClockTest):
    def test_a_step_ahead_ends_a_pause(self):
        root = self.make_share()
        self.start_at(0)
        self.await_drained("alpha")
        self.hold_a_line(root)
        self.ctl("pause", "--for", "1h")
        self.assertTrue(os.path.exists(self.queue("alpha")))
        after = self.log.mark()

        self.set_clock(DAY)

        self.await_resumed(after)
        self.await_drained("alpha")
        self.assert_index(root)

    def test_a_step_back_makes_a_pause_longer(self):
        root = self.make_share()
        self.start_at(0)
        self.await_drained("alpha")
        self.hold_a_line(root)
        after = self.log.mark()
        # A thread that has ended, for the housekeeping to join: so that is seen to have been there.
        self.ctl("resume")
        self.await_line("Worker[alpha] finished all task, stopping", after)
        self.set_clock(-DAY)
        after = self.log.mark()

        # An hour ago is in the future of the clock that was set back.
        self.assertEqual(self.command("pause", resume_time=int(time.time()) - 3600), 0)

        self.await_line(PAUSED, after)
        self.await_line("Worker[alpha] cancelled", after)
        self.make_files(root, "late.txt")
        self.append("alpha", {"event": CREATE, "path": f"{root}/late.txt"})
        self.await_line("Worker[alpha] respawned", after)
        self.assert_not_logged(RESUMED, after)
        self.assertTrue(os.path.exists(self.queue("alpha")))

        self.set_clock(0)

        self.await_resumed(after)
        self.await_drained("alpha")
        self.assert_index(root)


class WorkClockTest(ClockTest):
    def test_steps_while_walking_and_committing(self):
        root = self.make_share(files=[f"d{n % 30}/f{n}.txt" for n in range(FILES)])
        after = at = self.log.mark()
        began = time.time()

        self.start_at(0)
        for offset in STEPS:
            at = self.await_line(ADDED, at, ADDED_BETWEEN_STEPS)
            self.set_clock(offset)

        self.await_drained("alpha")
        self.assert_index(root)
        # The step ahead was seen in the walk: 600 s have passed since the last commit.
        walked = self.await_line(f"IndexDirAdd: {root}", after)
        self.assertIn(COMMITTED, self.log.texts(after, walked))
        self.assert_commit_at(STEPS[-1], began)

    def test_last_commit_is_the_clocks_also_when_that_went_back(self):
        root = self.make_share()
        self.start_at(0)
        self.await_drained("alpha")
        for number, offset in enumerate(STEPS):
            with self.subTest(offset=offset):
                self.set_clock(offset)
                began = time.time()
                self.make_files(root, f"f{number}")

                self.append("alpha", {"event": CREATE, "path": f"{root}/f{number}"})

                self.await_drained("alpha")
                self.assert_commit_at(offset, began)
        self.assert_index(root)

    def test_a_step_ahead_while_a_paused_worker_is_dropped_cancels_it(self):
        root = self.make_share()
        self.start_at(0)
        self.await_drained("alpha")
        self.hold_a_line(root)
        after = self.log.mark()

        # Its 50 s are those of the wall clock.
        with control.connect() as connection:
            connection.sendall(control.request("delete_share_worker", {"share_name": "alpha"}))
            self.await_line("Worker[alpha] deleted", after)
            self.set_clock(DAY)
            self.assertEqual(control.read_reply(connection), 0)

        self.await_line("In cleaner", self.await_line(NOT_ENDED, after))
        self.ctl("resume")
        self.assertEqual(self.command("revive_share_worker", share_name="alpha"), 0)
        self.await_drained("alpha")
        self.assert_index(root)


class ProcessClockTest(ClockTest):
    def test_pid_files_hold_whatever_the_clock_says(self):
        root = self.make_share(files=("a.txt",))
        for began, then in ((0, DAY), (DAY, -DAY), (-DAY, 0)):
            with self.subTest(began=began, then=then):
                pid = self.start_at(began)
                service = self.service_pid()
                self.set_clock(then)

                self.launch(**self.clock.environment)

                self.assertEqual(self.daemon_pid(), pid)
                self.await_drained("alpha")
                self.assert_index(root)
                self.stop(pid)
                self.assertFalse(os.path.exists(PID_FILE))
                self.assertEqual(self.await_exit(service), 0)


class SetAsideClockTest(ClockTest):
    def damage(self, root, name):
        """The index is no database any more, and an event finds that out. The lines of it."""
        folder = f"{namespace.STATE}/shares/alpha/index"
        for file_name in ("entries.db", "entries.db-wal"):
            with open(f"{folder}/{file_name}", "r+b") as file:
                file.write(b"no database" * 300)
        self.make_files(root, name)
        after = self.log.mark()
        self.append("alpha", {"event": CREATE, "path": f"{root}/{name}"})
        self.await_line(f"IndexDirAdd: {root}", after)
        self.await_line("Worker[alpha] finished all task, stopping", after)
        self.await_drained("alpha")
        self.assert_index(root)
        return self.log.texts(after)

    def copy(self):
        return os.stat(f"{namespace.STATE}/shares/alpha/index.damaged").st_ino

    def test_one_copy_an_hour_by_a_clock_that_is_set(self):
        root = self.make_share(files=[f"d/{i}.txt" for i in range(300)])
        self.start_at(0)
        self.await_drained("alpha")
        self.damage(root, "first.txt")
        first = self.copy()
        self.damage(root, "again.txt")
        self.assertEqual(self.copy(), first)

        # A day old.
        self.set_clock(DAY)
        self.damage(root, "ahead.txt")
        second = self.copy()
        self.assertNotEqual(second, first)

        # Of the future: nothing tells its age.
        self.set_clock(-DAY)
        self.damage(root, "back.txt")
        self.assertNotEqual(self.copy(), second)


if __name__ == "__main__":
    main()
