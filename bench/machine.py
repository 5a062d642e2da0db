# SPDX-License-Identifier: GPL-2.0-or-later
"""The programs under measurement on a state folder of their own, and the rows of the table.

Where there are events to wait for, that is what is done.
"""

import ctypes
import os
import select
import shutil
import signal
import socket
import sqlite3
import subprocess
import time

TRACKER = "/usr/libexec/tracker-miner-fs-3"
LIMIT = 600.0

libc = ctypes.CDLL(None, use_errno=True)


def row(name, ours, reference, target, unit=1e3, text="ms"):
    ratio = f"{ours / reference:.3f}" if reference else ""
    shown = f"{reference * unit:.2f} {text}" if reference else ""
    print(f"{name:<52} {ours * unit:>9.2f} {text} {shown:>12} {ratio:>8} {target:>8}", flush=True)


def wait(condition, *folders):
    """Until the condition holds; looked at after each change in a folder."""
    deadline = time.monotonic() + LIMIT
    fd = libc.inotify_init1(0o2000000)
    try:
        for folder in folders:
            if libc.inotify_add_watch(fd, folder.encode(), 0xFFE) < 0:
                raise OSError(ctypes.get_errno(), "inotify_add_watch", folder)
        while not condition():
            left = max(0.0, deadline - time.monotonic())
            if not select.select([fd], [], [], left)[0]:
                raise TimeoutError(folders)
            os.read(fd, 65536)
    finally:
        os.close(fd)


def look_until(condition, between):
    """Until the condition holds, with so many seconds between two looks. For a database that is kept
    open by who writes it: its files change for the last time before the change can be seen."""
    deadline = time.monotonic() + LIMIT
    while not condition():
        if time.monotonic() > deadline:
            raise TimeoutError
        time.sleep(between)


def has_tracker(folder):
    """Whether tracker-miner-fs is installed, and would look at that folder."""
    return (
        shutil.which("dbus-run-session") is not None
        and os.path.exists(TRACKER)
        and not os.path.realpath(folder).startswith("/tmp/")
    )


class Log:
    """Somebody has to read /dev/log, or syslog() waits."""

    def __init__(self):
        self.socket = socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM)
        self.socket.bind("/dev/log")
        pid = os.fork()
        if pid == 0:
            while True:
                self.socket.recv(65536)


class Machine:
    """One share, "bench", that lies in `root`; `spare` is for what lies beside it."""

    def __init__(self, folder, programs, root=None):
        self.programs = programs
        self.state = f"{folder}/state"
        self.root = root or f"{folder}/share"
        self.spare = f"{folder}/spare"
        for path in (self.root, self.spare):
            os.makedirs(path, exist_ok=True)
        self.env = {**os.environ, "FILEINDEXD_STATE_DIR": self.state}
        self.notifier = None
        self.queries = None
        self.index = f"{self.state}/shares/bench/index"
        self.queue = f"{self.state}/shares/bench/TALO@file_index_queue"
        self.ctl("share", "add", "bench", self.root)

    def ctl(self, *arguments):
        return subprocess.run(
            [f"{self.programs}/fileindexctl", *arguments],
            env=self.env, check=True, stdout=subprocess.PIPE,
        ).stdout

    def start_daemon(self):
        subprocess.run([f"{self.programs}/fileindexd"], env=self.env, check=True)
        wait(lambda: os.path.exists("/run/fileindexd.pid"), "/run")

    def daemon_pid(self):
        with open("/run/fileindexd.pid", encoding="ascii") as file:
            return int(file.read())

    def stop_daemon(self):
        pid = self.daemon_pid()
        os.kill(pid, signal.SIGTERM)
        wait(lambda: not os.path.exists("/run/fileindexd.pid"), "/run")

    def start_notifier(self):
        self.notifier = subprocess.Popen(
            [f"{self.programs}/fileindex-notifyd", "--syslog"], env=self.env
        )
        wait(lambda: os.path.exists("/run/fileindex-notifyd.pid"), "/run")

    def stop_notifier(self):
        self.notifier.send_signal(signal.SIGTERM)
        self.notifier.wait()

    def sync(self):
        self.ctl("search", "--wait", "--timeout", "300", "--count", "x")

    def await_quiet(self):
        """The daemon has taken what was queued."""
        wait(
            lambda: not os.path.exists(self.queue) and not os.path.exists(self.queue + ".tmp"),
            os.path.dirname(self.queue),
        )

    def count(self, pattern):
        """Entries whose path matches; a fresh look, as every search is."""
        if self.queries is None:
            self.queries = sqlite3.connect(f"file:{self.index}/entries.db?mode=ro", uri=True)
        low = pattern.encode()
        return self.queries.execute(
            "SELECT count(*) FROM entries WHERE path > ? AND path < ?", (low, low + b"\xff")
        ).fetchone()[0]

    def found(self, path):
        return self.count(path[:-1]) > 0

    def await_count(self, pattern, count):
        wait(lambda: self.count(pattern) == count, self.index)
