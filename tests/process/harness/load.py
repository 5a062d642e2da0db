# SPDX-License-Identifier: GPL-2.0-or-later
"""Changes on disk with a queue line for each, as many as one likes."""

import contextlib
import os
import random
import shutil

DELETE = 0x80
REINDEX = 0x10000


class Load:
    """Random changes below the root of a share, always the same ones for a seed."""

    def __init__(self, root, seed, folders=12, files=30):
        self.root = root
        self.random = random.Random(seed)
        self.folders = folders
        self.files = files
        for folder in range(folders):
            for number in range(files):
                self._write(f"d{folder}/f{number}")

    def _write(self, name):
        path = f"{self.root}/{name}"
        os.makedirs(os.path.dirname(path), exist_ok=True)
        with open(path, "a", encoding="ascii") as file:
            file.write(name)

    def _change(self):
        """The folder and the path that have changed."""
        folder = f"d{self.random.randrange(self.folders)}"
        name = f"{folder}/f{self.random.randrange(self.files)}"
        what = self.random.randrange(12)
        if what == 0:
            shutil.rmtree(f"{self.root}/{folder}", ignore_errors=True)
            return folder, folder
        if what < 5:
            with contextlib.suppress(OSError):
                os.unlink(f"{self.root}/{name}")
        else:
            self._write(name)
        return folder, name

    def lines(self, count):
        """Makes that many changes; their queue lines."""
        found = []
        for _ in range(count):
            for name in self._change():
                path = f"{self.root}/{name}"
                code = REINDEX if os.path.lexists(path) else DELETE
                found.append({"event": code, "path": path})
        return found
