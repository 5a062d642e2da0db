# SPDX-License-Identifier: GPL-2.0-or-later
"""Files whose opening or reading is held up in the kernel until the test lets it go on."""

import ctypes
import os
import select
import struct
import unittest

from harness.awaiting import LIMIT

OPENING, READING = 0x10000, 0x20000  # FAN_OPEN_PERM, FAN_ACCESS_PERM
FAN_CLASS_CONTENT, FAN_CLOEXEC = 4, 1
FAN_MARK_ADD = 1
FAN_ALLOW = 1
AT_FDCWD = -100
EVENT = struct.Struct("=IBBHQii")  # length, version, -, length of this, mask, descriptor, process
ANSWER = struct.Struct("=iI")

libc = ctypes.CDLL(None, use_errno=True)


class HeldFiles:
    def __init__(self, *paths, what=OPENING):
        self.fd = libc.fanotify_init(FAN_CLASS_CONTENT | FAN_CLOEXEC, os.O_RDONLY)
        for path in paths:
            mask = ctypes.c_uint64(what)
            if libc.fanotify_mark(self.fd, FAN_MARK_ADD, mask, AT_FDCWD, os.fsencode(path)) != 0:
                self.let_all_go()
                raise unittest.SkipTest("files cannot be held here")

    def await_next(self):
        """Descriptors of the files that somebody waits for, for `let_go`."""
        if not select.select([self.fd], [], [], LIMIT)[0]:
            raise AssertionError(f"nobody touched the files within {LIMIT} s")
        events = EVENT.iter_unpack(os.read(self.fd, 100 * EVENT.size))
        return [descriptor for _, _, _, _, _, descriptor, _ in events]

    def let_go(self, descriptor):
        os.write(self.fd, ANSWER.pack(descriptor, FAN_ALLOW))
        os.close(descriptor)

    def let_all_go(self):
        """Now and from now on."""
        if self.fd >= 0:
            os.close(self.fd)
        self.fd = -1
