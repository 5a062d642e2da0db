# SPDX-License-Identifier: GPL-2.0-or-later
"""Programs on a terminal of a given size."""

import fcntl
import os
import pty
import re
import struct
import subprocess
import termios
import unicodedata

from harness.awaiting import LIMIT
from harness.machine import environment

COLOUR = re.compile(r"\x1b\[([0-9;]*)m")


class Terminal:
    """Runs a program to its end; `out` is what it wrote on the terminal, `err` its standard error
    where that is elsewhere."""

    def __init__(self, command, columns, err_too=False, **more):
        ours, theirs = pty.openpty()
        fcntl.ioctl(theirs, termios.TIOCSWINSZ, struct.pack("HHHH", 24, columns, 0, 0))
        attributes = termios.tcgetattr(theirs)
        attributes[1] &= ~termios.OPOST  # line ends stay as they are written
        termios.tcsetattr(theirs, termios.TCSANOW, attributes)
        more = {"TERM": "xterm", "NO_COLOR": None, "COLUMNS": None, **more}
        process = subprocess.Popen(
            command,
            env=environment(**more),
            stdin=subprocess.DEVNULL,
            stdout=theirs,
            stderr=theirs if err_too else subprocess.PIPE,
        )
        os.close(theirs)
        written = b""
        while piece := _read(ours):
            written += piece
        os.close(ours)
        self.err = b"" if err_too else process.stderr.read()
        if process.stderr is not None:
            process.stderr.close()
        self.code = process.wait(LIMIT)
        self.out = written.decode()

    def lines(self):
        return self.out.splitlines()

    def plain_lines(self):
        return [plain(line) for line in self.lines()]


def _read(terminal):
    try:
        return os.read(terminal, 65536)
    except OSError:  # the last one that had it open is gone
        return b""


def plain(line):
    return COLOUR.sub("", line)


def marked(line):
    """The texts that are shown in colour."""
    return re.findall(r"\x1b\[[1-9][0-9;]*m(.*?)\x1b\[0?m", line)


def width(line):
    """Columns on the screen."""
    return sum(
        0 if unicodedata.combining(c) or unicodedata.category(c) in ("Mn", "Me", "Cf")
        else 2 if unicodedata.east_asian_width(c) in "WF"
        else 1
        for c in plain(line)
    )
