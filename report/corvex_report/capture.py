"""What is known of one log directory."""

from dataclasses import dataclass, field

from .artefacts import Kind
from .clock import Clock
from .files import Entry
from .line_formats import Calendar
from .recorders import Recorder
from .thermal import Record
from .tracks import Step, Track


@dataclass
class LogFile:
    entry: Entry
    track: Track | None = None
    first: float | None = None
    last: float | None = None
    time_source: str = ""  # of the last time, or of both
    ending: str = ""  # what is wrong with its end


@dataclass
class Series:
    """The files of one recorder."""

    recorder: Recorder
    switched_on: bool | None  # None: not known
    files: list[LogFile]  # oldest first
    missing: list[str]
    steps: list[Step] = field(default_factory=list)  # silences and steps of the clock

    @property
    def size(self) -> int:
        return sum(file.entry.size for file in self.files)

    @property
    def dated(self) -> bool:
        """Whether it bears the time of day."""
        tracks = [file.track for file in self.files if file.track]
        return bool(tracks) and not self.recorder.once and not tracks[0].format.relative

    @property
    def sampled(self) -> bool:
        return any(file.track is not None and file.track.sampled for file in self.files)

    @property
    def first(self) -> float | None:
        return next((file.first for file in self.files if file.first is not None), None)

    @property
    def last(self) -> float | None:
        newest = next((file for file in reversed(self.files) if file.first is not None), None)
        return newest.last if newest else None


@dataclass
class Capture:
    directory: str
    name: str
    number: int | None
    begun: float | None
    marked: bool  # as the current one
    neighbours: list[str]  # that bear the mark, too
    entries: list[Entry]
    unreadable: list[tuple[str, str]]  # path, and why
    properties: dict[str, str]
    version: bytes | None  # the file versionNumber
    kernel_version: str
    clock: Clock
    calendar: Calendar
    series: list[Series]
    kinds: list[Kind]
    records: list[Record]

    @property
    def size(self) -> int:
        return sum(entry.size for entry in self.entries)

    @property
    def since(self) -> float | None:
        """When it was begun, or a time by which it was: all recorders wrote."""
        firsts = [first for series in self.series if (first := series.first) is not None]
        return max(firsts, default=None) if self.begun is None else self.begun

    @property
    def end(self) -> float | None:
        """The last time that a recorder has written down. The thermal record has an end of its own,
        by a command of its own."""
        lasts = [series.last for series in self.series if not series.recorder.once]
        return max((last for last in lasts if last is not None), default=None)
