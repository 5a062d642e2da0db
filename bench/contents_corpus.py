# SPDX-License-Identifier: GPL-2.0-or-later
"""A corpus of documents for the measurement of contents, the same one at each run.

    python3 bench/contents_corpus.py FOLDER DIVISOR

5,000 files and about 150 MB, divided by DIVISOR. Words follow Zipf's law over a vocabulary of a few
hundred thousand; each document draws two fifths of them from a subject that it shares with those
beside it, as real ones do, for else no document would hold anything twice that is rare. No text is
longer than 1 MiB. Every document holds the word MARKER once.
"""

import io
import itertools
import math
import multiprocessing
import os
import random
import sys
import textwrap
import zipfile
import zlib
from xml.sax.saxutils import escape

SEED = 20261121
MARKER = "everydocument"
IN_A_FOLDER = 50
COUNTS = {
    "txt": 660, "html": 660, "pdf": 660, "odt": 660, "docx": 660, "manual": 850, "source": 850,
}
FOR_DESKTOPS = ("txt", "html", "pdf", "odt", "docx")  # what indexers of a desktop read of them
MEDIAN_LENGTH = 16_500  # characters of text
SPREAD = 1.2            # of their logarithm
SHORTEST, LONGEST = 400, 700_000
WORDS = 300_000
SUBJECT = 600  # words of a subject
OWN = 250      # of them in one document
OLDEST = 1_600_000_000  # seconds since the epoch; each file is a minute younger than the one before

ONSETS = ("b c d f g h j k l m n p r s t v w b c d l m n p r s t l n r s t br ch cl cr dr fl fr gr pl pr "
          "qu sc sh sl sp st str th tr wh").split()
VOWELS = "a e i o u a e i o a e i ai ea ee ia io oa ou".split()
CODAS = [""] * 8 + "ck ct l ll m n nd ng nt p r rd rm rt s ss st t x".split()
ENDINGS = [""] * 10 + "s s s ed ed ing ing er ly tion ment al ness ity".split()
ACCENTS = str.maketrans("aeou", "áéöü")


class Vocabulary:
    """Words by rank: the frequent ones are short, as in every language."""

    def __init__(self):
        rng = random.Random(SEED)
        known = {}
        while len(known) < WORDS:
            rank = len(known)
            syllables = 1 if rank < 150 else rng.choice((1, 2)) if rank < 3000 else rng.choice((2, 2, 3))
            word = "".join(
                rng.choice(ONSETS) + rng.choice(VOWELS) for _ in range(syllables)
            ) + rng.choice(CODAS)
            if rank >= 150:
                word += rng.choice(ENDINGS)
            if rng.random() < 0.02:
                word = word.translate(ACCENTS)
            known.setdefault(word, None)
        self.words = list(known)
        weights = [(rank + 2.7) ** -1.15 for rank in range(WORDS)]
        self.sums = list(itertools.accumulate(weights))

    def draw(self, rng, count):
        return rng.choices(self.words, cum_weights=self.sums, k=count)

    def subject(self, rng):
        """Rarer words, which documents of that subject use again and again."""
        return [self.words[int(100 * (WORDS / 100) ** rng.random())] for _ in range(SUBJECT)]


