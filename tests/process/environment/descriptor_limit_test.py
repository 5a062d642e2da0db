# SPDX-License-Identifier: GPL-2.0-or-later
"""A hard limit of 64 descriptors: nothing of a deep tree is passed over for good."""

import re
import subprocess

from harness import IndexTest, main
from harness.awaiting import LIMIT
from harness.machine import environment, program

DESCRIPTORS = 64
REINDEX = 0x10000
AGAIN = r"Share\[\w+\] has to be indexed again, .*, reason=Too many open files"
GIVEN_UP = r"Share\[alpha\] is not indexed as a whole$"
SHARES = ("alpha", "beta", "gamma")
MOST_ROUNDS = 100  # whether walks of one round meet is up to the machine


class DescriptorLimitTest(IndexTest):
    def launch(self, debug=True, **more):
        done = subprocess.run(
            ["prlimit", f"--nofile={DESCRIPTORS}:{DESCRIPTORS}", program("fileindexd")],
            env=environment(FILEINDEXD_LOG_LEVEL="debug" if debug else None, **more),
            check=False,
            timeout=LIMIT,
        )
        self.assertEqual(done.returncode, 0)

    def make_deep_share(self, name, depth):
        """A chain of folders with some files in each."""
        names = []
        for level in range(depth):
            folder = "/".join(f"d{step}" for step in range(level + 1))
            names += [f"{folder}/f{number}.txt" for number in range(3)]
        return self.make_share(name, names)

    def start_limited(self):
        pid = self.start()
        with open(f"/proc/{pid}/limits", encoding="ascii") as file:
            self.assertRegex(file.read(), rf"Max open files +{DESCRIPTORS} +{DESCRIPTORS} ")
        return pid

    def check_walks(self, depth, enough):
        """Rounds of walks, at least two, until `enough` says that they met as they should.

        Each thread ends only when its share needs no further pass.
        """
        roots = {name: self.make_deep_share(name, depth) for name in SHARES}
        after = self.log.mark()
        pid = self.start_limited()
        for number in range(1, MOST_ROUNDS + 1):
            for name in SHARES:
                self.await_line(f"Worker[{name}] finished all task, stopping", after)
            for name, root in roots.items():
                self.assert_index(root, name)
            if number >= 2 and enough():
                break
            after = self.log.mark()
            for name, root in roots.items():
                self.append(name, {"event": REINDEX, "path": root})
        self.stop(pid)

    def has_been_told_to_walk_again(self):
        return any(re.fullmatch(AGAIN, text) for text in self.log.texts())

    def test_three_walks_that_fit_together(self):
        self.check_walks(5, enough=lambda: True)

        self.assert_not_logged(AGAIN)

    def test_three_walks_that_fit_only_one_by_one(self):
        self.check_walks(20, enough=self.has_been_told_to_walk_again)

        self.assertTrue(self.has_been_told_to_walk_again())
        self.assert_not_logged(GIVEN_UP)

    def test_walk_that_does_not_fit_is_told_and_stays_on_record(self):
        root = self.make_deep_share("alpha", 2 * DESCRIPTORS)
        pid = self.start_limited()

        self.await_line("Worker[alpha] finished all task, stopping")

        self.await_line(re.compile(GIVEN_UP))
        (share,) = self.ctl("status", "--json").json()["shares"]
        self.assertTrue(share["needs_reindex"])
        self.stop(pid)
        after = self.log.mark()
        super().launch()
        self.await_line("Worker[alpha] finished all task, stopping", after)
        self.assert_index(root)


if __name__ == "__main__":
    main()
