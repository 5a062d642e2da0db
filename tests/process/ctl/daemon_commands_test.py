# SPDX-License-Identifier: GPL-2.0-or-later
"""pause, resume, log-level, worker, status: what goes to the daemon, and what is kept."""

import calendar
import os
import shutil
import time

from harness import IndexTest, control, main, namespace

DAY = 24 * 60 * 60


class PauseCommandTest(IndexTest):
    def paused_until(self):
        return self.ctl("status", "--json").json()["paused_until"]

    def test_without_an_end(self):
        self.start()

        self.ctl("pause")

        self.await_line("SetPaused: true")
        self.assertEqual(self.paused_until(), 0)

    def test_resume_is_sent_twice(self):
        self.start()
        self.ctl("pause")
        after = self.log.mark()

        self.ctl("resume")

        self.await_line("SetPaused: false", after, count=2)
        self.assertEqual(self.logged(after).count("SetPaused: false"), 2)
        self.assertIsNone(self.paused_until())

    def test_outlives_a_restart(self):
        pid = self.start()
        self.ctl("pause", "--for", "1d")
        until = self.paused_until()
        self.stop(pid)

        self.assertEqual(self.paused_until(), until)
        root = self.make_share(files=("a.txt",))
        self.start()
        self.assertTrue(os.path.exists(self.queue("alpha")))
        self.ctl("resume")
        self.await_drained("alpha")
        self.assert_index(root)

    def test_with_the_daemon_stopped(self):
        self.assertIsNone(self.paused_until())
        self.ctl("pause")
        self.assertEqual(self.paused_until(), 0)
        self.ctl("resume")
        self.assertIsNone(self.paused_until())

    def test_durations(self):
        for text, seconds in (("90s", 90), ("15m", 900), ("2h", 7200), ("1d", DAY),
                              ("1h30m", 5400), ("1w", 7 * DAY)):
            with self.subTest(text=text):
                before = int(time.time())

                self.ctl("pause", "--for", text)

                self.assertTrue(before + seconds <= self.paused_until() <= time.time() + seconds)

    def test_times(self):
        moment = calendar.timegm((2099, 3, 4, 5, 6, 7))
        for text in (
            str(moment),
            "2099-03-04T05:06:07Z",
            "2099-03-04 05:06:07Z",
            "2099-03-04T06:06:07+01:00",
            "2099-03-04T00:36:07-0430",
        ):
            with self.subTest(text=text):
                self.ctl("pause", "--until", text)

                self.assertEqual(self.paused_until(), moment)

    def test_time_in_the_past_ends_the_pause(self):
        self.start()
        self.ctl("pause")
        after = self.log.mark()

        self.ctl("pause", "--until", "2001-01-01T00:00:00Z")

        self.await_line("SetPaused: false", after)
        self.assertIsNone(self.paused_until())

    def test_values_that_are_refused(self):
        for option, values in {
            "--for": ("", "90", "s", "-1s", "1.5h", "1x", "1 h", "99999999999999999999s"),
            "--until": ("", "soon", "2099-13-01", "2099-02-30", "2099-01-01T25:00", "12:00"),
        }.items():
            for value in values:
                with self.subTest(option=option, value=value):
                    self.ctl("pause", f"{option}={value}", code=2)
        self.ctl("pause", "--for", "1h", "--until", "2099-01-01", code=2)

        self.assertIsNone(self.paused_until())


class DaemonCommandsTest(IndexTest):
    def test_log_level(self):
        self.start(debug=False)
        after = self.log.mark()

        self.ctl("log-level", "debug")
        self.await_line("Replying socket: 0", after)
        self.ctl("log-level", "error")

        self.ctl("log-level", "loud", code=2)
        self.ctl("log-level", code=2)

    def test_worker_drop_and_revive(self):
        root = self.make_share(files=("a.txt",))
        self.start()
        self.await_drained("alpha")

        self.ctl("worker", "drop", "alpha")
        self.await_line("Worker[alpha] deleted")
        self.ctl("worker", "drop", "alpha")
        after = self.log.mark()
        self.ctl("worker", "revive", "alpha")

        self.await_line("Worker[alpha] created:", after)
        self.assert_index(root)
        self.ctl("worker", "drop", "nope", code=1)
        self.ctl("worker", "revive", "nope", code=1)

    def test_folder_of_a_share_that_was_removed_is_told_of_until_it_is_watched_again(self):
        root = self.make_share(files=("a.txt",))
        self.start()
        self.await_drained("alpha")
        self.assertIs(self.ctl("status", "--json").json()["shares"][0]["unwatched"], False)
        self.assertNotIn(b"does not watch", self.ctl("status").out)

        folder = os.path.dirname(self.queue("alpha"))
        while os.path.exists(folder):  # a Worker that ends may still write
            shutil.rmtree(folder, ignore_errors=True)
        self.ctl("event", "alpha", "8", f"{root}/a.txt")

        self.assertIs(self.ctl("status", "--json").json()["shares"][0]["unwatched"], True)
        self.assertIn(b"does not watch its queue", self.ctl("status").out)
        self.ctl("worker", "drop", "alpha")
        self.ctl("worker", "revive", "alpha")
        self.await_drained("alpha")
        self.assertIs(self.ctl("status", "--json").json()["shares"][0]["unwatched"], False)
        self.assert_index(root)

    def test_without_the_daemon(self):
        self.make_share()

        for arguments in (
            ("log-level", "debug"),
            ("worker", "drop", "alpha"),
            ("worker", "revive", "alpha"),
        ):
            self.ctl(*arguments, code=3)
        self.kill(self.start())
        self.assertTrue(os.path.lexists(control.SOCKET))
        self.ctl("log-level", "debug", code=3)


class StatusTest(IndexTest):
    def status(self):
        return self.ctl("status", "--json").json()

    def test_without_daemon_and_shares(self):
        status = self.status()

        self.assertIs(status["daemon"], False)
        self.assertIsNone(status["paused_until"])
        self.assertEqual(status["shares"], [])
        self.assertNotEqual(self.ctl("status").out, b"")

    def test_running(self):
        root = self.make_share(files=("a.txt", "in/b.txt"))
        before = int(time.time())
        pid = self.start()
        self.await_drained("alpha")

        status = self.status()

        self.assertIs(status["daemon"], True)
        self.assertEqual(status["pid"], pid)
        (share,) = status["shares"]
        self.assertEqual((share["name"], share["waiting"], share["entries"]), ("alpha", 0, 4))
        self.assertTrue(before <= share["last_commit"] <= time.time())
        self.assertIs(share["needs_reindex"], False)
        self.assertIs(share["no_space"], False)
        self.assertIn(b"alpha", self.ctl("status").out)
        self.assert_index(root)

    def test_killed_daemon_is_not_running(self):
        self.kill(self.start())

        self.assertIs(self.status()["daemon"], False)

    def test_waiting_lines(self):
        root = self.make_share()
        for number in range(3):
            self.ctl("event", "alpha", "64", f"{root}/f{number}")

        (share,) = self.status()["shares"]

        self.assertEqual((share["waiting"], share["entries"]), (4, 0))
        self.assertEqual(os.listdir(f"{namespace.STATE}/shares"), ["alpha"])


if __name__ == "__main__":
    main()
