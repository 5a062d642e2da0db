# SPDX-License-Identifier: GPL-2.0-or-later
"""The system log as the programs see it: /dev/log, always drained.

Searched are the lines of one program, the daemon's; printed are all.
"""

import dataclasses
import os
import re
import socket
import threading
import time

from harness.awaiting import LIMIT

LINE = re.compile(r"<(\d+)>(?:\w{3} [ \d]\d \d\d:\d\d:\d\d )?([^:\[\]]+)(?:\[\d+\])?: ?(.*)", re.S)
MARK_PRIORITY = 7
MARK_PROGRAM = "mark of the test"
PREFIX = re.compile(r"[a-z/_]+\.cpp:\d+ ")


@dataclasses.dataclass
class Line:
    priority: int  # without the facility
    program: str
    message: str  # with the source's prefix; bytes that are not UTF-8 as surrogates

    @property
    def text(self):
        """The message without the source file and line in front."""
        prefix = PREFIX.match(self.message)
        return self.message[prefix.end() :] if prefix else self.message


class SystemLog:
    def __init__(self, path="/dev/log", program="fileindexd"):
        if os.path.lexists(path):
            os.unlink(path)
        self.socket = socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM)
        self.socket.setsockopt(socket.SOL_SOCKET, socket.SO_RCVBUF, 8 << 20)
        self.socket.bind(path)
        os.chmod(path, 0o666)
        self.path = path
        self.program = program
        self.lines = []
        self.marks = 0
        self.marked = {}  # number of a mark: its position
        self.changed = threading.Condition()
        self.reading = threading.Event()
        self.reading.set()
        self.hold_behind = None  # (line that reading stops behind, how many of them until then)
        self.thread = threading.Thread(target=self._drain, daemon=True)
        self.thread.start()

    def receive(self):
        self.reading.wait()
        return self.socket.recv(1 << 20)

    def _drain(self):
        while True:
            datagram = self.receive()
            if not datagram:
                return  # the end that close() sends
            text = datagram.rstrip(b"\0\n").decode("utf-8", "surrogateescape")
            match = LINE.fullmatch(text)
            line = Line(int(match[1]) % 8, match[2], match[3]) if match else Line(-1, "?", text)
            with self.changed:
                if line.program == MARK_PROGRAM:
                    self.marked[line.message] = len(self.lines)
                else:
                    self.lines.append(line)
                    self._hold_if_behind(line)
                self.changed.notify_all()

    def _hold_if_behind(self, line):
        if self.hold_behind is None or not self._is(line, self.hold_behind[0]):
            return
        wanted, count = self.hold_behind
        self.hold_behind = (wanted, count - 1) if count > 1 else None
        if count == 1:
            self.reading.clear()

    def hold_at(self, wanted, count):
        """Reading stops at the count-th such line from now on: whoever writes more of them waits.

        The kernel takes a few lines that nobody reads, on some machines a few hundred.
        """
        with self.changed:
            self.hold_behind = (wanted, count)

    def await_held(self, limit):
        """False when those lines do not come."""
        with self.changed:
            return self.changed.wait_for(lambda: not self.reading.is_set(), limit)

    def go_on(self, wanted=None, count=0):
        """Reading goes on; with a line given, until the next hold."""
        with self.changed:
            self.hold_behind = (wanted, count) if count > 0 else None
            self.reading.set()

    def close(self):
        self.go_on()
        with socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM) as end:
            end.connect(self.path)
            end.send(b"")
        self.thread.join()
        self.socket.close()
        os.unlink(self.path)

    def mark(self):
        """A position: what is logged from now on lies behind it, all earlier lines before.

        The line of our own that is waited for comes out behind all that was sent earlier.
        """
        self.marks += 1
        number = str(self.marks)
        with socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM) as sender:
            sender.settimeout(LIMIT)
            sender.connect(self.path)
            sender.send(f"<{MARK_PRIORITY}>{MARK_PROGRAM}: {number}".encode())
        with self.changed:
            if not self.changed.wait_for(lambda: number in self.marked, LIMIT):
                raise TimeoutError("the log is not drained")
            return self.marked.pop(number)

    def _is(self, line, wanted):
        if line.program != self.program:
            return False
        if isinstance(wanted, re.Pattern):
            return wanted.fullmatch(line.text) is not None
        return line.text == wanted

    def texts(self, after=0, before=None):
        with self.changed:
            return [line.text for line in self.lines[after:before] if line.program == self.program]

    def find(self, wanted, after=0, count=1, limit=LIMIT):
        """Position behind the count-th line with that text; None when it does not come.

        `wanted`: the whole text, or a compiled pattern for the whole text.
        """
        deadline = time.monotonic() + limit
        position = after
        with self.changed:
            while True:
                for line in self.lines[position:]:
                    position += 1
                    if self._is(line, wanted):
                        count -= 1
                        if count == 0:
                            return position
                left = deadline - time.monotonic()
                if left <= 0:
                    return None
                self.changed.wait(left)

    def print(self):
        with self.changed:
            for line in self.lines:
                print(f"  log <{line.priority}> {line.program}: {ascii(line.message)}", flush=True)
