# SPDX-License-Identifier: GPL-2.0-or-later
"""A program that changes files at random, in bursts and pauses, always the same for a seed.

    python3 churn.py SEED ROOT...

Standard input steers it: a line with a number makes it do so many operations and answer with how
many of them changed something; the end of the input ends it.
"""

import contextlib
import os
import random
import shutil
import sys
import time

FOLDERS = ["d0", "d1", "d2", "d3", "d4", "sub dir", "über", "#snapshot"]
FILES = [
    *(f"f{number}.txt" for number in range(24)),
    "x.o",
    ".hidden",
    "~$lock.docx",
    "new\nline",
    "photo.JPG",
]


class Churn:
    def __init__(self, seed, roots):
        self.random = random.Random(seed)
        self.roots = roots
        self.actions = [
            (24, self.write),
            (10, self.append),
            (8, self.remove),
            (8, self.make_folder),
            (14, self.rename_file),
            (4, self.rename_folder),
            (2, self.remove_folder),
            (3, self.truncate),
            (4, self.attributes),
            (3, self.link),
            (3, self.symbolic_link),
            (1, self.swap),
            (1, self.replace),
            (2, self.save_like_an_editor),
        ]
        self.weights = [weight for weight, _ in self.actions]

    def folder(self, root=None):
        depth = self.random.choice((0, 1, 1, 2, 2, 3))
        parts = [self.random.choice(FOLDERS) for _ in range(depth)]
        return os.path.join(root or self.random.choice(self.roots), *parts)

    def file(self):
        return os.path.join(self.folder(), self.random.choice(FILES))

    def subfolder(self):
        return os.path.join(self.folder(), self.random.choice(FOLDERS))

    def write(self):
        path = self.file()
        try:
            fd = os.open(path, os.O_CREAT | os.O_WRONLY | os.O_TRUNC, 0o644)
        except FileNotFoundError:
            os.makedirs(os.path.dirname(path), exist_ok=True)
            fd = os.open(path, os.O_CREAT | os.O_WRONLY | os.O_TRUNC, 0o644)
        os.write(fd, b"x" * self.random.randrange(200))
        os.close(fd)

    def append(self):
        fd = os.open(self.file(), os.O_WRONLY | os.O_APPEND)
        os.write(fd, b"more")
        os.close(fd)

    def remove(self):
        os.unlink(self.file())

    def make_folder(self):
        os.mkdir(self.subfolder())

    def rename_file(self):
        os.rename(self.file(), self.file())

    def rename_folder(self):
        os.rename(self.subfolder(), self.subfolder())

    def remove_folder(self):
        path = self.subfolder()
        if not os.path.isdir(path):
            raise FileNotFoundError(path)
        shutil.rmtree(path, ignore_errors=True)

    def truncate(self):
        os.truncate(self.file(), self.random.randrange(50))

    def attributes(self):
        if self.random.randrange(2):
            os.chmod(self.file(), self.random.choice((0o600, 0o644, 0o755)))
        else:
            os.utime(self.file(), (1e9, self.random.randrange(10**9)))

    def link(self):
        os.link(self.file(), self.file(), follow_symlinks=False)

    def symbolic_link(self):
        os.symlink(self.random.choice((self.file(), "f1.txt", "nowhere")), self.file())

    def swap(self):
        one, two = self.subfolder(), self.subfolder()
        os.rename(one, one + ".swapping")
        try:
            os.rename(two, one)
        finally:
            with contextlib.suppress(OSError):
                os.rename(one + ".swapping", two)

    def replace(self):
        """A folder in the place of a file, or the other way."""
        path = self.subfolder()
        if os.path.isdir(path):
            shutil.rmtree(path, ignore_errors=True)
            os.close(os.open(path, os.O_CREAT | os.O_WRONLY | os.O_NOFOLLOW))
        else:
            os.unlink(path)
            os.mkdir(path)

    def save_like_an_editor(self):
        path = self.file()
        with open(path + ".tmp", "w", encoding="ascii") as file:
            file.write("saved")
        os.rename(path + ".tmp", path)

    def run(self, count):
        changed = 0
        burst = 0
        for _ in range(count):
            if burst == 0:
                burst = int(self.random.expovariate(1 / 400)) + 1
                if self.random.randrange(4) == 0:
                    time.sleep(self.random.random() / 20)  # people pause
            burst -= 1
            action = self.random.choices(self.actions, self.weights)[0][1]
            with contextlib.suppress(OSError, shutil.Error):
                action()
                changed += 1
        return changed


def main():
    churn = Churn(int(sys.argv[1]), sys.argv[2:])
    for line in sys.stdin:
        print(churn.run(int(line)), flush=True)


if __name__ == "__main__":
    main()
