# SPDX-License-Identifier: GPL-2.0-or-later
"""A folder that is walked again loses from the index what it has lost on disk, unseen."""

import os

from harness import IndexTest, main

ATTRIB = 0x4
CREATE = 0x40
DELETE = 0x80
RENAME = 0x100
UPDATE = 0x20000


class WalksTest(IndexTest):
    def setUp(self):
        super().setUp()
        self.root = self.make_share(
            files=("d/gone.txt", "d/kept.txt", "d/e/gone.txt", "d/e/kept.txt"), flags=("--all",)
        )
        self.start(debug=False)
        self.await_drained("alpha")

    def at(self, name):
        return f"{self.root}/{name}"

    def event(self, event, name, *more):
        self.ctl("event", "alpha", str(event), self.at(name), *more)

    def lose(self):
        for name in ("d/gone.txt", "d/e/gone.txt"):
            os.unlink(self.at(name))

    def differences(self):
        return self.try_ctl("verify", "alpha").out.decode().splitlines()

    def assert_clean(self):
        self.await_drained("alpha")
        self.assertEqual(self.differences(), [])

    def test_by_a_rename_that_brings_back_a_known_folder(self):
        self.lose()
        self.event(RENAME, "d", "--path-old", self.at("elsewhere"))
        self.assert_clean()

    def test_by_a_rename_that_displaces_a_delete(self):
        self.lose()
        self.append(
            "alpha",
            {"event": DELETE, "path": self.at("d")},
            {"event": RENAME, "path": self.at("d"), "path_old": self.at("elsewhere")},
        )
        self.assert_clean()

    def test_by_an_update_that_swallows_a_delete(self):
        self.lose()
        self.append(
            "alpha",
            {"event": UPDATE, "path": self.at("d"), "data": {"audio": True}},
            {"event": DELETE, "path": self.at("d")},
        )
        self.assert_clean()

    def test_by_other_settings(self):
        self.lose()
        self.ctl("folder", "set", self.root, "--audio=off")
        self.assert_clean()

    def test_by_a_line_of_its_making(self):
        self.lose()
        self.event(CREATE, "d")
        self.assert_clean()

    def test_by_a_walk_in_a_later_pass_below_the_first_one(self):
        self.event(CREATE, "d")
        self.assert_clean()
        self.lose()
        self.event(CREATE, "d/e")
        self.await_drained("alpha")
        self.assertEqual(self.differences(), [f"left-over\t{self.at('d/gone.txt')}"])

    def test_not_by_a_change_of_its_attributes(self):
        """It is looked at alone, however much lies below it."""
        self.lose()
        self.event(ATTRIB, "d")
        self.await_drained("alpha")
        self.assertEqual(len(self.differences()), 2)


if __name__ == "__main__":
    main()
