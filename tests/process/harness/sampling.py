# SPDX-License-Identifier: GPL-2.0-or-later
"""Asking again and again while a share's queue is worked off.

What is done within the time of one question is seen by none. So the work can be held at moments
that are chosen, as nobody reads its log, until a question that was asked meanwhile is answered.
"""

import contextlib
import os
import time

from harness.awaiting import LIMIT
from harness.batch_load import CHANGED, COMMITTED
from harness.checks import IndexTest
from harness.machine import NUDGE_SECONDS

CHANGES_OF_A_COMMIT = 2000


def moments_of(changes):
    """Before the first commit, right behind it, and half way, where that is not the same.

    Between two commits is more than the kernel takes of the log's lines when nobody reads them.
    """
    moments = [(CHANGED, CHANGES_OF_A_COMMIT // 4), (COMMITTED, 1)]
    more = changes // CHANGES_OF_A_COMMIT // 2
    return [*moments, (COMMITTED, more)] if more > 0 else moments


class SamplingTest(IndexTest):
    def setUp(self):
        super().setUp()
        self.queued = None  # the queue file that was appended to last
        self.moments = []  # that are to come
        self.is_held = False  # while a question is asked at one of them

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

    def hold_at(self, *moments):
        """The work that is queued next is held when so many more of such lines are logged."""
        self.moments = list(moments)
        self.ctl("log-level", "debug")
        self.log.hold_at(*self.moments[0])

    def _sample(self, sample, share):
        """Calls it once; work that was held before goes on to its next moment."""
        drained = self.is_drained(share)
        self.is_held = self.log.await_held(0)
        sample(drained)
        if not self.is_held:
            return drained

        self.assertFalse(self.is_drained(share), "it was not held")
        self.is_held = False
        self.moments.pop(0)
        if self.moments:
            self.log.go_on(*self.moments[0])
        else:
            self.log.go_on()
            self.ctl("log-level", "error")
        return drained

    def sample_until_drained(self, sample, share="alpha"):
        """Calls `sample(drained)` until it was called once after the end. Returns the number.

        Fails when one of the moments that were chosen did not come.
        """
        deadline = time.monotonic() + LIMIT
        nudge = time.monotonic() + NUDGE_SECONDS
        count = 0
        while True:
            drained = self._sample(sample, share)
            count += 1
            if drained:
                self.assertEqual(self.moments, [], "not asked at all moments")
                return count
            now = time.monotonic()
            self.assertLess(now, deadline, "not drained")
            if now > nudge:  # as the notification service does
                self.touch_queues()
                nudge = now + NUDGE_SECONDS

    def await_all_drained(self, share="alpha"):
        """As await_drained, for what takes long."""
        self.sample_until_drained(lambda _: time.sleep(0), share)
