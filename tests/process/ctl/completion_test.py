# SPDX-License-Identifier: GPL-2.0-or-later
"""Completion of the command line in bash and zsh: what is offered, and that it is what there is."""

import os
import pty
import pwd
import re
import select
import shlex
import shutil
import subprocess
import unittest

from harness import IndexTest, main, namespace
from harness.awaiting import LIMIT
from harness.machine import environment, program

FOLDER = os.path.join(os.path.dirname(__file__), "../../../packaging/completions")
ZSH = os.path.realpath(FOLDER)
BASH = os.path.realpath(f"{FOLDER}/fileindexctl.bash")

COMMANDS = ["dump", "event", "failed", "folder", "info", "log-level", "pause", "reindex", "resume",
            "search", "share", "stats", "status", "verify", "worker"]
KINDS = ["audio", "document", "folder", "other", "photo", "video"]

# Words behind the program's name, the last one being completed, and what is offered, sorted.
OFFERED = [
    (("",), COMMANDS),
    (("s",), ["search", "share", "stats", "status"]),
    (("nope",), []),
    (("share", ""), ["accept", "add", "list", "remove", "set"]),
    (("folder", "re"), ["remove"]),
    (("worker", "drop", ""), ["alpha", "beta"]),
    (("share", "remove", "b"), ["beta"]),
    (("dump", ""), ["alpha", "beta"]),
    (("dump", "-0", "al"), ["alpha"]),
    (("verify", "alpha", ""), []),
    (("search", "--share", ""), ["alpha", "beta"]),
    (("search", "word", "--kind", ""), KINDS),
    (("search", "--kind", "p"), ["photo"]),
    (("search", "--sort", ""), ["modified", "name", "size"]),
    (("search", "--limit", ""), []),
    (("search", "--re"), ["--reverse"]),
    (("search", "word", "--off"), ["--offset"]),
    (("stats", "--by", ""), ["age", "ext", "folder", "kind", "owner"]),
    (("stats", "--share", "be"), ["beta"]),
    (("share", "set", "alpha", "--language", "ge"), ["german"]),
    (("log-level", ""), ["debug", "error"]),
    (("failed", "--retry", ""), ["alpha", "beta"]),
]

# Where the value stands in the option's own word.
EQUALS = [
    (("search", "--kind="), KINDS),
    (("search", "--kind=v"), ["video"]),
    (("search", "--sort=mo"), ["modified"]),
    (("search", "--share=be"), ["beta"]),
    (("stats", "--share="), ["alpha", "beta"]),
    (("stats", "--by=ex"), ["ext"]),
    (("folder", "set", "--document="), ["off", "on"]),
    (("folder", "set", "--document=o"), ["off", "on"]),
]


def commands(ctl, *group):
    """All that there are, in their words, as help lists them."""
    help_text = ctl(*group, "--help").out.decode()
    listed = help_text.partition("\nCommands:\n")[2].partition("\n\n")[0]
    return [tuple(re.split(r"\s{2,}", line.strip())[0].split()) for line in listed.splitlines()
            if re.match(r"  \S", line)]


def languages(ctl):
    """All that --language takes, as a refusal lists them."""
    told = ctl("share", "set", "alpha", "--language", "?", code=2).err.decode()
    return told.partition("not one of ")[2].rpartition(": ")[0].split(", ")


class CompletionTest(IndexTest):
    def setUp(self):
        super().setUp()
        self.root = self.make_share()
        self.make_share("beta")


