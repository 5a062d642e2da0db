# SPDX-License-Identifier: GPL-2.0-or-later
"""Private mount and process namespaces, and the mounts that one test sees.

The test program is process 1 of its namespace: detached processes become its children, so that it
can wait for them and read their exit status, and none outlives it.
"""

import ctypes
import os
import stat
import subprocess
import sys

from harness.scale import IS_LONG

SKIPPED = 77  # the exit status that ctest counts as "skipped"

RUN = "/run"
DISK = "/run/disk"  # a file system that holds the state folder alone
STATE = "/run/disk/state"
DATA = "/run/data"  # a file system for the shares
REPORTS = "/run/reports"  # what sanitizers have to say

MS_BIND = 4096
MNT_DETACH = 2
LOOP_MAJOR = 7
LOOP_DEVICES = 64

_MARK = "FILEINDEXD_TEST_INSIDE"
_libc = ctypes.CDLL(None, use_errno=True)
_world_mounted = False


def has_loop_devices():
    """Whoever is root of a namespace of its own alone has none."""
    return os.access("/dev/loop-control", os.R_OK | os.W_OK)


def mount(source, target, kind="none", flags=0, options=""):
    arguments = [os.fsencode(text) for text in (source, target, kind)]
    if _libc.mount(*arguments, ctypes.c_ulong(flags), options.encode()) != 0:
        error = ctypes.get_errno()
        raise OSError(error, os.strerror(error), target)


def unmount(target, flags=0):
    if _libc.umount2(os.fsencode(target), flags) != 0:
        error = ctypes.get_errno()
        raise OSError(error, os.strerror(error), target)


def enter():
    """Comes back inside the namespaces; outside them the process is replaced."""
    if os.environ.get(_MARK) == "1":
        _make_dev()
        return

    command = ["unshare", "--mount", "--pid", "--fork", "--kill-child", "--mount-proc"]
    if os.geteuid() != 0:
        command += ["--user", "--map-root-user"]
    if subprocess.run([*command, "true"], check=False).returncode != 0:
        print("no private namespaces here" + ("" if IS_LONG else ": skipped"))
        sys.exit(1 if IS_LONG else SKIPPED)

    os.environ[_MARK] = "1"
    os.environ["FILEINDEXD_BIN_DIR"] = os.path.abspath(os.environ["FILEINDEXD_BIN_DIR"])
    os.execvp("unshare", [*command, sys.executable, *sys.argv])


def _make_dev():
    """A /dev of our own that shows the old devices, so that /dev/log can be ours."""
    devices = {}
    for entry in os.scandir("/dev"):
        mode = entry.stat(follow_symlinks=False).st_mode
        if entry.name != "ptmx" and (stat.S_ISCHR(mode) or stat.S_ISBLK(mode)):
            devices[entry.name] = os.open(entry.path, os.O_PATH)

    mount("tmpfs", "/dev", "tmpfs", options="mode=0755")
    for name, fd in devices.items():
        path = f"/dev/{name}"
        try:
            os.mknod(path, os.fstat(fd).st_mode, os.fstat(fd).st_rdev)
        except PermissionError:  # without root the old node can only be shown
            os.close(os.open(path, os.O_CREAT | os.O_WRONLY))
            mount(f"/proc/self/fd/{fd}", path, flags=MS_BIND)
        os.close(fd)
    for number in range(LOOP_DEVICES):
        path = f"/dev/loop{number}"
        if has_loop_devices() and not os.path.exists(path):
            os.mknod(path, stat.S_IFBLK | 0o600, os.makedev(LOOP_MAJOR, number))
    os.symlink("/proc/self/fd", "/dev/fd")
    os.mkdir("/dev/pts")
    mount("devpts", "/dev/pts", "devpts", options="newinstance,ptmxmode=0666")
    os.symlink("pts/ptmx", "/dev/ptmx")


def fresh_world(state_size="256m"):
    """Empty /run, state disk and data disk."""
    global _world_mounted  # pylint: disable=global-statement
    if _world_mounted:
        unmount(RUN, MNT_DETACH)  # with everything that was mounted below
    mount("tmpfs", RUN, "tmpfs", options="mode=0755")
    _world_mounted = True
    if not os.path.samefile("/var/run", RUN):
        mount(RUN, "/var/run", flags=MS_BIND)

    for folder in (DISK, DATA, REPORTS):
        os.mkdir(folder)
    os.chmod(REPORTS, 0o777)
    mount("tmpfs", DISK, "tmpfs", options=f"mode=0755,size={state_size}")
    mount("tmpfs", DATA, "tmpfs", options="mode=0755")
