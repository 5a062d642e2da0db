# SPDX-License-Identifier: GPL-2.0-or-later
"""A share that changes batch by batch, and what its index must hold when the daemon is cut off.

Acknowledged is what the daemon has committed: its commit was logged, or the drained copy is gone.
"""

import os
import random
import re
import shutil
import time

from harness.checks import IndexTest
from harness.oracle import expected_entries

CLOSE_WRITE = 0x8
CREATE = 0x40
DELETE = 0x80
RENAME = 0x100

MOST_FILES = 40  # of one new folder
MOST_FOLDERS = 30
CHANGED = re.compile(r"\[alpha\] Document\[.*\] (added|updated)")
COMMITTED = "Worker[alpha] fileindex db committed"
WORK = re.compile(r"TREE COMMAND .*|\[alpha\] (Document|Directory)\[.*", re.S)
ENDED = re.compile(
    r"Worker\[alpha\] (finished all task, stopping|stopped while processing command queue)"
)


class Tree:
    """Changes what is on the disk, and tells the events of it."""

    def __init__(self, root, choice):
        self.root = root
        self.choice = choice
        self.number = 0

    def _folders(self):
        return sorted(name for name in os.listdir(self.root) if name.startswith("d"))

    def _next(self):
        self.number += 1
        return f"{self.root}/d{self.number:05}"

    def _write(self, path):
        with open(path, "w", encoding="ascii") as file:
            file.write("x" * self.choice.randrange(5000))

    def add_folder(self):
        folder = self._next()
        os.mkdir(folder)
        yield CREATE, folder, None
        for number in range(self.choice.randrange(MOST_FILES)):
            path = f"{folder}/{number:03} {self.choice.choice('abcdef')}.txt"
            self._write(path)
            yield CREATE, path, None

    def change_files(self):
        folder = f"{self.root}/{self.choice.choice(self._folders())}"
        for name in sorted(os.listdir(folder)):
            act = self.choice.randrange(3)
            if act == 0:
                self._write(f"{folder}/{name}")
                yield CLOSE_WRITE, f"{folder}/{name}", None
            elif act == 1:
                os.unlink(f"{folder}/{name}")
                yield DELETE, f"{folder}/{name}", None

    def rename_folder(self):
        folder = f"{self.root}/{self.choice.choice(self._folders())}"
        new = self._next()
        os.rename(folder, new)
        yield RENAME, new, folder

    def remove_folder(self):
        folder = f"{self.root}/{self.choice.choice(self._folders())}"
        shutil.rmtree(folder)
        yield DELETE, folder, None

    def change(self):
        """The events of a few changes."""
        steps = [self.add_folder]
        for _ in range(self.choice.randrange(6)):
            more = [self.add_folder, self.change_files, self.rename_folder, self.remove_folder]
            steps.append(self.choice.choice(more))
        if len(self._folders()) > MOST_FOLDERS:
            steps += [self.remove_folder] * 5
        events = []
        for step in steps:
            if not self._folders():
                step = self.add_folder
            for code, path, old in step():
                event = {"event": code, "path": path}
                events.append({**event, "path_old": old} if old else event)
        return events


class LoadTest(IndexTest):
    """The share "alpha" under load. Its moments are chosen by a seed that is printed."""

    def begin(self, root):
        seed = int(os.environ.get("FILEINDEXD_TEST_SEED") or random.randrange(1 << 32))
        print(f"FILEINDEXD_TEST_SEED={seed}", flush=True)
        self.choice = random.Random(seed)
        self.root = root
        self.tree = Tree(root, self.choice)
        self.acknowledged = {}
        self.sent = 0  # position in the log

    def send_batch(self):
        """Changes the disk and queues the events."""
        events = self.tree.change()
        self.sent = self.log.mark()
        self.append("alpha", *events)
        return len(events)

    def settle(self):
        """Until a started daemon's first pass is over, and with it all that was queued."""
        self.await_line(ENDED, self.sent)
        self.await_drained("alpha")
        self.acknowledged = expected_entries(self.root)

    def work_batch(self):
        self.send_batch()
        self.await_drained("alpha")
        self.acknowledged = expected_entries(self.root)

    def await_moment(self, events):
        """Until the daemon is somewhere in the batch, at its end, or behind it."""
        kind = self.choice.randrange(4)
        pattern, count = (COMMITTED, 1) if kind == 0 else (WORK, self.choice.randint(1, events + 1))
        queue = self.queue("alpha")
        for _ in range(3000):  # a minute
            if self.log.find(pattern, self.sent, count, 0.02) is not None:
                break
            if not os.path.lexists(queue) and not os.path.lexists(queue + ".tmp"):
                break
            self.touch_queues()
        # Nothing is awaited: the moment is what the test puts in.
        time.sleep(self.choice.random() * 0.01 * self.choice.randrange(2))

    def take_acknowledged(self):
        """What is acknowledged by now. The batch's own commit is the one behind work of it."""
        self.log.mark()
        work = self.log.find(WORK, self.sent, 1, 0)
        committed = work is not None and self.log.find(COMMITTED, work, 1, 0) is not None
        queue = self.queue("alpha")
        if committed or not (os.path.lexists(queue) or os.path.lexists(queue + ".tmp")):
            self.acknowledged = expected_entries(self.root)

    def assert_acknowledged(self):
        """Each entry is as it was acknowledged, or as what was under way makes it."""
        now = expected_entries(self.root)
        held = self.entries()
        for path in self.acknowledged.keys() | now.keys() | held.keys():
            allowed = (self.acknowledged.get(path), now.get(path))
            self.assertIn(held.get(path), allowed, path)
