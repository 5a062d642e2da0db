# SPDX-License-Identifier: GPL-2.0-or-later
"""Help: all commands are listed, and each has an example that the command line takes."""

import os
import re
import shlex

from ctl.completion_test import commands, languages
from ctl.follow_test import Follower
from harness import IndexTest, main, namespace

README = os.path.join(os.path.dirname(__file__), "../../../README.md")
EXAMPLE = re.compile(r"\nExample:\n((?:  fileindexctl [^\n]+\n)+)\Z")


class HelpTest(IndexTest):
    def setUp(self):
        super().setUp()
        with open(f"{namespace.RUN}/file", "w", encoding="ascii"):
            pass
        # A state that cannot be: what the command line takes goes no further than that.
        self.state = {"FILEINDEXD_STATE_DIR": f"{namespace.RUN}/file/state"}

    def examples(self, *command):
        """Arguments of each example in a command's help."""
        text = self.ctl(*command, "--help").out.decode()
        found = EXAMPLE.search(text)
        self.assertIsNotNone(found, text)
        return [shlex.split(line)[1:] for line in found[1].splitlines()]

    def test_commands_are_listed(self):
        found = commands(self.ctl)

        for wanted in (("share", "add"), ("folder", "set"), ("search",), ("stats",), ("verify",)):
            self.assertIn(wanted, found)
        self.assertEqual(len(set(found)), len(found))
        self.assertEqual(commands(self.ctl, "worker"), [("drop",), ("revive",)])

    def test_each_command_has_an_example_that_is_accepted(self):
        for command in commands(self.ctl):
            for example in self.examples(*command):
                with self.subTest(example=example):
                    self.assertEqual(tuple(example[: len(command)]), command)
                    result = self.try_ctl(*example, **self.state)
                    self.assertIn(result.code, (0, 1, 3), result)

    def make_machine(self):
        """The folders that the examples name, and a daemon."""
        namespace.mount("tmpfs", "/srv", "tmpfs")
        self.addCleanup(namespace.unmount, "/srv", namespace.MNT_DETACH)
        for name in ("letters", "photos", "projects"):
            self.make_files(f"/srv/{name}", "2024/", "old/", "annual report.txt", "new.jpg")
        self.start()

    def run_examples(self, command):
        for example in self.examples(*command):
            with self.subTest(example=example):
                if "--follow" in example:
                    follower = Follower(*example[2:])
                    follower.await_shown(lambda received: b"share projects\n" in received)
                    self.assertEqual(follower.stop(), (0, b""))
                else:
                    self.ctl(*example)

    def test_on_a_machine_like_theirs_each_example_succeeds(self):
        left = commands(self.ctl)
        self.make_machine()
        for command in (("share", "add"), ("folder", "add")):
            self.run_examples(command)
            for name in ("letters", "photos", "projects"):
                if command == ("folder", "add"):
                    self.ctl(*command, f"/srv/{name}/old")
                elif name != "photos":
                    self.ctl(*command, name, f"/srv/{name}")
            left.remove(command)
        left.remove(("share", "remove"))
        self.await_drained("projects")

        for command in left:
            self.run_examples(command)
        self.run_examples(("share", "remove"))

        shares = self.ctl("share", "list", "--json").json()
        self.assertEqual([share["name"] for share in shares], ["letters", "projects"])

    def test_what_is_no_option_is_refused_in_every_example(self):
        for command in commands(self.ctl):
            for example in self.examples(*command):
                with self.subTest(example=example):
                    self.ctl(*example, "--nope", code=2, **self.state)

    def test_help_needs_no_state(self):
        for command in commands(self.ctl):
            self.assertNotEqual(self.ctl(*command, "--help", **self.state).out, b"")

    def test_no_line_is_wider_than_a_usual_terminal(self):
        for command in [(), ("share",), ("folder",), ("worker",), *commands(self.ctl)]:
            for line in self.ctl(*command, "--help").out.decode().splitlines():
                with self.subTest(command=command, line=line):
                    self.assertLess(len(line), 80)

    def test_search_tells_how_many_hits_there_are_without_a_limit_and_with_none(self):
        told = " ".join(self.ctl("search", "--help").out.decode().split())

        self.assertIn("--limit N At most so many hits, or 'all'; 20 if not given; with 0 the "
                      "question is only checked", told)

    def test_every_language_is_told(self):
        known = languages(self.ctl)
        self.assertGreater(len(known), 2)
        self.assertIn(", ".join(known),
                      " ".join(self.ctl("share", "set", "--help").out.decode().split()))

        with open(README, encoding="utf-8") as file:
            option = file.read().partition("--language L` (")[2].partition(")")[0].lower()
        for language in set(known) - {"porter"}:  # English, as it was cut once
            self.assertIn(language, option)

    def test_examples_differ_from_each_other(self):
        found = [tuple(e) for command in commands(self.ctl) for e in self.examples(*command)]

        self.assertEqual(len(set(found)), len(found))


if __name__ == "__main__":
    main()
