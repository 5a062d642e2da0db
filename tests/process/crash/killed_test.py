# SPDX-License-Identifier: GPL-2.0-or-later
"""kill -9 in the middle of the work: after a restart the index is complete."""

import os
import re
import shutil

from harness import IndexTest, main

FOLDERS = 25
FILES = 60  # in each
REINDEX = 0x10000
CREATE = 0x40
DELETE = 0x80

ADDED = re.compile(r"\[alpha\] Document\[.*\] added")
DELETED = re.compile(r"\[alpha\] Document\[.*\] deleted")


class KilledTest(IndexTest):
    def make_tree(self, root, top):
        self.make_files(
            root, *(f"{top}/d{d:02}/f{f:03}.txt" for d in range(FOLDERS) for f in range(FILES))
        )

    def events(self, root, top, code):
        for folder in sorted(os.listdir(f"{root}/{top}")):
            path = f"{root}/{top}/{folder}"
            yield {"event": code, "path": path}
            for name in sorted(os.listdir(path)):
                yield {"event": code, "path": f"{path}/{name}"}

    def kill_after(self, pid, pattern, after, count):
        """Kills the daemon once that many operations are done, and finds it in the middle."""
        self.await_line(pattern, after, count)
        self.kill(pid)
        self.assertTrue(os.path.exists(self.queue("alpha") + ".tmp"), "the drain was over")

    def check_restart(self, root):
        self.start()
        self.await_drained("alpha")
        self.assert_index(root)

    def test_in_the_middle_of_a_drain(self):
        for count in (1, 300, 1200):
            with self.subTest(count=count):
                top = f"top{count}"
                root = self.make_share() if count == 1 else root
                pid = self.start() if count == 1 else self.daemon_pid()
                self.await_drained("alpha")
                self.make_tree(root, top)
                self.make_files(root, f"{top}/")
                events = [{"event": CREATE, "path": f"{root}/{top}"}]
                events += self.events(root, top, CREATE)
                after = self.log.mark()

                self.append("alpha", *events)
                self.kill_after(pid, ADDED, after, count)

                self.check_restart(root)

    def test_in_the_middle_of_deletions(self):
        root = self.make_share()
        self.make_tree(root, "top")
        pid = self.start()
        self.await_drained("alpha")
        self.append("alpha", {"event": REINDEX, "path": root})
        self.await_drained("alpha")
        events = list(self.events(root, "top", DELETE))
        for folder in os.listdir(f"{root}/top"):
            shutil.rmtree(f"{root}/top/{folder}")
        after = self.log.mark()

        self.append("alpha", *events)
        self.kill_after(pid, DELETED, after, 200)

        self.check_restart(root)

    def test_in_the_middle_of_a_walk(self):
        root = self.make_share()
        self.make_tree(root, "top")
        for count in (1, 700):
            with self.subTest(count=count):
                pid = self.start()
                self.await_drained("alpha")
                after = self.log.mark()

                self.append("alpha", {"event": REINDEX, "path": root})
                self.kill_after(pid, ADDED, after, count)

                self.check_restart(root)
                self.stop(self.daemon_pid())

    def test_at_the_first_index_of_all(self):
        root = self.make_share()
        self.make_tree(root, "top")
        pid = self.start()

        self.kill_after(pid, ADDED, 0, 100)

        self.check_restart(root)

    def test_lines_written_after_the_kill_are_not_lost(self):
        root = self.make_share()
        self.make_tree(root, "top")
        pid = self.start()
        self.kill_after(pid, ADDED, 0, 100)

        self.make_files(root, "late.txt")
        self.ctl("event", "alpha", "QLIB_NOTIFY_CREATE", f"{root}/late.txt")

        self.check_restart(root)


if __name__ == "__main__":
    main()
