# SPDX-License-Identifier: GPL-2.0-or-later
"""From files to hits on what is inside them: what is read when, and what is not."""

import contextlib
import os
import re
import shutil
import signal
import sqlite3

from harness import filesystems, main, namespace
from harness.awaiting import await_exit_of
from search.library import ScriptedTest

MS_RDONLY = 1


class ContentsFollowTest(ScriptedTest):
    def make_documents(self, **texts):
        """A share with these files, whose contents are wanted, and a daemon."""
        root = self.make_share(folders=())
        for name, text in texts.items():
            self.write(f"{root}/{name}.txt", text)
        self.daemon = self.start()
        self.ctl("folder", "add", root, "--document")
        return root

    def change(self, root, name, code=8):
        self.append("alpha", {"event": code, "path": f"{root}/{name}"})

    def await_all_taken_in(self, root):
        """Until what was queued before has come to the service: a file that is written now is
        read, and nothing waits."""
        self.await_drained("alpha")
        self.write(f"{root}/last.txt", "afterwards")
        self.change(root, "last.txt")
        self.await_drained("alpha")
        self.await_hits("afterwards", ["last.txt"])
        self.await_counts(waiting=0)

    def test_files_are_found_by_what_is_in_them(self):
        root = self.make_documents(one="lighthouse keeper", two="harbour master")

        self.await_hits("lighthouse", ["one.txt"])
        self.await_hits("harbour", ["two.txt"])
        self.await_counts(done=2, waiting=0, failed=0)

        self.write(f"{root}/three.txt", "lighthouse again")
        self.change(root, "three.txt")
        self.await_hits("lighthouse", ["one.txt", "three.txt"])
        self.assertEqual(self.given(), ["one.txt", "three.txt", "two.txt"])

    def test_what_only_gets_another_name_is_not_read_again(self):
        root = self.make_documents(one="lighthouse", two="harbour")
        self.await_counts(done=2, waiting=0)

        os.mkdir(f"{root}/folder")
        os.rename(f"{root}/one.txt", f"{root}/folder/other.txt")
        os.link(f"{root}/two.txt", f"{root}/twin.txt")
        self.ctl("reindex", root)

        self.await_hits("lighthouse", ["other.txt"])
        self.await_hits("harbour", ["twin.txt", "two.txt"])
        self.await_all_taken_in(root)
        self.assertEqual(self.given(), ["last.txt", "one.txt", "two.txt"])

    def test_a_move_from_one_indexed_folder_to_another_costs_no_reading(self):
        root = self.make_share(folders=())
        for folder in ("here", "there"):
            os.mkdir(f"{root}/{folder}")
            self.write(f"{root}/{folder}/{folder}.txt", f"lighthouse {folder}")
        self.start()
        for folder in ("here", "there"):
            self.ctl("folder", "add", f"{root}/{folder}", "--document")
        self.await_counts(done=2, waiting=0)

        os.rename(f"{root}/here/here.txt", f"{root}/there/moved.txt")
        self.change(root, "here/here.txt", code=0x80)
        self.change(root, "there/moved.txt")
        self.await_hits("lighthouse", ["moved.txt", "there.txt"])

        self.write(f"{root}/there/last.txt", "afterwards")
        self.change(root, "there/last.txt")
        self.await_hits("afterwards", ["last.txt"])
        self.await_counts(done=3, waiting=0)
        self.assertEqual(self.given(), ["here.txt", "last.txt", "there.txt"])

    def test_there_is_a_helper_for_each_processor(self):
        processors = len(os.sched_getaffinity(0))
        names = [f"gate{number}.txt" for number in range(3 * processors)]
        root = self.make_share(folders=())
        for name in names:
            self.write(f"{root}/{name}", "lighthouse")
        self.start()
        self.ctl("folder", "add", root, "--document")

        self.await_diary(lambda given: len(given) >= processors)
        at_work = {pid for _, pid in self.diary()}
        self.open_gate()

        self.await_hits("lighthouse", names)
        self.assertEqual(len(at_work), processors)
        self.assertEqual({pid for _, pid in self.diary()}, at_work)

    def test_a_link_that_is_taken_away_costs_no_reading(self):
        root = self.make_documents(one="lighthouse")
        os.link(f"{root}/one.txt", f"{root}/twin.txt")
        self.change(root, "twin.txt")
        self.await_hits("lighthouse", ["one.txt", "twin.txt"])

        os.unlink(f"{root}/twin.txt")
        self.change(root, "twin.txt", code=0x80)
        self.await_drained("alpha")
        self.ctl("reindex", root)

        self.await_all_taken_in(root)
        self.assertEqual(self.hits("lighthouse"), ["one.txt"])
        # Which of the two names the walk met first is the file system's affair.
        given = [name for name in self.given() if name != "last.txt"]
        self.assertEqual(len(given), 1, given)
        self.assertIn(given[0], ["one.txt", "twin.txt"])

    def test_a_rebuilt_index_costs_no_reading(self):
        root = self.make_documents(one="lighthouse")
        self.await_counts(done=1, waiting=0)
        self.stop(self.daemon)

        shutil.rmtree(f"{os.path.dirname(self.queue('alpha'))}/index")
        self.start()
        self.ctl("reindex", root)

        self.await_all_taken_in(root)
        self.await_hits("lighthouse", ["one.txt"])
        self.assertEqual(self.given(), ["last.txt", "one.txt"])

    def test_kinds_that_are_switched_off_are_dropped(self):
        root = self.make_documents(one="lighthouse")
        self.await_counts(done=1)

        self.ctl("folder", "set", root, "--document=off")

        self.await_counts(done=0, waiting=0)
        self.assertEqual(self.hits("lighthouse"), [])
        self.ctl("folder", "set", root, "--document=on")
        self.await_hits("lighthouse", ["one.txt"])

    def shown_kinds(self, root, name):
        """Of that file, as each command has it."""
        path = f"{root}/{name}"
        dumped = self.ctl("dump", "alpha", "--json").objects()
        told = self.ctl("info", path).out.decode()
        return [
            next(entry["kind"] for entry in dumped if entry["path"] == path),
            self.ctl("info", path, "--json").json()["entry"]["kind"],
            re.search(r"^  kind +(\w+)$", told, re.MULTILINE)[1],
            self.ctl("search", "--json", f"name:{name}").objects()[0]["kind"],
        ]

    def test_every_command_tells_the_kind_that_was_found_inside(self):
        root = self.make_documents(one="lighthouse")
        self.await_counts(done=1)
        os.mkdir(f"{root}/plain")
        self.ctl("folder", "add", f"{root}/plain")
        for name in ("notes", "plain/notices"):
            self.write(f"{root}/{name}", "harbour")
            self.change(root, name)
        self.await_hits("harbour", ["notes"])

        self.assertEqual(self.shown_kinds(root, "notes"), ["document"] * 4)
        self.assertEqual(self.ctl("info", f"{root}/notes", "--json").json()["state"], "current")
        # Of what nobody looks into, only the name could tell.
        self.await_drained("alpha")
        path = f"{root}/plain/notices"
        dumped = self.ctl("dump", "alpha", "--json").objects()
        self.assertEqual([e["kind"] for e in dumped if e["path"] == path], ["other"])

    def test_content_of_a_found_kind_that_is_not_wanted_is_shown_as_such(self):
        root = self.make_documents(one="lighthouse")
        self.ctl("folder", "set", root, "--photo=on")
        self.write(f"{root}/notes", "harbour")
        self.change(root, "notes")
        self.await_hits("harbour", ["notes"])
        for flag, wanted in (("on", True), ("off", False)):
            with self.subTest(document=flag):
                self.ctl("folder", "set", root, f"--document={flag}")
                self.await_drained("alpha")

                self.assertIs(self.flags()[f"{root}/notes"], wanted)
                told = self.ctl("info", f"{root}/notes", "--json").json()
                self.assertIs(told["entry"]["content"], wanted)
                self.assertEqual((told["entry"]["kind"], told["state"]), ("document", "current"))

    def test_dump_tells_of_contents_that_cannot_be_read(self):
        root = self.make_documents(one="lighthouse")
        self.await_counts(done=1)
        self.stop(self.daemon)
        for beside in ("-wal", "-shm"):
            with contextlib.suppress(FileNotFoundError):
                os.unlink(self.contents() + beside)
        self.write(self.contents(), "no database" * 1000)

        result = self.ctl("dump", "alpha", "--json", code=1)

        self.assertIn(f"{root}/one.txt", [entry["path"] for entry in result.objects()])
        self.assertIn(b"share alpha: contents: ", result.err)
        self.assertIn(f"{root}/one.txt".encode(), self.dump())

    def test_dump_lists_all_though_contents_turn_out_to_be_damaged_on_its_way(self):
        root = self.make_documents(one="lighthouse")
        self.await_counts(done=1)
        for name in ("notes", "notices"):  # whose names tell no kind
            self.write(f"{root}/{name}", "harbour")
            self.change(root, name)
        self.await_counts(done=3)
        self.stop(self.daemon)
        with contextlib.closing(sqlite3.connect(self.contents())) as contents:
            contents.execute("PRAGMA wal_checkpoint(TRUNCATE)")
            where = "SELECT rootpage FROM sqlite_master WHERE name = 'sqlite_autoindex_files_1'"
            page = contents.execute(where).fetchone()[0]
            size = contents.execute("PRAGMA page_size").fetchone()[0]
        with open(self.contents(), "r+b") as file:
            file.seek((page - 1) * size)
            file.write(b"\xff" * size)

        result = self.ctl("dump", "alpha", "--json", code=1)

        paths = [entry["path"] for entry in result.objects()]
        self.assertEqual(paths, [os.fsdecode(path) for path in self.dump()])
        self.assertIn(b"share alpha: contents: ", result.err)

    def test_a_file_that_changes_while_it_is_read_is_read_again(self):
        root = self.make_documents(gate="lighthouse")
        self.await_given("gate.txt")

        self.write(f"{root}/gate.txt", "a harbour instead")
        self.open_gate()
        self.change(root, "gate.txt")

        self.await_hits("harbour", ["gate.txt"])
        self.assertEqual(self.hits("lighthouse"), [])

    def test_what_is_no_file_any_more_is_not_opened(self):
        root = self.make_share(folders=())
        names = ["link.txt", "pipe.txt", "device.txt", "folder.txt", "gone.txt", "good.txt"]
        for name in names:
            self.write(f"{root}/{name}", f"lighthouse {name}")
        daemon = self.start()
        service = self.service_pid()
        os.kill(service, signal.SIGSTOP)
        self.ctl("folder", "add", root, "--document")
        self.await_drained("alpha")
        os.kill(daemon, signal.SIGSTOP)  # it would see what follows at a reindex

        for name in names[:-1]:
            os.unlink(f"{root}/{name}")
        os.symlink("good.txt", f"{root}/link.txt")
        os.mkfifo(f"{root}/pipe.txt")
        os.mknod(f"{root}/device.txt", 0o20666, os.makedev(1, 5))
        os.mkdir(f"{root}/folder.txt")
        os.kill(service, signal.SIGCONT)

        self.await_counts(done=1)
        self.assertEqual(self.given(), ["good.txt"])
        os.kill(daemon, signal.SIGCONT)

    def test_one_broken_share_does_not_hold_the_others(self):
        broken = self.make_documents(one="lighthouse")
        self.await_hits("lighthouse", ["one.txt"])
        folder = os.path.dirname(self.contents())
        namespace.mount("tmpfs", folder, "tmpfs", flags=MS_RDONLY)
        self.write(f"{broken}/two.txt", "lighthouse")
        self.change(broken, "two.txt")

        other = self.make_share("beta", folders=())
        self.write(f"{other}/three.txt", "harbour")
        self.ctl("folder", "add", other, "--document")
        self.await_hits("harbour", ["three.txt"], "beta")

        filesystems.unmount(folder)
        self.await_hits("lighthouse", ["one.txt", "two.txt"])

    def test_what_the_disk_does_not_give_is_read_when_it_does(self):
        root = self.make_share(folders=())
        for name in ("unread.txt", "good.txt"):
            self.write(f"{root}/{name}", "lighthouse")
        self.start()
        self.ctl("folder", "add", root, "--document")
        self.await_given("unread.txt")
        self.await_counts(done=1, waiting=0, failed=1)
        ((reason, tries),) = self.failed().values()
        self.assertEqual(reason, "the disk is gone")
        self.assertGreaterEqual(tries, 1)
        self.await_given("unread.txt", 3)

        self.write(f"{os.path.dirname(self.diary_path)}/mended", "")

        self.await_hits("lighthouse", ["good.txt", "unread.txt"])
        self.assertEqual(self.failed(), {})


