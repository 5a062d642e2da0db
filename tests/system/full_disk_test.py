# SPDX-License-Identifier: GPL-2.0-or-later
"""Full disks: nothing is lost for good, and the index is whole once there is space again."""

import os

from harness import main, namespace
from harness.awaiting import await_in_folder
from harness.batch_load import ENDED
from harness.filesystems import CREATE, REINDEX, FilesystemTest

FILES = 3000


class FullStateDiskTest(FilesystemTest):
    state_size = "16m"

    def fill(self, path):
        """Takes all space of the disk at `path`."""
        with open(f"{path}/filler", "wb", buffering=0) as file:
            for size in (1 << 20, 4096, 1):
                try:
                    while True:
                        file.write(b"\1" * size)
                except OSError:
                    pass

    def test_full_while_indexing(self):
        self.make_files(self.root, *(f"d{n % 40}/name of file {n}.txt" for n in range(FILES)))
        pid = self.start()
        self.assertEqual(self.command("pause"), 0)
        self.add_share()
        self.fill(namespace.DISK)
        self.assertEqual(self.command("resume"), 0)
        self.await_line(ENDED)
        os.unlink(f"{namespace.DISK}/filler")

        self.make_files(self.root, "late.txt")
        self.event(CREATE, "late.txt")

        self.stop(pid)
        self.start()
        self.await_drained("alpha")
        self.check()

    def test_full_for_a_while(self):
        self.add_share()
        self.start()
        self.await_drained("alpha")
        self.make_files(self.root, *(f"d{n % 40}/name of file {n}.txt" for n in range(FILES)))
        after = self.log.mark()
        self.append("alpha", {"event": REINDEX, "path": self.root})
        self.fill(namespace.DISK)
        self.await_line(ENDED, after)
        os.unlink(f"{namespace.DISK}/filler")

        self.make_files(self.root, "late.txt")
        after = self.log.mark()
        self.event(CREATE, "late.txt")

        self.settle(after)
        self.check()

    def test_tools_say_so(self):
        self.add_share()
        self.fill(namespace.DISK)

        result = self.ctl("share", "add", "beta", namespace.DATA, code=1)

        self.assertEqual(result.out, b"")


class FullShareTest(FilesystemTest):
    kind = "ext4"

    def fill_share(self):
        """Leaves less space than an index wants to be kept free. The file that takes the rest."""
        filler = f"{self.disk}/filler"
        with open(filler, "wb") as file:
            space = os.statvfs(self.disk)
            os.posix_fallocate(file.fileno(), 0, space.f_bavail * space.f_frsize * 999 // 1000)
        return filler

    def test_share_that_is_full_at_the_start_gets_no_worker_until_it_is_revived(self):
        self.make_files(self.root, "a.txt")
        self.add_share()
        filler = self.fill_share()

        self.start()

        self.await_lines(
            [
                "Share[alpha] is running out space",
                "Failed to initiate worker for share=alpha",
                "CreateWorker failed, share=alpha",
            ]
        )
        self.ctl("worker", "revive", "alpha", code=1)
        os.unlink(filler)
        self.ctl("worker", "revive", "alpha")
        self.await_drained("alpha")
        self.check()

    def await_no_space(self):
        """The flag is set just after the line."""

        def is_set():
            (share,) = self.ctl("status", "--json").json()["shares"]
            return share["no_space"]

        self.assertTrue(await_in_folder(f"{namespace.STATE}/state.db", is_set))

    def test_full_share_stops_and_goes_on(self):
        self.make_files(self.root, "a.txt")
        self.add_share()
        self.start()
        self.await_drained("alpha")
        filler = self.fill_share()
        self.make_files(self.root, "b.txt")
        after = self.log.mark()

        self.append("alpha", {"event": CREATE, "path": f"{self.root}/b.txt"})

        self.await_line("Share[alpha] is running out space", after)
        self.await_no_space()
        os.unlink(filler)
        self.make_files(self.root, "c.txt")
        self.event(CREATE, "c.txt")
        self.check()
        (share,) = self.ctl("status", "--json").json()["shares"]
        self.assertIs(share["no_space"], False)


if __name__ == "__main__":
    main()
