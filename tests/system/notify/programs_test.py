# SPDX-License-Identifier: GPL-2.0-or-later
"""Whatever ordinary programs do to files, the index follows, on every kind of file system."""

import os
import shutil
import subprocess

from harness import main
from harness.awaiting import LIMIT
from harness.filesystems import on_each, run
from harness.scale import IS_LONG
from harness.watched_disks import (
    BoundTest,
    FuseTest,
    NestedSubvolumeTest,
    OverlayTest,
    SubvolumeTest,
    WatchedDiskTest,
)


def write(path, text="text"):
    with open(path, "w", encoding="ascii") as file:
        file.write(text)


class Programs:
    """The stories; the classes below put them on file systems."""

    def setUp(self):
        super().setUp()
        self.make_files(self.root, "a.txt", "b.txt", "d/e/f.txt", "d/g.txt", "music/x.mp3")
        self.begin()

    def at(self, *names):
        return os.path.join(self.root, *names)

    def sh(self, script):
        done = subprocess.run(
            ["bash", "-ec", script],
            cwd=self.root,
            env={**os.environ, "GIT_CONFIG_GLOBAL": "/dev/null", "ELSEWHERE": self.elsewhere},
            capture_output=True,
            check=False,
            timeout=LIMIT,
        )
        self.assertEqual(done.returncode, 0, done.stderr)

    def follow(self, script):
        with self.subTest(script):
            self.sh(script)
            self.assert_converged(self.root)

    def test_single_files(self):
        self.follow("echo new > new.txt")
        self.follow("echo more >> a.txt")
        self.follow("truncate -s 3 a.txt")
        self.follow(": > a.txt")
        self.follow("chmod 600 a.txt; chown 1000:1000 b.txt")
        self.follow("touch -d '2001-02-03 04:05' b.txt")
        self.follow("rm b.txt")
        self.follow("mkfifo pipe; rm new.txt; mkfifo new.txt")
        self.follow("rm new.txt; echo again > new.txt")

    def test_links(self):
        self.follow("ln -s a.txt link; ln -s nowhere dangling; ln -s d folder_link")
        self.follow("ln -sfn b.txt link")
        self.follow("ln a.txt second; ln a.txt d/third")
        self.follow("echo longer than before >> second")
        self.follow("rm a.txt")
        self.follow("rm link folder_link; mkdir link; echo x > link/x")

    def test_copies(self):
        self.follow("cp a.txt c.txt; cp -r d copy; cp -a d/. copied")
        self.follow("cp b.txt a.txt")
        self.follow("mkdir -p one/two/three; echo x > one/two/three/x.txt; echo y > one/y")
        self.follow("tar cf pack.tar d copy; mkdir out; tar xf pack.tar -C out")
        self.follow("dd if=/dev/zero of=big.bin bs=64k count=40 2>&1")

    def test_rsync(self):
        if not shutil.which("rsync"):
            self.skipTest("no rsync here")
        self.sh("mkdir -p $ELSEWHERE/s/t; for i in $(seq 300); do echo $i > $ELSEWHERE/s/t/$i; done")
        self.follow("rsync -a $ELSEWHERE/s/ mirrored/")
        self.follow("rm $ELSEWHERE/s/t/1?; echo new > $ELSEWHERE/s/t/2; "
                    "rsync -a --delete $ELSEWHERE/s/ mirrored/")

    def test_git(self):
        self.follow(
            "git init -q -b main repo; cd repo; git config user.email a@b; git config user.name n; "
            "for i in $(seq 50); do echo $i > $i.c; done; git add .; git commit -qm one; "
            "git checkout -qb other; git rm -q 1.c 2.c; git mv 3.c 333.c; git commit -qm two"
        )
        self.follow("cd repo; git checkout -q main; cd ..; git clone -q repo cloned")
        self.follow("rm -rf repo")

    def test_editors(self):
        # Written beside it and renamed over it; the old one kept as a backup.
        self.follow("echo v2 > .a.txt.swp; mv .a.txt.swp a.txt")
        self.follow("ln a.txt a.txt~; echo v3 > .new; mv .new a.txt")
        self.follow("mv b.txt b.txt~; echo v2 > b.txt; rm b.txt~")

    def test_renames(self):
        self.follow("mv a.txt renamed.txt; mv d moved")
        self.follow("mv moved/e music/e; mv music/x.mp3 moved/x.txt")
        self.follow("mv b.txt renamed.txt")
        self.follow("mkdir -p p/q; echo 1 > p/q/1; mv p/q p/r; mv p pp")
        self.follow("echo 1 > one; echo 22 > two; mv one t; mv two one; mv t two")
        self.follow("mkdir s1 s2; echo 1 > s1/in1; echo 2 > s2/in2; mv s1 t; mv s2 s1; mv t s2")
        self.follow("mkdir x; echo a > x/a; mv x y; mkdir x; echo b > x/b; mv x/b y/b; mv y x/y")

    def test_in_and_out(self):
        self.follow("mkdir $ELSEWHERE/tree; echo 1 > $ELSEWHERE/tree/1; mv $ELSEWHERE/tree .")
        self.follow("mv tree $ELSEWHERE/back; mv a.txt $ELSEWHERE/")
        self.follow("mv $ELSEWHERE/a.txt b.txt")
        self.follow("mv $ELSEWHERE/back tree; mv tree/1 $ELSEWHERE/1; echo 2 > tree/2")

    def test_whole_trees_removed(self):
        self.sh("for i in $(seq 20); do mkdir -p t/$i; for j in $(seq 20); do : > t/$i/$j; done; done")
        self.follow("rm -rf t/1 t/2")
        self.follow("rm -rf t; mkdir t; echo x > t/x")
        self.follow("rm -rf t d; echo file > d")

    def test_names_of_any_bytes(self):
        root = os.fsencode(self.root)
        names = [b"\xff\xfe", b"new\nline", b'quo"te', b"back\\slash", b"\x01\x7f", "ä€🎈".encode()]
        for name in names:
            os.mkdir(root + b"/d_" + name)
            with open(root + b"/d_" + name + b"/" + name, "wb") as file:
                file.write(name)
        self.assert_converged(self.root)
        for name in names:
            os.rename(root + b"/d_" + name + b"/" + name, root + b"/" + name)
            os.rmdir(root + b"/d_" + name)
        self.assert_converged(self.root)

    def test_deep_paths(self):
        folder = os.open(self.root, os.O_PATH)
        length = len(os.fsencode(self.root))
        while length < 4000 - 250:
            os.mkdir("n" * 200, dir_fd=folder)
            folder = os.open("n" * 200, os.O_PATH, dir_fd=folder)
            length += 201
        with open(os.open("last.txt", os.O_CREAT | os.O_WRONLY, dir_fd=folder), "w") as file:
            file.write("x")
        self.assert_converged(self.root)
        os.unlink("last.txt", dir_fd=folder)
        self.assert_converged(self.root)

    def test_held_open(self):
        with open(self.at("log.txt"), "w", encoding="ascii") as file:
            for _ in range(1000):
                file.write("line\n")
                file.flush()
            self.assert_converged(self.root)
        self.assert_converged(self.root)

    def test_chmod_of_many(self):
        count = 200_000 if IS_LONG else 3_000
        for number in range(count):
            name = self.at("many", str(number // 1000), f"{number}.txt")
            if number % 1000 == 0:
                os.makedirs(os.path.dirname(name))
            os.close(os.open(name, os.O_CREAT | os.O_WRONLY))
        self.sync(seconds=2 * int(LIMIT))
        self.follow("chmod -R go-r many; touch -d 2001-01-01 many/*/*7.txt")


class LocalPrograms(Programs, WatchedDiskTest):
    pass


on_each("ext4", "xfs", "btrfs", "tmpfs")(LocalPrograms)
del LocalPrograms


class OnSubvolume(Programs, SubvolumeTest):
    pass


class OnNestedSubvolume(Programs, NestedSubvolumeTest):
    def test_inside_the_nested_one(self):
        self.follow("echo x > nested/x; mkdir nested/d; echo y > nested/d/y")
        self.follow("mv nested/x x; mv nested/d/y nested/z; rm -r nested/d")
        with self.subTest("another one"):
            run("btrfs", "subvolume", "create", self.at("d/later"))
            write(self.at("d/later/in.txt"))
            self.assert_converged(self.root)


class OnBindMount(Programs, BoundTest):
    pass


class OnOverlay(Programs, OverlayTest):
    pass


class OnFuse(Programs, FuseTest):
    pass


del Programs, WatchedDiskTest, SubvolumeTest, NestedSubvolumeTest, BoundTest, OverlayTest, FuseTest


if __name__ == "__main__":
    main()
