# SPDX-License-Identifier: GPL-2.0-or-later
"""info --terms and --query: the words of a content, and why a question finds it or not."""

import os
import sqlite3

from harness import main
from search.library import ContentsTest


class InfoQuestionTest(ContentsTest):
    def setUp(self):
        super().setUp()
        self.root = self.make_share(folders=())
        self.path = f"{self.root}/Report.txt"
        self.write(self.path, "The lighthouses shone. Lighthouses, Grüße, foo_bar 東京")
        self.write(f"{self.root}/other.bin", "x")
        self.start()
        self.ctl("folder", "add", self.root, "--document")
        self.await_hits("shone", ["Report.txt"])

    def ask(self, query, path=None):
        return self.ctl("info", path or self.path, "--query", query, "--json").json()["query"]


class TermsTest(InfoQuestionTest):
    def test_words_stand_as_the_index_has_them(self):
        terms = self.ctl("info", self.path, "--terms", "--json").json()["terms"]

        counts = {one["term"]: one["count"] for one in terms}
        self.assertEqual(counts["lighthouses"], 2)
        self.assertEqual(counts["shone"], 1)
        for term in ("the", "foo_bar", "foo", "bar", "東京"):
            self.assertIn(term, counts)
        self.assertTrue(any(term.startswith("gru") for term in counts), counts)
        self.assertEqual([one["term"].encode() for one in terms],
                         sorted(one["term"].encode() for one in terms))

    def test_every_word_is_found(self):
        terms = self.ctl("info", self.path, "--terms", "--json").json()["terms"]

        for word in [one["term"] for one in terms if one["term"].isalpha()]:
            with self.subTest(word=word):
                self.assertEqual(self.hits(word), ["Report.txt"])

    def test_for_people_one_a_line(self):
        lines = self.ctl("info", self.path, "--terms").out.decode().splitlines()

        self.assertIn("  term          lighthouses (2)", lines)
        self.assertIn("path            " + self.path, lines)

    def test_without_content_there_are_none(self):
        for path in (f"{self.root}/none.txt", self.root, "/nowhere/at/all"):
            with self.subTest(path=path):
                self.assertEqual(self.ctl("info", path, "--terms", "--json").json()["terms"], [])
                self.assertIn(b"  terms         none\n", self.ctl("info", path, "--terms").out)
        self.assertNotIn("terms", self.ctl("info", self.path, "--json").json())


