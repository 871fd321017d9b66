"""What all logs said round a moment."""

import os
from collections.abc import Iterator
from dataclasses import dataclass

from .capture import Capture, LogFile
from .files import Entry, Reader, open_text
from .occurrences import Telling
from .records import record_parser, text_of, threadtime

AROUND = 20  # lines
PIECE = 16384  # bytes that hold some lines
WIDTH = 400  # characters of a line
CLOSE = 60.0  # seconds from the moment; what was said earlier or later is of something else


@dataclass(frozen=True)
class Said:
    time: float | None
    file: str
    offset: int
    text: str
    mentioned: bool = False


class Context:
    def __init__(self, capture: Capture) -> None:
        self._capture = capture
        self._entries = {entry.path: entry for entry in capture.entries}
        self._parse = record_parser(capture.calendar)

    def round(self, telling: Telling) -> list[Said]:
        """The line that tells of it, and twenty before and after it."""
        lines = self._at(self._entries[telling.file], telling.offset, telling)
        place = next((i for i, one in enumerate(lines) if one.offset == telling.offset), None)
        if place is None:
            return []
        before, after = lines[:place], lines[place + 1 :]
        mention = Said(telling.time, telling.file, telling.offset, lines[place].text, True)
        if telling.time is not None:
            for entry in self._others(telling):
                said = [one for one in self._at_time(entry, telling.time) if one.time is not None]
                before += [one for one in said if (one.time or 0.0) <= telling.time]
                after += [one for one in said if (one.time or 0.0) > telling.time]
            close = [one for one in before if self._is_close(one, telling)]
            before = sorted(close, key=lambda one: one.time or 0.0)
            close = [one for one in after if self._is_close(one, telling)]
            after = sorted(close, key=lambda one: one.time or 0.0)
        return [*before[-AROUND:], mention, *after[:AROUND]]

    def _is_close(self, said: Said, telling: Telling) -> bool:
        if said.file == telling.file:
            return True
        return abs((said.time or 0.0) - (telling.time or 0.0)) <= CLOSE

    def _others(self, telling: Telling) -> Iterator[Entry]:
        """Of each other recorder the file of that time."""
        time = telling.time or 0.0
        for series in self._capture.series:
            paths = [file.entry.path for file in series.files]
            if telling.file in paths or series.recorder.ring or series.recorder.once:
                continue
            file = next((file for file in series.files if _covers(file, time)), None)
            if file:
                yield file.entry

    def _at_time(self, entry: Entry, time: float) -> list[Said]:
        """The lines round a time, which is looked for by halves."""
        try:
            with open_text(self._capture.directory, entry) as reader:
                low, high = 0, reader.size
                while high - low > PIECE:
                    middle = (low + high) // 2
                    found = self._first_time(reader, entry, middle)
                    low, high = (middle, high) if found is None or found < time else (low, middle)
                return self._lines(reader, entry, low, low + PIECE)
        except OSError:
            return []

    def _first_time(self, reader: Reader, entry: Entry, offset: int) -> float | None:
        for line in reader.read(offset, PIECE).split(b"\n")[1:]:
            record = self._parse(line)
            if record:
                return self._capture.clock.of_record(record, self._capture.clock.boot)
        return None

    def _at(self, entry: Entry, offset: int, telling: Telling) -> list[Said]:
        try:
            with open_text(self._capture.directory, entry) as reader:
                return self._lines(reader, entry, offset, offset, telling)
        except OSError:
            return []

    def _lines(
        self,
        reader: Reader,
        entry: Entry,
        low: int,
        high: int,
        telling: Telling | None = None,
    ) -> list[Said]:
        """The lines of a piece from before the one offset until behind the other."""
        start = max(0, low - PIECE)
        data = reader.read(start, high + PIECE - start)
        if start:
            cut = data.find(b"\n") + 1
            start, data = start + cut, data[cut:]
        found: list[Said] = []
        time = telling.time if telling else None
        for line in data.split(b"\n"):
            record = self._parse(line)
            if record and not (record.relative and os.sep in entry.path):
                time = self._capture.clock.of_record(record, self._capture.clock.boot)
            text = text_of(line[: 4 * WIDTH])
            if record and record.relative and time is not None:
                tag = entry.name.split(".")[0]
                text = text_of(threadtime(record, time, tag))
            if line:
                found.append(Said(time, entry.path, start, text[:WIDTH]))
            start += len(line) + 1
        return found


def _covers(file: LogFile, time: float) -> bool:
    if file.first is None or file.last is None or file.entry.problem:
        return False
    return file.first - CLOSE <= time <= file.last + CLOSE
