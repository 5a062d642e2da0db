# SPDX-License-Identifier: GPL-2.0-or-later
"""./run, as somebody does who has just got it: it shows words that stand inside of files."""

import datetime
import os
import re
import subprocess

from harness import main, namespace
from harness.awaiting import LIMIT
from harness.machine import environment
from harness.samples import pdf, photo
from harness.watching import NOTIFIER_PID_FILE
from search.library import ContentsTest

PROJECT = os.path.realpath(f"{os.path.dirname(__file__)}/../../..")


class RunTest(ContentsTest):
    folder = f"{namespace.DATA}/work"

    def setUp(self):
        super().setUp()
        self.prefixed = False  # the log has the notification service's lines too
        os.mkdir(self.folder)

    def put(self, name, content):
        path = f"{self.folder}/{name}"
        os.makedirs(os.path.dirname(path), exist_ok=True)
        with open(path, "wb") as file:
            file.write(content if isinstance(content, bytes) else content.encode())
        return path

    def run_it(self, *arguments):
        return subprocess.Popen(
            [f"{PROJECT}/run", *arguments],
            env=environment(),
            stdin=subprocess.DEVNULL,
            stdout=subprocess.PIPE,
            stderr=subprocess.STDOUT,
            encoding="utf-8",
        )

    def index(self):
        """What ./run prints, to its end."""
        run = self.run_it(self.folder)
        out, _ = run.communicate(timeout=LIMIT * 3)
        self.assertEqual(run.returncode, 0, out)
        return out

    def stop_all(self):
        with open(NOTIFIER_PID_FILE, encoding="ascii") as file:
            notifier = int(file.read())
        daemon = self.daemon_pid()
        run = self.run_it("--stop")
        # It waits until they are gone, which they are once their parent here has seen it.
        self.assertEqual(self.await_exit(notifier), 0)
        self.assertEqual(self.await_exit(daemon), 0)
        out, _ = run.communicate(timeout=LIMIT)
        self.assertEqual((run.returncode, len(out.splitlines())), (0, 2), out)


class FirstUseTest(RunTest):
    def make_mixed_files(self):
        self.put("keeper.txt", "The lighthouse. Who keeps the lighthouse, and for how long?\n")
        self.put("harbour/report.pdf", pdf("A lighthouse above", "the lighthouse of last year"))
        self.put("beach.jpg", photo("Canon", "Canon EOS 5D", datetime.datetime(2024, 1, 5, 12)))

    def test_a_word_inside_of_the_files_is_shown(self):
        self.make_mixed_files()

        out = self.index()

        self.assertIn(f'{self.folder} is indexed as share "work": 5 entries.', out)
        self.assertRegex(out, r"(?m)^Contents: 3 read\b")
        shown = re.search(r"\n\$ (.* text:lighthouse) +# 2 in all\n((?:/.*\n)+)", out)
        self.assertIsNotNone(shown, out)
        self.assertEqual(shown[1], "fileindexctl search --share work --limit 3 text:lighthouse")
        self.assertEqual(
            sorted(shown[2].splitlines()),
            [f"{self.folder}/harbour/report.pdf", f"{self.folder}/keeper.txt"],
        )
        self.assertEqual(self.hits("camera:eos", "work"), ["beach.jpg"])
        self.stop_all()

    def test_run_again_it_changes_nothing(self):
        self.make_mixed_files()
        self.index()
        daemon = self.daemon_pid()

        out = self.index()

        self.assertIn("text:lighthouse   # 2 in all\n", out)
        self.assertEqual(self.daemon_pid(), daemon)
        self.assertEqual(len(self.ctl("share", "list").out.splitlines()), 1)
        self.stop_all()
        self.assertIn("daemon does not run", self.run_it("--stop").communicate(timeout=LIMIT)[0])


