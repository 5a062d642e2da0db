# SPDX-License-Identifier: GPL-2.0-or-later
"""tracker-miner-fs beside us: how long until it holds a new file, or the texts of a whole tree.

    dbus-run-session python3 bench/tracker_peer.py FOLDER names ROUNDS
    dbus-run-session python3 bench/tracker_peer.py FOLDER texts TREE DOCUMENTS

Prints one time a line, in seconds. FOLDER must be empty, and neither it nor TREE below /tmp, which
it leaves out. DOCUMENTS: how many files below TREE it can read. Its database is read directly: its
own query interface would only add to its times.
"""

import contextlib
import os
import sqlite3
import subprocess
import sys
import time
from urllib.parse import quote

from machine import TRACKER, look_until, wait

FOLDER = os.path.realpath(sys.argv[1])
HOME = f"{FOLDER}/home"
DATA = f"{HOME}/data"
CACHE = f"{HOME}/.cache/tracker3/files"
GRAPH = "http://tracker.api.gnome.org/ontology/v3/tracker#"
SCHEMA = "org.freedesktop.Tracker3.Miner.Files"
BETWEEN_COUNTS = 0.1  # seconds: a count takes time from what is counted


@contextlib.contextmanager
def miner(tree):
    """Runs it on that tree."""
    for path in (DATA, CACHE, f"{FOLDER}/run"):
        os.makedirs(path)
    env = {
        **os.environ,
        "HOME": HOME,
        "XDG_RUNTIME_DIR": f"{FOLDER}/run",
        "XDG_CONFIG_HOME": f"{HOME}/.config",
        "XDG_CACHE_HOME": f"{HOME}/.cache",
        "XDG_DATA_HOME": f"{HOME}/.local/share",
        "GSETTINGS_BACKEND": "keyfile",
    }
    for key, value in (
        ("index-recursive-directories", f"['{tree}']"),
        ("index-single-directories", "[]"),
        ("initial-sleep", "0"),
        ("enable-monitors", "true"),
    ):
        subprocess.run(["gsettings", "set", SCHEMA, key, value], env=env, check=True)
    process = subprocess.Popen(
        [TRACKER], env=env,
        stdout=subprocess.DEVNULL, stderr=subprocess.DEVNULL,
    )
    try:
        yield
    finally:
        process.kill()
        process.wait()


def ask(graph, question, *values):
    """The number that a graph's database answers with; 0 where it cannot be asked yet."""
    # The file is named by the graph, quoted once; the address quotes that again.
    path = f"{CACHE}/{quote(quote(GRAPH + graph, safe=''))}.db"
    try:
        with contextlib.closing(sqlite3.connect(f"file:{path}?mode=ro", uri=True)) as database:
            # Its schema names extensions of SQLite's that are its own; no question here needs one.
            database.execute("PRAGMA writable_schema = on")
            return database.execute(question, values).fetchone()[0]
    except sqlite3.OperationalError:
        return 0


def holds(path):
    return ask(
        "FileSystem",
        'SELECT count(*) FROM "nfo:FileDataObject" WHERE "nfo:fileName" = ? COLLATE BINARY',
        os.path.basename(path),
    )


def texts():
    return ask("Documents", 'SELECT count("nie:plainTextContent") FROM "nie:InformationElement"')


def names(rounds):
    with miner(DATA):
        with open(f"{DATA}/first.txt", "w", encoding="ascii") as file:
            file.write("x")
        wait(lambda: holds(f"{DATA}/first.txt"), CACHE)
        for number in range(rounds):
            path = f"{DATA}/unique{number}.txt"
            with open(path, "wb") as file:
                file.write(b"x")
            began = time.monotonic()
            wait(lambda path=path: holds(path), CACHE)
            print(time.monotonic() - began, flush=True)
            time.sleep(0.2)  # it tells nobody when it is idle again


def tree_of_texts(tree, documents):
    began = time.monotonic()
    with miner(tree):
        look_until(lambda: texts() >= documents, BETWEEN_COUNTS)
        print(time.monotonic() - began, flush=True)


if sys.argv[2] == "names":
    names(int(sys.argv[3]))
else:
    tree_of_texts(os.path.realpath(sys.argv[3]), int(sys.argv[4]))
