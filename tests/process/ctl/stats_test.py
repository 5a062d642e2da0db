# SPDX-License-Identifier: GPL-2.0-or-later
"""stats: numbers and bytes, against what the disk holds."""

import os
import shutil
import sqlite3
import time

from ctl.terminal import Terminal, width
from harness import IndexTest, main, namespace
from harness.machine import full_path, program
from search.library import ContentsTest

DAY = 24 * 60 * 60


def spoil(database):
    """No database any more; its log would bring the first page back."""
    for ending in ("-wal", "-shm"):
        if os.path.exists(database + ending):
            os.unlink(database + ending)
    with open(database, "wb") as file:
        file.write(b"no database at all")


class StatsTest(IndexTest):
    def make(self, share, **sizes):
        """A share with files of these sizes; "__" in a name is a slash, "_" a dot."""
        root = self.make_share(share, folders=())
        for name, size in sizes.items():
            path = f"{root}/{name.replace('__', '/').replace('_', '.')}"
            os.makedirs(os.path.dirname(path), exist_ok=True)
            with open(path, "wb") as file:
                file.truncate(size)
        return root

    def index(self, *roots):
        self.start()
        for root in roots:
            self.ctl("folder", "add", root)
            self.await_drained(os.path.basename(root))

    def stats(self, *arguments):
        return self.ctl("stats", *arguments, "--json").json()

    def groups(self, by, *arguments):
        """(name, entries, bytes) in the order in which they are told."""
        answer = self.stats("--by", by, *arguments)
        self.assertEqual(answer["by"], by)
        key = "path" if by == "folder" else "name"
        return [(one[key], one["entries"], one["bytes"]) for one in answer["groups"]]


