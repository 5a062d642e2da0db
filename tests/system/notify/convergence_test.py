# SPDX-License-Identifier: GPL-2.0-or-later
"""Files change at random while everything goes wrong; once it is quiet, index and disk agree.

CONVERGENCE_SECONDS: how long (two minutes; ten in the long scale); CONVERGENCE_SEED: another story;
CONVERGENCE_DEBUG: with the daemon's debug lines. An hour of it, from a built tree:

    CONVERGENCE_SECONDS=3600 PYTHONPATH=tests/process FILEINDEXD_BIN_DIR=build/release/bin \\
        python3 tests/system/notify/convergence_test.py
"""

import contextlib
import fcntl
import os
import random
import shutil
import signal
import subprocess
import sys
import time

from harness import main, namespace
from harness.awaiting import LIMIT, await_in_folder
from harness.scale import IS_LONG
from harness.machine import SERVICE_PID_FILE
from harness.watched_disks import WatchedDiskTest
from harness.watching import ask_notifier, raise_more_events_than_are_kept

SECONDS = float(os.environ.get("CONVERGENCE_SECONDS", "600" if IS_LONG else "120"))
SEED = int(os.environ.get("CONVERGENCE_SEED", "1"))
SHARES = ("alpha", "beta", "gamma")
GENERATORS = 3
EXCLUDED = "*.o"
LOOKS = 60  # half a second apart: how long a quiet index may take to be clean


class Generator:
    def __init__(self, seed, roots):
        script = os.path.join(os.path.dirname(os.path.abspath(namespace.__file__)), "churn.py")
        self.process = subprocess.Popen(
            [sys.executable, script, str(seed), *roots],
            stdin=subprocess.PIPE,
            stdout=subprocess.PIPE,
            text=True,
        )

    def begin(self, count):
        self.process.stdin.write(f"{count}\n")
        self.process.stdin.flush()

    def end(self):
        """How many operations changed something."""
        return int(self.process.stdout.readline())


