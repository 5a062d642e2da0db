# SPDX-License-Identifier: GPL-2.0-or-later
"""Draining a share's queue: what is read, in what order, and what a bad line costs."""

import fcntl
import os
import re
import socket

from harness import IndexTest, main

CREATE = 0x40
DELETE = 0x80
RENAME = 0x100
RENAME_FULL = 0x200
QUEUE_RESET = 0x400
REINDEX = 0x10000
UPDATE = 0x20000

DEEP = 5000

MALFORMED = [
    b"",
    b"garbage",
    b"[]",
    b'["event",64]',
    b"null",
    b"7",
    b"{}",
    b'{"event":64}',
    b'{"path":"/x"}',
    b'{"event":-1,"path":"/x"}',
    b'{"event":"64","path":"/x"}',
    b'{"event":4294967296,"path":"/x"}',
    b'{"event":1.5e300,"path":"/x"}',
    b'{"event":[],"path":"/x"}',
    b'{"event":64,"path":1}',
    b'{"event":64,"path":null}',
    b'{"event":64,"path":{}}',
    b'{"event":64,',
    b'"path":"/x"}',
]


class DrainTest(IndexTest):
    def setUp(self):
        super().setUp()
        self.root = self.make_share()
        self.start()
        self.await_drained("alpha")

    def event(self, code, name, **more):
        return {"event": code, "path": f"{self.root}/{name}" if name else self.root, **more}

    def send(self, *lines):
        """Appends and waits for the end. A position in the log before all of it."""
        after = self.log.mark()
        self.append("alpha", *lines)
        self.await_drained("alpha")
        return after

    def commands(self, after):
        """(op, name below the root) of the tree that was executed."""
        self.await_line("Worker[alpha] finished all task, stopping", after)
        pattern = re.compile(r"TREE COMMAND (\d): path=([^,]*), data=.*", re.S)
        found = [pattern.fullmatch(text) for text in self.logged(after)]
        return [(int(hit[1]), os.path.relpath(hit[2], self.root)) for hit in found if hit]

    def test_bad_lines_cost_one_line_each(self):
        self.make_files(self.root, "first.txt", "last.txt")

        after = self.send(
            self.event(CREATE, "first.txt"), *MALFORMED, self.event(CREATE, "last.txt")
        )

        for line in MALFORMED:
            text = line.decode()
            after = self.await_lines(
                [f"Malformed event: {text}", f"Failed to insert event: {text}"], after
            )
        self.assert_paths(self.root, ["first.txt", "last.txt"])

    def test_line_nested_without_end_costs_one_line(self):
        self.make_files(self.root, "last.txt")
        nested = b'{"event":64,"path":"/x","data":' + b"[" * DEEP + b"]" * DEEP + b"}"

        self.send(nested, self.event(CREATE, "last.txt"))

        self.assert_paths(self.root, ["last.txt"])

    def test_object_over_several_lines_is_not_joined(self):
        path = f"{self.root}/a.txt"
        self.make_files(self.root, "a.txt", "b.txt")

        self.send(b'{"event":64,', f'"path":"{path}"}}'.encode(), self.event(CREATE, "b.txt"))

        self.assert_paths(self.root, ["b.txt"])

    def test_last_line_without_newline_is_read(self):
        self.make_files(self.root, "a.txt")

        self.append_bytes("alpha", b'{"event":64,"path":"%s/a.txt"}' % self.root.encode())
        self.await_drained("alpha")

        self.assert_paths(self.root, ["a.txt"])

    def test_unknown_event_changes_nothing(self):
        self.make_files(self.root, "a.txt")

        after = self.send(self.event(1, "a.txt"), self.event(0, "b.txt"))

        self.await_line(f"Unknown event: 1, path={self.root}/a.txt", after)
        self.await_line(f"Unknown event: 0, path={self.root}/b.txt", after)
        self.assert_paths(self.root, [])

    def test_codes_of_several_bits(self):
        self.make_files(self.root, "d/a.txt")
        self.send(self.event(REINDEX, ""))

        after = self.send(self.event(CREATE | DELETE, "d/a.txt"))
        self.assertEqual(self.commands(after), [(2, "d/a.txt")])

        after = self.send(self.event(DELETE | UPDATE, "d"))
        self.assertEqual(self.commands(after), [(5, "d")])
        self.assert_index(self.root)

    def test_every_code_becomes_its_operation(self):
        self.make_files(self.root, "d/")
        for code, op in (
            (0x2, 4), (0x4, 4), (0x8, 1), (CREATE, 1), (DELETE, 2), (REINDEX, 6), (UPDATE, 5),
        ):  # fmt: skip
            with self.subTest(code=hex(code)):
                after = self.send(self.event(code, "d"))

                self.assertEqual(self.commands(after), [(op, "d")])

    def test_queue_reset_cancels_what_was_pending(self):
        self.make_files(self.root, "a.txt")

        after = self.send(self.event(CREATE, "a.txt"), self.event(QUEUE_RESET, "a.txt"))

        self.assertEqual(self.commands(after), [])
        self.assert_paths(self.root, [])

    def test_rename(self):
        self.make_files(self.root, "old/in/a.txt", "old/b.txt")
        self.send(self.event(REINDEX, ""))
        os.rename(f"{self.root}/old", f"{self.root}/new")

        after = self.send(self.event(RENAME, "new", path_old=f"{self.root}/old"))

        self.assertEqual(self.commands(after), [(6, "old"), (3, "new")])
        self.assert_index(self.root)

    def test_full_rename_indexes_the_share_again(self):
        self.make_files(self.root, "never/announced.txt")

        after = self.send(self.event(RENAME_FULL, "whatever"))

        self.assertEqual(self.commands(after), [(6, ".")])
        self.assert_index(self.root)

    def test_later_lines_overwrite_earlier_ones_at_a_path(self):
        self.make_files(self.root, "stays.txt")

        after = self.send(
            self.event(CREATE, "gone.txt"),
            self.event(DELETE, "stays.txt"),
            self.event(DELETE, "gone.txt"),
            self.event(CREATE, "stays.txt"),
        )

        self.assertEqual(sorted(self.commands(after)), [(1, "stays.txt"), (2, "gone.txt")])
        self.assert_index(self.root)


