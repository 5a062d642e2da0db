# SPDX-License-Identifier: GPL-2.0-or-later
"""The notification service beside the daemon: nobody queues anything by hand."""

import contextlib
import json
import os
import signal
import socket
import subprocess

from harness import namespace
from harness.awaiting import LIMIT
from harness.checks import IndexTest
from harness.machine import PID_FILE, environment, program

NOTIFIER_PID_FILE = "/run/fileindex-notifyd.pid"
NOTIFIER_SOCKET = "/run/fileindex-notifyd.sock"


def ask_notifier(**request):
    """The service's reply to one request."""
    with socket.socket(socket.AF_UNIX, socket.SOCK_STREAM) as connection:
        connection.settimeout(LIMIT)
        connection.connect(NOTIFIER_SOCKET)
        connection.sendall(json.dumps(request).encode() + b"\n")
        received = b""
        while part := connection.recv(65536):
            received += part
    return json.loads(received)


def raise_more_events_than_are_kept(folder):
    """For a service that watches by fanotify and is stopped: the last are lost."""
    with open("/proc/sys/fs/fanotify/max_queued_events", encoding="ascii") as kept:
        number = int(kept.read()) + 600
    # Each event has a name of its own, or they would become one.
    os.mknod(f"{folder}/0", 0o600)
    for i in range(number):
        os.rename(f"{folder}/{i}", f"{folder}/{i + 1}")


class WatchedTest(IndexTest):
    """Programs change files, the service tells the daemon, and the index follows."""

    watch_by = None  # "fanotify", "inotify", "comparison": the best way that is tried

    def setUp(self):
        super().setUp()
        self.notifier = None
        self.notifier_log = f"{namespace.RUN}/notifier.log"

    def tearDown(self):
        if self.notifier is not None:
            self.notifier.kill()
            self.notifier.wait()
            self.notifier = None
        super().tearDown()

    def run(self, result=None):
        result = result if result is not None else self.defaultTestResult()
        before = len(result.failures) + len(result.errors)
        super().run(result)
        if len(result.failures) + len(result.errors) > before:
            with contextlib.suppress(OSError, AttributeError):
                with open(self.notifier_log, encoding="utf-8", errors="replace") as file:
                    print(f"notifier of {self.id()}:\n{file.read()}", flush=True)
        return result

    def launch_notifier(self, *options, **more):
        """Starts the service's program, which may refuse."""
        if self.watch_by and "--watch-by" not in options:
            options += ("--watch-by", self.watch_by)
        with open(self.notifier_log, "ab") as log:
            return subprocess.Popen(
                [program("fileindex-notifyd"), *options],
                env=environment(FILEINDEXD_LOG_LEVEL="debug", **more),
                stdin=subprocess.DEVNULL,
                stdout=log,
                stderr=log,
            )

    def start_notifier(self, *options, **more):
        """Until it watches and can be asked."""
        with contextlib.suppress(FileNotFoundError):
            os.unlink(NOTIFIER_PID_FILE)
        self.notifier = self.launch_notifier(*options, **more)
        self.await_file(NOTIFIER_PID_FILE)
        self.await_file(NOTIFIER_SOCKET)

    def stop_notifier(self, number=signal.SIGTERM):
        self.notifier.send_signal(number)
        code = self.notifier.wait(LIMIT)
        self.notifier = None
        self.assertEqual(code, 0 if number == signal.SIGTERM else -number)

    def kill_notifier(self):
        self.stop_notifier(signal.SIGKILL)

    def notifier_text(self):
        with open(self.notifier_log, encoding="utf-8", errors="replace") as file:
            return file.read()

    def watched(self, share="alpha"):
        """What the service tells of a share."""
        reply = ask_notifier(type="status")
        self.assertTrue(reply["ok"], reply)
        return next(told for told in reply["shares"] if told["name"] == share)

    def sync(self, *shares, seconds=int(LIMIT)):
        """Until all that happened before is in the index."""
        for share in shares or ("alpha",):
            self.ctl("search", "--share", share, "--wait", "--timeout", str(seconds), "--count", "x",
                     limit=seconds + LIMIT)

    def begin(self, **more):
        """Daemon and service, both at work, and the first index done."""
        if not os.path.exists(PID_FILE):
            self.start(debug=False)
        self.start_notifier(**more)
        self.sync()

    def assert_converged(self, root, share="alpha", **more):
        """Nobody queues anything: the index has to follow by itself."""
        self.sync(share)
        self.assert_index(root, share, **more)
