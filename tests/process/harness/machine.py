# SPDX-License-Identifier: GPL-2.0-or-later
"""What a test can do and wait for. Each test gets empty disks and a new log."""

import contextlib
import dataclasses
import fcntl
import glob
import json
import os
import re
import signal
import subprocess
import sys
import time
import unittest

from harness import control, namespace
from harness.awaiting import LIMIT, await_exit, await_in_folder, children
from harness.system_log import PREFIX, SystemLog

PID_FILE = "/run/fileindexd.pid"
SERVICE_PID_FILE = "/run/talocontentsearchd.pid"
QUEUE = "TALO@file_index_queue"
LOG_ERR = 3
SANITIZERS = ("ASAN_OPTIONS", "LSAN_OPTIONS", "TSAN_OPTIONS", "UBSAN_OPTIONS")
NUDGE_SECONDS = 2.0  # after which a queue that nobody took is touched again


@dataclasses.dataclass
class Result:
    code: int
    out: bytes
    err: bytes

    def json(self):
        return json.loads(self.out)

    def objects(self):
        """Of output that is one JSON object a line."""
        return [json.loads(line) for line in self.out.splitlines()]


def environment(**more):
    """What the programs run with. Sanitizers report into files: a daemon has no standard error."""
    result = {**os.environ, "FILEINDEXD_STATE_DIR": namespace.STATE, **more}
    for name in SANITIZERS:
        given = result.get(name)
        result[name] = (given + ":" if given else "") + f"log_path={namespace.REPORTS}/sanitizer"
    return {name: value for name, value in result.items() if value is not None}


def program(name):
    return os.path.join(os.environ["FILEINDEXD_BIN_DIR"], name)


def full_path(shown):
    """The bytes of the path that a JSON object of fileindexctl shows."""
    return bytes.fromhex(shown["path_hex"]) if "path_hex" in shown else shown["path"].encode()


