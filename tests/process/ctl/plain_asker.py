# SPDX-License-Identifier: GPL-2.0-or-later
"""Random questions, and beside each what it means, said in the plainest way: a test of one entry.

Entries are those of `dump --json`, with the words of their content put to them; nothing of the
index's own reading of questions is shared.
"""

import calendar
import dataclasses
import os
import re
import typing
import unicodedata

# None is a form or a beginning of another, nor part of an ending or of the folders above.
WORDS = ("amber", "birch", "copper", "élan", "fjord", "gravel", "hüttë", "ivory", "jungle", "krill",
         "lemon", "mango")
ENDINGS = (".txt", ".md", ".html", ".jpg", ".mkv", ".mp3", ".tar.gz", ".bin", "")
KINDS = ("document", "audio", "video", "photo", "other", "folder")


def plain(text):
    """Small letters without accents."""
    parted = unicodedata.normalize("NFD", text.lower())
    return "".join(letter for letter in parted if not unicodedata.combining(letter))


def words_of(text):
    return re.findall(r"[a-z0-9]+", plain(text))


def has_row(text, row, last_begins):
    """Whether these words stand in a row there, of the last one only its beginning."""
    words = words_of(text)
    for at in range(len(words) - len(row) + 1):
        there = words[at:at + len(row)]
        if last_begins:
            there[-1] = there[-1][:len(row[-1])]
        if there == row:
            return True
    return False


@dataclasses.dataclass
class Seen:
    """An entry as dump tells of it, and what was written into its file."""

    path: str
    is_folder: bool
    kind: str
    size: int
    mtime: int
    title: str = ""
    text: str = ""

    @property
    def name(self):
        return os.path.basename(self.path)


@dataclasses.dataclass
class Asked:
    text: str
    test: typing.Callable
    is_positive: bool = True  # says what to find, not only what not to


