# SPDX-License-Identifier: GPL-2.0-or-later
"""search on a terminal, through a pipe and as JSON: columns, colours, cuts, orders."""

import os
import unicodedata

from ctl.terminal import COLOUR, Terminal, marked, width
from harness import IndexTest, main, namespace
from harness.machine import full_path, program
from search.library import ContentsTest

TEXT = "The old lighthouse stood above the harbour, and its keeper wrote a letter each week. " * 3
NAMES = [
    "plain lighthouse.txt",
    "灯台の写真 lighthouse 東京タワーの夜景と海の見える丘.txt",
    unicodedata.normalize("NFD", "Möwen über dem lighthouse é à ü ö ñ.txt"),
    "deep/" + "very long folder name/" * 9 + "lighthouse at the end of a long way.txt",
    "lighthouse " + "x" * 200 + ".txt",
    "한국어 lighthouse 파일 이름.txt",
]


class TerminalTest(ContentsTest):
    def setUp(self):
        super().setUp()
        self.root = self.make_share(files=NAMES, folders=())
        self.write(f"{self.root}/story.txt", TEXT)
        self.start()
        self.ctl("folder", "add", self.root, "--document")
        self.await_counts(done=len(NAMES) + 1, waiting=0)

    def show(self, *arguments, columns=80, **more):
        shown = Terminal([program("fileindexctl"), "search", *arguments], columns, **more)
        self.assertEqual(shown.code, 0, shown.err)
        return shown

    def test_no_line_is_wider_than_the_screen(self):
        for columns in (1, 2, 5, 17, 30, 33, 40, 52, 80, 132, 1000):
            with self.subTest(columns=columns):
                shown = self.show("lighthouse", columns=columns)

                self.assertGreaterEqual(len(shown.lines()), len(NAMES) + 2)
                for line in shown.lines():
                    self.assertLessEqual(width(line), max(columns - 1, 1), line)

    def test_columns_stand_below_each_other(self):
        lines = [line for line in self.show("lighthouse").plain_lines() if line[0] == "/"]

        self.assertEqual(len(lines), len(NAMES) + 1)
        for line in lines:
            self.assertRegex(line, r" +\d+B  \d{4}-\d\d-\d\d \d\d:\d\d\Z")
        self.assertEqual(len({width(line) for line in lines}), 1)

    def test_a_narrow_screen_does_without_time_and_size(self):
        self.assertRegex(self.show("story", columns=60).plain_lines()[0], r"B  \d{4}-.*:\d\d\Z")
        self.assertRegex(self.show("story", columns=40).plain_lines()[0], r"txt +\d+B\Z")
        self.assertRegex(self.show("story", columns=20).plain_lines()[0], r"txt\Z")

    def test_a_long_path_is_cut_in_the_middle(self):
        (line,) = [line for line in self.show("lighthouse", "way").plain_lines() if line[0] == "/"]

        path = line.split("  ")[0]
        self.assertEqual(path.count("…"), 1)
        before, after = path.split("…")
        self.assertTrue(f"{self.root}/{NAMES[3]}".startswith(before))
        self.assertTrue(NAMES[3].endswith(after))
        self.assertIn("lighthouse", after)

    def test_words_of_the_content_are_marked(self):
        lines = self.show("keeper").lines()

        self.assertIn("story.txt", lines[0])
        self.assertTrue(lines[1].startswith("    "))
        self.assertEqual(set(marked(lines[1])), {"keeper"})

    def test_on_a_narrow_screen_the_marked_word_is_still_there(self):
        for columns in (30, 36, 44):
            self.assertIn("keeper", marked(self.show("keeper", columns=columns).lines()[1]))

    def test_words_of_the_path_are_marked(self):
        line = self.show("story").lines()[0]

        self.assertEqual(marked(line), ["story"])

    def test_without_colours_the_lines_are_the_same(self):
        coloured = self.show("lighthouse", "keeper")
        self.assertRegex(coloured.out, COLOUR)

        for more in ({"NO_COLOR": "1"}, {"TERM": "dumb"}, {"TERM": None}):
            with self.subTest(more=more):
                plain = self.show("lighthouse", "keeper", **more)
                self.assertNotIn("\x1b", plain.out)
                self.assertEqual(plain.lines(), coloured.plain_lines())
        self.assertEqual(self.show("lighthouse", "keeper", NO_COLOR="").out, coloured.out)

    def test_a_terminal_without_a_size_is_asked_about_elsewhere(self):
        self.assertEqual(self.show("lighthouse", columns=0).out, self.show("lighthouse").out)
        narrow = self.show("lighthouse", columns=0, COLUMNS="40")
        self.assertEqual(narrow.out, self.show("lighthouse", columns=40).out)
        for given in ("", "0", "-5", "x", "99999999999"):
            shown = self.show("lighthouse", columns=0, COLUMNS=given)
            self.assertEqual(shown.out, self.show("lighthouse").out)

    def test_colours_and_cuts_are_for_terminals_alone(self):
        out = self.ctl("search", "lighthouse", TERM="xterm", COLUMNS="20").out

        wanted = {os.fsencode(f"{self.root}/{name}") for name in [*NAMES, "story.txt"]}
        self.assertEqual(set(out.splitlines()), wanted)
        for option in ("--json", "-0", "--count"):
            self.assertNotIn("\x1b", self.show(option, "lighthouse", columns=20).out)
        objects = self.show("--json", "story", columns=20).out
        self.assertIn(f'"path":"{self.root}/story.txt"', objects)

    def test_json_tells_where_the_words_stand(self):
        (hit,) = self.ctl("search", "--json", "keeper").objects()
        snippet = hit["snippet"].encode()
        self.assertEqual({snippet[start:end] for start, end in hit["snippet_marks"]}, {b"keeper"})
        self.assertEqual(hit["marks"], [])

        (hit,) = self.ctl("search", "--json", "story").objects()
        self.assertEqual([full_path(hit)[start:end] for start, end in hit["marks"]], [b"story"])

    def test_marks_count_bytes_of_the_path_on_disk(self):
        folder = os.fsencode(self.root) + b"/\xff folder \xfe"
        os.mkdir(folder)
        with open(folder + b"/marked \xfc tower \xfd.txt", "wb"):
            pass
        self.ctl("reindex", self.root)
        self.await_drained("alpha")

        (hit,) = self.ctl("search", "--json", "tower").objects()

        self.assertEqual([full_path(hit)[start:end] for start, end in hit["marks"]], [b"tower"])
        told = b" ".join(self.ctl("search", "--help").out.split())
        self.assertIn(b"of path_hex where that is given", told)

    def test_nothing_found_suggests_what_there_is(self):
        result = self.try_ctl("search", "lighthuose")
        self.assertEqual((result.code, result.out), (0, b""))
        self.assertEqual(result.err, b"Did you mean: lighthouse\n")

        shown = self.show("lighthuose")
        self.assertEqual(shown.out, "Did you mean: lighthouse\n")
        self.assertEqual(shown.err, b"")
        self.assertEqual(self.try_ctl("search", "--count", "lighthuose").out, b"0\n")
        self.assertEqual(self.ctl("search", "story").err, b"")

    def test_nothing_found_is_told_to_people(self):
        self.assertEqual(self.show("zzzzzz").out, "Nothing found.\n")
        self.assertEqual(self.show("zzzzzz", "--limit", "0").out, "")
        self.assertEqual(self.show("--count", "zzzzzz").out, "0\n")
        for arguments in (["zzzzzz"], ["--json", "zzzzzz"], ["-0", "zzzzzz"]):
            self.assertEqual(self.ctl("search", *arguments).out, b"")

    def test_a_word_that_looks_for_no_field_is_told(self):
        note = "There is no field 'type': 'type:pdf' was looked for as words.\n"
        self.assertEqual(self.show("lighthouse type:pdf").out, note)
        self.assertEqual(self.show("(zzz OR type:pdf) ext:txt -lighthouse").out, note)
        piped = self.try_ctl("search", "type:pdf")
        self.assertEqual((piped.code, piped.out, piped.err), (0, b"", note.encode()))
        for words in ("12:30 zzzzzz", "http://zzzzzz", "fs::zzzzzz", "c:zzzzzz", '"type:pdf"',
                      "zzzzzz -type:pdf"):
            with self.subTest(words=words):
                self.assertEqual(self.show(words).out, "Nothing found.\n")

    def test_an_operator_in_small_letters_is_told(self):
        for words, note in (
                ("zzzz or story", "'or' was looked for as a word: OR is written in capitals."),
                ("zzzz And story", "'And' was looked for as a word: all words are wanted anyway."),
                ("zzzz not story",
                 "'not' was looked for as a word: NOT is written in capitals, or as -word."),
                ("lighthuose or story", "'or' was looked for as a word: OR is written in capitals.")):
            with self.subTest(words=words):
                self.assertEqual(self.show(words).out, note + "\n")
                self.assertEqual(self.try_ctl("search", "--json", words).err, note.encode() + b"\n")


