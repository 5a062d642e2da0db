# SPDX-License-Identifier: GPL-2.0-or-later
"""search --wait, and what status tells of watching, with a notification service of the test's."""

import contextlib
import json
import os
import signal
import socket
import subprocess
import threading
import time

from harness import IndexTest, main, namespace
from harness.awaiting import LIMIT
from harness.machine import Result, environment, program

SOCKET = "/run/fileindex-notifyd.sock"
ADDED = 8
REINDEX = 0x10000
WATCHED = {
    "name": "alpha",
    "watched_by": "fanotify",
    "problem": "",
    "changes": 12,
    "lines": 5,
    "folded": 7,
    "overflows": 0,
    "backlog": 0,
    "complete_until": 1700000000,
    "compared": {"ended": 1600000000, "differences": 3, "error": None},
    "comparing": False,
}


class FakeService:
    """Answers each request with what `answer` makes of it; None: never."""

    def __init__(self, answer):
        self.answer = answer
        self.requests = []
        self.kept = []
        self.listener = socket.socket(socket.AF_UNIX, socket.SOCK_STREAM)
        self.listener.bind(SOCKET)
        self.listener.listen(16)
        self.thread = threading.Thread(target=self._serve, daemon=True)
        self.thread.start()

    def _serve(self):
        while True:
            try:
                client, _ = self.listener.accept()
            except OSError:
                return  # closed
            client.settimeout(LIMIT)
            line = client.makefile("rb").readline()
            if not line:  # who asks was ended before
                client.close()
                continue
            request = json.loads(line)
            self.requests.append(request)
            reply = self.answer(request)
            if reply is None:
                self.kept.append(client)
                continue
            with contextlib.suppress(BrokenPipeError), client:
                client.sendall(reply if isinstance(reply, bytes) else json.dumps(reply).encode())
                client.sendall(b"\n")

    def __enter__(self):
        return self

    def __exit__(self, *_):
        self.listener.shutdown(socket.SHUT_RDWR)
        self.thread.join(LIMIT)
        for each in (self.listener, *self.kept):
            each.close()
        os.unlink(SOCKET)


