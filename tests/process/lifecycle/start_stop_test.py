# SPDX-License-Identifier: GPL-2.0-or-later
"""Starting and stopping: files, log lines in their order, the content service, exit status 0."""

import ctypes
import os
import re
import shutil
import signal
import stat
import unittest.mock

from harness import MachineTest, control, main, namespace
from harness.awaiting import FolderWatch
from harness.machine import PID_FILE, SERVICE_PID_FILE, program

STARTED = [
    "Daemonized ...",
    "Signal handler set ...",
    "Update done ...",
    "Domain socket setup done ...",
    "inotify setup done ...",
    "Worker setup done ...",
    "Workers start to run ...",
    "Search daemon launched ...",
]


CLONE3 = 435

IN_MODIFY = 0x02
IN_MOVED_TO = 0x80
IN_CREATE = 0x100


class CloneArguments(ctypes.Structure):
    _fields_ = [
        (name, ctypes.c_uint64)
        for name in (
            "flags",
            "pidfd",
            "child_tid",
            "parent_tid",
            "exit_signal",
            "stack",
            "stack_size",
            "tls",
            "set_tid",
            "set_tid_size",
        )
    ]


def start_as(pid):
    """Runs a program that waits for its end under that number. False when it is not to be had."""
    numbers = (ctypes.c_int32 * 1)(pid)
    arguments = CloneArguments(
        exit_signal=signal.SIGCHLD, set_tid=ctypes.addressof(numbers), set_tid_size=1
    )
    made = ctypes.CDLL(None).syscall(
        CLONE3, ctypes.byref(arguments), ctypes.c_size_t(ctypes.sizeof(arguments))
    )
    if made == 0:
        os.execv("/bin/sleep", ["sleep", "1000"])
    return made == pid


class StartStopTest(MachineTest):
    def test_start_logs_its_steps_in_order(self):
        self.start()

        self.assertEqual([text for text in self.log.texts() if text in STARTED], STARTED)

    def test_running_daemon_has_pid_file_socket_and_service(self):
        pid = self.start()

        self.assertEqual(os.readlink(f"/proc/{pid}/cwd"), "/")
        self.assertEqual(os.path.basename(os.readlink(f"/proc/{pid}/exe")), "fileindexd")
        mode = os.stat(control.SOCKET).st_mode
        self.assertTrue(stat.S_ISSOCK(mode))
        self.assertEqual(stat.S_IMODE(mode), 0o777)
        self.assertEqual(stat.S_IMODE(os.stat(namespace.STATE).st_mode), 0o700)
        self.await_file(SERVICE_PID_FILE)

    def test_pid_file_is_there_at_once_with_the_number_of_the_detached_process(self):
        with FolderWatch(namespace.RUN, mask=IN_CREATE | IN_MODIFY | IN_MOVED_TO) as watch:
            pid = self.start()

            self.assertEqual(watch.events(os.path.basename(PID_FILE)), [IN_MOVED_TO])
        self.assertEqual(pid, self.detached_pid())
        self.assertEqual(stat.S_IMODE(os.stat(PID_FILE).st_mode), 0o644)

    def test_standard_streams_lead_nowhere(self):
        pid = self.start()

        for number in range(3):
            self.assertEqual(os.readlink(f"/proc/{pid}/fd/{number}"), "/dev/null")

    def check_stop(self, number):
        pid = self.start()
        self.await_file(SERVICE_PID_FILE)

        self.stop(pid, number)

        end = self.await_line(f"In kill handler({int(number)})")
        self.await_lines(["Daemon Leaving main loop", "Cleaning resource"], end)
        for path in (PID_FILE, control.SOCKET, SERVICE_PID_FILE):
            self.assertFalse(os.path.lexists(path), path)

    def test_sigterm_cleans_up(self):
        self.check_stop(signal.SIGTERM)

    def test_sigint_cleans_up(self):
        self.check_stop(signal.SIGINT)

    def test_second_signal_changes_nothing(self):
        pid = self.start()

        os.kill(pid, signal.SIGTERM)
        os.kill(pid, signal.SIGTERM)

        self.assertEqual(self.await_exit(pid), 0)

    def test_sigpipe_is_ignored(self):
        pid = self.start()

        os.kill(pid, signal.SIGPIPE)

        self.assertEqual(self.command("resume"), 0)

    def test_without_debug_a_run_logs_only_what_is_always_logged(self):
        pid = self.start(debug=False)

        self.stop(pid)

        self.assertEqual(
            self.logged(),
            [f"In kill handler({int(signal.SIGTERM)})", "Daemon Leaving main loop"],
        )

    def test_starts_again_after_a_stop(self):
        first = self.start()
        self.stop(first)

        second = self.start()

        self.assertNotEqual(first, second)
        self.assertEqual(self.command("resume"), 0)

    def test_missing_content_service_does_not_keep_the_daemon_from_starting(self):
        alone = f"{namespace.RUN}/alone"
        os.mkdir(alone)
        shutil.copy(program("fileindexd"), alone)

        with unittest.mock.patch.dict(os.environ, FILEINDEXD_BIN_DIR=alone):
            self.start()

        error = r"err=\[0x[0-9A-F]{4} [a-z/_]+\.cpp:\d+\]"
        after = self.await_line(re.compile("QLIBServiceStart failed: " + error))
        self.await_line("Search daemon launched ...", after)
        self.assertEqual(self.command("resume"), 0)
        self.stop(self.daemon_pid())

    def test_a_stranger_who_got_the_services_number_is_left_alone(self):
        pid = self.start()
        service = self.service_pid()
        self.kill(service)
        if not start_as(service):
            self.skipTest(f"process {service} cannot be made")

        self.stop(pid)

        self.assertEqual(os.waitpid(service, os.WNOHANG), (0, 0))
        self.kill(service)

    def test_share_with_a_folder_gets_one_worker_at_start(self):
        root = self.make_share(folders=("", "docs"), files=("docs/",))

        self.start()

        after = self.await_line("Worker[alpha] created:")
        self.assertEqual(self.log.texts().count("Worker[alpha] created:"), 1)
        lines = self.log.texts(after)[:5]
        self.assertEqual(lines[0], f"    queue path: {self.queue('alpha')}")
        self.assertEqual(lines[1], f"    db path:    {namespace.STATE}/shares/alpha/index")
        self.assertTrue(lines[2].startswith("    folder:     ") and root in lines[2], lines)
        self.assertTrue(lines[3].startswith("    folder:     ") and root in lines[3], lines)
        self.assertEqual(lines[4], "-" * 38)


if __name__ == "__main__":
    main()
