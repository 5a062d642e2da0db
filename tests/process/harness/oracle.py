# SPDX-License-Identifier: GPL-2.0-or-later
"""What an index has to hold, by a walk that shares nothing with the programs."""

import contextlib
import os
import stat

KINDS = {
    b"document": b"txt md c html svg pdf odt docx epub eml zip tar",
    b"audio": b"mp3 flac ogg",
    b"video": b"mp4 mkv ts",
    b"photo": b"jpg png heic",
}
KIND_OF_ENDING = {
    ending: kind.decode() for kind, endings in KINDS.items() for ending in endings.split()
}


def _is_left_out(name):
    return (
        name in (b"#snapshot", b".snapshots", b"lost+found")
        or name.startswith((b".nfs", b".fuse_hidden", b"~$"))
        or (name.startswith(b".~lock.") and name.endswith(b"#"))
    )


def _mount_points():
    """Paths of all mounts, as bytes."""
    points = set()
    with open("/proc/self/mountinfo", "rb") as file:
        for line in file:
            field = line.split(b" ")[4]
            for escape in (b"\\040", b"\\011", b"\\012", b"\\134"):
                field = field.replace(escape, bytes([int(escape[1:], 8)]))
            points.add(field)
    return points


def kind_of_name(path):
    """What a file's name tells."""
    name, dot, ending = os.path.basename(path).rpartition(b".")
    return KIND_OF_ENDING.get(ending.lower(), "other") if name and dot else "other"


def _kind(path, mode):
    if stat.S_ISDIR(mode):
        return "folder"
    return "other" if stat.S_ISLNK(mode) else kind_of_name(path)


def _describe(path, info):
    is_folder = stat.S_ISDIR(info.st_mode)
    return {
        "dir": is_folder,
        "kind": _kind(path, info.st_mode),
        "size": 0 if is_folder else info.st_size,
        "mtime": 0 if is_folder else info.st_mtime_ns // 10**9,
    }


def expected_entries(root, folders=None, left_out=()):
    """{path: description} of all that belongs in the index of the share at `root`.

    `folders`: its indexed folders, the root if not given; `left_out`: snapshots.
    """
    root = os.fsencode(root)
    covering = [os.fsencode(folder) for folder in (folders if folders is not None else [root])]
    left_out = {os.fsencode(path) for path in left_out}
    mounts = _mount_points()
    found = {}

    pending = [root]
    while pending:
        path = pending.pop()
        with contextlib.suppress(FileNotFoundError):
            info = os.lstat(path)
            mode = info.st_mode
            if not (stat.S_ISDIR(mode) or stat.S_ISREG(mode) or stat.S_ISLNK(mode)):
                continue
            if any(path == folder or path.startswith(folder + b"/") for folder in covering):
                found[path] = _describe(path, info)
            if stat.S_ISDIR(mode) and (path == root or path not in mounts):
                children = {
                    path + b"/" + name for name in os.listdir(path) if not _is_left_out(name)
                }
                pending += children - left_out
    return found
