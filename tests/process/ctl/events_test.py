# SPDX-License-Identifier: GPL-2.0-or-later
"""event and reindex: the lines that they write, under the queue's lock."""

import fcntl
import json
import os
import subprocess

from harness import IndexTest, main, namespace
from harness.awaiting import LIMIT
from harness.machine import environment, program

CODES = {
    "QLIB_NOTIFY_MODIFY": 0x2,
    "QLIB_NOTIFY_ATTRIB": 0x4,
    "QLIB_NOTIFY_CLOSE_WRITE": 0x8,
    "QLIB_NOTIFY_CREATE": 0x40,
    "QLIB_NOTIFY_DELETE": 0x80,
    "QLIB_NOTIFY_RENAME": 0x100,
    "QLIB_NOTIFY_RENAME_FULL": 0x200,
    "QLIB_NOTIFY_QUEUE_RESET": 0x400,
    "CUSTOM_EVENT_REINDEX": 0x10000,
    "CUSTOM_EVENT_UPDATE": 0x20000,
}
WRITERS = 8
LINES = 40  # of each writer


class EventsTest(IndexTest):
    def setUp(self):
        super().setUp()
        self.root = self.make_share(folders=())

    def lines(self):
        with open(self.queue("alpha"), "rb") as file:
            data = file.read()
        self.assertTrue(data.endswith(b"\n"))
        return data.splitlines()

    def last(self):
        return json.loads(self.lines()[-1].decode("utf-8", "surrogateescape"))

    def test_names_and_numbers(self):
        for name, code in CODES.items():
            for text in (name, str(code), hex(code), hex(code).upper().replace("X", "x")):
                with self.subTest(text=text):
                    self.ctl("event", "alpha", text, "/x")

                    self.assertEqual(self.last(), {"event": code, "path": "/x"})

    def test_numbers_of_no_name_are_taken(self):
        for text, code in (("0", 0), ("1", 1), ("0xffffffff", 2**32 - 1)):
            self.ctl("event", "alpha", text, "/x")

            self.assertEqual(self.last()["event"], code)

    def test_codes_that_are_refused(self):
        for text in ("", "nope", "-1", "0x", "1x", "4294967296", " 1", "QLIB_NOTIFY_", "1.0"):
            with self.subTest(text=text):
                self.ctl("event", "alpha", "--", text, "/x", code=2)

        self.assertFalse(os.path.lexists(self.queue("alpha")))

    def test_paths_are_taken_as_given(self):
        for path in ("relative", "/a/../b", "//", "/x y", '/"\\', "/new\nline", "/é", "/\x01"):
            with self.subTest(path=path):
                self.ctl("event", "alpha", "64", path, "--path-old", path)

                line = self.last()
                self.assertEqual((line["path"], line["path_old"]), (path, path))

    def test_bytes_that_are_not_utf8_stay_as_they_are(self):
        self.ctl("event", "alpha", "64", b"/\xff\x80x")

        self.assertIn(b'"/\xff\x80x"', self.lines()[-1])

    def test_data_is_put_on_one_line(self):
        self.ctl("event", "alpha", "131072", "/x", "--data", '{\n "audio": true,\n "x": "é"}')

        self.assertEqual(self.last()["data"], {"audio": True, "x": "é"})

    def test_data_that_is_no_json(self):
        for text in ("", "{", "{}{}", "{} x", "nope", '{"a":1,}', "[" * 5000 + "]" * 5000):
            with self.subTest(text=text[:20]):
                self.ctl("event", "alpha", "64", "/x", "--data", text, code=2)

        self.assertFalse(os.path.lexists(self.queue("alpha")))

    def test_unknown_share(self):
        self.ctl("event", "nope", "64", "/x", code=1)

        self.assertFalse(os.path.lexists(f"{namespace.STATE}/shares/nope"))

    def test_queue_file_is_private(self):
        self.ctl("event", "alpha", "64", "/x")

        self.assertEqual(os.stat(self.queue("alpha")).st_mode & 0o777, 0o600)

    def test_locked_queue_is_waited_for_but_not_for_ever(self):
        os.makedirs(os.path.dirname(self.queue("alpha")), exist_ok=True)
        with open(self.queue("alpha"), "wb") as file:
            fcntl.flock(file, fcntl.LOCK_EX)

            self.ctl("event", "alpha", "64", "/x", code=1)

        self.assertEqual(os.path.getsize(self.queue("alpha")), 0)

    def test_many_writers_at_once_lose_nothing_while_the_daemon_drains(self):
        self.ctl("folder", "add", self.root)
        self.start()
        names = [f"f{number}-{line}" for number in range(WRITERS) for line in range(LINES)]
        self.make_files(self.root, *names)
        script = (
            'i=0; while [ $i -lt $3 ]; do "$0" event alpha 64 "$1$2-$i" || exit 1; i=$((i+1)); done'
        )
        writers = [
            subprocess.Popen(
                [
                    "sh",
                    "-c",
                    script,
                    program("fileindexctl"),
                    f"{self.root}/f",
                    str(number),
                    str(LINES),
                ],
                env=environment(),
            )
            for number in range(WRITERS)
        ]
        self.assertEqual([writer.wait(LIMIT) for writer in writers], [0] * WRITERS)

        self.await_drained("alpha")
        self.assert_index(self.root)

    def test_reindex(self):
        self.make_files(self.root, "in/a.txt")
        os.symlink(self.root, f"{namespace.RUN}/link")

        for path in (f"{self.root}/in", f"{namespace.RUN}/link/in", f"{self.root}//in/."):
            self.ctl("reindex", path)
            self.assertEqual(self.last(), {"event": 0x10000, "path": f"{self.root}/in"})
        self.ctl("reindex", f"{self.root}/gone/deep")
        self.assertEqual(self.last()["path"], f"{self.root}/gone/deep")

    def test_reindex_outside_every_share(self):
        for path in (namespace.DATA, "/", "/nowhere", f"{self.root}2"):
            self.ctl("reindex", path, code=1)

    def test_reindex_finds_what_no_event_told(self):
        self.ctl("folder", "add", self.root)
        self.start()
        self.await_drained("alpha")
        self.make_files(self.root, "in/a.txt", "b.txt")

        self.ctl("reindex", self.root)

        self.await_drained("alpha")
        self.assert_index(self.root)


if __name__ == "__main__":
    main()