class BashTest(CompletionTest):
    @staticmethod
    def pieces(word):
        """As the shell parts a word that is not in quotes."""
        return [word] if word[:1] in ("", "'") else re.findall(r"[:=]+|[^:=]+", word)

    def offered(self, *words, setup="", **more):
        """What the function leaves in COMPREPLY, sorted."""
        script = (
            f'{setup}\n'
            'source "$0"; program=$1; COMP_LINE="$program $2"; shift 2; '
            'COMP_WORDS=("$program" "$@"); COMP_CWORD=$#; '
            '_fileindexctl "$program" "${@: -1}" "${COMP_WORDS[COMP_CWORD-1]}"; '
            'printf "%s\\0" "${COMPREPLY[@]}"'
        )
        pieces = [piece for word in words for piece in self.pieces(word)]
        done = subprocess.run(
            ["bash", "--norc", "-c", script, BASH, program("fileindexctl"), " ".join(words),
             *pieces],
            env=environment(**more),
            capture_output=True,
            check=True,
            timeout=LIMIT,
        )
        self.assertEqual(done.stderr, b"")
        replies = done.stdout.decode().split("\0")
        return sorted(reply for reply in replies if reply)

    def test_what_is_offered(self):
        for words, wanted in OFFERED:
            with self.subTest(words=words):
                self.assertEqual(self.offered(*words), wanted)

    def test_values_behind_an_equals_sign(self):
        for words, wanted in EQUALS:
            with self.subTest(words=words):
                self.assertEqual(self.offered(*words), wanted)
        self.assertEqual(self.offered("search", "--kind=photo", "--so"), ["--sort"])
        self.assertEqual(self.offered("folder", "set", "--doc"), ["--document="])

    def test_every_option_of_every_command_and_no_other(self):
        found = commands(self.ctl)
        self.assertGreater(len(found), 20)
        for words in found:
            with self.subTest(command=words):
                listed = self.ctl(*words, "--help").out.decode().partition("\nOptions:\n")[2]
                wanted = re.findall(r"^  (?:-h,)?(--[a-z-]+|-0)", listed, re.MULTILINE)
                offered = [reply.rstrip("=") for reply in self.offered(*words, "-")]
                self.assertEqual(offered, sorted(wanted))

    def test_every_language(self):
        known = languages(self.ctl)
        self.assertGreater(len(known), 2)
        self.assertEqual(self.offered("share", "set", "alpha", "--language", ""), known)

    def test_every_command(self):
        for words in commands(self.ctl):
            with self.subTest(command=words):
                self.assertIn(words[-1], self.offered(*words))

    def test_paths(self):
        self.make_files(self.root, "one/two.txt", "one/three/")

        self.assertEqual(self.offered("info", f"{self.root}/on"), [f"{self.root}/one"])
        self.assertEqual(self.offered("reindex", f"{self.root}/one/t"),
                         [f"{self.root}/one/three", f"{self.root}/one/two.txt"])
        self.assertEqual(self.offered("folder", "add", f"{self.root}/one/t"),
                         [f"{self.root}/one/three"])
        self.assertEqual(self.offered("search", "--under", f"{self.root}/o"), [f"{self.root}/one"])

    def test_names_of_shares_that_need_quotes(self):
        self.make_share("my files")
        self.make_share("a$b")

        self.assertEqual(self.offered("dump", ""), ["a\\$b", "alpha", "beta", "my\\ files"])
        self.assertEqual(self.offered("dump", "my\\ f"), ["my\\ files"])
        self.assertEqual(self.offered("dump", "'my f"), ["my files"])

    def test_names_with_ends_of_lines(self):
        self.make_files(self.root, "two\nlines", "two\nfolders/")

        self.assertEqual(self.offered("info", f"{self.root}/tw"),
                         [f"{self.root}/two\nfolders", f"{self.root}/two\nlines"])
        self.assertEqual(self.offered("folder", "add", f"{self.root}/tw"),
                         [f"{self.root}/two\nfolders"])

    def test_paths_in_home_folders(self):
        self.make_files(self.root, "two")
        home = pwd.getpwnam("daemon").pw_dir
        theirs = sorted(f"~daemon/{name}" for name in os.listdir(home) if name.startswith("a"))
        self.assertTrue(theirs)

        self.assertEqual(self.offered("info", "~/tw", HOME=self.root), ["~/two"])
        self.assertEqual(self.offered("info", "~daemon/a"), theirs)
        self.assertEqual(self.offered("info", "~nobody-there/"), [])

    def test_names_with_backslashes(self):
        self.make_files(self.root, "a\\b", "ab")

        wanted = [f"{self.root}/a\\b"]
        self.assertEqual(self.offered("info", f"{self.root}/a\\\\"), wanted)
        self.assertEqual(self.offered("info", f"'{self.root}/a\\"), wanted)

    def test_nothing_is_said_where_what_matches_nothing_is_an_error(self):
        for words in (("info", f"{self.root}/none"), ("nope",), ("dump", "none")):
            with self.subTest(words=words):
                self.assertEqual(self.offered(*words, setup="shopt -s failglob"), [])

    def test_no_option_stands_behind_two_dashes(self):
        self.assertEqual(self.offered("search", "--", "-"), [])
        self.assertEqual(self.offered("search", "--kind", "photo", "--", "--so"), [])
        self.assertEqual(self.offered("search", "--", "--kind", "p"), [])
        self.assertEqual(self.offered("search", "--", "--kind=p"), [])
        self.assertEqual(self.offered("verify", "--", "-"), [])
        self.assertEqual(self.offered("verify", "--", "al"), ["alpha"])
        self.assertEqual(self.offered("search", "--kind", "p", "--"),
                         self.offered("search", "--"))

    def test_names_that_the_shell_parts(self):
        for name in ("a:b", "a:c=d", "a::"):
            self.make_share(name)
        self.make_files(self.root, "x=1:2/y:z")

        self.assertEqual(self.offered("dump", "a"), ["a::", "a:b", "a:c=d", "alpha"])
        # The shell puts what is offered behind the last ':' or '='.
        self.assertEqual(self.offered("dump", "a:"), [":", "b", "c=d"])
        self.assertEqual(self.offered("dump", "a:c"), ["c=d"])
        self.assertEqual(self.offered("dump", "a:c="), ["d"])
        self.assertEqual(self.offered("search", "--share=a:b"), ["b"])
        self.assertEqual(self.offered("search", "--share", "a:b", "--so"), ["--sort"])
        self.assertEqual(self.offered("verify", "a:b", "--re"), ["--repair"])
        self.assertEqual(self.offered("dump", "'a:c"), ["a:c=d"])
        self.assertEqual(self.offered("info", f"{self.root}/x=1:2/y:"), ["z"])

    def test_no_state_is_made(self):
        nowhere = {"FILEINDEXD_STATE_DIR": f"{namespace.RUN}/nowhere"}

        self.assertEqual(self.offered("dump", "", **nowhere), [])
        self.assertEqual(self.offered("search", "--share", "a", **nowhere), [])
        self.assertFalse(os.path.lexists(f"{namespace.RUN}/nowhere"))

    def test_without_a_state_no_share_is_offered(self):
        broken = {"FILEINDEXD_STATE_DIR": f"{namespace.STATE}/state.db/none"}

        self.assertEqual(self.offered("dump", "", **broken), [])
        self.assertEqual(self.offered("dump", "-", **broken), ["--help", "--json", "-0"])


