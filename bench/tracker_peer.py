# SPDX-License-Identifier: GPL-2.0-or-later
"""tracker-miner-fs beside us: how long until it holds a new file.

    dbus-run-session python3 bench/tracker_peer.py FOLDER ROUNDS

Prints one time a line, in seconds. FOLDER must be empty and not below /tmp, which it leaves out.
Its database is read directly: its own query interface would only add to its times.
"""

import ctypes
import os
import select
import sqlite3
import subprocess
import sys
import time
from urllib.parse import quote

FOLDER = os.path.realpath(sys.argv[1])
ROUNDS = int(sys.argv[2])
HOME = f"{FOLDER}/home"
DATA = f"{HOME}/data"
CACHE = f"{HOME}/.cache/tracker3/files"
GRAPH = "http://tracker.api.gnome.org/ontology/v3/tracker#FileSystem"
# The file is named by the graph, quoted once; the address quotes that again.
NAMES = f"{CACHE}/{quote(quote(GRAPH, safe=''))}.db"
SCHEMA = "org.freedesktop.Tracker3.Miner.Files"
LIMIT = 120.0

libc = ctypes.CDLL(None, use_errno=True)


def settings(env):
    for key, value in (
        ("index-recursive-directories", f"['{DATA}']"),
        ("index-single-directories", "[]"),
        ("initial-sleep", "0"),
        ("enable-monitors", "true"),
    ):
        subprocess.run(["gsettings", "set", SCHEMA, key, value], env=env, check=True)


class Watch:
    def __init__(self, folder):
        self.fd = libc.inotify_init1(0o2000000)
        libc.inotify_add_watch(self.fd, folder.encode(), 0x2 | 0x100 | 0x8)

    def wait(self, condition):
        deadline = time.monotonic() + LIMIT
        while not condition():
            if not select.select([self.fd], [], [], deadline - time.monotonic())[0]:
                raise TimeoutError
            os.read(self.fd, 65536)


def holds(path):
    # Its schema names extensions of SQLite's that are its own; this question needs none.
    try:
        database = sqlite3.connect(f"file:{NAMES}?mode=ro", uri=True)
        try:
            database.execute("PRAGMA writable_schema = on")
            return database.execute(
                'SELECT count(*) FROM "nfo:FileDataObject" WHERE "nfo:fileName" = ? '
                "COLLATE BINARY",
                (os.path.basename(path),),
            ).fetchone()[0]
        finally:
            database.close()
    except sqlite3.OperationalError:
        return False


def main():
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
    settings(env)
    with open(f"{DATA}/first.txt", "w", encoding="ascii") as file:
        file.write("x")
    watch = Watch(CACHE)
    miner = subprocess.Popen(
        ["/usr/libexec/tracker-miner-fs-3"], env=env,
        stdout=subprocess.DEVNULL, stderr=subprocess.DEVNULL,
    )
    try:
        watch.wait(lambda: holds(f"{DATA}/first.txt"))
        for number in range(ROUNDS):
            path = f"{DATA}/unique{number}.txt"
            with open(path, "wb") as file:
                file.write(b"x")
            began = time.monotonic()
            watch.wait(lambda path=path: holds(path))
            print(time.monotonic() - began, flush=True)
            time.sleep(0.2)  # it tells nobody when it is idle again
    finally:
        miner.kill()
        miner.wait()


if __name__ == "__main__":
    main()
