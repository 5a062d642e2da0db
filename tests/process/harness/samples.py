# SPDX-License-Identifier: GPL-2.0-or-later
"""Small files of formats that programs read."""

import struct


def pdf(*lines):
    """A page of these lines, plain ones without brackets."""
    page = b"BT /F1 12 Tf 14 TL 60 780 Td\n"
    page += b"".join(b"(%s) Tj T*\n" % line.encode("ascii") for line in lines) + b"ET\n"
    objects = [
        b"<< /Type /Catalog /Pages 2 0 R >>",
        b"<< /Type /Pages /Count 1 /Kids [4 0 R] >>",
        b"<< /Type /Font /Subtype /Type1 /BaseFont /Helvetica /Encoding /WinAnsiEncoding >>",
        b"<< /Type /Page /Parent 2 0 R /MediaBox [0 0 595 842] /Contents 5 0 R"
        b" /Resources << /Font << /F1 3 0 R >> >> >>",
        b"<< /Length %d >>\nstream\n%sendstream" % (len(page), page),
    ]
    made = b"%PDF-1.4\n"
    table = b"0000000000 65535 f \n"
    for number, body in enumerate(objects, 1):
        table += b"%010d 00000 n \n" % len(made)
        made += b"%d 0 obj\n%s\nendobj\n" % (number, body)
    count = len(objects) + 1
    end = b"trailer\n<< /Size %d /Root 1 0 R >>\nstartxref\n%d\n%%%%EOF\n" % (count, len(made))
    return made + b"xref\n0 %d\n" % count + table + end


def _text(tag, text, place):
    """An entry of a TIFF directory, whose text stands at that place."""
    return struct.pack("<HHII", tag, 2, len(text), place)


def photo(maker, model, taken):
    """A JPEG file as a camera begins it; `taken`: a datetime of the camera's clock."""
    texts = [text.encode("ascii") + b"\0" for text in (maker, model, f"{taken:%Y:%m:%d %H:%M:%S}")]
    first = 8 + (2 + 3 * 12 + 4) + (2 + 12 + 4)  # behind the header and both directories
    places = [first, first + len(texts[0]), first + len(texts[0]) + len(texts[1])]
    second = struct.pack("<HHII", 0x8769, 4, 1, 8 + 2 + 3 * 12 + 4)  # where the other directory is
    tiff = struct.pack("<2sHI", b"II", 42, 8)
    tiff += struct.pack("<H", 3) + _text(0x010F, texts[0], places[0])
    tiff += _text(0x0110, texts[1], places[1]) + second + struct.pack("<I", 0)
    tiff += struct.pack("<H", 1) + _text(0x9003, texts[2], places[2]) + struct.pack("<I", 0)
    exif = b"Exif\0\0" + tiff + b"".join(texts)
    frame = struct.pack(">HHBHHBBBB", 0xFFC0, 11, 8, 16, 16, 1, 1, 0x11, 0)
    scan = struct.pack(">HHBBBBBB", 0xFFDA, 8, 1, 1, 0, 0, 63, 0)
    return struct.pack(">HHH", 0xFFD8, 0xFFE1, len(exif) + 2) + exif + frame + scan + b"\0\xff\xd9"