class LockedQueueTest(IndexTest):
    def test_queue_that_stays_locked_is_left_in_place(self):
        root = self.make_share()
        self.start()
        self.await_drained("alpha")
        self.make_files(root, "a.txt")
        queue = self.queue("alpha")
        after = self.log.mark()

        with open(queue, "ab", buffering=0) as file:
            fcntl.flock(file, fcntl.LOCK_EX)
            file.write(b'{"event":64,"path":"%s/a.txt"}\n' % root.encode())
            with open(queue, "ab"):
                pass  # its close wakes the daemon while the lock is held
            self.await_line(
                f"try lock too many times, path={queue}, reason=Resource temporarily unavailable",
                after,
            )
            self.assertTrue(os.path.exists(queue))
            self.assert_paths(root, [])

        self.await_drained("alpha")
        self.assert_paths(root, ["a.txt"])


class LeftoverCopyTest(IndexTest):
    def test_copy_of_an_earlier_drain_is_read_first(self):
        root = self.make_share()
        pid = self.start()
        self.await_drained("alpha")
        self.stop(pid)
        self.make_files(root, "first.txt", "second.txt")
        queue = self.queue("alpha")
        for path, name in ((queue + ".tmp", "first.txt"), (queue, "second.txt")):
            with open(path, "w", encoding="ascii") as file:
                file.write(f'{{"event":64,"path":"{root}/{name}"}}\n')
        after = self.log.mark()

        self.start()

        self.await_lines(
            [
                f"TREE COMMAND 1: path={root}/first.txt, data=null",
                "Worker[alpha] fileindex db committed",
                f"TREE COMMAND 1: path={root}/second.txt, data=null",
                "Worker[alpha] fileindex db committed",
            ],
            after,
        )
        self.await_drained("alpha")
        self.assert_index(root)

    def check_lost_copy(self, make_copy, *told):
        """A copy of which nothing can be read: the whole share is looked at in its place."""
        root = self.make_share()
        pid = self.start()
        self.await_drained("alpha")
        self.stop(pid)
        self.make_files(root, "never/announced.txt")
        make_copy(self.queue("alpha") + ".tmp")
        after = self.log.mark()

        self.start()

        done = "Worker[alpha] finished all task, stopping"
        self.await_lines([*told, f"IndexDirAdd: {root}", done], after)
        self.assert_index(root)
        (share,) = self.ctl("status", "--json").json()["shares"]
        self.assertFalse(share["needs_reindex"])

    def test_copy_that_cannot_be_opened_has_the_share_indexed_again(self):
        def make_socket(path):
            with socket.socket(socket.AF_UNIX) as made:
                made.bind(path)

        self.check_lost_copy(
            make_socket,
            f"Failed to open queue, path={self.queue('alpha')}.tmp, "
            "reason=No such device or address",
            re.compile(r"Share\[alpha\] has to be indexed again, .*, reason=No such device .*"),
        )

    def test_copy_that_cannot_be_read_has_the_share_indexed_again(self):
        self.check_lost_copy(
            lambda path: os.symlink("/proc/self/mem", path),
            re.compile(r"Share\[alpha\] has to be indexed again, .*, reason=Input/output error"),
        )

    def test_queue_that_is_a_pipe_holds_nobody_up(self):
        def make_pipe(path):
            os.mkfifo(path.removesuffix(".tmp"))

        self.check_lost_copy(make_pipe)

    def test_empty_copy_does_no_harm(self):
        root = self.make_share()
        with open(self.queue("alpha") + ".tmp", "w", encoding="ascii"):
            pass

        self.start()

        self.await_drained("alpha")
        self.assert_index(root)


if __name__ == "__main__":
    main()
