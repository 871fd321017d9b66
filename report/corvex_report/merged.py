"""All logs of a capture as one, by time, a line at a time."""

import heapq
import os
from collections.abc import Callable, Iterator

from .artefacts import LOGS
from .capture import Capture
from .files import Entry, open_text
from .log_search import start_of_device
from .records import record_parser, threadtime

CHUNK = 65536
LONGEST = 16384  # bytes of a line that are shown
UNKNOWN = -float("inf")
# What would move a terminal's cursor, or worse.
HARMLESS = bytes(c if c == 9 or (c >= 32 and c != 127) else ord("?") for c in range(256))
Line = tuple[float, bytes]


def merged(capture: Capture) -> Iterator[bytes]:
    """What has no time that is known comes first."""
    sources = [
        _Source(capture, one.recorder.name, [file.entry for file in one.files])
        for one in capture.series
        if not one.recorder.ring
    ]
    sources += [
        _Source(capture, entry.path, [entry])
        for entry in capture.entries
        if os.sep in entry.path and entry.path.split(os.sep)[0] in LOGS
    ]
    streams = [source.lines() for source in sources]
    for _, line in heapq.merge(*streams, key=lambda one: one[0]):
        yield line


class _Source:
    """The files of one recorder, or one file."""

    def __init__(self, capture: Capture, name: str, entries: list[Entry]) -> None:
        self._directory, self._clock, self._entries = capture.directory, capture.clock, entries
        self._parse = record_parser(capture.calendar)
        self._head = os.fsencode(name).translate(HARMLESS) + b": "
        self._tag = os.path.basename(name).split(".")[0].split("_")[0]
        self._boot: float | None = None
        self._minutes: dict[bytes, float] = {}

    def lines(self) -> Iterator[Line]:
        time = UNKNOWN
        for entry in self._entries:
            if entry.problem or not entry.size:
                continue
            try:
                with open_text(self._directory, entry) as reader:
                    live = os.sep not in entry.path
                    self._boot = self._clock.boot if live else start_of_device(reader)
                    with open(os.dup(reader.fileno()), "rb", CHUNK) as file:
                        file.seek(0)
                        for line in _short_lines(file.readline):
                            time, text = self._dated(line.translate(HARMLESS), time)
                            yield time, self._head + text
            except OSError:
                continue  # the page names it

    def _dated(self, line: bytes, before: float) -> Line:
        """What bears no time of its own belongs to the line before it."""
        minute = self._minutes.get(line[:12])
        if minute is not None:
            try:
                return minute + float(line[12:18]), line
            except ValueError:
                pass
        record = self._parse(line)
        if record is None:
            return before, line
        if not record.relative:
            if not record.tid:
                return record.time, threadtime(record, record.time, record.tag)
            if line[2:3] == b"-":
                self._minutes[line[:12]] = record.time - float(line[12:18])
            return record.time, line
        time = self._clock.of_record(record, self._boot)
        if time is None:
            return before, line
        return time, threadtime(record, time, self._tag)


def _short_lines(readline: Callable[[int], bytes]) -> Iterator[bytes]:
    while line := readline(LONGEST):
        whole = line.endswith(b"\n")
        yield line.rstrip(b"\r\n")
        while not whole and (rest := readline(CHUNK)):
            whole = rest.endswith(b"\n")