# Sends what completion would offer down a pipe, and offers nothing.
ZSH_SETUP = """
PS1= PS2= ; unsetopt zle_bracketed_paste prompt_cr prompt_sp beep
fpath=({folder} $fpath); autoload -Uz compinit; compinit -D -u
compadd() {{
  local -a given=("$@") found
  if (( ${{given[(I)-[a-zA-Z]#[OAD]]}} )); then
    builtin compadd "$@"; return
  fi
  builtin compadd -A found "$@"
  (( $#found )) && print -rlu {pipe} -- $found
  builtin compadd "$@"
}}
offer() {{ _main_complete; compstate[insert]=''; compstate[list]=''; print -u {pipe} END; }}
setopt extended_glob; zle -C offer complete-word offer; bindkey -e; bindkey '^T' offer
print -u {pipe} END
"""


@unittest.skipUnless(shutil.which("zsh"), "no zsh here")
class ZshTest(CompletionTest):
    def setUp(self):
        super().setUp()
        self.keyboard, terminal = pty.openpty()
        self.pipe, theirs = os.pipe()
        setup = f"{namespace.RUN}/setup.zsh"
        with open(setup, "w", encoding="ascii") as file:
            file.write(ZSH_SETUP.format(folder=shlex.quote(ZSH), pipe=theirs))
        path = f"{os.path.dirname(program('fileindexctl'))}:{os.environ['PATH']}"
        self.shell = subprocess.Popen(
            ["zsh", "-f", "-i"],
            env=environment(TERM="dumb", PATH=path),
            stdin=terminal,
            stdout=terminal,
            stderr=terminal,
            pass_fds=[theirs],
            start_new_session=True,
        )
        os.close(terminal)
        os.close(theirs)
        self.addCleanup(self.end)
        self.theirs = theirs
        self.type(f"source {setup}\n")

    def end(self):
        self.shell.kill()
        self.shell.wait(LIMIT)
        os.close(self.keyboard)
        os.close(self.pipe)

    def type(self, text):
        """What comes down the pipe up to its end; the screen is read and dropped meanwhile."""
        os.write(self.keyboard, text.encode())
        told, screen = b"", b""
        while not told.endswith(b"END\n"):
            ready, _, _ = select.select([self.keyboard, self.pipe], [], [], LIMIT)
            self.assertTrue(ready, f"nothing comes: {told!r}, {screen!r}")
            if self.keyboard in ready:
                screen += os.read(self.keyboard, 4096)
            if self.pipe in ready:
                told += os.read(self.pipe, 4096)
        return told.decode().splitlines()[:-1]

    def offered(self, *words):
        line = " ".join(["fileindexctl", *words])
        return sorted(set(self.type(f"\x15{line}\x14")))

    def test_what_is_offered(self):
        for words, wanted in OFFERED:
            if not wanted and not words[-1]:
                continue  # it goes on to offer options, or files
            with self.subTest(words=words):
                self.assertEqual(self.offered(*words), wanted)

    def test_every_option_of_every_command(self):
        for words in commands(self.ctl):
            with self.subTest(command=words):
                listed = self.ctl(*words, "--help").out.decode().partition("\nOptions:\n")[2]
                wanted = re.findall(r"^  (?:-h,)?(--[a-z-]+|-0)", listed, re.MULTILINE)
                offered = [reply.rstrip("=") for reply in self.offered(*words, "-")]
                self.assertEqual(offered, sorted(wanted))

    def test_values_behind_an_equals_sign(self):
        self.make_files(self.root, "only/")
        for words, wanted in EQUALS:
            with self.subTest(words=words):
                self.assertEqual(self.offered(*words), wanted)
        for command, option in (("search", "--under"), ("event", "--path-old")):
            self.assertEqual(self.offered(command, f"{option}={self.root}/o"), ["only"])

    def test_no_option_stands_behind_two_dashes(self):
        self.assertEqual(self.offered("search", "--", "-"), [])
        self.assertEqual(self.offered("verify", "--", "-"), [])
        self.assertEqual(self.offered("verify", "--", "al"), ["alpha"])

    def test_no_state_is_made(self):
        nowhere = f"{namespace.RUN}/nowhere"
        self.type(f"FILEINDEXD_STATE_DIR={nowhere}; print -u {self.theirs} END\n")

        self.assertEqual(self.offered("worker", "drop", ""), [])
        self.assertFalse(os.path.lexists(nowhere))


if __name__ == "__main__":
    main()
