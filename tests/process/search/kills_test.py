# SPDX-License-Identifier: GPL-2.0-or-later
"""kill -9 of helper, service and daemon at random moments: all is read in the end, nothing blamed."""

import contextlib
import os
import random
import signal

from harness import main
from harness.scale import IS_LONG
from search.library import ContentsTest, ScriptedTest

KILLS = 300 if IS_LONG else 12
REAL_KILLS = 60 if IS_LONG else 12  # at each, helpers
FILES_BETWEEN = 6  # that are read between two kills, at most


def make_choice():
    seed = int(os.environ.get("FILEINDEXD_TEST_SEED", "0")) or random.randrange(1, 1 << 32)
    print(f"seed {seed}", flush=True)
    return random.Random(seed)


class RandomKillsTest(ScriptedTest):
    def setUp(self):
        super().setUp()
        self.choice = make_choice()

    def kill_helper(self):
        with contextlib.suppress(ProcessLookupError):  # it was killed with its service
            os.kill(self.diary()[-1][1], signal.SIGKILL)

    def kill_service(self):
        self.kill(self.service)
        self.service = self.start_service()

    def kill_daemon(self):
        self.kill(self.daemon)
        self.daemon = self.start()

    def add_files(self, count):
        for _ in range(count):
            self.added += 1
            self.write(f"{self.root}/f{self.added}.txt", f"lighthouse{self.added} everywhere")
        self.ctl("reindex", self.root)
        # A line that comes between a Worker's last look and its end waits until somebody touches it.
        self.await_taken("alpha")

    def test_kills(self):
        self.root = self.make_share(folders=())
        self.added = 0
        self.daemon = self.start()
        self.service = self.service_pid()
        self.ctl("folder", "add", self.root, "--document")

        for _ in range(KILLS):
            read = len(self.diary())
            self.add_files(FILES_BETWEEN)
            until = read + self.choice.randrange(1, FILES_BETWEEN)
            self.await_diary(lambda given, until=until: len(given) >= until)
            self.choice.choice([self.kill_helper, self.kill_service, self.kill_daemon])()

        self.await_counts(done=self.added, waiting=0, failed=0)
        self.assertEqual(self.failed(), {})
        self.assertEqual(len(self.hits("everywhere")), min(self.added, 1000))
        for number in self.choice.sample(range(1, self.added + 1), 20):
            self.assertEqual(self.hits(f"lighthouse{number}"), [f"f{number}.txt"])


class RealHelperKillsTest(ContentsTest):
    state_size = "2g" if IS_LONG else ContentsTest.state_size

    def helpers(self, service):
        """Processes of the service's own that read files."""
        pids = []
        for task in os.listdir(f"/proc/{service}/task"):
            with contextlib.suppress(OSError):  # a thread that has ended meanwhile
                with open(f"/proc/{service}/task/{task}/children", encoding="ascii") as children:
                    pids += [int(pid) for pid in children.read().split()]
        return pids

    def test_kills(self):
        choice = make_choice()
        root = self.make_share(folders=())
        self.start()
        service = self.service_pid()
        self.ctl("folder", "add", root, "--document")

        added = killed = 0
        for _ in range(REAL_KILLS):
            done = added
            for _ in range(4 * FILES_BETWEEN):
                added += 1
                text = " ".join(f"word{choice.randrange(100000)}" for _ in range(20000))
                self.write(f"{root}/f{added}.txt", f"lighthouse{added} everywhere {text}")
            self.ctl("reindex", root)
            self.await_taken("alpha")
            until = done + choice.randrange(1, FILES_BETWEEN)
            self.await_contents(lambda until=until: self.status()["contents_done"] >= until)
            helpers = self.helpers(service)
            for pid in choice.sample(helpers, choice.randrange(len(helpers) + 1)):
                with contextlib.suppress(ProcessLookupError):
                    os.kill(pid, signal.SIGKILL)
                    killed += 1

        self.assertGreater(killed, 0)
        self.await_counts(done=added, waiting=0, failed=0)
        self.assertEqual(self.failed(), {})
        self.assertEqual(len(self.hits("everywhere")), min(added, 1000))


if __name__ == "__main__":
    main()
