# SPDX-License-Identifier: GPL-2.0-or-later
"""What whoever starts the programs leaves to them: closed streams, ignored signals, a state folder
that is none."""

import contextlib
import os
import resource
import stat
import subprocess

from harness import IndexTest, MachineTest, main, namespace
from harness.awaiting import LIMIT
from harness.machine import PID_FILE, SERVICE_PID_FILE, environment, program
from harness.watching import NOTIFIER_PID_FILE

CREATE = 0x40
NULL = "/dev/null"
STREAMS = (0, 1, 2)
INHERITED = 1100  # more than a set of descriptors that is a table of bits has room for


def without_streams(name, numbers):
    """The command that runs the program with these streams closed."""
    closing = " ".join(f"{number}>&-" for number in numbers)
    return ["/bin/sh", "-c", f'exec "$0" {closing}', program(name)]


class InheritedTest(MachineTest):
    def assert_streams_lead_nowhere(self, pid):
        for number in STREAMS:
            self.assertEqual(os.readlink(f"/proc/{pid}/fd/{number}"), NULL)

    def test_daemon_starts_with_closed_streams_and_leaves_the_null_device_alone(self):
        os.chmod(NULL, 0o666)
        for numbers in (*((number,) for number in STREAMS), STREAMS):
            with self.subTest(numbers):
                after = self.log.mark()

                subprocess.run(
                    without_streams("fileindexd", numbers),
                    env=environment(FILEINDEXD_LOG_LEVEL="debug"),
                    check=True,
                    timeout=LIMIT,
                )

                self.await_line("Search daemon launched ...", after)
                pid = self.daemon_pid()
                self.assert_streams_lead_nowhere(pid)
                self.assertEqual(stat.S_IMODE(os.stat(NULL).st_mode), 0o666)
                self.stop(pid)

    def test_daemon_serves_beyond_the_first_thousand_descriptors(self):
        limits = resource.getrlimit(resource.RLIMIT_NOFILE)
        resource.setrlimit(resource.RLIMIT_NOFILE, (limits[1], limits[1]))
        self.addCleanup(resource.setrlimit, resource.RLIMIT_NOFILE, limits)
        root = self.make_share(files=("a.txt",))
        with contextlib.ExitStack() as held:
            inherited = [held.enter_context(open(NULL, "rb")).fileno() for _ in range(INHERITED)]
            subprocess.run(
                [program("fileindexd")],
                env=environment(FILEINDEXD_LOG_LEVEL="debug"),
                pass_fds=inherited,
                check=True,
                timeout=LIMIT,
            )

        self.await_line("Search daemon launched ...")
        pid = self.daemon_pid()
        self.assertGreater(self.descriptors(pid), INHERITED)
        self.assertEqual(self.command("resume"), 0)
        self.await_drained("alpha")
        self.append("alpha", {"event": CREATE, "path": f"{root}/a.txt"})
        self.await_drained("alpha")
        self.stop(pid)

    def check_service(self, name, pid_file):
        service = subprocess.Popen(without_streams(name, STREAMS), env=environment())
        self.await_file(pid_file)

        self.assert_streams_lead_nowhere(service.pid)

        service.terminate()
        self.assertEqual(service.wait(LIMIT), 0)

    def test_content_service_opens_nothing_under_the_numbers_of_closed_streams(self):
        self.check_service("talocontentsearchd", SERVICE_PID_FILE)

    def test_notification_service_opens_nothing_under_the_numbers_of_closed_streams(self):
        self.check_service("fileindex-notifyd", NOTIFIER_PID_FILE)


class IgnoredSignalTest(IndexTest):
    def launch(self, debug=True, **more):
        subprocess.run(
            ["env", "--ignore-signal=CHLD", program("fileindexd")],
            env=environment(FILEINDEXD_LOG_LEVEL="debug"),
            check=True,
            timeout=LIMIT,
        )

    def test_whole_reindex_ends_where_the_ends_of_children_are_ignored(self):
        root = self.make_share(files=("a.txt",))
        self.start()
        self.await_drained("alpha")
        os.rename(f"{namespace.STATE}/shares/alpha/index", f"{namespace.STATE}/away")
        after = self.log.mark()

        self.append("alpha", {"event": CREATE, "path": f"{root}/a.txt"})

        after = self.await_line(f"IndexDirAdd: {root}", after)
        self.await_line("Worker[alpha] finished all task, stopping", after)
        (share,) = self.ctl("status", "--json").json()["shares"]
        self.assertFalse(share["needs_reindex"])
        self.assert_index(root)


class RelativeStateTest(MachineTest):
    error = "FILEINDEXD_STATE_DIR is not an absolute path: state"

    def setUp(self):
        super().setUp()
        namespace.mount("tmpfs", "/var/lib", "tmpfs")  # where the usual state folder would be
        self.addCleanup(namespace.unmount, "/var/lib", namespace.MNT_DETACH)

    def tearDown(self):
        super().tearDown()
        self.assertEqual(os.listdir("/var/lib"), [])

    def test_daemon_tells_and_ends(self):
        self.launch(FILEINDEXD_STATE_DIR="state")

        self.await_lines([f"Failed to open the state database: {self.error}", "DoUpdate failed"])
        self.assertEqual(self.await_exit(self.detached_pid()), 0)
        self.assertFalse(os.path.lexists(PID_FILE))

    def test_services_refuse(self):
        for name in ("talocontentsearchd", "fileindex-notifyd"):
            with self.subTest(name):
                done = subprocess.run(
                    [program(name)],
                    env=environment(FILEINDEXD_STATE_DIR="state"),
                    capture_output=True,
                    check=False,
                    timeout=LIMIT,
                )
                self.assertEqual((done.returncode, done.stdout), (1, b""))
                self.assertIn(self.error, done.stderr.decode())

    def test_command_refuses(self):
        for command in ("status", "share list", "search lighthouse", "pause", "reindex /", "stats",
                        "event alpha 8 /a", "share add alpha /", "folder add /"):
            with self.subTest(command):
                result = self.ctl(*command.split(), code=1, FILEINDEXD_STATE_DIR="state")
                self.assertEqual(result.err.decode(), f"fileindexctl: {self.error}\n")
                self.assertEqual(result.out, b"")


if __name__ == "__main__":
    main()