class CountsTest(StatsTest):
    def setUp(self):
        super().setUp()
        self.root = self.make("alpha", a__one_pdf=1000, a__b__two_PDF=500, a__song_mp3=3000,
                              c__three_txt=700, _hidden=5, plain=40)
        self.other = self.make("beta", a__x_txt=10000)
        os.symlink("plain", f"{self.root}/link")
        os.mkdir(f"{self.root}/empty")

    def test_totals_are_those_of_the_disk(self):
        self.index(self.root, self.other)

        answer = self.stats()

        self.assertEqual(
            answer["shares"],
            [{"name": "beta", "files": 1, "folders": 2, "links": 0, "bytes": 10000},
             {"name": "alpha", "files": 6, "folders": 5, "links": 1, "bytes": 5250}],
        )
        self.assertEqual(answer["total"],
                         {"files": 7, "folders": 7, "links": 1, "bytes": 15250})
        self.assertEqual(self.ctl("stats").out, b"10000\t1\t2\t0\tbeta\n5250\t6\t5\t1\talpha\n")

    def test_groups(self):
        self.index(self.root, self.other)
        alpha = ("--share", "alpha")

        self.assertEqual(self.groups("kind", *alpha),
                         [("audio", 1, 3000), ("document", 3, 2200), ("other", 3, 50),
                          ("folder", 5, 0)])
        self.assertEqual(self.groups("ext", *alpha),
                         [("mp3", 1, 3000), ("pdf", 2, 1500), ("txt", 1, 700), ("", 3, 50)])
        self.assertEqual(self.groups("ext")[0], ("txt", 2, 10700))
        self.assertEqual(self.groups("folder", *alpha),
                         [(f"{self.root}/a", 5, 4500), (f"{self.root}/c", 2, 700),
                          (self.root, 4, 50), (f"{self.root}/empty", 1, 0)])
        self.assertEqual(self.groups("folder")[0], (f"{self.other}/a", 2, 10000))

    def test_owners(self):
        os.chown(f"{self.root}/a/song.mp3", 12345, -1)
        self.index(self.root)

        answer = self.stats("--by", "owner")["groups"]

        self.assertEqual([(one["owner"], one["name"], one["bytes"]) for one in answer],
                         [(12345, "12345", 3000), (0, "root", 2250)])

    def test_ages(self):
        now = time.time()
        for name, days in (("a/one.pdf", 3), ("a/b/two.PDF", 400), ("a/song.mp3", 20000),
                           ("c/three.txt", -30)):
            os.utime(f"{self.root}/{name}", (now, now - days * DAY))
        self.index(self.root)

        self.assertEqual(self.groups("age"),
                         [("older", 1, 3000), ("week", 1, 1000), ("future", 1, 700),
                          ("2 years", 1, 500), ("day", 3, 50)])

    def test_a_file_with_several_names_takes_its_room_once(self):
        os.link(f"{self.root}/a/song.mp3", f"{self.root}/c/again.mp3")
        os.link(f"{self.root}/a/song.mp3", f"{self.root}/a/Again.ogg")
        self.index(self.root)

        self.assertEqual(self.stats()["total"]["bytes"], 5250)
        self.assertEqual(self.stats()["total"]["files"], 8)
        # At its first path: a/Again.ogg.
        self.assertEqual(self.groups("ext")[:2], [("ogg", 1, 3000), ("pdf", 2, 1500)])
        self.assertIn(("mp3", 2, 0), self.groups("ext"))
        self.assertEqual([one["path"] for one in self.stats("--largest", "2")["largest"]],
                         [f"{self.root}/a/Again.ogg", f"{self.root}/a/one.pdf"])

    def test_a_file_with_names_in_two_shares_counts_in_each(self):
        os.link(f"{self.root}/a/song.mp3", f"{self.other}/song.mp3")
        self.index(self.root, self.other)

        self.assertEqual(self.stats()["total"]["bytes"], 5250 + 10000 + 3000)
        told = b" ".join(self.ctl("stats", "--help").out.split())
        self.assertIn(b"counts in each, and so more than once", told)

    def test_largest(self):
        self.index(self.root, self.other)

        largest = self.stats("--largest", "3")["largest"]

        self.assertEqual([(one["share"], os.path.basename(one["path"]), one["size"])
                          for one in largest],
                         [("beta", "x.txt", 10000), ("alpha", "song.mp3", 3000),
                          ("alpha", "one.pdf", 1000)])
        self.assertEqual(largest[0]["mtime"], int(os.stat(f"{self.other}/a/x.txt").st_mtime))
        lines = self.ctl("stats", "--largest", "100").out.decode().splitlines()
        self.assertEqual(len(lines), 7)
        self.assertRegex(lines[0], r"\A10000\t\d{4}-[^\t]+\t.*/x\.txt\Z")

    def test_growth_counts_what_was_added(self):
        self.index(self.root, self.other)

        answer = self.stats("--growth", "1d", "--share", "alpha")["growth"]
        self.assertEqual([(one["path"], one["entries"], one["bytes"])
                          for one in answer["folders"]], self.groups("folder", "--share", "alpha"))
        self.assertLessEqual(abs(answer["since"] - (time.time() - DAY)), 600)
        self.assertEqual(self.stats("--growth", "0s")["growth"]["folders"], [])

    def test_growth_leaves_out_what_is_older(self):
        self.index(self.root)
        self.stop(self.daemon_pid())
        database = sqlite3.connect(f"{namespace.STATE}/shares/alpha/index/entries.db")
        old = int((time.time() - 3 * DAY) * 1e9)
        for column, path in (("birth_time", "a/song.mp3"), ("birth_time", "c/three.txt"),
                             ("first_seen", "a/one.pdf")):
            database.execute(f"UPDATE entries SET {column} = ? WHERE path = ?",
                             (old, os.fsencode(f"{self.root}/{path}")))
        database.commit()
        database.close()

        def grown(duration):
            folders = self.stats("--growth", duration)["growth"]["folders"]
            return {one["path"]: (one["entries"], one["bytes"]) for one in folders}

        root = self.root
        self.assertEqual(grown("2d"), {f"{root}/a": (4, 1500), f"{root}/c": (1, 0),
                                       root: (4, 50), f"{root}/empty": (1, 0)})
        self.assertEqual(grown("4d")[f"{root}/a"], (5, 4500))
        self.assertEqual(grown("1w"), grown("7d"))
        self.assertEqual(grown("1d24h"), grown("2d"))

    def test_a_disk_that_is_gone_is_not_missed(self):
        self.index(self.root)
        before = self.stats("--by", "folder")

        os.rename(self.root, f"{self.root}.away")

        self.assertEqual(self.stats("--by", "folder"), before)

    def test_on_a_screen_bytes_are_short_and_nothing_is_too_wide(self):
        self.index(self.root, self.other)
        command = [program("fileindexctl"), "stats", "--by", "folder", "--largest", "9",
                   "--duplicates"]

        for columns in (2, 5, 10, 20, 31, 40, 80):
            with self.subTest(columns=columns):
                shown = Terminal(command, columns)
                self.assertEqual((shown.code, shown.err), (0, b""))
                for line in [*shown.lines(), *Terminal(command[:2], columns).lines()]:
                    self.assertLess(width(line), columns, line)
        self.assertRegex(shown.lines()[0], r"\ABYTES  ENTRIES  FOLDER\Z")
        self.assertIn(f" 9.8K        2  {self.other}/a", shown.lines())

    def test_names_that_are_no_text(self):
        folder = os.fsencode(self.root) + b"/\xff\n"
        os.mkdir(folder)
        with open(folder + b"/big.\xfe", "wb") as file:
            file.truncate(99999)
        self.index(self.root)

        (group,) = self.stats("--by", "folder")["groups"][:1]
        self.assertEqual((full_path(group), group["bytes"]), (folder, 99999))
        self.assertTrue(self.ctl("stats", "--by", "folder").out.startswith(
            b"99999\t2\t" + os.fsencode(self.root) + b"/\xff\\x0a\n"))
        (group,) = self.stats("--by", "ext")["groups"][:1]
        self.assertEqual(group["name_hex"], "fe")


