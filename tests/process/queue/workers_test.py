# SPDX-License-Identifier: GPL-2.0-or-later
"""Workers come and go: dropped, revived, woken by their queue, a thousand times in a row."""

import os

from harness import IndexTest, main, namespace
from harness.standing_in import remove

PAIRS = 1000
CREATE = 0x40


class WorkersTest(IndexTest):
    def test_dropped_worker_leaves_the_queue_for_the_revived_one(self):
        root = self.make_share()
        self.start()
        self.await_drained("alpha")
        self.assertEqual(self.command("delete_share_worker", share_name="alpha"), 0)
        self.make_files(root, "a.txt")
        after = self.log.mark()

        self.append("alpha", {"event": CREATE, "path": f"{root}/a.txt"})
        self.assertEqual(self.command("resume"), 0)
        self.assertTrue(os.path.exists(self.queue("alpha")))
        self.assert_not_logged("Failed to get worker .*", after)  # nobody watches any more

        self.assertEqual(self.command("revive_share_worker", share_name="alpha"), 0)
        self.await_drained("alpha")
        self.assert_index(root)

    def test_share_whose_folder_was_removed_is_drained_once_its_settings_are_read_again(self):
        root = self.make_share(files=("a.txt",))
        self.start()
        self.await_drained("alpha")
        remove(f"{namespace.STATE}/shares/alpha")
        # As whoever queues for it does.
        os.makedirs(f"{namespace.STATE}/shares/alpha", 0o700, exist_ok=True)
        self.make_files(root, "b.txt")
        self.append("alpha", {"event": CREATE, "path": f"{root}/b.txt"})

        after = self.log.mark()
        self.assertEqual(self.command("upsert_folder_setting", folder_path=root), 0)

        # The index went with the folder: the whole share follows what was queued.
        done = "Worker[alpha] finished all task, stopping"
        self.await_lines([f"IndexDirAdd: {root}", done], after)
        self.await_drained("alpha")
        self.assert_index(root)

    def test_finished_thread_is_joined_on_a_quiet_timeout(self):
        self.make_share()
        self.start()

        after = self.await_line("Worker[alpha] finished all task, stopping")

        self.await_line("Worker[alpha] cancelled", after)
        self.assert_not_logged("Worker.alpha. deleted")

    def test_other_files_in_the_queue_folder_wake_nobody(self):
        self.make_share()
        self.start()
        self.await_line("Worker[alpha] cancelled")
        after = self.log.mark()

        for name in ("TALO@file_index_queue2", "TALO@file_index_queu", "other"):
            with open(f"{namespace.STATE}/shares/alpha/{name}", "w", encoding="ascii"):
                pass

        self.assertEqual(self.command("resume"), 0)
        self.assert_not_logged(r"Worker\[alpha\] respawned", after)
        self.append("alpha", b"")
        self.await_line("Worker[alpha] respawned", after)

    def test_two_shares_do_not_touch_each_other(self):
        roots = {name: self.make_share(name, files=("a.txt",)) for name in ("alpha", "beta")}
        self.start()
        for name in roots:
            self.await_drained(name)
        self.assertEqual(self.command("delete_share_worker", share_name="beta"), 0)

        self.make_files(roots["alpha"], "b.txt")
        self.append("alpha", {"event": CREATE, "path": f"{roots['alpha']}/b.txt"})

        self.await_drained("alpha")
        for name, root in roots.items():
            self.assert_index(root, name)

    def test_no_index_at_start_is_made_anew(self):
        root = self.make_share(files=("a.txt", "d/b.txt"))
        pid = self.start()
        self.await_drained("alpha")
        self.stop(pid)
        remove(f"{namespace.STATE}/shares/alpha/index")

        after = self.log.mark()
        self.start()

        self.await_line("Failed to initiate indexer due to path not found, try re-create db", after)
        self.await_drained("alpha")
        self.assert_index(root)

    def test_index_removed_while_running_is_made_anew(self):
        root = self.make_share(files=("a.txt", "d/b.txt"))
        self.start()
        self.await_drained("alpha")
        remove(f"{namespace.STATE}/shares/alpha/index")
        self.make_files(root, "c.txt")
        after = self.log.mark()

        self.append("alpha", {"event": CREATE, "path": f"{root}/c.txt"})

        self.await_line(f"IndexDirAdd: {root}", after)
        self.await_line("Worker[alpha] finished all task, stopping", after)
        self.await_drained("alpha")
        self.assert_index(root)
        (share,) = self.ctl("status", "--json").json()["shares"]
        self.assertFalse(share["needs_reindex"])

    def test_index_damaged_while_running_is_made_anew_without_another_event(self):
        root = self.make_share(files=[f"d/{i}.txt" for i in range(300)])
        self.start()
        self.await_drained("alpha")
        folder = f"{namespace.STATE}/shares/alpha/index"
        for name in ("entries.db", "entries.db-wal"):
            with open(f"{folder}/{name}", "r+b") as file:
                file.write(b"no database" * 300)
        self.make_files(root, "c.txt")
        after = self.log.mark()

        self.append("alpha", {"event": CREATE, "path": f"{root}/c.txt"})

        self.await_line(f"IndexDirAdd: {root}", after)
        self.await_line("Worker[alpha] finished all task, stopping", after)
        self.await_drained("alpha")
        self.assert_index(root)


class ManyPairsTest(IndexTest):
    def test_a_thousand_deletes_and_revives(self):
        root = self.make_share(files=("a.txt",))
        pid = self.start(debug=False)
        self.await_drained("alpha")
        self.assertEqual(self.command("delete_share_worker", share_name="alpha"), 0)
        self.await_alone(pid)
        before = self.descriptors(pid)

        for _ in range(PAIRS):
            self.assertEqual(self.command("revive_share_worker", share_name="alpha"), 0)
            self.assertEqual(self.command("delete_share_worker", share_name="alpha"), 0)

        self.await_alone(pid)
        self.assertEqual(self.descriptors(pid), before)
        self.assertEqual(self.command("revive_share_worker", share_name="alpha"), 0)
        self.append("alpha", {"event": CREATE, "path": f"{root}/a.txt"})
        self.await_drained("alpha")
        self.assert_index(root)


if __name__ == "__main__":
    main()
