# SPDX-License-Identifier: GPL-2.0-or-later
"""Exclude patterns: what they keep out never gets in, and leaves or comes back with them."""

import json
import os
import shutil

from harness import IndexTest, main

REINDEX = 0x10000
UPDATE = 0x20000
CREATE = 0x40
DELETE = 0x80
FILES = (
    "a.txt",
    "a.o",
    "src/b.c",
    "src/b.o",
    "src/keep.o",
    "src/build/out.txt",
    "src/build/deep/er/out.txt",
    "build",
)
ALL = sorted({*FILES, "src", "src/build", "src/build/deep", "src/build/deep/er"})


class ExcludesTest(IndexTest):
    def setUp(self):
        super().setUp()
        self.root = self.make_share(files=FILES, folders=())

    def below(self, *names):
        return [f"{self.root}/{name}" for name in names]

    def begin(self, *excludes, path=""):
        given = [text for pattern in excludes for text in ("--exclude", pattern)]
        self.ctl("folder", "add", os.path.join(self.root, path), *given)
        self.start()
        self.await_drained("alpha")

    def set(self, *options, path=""):
        self.ctl("folder", "set", os.path.join(self.root, path), *options)
        self.await_drained("alpha")

    def event(self, code, name):
        self.ctl("event", "alpha", str(code), f"{self.root}/{name}")
        self.await_drained("alpha")

    def check(self, *left_out):
        """All of the tree is in but these paths with all below them."""
        self.assert_index(self.root, left_out=self.below(*left_out))

    def listed(self):
        return {
            folder["path"]: folder["excludes"]
            for folder in self.ctl("folder", "list", "--json").json()
        }


class KeptOutTest(ExcludesTest):
    def test_what_is_excluded_never_appears(self):
        self.begin("*.o", "!keep.o", "build/")

        self.check("a.o", "src/b.o", "src/build")
        self.assertIn(f"{self.root}/src/keep.o".encode(), self.dump())
        self.assertIn(f"{self.root}/build".encode(), self.dump())  # a file of that name

    def test_events_of_what_is_excluded_add_nothing(self):
        self.begin("*.o", "build/", "/only-here")
        self.make_files(self.root, "new.o", "src/build/new.txt", "only-here/x", "src/only-here")
        os.mkdir(f"{self.root}/src/build/d")

        for name in ("new.o", "src/build/new.txt", "src/build/d", "src/build", "only-here"):
            for code in (CREATE, UPDATE, REINDEX, 0x2):
                self.event(code, name)
        self.event(CREATE, "src/only-here")

        self.check("a.o", "src/b.o", "src/keep.o", "new.o", "src/build", "only-here")
        self.assertIn(f"{self.root}/src/only-here".encode(), self.dump())

    def test_directories_are_taken_in_again_and_of_files_only_some(self):
        self.begin("*", "!*/", "!*.txt")

        left_out = ("a.o", "build", "src/b.c", "src/b.o", "src/keep.o")
        self.check(*left_out)
        for name in left_out:
            info = self.ctl("info", f"{self.root}/{name}", "--json").json()
            self.assertEqual((info["verdict"], info["pattern"]), ("excluded", "*"))
        info = self.ctl("info", f"{self.root}/src", "--json").json()
        self.assertEqual((info["verdict"], info["state"]), ("belongs", "current"))

    def test_a_walk_does_not_enter_what_is_excluded(self):
        # What cannot be read would be told of; what is not entered is not.
        deep = f"{self.root}/src/build" + "/d" * 50
        os.makedirs(deep)
        self.begin("build/")
        after = self.log.mark()

        self.event(REINDEX, "")

        walked = [line for line in self.logged(after) if "IndexDirAdd: " in line]
        self.assertEqual(len(walked), 2, walked)  # the folder itself, and src
        self.check("src/build")

    def test_a_file_that_becomes_a_directory_of_an_excluded_name_leaves(self):
        self.begin("build/")
        os.unlink(f"{self.root}/build")
        self.make_files(self.root, "build/x.txt")

        self.event(REINDEX, "build")  # as the notification service tells of a new directory

        self.check("build", "src/build")

    def test_moved_in_and_out_of_what_is_excluded(self):
        self.begin("build/")
        os.rename(f"{self.root}/src", f"{self.root}/src/../moved")
        os.mkdir(f"{self.root}/src")
        os.rename(f"{self.root}/moved", f"{self.root}/src/build")
        self.event(REINDEX, "src")
        self.check("src/build")

        os.rename(f"{self.root}/src/build", f"{self.root}/free")
        self.append(
            "alpha",
            {"event": 0x100, "path": f"{self.root}/free", "path_old": f"{self.root}/src/build"},
        )
        self.await_drained("alpha")

        self.check("free/build")


