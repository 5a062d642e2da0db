# SPDX-License-Identifier: GPL-2.0-or-later
"""Libraries in front of the C library in the daemon, and the pages that they share with a test."""

import mmap
import os
import struct

from harness import namespace

PAGE_SIZE = 4096


def library(name):
    return os.path.join(os.environ["FILEINDEXD_BIN_DIR"], os.pardir, "tests-bin", name + ".so")


class Page:
    """A file that the library has mapped; `variable` tells it where."""

    def __init__(self, name, variable):
        self.path = f"{namespace.RUN}/{name}.page"
        with open(self.path, "wb") as file:
            file.truncate(PAGE_SIZE)
        with open(self.path, "r+b") as file:
            self.page = mmap.mmap(file.fileno(), PAGE_SIZE)
        self.environment = {"LD_PRELOAD": os.path.abspath(library(name)), variable: self.path}

    def number(self, index):
        """A signed one of 64 bits."""
        return struct.unpack_from("<q", self.page, 8 * index)[0]

    def set_number(self, index, value):
        struct.pack_into("<q", self.page, 8 * index, value)

    def text(self, offset):
        return self.page[offset:].split(b"\0")[0].decode("utf-8", "replace")