class MachineTest(unittest.TestCase):
    maxDiff = None
    state_size = "256m"

    def setUp(self):
        namespace.fresh_world(self.state_size)
        self.log = SystemLog()
        self.prefixed = True  # every line of the daemon has its source in front

    def tearDown(self):
        self.kill_all()
        self.log.close()
        self._check_reports()
        self._check_lines()

    def _check_reports(self):
        for name in sorted(os.listdir(namespace.REPORTS)):
            with open(f"{namespace.REPORTS}/{name}", encoding="utf-8", errors="replace") as file:
                self.fail(f"a sanitizer's report, {name}:\n{file.read()}")

    def _check_lines(self):
        for line in self.log.lines:
            if line.program == "fileindexd" and self.prefixed:
                self.assertEqual(line.priority, LOG_ERR, line)
                self.assertRegex(line.message, PREFIX, line)

    def run(self, result=None):
        result = result if result is not None else self.defaultTestResult()
        before = len(result.failures) + len(result.errors)
        super().run(result)
        if len(result.failures) + len(result.errors) > before and hasattr(self, "log"):
            print(f"log of {self.id()}:", flush=True)
            self.log.print()
        return result

    # The daemon.

    def launch(self, debug=True, **more):
        """Runs the daemon's program to the end of its first process."""
        level = "debug" if debug else None
        done = subprocess.run(
            [program("fileindexd")],
            env=environment(FILEINDEXD_LOG_LEVEL=level, **more),
            check=False,
            timeout=LIMIT,
        )
        self.assertEqual(done.returncode, 0)

    def start(self, debug=True, **more):
        """Starts the daemon; returns its pid once it serves."""
        after = self.log.mark()
        self.launch(debug, **more)
        if debug:
            self.await_line("Search daemon launched ...", after)
        else:
            self.await_file(SERVICE_PID_FILE)
        return self.daemon_pid()

    def daemon_pid(self):
        with open(PID_FILE, encoding="ascii") as file:
            return int(file.read())

    def service_pid(self):
        """The content service's pid, once it has written it down."""
        self.await_file(SERVICE_PID_FILE)

        def written():
            return os.path.getsize(SERVICE_PID_FILE) > 0

        self.assertTrue(await_in_folder(SERVICE_PID_FILE, written))
        with open(SERVICE_PID_FILE, encoding="ascii") as file:
            return int(file.read())

    def detached_pid(self):
        """The daemon, when its pid file is not to be had."""
        found = [pid for pid, name in children().items() if name == "fileindexd"]
        self.assertEqual(len(found), 1, children())
        return found[0]

    def descriptors(self, pid):
        return len(os.listdir(f"/proc/{pid}/fd"))

    def await_alone(self, pid):
        """Until the process has no thread but its first.

        One that was joined is listed a moment longer, and nothing tells of the end of that. The
        sanitizer of threads has two of its own.
        """
        alone = 3 if "TSAN_OPTIONS" in os.environ else 1
        deadline = time.monotonic() + LIMIT
        while len(threads := os.listdir(f"/proc/{pid}/task")) > alone:
            self.assertLess(time.monotonic(), deadline, threads)
            os.sched_yield()

    def await_exit(self, pid):
        status = await_exit(pid)
        self.assertIsNotNone(status, f"process {pid} still runs after {LIMIT} s")
        return status

    def stop(self, pid, number=signal.SIGTERM):
        os.kill(pid, number)
        self.assertEqual(self.await_exit(pid), 0)

    def kill(self, pid):
        os.kill(pid, signal.SIGKILL)
        self.assertEqual(self.await_exit(pid), -signal.SIGKILL)

    def kill_all(self):
        """Every program that runs."""
        for pid in children():
            with contextlib.suppress(ProcessLookupError):
                os.kill(pid, signal.SIGKILL)
        while left := children():  # whose children come to us in turn
            for pid in left:
                with contextlib.suppress(ProcessLookupError):
                    os.kill(pid, signal.SIGKILL)
                os.waitpid(pid, 0)

    # Its log.

    def await_line(self, wanted, after=0, count=1):
        """Position behind the line. `wanted`: the text after the prefix, or a pattern for it.

        Queues are touched meanwhile: what is queued between a Worker's last look and its end waits.
        """
        for _ in range(int(LIMIT / NUDGE_SECONDS)):
            position = self.log.find(wanted, after, count, NUDGE_SECONDS)
            if position is not None:
                return position
            self.touch_queues()
        return self.fail(f"not logged within {LIMIT} s: {wanted!r}")

    def touch_queues(self):
        """As the notification service does with queues that nobody takes."""
        for path in glob.glob(f"{namespace.STATE}/shares/*/{QUEUE}"):
            self.touch_queue(path)

    def touch_queue(self, queue):
        with contextlib.suppress(OSError):  # taken meanwhile; a new one would be a pass of its own
            os.close(os.open(queue, os.O_WRONLY | os.O_APPEND | os.O_NONBLOCK))

    def await_held(self):
        """Until the log is held, see SystemLog.hold_at. Queues are touched as above."""
        for _ in range(int(LIMIT / NUDGE_SECONDS)):
            if self.log.await_held(NUDGE_SECONDS):
                return
            self.touch_queues()
        self.fail(f"the log was not held within {LIMIT} s")

    def await_lines(self, wanted, after=0):
        """All of them, in this order, whatever lies between."""
        for text in wanted:
            after = self.await_line(text, after)
        return after

    def logged(self, after=0):
        """The texts of all lines that were sent by now."""
        return self.log.texts(after, self.log.mark())

    def assert_not_logged(self, pattern, after=0):
        found = [text for text in self.logged(after) if re.fullmatch(pattern, text)]
        self.assertEqual(found, [])

    # Files.

    def await_file(self, path):
        """Until it is there. Queues are touched meanwhile, as in await_line."""
        for _ in range(int(LIMIT / NUDGE_SECONDS)):
            if await_in_folder(path, lambda: os.path.lexists(path), NUDGE_SECONDS):
                return
            self.touch_queues()
        self.fail(f"no {path}")

    def await_gone(self, path):
        gone = await_in_folder(path, lambda: not os.path.lexists(path))
        self.assertTrue(gone, f"still there: {path}")

    # The control socket.

    def command(self, kind, **data):
        return control.exchange(control.request(kind, data))

    def hold_in_pause(self, share, *lines):
        """Pauses, queues the lines, and has a fresh Worker wait before it reads them."""
        self.assertEqual(self.command("delete_share_worker", share_name=share), 0)
        self.assertEqual(self.command("pause"), 0)
        self.append(share, *lines)
        self.assertEqual(self.command("revive_share_worker", share_name=share), 0)

    # Queues.

    def queue(self, share):
        return f"{namespace.STATE}/shares/{share}/{QUEUE}"

    def append(self, share, *lines):
        """Appends lines (bytes, or objects) as the notification service does."""
        texts = [line if isinstance(line, bytes) else json.dumps(line).encode() for line in lines]
        self.append_bytes(share, b"".join(text + b"\n" for text in texts))

    def append_bytes(self, share, data):
        path = self.queue(share)
        while True:
            with open(path, "ab", buffering=0) as file:
                fcntl.flock(file, fcntl.LOCK_EX)
                with contextlib.suppress(FileNotFoundError):
                    if os.path.samestat(os.fstat(file.fileno()), os.stat(path)):
                        file.write(data)
                        return  # closing is the unlock

    def await_taken(self, share):
        """Until a Worker has taken the queue."""
        self._await_queue(share, [""])

    def await_drained(self, share):
        """Until all that was queued is executed and committed."""
        # The queue may be made between the two looks, while its copy is still there.
        self._await_queue(share, ["", ".tmp", "", ".tmp"])

    def _await_queue(self, share, endings):
        """Until the queue file and its copy, or one of them, are gone.

        A line that comes between a Worker's last look and its end waits for the next one: the
        queue is touched when nobody takes it, as the notification service does.
        """
        queue = self.queue(share)

        def gone():
            return not any(os.path.lexists(queue + ending) for ending in endings)

        for _ in range(int(LIMIT / NUDGE_SECONDS)):
            if await_in_folder(queue, gone, NUDGE_SECONDS):
                return
            self.touch_queue(queue)
        self.fail(f"not drained: {os.listdir(os.path.dirname(queue))}")

    # fileindexctl.

    def ctl(self, *arguments, code=0, **more):
        """Runs the command, which has to end with that code; None: with any but 0."""
        result = self.try_ctl(*arguments, **more)
        if code is None:
            self.assertNotEqual(result.code, 0, f"{arguments}: {result}")
        else:
            self.assertEqual(result.code, code, f"{arguments}: {result}")
        if code == 0 and arguments[:1] == ("search",):  # what else could be asked is no complaint
            self.assertRegex(result.err, rb"\A(Did you mean: [^\n]+\n)?\Z", arguments)
        elif code == 0:
            self.assertEqual(result.err, b"", arguments)
        elif result.err or arguments[:1] != ("verify",):  # a difference is no error
            self.assertRegex(result.err, rb"\Afileindexctl: [^\n]+\n\Z", arguments)
        return result

    def try_ctl(self, *arguments, limit=LIMIT * 2, **more):
        """Runs the command, whatever comes of it, for `limit` seconds at most."""
        command = [os.fsencode(program("fileindexctl")), *map(os.fsencode, arguments)]
        done = subprocess.run(
            command,
            env=environment(**more),
            stdin=subprocess.DEVNULL,
            capture_output=True,
            check=False,
            timeout=limit,
        )
        return Result(done.returncode, done.stdout, done.stderr)

    def make_share(self, name="alpha", files=(), folders=("",), flags=()):
        """A share with these files (ending in "/": folders), and these folders of it indexed."""
        root = f"{namespace.DATA}/{name}"
        os.makedirs(root, exist_ok=True)
        self.make_files(root, *files)
        self.ctl("share", "add", name, root)
        for folder in folders:
            self.ctl("folder", "add", os.path.join(root, folder), *flags)
        return root

    def make_files(self, root, *names):
        for name in names:
            path = os.path.join(root, name)
            if name.endswith("/"):
                os.makedirs(path, exist_ok=True)
                continue
            os.makedirs(os.path.dirname(path), exist_ok=True)
            with open(path, "w", encoding="utf-8") as file:
                file.write(name)

    def dump(self, share="alpha"):
        """The paths of the index, as bytes, in its order."""
        paths = self.ctl("dump", share, "-0").out.split(b"\0")
        self.assertEqual(paths.pop(), b"")
        return paths


def main():
    """Runs the tests of the calling file inside the namespaces."""
    namespace.enter()
    sys.stdout.reconfigure(errors="backslashreplace")
    unittest.main(verbosity=2)