class ReadmeTest(RunTest):
    """What README.md shows a new user, on a folder that has what it asks for and what is like it."""

    ANNA = 4242

    def setUp(self):
        super().setUp()
        with open("/etc/passwd", encoding="utf-8") as file:
            users = file.read()
        self.write(f"{namespace.RUN}/passwd", f"{users}anna:x:{self.ANNA}:{self.ANNA}::/:/bin/sh\n")
        namespace.mount(f"{namespace.RUN}/passwd", "/etc/passwd", flags=namespace.MS_BIND)
        self.addCleanup(namespace.unmount, "/etc/passwd", namespace.MNT_DETACH)

    def questions(self):
        """{what a command is said to find: the command}"""
        with open(f"{PROJECT}/README.md", encoding="utf-8") as file:
            found = re.findall(r"(?m)^    (fileindexctl search .*?) +# (.*)$", file.read())
        return {purpose: command for command, purpose in found}

    def answer(self, command):
        """Names of the files, as the shell's user sees them."""
        path = f"{os.environ['FILEINDEXD_BIN_DIR']}:{os.environ['PATH']}"
        done = subprocess.run(["bash", "-c", command], env=environment(PATH=path), check=False,
                              capture_output=True, timeout=LIMIT)
        self.assertEqual((done.returncode, done.stderr), (0, b""), command)
        return [os.path.basename(path) for path in done.stdout.decode().splitlines()]

    def put_hole(self, name, size, beginning=b"", owner=0):
        path = self.put(name, beginning)
        os.truncate(path, size)
        os.chown(path, owner, -1)

    def make_folder(self):
        self.put("office/2023.pdf", pdf("Whales: the annual", "report of the year"))
        self.put("office/2022.pdf", pdf("A report, as is annual for whales"))
        self.put("office/annual.txt", "the annual report of all the others")
        now = datetime.datetime.now()
        for name, model, days in (("a", "Canon EOS 5D", 2), ("b", "Canon EOS 5D", 6),
                                  ("old", "Canon EOS 5D", 9), ("other", "Canon EOS 6D", 2),
                                  ("5d", "Nikon D5", 2)):
            taken = now - datetime.timedelta(days=days)
            self.put(f"photos/{name}.jpg", photo("Canon", model, taken))
        for number in range(1, 13):
            self.put_hole(f"films/{number}.mkv", number * 20_000_000, owner=self.ANNA)
        self.put_hole("films/hers too, but no film.txt", 900_000_000, owner=self.ANNA)
        self.put_hole("films/not hers.mkv", 900_000_001)
        scan = photo("Nikon", "Nikon D5", datetime.datetime(2020, 1, 5, 12))
        for number in range(30):
            self.put_hole(f"copies/{number}.jpg", 11_000_000, scan)
        self.put_hole("copies/as large.jpg", 11_000_000, scan.replace(b"D5", b"D6"))
        for number in range(2):
            self.put_hole(f"copies/small {number}.jpg", 10_000_000, scan)
        for name in ("invoice of may.ods", "iovce.ods", "voices.ods"):
            self.put(name, "x")

    def test_what_it_shows_a_new_user_is_found(self):
        self.make_folder()
        self.index()
        self.await_counts("work", waiting=0)

        found = {purpose: self.answer(command) for purpose, command in self.questions().items()}

        self.assertEqual(found.pop("a phrase inside a PDF"), ["2023.pdf"])
        photos = found.pop("last week's photos of one camera")
        self.assertEqual(sorted(photos), ["a.jpg", "b.jpg"])
        self.assertEqual(
            found.pop("the ten largest videos of one owner"),
            [f"{number}.mkv" for number in range(12, 2, -1)],
        )
        copies = found.pop("all duplicates above 10 MB")
        self.assertEqual(sorted(copies), sorted(f"{number}.jpg" for number in range(30)))
        names = found.pop("three letters in the middle of a name")
        self.assertEqual(sorted(names), ["invoice of may.ods", "voices.ods"])
        self.assertEqual(found, {}, "each has its answer above")
        self.stop_all()


