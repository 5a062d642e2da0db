# SPDX-License-Identifier: GPL-2.0-or-later
"""One instance at a time: later starts, and starts at the same moment."""

import fcntl
import os
import shutil
import stat
import subprocess

from harness import MachineTest, control, main, namespace
from harness.awaiting import LIMIT
from harness.machine import PID_FILE, SERVICE_PID_FILE, environment, program

LOCK_FILE = "/run/fileindexd.lock"
ROUNDS = 10
NOBODY = 65534


class SecondInstanceTest(MachineTest):
    def test_second_start_leaves_the_first_alone(self):
        pid = self.start()
        socket = os.stat(control.SOCKET)
        after = self.log.mark()

        self.launch()

        self.await_line("Daemon alive. No need to start", after)
        self.assert_not_logged(r"Daemonized \.\.\.|Cleaning resource", after)
        self.assertEqual(self.daemon_pid(), pid)
        self.assertEqual(os.stat(control.SOCKET).st_ino, socket.st_ino)
        self.assertEqual(self.command("resume"), 0)

    def test_second_start_says_nothing_without_debug(self):
        self.start(debug=False)

        self.launch(debug=False)

        self.assertEqual(self.logged(), [])

    def test_second_start_by_another_user_leaves_the_first_alone(self):
        pid = self.start()
        self.await_file(SERVICE_PID_FILE)
        os.mkdir(f"{namespace.RUN}/open")
        copy = shutil.copy(program("fileindexd"), f"{namespace.RUN}/open")
        after = self.log.mark()
        try:
            second = subprocess.Popen(
                [copy],
                env=environment(FILEINDEXD_LOG_LEVEL="debug"),
                user=NOBODY,
                cwd="/",
            )
        except OSError as error:  # where only one user is mapped
            self.skipTest(f"no other user here: {error}")

        self.assertEqual(second.wait(LIMIT), 0)

        self.await_line("Daemon alive. No need to start", after)
        self.assert_not_logged(r"Daemonized \.\.\.|Cleaning resource|Failed .*", after)
        self.assertEqual(self.daemon_pid(), pid)

    def test_whoever_can_read_a_stale_pid_file_cannot_keep_the_next_start_off_with_a_lock(self):
        self.kill(self.start())
        with open(PID_FILE, encoding="ascii") as stale:
            fcntl.flock(stale, fcntl.LOCK_EX)
            after = self.log.mark()

            self.launch()

            self.assert_not_logged("Daemon alive. No need to start", after)
            self.await_line("Search daemon launched ...", after)
        self.assertEqual(self.command("resume"), 0)

    def test_the_lock_is_out_of_other_users_reach_and_outlives_the_process(self):
        self.stop(self.start())
        self.assertEqual(stat.S_IMODE(os.stat(LOCK_FILE).st_mode), 0o600)

        with open(LOCK_FILE, encoding="ascii") as lock:
            fcntl.flock(lock, fcntl.LOCK_EX | fcntl.LOCK_NB)

    def test_a_start_that_cannot_have_the_lock_ends_beside_the_first(self):
        pid = self.start()
        os.unlink(PID_FILE)
        after = self.log.mark()

        self.launch()

        self.await_line("Daemon alive. No need to start", after)
        self.assert_not_logged(r"Daemonized \.\.\.|Cleaning resource", after)
        self.stop(pid)

    def start_two(self):
        command = [program("fileindexd")]
        starts = [
            subprocess.Popen(command, env=environment(FILEINDEXD_LOG_LEVEL="debug"))
            for _ in range(2)
        ]
        self.assertEqual([start.wait(LIMIT) for start in starts], [0, 0])

    def test_of_two_simultaneous_starts_one_goes_on(self):
        for _ in range(ROUNDS):
            after = self.log.mark()

            self.start_two()

            self.await_line("Search daemon launched ...", after)
            self.await_line("Daemon alive. No need to start", after)
            texts = self.log.texts(after)
            self.assertEqual(texts.count("Daemonized ..."), 1)
            self.assertEqual(texts.count("Daemon alive. No need to start"), 1)
            self.assertEqual(self.command("resume"), 0)
            pid = self.daemon_pid()
            self.assertTrue(os.path.exists(f"/proc/{pid}"))
            self.stop(pid)
            self.assertFalse(os.path.lexists(PID_FILE))


if __name__ == "__main__":
    main()
