# SPDX-License-Identifier: GPL-2.0-or-later
"""status --follow, and the progress of what runs."""

import contextlib
import json
import math
import os
import pty
import select
import shutil
import signal
import sqlite3
import subprocess
import time

from harness import IndexTest, main, namespace
from harness.awaiting import LIMIT, await_in_folder
from harness.machine import environment, program
from harness.scale import IS_LONG

REINDEX = 0x10000
FILES = 6000 if IS_LONG else 1500


class Follower:
    """A running `status --follow`."""

    def __init__(self, *options, stdout=subprocess.PIPE):
        self.process = subprocess.Popen(  # pylint: disable=consider-using-with
            [program("fileindexctl"), "status", "--follow", *options],
            env=environment(),
            stdin=subprocess.DEVNULL,
            stdout=stdout,
            stderr=subprocess.PIPE,
        )
        self.fd = self.process.stdout.fileno() if self.process.stdout else None
        self.received = b""

    def await_shown(self, condition):
        """Reads until condition(all that was received) is true; returns that."""
        deadline = time.monotonic() + LIMIT
        while not (found := condition(self.received)):
            ready, _, _ = select.select([self.fd], [], [], max(deadline - time.monotonic(), 0))
            part = os.read(self.fd, 65536) if ready else b""
            assert part, f"not shown: {self.received[-2000:]!r}"
            self.received += part
        return found

    def await_status(self, condition):
        """Of --json: the first status for which the condition holds."""

        def find(received):
            lines = received.split(b"\n")[:-1]
            return next((one for one in map(json.loads, lines) if condition(one)), None)

        return self.await_shown(find)

    def statuses(self):
        return [json.loads(line) for line in self.received.split(b"\n")[:-1]]

    def finish(self):
        """(exit code, what it wrote to standard error)"""
        self.process.wait(LIMIT)
        error = self.process.stderr.read()
        self.process.stderr.close()
        if self.process.stdout:
            self.process.stdout.close()
        return self.process.returncode, error

    def stop(self, number=signal.SIGTERM):
        self.process.send_signal(number)
        return self.finish()


