# SPDX-License-Identifier: GPL-2.0-or-later
"""Contents that were damaged where only questions look: they are told of, and made anew."""

import os

from harness import main, namespace
from harness.pages import scribble_leaf
from library import CLOSE_WRITE, ContentsTest

FOLDER = f"{namespace.STATE}/shares/alpha/contents"
FILE = f"{FOLDER}/contents.db"
ENTRIES = f"{namespace.STATE}/shares/alpha/index/entries.db"
SET_ASIDE = (
    f"index damaged and set aside, path={FOLDER}, copy={FOLDER}.damaged, reason=found at opening"
)
TEXTS = 300


class ContentsDamageTest(ContentsTest):
    def setUp(self):
        super().setUp()
        self.root = self.make_share(folders=())
        for i in range(TEXTS):
            words = " ".join(f"word{i}x{n}" for n in range(200))
            ending = ".txt" if i % 2 else ""  # the kind of the others stands in the contents alone
            self.write(f"{self.root}/text-{i:03}{ending}", f"lighthouse {words}")
        self.start()
        self.ctl("folder", "add", self.root, "--document")
        self.await_counts(done=TEXTS, waiting=0)

    def asked_only(self, table, ask):
        self.log.program = "talocontentsearchd"
        after = self.log.mark()
        scribble_leaf(FILE, table)

        ask()
        self.await_line(SET_ASIDE, after)

        self.await_counts(done=TEXTS, waiting=0)
        self.assertEqual(len(self.hits("lighthouse")), TEXTS)
        self.assertFalse(os.path.exists(f"{FOLDER}/suspected"))

    def test_words_that_only_a_search_reads_are_made_anew(self):
        self.asked_only("words_data", lambda: self.ctl("search", "word*", code=1))

    def test_texts_that_only_snippets_are_cut_from_are_made_anew(self):
        self.asked_only("texts", lambda: self.ctl("search", "--json", "--limit", "all", "lighthouse"))

    def test_texts_that_only_info_reads_are_made_anew(self):
        paths = [f"{self.root}/{name}" for name in os.listdir(self.root)]

        def ask():
            asked = [self.try_ctl("info", "--terms", path) for path in paths]
            self.assertTrue(any(b"the index is damaged" in result.out for result in asked))

        self.asked_only("texts", ask)

    def test_files_that_only_duplicates_are_made_of_are_made_anew(self):
        self.asked_only("files", lambda: self.ctl("stats", "--duplicates", code=1))

    def test_files_that_only_statistics_by_kind_read_are_made_anew(self):
        self.asked_only("files", lambda: self.ctl("stats", "--by", "kind", code=1))

    def test_files_that_only_a_dump_reads_are_made_anew(self):
        self.asked_only("files", lambda: self.ctl("dump", "--json", "alpha", code=1))

    def test_failures_that_only_a_list_of_them_reads_are_made_anew(self):
        self.asked_only("files_failed", lambda: self.ctl("failed", code=1))

    def test_counts_that_only_status_reads_are_made_anew(self):
        self.asked_only("counts", lambda: self.assertIn(b"cannot be read", self.ctl("status").out))

    def test_entries_whose_shared_memory_went_are_followed_on(self):
        os.unlink(f"{ENTRIES}-shm")

        for name in ("first", "second", "third"):
            self.write(f"{self.root}/{name}.txt", f"harbour {name}")
            self.append("alpha", {"event": CLOSE_WRITE, "path": f"{self.root}/{name}.txt"})
            self.await_drained("alpha")
            self.await_hits(f"harbour {name}", [f"{name}.txt"])


if __name__ == "__main__":
    main()
