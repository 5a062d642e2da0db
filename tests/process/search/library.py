# SPDX-License-Identifier: GPL-2.0-or-later
"""What tests of the content service have in common: programs with a scripted helper among them."""

import os
import shutil
import sys
import unittest.mock

from harness import IndexTest, namespace
from harness.awaiting import IN_CHANGE, await_in_folder
from harness.machine import environment, program

PROGRAMS = f"{namespace.RUN}/programs"
CLOSE_WRITE = 8
HERE = os.path.dirname(os.path.abspath(__file__))

STALE_AFTER = 15.0  # seconds; what the notification service calls a stale queue


class ContentsTest(IndexTest):
    """With the real helper."""

    def contents(self, share="alpha"):
        return f"{namespace.STATE}/shares/{share}/contents/contents.db"

    def hits(self, words, share="alpha"):
        """Names of the files that a search finds."""
        found = self.ctl("search", "--json", "--limit", "1000", "--share", share, words).objects()
        return sorted(os.path.basename(hit["path"]) for hit in found)

    def status(self, share="alpha"):
        shares = self.ctl("status", "--json").json()["shares"]
        return next(one for one in shares if one["name"] == share)

    def failed(self, *arguments):
        """{name: (reason, tries)}"""
        listed = self.ctl("failed", *arguments, "--json").json()
        return {os.path.basename(one["path"]): (one["reason"], one["tries"]) for one in listed}

    def await_contents(self, condition, share="alpha"):
        """Until the condition holds; looks again when the share's contents changed.

        A queue that nobody took for long is touched once, as the notification service does.
        """
        held = await_in_folder(self.contents(share), condition, STALE_AFTER, IN_CHANGE)
        if not held:
            self.touch_queue(self.queue(share))
        held = held or await_in_folder(self.contents(share), condition, mask=IN_CHANGE)
        self.assertTrue(held, f"status: {self.ctl('status').out.decode()}")

    def await_hits(self, words, names, share="alpha"):
        self.await_contents(lambda: self.hits(words, share) == sorted(names), share)

    def await_counts(self, share="alpha", **wanted):
        """Such as `done=2, failed=0`."""

        def are_there():
            status = self.status(share)
            return all(status[f"contents_{name}"] == count for name, count in wanted.items())

        self.await_contents(are_there, share)

    def write(self, path, text):
        with open(path, "w", encoding="utf-8") as file:
            file.write(text)

    def start_service(self, *through):
        """By hand, as a service manager would after it was killed; through such a command."""
        command = [*through, program("talocontentsearchd")]
        return os.posix_spawnp(command[0], command, environment())

    def use_own_programs(self):
        """Copies, with a place beside them for a helper: its path."""
        os.mkdir(PROGRAMS)
        for name in ("fileindexd", "fileindexctl", "talocontentsearchd"):
            shutil.copy(program(name), PROGRAMS)
        patch = unittest.mock.patch.dict(os.environ, FILEINDEXD_BIN_DIR=PROGRAMS)
        patch.start()
        self.addCleanup(patch.stop)
        return f"{PROGRAMS}/fileindex-extract"


class ScriptedTest(ContentsTest):
    """With a helper that does what files' names say, see scripted_extract.py."""

    def setUp(self):
        super().setUp()
        helper = self.use_own_programs()
        with open(f"{HERE}/scripted_extract.py", encoding="utf-8") as script:
            self.write(helper, f"#!{sys.executable}\n{script.read()}")
        os.chmod(helper, 0o755)
        os.chmod(PROGRAMS, 0o777)  # a helper may be another user
        os.mkfifo(f"{PROGRAMS}/gate")
        os.chmod(f"{PROGRAMS}/gate", 0o666)
        self.write(self.diary_path, "")
        os.chmod(self.diary_path, 0o666)

    diary_path = f"{PROGRAMS}/diary"

    def diary(self):
        """(name, helper's pid) of each file that a helper was given."""
        with open(self.diary_path, encoding="utf-8") as file:
            lines = file.read().splitlines()
        return [(line.rpartition(" ")[0], int(line.rpartition(" ")[2])) for line in lines]

    def given(self):
        return sorted(name for name, _ in self.diary())

    def await_diary(self, condition):
        """Until the diary, as `given` shows it, fulfils the condition."""
        held = await_in_folder(self.diary_path, lambda: condition(self.given()), mask=IN_CHANGE)
        self.assertTrue(held, self.given())

    def await_given(self, name, count=1):
        self.await_diary(lambda given: given.count(name) >= count)
        return [pid for other, pid in self.diary() if other == name][count - 1]

    def open_gate(self):
        """Lets those go on that wait at it, now or later."""
        # With a reader of our own a pipe can be opened for writing at any time.
        self.gate = os.open(f"{PROGRAMS}/gate", os.O_RDWR)
        self.addCleanup(os.close, self.gate)