class ChangedTest(ExcludesTest):
    def test_set_takes_out_and_no_excludes_brings_back(self):
        self.begin()
        self.check()

        self.set("--exclude", "src/")
        self.check("src")
        self.assertEqual(self.listed(), {self.root: ["src/"]})

        self.set("--exclude", "*.o", "--exclude", "!src/keep.o")
        self.check("a.o", "src/b.o")
        self.assertEqual(self.listed(), {self.root: ["*.o", "!src/keep.o"]})

        self.set("--no-excludes")
        self.check()
        self.assertEqual(self.listed(), {self.root: []})

    def test_flags_and_excludes_at_once(self):
        self.begin()

        self.set("--document=on", "--exclude", "src/build")

        self.check("src/build")
        self.assertTrue(self.flags()[f"{self.root}/a.txt"])
        self.set("--document=off")
        self.assertEqual(self.listed(), {self.root: ["src/build"]})
        self.assertFalse(any(self.flags().values()))
        self.check("src/build")

    def test_only_a_changed_list_queues_a_reindex(self):
        self.ctl("folder", "add", self.root, "--exclude", "a", "--exclude", "b")
        os.unlink(self.queue("alpha"))
        for options in (
            ("--exclude", "a", "--exclude", "b"),
            ("--exclude", "b", "--exclude", "a"),
            ("--exclude", "b", "--exclude", "a", "--audio=on"),
            ("--no-excludes", "--audio=on"),
            ("--no-excludes",),
        ):
            self.ctl("folder", "set", self.root, *options)

        with open(self.queue("alpha"), encoding="utf-8") as file:
            events = [json.loads(line)["event"] for line in file]
        self.assertEqual(events, [REINDEX, UPDATE, REINDEX])


class NestedTest(ExcludesTest):
    def test_an_inner_folder_has_its_own_patterns_alone(self):
        self.begin("*.o", "/a.txt")
        self.make_files(self.root, "src/a.txt")
        self.ctl("folder", "add", f"{self.root}/src", "--exclude", "/b.c")
        self.await_drained("alpha")

        self.check("a.o", "a.txt", "src/b.c")

    def test_a_folder_inside_what_an_outer_one_excludes_is_indexed(self):
        self.begin("build/")
        self.ctl("folder", "add", f"{self.root}/src/build/deep", "--exclude", "*.log")
        self.await_drained("alpha")
        self.make_files(self.root, "src/build/deep/x.log")
        without_inner = ["a.txt", "a.o", "build", "src", "src/b.c", "src/b.o", "src/keep.o"]
        inner = ["src/build/deep", "src/build/deep/er", "src/build/deep/er/out.txt"]

        for name in ("", "src", "src/build", "src/build/deep"):
            self.event(REINDEX, name)
            self.event(UPDATE, name)
            self.assert_paths(self.root, without_inner + inner)
            self.assertEqual(self.ctl("verify", "alpha").out, b"")

        self.ctl("folder", "remove", f"{self.root}/src/build/deep")
        self.await_drained("alpha")
        self.assert_paths(self.root, without_inner)
        self.assertEqual(self.ctl("verify", "alpha").out, b"")

    def test_an_inner_folder_that_goes_is_updated_like_any(self):
        self.begin("build/")
        self.ctl("folder", "add", f"{self.root}/src/build/deep")
        self.await_drained("alpha")
        self.ctl("pause")

        self.ctl("folder", "remove", f"{self.root}/src/build/deep")

        with open(self.queue("alpha"), encoding="utf-8") as file:
            (line,) = file
        every = dict.fromkeys(("document", "audio", "video", "photo"), True)
        self.assertEqual(
            json.loads(line),
            {"event": UPDATE, "path": f"{self.root}/src/build/deep", "data": every},
        )

    def test_an_inner_folder_that_goes_leaves_the_outer_ones_patterns(self):
        self.begin("*.o")
        self.ctl("folder", "add", f"{self.root}/src", "--exclude", "build/")
        self.await_drained("alpha")
        self.check("a.o", "src/build")

        self.ctl("folder", "remove", f"{self.root}/src")

        self.await_drained("alpha")
        self.check("a.o", "src/b.o", "src/keep.o")

    def test_a_name_that_is_excluded_does_not_keep_its_folder_out(self):
        self.begin("src", path="src")

        self.assert_index(self.root, folders=[f"{self.root}/src"])

    def test_what_is_gone_leaves_with_an_update_behind_which_it_is_deleted(self):
        self.begin("build/")
        self.ctl("pause")
        shutil.rmtree(f"{self.root}/src")
        self.ctl("event", "alpha", str(UPDATE), f"{self.root}/src", "--data", '{"audio":true}')
        self.ctl("event", "alpha", str(DELETE), f"{self.root}/src")
        self.ctl("resume")
        self.await_drained("alpha")

        self.assertEqual(self.ctl("verify", "alpha").out, b"")
        self.assertNotIn(f"{self.root}/src".encode(), self.dump())

    def test_what_is_gone_leaves_while_an_inner_folder_stays(self):
        self.begin("build/")
        self.ctl("folder", "add", f"{self.root}/src/build/deep")
        self.await_drained("alpha")

        shutil.rmtree(f"{self.root}/src/build/deep/er")
        self.event(REINDEX, "src")

        self.assertEqual(self.ctl("verify", "alpha").out, b"")
        self.assertNotIn(f"{self.root}/src/build/deep/er".encode(), self.dump())


