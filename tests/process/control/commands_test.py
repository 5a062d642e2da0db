# SPDX-License-Identifier: GPL-2.0-or-later
"""Every control command: replies and log lines."""

import os
import time

from harness import MachineTest, control, main, namespace

FAR = 10**6  # seconds


class CommandsTest(MachineTest):
    def check(self, reply, lines, kind, **data):
        """The command gets that reply, and exactly these lines are logged about it."""
        after = self.log.mark()

        self.assertEqual(self.command(kind, **data), reply)

        end = self.await_line(f"Replying socket: {reply}", after)
        seen = self.log.texts(after, end)
        self.assertRegex(seen[0], rf'Got command: .*"{kind}"')
        self.assertEqual(seen[1:-1], lines)

    def test_resume_as_its_bytes(self):
        self.start()

        self.assertEqual(control.exchange(b"\x1c\0\0\0" + b'{"type":"resume","data":{}}\0'), 0)

        self.await_line("SetPaused: false")

    def test_pause_and_resume(self):
        self.start()
        now = int(time.time())

        self.check(0, ["SetPaused: true"], "pause")
        self.check(0, ["SetPaused: true"], "pause", resume_time=0)
        self.check(0, ["SetPaused: true"], "pause", resume_time=now + FAR)
        self.check(0, ["SetPaused: true"], "pause", resume_time=2**62)
        self.check(0, ["SetPaused: false"], "pause", resume_time=now - FAR)
        self.check(0, ["SetPaused: false"], "pause", resume_time=-1)
        self.check(0, ["SetPaused: false"], "resume")
        self.check(0, ["SetPaused: false"], "resume", resume_time=0)

    def test_timed_pause_ends_by_itself(self):
        self.start()

        ahead = 2
        said = []
        while "SetPaused: true" not in said:  # the time may have come before it is served
            after = self.log.mark()
            self.assertEqual(self.command("pause", resume_time=int(time.time()) + ahead), 0)
            said = self.logged(after)
            ahead *= 3

        self.await_line("SetPaused: false", after)

    def test_log_level(self):
        self.start()
        self.check(0, [], "set_log_level", log_level="debug")
        self.check(-1, ["Unknown log level: loud"], "set_log_level", log_level="loud")
        self.check(-1, ["Unknown log level: Debug"], "set_log_level", log_level="Debug")
        self.check(-1, ["Unknown log level: "], "set_log_level")

        after = self.log.mark()
        self.assertEqual(self.command("set_log_level", log_level="error"), 0)
        self.assertEqual(self.command("resume"), 0)
        self.assertEqual(self.command("set_log_level", log_level="debug"), 0)

        self.await_line("Replying socket: 0", after)
        seen = self.log.texts(after)
        self.assertRegex(seen[0], "Got command: ")
        self.assertEqual(seen[1:], ["SetPaused: false", "Replying socket: 0"])

    def test_unknown_types(self):
        self.start()

        for kind in ("Pause", "PAUSE", "pause ", "", "reload"):
            self.check(-1, [f"Unknown command type: {kind}"], kind)

    def test_upsert_creates_the_worker_then_reloads_it(self):
        root = self.make_share(files=("a.txt",))
        self.start()
        self.assertEqual(self.command("delete_share_worker", share_name="alpha"), 0)
        after = self.log.mark()

        self.assertEqual(self.command("upsert_folder_setting", folder_path=root), 0)
        self.await_line("Worker[alpha] created:", after)
        after = self.log.mark()
        self.assertEqual(self.command("upsert_folder_setting", folder_path=root), 0)

        self.await_line("Worker[alpha] reload setting", after)
        self.assert_not_logged(r"Worker\[alpha\] created:", after)

    def test_upsert_in_no_share(self):
        self.start()

        for path in ("/nowhere", "", f"{namespace.DATA}/alpha2"):
            line = f"GetShareNameByPath failed, path={path}"
            self.check(-1, [line], "upsert_folder_setting", folder_path=path)
        self.check(-1, ["GetShareNameByPath failed, path="], "upsert_folder_setting")

    def test_upsert_in_a_share_that_is_gone(self):
        root = self.make_share()
        os.rename(root, root + ".away")
        self.start()

        self.check(
            -1,
            [
                "Skip share[alpha] which cannot be indexed",
                "CreateWorker failed, share=alpha",
            ],
            "upsert_folder_setting",
            folder_path=root,
        )

    def test_delete_folder_setting_in_no_share(self):
        self.start()

        line = "GetShareNameByPath failed, path=/nowhere"
        self.check(-1, [line], "delete_folder_setting", folder_path="/nowhere")

    def test_delete_folder_setting_without_worker(self):
        root = self.make_share(folders=())
        self.start()

        line = "Cannot find worker:alpha"
        self.check(-1, [line], "delete_folder_setting", folder_path=root)

    def test_delete_folder_setting_with_settings_left_reloads(self):
        root = self.make_share()
        self.start()
        self.await_line("Worker[alpha] finished all task, stopping")

        line = "Worker[alpha] reload setting"
        self.check(0, [line], "delete_folder_setting", folder_path=root)

    def test_delete_folder_setting_of_the_last_deletes_the_worker(self):
        root = self.make_share()
        self.start()
        self.ctl("worker", "revive", "alpha")
        after = self.log.mark()

        self.ctl("folder", "remove", root)

        self.await_line("Worker[alpha] deleted", after)
        line = "Cannot find worker:alpha"
        self.check(-1, [line], "delete_folder_setting", folder_path=root)

    def test_delete_share_worker(self):
        self.make_share()
        self.start()
        after = self.log.mark()

        self.assertEqual(self.command("delete_share_worker", share_name="alpha"), 0)

        self.await_line("Worker[alpha] deleted", after)
        self.check(0, [], "delete_share_worker", share_name="alpha")
        self.check(0, [], "delete_share_worker", share_name="nope")
        self.check(0, [], "delete_share_worker")

    def test_revive_share_worker(self):
        self.make_share()
        self.start()
        after = self.log.mark()

        self.assertEqual(self.command("revive_share_worker", share_name="alpha"), 0)

        self.await_lines(["Worker[alpha] deleted", "Worker[alpha] created:"], after)

    def test_revive_of_an_unknown_share(self):
        self.start()

        self.check(
            -1,
            ["TALOShareGet failed, share=nope", "CreateWorker failed, share=nope"],
            "revive_share_worker",
            share_name="nope",
        )


if __name__ == "__main__":
    main()
