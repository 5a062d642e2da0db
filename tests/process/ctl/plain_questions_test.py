# SPDX-License-Identifier: GPL-2.0-or-later
"""Random questions to a real index, answered a second time entry by entry over its dump."""

import os
import random

from ctl import plain_asker
from ctl.plain_asker import ENDINGS, WORDS, Asker, Seen
from harness import main
from harness.machine import full_path
from harness.scale import IS_LONG
from search.library import ContentsTest

SEED = 20_261_122
FILES = 400 if IS_LONG else 120
QUESTIONS = 5000 if IS_LONG else 400
YEAR_BEGIN, YEAR_END = 1_704_067_200, 1_735_689_599  # 2024


class PlainQuestionsTest(ContentsTest):
    def setUp(self):
        super().setUp()
        self.random = random.Random(SEED)
        self.written = {}  # title and text of each path
        self.root = self.make_share(folders=())
        self.folders = [self.root]
        for _ in range(FILES // 12):
            self.make_folder()
        for number in range(FILES):
            self.make_file(number)
        self.start()
        self.ctl("folder", "add", self.root, "--document")
        self.await_drained("alpha")
        wanted = sum(entry["content"] for entry in self.ctl("dump", "alpha", "--json").objects())
        self.assertGreaterEqual(wanted, len(self.written))
        self.await_contents(lambda: self.read() == wanted)

    def read(self):
        """How many contents were looked into, whatever came of it."""
        status = self.status()
        return sum(status[f"contents_{state}"] for state in ("done", "failed", "not_kept"))

    def some_words(self, most):
        words = self.random.choices(WORDS, k=self.random.randrange(most + 1))
        return [self.random.choice((word, word.upper(), plain_asker.plain(word)))
                for word in words]

    def name(self, number):
        words = self.random.choice(" -_").join(self.some_words(3))
        hidden = "." if self.random.randrange(15) == 0 else ""
        return f"{hidden}{words}{self.random.choice(' -_')}{number}"

    def make_folder(self):
        path = f"{self.random.choice(self.folders)}/{self.name(len(self.folders)).strip()} d"
        os.mkdir(path)
        self.folders.append(path)

    def make_file(self, number):
        ending = self.random.choice(ENDINGS)
        path = f"{self.random.choice(self.folders)}/{self.name(number)}{ending}"
        if ending in (".txt", ".md", ".html"):
            self.write_document(path, ending)
        else:
            with open(path, "wb") as file:
                file.truncate(self.random.choice((0, 7, 33, 5000)))
        time = self.random.randrange(YEAR_BEGIN, YEAR_END)
        os.utime(path, (time, time))

    def write_document(self, path, ending):
        text = " ".join(self.some_words(6))
        title = " ".join(self.some_words(2)) if ending == ".html" else ""
        self.written[path] = (title, text)
        head = f"<head><meta charset='utf-8'><title>{title}</title></head>"
        self.write(path, f"<html>{head}<body>{text}</body></html>" if ending == ".html" else text)

    def entries(self):
        """All that the index holds, with what its files hold."""
        seen = []
        for entry in self.ctl("dump", "alpha", "--json").objects():
            path = os.fsdecode(full_path(entry))
            title, text = self.written.get(path, ("", ""))
            seen.append(Seen(path, entry["dir"], entry["kind"], entry["size"], entry["mtime"],
                             title, text))
        return seen

    def ask(self, text):
        """The paths that are found; None: the question was refused."""
        result = self.try_ctl("search", "-0", "--limit", "all", "--", text, TZ="UTC")
        if result.code == 2:
            return None
        self.assertEqual(result.code, 0, (text, result))
        return sorted(os.fsdecode(path) for path in result.out.split(b"\0")[:-1])

    def test_the_index_and_the_plain_way_agree(self):
        entries = self.entries()
        self.assertGreater(len(entries), FILES)
        asker = Asker(self.random, entries)
        telling = 0
        for _ in range(QUESTIONS):
            made = asker.tree(self.random.randrange(4))
            wanted = sorted(entry.path for entry in entries if made.test(entry))
            self.assertEqual(self.ask(made.text), wanted if made.is_positive else None, made.text)
            telling += made.is_positive and 0 < len(wanted) < len(entries)
        self.assertGreater(telling, QUESTIONS / 3, "many questions tell entries apart")


if __name__ == "__main__":
    main()