class Convergence(WatchedDiskTest):
    kind = "ext4"
    state_size = "512m"

    def setUp(self):
        super().setUp()
        self.random = random.Random(SEED)
        self.roots = {"alpha": self.root, "beta": f"{self.disk}/second"}
        self.roots["gamma"] = f"{namespace.DATA}/gamma"  # on another file system
        for name in SHARES:
            os.makedirs(self.roots[name], exist_ok=True)
            self.ctl("share", "add", name, self.roots[name])
            self.ctl("folder", "add", self.roots[name], "--exclude", EXCLUDED)
        self.daemon = self.start(debug=bool(os.environ.get("CONVERGENCE_DEBUG")))
        self.start_notifier()
        self.sync(*SHARES)
        self.pressure = f"{namespace.DISK}/filling"
        self.operations = 0
        self.overflows = 0
        self.counted = 0  # of them in this life of the service
        self.troubles = {}
        self.locked = None
        self.has_paused = False
        self.longest = 0  # looks until an index was clean

    # What goes wrong. Each leaves the machine as `mend` can put it right.

    def daemon_killed(self):
        self.kill(self.daemon)
        self.daemon = None
        self.end_content_service()

    def daemon_restarted(self):
        os.kill(self.daemon, signal.SIGTERM)
        self.await_exit(self.daemon)
        self.daemon = self.start(debug=bool(os.environ.get("CONVERGENCE_DEBUG")))

    def service_killed(self):
        self.kill_notifier()

    def service_restarted(self):
        self.stop_notifier()
        self.start_notifier()

    def service_stopped_for_a_while(self):
        self.notifier.send_signal(signal.SIGSTOP)

    def daemon_stopped_for_a_while(self):
        os.kill(self.daemon, signal.SIGSTOP)

    def paused(self):
        self.has_paused = True
        self.ctl("pause", "--for", "2s" if self.random.randrange(2) else "1h")

    def queue_locked(self):
        path = self.queue(self.random.choice(SHARES))
        with contextlib.suppress(OSError):
            self.locked = open(path, "ab")
            fcntl.flock(self.locked, fcntl.LOCK_EX | fcntl.LOCK_NB)

    def disk_filled(self):
        with contextlib.suppress(OSError), open(self.pressure, "wb") as file:
            while True:
                file.write(b"\0" * (1 << 20))

    def event_queue_overflown(self):
        self.notifier.send_signal(signal.SIGSTOP)
        burst = f"{self.random.choice(list(self.roots.values()))}/burst"
        shutil.rmtree(burst, ignore_errors=True)
        os.makedirs(burst, exist_ok=True)
        raise_more_events_than_are_kept(burst)
        self.notifier.send_signal(signal.SIGCONT)

    def folder_settings_changed(self):
        name = self.random.choice(SHARES)
        self.try_ctl("folder", "set", self.roots[name], "--photo=on")

    def mend(self):
        """Ends all that goes wrong."""
        with contextlib.suppress(FileNotFoundError):
            os.unlink(self.pressure)
        if self.locked is not None:
            self.locked.close()
            self.locked = None
        if self.daemon is not None:
            with contextlib.suppress(ProcessLookupError):
                os.kill(self.daemon, signal.SIGCONT)
        if self.notifier is not None:
            self.notifier.send_signal(signal.SIGCONT)
        if self.daemon is None:
            self.daemon = self.start(debug=bool(os.environ.get("CONVERGENCE_DEBUG")))
        if self.notifier is None:
            self.start_notifier()
        if self.has_paused:
            self.has_paused = False
            self.ctl("resume")

    def end_content_service(self):
        with contextlib.suppress(OSError, ValueError):
            with open(SERVICE_PID_FILE, encoding="ascii") as file:
                pid = int(file.read())
            os.kill(pid, signal.SIGKILL)
            self.await_exit(pid)
            os.unlink(SERVICE_PID_FILE)

    def trouble(self):
        chosen = [
            self.random.choice(
                (
                    self.daemon_killed,
                    self.daemon_restarted,
                    self.service_killed,
                    self.service_restarted,
                    self.service_stopped_for_a_while,
                    self.daemon_stopped_for_a_while,
                    self.paused,
                    self.disk_filled,
                    self.folder_settings_changed,
                )
            )
        ]
        if chosen[0] != self.service_killed and self.random.randrange(2):
            chosen.append(self.random.choice((self.queue_locked, self.event_queue_overflown)))
        for make in chosen:
            print(f"{time.monotonic() - self.began:7.1f} s  {make.__name__}", flush=True)
            self.troubles[make.__name__] = self.troubles.get(make.__name__, 0) + 1
            make()

    # The quiet point.

    def await_backlog(self):
        """Until nobody has anything left to do: the service has compared, the queues are gone."""
        self.sync(*SHARES, seconds=300)

    def assert_clean(self, name):
        """By what was told: another comparison would have mended it."""
        compared = self.watched(name)["compared"]
        looks = 0
        while (result := self.try_ctl("verify", name)).code != 0:
            looks += 1
            if looks == LOOKS:
                self.fail(f"{name}: {result}\n{self.watched(name)}\n{self.facts(name, result)}")
            await_in_folder(self.queue(name), lambda: False, 0.5)
        self.longest = max(self.longest, looks)
        self.assertEqual(self.watched(name)["compared"], compared, self.watched(name))

    def facts(self, name, result):
        """Of what differs, and of the folders above it: what the index holds, since when, and what
        is on disk. The story's own times count from `began`."""
        now = f"now {time.time():.6f} s since the epoch, {time.monotonic() - self.began:.6f} s here"
        facts = [now]
        for line in result.out.splitlines():
            path = line.split(b"\t")[-1]
            while path.startswith(os.fsencode(self.roots[name])):
                try:
                    on_disk = os.lstat(path)
                except OSError as error:
                    on_disk = error
                facts += [str(self.try_ctl("info", path, "--json").out), str(on_disk)]
                path = os.path.dirname(path)
        return "\n".join(facts)

    def quiet(self):
        print(f"{time.monotonic() - self.began:7.1f} s  quiet", flush=True)
        self.mend()
        self.await_backlog()
        self.count_overflows()
        for name in SHARES:
            self.assert_clean(name)
            left_out = self.left_out(self.roots[name])
            self.assert_index(self.roots[name], name, left_out=left_out)

    def count_overflows(self):
        """Those of a service that was killed before it could be asked are lost to the count."""
        told = sum(share["overflows"] for share in ask_notifier(type="status")["shares"])
        self.overflows += told - (self.counted if told >= self.counted else 0)
        self.counted = told

    def left_out(self, root):
        found = []
        for folder, _, files in os.walk(os.fsencode(root)):
            found += [os.path.join(folder, name) for name in files if name.endswith(b".o")]
        return found

    def test_after_any_story_index_and_disk_agree(self):
        self.began = time.monotonic()
        roots = list(self.roots.values())
        generators = [Generator(SEED * 1000 + number, roots) for number in range(GENERATORS)]
        quiet_points = 0

        while time.monotonic() - self.began < SECONDS:
            for _ in range(self.random.randrange(1, 5)):
                for generator in generators:
                    generator.begin(self.random.choice((200, 1_500, 4_000)))
                self.trouble()
                self.operations += sum(generator.end() for generator in generators)
                self.mend()
            self.quiet()
            quiet_points += 1

        for generator in generators:
            generator.process.stdin.close()
            generator.process.wait(LIMIT)
        print(
            f"{self.operations} operations, {quiet_points} quiet points, all clean; seed {SEED}; "
            f"{dict(sorted(self.troubles.items()))}; overflows {self.overflows}; "
            f"{self.longest} looks at most",
            flush=True,
        )
        if self.troubles.get("event_queue_overflown", 0) > 10:
            self.assertGreater(self.overflows, 0)


del WatchedDiskTest

if __name__ == "__main__":
    main()
