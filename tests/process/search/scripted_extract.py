# SPDX-License-Identifier: GPL-2.0-or-later
"""A helper for the content service that does what a file's name says, and keeps a diary.

It speaks as the real one does (see extract/answer.h); what a file holds is its text.

    gate…      waits until somebody opens the pipe "gate" for writing
    crash…     ends by a signal, unless there is a file "mended"; so does gatecrash…, at the gate's end
    bad…       cannot be read
    unread…    is not given by the disk, unless there is a file "mended"
    nonsense…  is answered with bytes that are no answer

All files are in the helper's own folder. "diary" gets a line for each file: its name, our process.
"""

import array
import os
import signal
import socket
import struct

FOLDER = os.path.dirname(os.path.abspath(__file__))
SOCKET = 3
VERSION = 2
TEXT, KIND, SAMPLE, FAILED, BEGUN, READY, UNREAD = 128, 130, 131, 133, 134, 135, 136
DOCUMENT = 1


def beside(name):
    return os.path.join(FOLDER, name)


def record(tag, value):
    return struct.pack("<BI", tag, len(value)) + value


def frame(*records):
    body = b"".join(records)
    return struct.pack("<I", len(body)) + body


def note(name):
    diary = os.open(beside("diary"), os.O_WRONLY | os.O_APPEND | os.O_CREAT, 0o666)
    os.write(diary, name + f" {os.getpid()}\n".encode())
    os.close(diary)


def read(file, name):
    if name.startswith(b"gate"):
        os.close(os.open(beside("gate"), os.O_RDONLY))
    if name.startswith((b"crash", b"gatecrash")) and not os.path.exists(beside("mended")):
        os.kill(os.getpid(), signal.SIGABRT)
    if name.startswith(b"nonsense"):
        return b"\xff" * 100
    if name.startswith(b"unread") and not os.path.exists(beside("mended")):
        return frame(record(UNREAD, b"the disk is gone"))
    found = [record(KIND, bytes([DOCUMENT])), record(SAMPLE, struct.pack("<Q", 1))]
    if name.startswith(b"bad"):
        return frame(*found, record(FAILED, b"damaged"))
    text = b" ".join(os.pread(file, 1 << 20, 0).split())
    return frame(*([record(TEXT, text)] if text else []), *found)


def receive(connection):
    """The file and its name; none at the end."""
    files = array.array("i")
    data, control, _, _ = connection.recvmsg(8192, socket.CMSG_SPACE(files.itemsize))
    if not data:
        return None, b""
    files.frombytes(control[0][2][: files.itemsize])
    return files[0], data[8:]


def serve():
    connection = socket.socket(fileno=SOCKET)
    connection.sendall(frame(record(READY, bytes([VERSION]))))
    while True:
        file, name = receive(connection)
        if file is None:
            return
        connection.sendall(frame(record(BEGUN, b"")))
        note(name)
        connection.sendall(read(file, name))
        os.close(file)


serve()
