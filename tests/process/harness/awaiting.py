# SPDX-License-Identifier: GPL-2.0-or-later
"""Waiting for what happens: files and processes. Nothing here sleeps."""

import ctypes
import os
import select
import struct
import time

from harness.scale import IS_LONG

LIMIT = 1200.0 if IS_LONG else 300.0  # seconds; far beyond what anything takes that works

LOOK_SECONDS = 1.0

IN_ANY = 0x00000FFE  # all changes of a folder and of what is in it, but reading
IN_CHANGE = 0x00000FC2  # the same without opening and closing: what a look itself does not raise
IN_CLOSE = 0x00000018
IN_CLOEXEC = 0o2000000
EVENT = struct.Struct("iIII")  # and its name behind it

FUTEX = 202  # the number of the call, on amd64
FUTEX_COMMAND = 0x7F
FUTEX_WAIT_BITSET = 9  # of a condition; that of a mutex is another

_libc = ctypes.CDLL(None, use_errno=True)


def _deepest_folder(path):
    while not os.path.isdir(path):
        path = os.path.dirname(path)
    return path


class FolderWatch:
    """Tells when something happens in a folder. Watch first, then look, then wait."""

    def __init__(self, *folders, mask=IN_ANY):
        self.fd = _libc.inotify_init1(IN_CLOEXEC)
        for folder in folders:
            if _libc.inotify_add_watch(self.fd, os.fsencode(folder), mask) < 0:
                error = ctypes.get_errno()
                os.close(self.fd)
                raise OSError(error, os.strerror(error), folder)

    def wait(self, seconds):
        """False when nothing happened in that time."""
        ready, _, _ = select.select([self.fd], [], [], max(seconds, 0))
        if ready:
            os.read(self.fd, 65536)
        return bool(ready)

    def events(self, name):
        """What has happened to the entry of that name, in order; some event has to be there."""
        found = []
        data = os.read(self.fd, 65536)
        while data:
            _, mask, _, length = EVENT.unpack_from(data)
            if data[EVENT.size : EVENT.size + length].rstrip(b"\0") == name.encode():
                found.append(mask)
            data = data[EVENT.size + length :]
        return found

    def __enter__(self):
        return self

    def __exit__(self, *_):
        os.close(self.fd)


def await_in_folder(path, condition, limit=LIMIT, mask=IN_ANY):
    """Waits until condition() holds, looking again at each change in the folder of `path`.

    False when it does not hold within the limit.
    """
    deadline = time.monotonic() + limit
    while True:
        folder = _deepest_folder(os.path.dirname(path))
        try:
            watch = FolderWatch(folder, mask=mask)
        except FileNotFoundError:
            if time.monotonic() < deadline:
                continue  # it has gone meanwhile
            raise
        with watch:
            while folder == _deepest_folder(os.path.dirname(path)):
                if condition():
                    return True
                left = deadline - time.monotonic()
                if left <= 0:
                    return False
                # Not all that changes is told, nor is it always to be seen when it is told.
                watch.wait(min(left, LOOK_SECONDS))


def await_exit(pid, limit=LIMIT):
    """Exit status as os.waitstatus_to_exitcode gives it; None when it still runs at the limit."""
    fd = os.pidfd_open(pid)
    try:
        poll = select.poll()
        poll.register(fd, select.POLLIN)
        if not poll.poll(limit * 1000):
            return None
    finally:
        os.close(fd)
    return os.waitstatus_to_exitcode(os.waitpid(pid, 0)[1])


def await_exit_of(pid, limit=LIMIT):
    """True once a process that is nobody's child of ours has ended."""
    try:
        fd = os.pidfd_open(pid)
    except ProcessLookupError:
        return True
    try:
        return bool(select.select([fd], [], [], limit)[0])
    finally:
        os.close(fd)


def children():
    """{pid: program} of the processes whose parent is this one, those that have ended included."""
    found = {}
    for name in filter(str.isdigit, os.listdir("/proc")):
        try:
            with open(f"/proc/{name}/stat", encoding="utf-8", errors="replace") as file:
                text = file.read()
        except OSError:
            continue  # it has ended meanwhile
        if int(text.rpartition(")")[2].split()[1]) == os.getpid():
            found[int(name)] = text.partition("(")[2].rpartition(")")[0]
    return found


def waits_on_condition(pid):
    """Whether a thread of the process waits on a condition."""
    for thread in os.listdir(f"/proc/{pid}/task"):
        try:
            with open(f"/proc/{pid}/task/{thread}/syscall", encoding="ascii") as file:
                call = file.read().split()
        except OSError:
            continue  # it has ended meanwhile
        if call[0] == str(FUTEX) and int(call[2], 16) & FUTEX_COMMAND == FUTEX_WAIT_BITSET:
            return True
    return False
