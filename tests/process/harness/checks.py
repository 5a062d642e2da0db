# SPDX-License-Identifier: GPL-2.0-or-later
"""Index and disk agree: the criterion of most tests."""

from harness.machine import MachineTest, full_path
from harness.oracle import expected_entries, kind_of_name


class IndexTest(MachineTest):
    def assert_index(self, root, share="alpha", folders=None, left_out=()):
        """The index holds what an independent walk finds, and `verify` has nothing to say."""
        expected = expected_entries(root, folders, left_out)
        self.assertEqual(self.entries(share), expected)
        self.assertEqual(self.dump(share), sorted(expected))

        verified = self.ctl("verify", share)
        self.assertEqual((verified.out, verified.err), (b"", b""))

    def entries(self, share="alpha"):
        """{path: description} of all that the index holds."""
        shown = self.ctl("dump", share, "--json").objects()
        entries = {
            full_path(entry): {key: entry[key] for key in ("dir", "kind", "size", "mtime")}
            for entry in shown
        }
        self.assertEqual(len(shown), len(entries))
        for entry in shown:  # whether somebody has looked into a file by now is another matter
            path = full_path(entry)
            if not entry["dir"] and kind_of_name(path) == "other":
                entries[path]["kind"] = "other"
        return entries

    def assert_paths(self, root, wanted, share="alpha"):
        """The index holds exactly these paths below `root`, and the root itself."""
        prefix = root.encode()
        paths = [path.removeprefix(prefix + b"/") for path in self.dump(share) if path != prefix]
        self.assertEqual(paths, sorted(name.encode() for name in wanted))

    def flags(self, share="alpha"):
        """{path: whether its content is wanted} as the index has it."""
        entries = self.ctl("dump", share, "--json").objects()
        return {full_path(entry).decode(): entry["content"] for entry in entries}
