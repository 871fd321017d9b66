"""What the daemon collects beside its recordings, by kind, and what each says of itself."""

import os
import re
from dataclasses import dataclass, field
from datetime import datetime, timezone

from .clock import Clock
from .files import Entry, read_piece
from .tracks import Track

# Directory of the capture, and its title in the order of the page.
KINDS = (
    ("tombstones", "Tombstones"),
    ("anr", "ANR traces"),
    ("coredump", "Core dumps"),
    ("dropbox", "Dropbox entries"),
    ("Screenshots", "Screenshots"),
    ("media", "Media dumps"),
    ("rawdata", "Display dumps"),
    ("BatteryHistory", "Battery history"),
    ("boot_log", "Boot log"),
    ("log_before_initial", "Initial phase"),
    ("recovery", "Recovery"),
    ("kmsg", "Kernel logs of earlier boots"),
)
EARLIER, REPORTS, OTHER = "From before the capture", "Bug reports", "Other files"
LOGS = ("boot_log", "log_before_initial", "recovery", "kmsg")  # their lines have times
# Copied when the capture begins, or later: the times of their files are those of the copies.
COPIED = (EARLIER, *(title for name, title in KINDS if name in LOGS))
DESCRIBED = 4096  # bytes
# What a kernel may have nothing to say in, beside each ANR.
BINDER_STATE = ("transactions", "transaction_log", "state")
MARKERS = ("fileAfter911", "fileBefore911")
OWN = ("getprop.txt", "versionNumber")

STAMP = re.compile(r"\d{4}(-\d\d){5}(?!\d)", re.ASCII)
MILLISECONDS = re.compile(r"@(\d{12,13})(?!\d)", re.ASCII)
CRASH = re.compile(r"signal \d+ \((SIG\w+)\)")
PROCESS = re.compile(r">>> (.{1,100}?) <<<")
COMMAND = re.compile(r"^(?:Cmd line|Process): (.{1,100})$", re.MULTILINE)


@dataclass
class Item:
    """One artefact: a file, or what was collected with it into a directory of its own."""

    name: str
    entries: list[Entry] = field(default_factory=list)
    first: float | None = None
    last: float | None = None
    about: str = ""

    @property
    def size(self) -> int:
        return sum(entry.size for entry in self.entries)


@dataclass
class Kind:
    title: str
    items: list[Item]

    @property
    def size(self) -> int:
        return sum(item.size for item in self.items)


def stamp_time(text: str) -> float | None:
    stamp = STAMP.search(text)
    try:
        time = datetime.strptime(stamp[0], "%Y-%m-%d-%H-%M-%S") if stamp else None
    except ValueError:
        return None
    return time.replace(tzinfo=timezone.utc).timestamp() if time else None


def name_time(name: str, clock: Clock) -> float | None:
    """The time in a name, as the daemon and the system write it."""
    time = stamp_time(name)
    if time is not None:
        return time
    since_epoch = MILLISECONDS.search(name)
    return clock.from_utc(int(since_epoch[1]) / 1000) if since_epoch else None


def collect(
    directory: str, entries: list[Entry], tracks: dict[str, Track], clock: Clock
) -> list[Kind]:
    """`entries` are those that belong to no recorder."""
    titles = dict(KINDS)
    grouped: dict[str, dict[str, Item]] = {}
    for entry in entries:
        title, name = _place(entry, titles)
        item = grouped.setdefault(title, {}).setdefault(name, Item(name))
        item.entries.append(entry)
    kinds = []
    for title in [*titles.values(), EARLIER, REPORTS, OTHER]:
        items = list(grouped.get(title, {}).values())
        for item in items:
            _set_times(item, title, tracks, clock)
            item.about = _about(directory, item, title)
        items.sort(key=lambda item: (item.first is None, item.first or 0.0))
        if items:
            kinds.append(Kind(title, items))
    return kinds


def _place(entry: Entry, titles: dict[str, str]) -> tuple[str, str]:
    """The kind of an entry, and the item that it belongs to."""
    top, _, rest = entry.path.partition(os.sep)
    if top == "anr" and os.sep not in rest:  # those of the capture have directories of their own
        return EARLIER, rest
    if not rest:
        return (REPORTS if top.endswith("-BUGREPORT.log") else OTHER), top
    return (titles[top], rest.split(os.sep)[0]) if top in titles else (OTHER, top)


def _set_times(item: Item, title: str, tracks: dict[str, Track], clock: Clock) -> None:
    time = name_time(item.name, clock)
    if time is not None:
        item.first = item.last = time
        return
    path = item.entries[0].path
    track = tracks.get(path) if len(item.entries) == 1 else None
    if track and track.last is not None and (_this_start(path) or not track.format.relative):
        item.first, item.last = (clock.local(track, t) for t in (track.first, track.last))
    if item.first is None and title not in COPIED:
        written = [time for entry in item.entries if (time := clock.written(entry)) is not None]
        item.first = item.last = max(written, default=None)


def _this_start(path: str) -> bool:
    """Whether a copied log counts from this start of the device."""
    return path.startswith("boot_log" + os.sep) and not path.endswith(".pre")


def _about(directory: str, item: Item, title: str) -> str:
    if title in ("Dropbox entries", EARLIER) and "@" in item.name:
        return item.name.partition("@")[0].replace("_", " ")
    if title not in ("Tombstones", "ANR traces", EARLIER):
        return ""
    for entry in item.entries:
        text = read_piece(directory, entry, DESCRIBED).decode("utf-8", "surrogateescape")
        process = PROCESS.search(text) or COMMAND.search(text)
        if process:
            signal = CRASH.search(text)
            return f"{process[1].strip()}, {signal[1]}" if signal else process[1].strip()
    return ""
