# SPDX-License-Identifier: GPL-2.0-or-later
"""A share's language: which forms of a word are found together."""

import subprocess

from harness import main
from harness.awaiting import LIMIT
from harness.machine import environment, program
from search.library import ContentsTest

TEXTS = {
    "walks.txt": "She walks along the harbour.",
    "walking.txt": "Walking is what he likes.",
    "haus.txt": "Das Haus am Meer.",
    "hause.txt": "Sie kam nach Hause.",
    "häuser.txt": "Viele Häuser am Meer.",
}
WALKS = ["walking.txt", "walks.txt"]
HOUSES = ["haus.txt", "hause.txt", "häuser.txt"]


class LanguageTest(ContentsTest):
    def setUp(self):
        super().setUp()
        self.root = self.make_share(folders=())
        for name, text in TEXTS.items():
            self.write(f"{self.root}/{name}", text)
        self.daemon = self.start()

    def read_all(self):
        self.ctl("folder", "add", self.root, "--document")
        self.await_counts(done=len(TEXTS), waiting=0)

    def set_language(self, language):
        self.ctl("share", "set", "alpha", "--language", language)

    def said_by_search(self):
        """On standard error."""
        command = [program("fileindexctl"), "search", "text:walks"]
        done = subprocess.run(command, env=environment(), capture_output=True, check=True,
                              timeout=LIMIT)
        return done.stderr

    def test_english_unless_said_otherwise(self):
        self.read_all()

        self.assertEqual(self.hits("text:walked"), WALKS)
        self.assertEqual(self.hits("text:häuser"), ["häuser.txt"])

    def test_a_language_that_is_set_first(self):
        self.set_language("german")
        self.read_all()

        self.assertEqual(self.hits("text:häuser"), HOUSES)
        self.assertEqual(self.hits("text:walked"), [])

    def test_without_a_language_words_are_found_as_they_stand(self):
        self.set_language("none")
        self.read_all()

        self.assertEqual(self.hits("text:walks"), ["walks.txt"])
        self.assertEqual(self.hits("text:haus"), ["haus.txt"])

    def test_until_the_words_are_made_anew_the_old_ones_are_found_and_it_is_said(self):
        self.read_all()
        self.stop(self.daemon)

        self.set_language("german")

        self.assertEqual(self.hits("text:walked"), WALKS)
        words = {"language": "english", "wanted": "german", "done": 0, "total": len(TEXTS)}
        self.assertEqual(self.status()["words_made_anew"], words)
        self.assertIn(b"made anew for german yet, 0 of 5", self.ctl("status").out)
        path = f"{self.root}/walks.txt"
        self.assertEqual(self.ctl("info", path, "--json").json()["words_made_anew"], words)
        self.assertIn(b"made anew for german yet, 0 of 5", self.ctl("info", path).out)
        said = self.said_by_search()
        self.assertIn(b"words of share alpha are not made anew for german yet: those for english", said)
        self.assertEqual(said.count(b"\n"), 1)

        self.start()
        self.await_hits("text:h\u00e4user", HOUSES)
        self.assertIsNone(self.status()["words_made_anew"])
        self.assertEqual(self.said_by_search(), b"")

    def test_a_language_that_is_set_later(self):
        self.read_all()

        self.set_language("german")

        self.await_hits("text:häuser", HOUSES)
        self.await_hits("text:walked", [])
        self.set_language("none")
        self.await_hits("text:häuser", ["häuser.txt"])
        self.await_hits("text:walks", ["walks.txt"])
        self.set_language("english")
        self.await_hits("text:walks", WALKS)


if __name__ == "__main__":
    main()