class WaitTest(IndexTest):
    """The service writes what waits for it when it is asked, as the real one does."""

    def setUp(self):
        super().setUp()
        self.lines = []  # to be written at the next request
        self.prefixed = False

    def service(self):
        count = 0

        def answer(_request):
            nonlocal count
            count += 1
            if self.lines:
                self.append("alpha", *self.lines)
            with open(self.asked(count), "wb"):
                return {"ok": True}

        return FakeService(answer)

    def asked(self, count):
        """A file that is there once the service has done that many requests."""
        return f"{namespace.RUN}/asked.{count}"

    def event(self, path, code=ADDED):
        return {"event": code, "path": path}

    def begin(self, *arguments):
        """A running search --wait."""
        return subprocess.Popen(
            [program("fileindexctl"), "search", "--wait", *arguments],
            env=environment(),
            stdin=subprocess.DEVNULL,
            stdout=subprocess.PIPE,
            stderr=subprocess.PIPE,
        )

    def finish(self, process):
        out, err = process.communicate(timeout=LIMIT)
        return Result(process.returncode, out, err)

    def make_new_file(self, root, name="fresh.txt"):
        self.make_files(root, name)
        self.lines = [self.event(f"{root}/{name}")]
        return f"{root}/{name}".encode() + b"\n"

    def test_what_the_service_writes_is_found(self):
        root = self.make_share()
        self.start()
        self.await_drained("alpha")
        with self.service() as service:
            for number in range(20):
                found = self.make_new_file(root, f"fresh{number}x.txt")
                searching = self.begin(f"fresh{number}x")
                self.await_file(self.asked(number + 1))
                self.await_drained("alpha")  # touches what nobody takes
                self.assertEqual(self.finish(searching), Result(0, found, b""))

        self.assertEqual(service.requests[0], {"type": "sync", "shares": ["alpha"]})

    def test_shares_that_the_question_rules_out_are_not_waited_for(self):
        for share in ("alpha", "beta"):
            self.make_share(share)
        self.start()
        for share in ("alpha", "beta"):
            self.await_drained(share)
        with self.service() as service:
            for words in ("share:beta nothing", f"nothing under:{namespace.DATA}/beta",
                          "nothing -share:alpha", "nothing share:alpha share:beta"):
                self.ctl("search", "--wait", words)
            self.finish(self.begin("--share", "alpha", "--under", f"{namespace.DATA}/beta", "x"))

        self.assertEqual([request["shares"] for request in service.requests], [["beta"]] * 3)

    def test_question_that_makes_no_sense_is_refused_at_once(self):
        self.make_share()
        for words in ("size:x", "share:nope x", "x OR"):
            with self.subTest(words=words):  # no service runs that it could wait for
                self.assertIn(b"character", self.ctl("search", "--wait", words, code=2).err)

    def test_waits_as_long_as_the_lines_do(self):
        root = self.make_share()
        self.start()
        self.await_drained("alpha")
        self.hold_in_pause("alpha", self.event(root))
        found = self.make_new_file(root)
        with self.service():
            searching = self.begin("fresh")
            self.await_file(self.asked(1))
            self.assertIsNone(searching.poll())
            self.ctl("resume")
            self.await_drained("alpha")

            self.assertEqual(self.finish(searching), Result(0, found, b""))

    def test_whole_reindex_is_waited_for(self):
        root = self.make_share()
        self.start()
        self.await_drained("alpha")
        os.rename(root, root + ".away")  # a reindex that cannot end
        self.append("alpha", self.event(root, REINDEX))
        self.await_drained("alpha")
        os.rename(root + ".away", root)
        self.make_new_file(root)
        self.lines = []
        with self.service():
            held = self.ctl("search", "--wait", "--timeout", "5", "fresh", code=1)
            self.assertIn(b"share alpha", held.err)
            searching = self.begin("fresh")
            self.append("alpha", b"")

            self.assertEqual(self.finish(searching).out, f"{root}/fresh.txt\n".encode())

    def test_daemon_that_stands_still_is_waited_for_as_long_as_told(self):
        root = self.make_share()
        pid = self.start()
        self.await_drained("alpha")
        with self.service():
            self.assertEqual(self.ctl("search", "--wait", "nothing").out, b"")
            os.kill(pid, signal.SIGSTOP)
            self.make_new_file(root)
            held = self.ctl("search", "--wait", "--timeout", "5", "fresh", code=1)
            os.kill(pid, signal.SIGCONT)

        self.assertIn(b"not done within 5 s: share alpha: lines wait in its queue", held.err)

    def test_reason_is_told(self):
        root = self.make_share()
        self.start()
        self.await_drained("alpha")
        self.ctl("pause")
        self.make_new_file(root)
        with self.service():
            held = self.ctl("search", "--wait", "--timeout", "5", "fresh", code=1)

        self.assertIn(b"indexing is paused", held.err)

    def test_daemon_is_needed_only_while_something_waits(self):
        root = self.make_share()
        pid = self.start()
        self.await_drained("alpha")
        self.stop(pid)
        with self.service():
            self.assertEqual(self.ctl("search", "--wait", "nothing").out, b"")
            self.make_new_file(root)
            refused = self.ctl("search", "--wait", "fresh", code=3)

        self.assertIn(b"the daemon does not run", refused.err)

    def test_daemon_that_dies_is_noticed(self):
        root = self.make_share()
        pid = self.start()
        self.await_drained("alpha")
        os.kill(pid, signal.SIGSTOP)
        self.make_new_file(root)
        with self.service():
            searching = self.begin("--timeout", "600", "fresh")
            self.await_file(self.queue("alpha"))
            self.kill(pid)

            self.assertEqual(self.finish(searching).code, 3)

    def test_share_that_is_removed_meanwhile(self):
        root = self.make_share()
        pid = self.start()
        self.await_drained("alpha")
        os.kill(pid, signal.SIGSTOP)
        self.make_new_file(root)
        with self.service():
            searching = self.begin("--timeout", "600", "fresh")
            self.await_file(self.queue("alpha"))
            removing = subprocess.Popen(
                [program("fileindexctl"), "share", "remove", "alpha"], env=environment()
            )
            os.kill(pid, signal.SIGCONT)
            self.assertEqual(removing.wait(LIMIT), 0)

            self.assertIn(self.finish(searching).code, (0, 1))

    def test_service_that_is_of_no_help(self):
        self.make_share()
        absent = self.ctl("search", "--wait", "x", code=1)
        self.assertIn(b"fileindex-notifyd does not run", absent.err)

        with FakeService(lambda request: None) as service:
            late = self.ctl("search", "--wait", "--timeout", "1", "--share", "alpha", "x", code=1)
            self.assertIn(b"fileindex-notifyd has not answered within 1 s", late.err)
            service.answer = lambda request: {"ok": False, "error": "no such share: alpha"}
            self.assertIn(b"no such share: alpha", self.ctl("search", "--wait", "x", code=1).err)
            for nonsense in (b"", b"[]", b"{", b"{}", b"7", b"[" * 5000, b'{"ok":"yes"}'):
                service.answer = lambda request, reply=nonsense: reply
                self.ctl("search", "--wait", "x", code=1)

    def test_wrong_usage(self):
        self.make_share()
        for wrong in (
            ("--timeout", "5"),
            ("--wait", "--timeout", "0"),
            ("--wait", "--timeout", "-1"),
            ("--wait", "--timeout", "1.5"),
            ("--wait", "--timeout", "5s"),
            ("--wait", "--timeout", ""),
            ("--wait", "--timeout"),
        ):
            with self.subTest(wrong=wrong):
                # A value that is missing takes the query for one.
                query = () if wrong[-1] == "--timeout" else ("x",)
                self.ctl("search", *wrong, *query, code=2)


