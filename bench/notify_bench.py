# SPDX-License-Identifier: GPL-2.0-or-later
"""Speed of the notification service, with the daemon behind it, on real files.

    bench/in_namespace python3 bench/notify_bench.py DIVISOR BIN_DIR BARE_READER

Sizes are divided by DIVISOR. Data lies below FILEINDEXD_BENCH_DIR.
"""

import os
import shutil
import signal
import statistics
import subprocess
import sys
import tempfile
import time

from machine import Log, Machine, has_tracker, row, wait

DIVISOR = int(sys.argv[1])
BIN = sys.argv[2]
BARE_READER = sys.argv[3]
ROUNDS = max(200 // DIVISOR, 20)
FILES = max(10_000 // DIVISOR, 500)
BURST = max(54_000 // DIVISOR, 2_000)
IN_A_FOLDER = 500


def make_files(folder, count, name="file"):
    for number in range(count):
        if number % IN_A_FOLDER == 0:
            os.makedirs(f"{folder}/{number // IN_A_FOLDER}")
        with open(f"{folder}/{number // IN_A_FOLDER}/{name}{number}.txt", "wb") as file:
            file.write(b"x" * 100)
    return count + -(-count // IN_A_FOLDER)


def one_new_file(machine):
    times = []
    os.makedirs(f"{machine.root}/single")
    machine.sync()
    for number in range(ROUNDS):
        path = f"{machine.root}/single/unique{number}.txt"
        with open(path, "wb") as file:
            file.write(b"x")
        began = time.monotonic()
        wait(lambda path=path: machine.found(path), machine.index)
        times.append(time.monotonic() - began)
        machine.await_quiet()
    peer = tracker(machine)
    for name, share in (("median", 0.5), ("95th percentile", 0.95)):
        ours, reference = (sorted(each)[int(len(each) * share)] for each in (times, peer or [0]))
        row(f"a new file, until found: {name} / tracker-miner-fs", ours, reference, "0.333")


def tracker(machine):
    """The times of tracker-miner-fs for the same; none where it cannot tell any."""
    if not has_tracker(machine.spare):
        return []
    folder = f"{machine.spare}/tracker"
    os.makedirs(folder)
    script = os.path.join(os.path.dirname(os.path.abspath(__file__)), "tracker_peer.py")
    told = subprocess.run(
        ["dbus-run-session", sys.executable, script, folder, "names", str(ROUNDS)],
        check=True, stdout=subprocess.PIPE, stderr=subprocess.DEVNULL,
    ).stdout
    shutil.rmtree(folder)
    return [float(line) for line in told.split()]


def unpacked(machine):
    entries = make_files(f"{machine.spare}/tree", FILES)
    subprocess.run(["tar", "cf", f"{machine.spare}/t.tar", "-C", machine.spare, "tree"], check=True)
    began = time.monotonic()
    subprocess.run(["tar", "xf", f"{machine.spare}/t.tar", "-C", machine.root], check=True)
    machine.await_count(f"{machine.root}/tree/", entries)
    ours = time.monotonic() - began
    machine.sync()

    # The first index of the same files: their folder becomes a share's for the first time.
    os.makedirs(f"{machine.spare}/other")
    os.rename(f"{machine.spare}/tree", f"{machine.spare}/other/tree")
    machine.ctl("share", "add", "first", f"{machine.spare}/other")
    index = f"{machine.state}/shares/first"
    began = time.monotonic()
    machine.ctl("folder", "add", f"{machine.spare}/other")
    queue = f"{index}/TALO@file_index_queue"
    wait(
        lambda: not os.path.exists(queue) and not os.path.exists(queue + ".tmp"), index
    )
    reference = time.monotonic() - began
    row(f"{FILES} files by tar, until found / first index", ours, reference, "2")
    machine.ctl("share", "remove", "first")
    shutil.rmtree(f"{machine.spare}/other")


def renamed(machine):
    """Both ways: by the service, and by the one line that the daemon is given alone."""
    old, new = f"{machine.root}/tree", f"{machine.root}/moved"
    entries = machine.count(f"{old}/")
    ours, reference = [], []
    for _ in range(3):
        began = time.monotonic()
        os.rename(old, new)
        wait(
            lambda new=new, old=old: machine.count(f"{new}/") == entries
            and machine.count(f"{old}/") == 0,
            machine.index,
        )
        ours.append(time.monotonic() - began)
        machine.sync()
        old, new = new, old
    machine.stop_notifier()
    for _ in range(3):
        began = time.monotonic()
        os.rename(old, new)
        machine.ctl("event", "bench", "256", new, "--path-old", old)
        wait(
            lambda new=new, old=old: machine.count(f"{new}/") == entries
            and machine.count(f"{old}/") == 0,
            machine.index,
        )
        reference.append(time.monotonic() - began)
        old, new = new, old
    machine.start_notifier()
    machine.sync()
    row(
        f"rename of {FILES} files / one line given",
        statistics.median(ours),
        statistics.median(reference),
        "1.2",
    )


def recoll(machine):
    """The same by recollindex in its monitoring mode, with an interval of one second."""
    config = f"{machine.spare}/recoll"
    top = f"{machine.spare}/top"
    os.makedirs(config)
    os.makedirs(top)
    with open(f"{config}/recoll.conf", "w", encoding="ascii") as file:
        file.write(f"topdirs = {top}\nindexallfilenames = 1\nmonauxinterval = 1\n"
                   "monixinterval = 1\nnoContentSuffixes = .txt\n")
    env = {**os.environ, "RECOLL_CONFDIR": config}

    def count(part):
        found = subprocess.run(
            ["recollq", "-n", "1", f"dir:{part}"], env=env, capture_output=True, check=False
        ).stdout.splitlines()
        return int(found[1].split()[0]) if len(found) > 1 and found[1].split() else 0

    subprocess.run(["recollindex"], env=env, check=True, capture_output=True)
    monitor = subprocess.Popen(
        ["recollindex", "-m", "-D", "-x", "-w", "0"],
        env=env, stdout=subprocess.DEVNULL, stderr=subprocess.DEVNULL,
    )
    times = {}
    try:
        time.sleep(3)  # it tells nobody when it has begun to watch
        for name, change in (
            ("made", lambda: make_files(f"{top}/tree", FILES)),
            ("moved", lambda: os.rename(f"{top}/tree", f"{top}/moved")),
        ):
            began = time.monotonic()
            change()
            part = f"{top}/tree" if name == "made" else f"{top}/moved"
            while count(part) < FILES and time.monotonic() - began < 120:
                time.sleep(0.05)
            times[name] = time.monotonic() - began
    finally:
        monitor.kill()
        monitor.wait()
    return times


def made_and_moved(machine):
    shutil.rmtree(f"{machine.root}/tree", ignore_errors=True)
    shutil.rmtree(f"{machine.root}/moved", ignore_errors=True)
    machine.sync()
    times = {}
    began = time.monotonic()
    entries = make_files(f"{machine.root}/new", FILES)
    machine.await_count(f"{machine.root}/new/", entries)
    times["made"] = time.monotonic() - began
    machine.sync()
    began = time.monotonic()
    os.rename(f"{machine.root}/new", f"{machine.root}/new2")
    machine.await_count(f"{machine.root}/new2/", entries)
    times["moved"] = time.monotonic() - began
    machine.sync()
    peer = recoll(machine) if shutil.which("recollindex") else {"made": 0, "moved": 0}
    row(f"{FILES} files made, until found / recollindex -m", times["made"], peer["made"], "0.2")
    row("their folder renamed, until found / the same", times["moved"], peer["moved"], "0.2")


def unpack(machine, target):
    subprocess.run(["tar", "xf", f"{machine.spare}/t.tar", "-C", target], check=True)


def clone(machine, target):
    subprocess.run(["git", "clone", "-q", "--no-local", f"{machine.spare}/git", target], check=True)


def make_repository(machine):
    git = ["git", "-C", f"{machine.spare}/git", "-c", "user.name=n", "-c", "user.email=e"]
    os.makedirs(f"{machine.spare}/git")
    make_files(f"{machine.spare}/git", FILES)
    for command in (["init", "-q"], ["add", "."], ["commit", "-q", "-m", "files"]):
        subprocess.run([*git, *command], check=True)


def slowed(machine):
    """tar and git, with the service at work and with somebody who reads the same events only."""
    def work(number, change):
        target = f"{machine.root}/slow{number}"
        os.mkdir(target)
        began = time.monotonic()
        change(machine, target)
        ended = time.monotonic()
        shutil.rmtree(target)
        return ended - began

    def median(change):
        return statistics.median(work(number, change) for number in range(5))

    make_repository(machine)
    changes = {"tar x": unpack, "git clone": clone}
    pid = machine.daemon_pid()
    os.kill(pid, signal.SIGSTOP)
    stopped = {name: median(change) for name, change in changes.items()}
    os.kill(pid, signal.SIGCONT)
    machine.sync()
    for thread in os.listdir(f"/proc/{pid}/task"):  # a Worker's may have ended by now
        subprocess.run(["chrt", "--idle", "--pid", "0", thread], check=False)
        subprocess.run(["ionice", "-c", "3", "-p", thread], check=False)
    working = {name: median(change) for name, change in changes.items()}
    machine.stop_notifier()
    machine.stop_daemon()
    reader = subprocess.Popen([BARE_READER, machine.root], stdout=subprocess.PIPE)
    reader.stdout.readline()
    bare = {name: median(change) for name, change in changes.items()}
    reader.kill()
    reader.wait()
    machine.start_daemon()
    machine.start_notifier()
    machine.sync()
    for name in changes:
        row(f"{name} with the service, daemon stopped / bare reader", stopped[name], bare[name], "1.2")
        row(f"{name}, the daemon at idle priority / the same", working[name], bare[name], "1.3")


def burst(machine):
    files = BURST // 3
    began = time.monotonic()
    os.makedirs(f"{machine.root}/burst")
    for number in range(files):
        path = f"{machine.root}/burst/{number}"
        os.close(os.open(path, os.O_CREAT | os.O_WRONLY))
        os.chmod(path, 0o600)
        if number % 2:
            os.rename(path, path + ".renamed")
    made = time.monotonic()
    machine.sync()
    machine.ctl("verify", "bench")
    row(f"{BURST} operations in {made - began:.1f} s, until all is found",
        time.monotonic() - made, 60, "1", 1, "s")


def fill_shares(machine):
    """Eight shares that hold a million files between them."""
    for number in range(1, 8):
        folder = f"{machine.spare}/rest{number}"
        make_files(f"{folder}/tree", max(1_000_000 // 7 // DIVISOR, 1000))
        machine.ctl("share", "add", f"rest{number}", folder)
        machine.ctl("folder", "add", folder)
    machine.sync()


def at_rest(machine):
    seconds = max(600 // DIVISOR, 10)
    fill_shares(machine)

    def used(pid):
        with open(f"/proc/{pid}/stat", encoding="ascii", errors="replace") as file:
            fields = file.read().rpartition(")")[2].split()
        return (int(fields[11]) + int(fields[12])) / os.sysconf("SC_CLK_TCK")

    def memory(pid):
        with open(f"/proc/{pid}/status", encoding="ascii", errors="replace") as file:
            return next(int(line.split()[1]) for line in file if line.startswith("VmRSS"))

    pids = {"service": machine.notifier.pid, "daemon": machine.daemon_pid()}
    time.sleep(30 if DIVISOR < 10 else 0)  # comparisons of the new shares
    began = {name: used(pid) for name, pid in pids.items()}
    time.sleep(seconds)
    for name, pid in pids.items():
        row(f"{name} at rest for {seconds} s: processor", used(pid) - began[name], 0, "")
        row(f"{name} at rest: resident / 20 MB", memory(pid) / 1000, 20, "1", 1, "MB")


def main():
    log = Log()
    with tempfile.TemporaryDirectory(dir=os.environ["FILEINDEXD_BENCH_DIR"]) as folder:
        machine = Machine(folder, BIN)
        machine.ctl("folder", "add", machine.root)
        machine.start_daemon()
        machine.start_notifier()
        machine.sync()
        one_new_file(machine)
        unpacked(machine)
        renamed(machine)
        slowed(machine)
        burst(machine)
        made_and_moved(machine)
        at_rest(machine)
        machine.stop_notifier()
        machine.stop_daemon()
    del log


if __name__ == "__main__":
    main()
