# SPDX-License-Identifier: GPL-2.0-or-later
"""A system log that nobody reads: whoever writes a line waits, and nothing is lost by it."""

import os
import re
import signal
import socket
import time

from harness import IndexTest, control, main
from harness.scale import IS_LONG
from harness.system_log import SystemLog

FILES = 600
CREATE = 0x40
REINDEX = 0x10000
UNREAD_SECONDS = 60
SO_SNDBUFFORCE = 32  # which Python has no name for
ADDED = re.compile(r"\[alpha\] Document\[.*\] added")


class HeldLog(SystemLog):
    """A log that nobody can write a line to."""

    def fill(self):
        """While it is held."""
        with socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM) as sender:
            sender.connect(self.path)
            # One buffer for each writer, and one queue for all: the queue is the smaller.
            sender.setsockopt(socket.SOL_SOCKET, SO_SNDBUFFORCE, 64 << 20)
            sender.setblocking(False)
            try:
                while True:
                    sender.send(b"<7>filler: of the test")
            except BlockingIOError:
                pass


class UnreadLogTest(IndexTest):
    def setUp(self):
        super().setUp()
        self.log.close()
        self.log = HeldLog()
        self.addCleanup(self.log.go_on)
        self.root = self.make_share(files=[f"d{n % 30}/f{n}.txt" for n in range(FILES)])
        self.pid = self.start()
        self.await_drained("alpha")

    def tearDown(self):
        self.log.go_on()
        super().tearDown()

    def hold_in_a_walk(self):
        """Nobody reads the log any more, and a walk has not come to its end."""
        self.log.hold_at(ADDED, 50)
        self.append("alpha", {"event": REINDEX, "path": self.root})
        self.await_held()
        self.log.fill()
        self.assertTrue(os.path.exists(self.queue("alpha") + ".tmp"), "the pass was over")
        self.make_files(self.root, "late.txt")
        self.append("alpha", {"event": CREATE, "path": f"{self.root}/late.txt"})

    def let_time_pass(self):
        if IS_LONG:
            time.sleep(UNREAD_SECONDS)  # what is asked is how it is after this time

    def test_all_that_waited_is_done_once_it_is_read(self):
        self.hold_in_a_walk()
        with control.connect() as connection:
            connection.sendall(control.request("resume", {}))
            self.let_time_pass()
            self.assertTrue(os.path.exists(self.queue("alpha") + ".tmp"))

            self.log.go_on()

            self.assertEqual(control.read_reply(connection), 0)
        self.await_drained("alpha")
        self.assert_index(self.root)

    def test_a_stop_ends_within_its_waits_once_it_is_read(self):
        self.hold_in_a_walk()
        os.kill(self.pid, signal.SIGTERM)
        self.let_time_pass()
        self.log.go_on()

        self.assertEqual(self.await_exit(self.pid), 0)

        self.assert_not_logged("Failed to wait thread.*")
        self.start()
        self.await_drained("alpha")
        self.assert_index(self.root)

    def test_a_kill_in_it_loses_nothing(self):
        self.hold_in_a_walk()

        self.kill(self.pid)

        self.log.go_on()
        self.start()
        self.await_drained("alpha")
        self.assert_index(self.root)


if __name__ == "__main__":
    main()
