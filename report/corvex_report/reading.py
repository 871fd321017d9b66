"""Reads a log directory."""

import os
import re
from collections.abc import Callable, Iterable

from . import artefacts, thermal
from .capture import Capture, LogFile, Series
from .clock import Clock, find_clock
from .files import Entry, Reader, read_piece, scan
from .line_formats import DAY, Calendar
from .properties import parse_properties
from .recorders import RECORDERS, Recorder, missing_names, rotated_files
from .tracks import Step, notable, read_track, steps_between

NAME = re.compile(r".+_(?P<number>\d{1,9})--(?P<time>[\d-]{19})(_current)?")
MARK = "_current"
FAR_FUTURE = 2.0**33
YEAR = 365 * DAY  # 1970
PROPERTIES = 1024 * 1024  # bytes of getprop.txt
VERSION_FILE = 4096
SOME = 256 * 1024  # bytes of a kernel log that are searched
KERNEL_LOGS = 16  # that are searched for its version
VERSION = re.compile(rb"Linux version ([^\n]{1,200})")

Progress = Callable[[str], None]


def read_capture(directory: str, progress: Progress, gaps: bool = True) -> Capture:
    """Raises OSError when the directory cannot be listed. Without gaps it is done sooner."""
    name = os.path.basename(os.path.realpath(directory))
    match = NAME.fullmatch(name)
    begun = artefacts.stamp_time(match["time"]) if match else None
    number = int(match["number"]) if match and begun is not None else None
    entries = scan(directory)
    written = max((entry.mtime for entry in entries), default=0.0)
    near = min(max(written, 0.0), FAR_FUTURE)
    if begun is not None and (begun >= YEAR or near < YEAR):
        near = begun
    else:  # no time in the name, or the one of a clock that was set later
        begun = None
    return _Reading(directory, name, entries, near, progress, gaps).capture(number, begun)


class _Reading:
    def __init__(
        self,
        directory: str,
        name: str,
        entries: list[Entry],
        near: float,
        progress: Progress,
        gaps: bool,
    ) -> None:
        self._directory = directory
        self._name = name
        self._entries = entries
        self._near = near
        self._calendar = Calendar(near)
        self._progress = progress
        self._gaps = gaps
        self._unreadable = [(entry.path, entry.problem) for entry in entries if entry.problem]
        self._logs: dict[str, LogFile] = {}
        self._properties = parse_properties(self._head("getprop.txt", PROPERTIES) or b"")

    def capture(self, number: int | None, begun: float | None) -> Capture:
        series = [self._series(recorder) for recorder in RECORDERS]
        rest = [entry for entry in self._entries if entry.path not in self._logs]
        records = list(self._records(e for e in rest if _top(e) == thermal.DIRECTORY))
        for entry in rest:
            if _top(entry) in artefacts.LOGS:
                self._log(entry)
        clock = self._clock(series, records)
        for one in series:
            _place_in_time(one, clock)
        for record in records:
            steps = clock.measured(steps_between(record.times))
            record.steps = [step for step in steps if notable(step)]
        tracks = {path: log.track for path, log in self._logs.items() if log.track}
        others = [e for e in rest if _top(e) not in (thermal.DIRECTORY, *artefacts.OWN)]
        marked = MARK in self._name
        return Capture(
            directory=self._directory,
            name=self._name,
            number=number,
            begun=begun,
            marked=marked,
            neighbours=_marked_neighbours(self._directory, self._name) if marked else [],
            entries=self._entries,
            unreadable=self._unreadable,
            properties=self._properties,
            version=self._head("versionNumber", VERSION_FILE),
            kernel_version=self._kernel_version(),
            clock=clock,
            calendar=self._calendar,
            series=series,
            kinds=artefacts.collect(self._directory, others, tracks, clock),
            records=records,
        )

    def _head(self, path: str, length: int) -> bytes | None:
        found = next((entry for entry in self._entries if entry.path == path), None)
        return None if found is None else read_piece(self._directory, found, length)

    def _log(self, entry: Entry) -> LogFile:
        """What the times in a file say, and its end."""
        self._progress(entry.path)
        log = self._logs[entry.path] = LogFile(entry)
        if entry.problem:
            return log
        try:
            with Reader(self._directory, entry) as reader:
                log.track, log.ending = read_track(reader, self._calendar, self._gaps)
        except OSError as error:
            self._unreadable.append((entry.path, f"cannot be read: {error.strerror}"))
        return log

    def _series(self, recorder: Recorder) -> Series:
        files = rotated_files(recorder, self._entries)
        values = [self._properties.get(switch) for switch in recorder.switches]
        known = bool(self._properties)
        logs = [self._log(files[number]) for number in sorted(files, reverse=not recorder.ring)]
        if recorder.ring:
            logs.sort(key=lambda log: log.track.first if log.track else log.entry.mtime)
        switched_on = "yes" in values if known else None
        return Series(recorder, switched_on, logs, missing_names(recorder, files))

    def _records(self, entries: Iterable[Entry]) -> Iterable[thermal.Record]:
        for entry in entries:
            log = self._log(entry)
            if log.track:
                record = thermal.read_record(self._directory, entry, self._calendar)
                record.ending = log.ending
                yield record

    def _clock(self, series: list[Series], records: list[thermal.Record]) -> Clock:
        """From what this capture recorded: copies may be of other starts of the device."""
        live = [file.entry for one in series if not one.recorder.once for file in one.files]
        live += [record.entry for record in records]
        tracks = [(entry, track) for entry in live if (track := self._logs[entry.path].track)]
        newest = next((entry for entry in self._entries if entry.path == "kernel.log"), None)
        text = read_piece(self._directory, newest, SOME, at_end=True) if newest else b""
        return find_clock(
            tracks, text, self._properties.get("persist.sys.timezone", ""), self._near
        )

    def _kernel_version(self) -> str:
        """From the first lines of a kernel's life, where one of the logs still holds them."""
        logs = [log.entry for log in self._logs.values() if log.entry.name.startswith("kernel")]
        for entry in logs[:KERNEL_LOGS]:
            match = VERSION.search(read_piece(self._directory, entry, SOME))
            if match:
                return match[1].decode("utf-8", "surrogateescape")
        return ""


def _top(entry: Entry) -> str:
    return entry.path.split(os.sep)[0]


def _place_in_time(series: Series, clock: Clock) -> None:
    before: float | None = None
    holds_packets = series.recorder.ring and any(file.track for file in series.files)
    for file in series.files:
        track = file.track
        if holds_packets and track is None:
            continue  # it says nothing of when the others were written
        if track:
            file.first = clock.local(track, track.first)
            file.last = None if track.last is None else clock.local(track, track.last)
        if file.last is None:
            file.last = clock.written(file.entry)
            file.time_source = "time of the file"
        if file.first is None or track is None:
            file.first = file.last
            continue
        steps = clock.steps(track)
        if before is not None:
            steps.insert(0, Step(before, file.first, clock.passed(before, file.first)))
        series.steps += [step for step in steps if notable(step)]
        before = file.last


def _marked_neighbours(directory: str, name: str) -> list[str]:
    parent = os.path.dirname(os.path.realpath(directory))
    try:
        with os.scandir(parent) as listing:
            return sorted(
                item.name
                for item in listing
                if MARK in item.name and item.name != name and item.is_dir(follow_symlinks=False)
            )
    except OSError:
        return []
