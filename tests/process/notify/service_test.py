# SPDX-License-Identifier: GPL-2.0-or-later
"""The notification service as a service: start, end, settings that change, what it tells."""

import json
import os
import signal
import subprocess

from harness import main, namespace
from harness.awaiting import LIMIT, await_in_folder
from harness.machine import program
from harness.watching import NOTIFIER_PID_FILE, NOTIFIER_SOCKET, WatchedTest, ask_notifier

CREATE = 0x40
MODIFY = 0x2
CLOSE_WRITE = 0x8


class Service(WatchedTest):
    def refused(self, *options):
        done = subprocess.run(
            [program("fileindex-notifyd"), *options], capture_output=True, check=False, timeout=LIMIT
        )
        self.assertEqual(done.stdout, b"")
        self.assertEqual(done.stderr.count(b"\n"), 1, done.stderr)
        self.assertTrue(done.stderr.startswith(b"fileindex-notifyd: "), done.stderr)
        return done.returncode, done.stderr

    def test_wrong_usage_is_refused_in_one_line(self):
        for options in (["--nonsense"], ["x"], ["--interval"], ["--interval", "5"],
                        ["--interval", "5parsecs"], ["--interval", "0s"], ["--watch-by", "magic"]):
            with self.subTest(options):
                code, _ = self.refused(*options)
                self.assertEqual(code, 2)

    def test_help(self):
        done = subprocess.run(
            [program("fileindex-notifyd"), "--help"], capture_output=True, check=True, timeout=LIMIT
        )
        for option in (b"--syslog", b"--watch-by", b"--interval"):
            self.assertIn(option, done.stdout)

    def test_second_instance_refuses_with_a_message(self):
        self.make_share()
        self.start_notifier()
        pid = self.notifier.pid

        second = self.launch_notifier()
        self.assertEqual(second.wait(LIMIT), 1)

        self.assertIn("another instance runs", self.notifier_text())
        with open(NOTIFIER_PID_FILE, encoding="ascii") as file:
            self.assertEqual(int(file.read()), pid)
        self.assertTrue(ask_notifier(type="status")["ok"])

    def test_left_over_files_of_a_killed_one_stop_nobody(self):
        self.make_share()
        self.start_notifier()
        self.kill_notifier()
        self.assertTrue(os.path.exists(NOTIFIER_SOCKET))

        self.start_notifier()

        self.assertTrue(ask_notifier(type="status")["ok"])

    def test_ending_removes_its_files(self):
        self.make_share()
        self.start_notifier()
        for number in (signal.SIGTERM, ):
            self.stop_notifier(number)
        self.assertFalse(os.path.exists(NOTIFIER_SOCKET))
        self.assertFalse(os.path.exists(NOTIFIER_PID_FILE))

    def test_what_is_gathered_is_written_at_the_end(self):
        root = self.make_share()
        self.begin()
        self.assertEqual(self.command("pause"), 0)

        # Held back for its close, which does not come before the end.
        self.notifier.send_signal(signal.SIGSTOP)  # it reads both at once
        with open(f"{root}/held.txt", "w", encoding="ascii") as file:
            file.write("x")
            file.flush()
            self.notifier.send_signal(signal.SIGCONT)
            self.stop_notifier()

        with open(self.queue("alpha"), encoding="ascii") as file:
            lines = [json.loads(line) for line in file]
        self.assertEqual([line["path"] for line in lines], [f"{root}/held.txt"])

    def test_lines_of_single_changes(self):
        root = self.make_share(files=("a.txt", "old.txt", "d/", "gone.txt"))
        self.begin()
        self.assertEqual(self.command("delete_share_worker", share_name="alpha"), 0)
        cases = [
            ("close after write", f"echo x >> {root}/a.txt", {"event": CLOSE_WRITE, "path": "a.txt"}),
            ("new file", f"echo x > {root}/new.txt", {"event": CLOSE_WRITE, "path": "new.txt"}),
            ("mode", f"chmod 600 {root}/a.txt", {"event": 0x4, "path": "a.txt"}),
            ("delete", f"rm {root}/gone.txt", {"event": 0x80, "path": "gone.txt"}),
            ("link", f"ln -s x {root}/link", {"event": CREATE, "path": "link"}),
            ("folder", f"mkdir {root}/new", {"event": 0x10000, "path": "new"}),
            ("rename", f"mv {root}/old.txt {root}/d/new.txt",
             {"event": 0x100, "path": "d/new.txt", "path_old": f"{root}/old.txt"}),
        ]
        for name, script, expected in cases:
            with self.subTest(name):
                if os.path.exists(self.queue("alpha")):
                    os.unlink(self.queue("alpha"))
                self.notifier.send_signal(signal.SIGSTOP)  # it reads all of it at once
                subprocess.run(["sh", "-c", script], check=True, timeout=LIMIT)
                self.notifier.send_signal(signal.SIGCONT)
                self.await_file(self.queue("alpha"))
                self.assertTrue(
                    await_in_folder(
                        self.queue("alpha"), lambda: os.path.getsize(self.queue("alpha")) > 0
                    )
                )
                with open(self.queue("alpha"), encoding="ascii") as file:
                    lines = [json.loads(line) for line in file]
                self.assertEqual(lines, [{**expected, "path": f"{root}/{expected['path']}"}])

    def test_a_thousand_writes_are_few_lines(self):
        root = self.make_share()
        self.begin()
        before = self.watched()["lines"]

        with open(f"{root}/log.txt", "w", encoding="ascii") as file:
            for _ in range(1000):
                file.write("line\n")
                file.flush()

        self.assert_converged(root)
        self.assertLessEqual(self.watched()["lines"] - before, 4)

    def test_changes_while_nobody_watched(self):
        root = self.make_share(files=("a.txt", "b.txt", "d/c.txt"))
        self.begin()
        self.stop_notifier()
        os.unlink(f"{root}/a.txt")
        os.rename(f"{root}/d", f"{root}/e")
        self.make_files(root, "new.txt", "b.txt")

        self.start_notifier()

        self.assert_converged(root)

    def test_shares_and_folders_are_followed(self):
        self.start(debug=False)
        self.start_notifier()
        root = self.make_share(files=("a/a.txt", "b/b.txt"), folders=("a",))
        self.assert_converged(root, folders=[f"{root}/a"])

        self.make_files(root, "a/later.txt")
        self.assert_converged(root, folders=[f"{root}/a"])

        self.ctl("folder", "add", f"{root}/b")
        self.make_files(root, "b/later.txt")
        self.assert_converged(root, folders=[f"{root}/a", f"{root}/b"])

        self.ctl("folder", "remove", f"{root}/a")
        self.make_files(root, "a/unseen.txt", "b/seen.txt")
        self.assert_converged(root, folders=[f"{root}/b"])

        second = self.make_share("beta", files=("x.txt",))
        self.make_files(second, "y.txt")
        self.assert_converged(second, "beta")
        self.ctl("share", "remove", "beta")
        names = [share["name"] for share in ask_notifier(type="status")["shares"]]
        self.sync()
        names = [share["name"] for share in ask_notifier(type="status")["shares"]]
        self.assertEqual(names, ["alpha"])

    def test_only_what_belongs_becomes_lines(self):
        root = self.make_share(files=("d/",), folders=("d",))
        self.ctl("folder", "set", f"{root}/d", "--exclude", "*.o")
        self.begin()
        before = self.watched()["lines"]

        self.make_files(root, "outside.txt", "d/a.o", "d/#snapshot/x", "d/~$lock", "e/f.txt")
        os.rename(f"{root}/outside.txt", f"{root}/e/moved.txt")
        self.sync()
        self.assertEqual(self.watched()["lines"], before)

        os.rename(f"{root}/d/a.o", f"{root}/d/a.c")  # new only
        os.rename(f"{root}/e/f.txt", f"{root}/d/f.txt")
        self.assert_converged(root, folders=[f"{root}/d"], left_out=[f"{root}/d/#snapshot"])
        os.rename(f"{root}/d/a.c", f"{root}/d/a.o")  # old only
        self.sync()
        self.assertNotIn(f"{root}/d/a.o".encode(), self.dump())
        self.assertNotIn(f"{root}/d/a.c".encode(), self.dump())

    def test_directory_above_an_indexed_folder(self):
        root = self.make_share(files=("up/mid/in/a.txt", "other/"), folders=("up/mid/in",))
        folders = [f"{root}/up/mid/in"]
        self.begin()

        os.rename(f"{root}/up", f"{root}/away")
        self.assert_converged(root, folders=folders)
        self.make_files(root, "away/mid/in/b.txt")
        os.rename(f"{root}/away", f"{root}/up")
        self.assert_converged(root, folders=folders)
        self.assertEqual(len(self.dump()), 3)

    def test_queue_that_nobody_took_is_taken(self):
        root = self.make_share(files=("a.txt",))
        self.begin()
        os.unlink(f"{root}/a.txt")
        self.sync()

        # As after a wake-up that was lost: a queue without an event.
        hidden = f"{namespace.STATE}/shares/alpha/hidden"
        with open(hidden, "w", encoding="ascii") as file:
            file.write(json.dumps({"event": 0x10000, "path": root}) + "\n")
        os.rename(hidden, self.queue("alpha"))

        gone = await_in_folder(
            self.queue("alpha"), lambda: not os.path.lexists(self.queue("alpha")), LIMIT
        )
        self.assertTrue(gone, "nobody touched the queue")
        self.assert_converged(root)


if __name__ == "__main__":
    main()