class Writer:
    """Draws the text of one document."""

    def __init__(self, vocabulary, subject, rng):
        self.vocabulary = vocabulary
        self.rng = rng
        self.own = rng.sample(vocabulary.subject(subject), OWN)
        self.own_sums = list(itertools.accumulate(1 / (rank + 2) for rank in range(len(self.own))))
        self.stock = iter(())

    def words(self, count):
        taken = list(itertools.islice(self.stock, count))
        if len(taken) < count:
            common = self.vocabulary.draw(self.rng, 1200)
            own = self.rng.choices(self.own, cum_weights=self.own_sums, k=800)
            mixed = common + own
            self.rng.shuffle(mixed)
            for place in range(0, len(mixed), 60):
                mixed[place] = self.number()
            self.stock = iter(mixed)
            taken += itertools.islice(self.stock, count - len(taken))
        return taken

    def number(self):
        return self.rng.choice((
            lambda: str(self.rng.randrange(1, 10 ** self.rng.randrange(1, 7))),
            lambda: f"{self.rng.randrange(1, 29):02d}.{self.rng.randrange(1, 13):02d}."
                    f"{self.rng.randrange(1990, 2026)}",
            lambda: f"v{self.rng.randrange(10)}.{self.rng.randrange(20)}",
        ))()

    def sentence(self):
        words = self.words(self.rng.randrange(5, 22))
        if len(words) > 12:
            words[len(words) // 2] += ","
        return " ".join(words).capitalize() + "."

    def paragraph(self):
        return " ".join(self.sentence() for _ in range(self.rng.randrange(2, 8)))

    def paragraphs(self, length):
        """About `length` characters, the marker among them."""
        made = [f"{self.sentence()} {MARKER} {self.sentence()}"]
        left = length - len(made[0])
        while left > 0:
            made.append(self.paragraph()[: left + 100])
            left -= len(made[-1])
        return made

    def title(self):
        return " ".join(self.words(self.rng.randrange(2, 6))).title()

    def identifier(self):
        words = [word for word in self.words(self.rng.randrange(1, 4)) if word.isascii()]
        words = [word for word in words if word.isalpha()] or ["value"]
        if self.rng.random() < 0.5:
            return "_".join(words)
        return words[0] + "".join(word.title() for word in words[1:])


def cut(text, *lengths):
    """Pieces of about these lengths and the rest; no word is cut through."""
    pieces = []
    for length in lengths:
        end = text.find(" ", length) + 1 or len(text)
        pieces.append(text[:end])
        text = text[end:]
    return [*pieces, text]


def txt(writer, length):
    return "\n\n".join(textwrap.fill(one, 78) for one in writer.paragraphs(length)).encode()


def html(writer, length):
    title = escape(writer.title())
    parts = [
        f'<!DOCTYPE html>\n<html lang="en"><head><meta charset="utf-8"><title>{title}</title>\n'
        f'<link rel="stylesheet" href="style.css"><script>var shown = "{title}";</script></head>\n'
        f'<body class="page"><div id="navigation"><ul><li><a href="index.html">Index</a></li>'
        f'</ul></div>\n<h1>{title}</h1>\n'
    ]
    for number, text in enumerate(writer.paragraphs(length)):
        if number % 6 == 5:
            parts.append(f'<h2 id="part{number}">{escape(writer.title())}</h2>\n')
        link, strong, rest = map(escape, cut(text, 1, 20))
        parts.append(f'<p class="text"><a href="#part{number}">{link}</a><em>{strong}</em>'
                     f"{rest}</p>\n")
    return "".join(parts + ["</body></html>\n"]).encode()


def pdf_page(lines):
    shown = []
    for line in lines:
        text = line.encode("cp1252", "replace")
        for special in (b"\\", b"(", b")"):
            text = text.replace(special, b"\\" + special)
        shown.append(b"(" + text + b") Tj T*\n")
    return b"BT /F1 10 Tf 12 TL 60 780 Td\n" + b"".join(shown) + b"ET\n"


def pdf(writer, length):
    lines = []
    for text in writer.paragraphs(length):
        lines += textwrap.wrap(text, 92) + [""]
    pages = [lines[at : at + 58] for at in range(0, len(lines), 58)]
    title = writer.title().encode("cp1252", "replace")
    author = b"".join(word.encode("cp1252", "replace") for word in writer.words(1))
    first = 5  # number of the first page's object; its stream follows it
    kids = b" ".join(b"%d 0 R" % (first + 2 * at) for at in range(len(pages)))
    objects = [
        b"<< /Type /Catalog /Pages 2 0 R >>",
        b"<< /Type /Pages /Count %d /Kids [%s] >>" % (len(pages), kids),
        b"<< /Type /Font /Subtype /Type1 /BaseFont /Helvetica /Encoding /WinAnsiEncoding >>",
        b"<< /Title (%s) /Author (%s) /CreationDate (D:20200101120000Z) >>" % (title, author),
    ]
    for at, page in enumerate(pages):
        packed = zlib.compress(pdf_page(page))
        objects.append(
            b"<< /Type /Page /Parent 2 0 R /MediaBox [0 0 595 842] /Contents %d 0 R "
            b"/Resources << /Font << /F1 3 0 R >> >> >>" % (first + 2 * at + 1)
        )
        objects.append(
            b"<< /Length %d /Filter /FlateDecode >>\nstream\n%s\nendstream" % (len(packed), packed)
        )
    return pdf_file(objects)


def pdf_file(objects):
    """Objects 1 (the catalogue) to 4 (the information) and others, with what holds them together."""
    made = io.BytesIO()
    made.write(b"%PDF-1.4\n")
    places = []
    for number, body in enumerate(objects, 1):
        places.append(made.tell())
        made.write(b"%d 0 obj\n%s\nendobj\n" % (number, body))
    table = made.tell()
    made.write(b"xref\n0 %d\n0000000000 65535 f \n" % (len(objects) + 1))
    made.write(b"".join(b"%010d 00000 n \n" % place for place in places))
    made.write(b"trailer\n<< /Size %d /Root 1 0 R /Info 4 0 R >>\nstartxref\n%d\n%%%%EOF\n"
               % (len(objects) + 1, table))
    return made.getvalue()


def packed(members):
    made = io.BytesIO()
    with zipfile.ZipFile(made, "w", zipfile.ZIP_DEFLATED) as archive:
        for name, text in members.items():
            member = zipfile.ZipInfo(name)  # with a date that never changes
            member.compress_type = zipfile.ZIP_STORED if name == "mimetype" else zipfile.ZIP_DEFLATED
            archive.writestr(member, text)
    return made.getvalue()


XML = '<?xml version="1.0" encoding="UTF-8"?>\n'
ODF = "urn:oasis:names:tc:opendocument:xmlns"
ODT_TYPE = "application/vnd.oasis.opendocument.text"


def odt(writer, length):
    names = (f'xmlns:office="{ODF}:office:1.0" xmlns:text="{ODF}:text:1.0" '
             f'xmlns:meta="{ODF}:meta:1.0" xmlns:dc="http://purl.org/dc/elements/1.1/" '
             'office:version="1.3"')
    body = []
    for number, text in enumerate(writer.paragraphs(length)):
        if number % 8 == 0:
            body.append('<text:h text:style-name="Heading_20_1" text:outline-level="1">'
                        f"{escape(writer.title())}</text:h>")
        head, strong, rest = map(escape, cut(text, 40, 40))
        body.append(f'<text:p text:style-name="Text_20_body">{head}'
                    f'<text:span text:style-name="T1">{strong}</text:span>{rest}</text:p>')
    return packed({
        "mimetype": ODT_TYPE,
        "META-INF/manifest.xml":
            f'{XML}<manifest:manifest xmlns:manifest="{ODF}:manifest:1.0">'
            f'<manifest:file-entry manifest:full-path="/" manifest:media-type="{ODT_TYPE}"/>'
            '<manifest:file-entry manifest:full-path="content.xml" manifest:media-type="text/xml"/>'
            '<manifest:file-entry manifest:full-path="meta.xml" manifest:media-type="text/xml"/>'
            "</manifest:manifest>",
        "meta.xml":
            f"{XML}<office:document-meta {names}><office:meta><dc:title>{escape(writer.title())}"
            f"</dc:title><dc:creator>{escape(writer.words(1)[0])}</dc:creator></office:meta>"
            "</office:document-meta>",
        "content.xml":
            f"{XML}<office:document-content {names}><office:body><office:text>{''.join(body)}"
            "</office:text></office:body></office:document-content>",
    })


def docx(writer, length):
    package = "http://schemas.openxmlformats.org/package/2006"
    office = "application/vnd.openxmlformats-officedocument.wordprocessingml"
    words = "http://schemas.openxmlformats.org/wordprocessingml/2006/main"
    relations = "http://schemas.openxmlformats.org/officeDocument/2006/relationships"
    run = '<w:r w:rsidR="00A77427"><w:t xml:space="preserve">'
    bold = '<w:r><w:rPr><w:b/></w:rPr><w:t xml:space="preserve">'
    body = []
    for text in writer.paragraphs(length):
        head, strong, rest = map(escape, cut(text, 50, 20))
        body.append('<w:p w:rsidR="00A77427" w:rsidRDefault="00B3489D"><w:pPr><w:pStyle '
                    f'w:val="Normal"/></w:pPr>{run}{head}</w:t></w:r>{bold}{strong}</w:t></w:r>'
                    f"{run}{rest}</w:t></w:r></w:p>")
    return packed({
        "[Content_Types].xml":
            f'{XML}<Types xmlns="{package}/content-types"><Default Extension="rels" '
            'ContentType="application/vnd.openxmlformats-package.relationships+xml"/>'
            '<Default Extension="xml" ContentType="application/xml"/><Override '
            f'PartName="/word/document.xml" ContentType="{office}.document.main+xml"/></Types>',
        "_rels/.rels":
            f'{XML}<Relationships xmlns="{package}/relationships"><Relationship Id="rId1" '
            f'Type="{relations}/officeDocument" Target="word/document.xml"/><Relationship Id="rId2" '
            f'Type="{package}/relationships/metadata/core-properties" Target="docProps/core.xml"/>'
            "</Relationships>",
        "docProps/core.xml":
            f'{XML}<cp:coreProperties xmlns:cp="{package}/metadata/core-properties" '
            'xmlns:dc="http://purl.org/dc/elements/1.1/">'
            f"<dc:title>{escape(writer.title())}</dc:title>"
            f"<dc:creator>{escape(writer.words(1)[0])}</dc:creator></cp:coreProperties>",
        "word/document.xml":
            f'{XML}<w:document xmlns:w="{words}"><w:body>{"".join(body)}</w:body></w:document>',
    })


def manual(writer, length):
    name = writer.identifier()
    lines = [f'.\\" Automatically generated', f'.TH {name.upper()} 1 "2020-01-01" "1.0" "Commands"',
             ".SH NAME", f"{name} \\- {' '.join(writer.words(5))}", ".SH SYNOPSIS",
             f".B {name}", "[\\fIoptions\\fR] \\fIfile\\fR", ".SH DESCRIPTION"]
    for number, text in enumerate(writer.paragraphs(length)):
        if number % 12 == 11:
            lines.append(f".SH {writer.title().upper()}")
        if number % 3 == 1:
            lines += [".TP", f"\\fB\\-\\-{writer.identifier().replace('_', '-')}\\fR=\\fIvalue\\fR"]
        else:
            lines.append(".PP")
        lines += textwrap.wrap(text, 72)
    return ("\n".join(lines) + "\n").encode()


def source(writer, length):
    lines = [f"/* {writer.sentence()} {MARKER} */", "#include <stdio.h>", ""]
    size = 0
    while size < length:
        name, value = writer.identifier(), writer.identifier()
        before = len(lines)
        lines += [f"/* {one}" if not at else f" * {one}"
                  for at, one in enumerate(textwrap.wrap(writer.sentence(), 76))]
        lines += [" */", f"static int {name}(struct {value} *{value}, size_t count)", "{"]
        for _ in range(writer.rng.randrange(2, 14)):
            one, other = writer.identifier(), writer.identifier()
            lines += writer.rng.choice((
                [f"\tint {one} = {other}({value}, {writer.rng.randrange(1000)});"],
                [f"\tif ({one} < count) {{", f"\t\treturn {other}->{one};", "\t}"],
                [f"\tfor (size_t i = 0; i < count; ++i) {{", f"\t\t{one}[i] += {other};", "\t}"],
                [f'\tprintf("{" ".join(writer.words(4))}: %d\\n", {one});'],
            ))
        lines += ["\treturn 0;", "}", ""]
        size += sum(len(line) + 1 for line in lines[before:])
    return "\n".join(lines).encode()


MAKERS = {"txt": txt, "html": html, "pdf": pdf, "odt": odt, "docx": docx, "manual": manual,
          "source": source}
SUFFIXES = {"manual": "1", "source": "c"}
vocabulary = None


def prepare():
    global vocabulary
    vocabulary = Vocabulary()


def make_file(task):
    folder, number, kind = task
    rng = random.Random(SEED * 1_000_003 + number)
    subject = random.Random(SEED + number // IN_A_FOLDER)
    writer = Writer(vocabulary, subject, rng)
    length = round(MEDIAN_LENGTH * math.exp(rng.gauss(0, SPREAD)))
    data = MAKERS[kind](writer, min(max(length, SHORTEST), LONGEST))
    name = "-".join(word for word in writer.words(3) if word.isalpha()).lower()
    path = (f"{folder}/project-{number // IN_A_FOLDER:03d}/"
            f"{name}-{number:04d}.{SUFFIXES.get(kind, kind)}")
    with open(path, "wb") as file:
        file.write(data)
    os.utime(path, (OLDEST + number * 60,) * 2)
    return kind, len(data)


def kinds(divisor):
    """The kind of each file, evenly mixed."""
    places = []
    for kind, full in COUNTS.items():
        count = max(full // divisor, 2)
        places += [((at + 0.5) / count, kind) for at in range(count)]
    return [kind for _, kind in sorted(places)]


def make(folder, divisor):
    """Fills the folder, which must be there. Gives {kind: (files, bytes)}."""
    tasks = [(folder, number, kind) for number, kind in enumerate(kinds(divisor))]
    for number in range(0, len(tasks), IN_A_FOLDER):
        os.mkdir(f"{folder}/project-{number // IN_A_FOLDER:03d}")
    made = dict.fromkeys(COUNTS, (0, 0))
    with multiprocessing.Pool(initializer=prepare) as pool:
        for kind, size in pool.imap_unordered(make_file, tasks, chunksize=8):
            made[kind] = (made[kind][0] + 1, made[kind][1] + size)
    return made


if __name__ == "__main__":
    os.makedirs(sys.argv[1])
    for each, (files, size) in make(sys.argv[1], int(sys.argv[2])).items():
        print(f"{each:<8} {files:>5} files {size / 1e6:>7.1f} MB")
