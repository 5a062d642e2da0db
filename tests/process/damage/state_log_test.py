# SPDX-License-Identifier: GPL-2.0-or-later
"""The state database's log or shared memory is damaged, or an older database stands in its place."""

import os
import re
import shutil

from damaged_state import FILE, USED, StateDamageTest
from harness import main, namespace
from harness.pages import copy_log_back, scribble
from harness.standing_in import make_full_folder, remove, replace

LOG = FILE + "-wal"
MEMORY = FILE + "-shm"
OLDER = f"{namespace.RUN}/older.db"


def cut_log(size):
    os.truncate(LOG, os.path.getsize(LOG) + size if size < 0 else size)


def put_older():
    shutil.copyfile(OLDER, f"{FILE}.older")
    os.rename(f"{FILE}.older", FILE)


STANDING_IN = (
    ("log replaced by a folder", lambda: replace(LOG, make_full_folder)),
    ("log replaced by a pipe", lambda: replace(LOG, os.mkfifo)),
    ("memory replaced by a folder", lambda: replace(MEMORY, make_full_folder)),
    ("memory replaced by a pipe", lambda: replace(MEMORY, os.mkfifo)),
)
OLDER_ONES = (
    ("older one in its place", put_older),
    ("older one written over it", lambda: shutil.copyfile(OLDER, FILE)),
)
# Of a log that alone holds the last change.
LOG_DAMAGES = (
    ("log removed", lambda: remove(LOG)),
    ("log and memory removed", lambda: (remove(LOG), remove(MEMORY))),
    ("log cut to nothing", lambda: cut_log(0)),
    ("log cut inside its header", lambda: cut_log(17)),
    ("log cut by a byte", lambda: cut_log(-1)),
    ("log overwritten", lambda: scribble(LOG)),
    ("end of the log overwritten", lambda: scribble(LOG, os.path.getsize(LOG) - 100)),
)


class StateLogTest(StateDamageTest):
    """What was set before is there afterwards: a part of it was in the file, the last in the log."""

    def prepare(self):
        super().prepare()
        copy_log_back(FILE)
        shutil.copyfile(FILE, OLDER)
        self.ctl("share", "set", "alpha", "--language", "german")
        copy_log_back(FILE)
        self.ctl("folder", "add", f"{self.root}/d", "--photo")
        self.await_drained("alpha")

    def check_works(self):
        super().check_works()
        (share,) = self.ctl("share", "list", "--json").json()
        self.assertEqual(share["language"], "german")
        paths = [folder["path"] for folder in self.ctl("folder", "list", "--json").json()]
        self.assertEqual(paths, [self.root, f"{self.root}/d"])

    def killed(self):
        self.prepare()
        self.kill_all()
        self.assertGreater(os.path.getsize(LOG), 0)

    def damaged_while_killed(self, damage):
        self.killed()
        damage()
        after = self.log.mark()

        self.start()

        self.assertEqual(len(self.told(USED, after)), 1)
        self.check_works()

    def test_a_log_beside_an_emptied_database_is_kept_with_it(self):
        self.killed()
        os.truncate(FILE, 0)
        with open(LOG, "rb") as file:
            log = file.read()

        self.start()

        with open(f"{FILE}.damaged-wal", "rb") as file:
            self.assertEqual(file.read(), log)
        self.check_works()

    def test_a_log_that_is_whole_is_not_told_of(self):
        self.killed()
        after = self.log.mark()

        self.start()

        self.check_works()
        self.assertEqual(self.told(USED, after), [])


def add_cases():
    for cases, states in (
        (STANDING_IN, ("stopped", "running", "killed")),
        (OLDER_ONES, ("stopped", "running", "killed")),
        (LOG_DAMAGES, ("killed",)),
    ):
        for name, damage in cases:
            for state in states:
                def test(self, damage=damage, state=state):
                    getattr(self, f"damaged_while_{state}")(damage)

                words = re.sub(r"\W+", "_", name)
                setattr(StateLogTest, f"test_{words}_while_{state}", test)


add_cases()


if __name__ == "__main__":
    main()