class PauseTest(ScriptedTest):
    def begin(self, name):
        """A document that a helper is in the middle of: that helper."""
        self.root = self.make_share(folders=())
        self.write(f"{self.root}/{name}", "lighthouse")
        self.daemon = self.start()
        self.ctl("folder", "add", self.root, "--document")
        return self.await_given(name)

    def test_a_pause_stops_a_document_in_the_middle(self):
        helper = self.begin("gate.txt")
        self.ctl("pause")
        self.assertTrue(await_exit_of(helper))
        self.assertEqual(self.given(), ["gate.txt"])

        self.open_gate()
        self.ctl("resume")
        self.await_hits("lighthouse", ["gate.txt"])
        self.assertEqual(self.failed(), {})
        self.assertEqual(self.given(), ["gate.txt"] * 2)

    def test_what_a_pause_stopped_is_no_try(self):
        helper = self.begin("gatecrash.txt")
        for given in (2, 3):
            self.ctl("pause")
            self.assertTrue(await_exit_of(helper))
            self.ctl("resume")
            helper = self.await_given("gatecrash.txt", given)

        self.open_gate()

        # That one and the next end over it: both tries, and not the second after the first pause.
        self.await_counts(failed=1, waiting=0)
        self.assertEqual(self.failed(), {"gatecrash.txt": ("the helper ended with SIGABRT", 2)})
        self.assertEqual(self.given(), ["gatecrash.txt"] * 4)

    def test_a_pause_ends_by_itself(self):
        helper = self.begin("gate.txt")
        self.ctl("pause", "--for", "10s")
        self.assertTrue(await_exit_of(helper))

        self.open_gate()

        self.await_hits("lighthouse", ["gate.txt"])

    def test_without_a_daemon_nothing_is_read(self):
        helper = self.begin("gate.txt")
        self.kill(self.daemon)
        self.assertTrue(await_exit_of(helper))

        self.open_gate()
        self.start()

        self.await_hits("lighthouse", ["gate.txt"])
        self.assertEqual(self.failed(), {})


class IgnoredSignalTest(ScriptedTest):
    def test_service_that_was_to_ignore_the_ends_of_children_sees_those_of_its_helpers(self):
        root = self.make_share(folders=())
        self.write(f"{root}/crash.txt", "lighthouse")
        self.start()
        self.kill(self.service_pid())
        self.start_service("env", "--ignore-signal=CHLD")

        self.ctl("folder", "add", root, "--document")

        self.await_counts(failed=1, waiting=0)
        self.assertEqual(self.failed()["crash.txt"], ("the helper ended with SIGABRT", 2))


if __name__ == "__main__":
    main()
