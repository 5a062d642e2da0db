# SPDX-License-Identifier: GPL-2.0-or-later
"""Speed of the content service, with the daemon before and its helpers behind it, on real files.

    bench/in_namespace python3 bench/contents_bench.py DIVISOR BIN_DIR POOL_BENCH

Sizes are divided by DIVISOR. Data lies below FILEINDEXD_BENCH_DIR, which must not be below /tmp for
tracker-miner-fs, and on a file system that can be watched as a whole. All runs on two processors.
"""

import contextlib
import os
import resource
import shutil
import signal
import sqlite3
import statistics
import subprocess
import sys
import tempfile
import time

import contents_corpus
import contents_questions
import slow_document
from machine import Log, Machine, has_tracker, look_until, row, wait

DIVISOR = int(sys.argv[1])
PROGRAMS = os.path.abspath(sys.argv[2])
POOL_BENCH = os.path.abspath(sys.argv[3])
ROUNDS = 3 if DIVISOR < 10 else 1
NEW_FILES = max(200 // DIVISOR, 20)
QUICK_FILES = 100
SLOW_SECONDS = 30 if DIVISOR < 10 else 3
SHORT_REST = 0.001  # seconds between two looks
LONG_REST = 0.05    # where a whole tree is waited for: looks take time from others
MANUALS = contents_corpus.SUFFIXES["manual"]
TRACKER_EXTRACT = "/usr/libexec/tracker-extract-3"  # which the session's bus starts
DONE = 1  # a file's state


class ContentMachine(Machine):
    """With the share's contents, which the bench reads as they are committed."""

    def __init__(self, folder, root=None):
        super().__init__(folder, PROGRAMS, root)
        self.contents = f"{self.state}/shares/bench/contents"
        self.database = None

    def ask(self, question, *values):
        """The first column of the first row; 0 while there is no database."""
        try:
            if self.database is None:
                path = f"{self.contents}/contents.db"
                self.database = sqlite3.connect(f"file:{path}?mode=ro", uri=True)
            return (self.database.execute(question, values).fetchone() or [0])[0]
        except sqlite3.OperationalError:
            self.database = None
            return 0

    def close(self):
        for database in (self.database, self.queries):
            if database is not None:
                database.close()

    def done(self):
        return self.ask("SELECT sum(done) FROM counts") or 0

    def await_done(self, count):
        look_until(lambda: self.done() >= count, LONG_REST)

    def has_read(self, inode):
        return self.ask("SELECT count(*) FROM files WHERE inode = ? AND state = ?", inode, DONE)

    def has_begun(self, inode):
        return self.ask("SELECT count(*) FROM files WHERE inode = ? AND begun <> 0", inode)


def processor_time():
    """Seconds that all but this process have used in this namespace, those that ended included."""
    ended = resource.getrusage(resource.RUSAGE_CHILDREN)
    seconds = ended.ru_utime + ended.ru_stime
    for pid in filter(str.isdigit, os.listdir("/proc")):
        if int(pid) == os.getpid():
            continue
        with contextlib.suppress(FileNotFoundError, ProcessLookupError):
            with open(f"/proc/{pid}/stat", encoding="ascii", errors="replace") as file:
                fields = file.read().rpartition(")")[2].split()
            seconds += sum(map(int, fields[11:15])) / os.sysconf("SC_CLK_TCK")
    return seconds


def size_of(*folders):
    return sum(
        os.path.getsize(f"{parent}/{name}")
        for folder in folders
        for parent, _, names in os.walk(folder)
        for name in names
    )


def processes_of(program):
    for pid in filter(str.isdigit, os.listdir("/proc")):
        with contextlib.suppress(FileNotFoundError, ProcessLookupError):
            if os.readlink(f"/proc/{pid}/exe") == program:
                yield int(pid)


def peak_memory(program):
    """Bytes; of the one process that runs it."""
    (pid,) = processes_of(f"{PROGRAMS}/{program}")
    with open(f"/proc/{pid}/status", encoding="ascii", errors="replace") as file:
        return next(int(line.split()[1]) for line in file if line.startswith("VmHWM")) * 1024


def measured(work):
    """Seconds by the clock and of processors."""
    os.sync()  # what was written before does not go to the disk within this
    used, began = processor_time(), time.monotonic()
    work()
    return time.monotonic() - began, processor_time() - used


def check(found, wanted, who):
    if found != wanted:
        raise AssertionError(f"{who} found {found} of {wanted} documents")


def index_it(machine, files):
    machine.ctl("folder", "add", machine.root, "--document")
    machine.await_done(files)


def ours(folder, tree, files):
    """The first index, from the wish for it until the last document is found."""
    machine = ContentMachine(folder, tree)
    machine.start_daemon()
    seconds, processor = measured(lambda: index_it(machine, files))
    found = machine.ctl("search", "--share", "bench", "--count", contents_corpus.MARKER)
    check(int(found), files, "we")
    memory = peak_memory("talocontentsearchd")
    machine.close()
    machine.stop_daemon()
    return {"seconds": seconds, "processor": processor, "memory": memory,
            "size": size_of(machine.index, machine.contents)}


def pool(tree):
    told = subprocess.run(
        [POOL_BENCH, tree, f"{PROGRAMS}/fileindex-extract"], check=True, capture_output=True
    ).stdout
    return {"seconds": float(told.split()[0])}


def recoll(folder, tree, files):
    """As installed, but for manual pages: outside of the system's own it reads them only when told
    to. As we do, it is to take their source for text."""
    os.makedirs(folder)
    with open(f"{folder}/recoll.conf", "w", encoding="ascii") as file:
        file.write(f"topdirs = {tree}\nloglevel = 2\n")
    with open(f"{folder}/mimemap", "w", encoding="ascii") as file:
        file.write(f"[{tree}]\n.{MANUALS} = text/plain\n")

    def index():
        with open(f"{folder}/output", "wb") as output:
            subprocess.run(["recollindex", "-c", folder], check=True, stdout=output, stderr=output)

    seconds, processor = measured(index)
    told = subprocess.run(
        ["recollq", "-c", folder, "-n", "1", contents_corpus.MARKER],
        check=True, capture_output=True, text=True,
    ).stdout.splitlines()
    check(int(told[1].split()[0]), files, "recollindex")
    return {"seconds": seconds, "processor": processor, "size": size_of(f"{folder}/xapiandb")}


def tracker(folder, tree, documents):
    os.makedirs(folder)
    script = os.path.join(os.path.dirname(os.path.abspath(__file__)), "tracker_peer.py")
    os.sync()
    # Not through a pipe: what it leaves behind would keep that open.
    with open(f"{folder}.output", "w+b") as output:
        subprocess.run(
            ["dbus-run-session", sys.executable, script, folder, "texts", tree, str(documents)],
            check=True, stdout=output, stderr=subprocess.DEVNULL,
        )
        output.seek(0)
        told = output.read()
    for pid in processes_of(TRACKER_EXTRACT):
        os.kill(pid, signal.SIGKILL)
    return {"seconds": float(told)}


def first_index(folder):
    tree = f"{folder}/corpus"
    os.mkdir(tree)
    made = contents_corpus.make(tree, DIVISOR)
    files = sum(count for count, _ in made.values())
    documents = sum(made[kind][0] for kind in contents_corpus.FOR_DESKTOPS)
    print(f"{files} files, {sum(size for _, size in made.values()) / 1e6:.1f} MB")
    peers = {"ours": lambda place: ours(place, tree, files), "pool": lambda place: pool(tree)}
    if shutil.which("recollindex"):
        peers["recoll"] = lambda place: recoll(place, tree, files)
    if has_tracker(folder):
        peers["tracker"] = lambda place: tracker(place, tree, documents)
    results = {name: [] for name in peers}
    for number in range(ROUNDS):
        for name, peer in peers.items():
            place = f"{folder}/{name}"
            shutil.rmtree(place, ignore_errors=True)
            results[name].append(peer(place))
    print_first_index(
        {name: {what: statistics.median(one[what] for one in rounds) for what in rounds[0]}
         for name, rounds in results.items()}
    )
    if "recoll" in peers:
        questions(folder)
    for name in (*peers, "corpus"):
        shutil.rmtree(f"{folder}/{name}", ignore_errors=True)


def questions(folder):
    """To the indexes that the last round left."""
    tree = f"{folder}/one-document"
    os.mkdir(tree)
    write(f"{tree}/one.txt", contents_corpus.MARKER)
    ours(f"{folder}/ours-start", tree, 1)
    recoll(f"{folder}/recoll-start", tree, 1)
    contents_questions.compare(
        contents_questions.ours(PROGRAMS, f"{folder}/ours/state", f"{folder}/ours-start/state"),
        contents_questions.recoll(f"{folder}/recoll", f"{folder}/recoll-start"),
    )


def print_first_index(medians):
    def against(name, peer, what, target, *unit):
        reference = medians.get(peer, {}).get(what, 0)
        row(name, medians["ours"][what], reference, target, *unit)

    against("first index with contents / recollindex", "recoll", "seconds", "0.2", 1, "s")
    against("processor time of it / recollindex", "recoll", "processor", "0.333", 1, "s")
    against("first index with contents / tracker-miner-fs", "tracker", "seconds", "0.5", 1, "s")
    against("first index with contents / reading, extracting", "pool", "seconds", "1.5", 1, "s")
    against("size with text / recollindex", "recoll", "size", "0.333", 1e-6, "MB")
    row("memory of the service, highest / 64 MB", medians["ours"]["memory"], 64e6, "1", 1e-6, "MB")


def write(path, text):
    """The file's inode."""
    with open(path, "w", encoding="utf-8") as file:
        file.write(text)
        return os.fstat(file.fileno()).st_ino


def one_new_text(machine):
    """From one close: until its name is found, and until its content is."""
    names, contents = [], []
    for number in range(NEW_FILES):
        path = f"{machine.root}/new{number}.txt"
        inode = write(path, f"newtext{number} {contents_corpus.MARKER} " + "some words " * 200)
        began = time.monotonic()
        wait(lambda path=path: machine.found(path), machine.index)
        names.append(time.monotonic() - began)
        look_until(lambda inode=inode: machine.has_read(inode), SHORT_REST)
        contents.append(time.monotonic() - began)
        machine.await_quiet()
    last = machine.ctl("search", "--share", "bench", "--count", f"newtext{NEW_FILES - 1}")
    check(int(last), 1, "we")
    row("a new text, content found / name found: median",
        statistics.median(contents), statistics.median(names), "2")


def quick_ones(machine, name):
    """Seconds until all of a hundred texts are found."""
    before = machine.done()
    began = time.monotonic()
    for number in range(QUICK_FILES):
        write(f"{machine.root}/{name}{number}.txt", f"{name} " + "some other words " * 200)
    look_until(lambda: machine.done() >= before + QUICK_FILES, SHORT_REST)
    return time.monotonic() - began


def beside_a_slow_one(machine, repeats, number):
    """The same while a helper reads a slow document; and for how long it did."""
    path = f"{machine.root}/slow{number}.pdf"
    began = time.monotonic()
    with open(path, "wb") as file:
        file.write(slow_document.document(f"slowtext{number}", repeats))
        inode = os.fstat(file.fileno()).st_ino
    look_until(lambda: machine.has_begun(inode), SHORT_REST)
    seconds = quick_ones(machine, f"beside{number}")
    if machine.has_read(inode):
        raise AssertionError("the slow document was too quick")
    look_until(lambda: machine.has_read(inode), LONG_REST)
    took = time.monotonic() - began
    found = machine.ctl("search", "--share", "bench", "--count", f"slowtext{number}")
    check(int(found), 1, "we")
    return seconds, took


def slow_among_quick(machine):
    reading = [POOL_BENCH, f"{PROGRAMS}/fileindex-extract"]
    repeats = slow_document.repeats_for(SLOW_SECONDS, f"{machine.spare}/slow", reading)
    alone, beside = [], []
    for number in range(ROUNDS):
        alone.append(quick_ones(machine, f"alone{number}"))
        beside.append(beside_a_slow_one(machine, repeats, number))
    row(f"{QUICK_FILES} texts beside one that takes {SLOW_SECONDS} s / without it",
        statistics.median(seconds for seconds, _ in beside), statistics.median(alone), "1")
    row("that slow one itself", statistics.median(took for _, took in beside), 0, "", 1, "s")


def changes(folder):
    machine = ContentMachine(folder)
    machine.start_daemon()
    machine.start_notifier()
    write(f"{machine.root}/first.txt", "first")
    index_it(machine, 1)
    machine.sync()
    one_new_text(machine)
    slow_among_quick(machine)
    machine.close()
    machine.stop_notifier()
    machine.stop_daemon()


def main():
    os.sched_setaffinity(0, sorted(os.sched_getaffinity(0))[:2])
    log = Log()
    with tempfile.TemporaryDirectory(dir=os.environ["FILEINDEXD_BENCH_DIR"]) as folder:
        first_index(folder)
        changes(f"{folder}/changes")
    del log


if __name__ == "__main__":
    main()