class ReadingTest(InfoQuestionTest):
    def test_it_tells_what_read_the_content(self):
        stored = self.ctl("info", self.path, "--json").json()["stored"]

        self.assertEqual((stored["state"], stored["kind"], stored["tries"]),
                         ("done", "document", 0))
        self.assertGreaterEqual(stored["extractor"], 1)
        plain = self.ctl("info", self.path).out.decode()
        self.assertIn("content state", plain)
        self.assertRegex(plain, rf"content read by +version {stored['extractor']}\n")

    def test_what_is_found_to_be_of_an_unwanted_kind_says_so(self):
        path = f"{self.root}/plain"
        self.write(path, "a text without an ending")
        self.ctl("folder", "set", self.root, "--document=off", "--photo=on")
        self.ctl("reindex", self.root)

        def is_read():
            stored = self.ctl("info", path, "--json").json().get("stored")
            return stored is not None and stored["state"] == "done"

        self.await_contents(is_read)
        stored = self.ctl("info", path, "--json").json()["stored"]
        self.assertEqual((stored["kind"], stored["extractor"]), ("document", 0))
        self.assertEqual(stored["reason"], "nothing is kept of a kind that is not wanted")
        self.assertIn(b"done: nothing is kept of a kind", self.ctl("info", path).out)

    def stop_all(self):
        service = self.service_pid()
        self.stop(self.daemon_pid())
        self.await_exit(service)

    def test_what_is_not_read_yet_waits(self):
        self.stop_all()
        with sqlite3.connect(self.contents()) as contents:
            contents.execute("DELETE FROM files")
        contents.close()

        stored = self.ctl("info", self.path, "--json").json()["stored"]
        self.assertEqual((stored["state"], stored["extractor"]), ("waiting", 0))
        self.assertRegex(self.ctl("info", self.path).out, rb"\n  content state +waiting\n")
        self.assertIsNone(self.ctl("info", self.root, "--json").json()["stored"])

        for name in os.listdir(os.path.dirname(self.contents())):
            os.unlink(f"{os.path.dirname(self.contents())}/{name}")
        stored = self.ctl("info", self.path, "--json").json()["stored"]
        self.assertEqual(stored["state"], "waiting")

    def test_contents_that_cannot_be_read_are_named(self):
        self.stop_all()
        self.assertEqual(self.ctl("info", self.path, "--json").json()["content_problem"], "")
        with sqlite3.connect(self.contents()) as contents:
            contents.execute("UPDATE texts SET packed = x'00'")
        contents.close()

        self.check_problem("^the index is damaged$")
        for name in os.listdir(os.path.dirname(self.contents())):
            os.unlink(f"{os.path.dirname(self.contents())}/{name}")
        self.write(self.contents(), "no database at all")
        self.check_problem(".")

    def check_problem(self, pattern):
        answer = self.ctl("info", self.path, "--json").json()
        self.assertRegex(answer["content_problem"], pattern)
        self.assertIsNone(answer["stored"])
        self.assertRegex(self.ctl("info", self.path).out.decode(),
                         rf"\n  content problem +{answer['content_problem']}\n")


class QueryTest(InfoQuestionTest):
    def test_each_part_is_told(self):
        answer = self.ask("report lighthouses")

        self.assertTrue(answer["matches"])
        self.assertEqual(answer["text"], "report lighthouses")
        self.assertEqual([(one["part"], one["matches"], one["where"])
                          for one in answer["reasons"]],
                         [("report", True, "name"), ("lighthouses", True, "text")])

    def test_what_is_missing_is_told(self):
        answer = self.ask("report submarine")

        self.assertFalse(answer["matches"])
        self.assertEqual([one["matches"] for one in answer["reasons"]], [True, False])
        plain = self.ctl("info", self.path, "--query", "report submarine").out.decode()
        self.assertIn("answer          not found\n", plain)
        self.assertIn("  matches       report (name)\n", plain)
        self.assertRegex(plain, r"  no match      submarine\b")

    def test_it_agrees_with_the_search(self):
        for query in ("report", "shone", "report shone", "lighthouse", "nothing", "other",
                      "bar report nothing", "Grüße", "東京"):
            with self.subTest(query=query):
                self.assertEqual(self.ask(query)["matches"],
                                 "Report.txt" in self.hits(query))

    def test_what_is_not_in_the_index_is_never_found(self):
        for path in (f"{self.root}/none.txt", "/nowhere"):
            answer = self.ask("report", path)
            self.assertEqual((answer["matches"], answer["reasons"]), (False, []))
            self.assertIn("not in the index", answer["problem"])
        self.assertEqual(self.ask("report")["problem"], "")

    def test_a_question_may_begin_with_a_minus(self):
        self.assertEqual(self.ask("-draft report")["text"], "-draft report")

    def test_a_question_may_name_shares(self):
        self.make_share("beta", folders=())

        self.assertTrue(self.ask("share:alpha report")["matches"])
        self.assertFalse(self.ask("share:beta report")["matches"])
        self.ctl("info", self.path, "--query", "share:nope report", code=2)

    def test_what_is_no_question_is_refused(self):
        self.ctl("info", self.path, "--query", "", code=2)
        self.ctl("info", self.path, "--query", "  ", code=2)
        self.ctl("info", self.path, "--query", code=2)
        self.ctl("info", "/nowhere", "--query", " ", code=2)


if __name__ == "__main__":
    main()
