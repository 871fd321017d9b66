"""The table of a capture's recorders, and how each numbers its files."""

import re
from dataclasses import dataclass

from .files import Entry


@dataclass(frozen=True)
class Recorder:
    name: str  # of its file
    title: str
    switches: tuple[str, ...]
    quiet: float = 0.0  # seconds without a line that are odd; 0: half the capture
    ring: bool = False  # numbers its files in a ring; the others shift theirs, the oldest is last
    may_be_empty: bool = False
    once: bool = False  # copied at the start, and its lines have no date

    def number(self, name: str) -> int | None:
        """Which file of the series this is: 0 is the newest, or the first of a ring."""
        pattern = r"(\d*)" if self.ring else r"(?:\.(\d{1,9}))?"
        match = re.fullmatch(re.escape(self.name) + pattern, name)
        return int(match[1] or 0) if match else None


RECORDERS = (
    # The daemon itself takes an android.log that stands still for five minutes for stuck.
    Recorder("android.log", "Android", ("persist.sys.main", "persist.sys.system"), quiet=300.0),
    Recorder("radio.log", "Radio", ("persist.sys.radio",)),
    Recorder("event.log", "Events", ("persist.sys.event",)),
    Recorder("kernel.log", "Kernel", ("persist.sys.kernel",)),
    Recorder("tcpdump", "Packets", ("persist.sys.tcpdump",), ring=True),
    Recorder("qsee.log", "Secure world, applications", ("persist.sys.qsee",)),
    Recorder("tz.log", "Secure world, kernel", ("persist.sys.tz",)),
    Recorder("bootloader.log", "Bootloader", ("persist.sys.bootloader",), once=True),
    # Its area is erased once read: only the first capture after a start of the device finds text.
    Recorder(
        "pre_bootloader.log",
        "Pre-bootloader",
        ("persist.sys.pre_bootloader",),
        may_be_empty=True,
        once=True,
    ),
)


def rotated_files(recorder: Recorder, entries: list[Entry]) -> dict[int, Entry]:
    """The files of one recorder by their numbers."""
    files = {}
    for entry in entries:
        number = recorder.number(entry.path)
        if number is not None:
            files[number] = entry
    return files


def missing_names(recorder: Recorder, files: dict[int, Entry]) -> list[str]:
    """The files that the others' numbers say there must be, or have been."""
    if not files:
        return []
    width = max(len(entry.path.removeprefix(recorder.name).lstrip(".")) for entry in files.values())
    missing = [number for number in range(min(max(files), 1000)) if number not in files]
    return [_name(recorder, number, width) for number in missing]


def _name(recorder: Recorder, number: int, width: int) -> str:
    if recorder.ring:
        return f"{recorder.name}{number:0{width}}"
    return f"{recorder.name}.{number:0{width}}" if number else recorder.name