class ReadmeSessionTest(RunTest):
    """The session that README.md shows, on a folder of the same name."""

    SHOWN = "/usr/share/doc"
    BUILT = "$PWD/build/release/bin"  # those that are tested may lie elsewhere
    folder = f"{namespace.DATA}/doc"

    # What each prompt answers: the names of its hits, or its lines.
    ANSWERS = {
        "fileindexctl search --share doc --limit 3 text:devices": ["first.txt", "second.txt"],
        "fileindexctl search --limit 2 byte-compiled modules": ["policy.html", "policy.txt"],
        "fileindexctl search '\"free software\" ext:pdf'": ["libtasn1.pdf"],
        f"touch {SHOWN}/holiday-plan.txt; fileindexctl search --wait name:holiday":
            ["holiday-plan.txt"],
        f"rm {SHOWN}/holiday-plan.txt": [],
        "fileindexctl verify doc && echo the index agrees with the disk":
            ["the index agrees with the disk"],
    }

    def prompts(self):
        """Its commands, in order, without what is said about them."""
        with open(f"{PROJECT}/README.md", encoding="utf-8") as file:
            found = re.findall(r"(?m)^    [#$] (.*?)(?: {2,}# .*)?$", file.read())
        self.assertEqual(found.pop(0), f"./run {self.SHOWN}")
        return found

    def make_folder(self):
        for name in self.ANSWERS["fileindexctl search --share doc --limit 3 text:devices"]:
            self.put(name, "what is said of devices: devices")
        self.put("policy.html", "<p>modules should be byte-compiled</p>")
        self.put("policy.txt", "byte-compiled are the modules")
        self.put("modules.txt", "of modules, and of what is compiled")
        self.put("libtasn1.pdf", pdf("This is free software", "and more"))
        self.put("gpl.txt", "free software")
        self.put("other.pdf", pdf("software, free of charge"))

    def test_each_prompt_answers_what_it_is_for(self):
        self.make_folder()
        out = self.index()
        self.assertRegex(out, rf"(?m)^{self.folder} is indexed as share \"doc\": 9 entries\.$")
        prompts = self.prompts()
        export = f"export PATH={self.BUILT}:$PATH"
        self.assertEqual([prompt for prompt in prompts if prompt != export], list(self.ANSWERS))
        prompts.remove(export)
        export = export.replace(self.BUILT, os.environ["FILEINDEXD_BIN_DIR"])

        for prompt in prompts:
            if "verify" in prompt:  # who types is slower than the service
                self.ctl("search", "--wait", "name:holiday")
            command = f"{export}; {prompt}".replace(self.SHOWN, self.folder)
            done = subprocess.run(["bash", "-c", command], cwd=PROJECT, env=environment(),
                                  check=False, capture_output=True, timeout=LIMIT)
            self.assertEqual((done.returncode, done.stderr), (0, b""), command)
            lines = [line.removeprefix(f"{self.folder}/")
                     for line in done.stdout.decode().splitlines()]
            self.assertEqual(sorted(lines), self.ANSWERS[prompt], prompt)
        self.stop_all()

    def test_the_command_lines_of_the_manual_of_questions_find_what_it_says(self):
        with open(f"{PROJECT}/QUERY.md", encoding="utf-8") as file:
            commands = re.findall(r"`(fileindexctl search [^`]+)`", file.read())
        wanted = {"fileindexctl search 'size:>1G \"annual report\"'": "annual report.bin",
                  "fileindexctl search --kind video is:file": "film.mkv"}
        self.assertEqual(commands, list(wanted))
        for name, size in (("annual report.bin", 2 << 30), ("old annual report.bin", 1 << 30),
                           ("report annual.bin", 2 << 30), ("film.mkv", 1)):
            os.truncate(self.put(name, ""), size)
        self.index()

        path = f"{os.environ['FILEINDEXD_BIN_DIR']}:{os.environ['PATH']}"
        for command in commands:
            done = subprocess.run(["bash", "-c", command], env=environment(PATH=path), check=False,
                                  capture_output=True, timeout=LIMIT)
            self.assertEqual((done.returncode, done.stderr), (0, b""), command)
            self.assertEqual(done.stdout.decode(), f"{self.folder}/{wanted[command]}\n", command)
        self.stop_all()


if __name__ == "__main__":
    main()
