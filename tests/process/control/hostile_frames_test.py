# SPDX-License-Identifier: GPL-2.0-or-later
"""Broken and hostile requests: each gets its answer, and the daemon goes on serving."""

import select
import struct

from harness import MachineTest, control, main

BOUND = 64 << 20  # bytes of a body that are taken
DEEP = 100_000
LOGGED = 128 << 10  # bytes of a line
CUT = " [cut]"

MALFORMED = [
    b"",
    b"hello",
    b"{",
    b"null",
    b"1",
    b'"text"',
    b"[]",
    b"{}",
    b'{"type":"resume"}',
    b'{"data":{}}',
    b'{"type":"resume","data":[]}',
    b'{"type":"resume","data":"text"}',
    b'{"type":"resume","data":null}',
    b'{"type":"resume","data":1}',
    b'["type","data"]',
    b'{"Type":"resume","Data":{}}',
]
# Well-formed, but of another kind than what is read from them.
THROWING = [
    b'{"type":{},"data":{}}',
    b'{"type":[],"data":{}}',
    b'{"type":"set_log_level","data":{"log_level":{}}}',
    b'{"type":"pause","data":{"resume_time":"soon"}}',
    b'{"type":"pause","data":{"resume_time":{}}}',
    b'{"type":"pause","data":{"resume_time":1e300}}',
    b'{"type":"upsert_folder_setting","data":{"folder_path":[]}}',
    b'{"type":"delete_folder_setting","data":{"folder_path":{}}}',
    b'{"type":"delete_share_worker","data":{"share_name":{}}}',
    b'{"type":"revive_share_worker","data":{"share_name":[1]}}',
]


class HostileFramesTest(MachineTest):
    def setUp(self):
        super().setUp()
        self.pid = self.start()

    def tearDown(self):
        try:
            self.assertEqual(self.command("resume"), 0)
            self.assertEqual(self.daemon_pid(), self.pid)
            self.stop(self.pid)
        finally:
            super().tearDown()

    def check(self, request, reply, lines, hang_up=False):
        after = self.log.mark()

        self.assertEqual(control.exchange(request, hang_up), reply)

        self.await_lines(lines, after)

    def test_malformed_bodies(self):
        for body in MALFORMED:
            with self.subTest(body=body):
                self.check(control.frame(body), -1, [f"Malformed command: {body.decode()}"])

    def test_values_of_the_wrong_kind_end_without_a_reply(self):
        for body in THROWING:
            with self.subTest(body=body):
                self.check(control.frame(body), None, ["MainLoop exception ..."])

    def test_body_ends_at_its_first_nul(self):
        body = b'{"type":"resume","data":{}}\0garbage'

        self.check(control.frame(body), 0, ["SetPaused: false"])

    def test_body_without_a_nul_ends_with_the_request(self):
        body = b'{"type":"resume","data":{}}'

        self.check(struct.pack("<I", len(body)) + body, 0, ["SetPaused: false"])

    def test_bytes_that_are_no_text(self):
        self.check(control.frame(b"\xff\xfe\x80{"), -1, ["Malformed command: \udcff\udcfe\udc80{"])

    def test_nesting_without_end(self):
        body = b'{"type":"resume","data":' + b'{"a":' * DEEP
        after = self.log.mark()

        reply = control.exchange(control.frame(body))

        self.assertIn(reply, (-1, None))
        self.assert_not_logged("SetPaused: .*", after)

    def test_line_that_is_too_long_for_the_log_is_cut_between_characters(self):
        for size in (LOGGED - 100, LOGGED, 300_000, 5_000_000):
            for shift in range(3):
                with self.subTest(size=size, shift=shift):
                    body = "x" * shift + "\N{EURO SIGN}" * (size // 3)
                    after = self.log.mark()

                    reply = control.exchange(control.frame(body.encode()))

                    self.assertEqual(reply, -1)
                    (line,) = (t for t in self.logged(after) if t.startswith("Malformed"))
                    shown = line.removeprefix("Malformed command: ")
                    if size < LOGGED:
                        self.assertEqual(shown, body)
                        continue
                    self.assertTrue(shown.endswith(CUT), shown[-20:])
                    self.assertTrue(body.startswith(shown.removesuffix(CUT)))
                    self.assertGreater(len(shown.encode()), LOGGED - 100)

    def test_lengths_out_of_bounds(self):
        for length in (0, BOUND + 1, 2**31, 2**32 - 1):
            with self.subTest(length=length):
                request = struct.pack("<I", length) + b"{}\0"
                self.check(request, -1, ["Receive command body failed"])

    def test_largest_body_that_is_taken(self):
        body = b'{"type":"resume","data":{}}'
        padded = body + b" " * (BOUND - 1 - len(body))

        self.check(control.frame(padded), 0, ["SetPaused: false"])

    def test_hang_up_before_the_end(self):
        lost = "Failed to read from domain socket, reason=Connection reset by peer"
        for sent, line in (
            (b"", "Receive command length failed"),
            (b"\x1c\0", "Receive command length failed"),
            (b"\x1c\0\0\0", "Receive command body failed"),
            (b"\x1c\0\0\0" + b'{"type"', "Receive command body failed"),
        ):
            with self.subTest(sent=sent):
                self.check(sent, -1, [lost, line], hang_up=True)

    def test_client_that_does_not_wait_for_its_reply(self):
        after = self.log.mark()
        with control.connect() as connection:
            connection.sendall(control.request("resume", {}))

        self.await_line("SetPaused: false", after)

    def test_silent_client_is_let_go(self):
        late = "Failed to read from domain socket, reason=Connection timed out"

        self.check(b"", -1, [late, "Receive command length failed"])
        self.check(b"\x1c\0\0\0{", -1, [late, "Receive command body failed"])

    def test_dripping_client_is_let_go(self):
        after = self.log.mark()
        request = control.frame(b'{"type":"resume","data":{}}' + b" " * 1000)

        with control.connect() as connection:
            for number in range(len(request)):
                try:
                    connection.sendall(request[number : number + 1])
                except (BrokenPipeError, ConnectionResetError):
                    break  # it was let go just now, and the reply lies here
                answered, _, _ = select.select([connection], [], [], 0.25)
                if answered:
                    break
            self.assertEqual(control.read_reply(connection), -1)

        self.await_line("Receive command body failed", after)
        self.assert_not_logged("SetPaused: .*", after)


if __name__ == "__main__":
    main()
