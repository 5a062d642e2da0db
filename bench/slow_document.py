# SPDX-License-Identifier: GPL-2.0-or-later
"""A document that takes as long to read as is wanted: a small PDF whose page draws a form many times,
which draws another one many times, and so on down to one that draws nothing."""

import os
import subprocess

import contents_corpus

TIMES = 100   # that a form draws the next one
LEVELS = 2    # of forms, below the page
PROBE = 0.3   # seconds; what takes longer tells well enough


def stream(head, body):
    return b"<< %s /Length %d >>\nstream\n%s\nendstream" % (head, len(body), body)


def document(words, repeats):
    """A PDF of one page with these words, at the cost of `repeats` * TIMES ** LEVELS drawings."""
    first = 7  # number of the first form's object; each draws the next
    page = b"BT /F1 10 Tf 60 780 Td (%s) Tj ET\n" % words.encode("ascii") + b"/X Do\n" * repeats
    objects = [
        b"<< /Type /Catalog /Pages 2 0 R >>",
        b"<< /Type /Pages /Count 1 /Kids [5 0 R] >>",
        b"<< /Type /Font /Subtype /Type1 /BaseFont /Helvetica /Encoding /WinAnsiEncoding >>",
        b"<< /Title (slow) >>",
        b"<< /Type /Page /Parent 2 0 R /MediaBox [0 0 595 842] /Contents 6 0 R /Resources << "
        b"/Font << /F1 3 0 R >> /XObject << /X %d 0 R >> >> >>" % first,
        stream(b"", page),
    ]
    for level in range(LEVELS):
        objects.append(stream(
            b"/Type /XObject /Subtype /Form /BBox [0 0 9 9] /Resources << /XObject << /X %d 0 R >> >>"
            % (first + level + 1), b"/X Do\n" * TIMES,
        ))
    objects.append(stream(b"/Type /XObject /Subtype /Form /BBox [0 0 9 9]", b"q Q"))
    return contents_corpus.pdf_file(objects)


def repeats_for(seconds, folder, reading):
    """How many make a document that takes so long on this machine. `reading`: the command that reads
    all files of a folder and prints for how long it did."""
    os.mkdir(folder)
    repeats, took = 1, 0
    while True:
        with open(f"{folder}/probe.pdf", "wb") as file:
            file.write(document("probe", repeats))
        told = subprocess.run([*reading[:1], folder, *reading[1:]], check=True, capture_output=True)
        took = float(told.stdout.split()[0])
        if took > PROBE:
            return max(round(repeats * seconds / took), 1)
        repeats *= 2