class MoreTest(IndexTest):
    NOTE = "There are more than these 20: --limit N or --limit all shows them, --offset N the next."

    def setUp(self):
        super().setUp()
        self.root = self.make_share(files=[f"tower {n}.txt" for n in range(25)])
        self.start()
        self.await_drained("alpha")

    def show(self, *arguments, columns=100):
        return Terminal([program("fileindexctl"), "search", *arguments], columns).plain_lines()

    def test_that_there_are_more_is_told_where_somebody_looks_on(self):
        self.assertEqual(self.show("tower")[20:], [self.NOTE])
        self.assertEqual(self.show("tower", "--offset", "4")[20:], [self.NOTE])
        for line in self.show("tower", columns=30):
            self.assertLess(width(line), 30, line)
        self.assertEqual(" ".join(self.show("tower", columns=30)[20:]), self.NOTE)

        into_file = f"{program('fileindexctl')} search tower >{namespace.RUN}/found"
        self.assertEqual(Terminal(["sh", "-c", into_file], 80, err_too=True).out, f"{self.NOTE}\n")
        with open(f"{namespace.RUN}/found", "rb") as file:
            self.assertEqual(len(file.readlines()), 20)

    def test_how_many_there_are_is_told_behind_the_last(self):
        note = "Nothing behind the first 25: there are 25 in all."
        self.assertEqual(self.show("tower", "--offset", "25"), [note])
        self.assertEqual(self.show("tower", "--offset", "25", "--limit", "5"), [note])
        self.assertEqual(self.show("tower 7", "--offset", "9"),
                         ["Nothing behind the first 9: there is 1 in all."])
        self.assertEqual(self.show("tower", "--offset", "25", "--limit", "0"), [])
        self.assertEqual(self.ctl("search", "tower", "--offset", "25").out, b"")
        self.assertEqual(self.show("--json", "tower", "--offset", "25"), [])

    def test_otherwise_nothing_is_told(self):
        for count, *arguments in ((20, "--offset", "5"), (20, "--limit", "20"),
                                  (3, "--limit", "3"), (25, "--limit", "all")):
            with self.subTest(arguments=arguments):
                lines = self.show("tower", *arguments)
                self.assertEqual(len(lines), count)
                self.assertTrue(all("tower" in line for line in lines), lines)
        self.assertEqual(self.show("tower", "--count"), ["25"])
        self.assertEqual(len(self.ctl("search", "tower").out.splitlines()), 20)

    def test_all_are_shown_where_that_is_asked_for(self):
        everything = self.ctl("search", "--limit", "all", "tower").out.splitlines()
        self.assertEqual(len(set(everything)), 25)
        rest = self.ctl("search", "--limit", "all", "--offset", "7", "tower").out.splitlines()
        self.assertEqual(rest, everything[7:])


