# SPDX-License-Identifier: GPL-2.0-or-later
"""Files that grow, shrink, vanish or are replaced while the real helper reads them."""

import collections
import io
import os
import struct
import zipfile

from harness import main
from search.held_files import READING, HeldFiles
from search.library import CLOSE_WRITE, ContentsTest

DELETE = 0x80
FILL = "and so on, line after line\n" * 12000  # 300 KiB: more than one reading


def text_bytes(word):
    return f"{word}\n{FILL}".encode()


def html_bytes(word):
    return f"<html><title>{word}</title><body><p>{FILL}</p></body></html>".encode()


def mail_bytes(word):
    return f"From: a@b.example\nSubject: {word}\nContent-Type: text/plain\n\n{FILL}".encode()


def zip_bytes(word):
    made = io.BytesIO()
    with zipfile.ZipFile(made, "w") as archive:
        archive.writestr(f"{word}.txt", FILL)
    return made.getvalue()


def picture_bytes(word):
    def segment(marker, content):
        return struct.pack(">BBH", 0xFF, marker, len(content) + 2) + content

    comments = segment(0xFE, word.encode()) + 4 * segment(0xFE, bytes(65000))
    frame = segment(0xC0, struct.pack(">BHHB", 8, 1, 1, 1) + bytes((1, 0x11, 0)))
    return b"\xff\xd8" + comments + frame + b"\xff\xd9"


FORMATS = {
    "txt": text_bytes,
    "html": html_bytes,
    "eml": mail_bytes,
    "zip": zip_bytes,
    "jpg": picture_bytes,
}
CHANGES = ("grown", "cut", "gone", "replaced")
# The second time that somebody reads from the file it changes: whoever reads it is at it.
CHANGED_AT = 2


class ChangingFilesTest(ContentsTest):
    def setUp(self):
        super().setUp()
        self.root = self.make_share(folders=())
        self.names = {}  # by inode: (change, ending)
        for ending in FORMATS:
            for change in CHANGES:
                path = self.path(change, ending)
                self.write_bytes(path, FORMATS[ending](f"early{change}{ending}"))
                self.names[os.stat(path).st_ino] = (change, ending)
        self.write(f"{self.root}/good.txt", "lighthouse")
        self.held = HeldFiles(*(self.path(*name) for name in self.names.values()), what=READING)
        self.addCleanup(self.held.let_all_go)
        self.start()
        self.service = self.service_pid()
        self.ctl("folder", "add", self.root, "--document", "--photo")

    def path(self, change, ending):
        return f"{self.root}/{change}.{ending}"

    def write_bytes(self, path, content):
        with open(path, "wb") as file:
            file.write(content)

    def change(self, change, ending):
        path = self.path(change, ending)
        late = FORMATS[ending](f"late{change}{ending}") + b"\n" * 5000
        if change == "grown":
            with open(path, "r+b") as file:
                file.write(late)
        elif change == "cut":
            os.truncate(path, os.path.getsize(path) // 2)
        elif change == "gone":
            os.unlink(path)
        else:
            self.write_bytes(f"{path}.new", late)
            os.rename(f"{path}.new", path)

    def change_all_while_they_are_read(self):
        reads = collections.Counter()
        changed = set()
        while len(changed) < len(self.names):
            for descriptor in self.held.await_next():
                name = self.names[os.fstat(descriptor).st_ino]
                reads[name] += 1
                if reads[name] == CHANGED_AT:
                    self.change(*name)
                    changed.add(name)
                self.held.let_go(descriptor)
        self.held.let_all_go()

    def test_they_are_read_as_they_are_in_the_end_and_nobody_is_blamed(self):
        self.change_all_while_they_are_read()
        # What was read of a file that is another now is nobody's; of the others it counts.
        same, others = 1 + 2 * len(FORMATS), 2 * len(FORMATS)
        self.await_counts(done=same, waiting=others, failed=0)

        for change, ending in self.names.values():
            event = DELETE if change == "gone" else CLOSE_WRITE
            self.append("alpha", {"event": event, "path": self.path(change, ending)})
        self.await_drained("alpha")

        self.await_hits("lighthouse", ["good.txt"])
        for change, ending in self.names.values():
            found = [f"{change}.{ending}"] if change in ("grown", "replaced") else []
            self.await_hits(f"late{change}{ending}", found)
            if change != "cut":  # of which something is still there
                self.assertEqual(self.hits(f"early{change}{ending}"), [])
        self.await_hits("earlycuttxt", ["cut.txt"])
        self.await_counts(waiting=0)
        blamed = {name for name, (_, tries) in self.failed().items() if tries > 1}
        self.assertEqual(blamed, set())
        self.assertLessEqual(set(self.failed()), {f"cut.{ending}" for ending in FORMATS})
        self.assertEqual(self.service_pid(), self.service)


if __name__ == "__main__":
    main()