class PatternsTest(ExcludesTest):
    def test_wrong_patterns_are_refused_by_name(self):
        self.ctl("folder", "add", self.root)
        for pattern, named in (
            ("", b"--exclude"),
            (" ", b'" "'),
            ("/", b'"/"'),
            ("!", b'"!"'),
            ("a[b", b"a[b"),
            ("a\\", b"a\\"),
            ("a\nb", b"newline"),
            ("x" * 4097, b"4096"),
        ):
            with self.subTest(pattern=pattern[:10]):
                for command in ("add", "set"):
                    result = self.ctl(
                        "folder", command, self.root, f"--exclude={pattern}", code=2
                    )
                    self.assertIn(named, result.err)
        self.ctl("folder", "set", self.root, "--exclude", code=2)
        self.ctl("folder", "set", self.root, "--exclude", "a", "--no-excludes", code=2)
        self.ctl("folder", "add", f"{self.root}/src", "--no-excludes", code=2)

        self.assertEqual(self.listed(), {self.root: []})

    def test_at_most_a_thousand(self):
        many = [f"--exclude=x{number}" for number in range(1001)]

        self.ctl("folder", "add", self.root, *many, code=2)
        self.ctl("folder", "add", self.root, *many[:1000])

        self.assertEqual(len(self.listed()[self.root]), 1000)

    def test_patterns_are_taken_as_they_are(self):
        patterns = ["[a,b]", "{}", "%%", "-x", "a,b", "*", "!*", "#x", "a b", "~", "\\ "]

        self.ctl("folder", "add", self.root, *[f"--exclude={pattern}" for pattern in patterns])

        self.assertEqual(self.listed(), {self.root: patterns})
        plain = self.ctl("folder", "list").out
        for pattern in patterns:
            self.assertIn(f"\texclude {pattern}".encode(), plain)

    def test_bytes_that_are_no_text(self):
        name = os.fsencode(self.root) + b"/\xe4.o"
        with open(name, "wb"):
            pass
        self.ctl("folder", "add", self.root, b"--exclude=\xe4.*")
        self.start()
        self.await_drained("alpha")

        self.assertNotIn(name, self.dump())
        self.assertEqual(self.ctl("verify", "alpha").out, b"")
        (folder,) = self.ctl("folder", "list", "--json").json()
        self.assertEqual(folder["excludes"], ["\ufffd.*"])
        self.assertEqual(bytes.fromhex(folder["excludes_hex"][0]), b"\xe4.*")


if __name__ == "__main__":
    main()