class WatchedTest(IndexTest):
    def share(self):
        (share,) = self.ctl("status", "--json").json()["shares"]
        return share

    def test_what_the_service_tells_is_shown(self):
        self.make_share(folders=())
        with FakeService(lambda request: {"ok": True, "shares": [WATCHED]}) as service:
            share = self.share()
            text = self.ctl("status").out.decode()

        self.assertEqual(service.requests[0], {"type": "status"})
        for key, value in WATCHED.items():
            if key != "problem":
                self.assertEqual(share[key], value, key)
        self.assertIsNone(share["watch_problem"])
        self.assertRegex(text, r"\n  watched by +fanotify\n")
        self.assertRegex(text, r"\n  complete until +2023-11-")
        self.assertRegex(text, r"\n  changes +12 read, 5 lines written, 7 folded, 0 not written")
        self.assertRegex(text, r"\n  compared +2020-09-\S+ \S+, differences: 3\n")

    def test_nobody_watches(self):
        self.make_share(folders=())

        self.assertIsNone(self.share()["watched_by"])
        self.assertIsNone(self.share()["complete_until"])
        self.assertEqual(self.share()["watch_problem"], "fileindex-notifyd does not run")
        self.assertRegex(
            self.ctl("status").out, rb"watched by +nobody: fileindex-notifyd does not run\n"
        )

    def test_service_that_tells_nothing_of_use(self):
        self.make_share(folders=())
        with FakeService(lambda request: {"ok": True, "shares": []}) as service:
            self.assertEqual(
                self.share()["watch_problem"], "fileindex-notifyd does not know it yet"
            )
            for nonsense in (
                b"[]",
                b"7",
                b"{",
                b'{"ok":true,"shares":7}',
                b"[" * 5000,
                b'{"ok":true,"shares":[{"name":"alpha","lines":"many"}]}',
            ):
                service.answer = lambda request, reply=nonsense: reply
                share = self.share()
                self.assertIsNone(share["watched_by"])
                self.assertRegex(share["watch_problem"], "fileindex-notifyd")
            service.answer = lambda request: None
            self.assertEqual(self.share()["watch_problem"], "fileindex-notifyd does not answer")

    def test_time_that_goes_on_is_no_news(self):
        root = self.make_share(folders=())
        times = iter(range(10**9, 2 * 10**9))

        def answer(_request):
            return {"ok": True, "shares": [{**WATCHED, "complete_until": next(times)}]}

        with FakeService(answer) as service:
            following = subprocess.Popen(
                [program("fileindexctl"), "status", "--follow", "--json"],
                env=environment(),
                stdout=subprocess.PIPE,
            )
            first = json.loads(following.stdout.readline())
            asked = len(service.requests)
            deadline = time.monotonic() + LIMIT
            while len(service.requests) == asked:  # it looks whenever something happens here
                self.assertIsNone(following.poll())
                self.assertLess(time.monotonic(), deadline)
                self.make_files(root, "x")
                os.unlink(f"{root}/x")
            self.ctl("pause")
            second = json.loads(following.stdout.readline())
            while second["paused_until"] is None:  # the service was too slow for it
                second = json.loads(following.stdout.readline())
            following.send_signal(signal.SIGTERM)
            self.assertEqual(following.communicate(timeout=LIMIT)[0], b"")

        self.assertIsNone(first["paused_until"])
        self.assertEqual(second["paused_until"], 0)


if __name__ == "__main__":
    main()
