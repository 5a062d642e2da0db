# SPDX-License-Identifier: GPL-2.0-or-later
"""What an administrator's hand puts in a file's place, or takes away."""

import ctypes
import errno
import os
import shutil
import subprocess

AT_FDCWD = -100
RENAME_EXCHANGE = 2

_libc = ctypes.CDLL(None, use_errno=True)


def remove(path):
    if os.path.isdir(path) and not os.path.islink(path):
        while os.path.isdir(path):
            try:
                shutil.rmtree(path)
            except OSError as error:  # the content service may be making a folder there
                if error.errno not in (errno.ENOTEMPTY, errno.ENOENT):
                    raise
    elif os.path.lexists(path):
        os.unlink(path)


def empty(folder):
    """One after the other, as users do."""
    subprocess.run(["find", folder, "-mindepth", "1", "-delete"], check=True)


def replace(path, make):
    """At once: programs make what is missing anew."""
    made = f"{path}.made"
    make(made)
    names = (AT_FDCWD, os.fsencode(made), AT_FDCWD, os.fsencode(path))
    if _libc.renameat2(*names, RENAME_EXCHANGE) == 0:
        remove(made)
    elif ctypes.get_errno() == errno.ENOENT:
        os.rename(made, path)
    else:
        raise OSError(ctypes.get_errno(), "renameat2", path)


def make_full_folder(path):
    os.makedirs(f"{path}/in/its/place")