class Asker:
    """Makes questions about entries that are given."""

    def __init__(self, random, entries):
        self.random = random
        self.entries = entries

    def one_of(self, number):
        return self.random.randrange(number) == 0

    def spelt(self, word):
        """The word in one of the ways that mean the same."""
        ways = (word, word.upper(), plain(word), unicodedata.normalize("NFD", word))
        return self.random.choice(ways)

    def tree(self, depth):
        if depth == 0 or self.one_of(5):
            return self.leaf()
        form = self.random.randrange(6)
        if form == 0:
            return self.negated(self.tree(depth - 1))
        return self.group(form < 3, depth - 1)

    def negated(self, of):
        sign = "-" if self.one_of(2) and not of.text.startswith("-") else "NOT "
        text = of.text if " " not in of.text else f"({of.text})"
        return Asked(sign + text, lambda entry: not of.test(entry), False)

    def group(self, is_any, depth):
        parts = [self.tree(depth) for _ in range(2 + self.random.randrange(2))]
        parts = [self.negated(part) if not is_any and self.one_of(4) else part for part in parts]
        together = any if is_any else all
        positive = (part.is_positive for part in parts)
        between = " OR " if is_any else self.random.choice((" ", " AND "))
        return Asked(f"({between.join(part.text for part in parts)})",
                     lambda entry: together([part.test(entry) for part in parts]),
                     all(positive) if is_any else any(positive))

    def leaf(self):
        forms = (self.words, self.words, self.words, self.field_group, self.pattern, self.exact,
                 self.path, self.kind, self.ending, self.size, self.modified, self.under,
                 self.property)
        return self.random.choice(forms)()

    def words(self):
        """One word or two in a row, in the name, in the content, or in one place of them."""
        row = self.random.sample(WORDS, 2 if self.one_of(4) else 1)
        begins = self.one_of(5)
        spelt = [self.spelt(word) for word in row]
        if begins:
            spelt[-1] = plain(row[-1])[:3]
        text = " ".join(spelt)
        text = (f'"{text}"' if len(row) > 1 else text) + ("*" if begins else "")
        asked = [plain(word) for word in spelt]
        fields = self.random.choice((("name", "title", "text"), ("name", "title", "text"),
                                     ("title",), ("text",), ("name",)))
        if fields == ("name",) and len(row) > 1:  # in quotes it would be the whole name
            fields = ("text",)
        front = "" if len(fields) > 1 else fields[0] + ":"
        return Asked(front + text, lambda entry: any(
            has_row(getattr(entry, field), asked, begins) for field in fields))

    def field_group(self):
        """Words in the brackets behind a field."""
        field = self.random.choice(("name", "title", "text"))
        first, second = self.random.sample(WORDS, 2)

        def has(entry, word):
            return has_row(getattr(entry, field), [plain(word)], False)

        form = self.random.randrange(3)
        text = f"{self.spelt(first)}{(' ', ' OR ', ' -')[form]}{self.spelt(second)}"
        tests = (lambda entry: has(entry, first) and has(entry, second),
                 lambda entry: has(entry, first) or has(entry, second),
                 lambda entry: has(entry, first) and not has(entry, second))
        return Asked(f"{field}:({text})", tests[form])

    def pattern(self):
        word = self.random.choice(WORDS)
        first = self.random.randrange(3)
        part = plain(word)[first:first + 1 + self.random.randrange(3)]
        if self.one_of(3):
            ending = self.random.choice((".txt", ".gz", ".html"))
            return Asked(f"name:*{part}*{ending}", lambda entry: re.search(
                f"{part}.*{re.escape(ending)}$", plain(entry.name), re.DOTALL) is not None)
        return Asked(f"name:*{part}*", lambda entry: part in plain(entry.name))

    def exact(self):
        name = self.random.choice(self.entries).name
        return Asked(f'name:"{name}"', lambda entry: plain(entry.name) == plain(name))

    def path(self):
        word = self.random.choice(WORDS)
        front = self.random.choice(("", "/"))
        return Asked(f"path:{front}{self.spelt(word)}",
                     lambda entry: front + plain(word) in plain(entry.path))

    def kind(self):
        kinds = self.random.sample(KINDS, 1 + self.random.randrange(2))
        return Asked("kind:" + ",".join(kinds), lambda entry: entry.kind in kinds)

    def ending(self):
        ending = self.random.choice(("txt", "MD", "gz", "tar.gz", "jpg"))

        def ends(entry):
            name = plain(entry.name)
            tail = "." + ending.lower()
            return not entry.is_folder and name.endswith(tail) and len(name) > len(tail)

        return Asked(f"ext:{ending}", ends)

    def size(self):
        low = self.random.randrange(60)
        high = low + self.random.randrange(40)
        text, test = self.random.choice((
            (f">{low}", lambda size: size > low),
            (f"<={high}", lambda size: size <= high),
            (f"{low}..{high}", lambda size: low <= size <= high),
            (">=1K", lambda size: size >= 1024),
            ("0", lambda size: size == 0)))
        return Asked(f"size:{text}", lambda entry: not entry.is_folder and test(entry.size))

    def modified(self):
        """Days and months of 2024."""
        month = 1 + self.random.randrange(12)
        first = calendar.timegm((2024, month, 1, 0, 0, 0))
        last = calendar.timegm((2024 + month // 12, month % 12 + 1, 1, 0, 0, 0)) - 1
        name = f"2024-{month:02}"
        if self.one_of(3):
            day = 1 + self.random.randrange(28)
            first = calendar.timegm((2024, month, day, 0, 0, 0))
            last = first + 86399
            name += f"-{day:02}"
        text, test = self.random.choice(((name, lambda time: first <= time <= last),
                                         (f"<{name}", lambda time: time < first),
                                         (f">{name}", lambda time: time > last)))
        return Asked(f"modified:{text}", lambda entry: not entry.is_folder and test(entry.mtime))

    def under(self):
        folder = self.random.choice([entry for entry in self.entries if entry.is_folder]).path
        return Asked(f'under:"{folder}"', lambda entry: entry.path == folder
                     or entry.path.startswith(folder + "/"))

    def property(self):
        return self.random.choice((
            Asked("is:folder", lambda entry: entry.is_folder),
            Asked("is:file", lambda entry: not entry.is_folder),
            Asked("is:empty", lambda entry: not entry.is_folder and entry.size == 0),
            Asked("is:hidden", lambda entry: entry.name.startswith(".")),
            Asked("has:text", lambda entry: entry.text != ""),
            Asked("has:title", lambda entry: entry.title != "")))
