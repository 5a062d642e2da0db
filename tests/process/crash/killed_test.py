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

    def kill_after(self, pattern, count, work):
        """Kills the daemon once that many operations of the work are done, in the middle of it."""
        self.log.hold_at(pattern, count)
        work()
        self.await_held()
        self.kill(self.daemon_pid())
        self.log.go_on()
        self.assertTrue(os.path.exists(self.queue("alpha") + ".tmp"), "the drain was over")

    def check_restart(self, root):
        self.start()
        self.await_drained("alpha")
        self.assert_index(root)

    def test_in_the_middle_of_a_drain(self):
        for count in (1, 300, 900):
            with self.subTest(count=count):
                top = f"top{count}"
                root = self.make_share() if count == 1 else root
                if count == 1:
                    self.start()
                self.await_drained("alpha")
                self.make_tree(root, top)
                self.make_files(root, f"{top}/")
                events = [{"event": CREATE, "path": f"{root}/{top}"}]
                events += self.events(root, top, CREATE)

                self.kill_after(ADDED, count, lambda: self.append("alpha", *events))

                self.check_restart(root)

    def test_in_the_middle_of_deletions(self):
        root = self.make_share()
        self.make_tree(root, "top")
        self.start()
        self.await_drained("alpha")
        self.append("alpha", {"event": REINDEX, "path": root})
        self.await_taken("alpha")
        self.await_drained("alpha")
        events = list(self.events(root, "top", DELETE))
        for folder in os.listdir(f"{root}/top"):
            shutil.rmtree(f"{root}/top/{folder}")

        self.kill_after(DELETED, 200, lambda: self.append("alpha", *events))

        self.check_restart(root)

    def test_in_the_middle_of_a_walk(self):
        root = self.make_share()
        self.make_tree(root, "top")
        for count in (1, 700):
            with self.subTest(count=count):
                self.start()
                self.await_drained("alpha")
                event = {"event": REINDEX, "path": root}

                self.kill_after(ADDED, count, lambda: self.append("alpha", event))

                self.check_restart(root)
                self.stop(self.daemon_pid())

    def test_at_the_first_index_of_all(self):
        root = self.make_share()
        self.make_tree(root, "top")

        self.kill_after(ADDED, 100, self.launch)

        self.check_restart(root)

    def test_lines_written_after_the_kill_are_not_lost(self):
        root = self.make_share()
        self.make_tree(root, "top")
        self.kill_after(ADDED, 100, self.launch)

        self.make_files(root, "late.txt")
        self.ctl("event", "alpha", "QLIB_NOTIFY_CREATE", f"{root}/late.txt")

        self.check_restart(root)


if __name__ == "__main__":
    main()
