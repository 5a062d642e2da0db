# SPDX-License-Identifier: GPL-2.0-or-later
"""Asking again and again while a share's queue is worked off."""

import contextlib
import os
import time

from harness.awaiting import LIMIT
from harness.checks import IndexTest
from harness.machine import NUDGE_SECONDS


class SamplingTest(IndexTest):
    def setUp(self):
        super().setUp()
        self.queued = None  # the queue file that was appended to last

    def found(self, word, share="alpha"):
        """The paths that one answer holds."""
        answer = self.ctl("search", "-0", "--limit", "100000", "--share", share, word).out
        return [os.fsdecode(path) for path in answer.split(b"\0")[:-1]]

    def append(self, share, *lines):
        super().append(share, *lines)
        self.queued = None
        with contextlib.suppress(FileNotFoundError):  # taken already
            self.queued = os.stat(self.queue(share)).st_ino

    def has_begun(self, share="alpha"):
        """Whether a Worker has taken what was appended last."""
        try:
            return os.stat(self.queue(share)).st_ino != self.queued
        except FileNotFoundError:
            return True

    def is_drained(self, share="alpha"):
        """Whether all that was queued is executed and committed."""
        queue = self.queue(share)
        # Between two passes there is always one of them: the queue is renamed to the copy's name,
        # and a pass that wants another one makes the queue before it removes the copy.
        paths = (queue, queue + ".tmp", queue, queue + ".tmp")
        return not any(os.path.lexists(path) for path in paths)

    def sample_until_drained(self, sample, share="alpha"):
        """Calls `sample(drained)` until it was called once after the end. Returns the number."""
        deadline = time.monotonic() + LIMIT
        nudge = time.monotonic() + NUDGE_SECONDS
        count = 0
        while True:
            drained = self.is_drained(share)
            sample(drained)
            count += 1
            if drained:
                return count
            now = time.monotonic()
            self.assertLess(now, deadline, "not drained")
            if now > nudge:  # as the notification service does
                self._touch_queues()
                nudge = now + NUDGE_SECONDS

    def await_all_drained(self, share="alpha"):
        """As await_drained, for what takes long."""
        self.sample_until_drained(lambda _: time.sleep(0), share)
