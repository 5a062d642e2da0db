# SPDX-License-Identifier: GPL-2.0-or-later
"""One-word questions over the corpus of documents: fileindexctl against recollq on its own index of
the same files, each as a process of its own, in turns.

What starting costs is told by the same programs on an index of one document.
"""

import os
import statistics
import time

import contents_corpus
from machine import row

RANKS = (200, 300, 500, 800, 1300, 2100, 3400, 5500, 8900, 14400)  # of words, the common ones first
ROUNDS = 10
SHOWN = "20"


def words():
    """Plain ones, near to those ranks."""
    known = contents_corpus.Vocabulary().words
    return [
        next(word for word in known[rank:] if word.isascii() and len(word) > 3) for rank in RANKS
    ]


class Asker:
    """A program and its index."""

    def __init__(self, arguments, env, start_arguments, start_env):
        self.arguments = arguments
        self.env = env
        self.start_arguments = start_arguments
        self.start_env = start_env
        self.times = []
        self.starts = []

    def ask(self, word):
        self.times.append(time_of([*self.arguments, word], self.env))
        self.starts.append(time_of([*self.start_arguments, contents_corpus.MARKER], self.start_env))

    def forget(self):
        self.times.clear()
        self.starts.clear()

    def median(self):
        return statistics.median(self.times)

    def median_without_start(self):
        return self.median() - statistics.median(self.starts)


def time_of(arguments, env):
    """Seconds until the program has ended; what it says is dropped."""
    silent = [(os.POSIX_SPAWN_OPEN, fd, os.devnull, os.O_WRONLY, 0) for fd in (1, 2)]
    began = time.monotonic()
    pid = os.posix_spawnp(arguments[0], arguments, env, file_actions=silent)
    _, status = os.waitpid(pid, 0)
    seconds = time.monotonic() - began
    if status != 0:
        raise AssertionError(f"{arguments} ended with {status}")
    return seconds


def ours(programs, state, start_state):
    search = [f"{programs}/fileindexctl", "search", "--limit", SHOWN]
    env = {**os.environ, "FILEINDEXD_STATE_DIR": state}
    return Asker(search, env, search, {**env, "FILEINDEXD_STATE_DIR": start_state})


def recoll(folder, start_folder):
    def command(of):
        return ["recollq", "-c", of, "-n", SHOWN]

    return Asker(command(folder), os.environ, command(start_folder), os.environ)


def compare(one, other):
    asked = words()
    for number in range(ROUNDS + 1):
        for word in asked:
            one.ask(word)
            other.ask(word)
        if number == 0:  # now all is in the page cache
            one.forget()
            other.forget()
    row("one word over the documents, without start / recollq",
        one.median_without_start(), other.median_without_start(), "2")
    row("the same with the start of the process", one.median(), other.median(), "0.333")
