# SPDX-License-Identifier: GPL-2.0-or-later
"""What an earlier run, or somebody else, left where the daemon's own files go."""

import os
import signal
import socket
import subprocess

from harness import MachineTest, control, main
from harness.awaiting import LIMIT
from harness.machine import PID_FILE


def ended_process():
    process = subprocess.Popen(["true"])
    process.wait(LIMIT)
    return process.pid


class StaleFilesTest(MachineTest):
    def write_pid_file(self, text):
        with open(PID_FILE, "w", encoding="ascii") as file:
            file.write(text)

    def check_starts(self):
        pid = self.start()

        with open(PID_FILE, encoding="ascii") as file:
            self.assertEqual(file.read().strip(), str(pid))
        self.assertEqual(self.command("resume"), 0)
        self.stop(pid)

    def test_pid_file_of_an_ended_process(self):
        self.write_pid_file(f"{ended_process()}\n")

        self.check_starts()

    def test_pid_file_names_another_program(self):
        with subprocess.Popen(["cat"], stdin=subprocess.PIPE) as other:
            self.write_pid_file(f"{other.pid}\n")

            self.check_starts()

            self.assertIsNone(other.poll())

    def test_pid_file_without_a_usable_number(self):
        for text in ("", "\n", "fileindexd\n", "-1\n", "0\n", "99999999999999999999\n", "1 x\n"):
            with self.subTest(text=text):
                self.write_pid_file(text)

                self.check_starts()

    def test_files_of_a_killed_daemon(self):
        self.kill(self.start())
        self.assertTrue(os.path.lexists(PID_FILE))
        self.assertTrue(os.path.lexists(control.SOCKET))

        self.check_starts()

    def test_file_or_dead_socket_at_the_socket_path(self):
        with open(control.SOCKET, "w", encoding="ascii"):
            pass
        self.check_starts()

        with socket.socket(socket.AF_UNIX, socket.SOCK_STREAM) as dead:
            dead.bind(control.SOCKET)
        self.check_starts()

    def check_gives_up(self, lines):
        self.launch()
        pid = self.detached_pid()

        self.assertEqual(self.await_exit(pid), 0)

        self.await_lines([*lines, "Cleaning resource"])

    def test_folder_at_the_socket_path_ends_the_start(self):
        os.mkdir(control.SOCKET)

        self.check_gives_up(
            ["bind failed, reason=Address already in use", "SetupDomainSocket failed"]
        )

        self.assertFalse(os.path.lexists(PID_FILE))

    def test_folder_at_the_pid_file_ends_the_start(self):
        os.mkdir(PID_FILE)

        self.check_gives_up(["Failed to create daemon file"])

    def test_unusable_state_folder_ends_the_start(self):
        self.launch(FILEINDEXD_STATE_DIR="/proc/no/such/folder")
        pid = self.detached_pid()

        self.assertEqual(self.await_exit(pid), 0)

        self.await_lines(["DoUpdate failed", "Cleaning resource"])
        self.assertFalse(os.path.lexists(PID_FILE))

    def test_stop_of_a_service_that_was_killed(self):
        pid = self.start()
        service = self.service_pid()
        os.kill(service, signal.SIGKILL)
        self.await_exit(service)

        self.stop(pid)


if __name__ == "__main__":
    main()
