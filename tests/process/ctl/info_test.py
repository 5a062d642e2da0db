# SPDX-License-Identifier: GPL-2.0-or-later
"""info: what is known of one path, and each reason for which it is not in the index."""

import os
import shutil
import stat

from harness import IndexTest, main, namespace
from harness.machine import full_path


class InfoTest(IndexTest):
    def setUp(self):
        super().setUp()
        self.root = self.make_share(
            files=("in/a.txt", "in/b.o", "in/build/c.txt", "out/d.txt"), folders=()
        )
        self.ctl("folder", "add", f"{self.root}/in", "--document", "--exclude=*.o",
                 "--exclude=build/")

    def begin(self):
        pid = self.start()
        self.await_drained("alpha")
        return pid

    def info(self, path, **more):
        """Both forms have to work."""
        path = path if path.startswith(("/", ".")) else f"{self.root}/{path}"
        plain = self.ctl("info", path, **more).out
        answer = self.ctl("info", path, "--json", **more).json()
        self.assertIn(os.fsencode(path.rsplit("/", 1)[-1]), plain)
        return answer

    def check(self, path, verdict, state, **more):
        answer = self.info(path)
        self.assertEqual((answer["verdict"], answer["state"]), (verdict, state), answer)
        for key, value in more.items():
            self.assertEqual(answer[key], value, answer)
        return answer


class EntryTest(InfoTest):
    def test_an_entry_with_all_that_is_known_of_it(self):
        self.begin()
        info = os.lstat(f"{self.root}/in/a.txt")

        answer = self.check("in/a.txt", "belongs", "current", share="alpha",
                            folder=f"{self.root}/in", excludes=["*.o", "build/"])

        self.assertEqual(answer["path"], f"{self.root}/in/a.txt")
        self.assertEqual(answer["flags"],
                         {"document": True, "audio": False, "video": False, "photo": False})
        entry = answer["entry"]
        self.assertEqual(entry["thing"], "file")
        self.assertEqual(entry["kind"], "document")
        self.assertTrue(entry["content"])
        self.assertEqual(
            (entry["inode"], entry["size"], entry["owner"], entry["group"], entry["mode"],
             entry["mtime"], entry["ctime"]),
            (info.st_ino, info.st_size, info.st_uid, info.st_gid, stat.S_IMODE(info.st_mode),
             int(info.st_mtime), int(info.st_ctime)),
        )
        self.assertGreaterEqual(entry["written"], entry["first_seen"])
        self.assertEqual(answer["pending"], {"events": [], "below": 0})
        plain = self.ctl("info", f"{self.root}/in/a.txt").out
        self.assertIn(b"in the index, as it is on disk", plain)
        self.assertIn(b"last written", plain)

    def test_disk_and_index_differ(self):
        self.stop(self.begin())
        with open(f"{self.root}/in/a.txt", "a", encoding="ascii") as file:
            file.write("more")
        self.make_files(self.root, "in/new.txt")

        self.check("in/a.txt", "belongs", "stale")
        self.check("in/new.txt", "belongs", "missing", entry=None)
        os.unlink(f"{self.root}/in/a.txt")
        self.check("in/a.txt", "gone", "left-over")
        self.check("in/never.txt", "gone", "absent")

    def test_a_name_that_is_no_text(self):
        path = os.fsencode(self.root) + b"/in/\xff\n.txt"
        with open(path, "wb"):
            pass
        self.begin()

        answer = self.ctl("info", path, "--json").json()

        self.assertEqual(full_path(answer), path)
        self.assertEqual(answer["state"], "current")
        self.assertIn(b"/in/\xff\\x0a.txt\n", self.ctl("info", path).out)

    def test_a_share_that_is_not_indexed_says_so(self):
        answer = self.check("in/a.txt", "belongs", "missing")

        self.assertIn("not indexed yet", answer["index_problem"])
        self.assertIn(b"not indexed yet", self.ctl("info", f"{self.root}/in/a.txt").out)

    def test_a_missing_root_says_so(self):
        self.stop(self.begin())
        os.rename(self.root, self.root + ".away")

        answer = self.check("in/a.txt", "gone", "unknown")

        self.assertIn("missing", answer["root_problem"])
        self.assertEqual(answer["entry"]["kind"], "document")

    def test_an_emptied_root_says_so_until_it_is_accepted(self):
        self.stop(self.begin())
        for name in os.listdir(self.root):
            shutil.rmtree(f"{self.root}/{name}")

        answer = self.check("in/a.txt", "gone", "unknown")
        self.assertIn("empty where it was not", answer["root_problem"])
        self.assertIn("share accept alpha", answer["root_problem"])
        self.assertIn(b"empty where it was not", self.ctl("info", f"{self.root}/in/a.txt").out)

        self.ctl("share", "accept", "alpha")
        self.check("in/a.txt", "gone", "left-over", root_problem="")


