"""Looks through a capture for what went wrong."""

import os
import re
from collections.abc import Callable, Iterator, Sequence
from functools import partial

from . import android_tellings, artefact_tellings, conditions, kernel_tellings
from .android_tellings import EVENT_RULES, MAIN_RULES, Mention
from .artefact_tellings import KERNEL_TAGS, dropbox_tag
from .capture import Capture
from .files import Entry, Reader, open_text
from .incidents import Incident, incidents
from .occurrences import Telling
from .log_search import LINE, MOST, search, start_of_device
from .records import Record, record_parser

AHEAD = 65536  # bytes behind a mention in which its writer goes on
LINES = 400
OWN = 160  # lines that a writer adds
LATER = 5.0  # seconds for which it goes on

KERNEL, ANDROID, EVENTS = "kernel", "android", "events"
NAMES = (
    (re.compile(r"android(?:_boot|_initial)?\.log"), ANDROID),
    (re.compile(r"event(?:_boot|_initial)?\.log"), EVENTS),
    (re.compile(r"kernel(?:_boot|_initial)?\.log"), KERNEL),
)
EARLIER = ("kmsg", "recovery")
FOLDERS = ("", "boot_log", "log_before_initial")
Progress = Callable[[str], None]


def log_kind(entry: Entry) -> str | None:
    """Which system's log it is, by its place and name."""
    folder, name = os.path.split(entry.path)
    if folder.split(os.sep)[0] in EARLIER or dropbox_tag(entry) in KERNEL_TAGS:
        return KERNEL
    if folder not in FOLDERS:
        return None
    return next((kind for pattern, kind in NAMES if pattern.match(name)), None)


def find_incidents(capture: Capture, progress: Progress) -> list[Incident]:
    """What cannot be read is noted in the capture."""
    parse = record_parser(capture.calendar)
    tellings: list[Telling] = []
    for entry in capture.entries:
        if entry.problem or not entry.size:
            continue
        progress(entry.path)
        try:
            kind = log_kind(entry)
            if kind:
                tellings += _Log(capture, entry, kind, parse).tellings()
            elif telling := artefact_tellings.told(
                capture.directory, entry, capture.clock, capture.calendar
            ):
                tellings.append(telling)
        except OSError as error:
            capture.unreadable.append((entry.path, f"cannot be read: {error.strerror}"))
    tellings += conditions.boot_reason(capture.properties)
    tellings += conditions.overheating(capture.records)
    return incidents(tellings)


class _Log:
    def __init__(
        self, capture: Capture, entry: Entry, kind: str, parse: Callable[[bytes], Record | None]
    ) -> None:
        self._capture, self._entry, self._kind, self._parse = capture, entry, kind, parse
        self._boot = capture.clock.boot if os.sep not in entry.path else None

    def tellings(self) -> Iterator[Telling]:
        with open_text(self._capture.directory, self._entry) as reader:
            hits = list(search(reader))
            if len(hits) >= MOST:
                text = f"has over {MOST} lines that may tell of an incident; the rest was not read"
                self._capture.unreadable.append((self._entry.path, text))
            lines = [(hit, reader.read(hit.offset, LINE).split(b"\n")[0]) for hit in hits]
            if hits and self._kind == KERNEL and self._boot is None:
                self._boot = start_of_device(reader)
            for hit, line in lines:
                record = self._parse(line)
                if record is None:
                    continue
                mention = Mention(
                    record,
                    self._entry.path,
                    hit.number,
                    hit.offset,
                    self._capture.clock.of_record(record, self._boot),
                    partial(self._following, reader, hit.offset, record),
                )
                if self._kind == KERNEL:
                    yield from kernel_tellings.told(mention)
                else:
                    rules = EVENT_RULES if self._kind == EVENTS else MAIN_RULES
                    yield from android_tellings.told(mention, rules)

    def _following(self, reader: Reader, offset: int, first: Record) -> Sequence[str]:
        """What the same writer says next."""
        found: list[str] = []
        lines = reader.read(offset, AHEAD).split(b"\n")[1:LINES]
        for line in lines:
            record = self._parse(line[:LINE])
            if record is None:
                continue
            if self._kind == KERNEL:
                found.append(record.kernel_text)
            elif (record.pid, record.tid, record.tag) == (first.pid, first.tid, first.tag):
                found.append(record.text)
            if len(found) >= OWN or record.time > first.time + LATER:
                break
        return found