class TroubleTest(StatsTest):
    def test_a_broken_share_is_named_and_the_others_counted(self):
        roots = [self.make(name, one_txt=100) for name in ("alpha", "beta")]
        self.index(*roots)
        self.stop(self.daemon_pid())
        spoil(f"{namespace.STATE}/shares/alpha/index/entries.db")

        for arguments in ((), ("--by", "kind"), ("--largest", "3"), ("--growth", "1d")):
            with self.subTest(arguments=arguments):
                result = self.ctl("stats", *arguments, code=1)
                self.assertIn(b"alpha", result.err)
                self.assertTrue(result.out.startswith(b"100\t"), result.out)
                self.assertNotIn(b"alpha", result.out)

    def test_a_share_without_an_index_is_empty(self):
        self.make_share(folders=())

        self.assertEqual(self.stats()["shares"], [])
        self.assertEqual(self.ctl("stats").out, b"")

    def test_what_is_refused(self):
        for arguments in (("--by", "size"), ("--by",), ("--by", ""), ("--largest", "0"),
                          ("--largest", "-1"), ("--largest", "x"), ("--largest", "1000000000"),
                          ("--growth", "7"), ("--growth", "7x"), ("--growth", "-1d"),
                          ("--growth", ""), ("--duplicates=x",), ("extra",), ("--nope",)):
            with self.subTest(arguments=arguments):
                self.ctl("stats", *arguments, code=2)
        self.ctl("stats", "--share", "nope", code=1)


