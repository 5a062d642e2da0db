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
GIVEN_UP = r"Share\[alpha\] is not indexed as a whole: too few descriptors"
SHARES = ("alpha", "beta", "gamma")


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

    def check_walks(self, depth):
        """Each thread ends only when its share needs no further pass. The log of it all."""
        roots = {name: self.make_deep_share(name, depth) for name in SHARES}
        after = self.log.mark()
        pid = self.start_limited()
        for _ in range(2):
            for name in SHARES:
                self.await_line(f"Worker[{name}] finished all task, stopping", after)
            for name, root in roots.items():
                self.assert_index(root, name)
            after = self.log.mark()
            for name, root in roots.items():
                self.append(name, {"event": REINDEX, "path": root})
        self.stop(pid)

    def test_three_walks_that_fit_together(self):
        self.check_walks(5)

        self.assert_not_logged(AGAIN)

    def test_three_walks_that_fit_only_one_by_one(self):
        self.check_walks(20)

        self.assertTrue(any(re.fullmatch(AGAIN, text) for text in self.log.texts()))
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
