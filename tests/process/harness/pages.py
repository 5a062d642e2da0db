# SPDX-License-Identifier: GPL-2.0-or-later
"""A database's pages, and what is written over them."""

import os
import sqlite3

PAGE = 4096
LEAVES = (10, 13)  # of an index, and of a table


def try_to_copy_log_back(path):
    """So that the main file alone holds it all, for those too who have it open."""
    with sqlite3.connect(path) as db:
        done = db.execute("PRAGMA wal_checkpoint(TRUNCATE)").fetchone()[0] == 0
    db.close()
    return done


def copy_log_back(path):
    while not try_to_copy_log_back(path):
        pass  # a reader was in the way


def scribble(path, start=0, end=None):
    """To the file's end where none is given, and beyond it where hardly anything is left to it."""
    with open(path, "r+b") as file:
        size = os.fstat(file.fileno()).st_size
        file.seek(start)
        file.write(b"\xa5" * (max(size - start, PAGE) if end is None else min(end, size) - start))


def scribble_leaf(path, table):
    """In the middle of the table's rows, where nobody looks who does not read them all."""
    copy_log_back(path)
    with sqlite3.connect(path) as db:
        query = "SELECT rootpage FROM sqlite_schema WHERE name = ?"
        page = db.execute(query, (table,)).fetchone()[0]
    db.close()
    with open(path, "rb") as file:
        while True:
            file.seek((page - 1) * PAGE)
            data = file.read(PAGE)
            if data[0] in LEAVES:
                break
            cells = int.from_bytes(data[3:5], "big")
            cell = 12 + cells // 2 * 2
            place = int.from_bytes(data[cell : cell + 2], "big")
            page = int.from_bytes(data[place : place + 4], "big")
    scribble(path, (page - 1) * PAGE, page * PAGE)
