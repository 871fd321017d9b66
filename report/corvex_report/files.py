"""The files of a log directory. It may hold anything: nothing is followed, nothing can block."""

import errno
import os
import re
import stat
import zlib
from dataclasses import dataclass


UNPACKED = 4 * 1024 * 1024  # bytes that are taken from a packed file
GZIP = 31  # zlib's name for it


@dataclass(frozen=True)
class Entry:
    path: str  # below the log directory
    size: int = 0
    mtime: float = 0.0
    problem: str = ""  # why it cannot be looked into

    @property
    def name(self) -> str:
        return os.path.basename(self.path)


def natural(path: str) -> list[tuple[int, str]]:
    """Sorts android.log.10 behind android.log.9."""
    return [
        (int(part), "") if part.isdecimal() else (-1, part) for part in re.split(r"(\d+)", path)
    ]


def scan(directory: str) -> list[Entry]:
    """Everything below the directory but directories, unless those cannot be read."""
    entries: list[Entry] = []
    waiting = [""]
    while waiting:
        folder = waiting.pop()
        try:
            with os.scandir(os.path.join(directory, folder)) as listing:
                for item in listing:
                    path = os.path.join(folder, item.name)
                    if item.is_dir(follow_symlinks=False):
                        waiting.append(path)
                    else:
                        entries.append(_entry(path, item))
        except OSError as error:
            if not folder:
                raise
            entries.append(Entry(folder, problem=f"cannot be listed: {error.strerror}"))
    return sorted(entries, key=lambda entry: natural(entry.path))


def _entry(path: str, item: "os.DirEntry[str]") -> Entry:
    try:
        status = item.stat(follow_symlinks=False)
    except OSError as error:
        return Entry(path, problem=f"cannot be looked at: {error.strerror}")
    if stat.S_ISREG(status.st_mode):
        problem = "" if os.access(item.path, os.R_OK) else "may not be read"
        return Entry(path, status.st_size, status.st_mtime, problem)
    kind = "a link" if stat.S_ISLNK(status.st_mode) else "no regular file"
    return Entry(path, 0, status.st_mtime, f"is {kind} and was not looked into")


class Reader:
    """Reads pieces of one file. Raises OSError."""

    def __init__(self, directory: str, entry: Entry) -> None:
        flags = os.O_RDONLY | os.O_NOFOLLOW | os.O_NONBLOCK | os.O_CLOEXEC
        self._fd = os.open(os.path.join(directory, entry.path), flags)
        status = os.fstat(self._fd)
        self.size, self.mtime = status.st_size, status.st_mtime

    def __enter__(self) -> "Reader":
        return self

    def __exit__(self, *_: object) -> None:
        os.close(self._fd)

    def fileno(self) -> int:
        return self._fd

    def read(self, offset: int, length: int) -> bytes:
        return os.pread(self._fd, length, offset)


class Unpacked(Reader):
    """Reads the beginning of what a packed file holds."""

    def __init__(self, directory: str, entry: Entry) -> None:
        with Reader(directory, entry) as packed:
            data = packed.read(0, UNPACKED)
        try:
            text = zlib.decompressobj(GZIP).decompress(data, UNPACKED)
        except zlib.error as error:
            raise OSError(errno.EIO, "it cannot be unpacked") from error
        self._fd = os.memfd_create("unpacked", os.MFD_CLOEXEC)
        with open(os.dup(self._fd), "wb") as file:
            file.write(text)
        os.lseek(self._fd, 0, os.SEEK_SET)
        self.size, self.mtime = len(text), entry.mtime


def open_text(directory: str, entry: Entry) -> Reader:
    """Raises OSError."""
    return (Unpacked if entry.name.endswith(".gz") else Reader)(directory, entry)


def read_piece(directory: str, entry: Entry, length: int, at_end: bool = False) -> bytes:
    """The first or the last bytes of a file; none of one that cannot be read."""
    if entry.problem:
        return b""
    try:
        with Reader(directory, entry) as reader:
            return reader.read(max(0, reader.size - length) if at_end else 0, length)
    except OSError:
        return b""