class DuplicatesTest(ContentsTest):
    def setUp(self):
        super().setUp()
        self.roots = [self.make_share(name, folders=()) for name in ("alpha", "beta")]
        self.start()

    def fill(self, at, **texts):
        for name, text in texts.items():
            self.write(f"{self.roots[at]}/{name}.txt", text)

    def index(self, at, done):
        self.ctl("folder", "add", self.roots[at], "--document")
        self.await_counts(os.path.basename(self.roots[at]), done=done, waiting=0)

    def sets(self, *arguments):
        answer = self.ctl("stats", "--duplicates", "--json", *arguments).json()["duplicates"]
        self.assertEqual(answer["spare"], sum(one["spare"] for one in answer["sets"]))
        self.assertEqual(answer["files"], sum(one["files"] for one in answer["sets"]))
        self.assertEqual(answer["set_count"], len(answer["sets"]))
        return [(one["size"], one["spare"],
                 [os.path.relpath(place["path"], namespace.DATA) for place in one["places"]])
                for one in answer["sets"]]

    def test_alike_files_in_one_share_and_across_shares(self):
        self.fill(0, one="lighthouse" * 10, two="lighthouse" * 10, three="harbour" * 10,
                  four="lighthousE" * 10)
        self.fill(1, five="harbour" * 10, six="lighthouse" * 10)
        self.index(0, done=4)
        self.index(1, done=2)

        self.assertEqual(self.sets("--share", "beta"), [])
        self.assertEqual(self.sets("--share", "alpha"),
                         [(100, 100, ["alpha/one.txt", "alpha/two.txt"])])
        answer = [(size, spare, sorted(places)) for size, spare, places in self.sets()]
        self.assertEqual(answer,
                         [(100, 200, ["alpha/one.txt", "alpha/two.txt", "beta/six.txt"]),
                          (70, 70, ["alpha/three.txt", "beta/five.txt"])])

    def test_another_name_is_no_duplicate(self):
        self.fill(0, one="lighthouse", two="harbour")
        os.link(f"{self.roots[0]}/one.txt", f"{self.roots[0]}/twin.txt")
        os.link(f"{self.roots[0]}/two.txt", f"{self.roots[1]}/twin.txt")
        self.index(0, done=2)
        self.index(1, done=1)

        self.assertEqual(self.sets(), [])

    def test_what_is_gone_or_changed_is_none_any_more(self):
        self.fill(0, one="lighthouse", two="lighthouse", three="lighthouse")
        self.index(0, done=3)
        self.assertEqual(len(self.sets()[0][2]), 3)

        os.unlink(f"{self.roots[0]}/one.txt")
        self.fill(0, two="another thing altogether")
        self.ctl("reindex", self.roots[0])
        self.await_drained("alpha")

        self.assertEqual(self.sets(), [])

    def test_empty_files_and_files_without_content_are_left_out(self):
        self.fill(0, one="", two="")
        for name in ("a.bin", "b.bin"):
            shutil.copy(program("fileindexctl"), f"{self.roots[1]}/{name}")
        self.index(0, done=2)
        self.ctl("folder", "add", self.roots[1])
        self.await_drained("beta")

        self.assertEqual(self.sets(), [])

    def test_contents_that_cannot_be_read_are_named(self):
        self.fill(0, one="lighthouse", two="lighthouse")
        self.fill(1, three="harbour", four="harbour")
        self.index(0, done=2)
        self.index(1, done=2)
        service = self.service_pid()
        self.stop(self.daemon_pid())
        self.await_exit(service)
        spoil(self.contents("alpha"))

        result = self.ctl("stats", "--duplicates", code=1)
        self.assertIn(b"alpha: contents", result.err)
        self.assertIn(b"beta/three.txt", result.out)
        result = self.ctl("stats", "--by", "kind", code=1)
        self.assertEqual(result.out, b"34\t4\tdocument\n0\t2\tfolder\n")

    def test_it_says_that_nothing_was_compared(self):
        self.fill(0, one="lighthouse", two="lighthouse")
        self.index(0, done=2)

        lines = self.ctl("stats", "--duplicates").out.decode().splitlines()

        self.assertRegex(lines[0], r"\A1 sets, 2 files, 10 bytes to spare; probably alike, among files .*")
        self.assertEqual(lines[1:], ["", f"10\t{self.roots[0]}/one.txt",
                                     f"10\t{self.roots[0]}/two.txt"])


class FoundKindTest(ContentsTest):
    def test_what_is_found_inside_counts(self):
        root = self.make_share(folders=())
        self.write(f"{root}/README", "a text without an ending")
        self.write(f"{root}/none.xyz", "")
        self.start()
        self.ctl("folder", "add", root, "--document")
        self.await_hits("ending", ["README"])

        groups = self.ctl("stats", "--by", "kind", "--json").json()["groups"]

        self.assertEqual(groups[0], {"name": "document", "entries": 1, "bytes": 24})


if __name__ == "__main__":
    main()
