# SPDX-License-Identifier: GPL-2.0-or-later
"""Processes that stand still for a while."""

import contextlib
import os
import signal
import time

from harness.awaiting import LIMIT


def _thread_states(pid):
    for thread in os.listdir(f"/proc/{pid}/task"):
        with contextlib.suppress(OSError):  # a thread that has ended meanwhile
            with open(f"/proc/{pid}/task/{thread}/stat", encoding="utf-8") as file:
                yield file.read().rpartition(") ")[2]


@contextlib.contextmanager
def stopped(*pids):
    """While the block runs, with all their threads."""
    try:
        for pid in pids:
            os.kill(pid, signal.SIGSTOP)
        deadline = time.monotonic() + LIMIT
        while not all(state.startswith("T") for pid in pids for state in _thread_states(pid)):
            assert time.monotonic() < deadline, f"not stopped: {pids}"
            os.sched_yield()
        yield
    finally:
        for pid in pids:
            with contextlib.suppress(ProcessLookupError):
                os.kill(pid, signal.SIGCONT)