class HostileNameTest(IndexTest):
    def test_no_name_can_move_the_cursor_or_turn_the_line(self):
        root = self.make_share(folders=())
        for name in (b"bell\x07 hit", b"escape\x1b[2J hit", "c1\x9b31m hit".encode(),
                     "turned\u202egpj.exe hit".encode(), b"bytes\xff\xfe hit", b"line\nbreak hit"):
            with open(os.fsencode(root) + b"/" + name, "wb"):
                pass
        self.start()
        self.ctl("folder", "add", root)
        self.await_drained("alpha")

        command = [program("fileindexctl"), "search", "hit"]
        shown = Terminal(command, 120, NO_COLOR="1")

        self.assertEqual(len(shown.lines()), 6)
        for line in shown.lines():
            self.assertTrue(line.isprintable(), ascii(line))
        for digits in ("\\x07", "\\x1b[2J", "\\xc2\\x9b31m", "\\u202egpj", "\\xff\\xfe", "\\x0a"):
            self.assertIn(digits, shown.out)


class OrderTest(IndexTest):
    SIZES = {"b.txt": 10, "a.txt": 30, "C.txt": 20, "d.txt": 20}

    def setUp(self):
        super().setUp()
        self.root = self.make_share(folders=())
        for at, (name, size) in enumerate(self.SIZES.items()):
            with open(f"{self.root}/{name}", "w", encoding="ascii") as file:
                file.write("x" * size)
            os.utime(f"{self.root}/{name}", (at, 1000 + at))
        self.start()
        self.ctl("folder", "add", self.root)
        self.await_drained("alpha")

    def names(self, *arguments):
        out = self.ctl("search", *arguments, "txt").out.decode()
        return [os.path.basename(line) for line in out.splitlines()]

    def test_orders(self):
        self.assertEqual(self.names("--sort", "modified"), ["d.txt", "C.txt", "a.txt", "b.txt"])
        self.assertEqual(self.names("--sort=size"), ["a.txt", "C.txt", "d.txt", "b.txt"])
        self.assertEqual(self.names("--sort", "name"), ["C.txt", "a.txt", "b.txt", "d.txt"])

    def test_the_other_way_round(self):
        for order, wanted in (("modified", ["b.txt", "a.txt", "C.txt", "d.txt"]),
                              ("size", ["b.txt", "C.txt", "d.txt", "a.txt"]),
                              ("name", ["d.txt", "b.txt", "a.txt", "C.txt"])):
            self.assertEqual(self.names("--sort", order, "--reverse"), wanted)
        self.assertEqual(sorted(self.names("--reverse")), sorted(self.names()))

    def test_pages(self):
        for order in ("name", "size", "modified"):
            with self.subTest(order=order):
                forwards = self.names("--sort", order)
                paged = [self.names("--sort", order, "--limit", "1", "--offset", str(at))
                         for at in range(5)]
                self.assertEqual(paged, [[name] for name in forwards] + [[]])

    def test_what_is_refused(self):
        for arguments in (("--sort", "date"), ("--sort", ""), ("--sort",), ("--sort=Name",),
                          ("--reverse=x",)):
            with self.subTest(arguments=arguments):
                self.ctl("search", "txt", *arguments, code=2)



if __name__ == "__main__":
    main()
