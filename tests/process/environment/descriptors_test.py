# SPDX-License-Identifier: GPL-2.0-or-later
"""Eight shares at work: no Worker closes what is not its own, and nothing is left over."""

import time

from harness import IndexTest, main
from harness.load import Load
from harness.scale import IS_LONG
from harness.preload import Page

SHARES = [f"share{number}" for number in range(8)]
ROUNDS = 12
LONG_SECONDS = 600
CHANGES = 25  # in a share and a round
REINDEX = 0x10000
CLOSED, WRONG = 0, 1  # the numbers that the library keeps
FIRST_WRONG = 16  # where its text stands


class DescriptorsTest(IndexTest):
    def left_without_workers(self, pid):
        """Descriptors of the daemon."""
        for name in SHARES:
            self.assertEqual(self.command("delete_share_worker", share_name=name), 0)
        self.await_alone(pid)
        return self.descriptors(pid)

    def revive_all(self):
        for name in SHARES:
            self.assertEqual(self.command("revive_share_worker", share_name=name), 0)

    def rounds(self):
        began = time.monotonic()
        done = 0
        while time.monotonic() - began < LONG_SECONDS if IS_LONG else done < ROUNDS:
            yield done
            done += 1

    def test_nobody_closes_a_strangers_descriptor(self):
        watch = Page("descriptor_watch", "DESCRIPTOR_WATCH")
        loads = {name: Load(self.make_share(name), name) for name in SHARES}
        pid = self.start(debug=False, **watch.environment)
        for name in SHARES:
            self.await_drained(name)
        before = self.left_without_workers(pid)
        self.revive_all()

        for number in self.rounds():
            for name, load in loads.items():
                lines = load.lines(CHANGES)
                if number % 3 == 0:
                    lines.append({"event": REINDEX, "path": load.root})
                self.append(name, *lines)
            dropped = SHARES[number % len(SHARES)]
            self.assertEqual(self.command("revive_share_worker", share_name=dropped), 0)
            for name in SHARES if number % 2 else ():
                self.await_drained(name)

        for name, load in loads.items():
            self.await_drained(name)
            self.assert_index(load.root, name)
        self.assertEqual(self.left_without_workers(pid), before)
        self.assertEqual(watch.number(WRONG), 0, watch.text(FIRST_WRONG))
        self.assertGreater(watch.number(CLOSED), 1000)


if __name__ == "__main__":
    main()
