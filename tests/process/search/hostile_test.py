# SPDX-License-Identifier: GPL-2.0-or-later
"""Hostile files through the whole service, with the real helper: it lives, stays small, reads all
that lies beside them, and names what it could not read."""

import io
import os
import re
import struct
import zipfile
import zlib

from harness import main
from search.library import ContentsTest

HIGHEST_MEMORY = 64 * 1024  # KiB
BOMB = 600 << 20  # bytes of zeros: more than is ever unpacked
HOSTILE_NAME = b"quay\n\x1b[31m\xff$(reboot)';--.txt"
INNOCENT = "lighthouse"


def zipped(members, compression=zipfile.ZIP_DEFLATED):
    made = io.BytesIO()
    with zipfile.ZipFile(made, "w", compression) as archive:
        for name, data in members:
            archive.writestr(name, data)
    return made.getvalue()


def bomb():
    """One member of zeros, written piece by piece."""
    made = io.BytesIO()
    with zipfile.ZipFile(made, "w", zipfile.ZIP_DEFLATED, compresslevel=1) as archive:
        with archive.open("zeros.txt", "w", force_zip64=True) as member:
            for _ in range(BOMB >> 20):
                member.write(bytes(1 << 20))
    return made.getvalue()


def nested(depth):
    data = zipped([("core.txt", "kernel")])
    for _ in range(depth):
        data = zipped([("inner.zip", data)], zipfile.ZIP_STORED)
    return data


def docx(words):
    return zipped([("[Content_Types].xml", "<Types/>"),
                   ("word/document.xml", f"<w:document><w:t>{words}</w:t></w:document>")])


def pdf(levels=0, parent="", unused=0):
    """Words on a page, which hangs ten times in the tree of pages for each level of it. `parent`
    may lead the root of that tree back to where it hangs. More pages than objects, `unused` ones
    among them, are not believed."""
    text = b"BT /F1 1 Tf 2 TL 72 780 Td %s ET" % (b"(harbour masters number their lamps) Tj T* " * 300)
    trees = [f"<</Type/Pages/Count {10 ** (levels - level)}{parent}"
             f"/Kids[{f'{level + 3} 0 R ' * (10 if level < levels else 1)}]>>".encode()
             for level in range(levels + 1)]
    page = len(trees) + 2
    objects = [b"<</Type/Catalog/Pages 2 0 R>>", *trees,
               b"<</Type/Page/Parent 2 0 R/MediaBox[0 0 612 792]/Contents %d 0 R/Resources<<"
               b"/Font<</F1<</Type/Font/Subtype/Type1/BaseFont/Helvetica>>>>>>>>" % (page + 1),
               b"<</Length %d>>stream\n%s\nendstream" % (len(text), text)]
    made, places = b"%PDF-1.4\n", []
    for number, body in enumerate(objects, 1):
        places.append(len(made))
        made += b"%d 0 obj%s endobj\n" % (number, body)
    table = b"".join(b"%010d 00000 n \n" % place for place in places)
    table += b"0000000000 65535 f \n" * unused
    count = len(objects) + 1 + unused
    return (made + b"xref\n0 %d\n0000000000 65535 f \n" % count + table +
            b"trailer<</Size %d/Root 1 0 R>>\nstartxref\n%d\n%%%%EOF\n" % (count, len(made)))


def jpeg():
    head = struct.pack(">HH5sHBHHBB", 0xFFE0, 16, b"JFIF\0", 0x101, 0, 1, 1, 0, 0)
    exif = b"Exif\0\0II*\0\x08\0\0\0\xff\xff" + bytes(12)
    return b"\xff\xd8" + head + struct.pack(">HH", 0xFFE1, len(exif) + 2) + exif


def mp4():
    def box(name, data, size=None):
        return struct.pack(">I4s", size or len(data) + 8, name) + data

    return box(b"ftyp", b"isom\0\0\2\0isom") + box(b"moov", box(b"trak", bytes(64), 0x7FFFFFFF))


WITH_FAILURE = {  # damaged beyond what any reader forgives
    "cut.pdf": pdf()[:40],
    "cut.docx": docx("x" * 1000)[:60],
    "noise.jpg": zlib.compress(bytes(range(256)) * 8),
    "cut.mp4": mp4(),
    "noise.pdf": zlib.compress(bytes(range(256)) * 64),
    "word.xls": b"\xd0\xcf\x11\xe0\xa1\xb1\x1a\xe1" + bytes(100),
}
WITHOUT_A_SAY = {  # read or failed: whatever comes of them, it ends
    "endless.pdf": pdf(levels=9),
    "thousand.pdf": pdf(levels=3, unused=1000),
    "ring.pdf": pdf(parent="/Parent 2 0 R"),
    "cut.jpg": jpeg(),
    "nested.zip": nested(200),
    "deep.xml": b"<a>" * 200000,
    "text.zip": b"words in disguise",
    "picture.docx": jpeg(),
    "document.mp3": docx("harbour"),
    "film.png": mp4(),
}


class HostileTest(ContentsTest):
    def write_bytes(self, path, data):
        with open(path, "wb") as file:
            file.write(data)

    def highest_memory(self, pid):
        """KiB."""
        with open(f"/proc/{pid}/status", encoding="utf-8") as file:
            return int(re.search(r"VmHWM:\s+(\d+) kB", file.read())[1])

    def make_hostile_share(self):
        root = self.make_share(folders=())
        hostile = {**WITH_FAILURE, **WITHOUT_A_SAY, "bomb.zip": bomb()}
        for name, data in hostile.items():
            self.write_bytes(f"{root}/{name}", data)
            self.write(f"{root}/beside {name}.txt", f"{INNOCENT} beside {name}")
        self.write_bytes(os.fsencode(root) + b"/" + HOSTILE_NAME, b"a plain word: gatekeeper")
        os.mkfifo(f"{root}/pipe.pdf")
        os.mknod(f"{root}/device.docx", 0o20666, os.makedev(1, 5))
        return root, hostile

    def test_hostile_files_harm_nobody_but_themselves(self):
        root, hostile = self.make_hostile_share()
        self.start()
        service = self.service_pid()
        self.ctl("folder", "add", root, "--document", "--photo", "--audio", "--video")

        def all_ended():
            status = self.status()
            return status["contents_done"] + status["contents_failed"] == 2 * len(hostile) + 1

        self.await_contents(all_ended)
        self.await_counts(waiting=0)

        self.assertEqual(self.hits(INNOCENT), sorted(f"beside {name}.txt" for name in hostile))
        self.assertEqual(self.ctl("search", "--count", "gatekeeper").out.strip(), b"1")
        self.assertEqual(self.hits("text:disguise"), ["text.zip"])
        self.assertEqual(self.hits("text:harbour"), ["document.mp3", "ring.pdf", "thousand.pdf"])
        failed = self.failed()
        self.assertLessEqual(set(WITH_FAILURE), set(failed))
        self.assertLessEqual(set(failed), set(hostile), "an innocent file, a pipe or a device")
        for reason, _ in failed.values():
            self.assertTrue(reason and reason.isprintable(), failed)
        self.assertEqual(self.service_pid(), service)
        self.assertLess(self.highest_memory(service), HIGHEST_MEMORY)

        self.write(f"{root}/afterwards.txt", "still at work")
        self.append("alpha", {"event": 8, "path": f"{root}/afterwards.txt"})
        self.await_hits("text:work", ["afterwards.txt"])


if __name__ == "__main__":
    main()
