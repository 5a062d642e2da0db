# SPDX-License-Identifier: GPL-2.0-or-later
"""The control socket from a client's side, well-behaved or not.

    request  length (4 bytes, little-endian) body (JSON text and its NUL)
    reply    4 bytes, signed
"""

import json
import socket
import struct

from harness.awaiting import LIMIT

SOCKET = "/run/fileindexd.sock"


def frame(body):
    """A whole request of a body that needs its NUL."""
    return struct.pack("<I", len(body) + 1) + body + b"\0"


def request(kind, data):
    return frame(json.dumps({"type": kind, "data": data}, separators=(",", ":")).encode())


def connect():
    connection = socket.socket(socket.AF_UNIX, socket.SOCK_STREAM)
    connection.settimeout(LIMIT)
    connection.connect(SOCKET)
    return connection


def read_reply(connection):
    """The reply, or None when there is none, once the daemon has closed the connection."""
    received = b""
    part = None
    while part != b"":
        try:
            part = connection.recv(64)
        except ConnectionResetError:  # closed with bytes of ours unread
            part = b""
        received += part
    assert len(received) in (0, 4), f"no reply: {received!r}"
    return struct.unpack("<i", received)[0] if received else None


def exchange(request_bytes, hang_up=False):
    """Sends the bytes; with `hang_up` nothing more will come. The reply."""
    with connect() as connection:
        try:
            connection.sendall(request_bytes)
            if hang_up:
                connection.shutdown(socket.SHUT_WR)
        except (BrokenPipeError, ConnectionResetError):
            pass  # refused before all was sent: the reply tells
        return read_reply(connection)