class FollowTest(IndexTest):
    def test_first_index_until_it_is_done(self):
        follower = Follower("--json")
        follower.await_status(lambda status: status["shares"] == [])
        self.start(debug=False)
        root = self.make_share(files=[f"{i % 20}/{i}.txt" for i in range(FILES)])
        follower.await_status(lambda status: status["daemon"])

        last = follower.await_status(
            lambda status: status["shares"]
            and status["shares"][0]["entries"] == FILES + 21
            and status["shares"][0]["progress"] is None
            and status["shares"][0]["waiting"] == 0
        )

        self.assertEqual(last["shares"][0]["root"], "sound")
        self.assertEqual(follower.stop(), (0, b""))
        texts = follower.received.split(b"\n")[:-1]
        self.assertFalse([one for one, two in zip(texts, texts[1:]) if one == two])
        self.assert_index(root)

    def test_both_signals_end_it_well(self):
        for number in (signal.SIGINT, signal.SIGTERM):
            follower = Follower()
            follower.await_shown(lambda received: b"not paused\n" in received)
            self.assertEqual(follower.stop(number), (0, b""))

    def test_reader_that_goes_away_ends_it_well(self):
        follower = Follower("--json")
        follower.await_status(lambda status: True)

        follower.process.stdout.close()
        follower.process.stdout = None

        self.assertEqual(follower.finish(), (0, b""))

    def test_reader_that_stands_still_does_not_keep_a_signal_away(self):
        read_end, write_end = os.pipe()
        follower = Follower(stdout=write_end)
        follower.fd = read_end
        follower.await_shown(lambda received: b"not paused\n" in received)
        ours = os.open(f"/proc/self/fd/{write_end}", os.O_WRONLY | os.O_NONBLOCK)
        with contextlib.suppress(BlockingIOError):
            while True:
                os.write(ours, b"x" * 4096)
        self.ctl("pause")

        self.assertEqual(follower.stop(), (0, b""))
        for fd in (ours, write_end, read_end):
            os.close(fd)

    def test_output_that_cannot_be_written(self):
        with open("/dev/full", "wb") as full:
            code, error = Follower(stdout=full).finish()

        self.assertEqual(code, 1)
        self.assertRegex(error, rb"\Afileindexctl: [^\n]+\n\Z")

    def test_what_comes_and_goes_is_shown(self):
        follower = Follower("--json")
        follower.await_status(lambda status: not status["daemon"])
        pid = self.start(debug=False)
        follower.await_status(lambda status: status["pid"] == pid)

        self.ctl("pause")
        follower.await_status(lambda status: status["paused_until"] == 0)
        root = self.make_share()
        follower.await_status(lambda status: status["shares"])
        os.rmdir(root)
        follower.await_status(
            lambda status: status["shares"] and status["shares"][0]["root"] == "missing"
        )
        before = len(follower.statuses())
        self.kill(pid)  # which leaves its pid file
        follower.await_status(
            lambda status: not status["daemon"] and status in follower.statuses()[before:]
        )
        self.assertEqual(follower.stop(), (0, b""))

    def test_end_of_a_pause_is_shown(self):
        follower = Follower("--json")
        follower.await_status(lambda status: True)
        self.ctl("pause", "--for", "20s")

        follower.await_status(lambda status: status["paused_until"])
        follower.await_status(lambda status: status["paused_until"] is None)

        self.assertEqual(follower.stop(), (0, b""))

    def test_blocks_for_people(self):
        follower = Follower()
        follower.await_shown(lambda received: received.endswith(b"not paused\n"))
        self.ctl("pause")
        follower.await_shown(lambda received: b"paused without end\n" in received)
        self.assertEqual(follower.stop(), (0, b""))

        blocks = follower.received.split(b"\n\n")
        self.assertEqual(blocks[0], b"daemon does not run\nnot paused")
        self.assertEqual(blocks[-1], b"daemon does not run\npaused without end\n")
        self.assertNotIn(b"\033", follower.received)

    def open_terminal(self):
        if not os.path.exists("/dev/pts"):
            os.mkdir("/dev/pts")
            namespace.mount("devpts", "/dev/pts", "devpts", options="newinstance,ptmxmode=0666")
        if not os.path.lexists("/dev/ptmx"):
            os.symlink("pts/ptmx", "/dev/ptmx")
        master, slave = pty.openpty()
        follower = Follower(stdout=slave)
        os.close(slave)
        follower.fd = master
        self.addCleanup(os.close, master)
        return follower

    def test_a_terminal_wraps_lines_again_however_it_ends(self):
        follower = self.open_terminal()
        follower.await_shown(lambda received: b"\033[?7l" in received and b"not" in received)
        with sqlite3.connect(f"{namespace.STATE}/state.db") as state:
            for (table,) in state.execute("SELECT name FROM sqlite_master WHERE type = 'table'"
                                          " AND name NOT LIKE 'sqlite%'").fetchall():
                state.execute(f"ALTER TABLE {table} RENAME TO {table}_away")
        state.close()

        follower.await_shown(lambda received: received.endswith(b"\033[?7h"))
        code, error = follower.finish()
        self.assertEqual(code, 1)
        self.assertRegex(error, rb"\Afileindexctl: [^\n]+\n\Z")

    def test_a_terminal_is_drawn_in_place(self):
        follower = self.open_terminal()
        follower.await_shown(lambda received: b"not paused" in received)
        self.ctl("pause")
        shown = follower.await_shown(
            lambda received: b"paused without end" in received and received
        )

        self.assertIn(b"\033[2J\033[H", shown)
        self.assertIn(b"\033[H", shown.partition(b"not paused")[2])
        self.assertEqual(follower.stop(), (0, b""))
        follower.await_shown(lambda received: received.endswith(b"\033[?7h"))


class ProgressTest(IndexTest):
    def share(self):
        (share,) = self.ctl("status", "--json").json()["shares"]
        return share

    def path(self):
        return f"{namespace.STATE}/shares/alpha/progress"

    def await_progress(self):
        self.await_file(self.path())
        shown = await_in_folder(self.path(), lambda: self.share()["progress"] is not None)
        self.assertTrue(shown)
        return self.share()["progress"]

    def hold_whole_reindex(self, root):
        """A whole reindex that has begun and waits in a pause."""
        os.rename(root, root + ".away")
        self.append("alpha", {"event": REINDEX, "path": root})
        self.await_drained("alpha")
        os.rename(root + ".away", root)
        self.assertTrue(self.share()["needs_reindex"])
        self.assertEqual(self.command("pause"), 0)
        self.append("alpha", b"")

    def test_reindex_that_is_held_is_shown_until_it_ends(self):
        root = self.make_share(files=("a.txt", "in/b.txt"))
        self.start()
        self.await_drained("alpha")
        self.assertIsNone(self.share()["progress"])

        self.hold_whole_reindex(root)

        progress = self.await_progress()
        self.assertEqual(
            progress,
            {"what": "reindex", "done": 0, "total": 4, "rate": None, "seconds_left": None},
        )
        self.assertIn(b"reindex, 0 of about 4 entries", self.ctl("status").out)
        self.assertEqual(os.stat(self.path()).st_mode & 0o777, 0o600)
        self.ctl("resume")
        self.await_gone(self.path())
        self.await_drained("alpha")
        self.assertIsNone(self.share()["progress"])
        self.assert_index(root)

    def test_killed_daemons_work_is_not_shown(self):
        root = self.make_share(files=("a.txt",))
        pid = self.start()
        self.await_drained("alpha")
        self.hold_whole_reindex(root)
        self.await_progress()

        self.kill(pid)

        self.assertTrue(os.path.lexists(self.path()))
        self.assertIsNone(self.share()["progress"])
        self.ctl("resume")
        self.start()
        self.await_gone(self.path())
        self.assert_index(root)

    def test_stopped_daemon_leaves_no_file(self):
        root = self.make_share(files=("a.txt",))
        pid = self.start()
        self.await_drained("alpha")
        self.hold_whole_reindex(root)
        self.await_progress()

        self.stop(pid)

        self.assertFalse(os.path.lexists(self.path()))


