# SPDX-License-Identifier: GPL-2.0-or-later
"""With the real helper: much text goes through, and the service stays small."""

import re

from harness import main
from harness.scale import IS_LONG
from search.library import ContentsTest

LARGE, SMALL = (500, 20000) if IS_LONG else (40, 400)  # files; each large one beyond the text's cap
SHARES = 6
IN_EACH = 60 if IS_LONG else 20  # large files, all words of which are new
WORDS = "lighthouse keepers number their lamps "


class BoundsTest(ContentsTest):
    state_size = "4g" if IS_LONG else ContentsTest.state_size

    def highest_memory(self, pid):
        """KiB."""
        with open(f"/proc/{pid}/status", encoding="utf-8") as file:
            return int(re.search(r"VmHWM:\s+(\d+) kB", file.read())[1])

    def test_memory_and_descriptors_are_bounded(self):
        root = self.make_share(folders=())
        for number in range(LARGE):
            self.write(f"{root}/large{number}.txt", f"{WORDS} {number} " * 30000)
        for number in range(SMALL):
            self.write(f"{root}/small{number}.txt", f"{WORDS} {number}")
        self.start()
        service = self.service_pid()
        self.ctl("folder", "add", root, "--document")

        self.await_counts(done=LARGE + SMALL, waiting=0, failed=0)

        self.assertLess(self.highest_memory(service), 64 * 1024)
        self.assertLess(self.descriptors(service), 100)
        self.assertEqual(self.ctl("search", "--count", "lighthouse").out.strip().decode(),
                         str(LARGE + SMALL))

    def test_many_shares_take_no_more_memory_than_one(self):
        names = [f"share{number}" for number in range(SHARES)]
        roots = [self.make_share(name, folders=()) for name in names]
        for name, root in zip(names, roots):
            for number in range(IN_EACH):
                text = "".join(f"{WORDS} {name}x{number}y{word} " for word in range(12000))
                self.write(f"{root}/large{number}.txt", text)
        self.start()
        service = self.service_pid()
        for root in roots:
            self.ctl("folder", "add", root, "--document")

        for name in names:
            self.await_counts(name, done=IN_EACH, waiting=0, failed=0)

        self.assertLess(self.highest_memory(service), 64 * 1024)


if __name__ == "__main__":
    main()
