# SPDX-License-Identifier: GPL-2.0-or-later
"""SIGSTOP and SIGCONT, of the daemon and of the content service, in the middle of what they do."""

import os
import re
import signal

from harness import IndexTest, control, main

FILES = 900
CREATE = 0x40
REINDEX = 0x10000
ADDED = re.compile(r"\[alpha\] Document\[.*\] added")


class StoppedTest(IndexTest):
    def setUp(self):
        super().setUp()
        self.root = self.make_share(files=[f"d{n % 30}/f{n}.txt" for n in range(FILES)])

    def hold(self, pid):
        """Stops the process, and waits until all its threads stand."""
        os.kill(pid, signal.SIGSTOP)
        held = os.waitid(os.P_PID, pid, os.WSTOPPED)
        self.assertEqual((held.si_pid, held.si_status), (pid, signal.SIGSTOP))

    def go_on(self, pid):
        os.kill(pid, signal.SIGCONT)

    def start_drained(self):
        pid = self.start()
        self.await_drained("alpha")
        return pid

    def hold_after(self, pid, count, *lines):
        """Queues the lines, and stops the daemon once that many entries are added."""
        self.log.hold_at(ADDED, count)
        self.append("alpha", *lines)
        self.await_held()
        self.hold(pid)
        self.log.go_on()
        self.assertTrue(os.path.exists(self.queue("alpha") + ".tmp"), "the pass was over")

    def change_more(self):
        self.make_files(self.root, "late.txt")
        self.append("alpha", {"event": CREATE, "path": f"{self.root}/late.txt"})

    def check_goes_on(self, pid):
        self.go_on(pid)
        self.await_drained("alpha")
        self.assert_index(self.root)
        self.stop(pid)

    def test_daemon_in_the_middle_of_a_drain(self):
        pid = self.start_drained()
        names = [f"new{n % 10}/f{n}.txt" for n in range(FILES)]
        self.make_files(self.root, *names)
        folders = sorted({os.path.dirname(name) for name in names})
        lines = [{"event": CREATE, "path": f"{self.root}/{name}"} for name in folders + names]

        self.hold_after(pid, 100, *lines)
        self.change_more()

        self.check_goes_on(pid)

    def test_daemon_in_the_middle_of_a_walk(self):
        pid = self.start_drained()

        self.hold_after(pid, 100, {"event": REINDEX, "path": self.root})
        self.change_more()

        self.check_goes_on(pid)

    def test_client_of_a_stopped_daemon_gets_its_answer(self):
        pid = self.start_drained()
        self.hold(pid)

        # The kernel takes the connection; nobody serves it yet.
        with control.connect() as connection:
            connection.sendall(control.request("resume", {}))
            self.go_on(pid)
            self.assertEqual(control.read_reply(connection), 0)

    def test_daemon_in_the_middle_of_an_exchange(self):
        pid = self.start_drained()
        request = control.request("pause", {"resume_time": 0})
        with control.connect() as connection:
            connection.sendall(request[:7])
            self.hold(pid)
            connection.sendall(request[7:])
            self.go_on(pid)
            self.assertEqual(control.read_reply(connection), 0)

        self.ctl("resume")
        self.change_more()
        self.await_drained("alpha")
        self.assert_index(self.root)

    def test_sigterm_reaches_a_stopped_daemon_when_it_goes_on(self):
        pid = self.start_drained()
        self.hold_after(pid, 100, {"event": REINDEX, "path": self.root})
        os.kill(pid, signal.SIGTERM)
        self.go_on(pid)

        self.assertEqual(self.await_exit(pid), 0)

        self.start_drained()
        self.assert_index(self.root)

    def test_daemon_works_on_while_the_content_service_stands(self):
        pid = self.start()
        service = self.service_pid()
        self.await_drained("alpha")
        after = self.log.mark()
        self.append("alpha", {"event": REINDEX, "path": self.root})
        self.await_line(ADDED, after, 100)
        self.hold(service)
        self.change_more()

        self.await_drained("alpha")

        self.assert_index(self.root)
        self.go_on(service)
        self.stop(pid)
        self.assertEqual(self.await_exit(service), 0)

    def test_content_service_that_stands_does_not_hold_a_stop_up(self):
        pid = self.start_drained()
        service = self.service_pid()
        self.hold(service)

        self.stop(pid)

        self.assertEqual(self.await_exit(service), -signal.SIGKILL)
        self.assert_not_logged("QLIBServiceStop failed.*")


if __name__ == "__main__":
    main()
