# SPDX-License-Identifier: GPL-2.0-or-later
"""kill -9 at random moments under load: what was acknowledged stays, and the rest is made good."""

from harness import LoadTest, main
from harness.awaiting import children
from harness.scale import IS_LONG

KILLS = 500 if IS_LONG else 30


class RandomKillsTest(LoadTest):
    def launch_and_kill(self):
        """At its start, or while it makes up for the kill before."""
        before = children()  # helpers of the one before may not have ended
        self.sent = self.log.mark()
        self.launch()
        (pid,) = [pid for pid, name in children().items() if pid not in before and name[0] == "f"]
        self.await_moment(self.choice.randrange(40))
        self.kill(pid)
        self.assert_acknowledged()

    def start_and_settle(self):
        self.sent = self.log.mark()
        pid = self.start()
        self.settle()
        return pid

    def test_kills(self):
        self.begin(self.make_share(files=("d00000/a.txt",)))
        pid = self.start_and_settle()

        for _ in range(KILLS):
            for _ in range(self.choice.randrange(2)):
                self.work_batch()
            self.await_moment(self.send_batch())
            self.take_acknowledged()
            self.kill(pid)

            self.assert_acknowledged()
            if self.choice.randrange(4) == 0:
                self.launch_and_kill()
            pid = self.start_and_settle()
            self.assert_index(self.root)


if __name__ == "__main__":
    main()