class VerdictTest(InfoTest):
    def test_not_covered_and_in_no_share(self):
        self.check("out/d.txt", "not-covered", "absent", folder=None, share="alpha")
        self.check("/nowhere/at/all", "no-share", "absent", share=None)
        self.check(namespace.DATA, "no-share", "absent")
        self.check("/", "no-share", "absent")

    def test_excluded_names_the_pattern_and_whose_it_is(self):
        for path, pattern, at in (
            ("in/b.o", "*.o", "in/b.o"),
            ("in/build", "build/", "in/build"),
            ("in/build/c.txt", "build/", "in/build"),
            ("in/build/none/x.o", "build/", "in/build"),
        ):
            answer = self.check(path, "excluded", "absent", pattern=pattern,
                                at=f"{self.root}/{at}")
            for word in (pattern, f"{self.root}/in ", at):
                self.assertIn(word, answer["reason"])

    def test_names_links_and_special_files(self):
        os.symlink("../out", f"{self.root}/in/link")
        os.mkfifo(f"{self.root}/in/pipe")
        self.make_files(self.root, "in/~$x/y.txt")
        self.begin()

        self.check("in/~$x/y.txt", "skipped-name", "absent", at=f"{self.root}/in/~$x")
        self.check("in/link", "belongs", "current")
        self.check("in/link/d.txt", "behind-link", "absent", at=f"{self.root}/in/link")
        self.check("in/pipe", "special-file", "absent")

    def test_below_a_mount_point(self):
        os.mkdir(f"{self.root}/in/point")
        namespace.mount("tmpfs", f"{self.root}/in/point", "tmpfs")
        self.make_files(self.root, "in/point/deep/x.txt")

        self.check("in/point", "belongs", "missing")
        self.check("in/point/deep/x.txt", "below-mount", "absent", at=f"{self.root}/in/point")

    def test_in_our_own_state(self):
        before = f"{namespace.RUN}/state-elsewhere"
        state = f"{self.root}/in/state"
        self.ctl("share", "add", "alpha", self.root, FILEINDEXD_STATE_DIR=before)
        shutil.move(before, state)  # a share that holds it is refused

        answer = self.info("in/state/state.db", FILEINDEXD_STATE_DIR=state)

        self.assertEqual((answer["verdict"], answer["state"]), ("own-state", "absent"))
        self.assertIn(state, answer["reason"])

    def test_left_over_after_a_changed_setting(self):
        self.begin()
        self.assertEqual(self.command("pause"), 0)

        self.ctl("folder", "set", f"{self.root}/in", "--exclude=a.*")

        answer = self.check("in/a.txt", "excluded", "left-over", pattern="a.*")
        self.assertEqual([event["event"] for event in answer["pending"]["events"]],
                         ["CUSTOM_EVENT_REINDEX"])


class PendingTest(InfoTest):
    def test_what_waits_at_above_and_below(self):
        os.unlink(self.queue("alpha"))
        at = f"{self.root}/in"
        self.append(
            "alpha",
            {"event": 8, "path": f"{at}/a.txt"},
            {"event": 0x10000, "path": self.root},
            {"event": 0x100, "path": f"{at}/e", "path_old": f"{at}/a.txt"},
            {"event": 0x42, "path": f"{self.root}/out"},
            {"event": 64, "path": f"{at}/a.txt/x"},
            {"event": 64, "path": f"{at}/a.txtx"},
            b"no json",
            b'{"event":"x","path":1}',
        )
        self.append_bytes("alpha", b'{"event":8,"path":"' + f"{at}/a.txt".encode())

        answer = self.info("in/a.txt")

        self.assertEqual(
            [(event["event"], event["above"], event["begun"])
             for event in answer["pending"]["events"]],
            [("QLIB_NOTIFY_CLOSE_WRITE", False, False),
             ("CUSTOM_EVENT_REINDEX", True, False),
             ("QLIB_NOTIFY_RENAME", False, False)],
        )
        self.assertEqual(answer["pending"]["below"], 1)
        plain = self.ctl("info", f"{at}/a.txt").out
        self.assertIn(b"QLIB_NOTIFY_CLOSE_WRITE", plain)
        self.assertIn(b"1 events", plain)

    def test_what_a_worker_has_taken(self):
        os.rename(self.queue("alpha"), self.queue("alpha") + ".tmp")

        (event,) = self.info("in/a.txt")["pending"]["events"]

        self.assertEqual((event["event"], event["begun"]), ("CUSTOM_EVENT_REINDEX", True))


class UsageTest(InfoTest):
    def test_wrong_usage(self):
        self.ctl("info", code=2)
        self.ctl("info", "/a", "/b", code=2)
        self.ctl("info", "", code=2)


if __name__ == "__main__":
    main()
