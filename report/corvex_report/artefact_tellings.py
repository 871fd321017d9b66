"""What the collected artefacts tell of: tombstones, traces, dropbox entries."""

import os
import re
from collections.abc import Callable, Sequence

from .artefacts import BINDER_STATE, name_time
from .clock import Clock
from .crash_texts import PROCESS, Crash, java_crash, native_crash, not_responding
from .files import Entry, open_text
from .occurrences import SYSTEM, Telling
from .line_formats import Calendar
from .records import text_of

LONGEST = 256 * 1024  # bytes of an artefact's text
DROPPED = re.compile(r"([A-Za-z_]{1,60})@\d+\.(?:txt|dat)(?:\.gz)?$")
DUMPS = ("dumpsys_input", *BINDER_STATE)  # are made beside each trace
KERNEL_TAGS = ("SYSTEM_LAST_KMSG", "APANIC_CONSOLE")


def dropbox_tag(entry: Entry) -> str | None:
    match = DROPPED.fullmatch(entry.name)
    return match[1] if match and entry.path.startswith(("dropbox/", "anr/")) else None


def told(directory: str, entry: Entry, clock: Clock, calendar: Calendar) -> Telling | None:
    """Raises OSError."""
    top = entry.path.split(os.sep)[0]
    tag = dropbox_tag(entry)
    if not entry.size or (tag is None and top not in ("tombstones", "anr")):
        return None
    if tag in KERNEL_TAGS or entry.name in DUMPS:
        return None
    with open_text(directory, entry) as reader:
        lines = text_of(reader.read(0, LONGEST)).split("\n")
    if tag is None:
        kind = "native-crash" if top == "tombstones" else "anr"
        crash = native_crash(lines) if top == "tombstones" else not_responding(lines)
    else:
        kind, crash = _dropped(tag, lines)
    if crash is None:
        return None
    own = _seconds(crash.time, calendar)
    # A directory of that time holds what came while the capture ran.
    time = own if own is not None else name_time(entry.path.removeprefix(top), clock)
    rank = (1 if top == "tombstones" else 3) if tag is None else 4
    return Telling.of(crash, kind, time, entry.path, rank)


def _seconds(text: str, calendar: Calendar) -> float | None:
    if not text:
        return None
    midnight = calendar.month_day(text[:10].encode())
    hour, minute, second = (int(part) for part in text[11:].split(":"))
    return None if midnight is None else midnight + hour * 3600 + minute * 60 + second


Parse = Callable[[Sequence[str]], Crash | None]
# The end of an entry's tag, the kind of what it tells of, and who knows how.
TAGS: tuple[tuple[str, str, Parse], ...] = (
    ("_native_crash", "native-crash", native_crash),
    ("SYSTEM_TOMBSTONE", "native-crash", native_crash),
    ("_crash", "java-crash", java_crash),
    ("_anr", "anr", not_responding),
    ("_watchdog", "system-restart", not_responding),
)


def _dropped(tag: str, lines: list[str]) -> tuple[str, Crash | None]:
    for ending, kind, parse in TAGS:
        if not tag.endswith(ending):
            continue
        if any(PROCESS.search(line) for line in lines[:60]):  # whatever it is filed under
            kind, parse = "native-crash", native_crash
        crash = parse(lines) or java_crash(lines)
        if tag.startswith("system_server"):
            crash.process = SYSTEM
            if kind == "anr":
                return kind, crash
            return "system-restart", crash
        return kind, crash
    return "", None
