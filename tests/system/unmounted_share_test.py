# SPDX-License-Identifier: GPL-2.0-or-later
"""A disk that is away must not empty an index."""

import os

from harness import main
from harness.filesystems import (
    CREATE,
    DELETE,
    MODIFY,
    REINDEX,
    RENAME_FULL,
    UPDATE,
    FilesystemTest,
    make_image,
    on_each,
    run,
)


@on_each("ext4", "btrfs")
class UnmountedShare(FilesystemTest):
    def setUp(self):
        super().setUp()
        self.make_files(self.root, "a.txt", "in/b.txt", "in/deep/c.txt")
        self.add_share()
        self.pid = self.start()
        self.await_drained("alpha")
        self.check()
        self.before = self.dump()

    def send_everything(self):
        """Every operation on what cannot be seen, and on the root."""
        for name in ("", "in", "in/b.txt", "new.txt"):
            path = os.path.join(self.root, name) if name else self.root
            lines = [
                {"event": code, "path": path}
                for code in (CREATE, MODIFY, DELETE, REINDEX, UPDATE, RENAME_FULL)
            ]
            for line in lines:
                self.append("alpha", line)
                self.await_drained("alpha")

    def check_unchanged(self):
        self.assertEqual(self.dump(), self.before)
        result = self.ctl("verify", "alpha", code=1)
        self.assertEqual(result.out, b"")
        self.assertRegex(result.err, b"alpha|" + self.root.encode())

    def check_goes_on(self):
        """After mounting again: what was there is there, and new events count."""
        self.make_files(self.root, "new.txt")
        os.unlink(f"{self.root}/a.txt")
        self.event(CREATE, "new.txt")
        self.event(DELETE, "a.txt")
        self.check()

    def test_unmounted_while_running(self):
        self.unmount_disk()

        self.send_everything()

        self.check_unchanged()
        self.mount_disk()
        self.check_goes_on()

    def test_unmounted_while_running_with_the_folder_in_its_place(self):
        self.unmount_disk()
        self.make_files(self.root, "impostor.txt")

        self.send_everything()

        self.check_unchanged()
        self.mount_disk()
        self.check_goes_on()

    def test_unmounted_while_stopped(self):
        self.stop(self.pid)
        self.unmount_disk()

        after = self.log.mark()
        self.start()

        self.await_line("Skip share[alpha] which cannot be indexed", after)
        self.check_unchanged()
        self.mount_disk()
        self.ctl("worker", "revive", "alpha")
        self.check_goes_on()

    def test_mounted_again_before_a_restart(self):
        self.unmount_disk()
        self.stop(self.pid)
        self.mount_disk()

        self.start()

        self.check_goes_on()

    def test_other_disk_in_its_place(self):
        self.unmount_disk()
        other = make_image(self.kind, "other")
        run("mount", "-o", "loop", other, self.disk)
        self.make_files(self.root, "foreign.txt")

        self.send_everything()

        self.check_unchanged()
        self.unmount_disk()
        self.mount_disk()
        self.check_goes_on()

    def test_unmounted_between_drain_and_walk(self):
        self.hold_in_pause("alpha", {"event": REINDEX, "path": self.root})
        self.unmount_disk()

        self.ctl("resume")
        self.await_drained("alpha")

        self.check_unchanged()
        self.mount_disk()
        self.check_goes_on()


if __name__ == "__main__":
    main()
