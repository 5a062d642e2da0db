# SPDX-License-Identifier: GPL-2.0-or-later
"""Stopping a daemon that is busy: with clients that wait, and with Workers that walk."""

import contextlib
import os
import re
import signal
import time

from harness import MachineTest, control, main, namespace

ADDED = re.compile(r"\[share\d\] Document\[.*\] added")
SHARES = 4
FILES = 400
ROUNDS = 6
SILENCE = 10  # seconds, after which a client is let go


class BusyStopTest(MachineTest):
    def test_clients_in_the_queue_do_not_put_a_stop_off(self):
        pid = self.start()
        with contextlib.ExitStack() as clients:
            began = time.monotonic()
            for _ in range(3):
                clients.enter_context(control.connect())

            os.kill(pid, signal.SIGTERM)
            stood = int(time.monotonic() - began) // SILENCE
            self.assertEqual(self.await_exit(pid), 0)

        # At most the one that was being served is waited for, and whom a busy machine let go before.
        served = [text for text in self.log.texts() if "Receive command length failed" in text]
        self.assertLessEqual(len(served), 1 + stood)

    def test_workers_among_the_path_checks_end_by_themselves(self):
        for number in range(SHARES):
            self.make_share(f"share{number}", [f"f{i}" for i in range(FILES)])
        for _ in range(ROUNDS):
            after = self.log.mark()
            pid = self.start()
            for number in range(SHARES):
                self.append(
                    f"share{number}",
                    {"event": 0x10000, "path": f"{namespace.DATA}/share{number}"},
                )
            self.await_line(ADDED, after, 3 * SHARES)

            self.stop(pid)

            self.assert_not_logged(re.compile("Failed to wait thread.*"), after)


if __name__ == "__main__":
    main()
