# SPDX-License-Identifier: GPL-2.0-or-later
"""search: options, output, and what is no question."""

import os

from harness import IndexTest, main, namespace
from harness.machine import full_path

ENTRIES = f"{namespace.STATE}/shares/alpha/index/entries.db"
FILES = [
    "holiday/beach.jpg",
    "holiday/beach.mp4",
    "holiday/plan.txt",
    "music/beach boys.mp3",
    "office/report beach.pdf",
    "office/budget.xyz",
]


class SearchTest(IndexTest):
    def setUp(self):
        super().setUp()
        self.root = self.make_share(files=FILES)
        self.other = self.make_share("beta", files=("beach.txt",))
        self.pid = self.start()
        for share in ("alpha", "beta"):
            self.await_drained(share)

    def hits(self, *arguments):
        """Paths below the data disk, in byte order."""
        paths = self.ctl("search", "-0", *arguments).out.split(b"\0")
        self.assertEqual(paths.pop(), b"")
        return sorted(os.path.relpath(os.fsdecode(path), namespace.DATA) for path in paths)

    def test_finds_by_name_in_all_shares(self):
        self.assertEqual(
            self.hits("beach"),
            [
                "alpha/holiday/beach.jpg",
                "alpha/holiday/beach.mp4",
                "alpha/music/beach boys.mp3",
                "alpha/office/report beach.pdf",
                "beta/beach.txt",
            ],
        )

    def test_a_share_that_holds_nothing_yet_may_be_named(self):
        self.make_share("gamma", folders=())

        self.assertEqual(self.hits("share:gamma", "beach"), [])
        self.assertEqual(self.hits("share:gamma,beta", "beach"), ["beta/beach.txt"])
        self.ctl("search", "share:delta", "beach", code=2)

    def test_a_share_whose_index_is_gone_is_named_beside_those_that_answer(self):
        self.stop(self.pid)
        index = os.path.dirname(ENTRIES)
        os.rename(index, f"{index}.away")

        answer = self.ctl("search", "beach", code=1)

        self.assertEqual(answer.out, f"{self.other}/beach.txt\n".encode())
        self.assertEqual(answer.err, b"fileindexctl: share alpha: there is no index\n")
        self.append("alpha", {"event": 0x10000, "path": self.root})  # which makes a new one
        self.assertEqual(self.hits("share:alpha", "beach"), [])

    def test_a_share_with_a_comma_in_its_name_is_named_in_quotes(self):
        self.make_share("alpha,old", folders=())

        self.assertEqual(self.hits('share:"alpha,old"', "beach"), [])
        self.assertEqual(self.hits('share:"alpha,old",beta', "beach"), ["beta/beach.txt"])
        self.ctl("search", "share:alpha,old", "beach", code=2)

    def test_several_words_are_joined(self):
        self.assertEqual(self.hits("beach", "boys"), ["alpha/music/beach boys.mp3"])
        self.assertEqual(self.hits("beach boys"), ["alpha/music/beach boys.mp3"])

    def test_options(self):
        self.assertEqual(self.hits("--share", "beta", "beach"), ["beta/beach.txt"])
        self.assertEqual(self.hits("--kind", "photo", "beach"), ["alpha/holiday/beach.jpg"])
        self.assertEqual(self.hits("beach", "--kind=video"), ["alpha/holiday/beach.mp4"])
        self.assertEqual(self.hits("--kind", "folder", "holiday"), ["alpha/holiday"])
        self.assertEqual(
            self.hits("--under", f"{self.root}/office", "beach"), ["alpha/office/report beach.pdf"]
        )

    def test_count_is_a_line_or_an_object(self):
        self.assertEqual(self.ctl("search", "--count", "beach").out, b"5\n")
        self.assertEqual(self.ctl("search", "--count", "--json", "beach").out, b'{"count":5}\n')
        # NUL ends paths, and a number is none.
        self.assertEqual(self.ctl("search", "--count", "-0", "beach").out, b"5\n")

    def test_limit_offset_and_count(self):
        everything = self.ctl("search", "beach").out.splitlines()
        self.assertEqual(len(everything), 5)

        self.assertEqual(
            self.ctl("search", "--limit", "2", "beach").out.splitlines(), everything[:2]
        )
        rest = self.ctl("search", "--offset", "2", "beach").out.splitlines()
        self.assertEqual(rest, everything[2:])
        self.assertEqual(self.ctl("search", "--limit", "0", "beach").out, b"")
        self.assertEqual(self.ctl("search", "--limit", "0", "--count", "beach").out, b"5\n")
        self.ctl("search", "--limit", "0", "beach OR", code=2)
        self.assertEqual(self.ctl("search", "--count", "beach").out, b"5\n")

    def test_twenty_hits_without_a_limit(self):
        self.make_files(self.root, *(f"many/number{n}.txt" for n in range(30)))
        self.ctl("reindex", self.root)
        self.await_drained("alpha")

        self.assertEqual(
            len(self.ctl("search", "--under", f"{self.root}/many", "txt").out.splitlines()), 20
        )
        self.assertEqual(
            self.ctl("search", "--count", "--under", f"{self.root}/many", "txt").out, b"30\n"
        )

    def test_json(self):
        hits = self.ctl("search", "--json", "budget").objects()

        (hit,) = hits
        path = f"{self.root}/office/budget.xyz"
        self.assertEqual(full_path(hit), path.encode())
        self.assertEqual((hit["share"], hit["kind"]), ("alpha", "other"))
        info = os.stat(path)
        self.assertEqual((hit["size"], hit["mtime"]), (info.st_size, int(info.st_mtime)))
        self.assertIsInstance(hit["score"], (int, float))
        self.assertIsInstance(hit["snippet"], str)

    def test_no_hits_are_no_failure(self):
        self.assertEqual(self.ctl("search", "nowhere").out, b"")
        self.assertEqual(self.ctl("search", "--count", "nowhere").out, b"0\n")

    def test_works_with_the_daemon_stopped(self):
        self.stop(self.daemon_pid())

        self.assertEqual(len(self.hits("beach")), 5)

    def test_minus_in_front_belongs_to_the_query(self):
        self.make_files(self.root, "minus x.txt", "minus y.txt", "two --json.txt")
        self.ctl("reindex", self.root)
        self.await_drained("alpha")

        for words in (("minus", "-x"), ("-x", "minus"), ("--", "minus", "-x"), ("minus -x",)):
            with self.subTest(words=words):
                self.assertEqual(self.hits(*words), ["alpha/minus y.txt"])
        self.assertEqual(self.hits("--", "two", '"--json"'), ["alpha/two --json.txt"])

    def test_what_is_refused(self):
        for arguments in (
            (),
            ("--kind", "film", "beach"),
            ("--limit", "x", "beach"),
            ("--limit", "-1", "beach"),
            ("--offset", "1.5", "beach"),
            ("--nope", "beach"),
            ("--json", "-0", "beach"),
            ("--share",),
            ("---x", "beach"),
            ("--!x", "beach"),
            ("-- x", "beach"),
            ("--\n", "beach"),
            ("---x beach",),
            ("size:<0", "beach"),
            ("size=10M", "beach"),
            ("beach", "name:(boys", "title:x)"),
            ("modified:2024-06..2024-01",),
            ("beach", f"under:{namespace.DATA}/nowhere"),
        ):
            with self.subTest(arguments=arguments):
                self.ctl("search", *arguments, code=2)
        self.ctl("search", "--share", "nope", "beach", code=1)
        self.ctl("search", "--under", "/nowhere", "beach", code=1)

    def test_an_option_that_is_none_is_named(self):
        for option in ("--nope", "---x", "-- x"):
            with self.subTest(option=option):
                told = self.ctl("search", "beach", option, "--count", code=2).err.decode()
                self.assertEqual(told, "fileindexctl: search: The following argument was not "
                                       f"expected: {option}\n")

    def test_who_asks_for_help_with_a_question_is_told_what_does(self):
        for words in (("-h",), ("-?",), ("-help",), ("--wait", "-h")):
            with self.subTest(words=words):
                told = self.ctl("search", *words, code=2).err.decode()
                self.assertRegex(told, "^fileindexctl: search: -.*; --help shows help\n$")
        self.assertNotIn(b"--help", self.ctl("search", "-x", code=2).err)
        self.assertEqual(self.hits("-h", "budget"), ["alpha/office/budget.xyz"])

    def test_an_option_with_an_equals_sign_takes_what_stands_behind_that(self):
        for line in (
            ("search", "--share=", "beach", "--count"),
            ("search", "--share", "", "beach", "--count"),
            ("search", "--limit=", "beach", "--count"),
            ("stats", "--share=", "--json"),
            ("info", self.root, "--query", "", "--json"),
            ("event", "alpha", "8", self.root, "--data=", "{}"),
            ("search", "--count=3", "beach"),
            ("search", "--count=0", "beach"),
            ("search", "--count=true", "beach"),
            ("search", "--reverse=false", "beach"),
            ("search", "--json=", "beach"),
            ("search", "--json=false", "beach"),
            ("folder", "list", "--json=false"),
        ):
            with self.subTest(line=line):
                told = self.ctl(*line, code=2)
                self.assertEqual(told.out, b"")
                self.assertRegex(told.err.decode(), r"^fileindexctl: [a-z ]+: --[a-z]+: [a-z ]+\n$")
        self.ctl("folder", "set", self.root, "--exclude", "--share=", "--exclude=--count=3")
        self.assertEqual(self.ctl("folder", "list", "--json").json()[0]["excludes"],
                         ["--share=", "--count=3"])

    def test_a_folder_that_is_not_there_is_told(self):
        for words in (("beach",), ("beach", "--count"), ("is:folder",)):
            with self.subTest(words=words):
                told = self.try_ctl("search", "--under", f"{self.root}/ofice", *words)
                self.assertEqual(told.code, 0)
                self.assertEqual(told.err.decode(),
                                 f"No share that is asked knows the folder {self.root}/ofice\n")
        for words in (("--limit", "0", "beach"), ("nowhere", "--under", f"{self.root}/office"),
                      ("nowhere", "--under", namespace.DATA), ("--under", self.root, "nowhere")):
            with self.subTest(words=words):
                self.assertEqual(self.ctl("search", *words).err, b"")

    def test_a_field_goes_for_all_in_the_brackets_behind_it(self):
        self.assertEqual(self.hits("name:(plan OR budget)"),
                         ["alpha/holiday/plan.txt", "alpha/office/budget.xyz"])
        self.assertEqual(self.hits("beach", "ext:(mp4 OR pdf)"),
                         ["alpha/holiday/beach.mp4", "alpha/office/report beach.pdf"])

    def test_a_long_question_that_makes_no_sense_is_not_repeated_whole(self):
        words = "über" * 700 + "\x1b "
        told = self.ctl("search", words + "size:x", code=2).err.decode()

        self.assertEqual(told.count("\n"), 1)
        self.assertTrue(told.startswith("fileindexctl: search: \u2026"), told)
        self.assertIn("überüber\\x1b size:x: 'x' is not a size", told)
        self.assertIn("(character 2808, at: x)", told)
        self.assertLess(len(told), 300)

    def test_a_slip_behind_a_field_or_in_a_phrase_is_told(self):
        for words, better in (("name:budgte", "name:budget"),
                              ('"report baech"', '"report beach"'),
                              ('kind:document name:(reprot beach)',
                               "kind:document name:(report beach)")):
            with self.subTest(words=words):
                self.assertEqual(self.try_ctl("search", words).err.decode(),
                                 f"Did you mean: {better}\n")
                self.assertNotEqual(self.hits(better), [])


class UnindexedTest(IndexTest):
    """A share that was added while no daemon ran: there is no index of it."""

    def setUp(self):
        super().setUp()
        self.root = f"{namespace.DATA}/gamma"
        os.makedirs(f"{self.root}/new")
        self.ctl("share", "add", "gamma", self.root)
        self.assertFalse(os.path.exists(f"{namespace.STATE}/shares/gamma/index"))

    def test_it_holds_nothing_and_its_folders_are_known_by_the_disk(self):
        for words in ("beach", "share:gamma beach", f"beach under:{self.root}",
                      f"beach under:{self.root}/new"):
            with self.subTest(words=words):
                self.assertEqual(self.ctl("search", words).out, b"")

    def test_a_folder_that_is_not_there_is_refused(self):
        told = self.ctl("search", f"beach under:{self.root}/nwe", code=2).err.decode()
        self.assertIn("know no such folder (character 7, at: under:", told)
        self.assertEqual(told.count("\n"), 1)


if __name__ == "__main__":
    main()