class ComparisonTest(IndexTest):
    """A comparison that cannot go on while nobody reads what it found."""

    FILES = 3000
    NAME = "name of a file that is longer than most " * 4
    PART = 8192

    def setUp(self):
        super().setUp()
        self.root = self.make_share(files=[f"{i} {self.NAME}" for i in range(self.FILES)])
        pid = self.start(debug=False)
        self.await_drained("alpha")
        self.stop(pid)
        for name in os.listdir(self.root):
            os.utime(f"{self.root}/{name}", (0, 0))

    def begin(self):
        return subprocess.Popen(
            [program("fileindexctl"), "verify", "alpha"],
            env=environment(),
            stdin=subprocess.DEVNULL,
            stdout=subprocess.PIPE,
        )

    def read_until_it_is_shown(self, stdout):
        """It says how far it is when a second is over: so long it gets little to go on."""
        path = f"{namespace.STATE}/shares/alpha/comparison"

        def is_written():
            return os.path.lexists(path) and os.path.getsize(path) > 0

        while not await_in_folder(path, is_written, 0.1):
            self.assertNotEqual(os.read(stdout.fileno(), self.PART), b"", "ended and never shown")
        with open(path, encoding="utf-8") as file:
            return json.loads(file.read())

    def test_it_is_shown_with_its_rate_and_its_time_left(self):
        follower = Follower("--json")
        with self.begin() as verify:
            said = self.read_until_it_is_shown(verify.stdout)
            status = follower.await_status(lambda one: one["shares"][0]["progress"] is not None)
            text = self.ctl("status").out.decode()
            before = len(follower.statuses())
            verify.stdout.read()
        follower.await_status(
            lambda one: one["shares"][0]["progress"] is None
            and one in follower.statuses()[before:]
        )

        self.assertEqual(verify.returncode, 1)
        self.assertEqual((said["what"], said["total"]), ("comparison", self.FILES + 1))
        exact = said["done"] * 1000 / (said["updated"] - said["began"])
        rate = math.floor(exact + 0.5)
        left = math.ceil((said["total"] - said["done"]) / exact)
        self.assertGreater(left, 0)
        self.assertEqual(
            status["shares"][0]["progress"],
            {
                "what": "comparison",
                "done": said["done"],
                "total": said["total"],
                "rate": rate,
                "seconds_left": left,
            },
        )
        self.assertIn(
            f"comparison, {said['done']} of about {said['total']} entries, "
            f"{rate} a second, about {left} s left\n",
            text,
        )
        self.assertEqual(follower.stop(), (0, b""))


class MissingIndexTest(IndexTest):
    def share(self):
        (share,) = self.ctl("status", "--json").json()["shares"]
        return share

    def test_index_that_is_missing_is_told_of(self):
        self.make_share(files=("a.txt",))
        self.assertNotIn("index_problem", self.share())  # it is on its way
        pid = self.start()
        self.await_drained("alpha")
        self.assertNotIn("index_problem", self.share())
        self.stop(pid)

        shutil.rmtree(f"{namespace.STATE}/shares/alpha/index")

        self.assertRegex(self.share()["index_problem"], "missing")
        self.assertIn(b"index: missing", self.ctl("status").out)
        for question in (("dump", "alpha"), ("stats",), ("stats", "--duplicates"), ("search", "a")):
            asked = self.ctl(*question, code=1)
            self.assertEqual(asked.out, b"")
            self.assertIn(b"there is no index", asked.err)

    def test_share_without_folders_needs_none(self):
        self.make_share(folders=())

        self.assertNotIn("index_problem", self.share())


if __name__ == "__main__":
    main()
