# SPDX-License-Identifier: GPL-2.0-or-later
"""Shares on real file systems: ext4 and btrfs on loop devices, tmpfs."""

import contextlib
import errno
import os
import subprocess
import sys
import time

from harness import namespace
from harness.awaiting import IN_CLOSE, LIMIT, FolderWatch
from harness.batch_load import ENDED
from harness.checks import IndexTest
from harness.scale import IS_LONG

IMAGE_SIZE = {"ext4": 512 << 20, "btrfs": 512 << 20, "xfs": 512 << 20}
MAKE = {
    "ext4": ["mkfs.ext4", "-q", "-F", *(["-N", "300000"] if IS_LONG else [])],  # inodes
    "btrfs": ["mkfs.btrfs", "-q", "-f"],
    "xfs": ["mkfs.xfs", "-q", "-f"],
}
MODIFY = 0x2
ATTRIB = 0x4
CLOSE_WRITE = 0x8
CREATE = 0x40
DELETE = 0x80
RENAME = 0x100
RENAME_FULL = 0x200
QUEUE_RESET = 0x400
REINDEX = 0x10000
UPDATE = 0x20000


def run(*command):
    done = subprocess.run(
        list(map(os.fsencode, command)), capture_output=True, check=False, timeout=LIMIT
    )
    assert done.returncode == 0, f"{command}: {done.stderr + done.stdout!r}"


def _mounts(process):
    """(device, mount point) of each."""
    with contextlib.suppress(OSError), open(f"/proc/{process}/mountinfo", "rb") as mounts:
        return [(fields[2], fields[4]) for fields in map(bytes.split, mounts)]
    return []


def _is_mounted_somewhere(mount):
    """Another disk may stand at this place, and this one be bound elsewhere."""
    return any(mount in _mounts(process) for process in filter(str.isdigit, os.listdir("/proc")))


def unmount(folder):
    """Once nothing there is open: the content service may be reading a document.

    A reader's helper that has just begun holds copies of all mounts, until it has a root of its
    own; nothing tells of the end of that.
    """
    deadline = time.monotonic() + LIMIT
    place = os.fsencode(folder)
    mount = [mount for mount in _mounts("self") if mount[1] == place][-1]  # the uppermost
    with FolderWatch(*(path for path, _, _ in os.walk(folder)), mask=IN_CLOSE) as watch:
        while True:
            try:
                namespace.unmount(folder)
                break
            except OSError as error:
                left = deadline - time.monotonic()
                if error.errno != errno.EBUSY or left <= 0:
                    raise
                # A close is told before the mount is let go, a look at a path not at all.
                watch.wait(min(left, 0.1))
    while _is_mounted_somewhere(mount):
        assert time.monotonic() < deadline, f"still mounted somewhere: {folder}"
        time.sleep(0.01)


def make_image(kind, name):
    image = f"{namespace.RUN}/{name}.image"
    with open(image, "wb") as file:
        file.truncate(IMAGE_SIZE[kind])
    run(*MAKE[kind], image)
    return image


def need_loop_devices(test):
    """Skips the test where there are none; at the long scale, which is to try all, it fails."""
    if namespace.has_loop_devices():
        return
    (test.fail if IS_LONG else test.skipTest)("no loop devices here")


class FilesystemTest(IndexTest):
    """A disk of the kind is mounted at `disk`; the share is the folder "share" on it."""

    kind = "tmpfs"

    def setUp(self):
        super().setUp()
        self.disk = f"{namespace.DATA}/disk"
        os.mkdir(self.disk)
        if self.kind != "tmpfs":
            need_loop_devices(self)
        self.image = make_image(self.kind, "disk") if self.kind != "tmpfs" else None
        self.mount_disk()
        self.root = f"{self.disk}/share"
        os.mkdir(self.root)

    def mount_disk(self):
        if self.image:
            run("mount", "-o", "loop", self.image, self.disk)
        else:
            namespace.mount("tmpfs", self.disk, "tmpfs")

    def unmount_disk(self):
        unmount(self.disk)

    def add_share(self, *folders, flags=()):
        self.ctl("share", "add", "alpha", self.root)
        for folder in folders or ("",):
            self.ctl("folder", "add", os.path.join(self.root, folder), *flags)

    def event(self, code, name, *more):
        """Queues one event at a path below the root, and waits until it is done."""
        path = os.fsencode(self.root) + (b"/" + os.fsencode(name) if name else b"")
        self.ctl("event", "alpha", str(code), path, *more)
        self.await_drained("alpha")

    def settle(self, after):
        """Until nothing is queued and no reindex is asked for."""
        while True:
            self.await_drained("alpha")
            (share,) = self.ctl("status", "--json").json()["shares"]
            if not share["needs_reindex"]:
                self.assertIs(share["no_space"], False)
                return
            after = self.await_line(ENDED, after)

    def check(self, **more):
        self.assert_index(self.root, **more)


def on_each(*kinds):
    """Class decorator: the same tests once on each of these kinds of file system."""

    def make(cls):
        module = sys.modules[cls.__module__]
        for kind in kinds:
            name = f"{cls.__name__}On{kind.capitalize()}"
            setattr(module, name, type(name, (cls,), {"kind": kind, "__module__": cls.__module__}))
        return None

    return make
