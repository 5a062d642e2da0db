# SPDX-License-Identifier: GPL-2.0-or-later
"""A pause holds every Worker before its next step, and outlives a restart."""

import os
import re
import time

from harness import IndexTest, control, main
from harness.awaiting import LIMIT, waits_on_condition

FILES = 1500
TURNS = 50
CREATE = 0x40
REINDEX = 0x10000
MOST_ROUNDS = 20  # whether a pause comes in the middle of a walk is up to the machine
ENDED = "Worker[alpha] finished all task, stopping"
ADDED = re.compile(r"\[alpha\] Document\[.*\] added")


class PauseTest(IndexTest):
    def make_big_share(self):
        root = self.make_share(files=[f"d{n % 30}/f{n}.txt" for n in range(FILES)])
        return root

    def pause_in_a_walk(self, pid, root):
        """The position in the log at which the daemon is paused; its Worker waits."""
        for _ in range(MOST_ROUNDS):
            self.await_drained("alpha")
            before = self.log.mark()
            self.log.hold_at(ADDED, 100)
            self.append("alpha", {"event": REINDEX, "path": root})
            self.await_held()
            with control.connect() as connection:
                connection.sendall(control.request("pause", {}))
                self.log.go_on()
                self.assertEqual(control.read_reply(connection), 0)
            if self.comes_to_wait(pid, before):
                return self.await_line("Replying socket: 0", before)
            self.ctl("resume")
        return self.fail("no pause came in the middle of a walk")

    def comes_to_wait(self, pid, before):
        """False when the Worker has come to its end instead. Nothing tells that it waits."""
        deadline = time.monotonic() + LIMIT
        while not waits_on_condition(pid):
            if ENDED in self.log.texts(before):
                return False
            self.assertLess(time.monotonic(), deadline, "the Worker neither waits nor ends")
            os.sched_yield()
        return True

    def test_nothing_is_read_while_paused(self):
        root = self.make_share()
        self.start()
        self.await_drained("alpha")
        self.make_files(root, "a.txt")
        after = self.log.mark()

        self.hold_in_pause("alpha", {"event": 0x40, "path": f"{root}/a.txt"})

        self.assertEqual(self.command("pause"), 0)
        self.assertTrue(os.path.exists(self.queue("alpha")))
        self.assert_not_logged("In cleaner", after)
        self.ctl("resume")  # twice: the Worker may have been just about to wait
        self.await_drained("alpha")
        self.assert_index(root)

    def test_pause_in_the_middle_of_a_walk(self):
        root = self.make_big_share()
        pid = self.start()

        after = self.pause_in_a_walk(pid, root)

        # The operation that was under way ends; the next one waits.
        self.assertLess(len(list(filter(ADDED.fullmatch, self.logged(after)))), 2)

        self.assertEqual(self.command("resume"), 0)
        self.await_line("In cleaner", after)
        self.await_drained("alpha")
        self.assert_index(root)

    def test_many_pauses_under_load(self):
        root = self.make_big_share()
        self.start()

        for _ in range(TURNS):
            self.assertEqual(self.command("pause"), 0)
            self.assertEqual(self.command("resume"), 0)
        self.ctl("resume")  # one that falls between a test and its wait is missed

        self.await_drained("alpha")
        self.assert_index(root)

    def test_worker_is_dropped_while_it_waits(self):
        root = self.make_share()
        self.start()
        self.await_drained("alpha")
        self.hold_in_pause("alpha", {"event": REINDEX, "path": root})
        # Ends the wait before the stop does: a stopped Worker in a pause waits out 50 s.
        self.ctl("resume")

        self.assertEqual(self.command("delete_share_worker", share_name="alpha"), 0)
        self.assertEqual(self.command("revive_share_worker", share_name="alpha"), 0)

        self.await_drained("alpha")
        self.assert_index(root)

    def test_sigterm_while_a_worker_waits(self):
        root = self.make_big_share()
        pid = self.start()
        self.pause_in_a_walk(pid, root)

        self.stop(pid)

        self.await_lines(["Cleaning resource", "In cleaner"])
        self.assert_not_logged(r"Failed to wait thread.*")
        self.start()
        self.await_drained("alpha")
        self.assert_index(root)

    def test_sigterm_in_a_pause_leaves_what_is_queued(self):
        roots = {share: self.make_share(share) for share in ("alpha", "beta")}
        pid = self.start()
        for share in roots:
            self.await_drained(share)  # no first pass is caught in the pause
        for share, root in roots.items():
            names = [f"{n}.txt" for n in range(20)]
            self.make_files(root, *names)
            self.hold_in_pause(share, *({"event": CREATE, "path": f"{root}/{n}"} for n in names))
        kept = {share: os.stat(self.queue(share)) for share in roots}
        after = self.log.mark()

        self.stop(pid)

        self.assert_not_logged(r"\[.*\] Document\[.*\] added", after)
        for share, before in kept.items():
            self.assertTrue(os.path.samestat(os.stat(self.queue(share)), before))
        self.start()
        for share, root in roots.items():
            self.await_drained(share)
            self.assert_index(root, share)

    def test_stored_pause_holds_from_the_start(self):
        root = self.make_share(files=("a.txt",))
        self.ctl("pause")

        self.start()

        self.assertTrue(os.path.exists(self.queue("alpha")))
        self.ctl("resume")
        self.await_drained("alpha")
        self.assert_index(root)


if __name__ == "__main__":
    main()
