"""The device's clock. All times of a report are local times of the device, as its logs have them;
what counts otherwise, in UTC or from the device's start, is converted when it is known how."""

import re
import time
from collections import Counter
from collections.abc import Sequence
from dataclasses import dataclass, replace
from datetime import datetime, timezone
from zoneinfo import ZoneInfo

from .files import Entry
from .line_formats import DAY
from .records import Record
from .text import EARLIEST, LATEST
from .tracks import Step, Track

QUARTER = 900  # seconds; every zone is off by a multiple of it
AT_ONCE = 5.0  # seconds within which a line is written after the time that it bears
WIDEST = 14 * 3600
SET = 40 * 365 * DAY  # a clock that is behind it has not been set

# Lines in which a kernel tells the time of day beside its own.
KERNEL_TIME = re.compile(
    rb"^(?:\d+,\d+,(?P<us>\d{1,17}),[^;\n]*;|(?:<\d+>)?\[ *(?P<s>\d{1,10}\.\d{1,9})\] )"
    rb"[^\n]{0,80}?(?:suspend|setting system clock)"
    rb"[^\n]{0,80}?(\d{4}-\d\d-\d\d)[ T](\d\d:\d\d:\d\d)",
    re.MULTILINE,
)


@dataclass(frozen=True)
class Clock:
    offset: float  # of local time from UTC when the capture began
    source: str  # of the offset
    zone: ZoneInfo | None = None  # if known, the offset follows its summer time
    file_times: bool = False  # whether the files still have the times of the device
    boot: float | None = None  # in UTC
    boot_source: str = ""

    def from_utc(self, utc: float) -> float:
        return utc + (self.offset if self.zone is None else _offset_at(self.zone, utc))

    def local(self, track: Track, value: float) -> float | None:
        """A time that a track holds."""
        if track.format.relative:
            return None if self.boot is None else self.from_utc(self.boot + value)
        return self.from_utc(value) if track.format.utc else value

    def of_record(self, record: Record, boot: float | None) -> float | None:
        """The time of a line, in a log of the start of the device at `boot`."""
        if not record.relative:
            return record.time
        return None if boot is None else self.from_utc(boot + record.time)

    def steps(self, track: Track) -> list[Step]:
        """A track's steps in local time."""
        if not (track.format.relative or track.format.utc):
            return self.measured(track.steps)
        steps = []
        for step in track.steps:
            before, after = (self.local(track, time) for time in (step.before, step.after))
            if before is not None and after is not None:
                steps.append(Step(before, after, step.length))
        return steps

    def measured(self, steps: list[Step]) -> list[Step]:
        """Steps between local times, with the seconds that did pass."""
        return [replace(step, length=self.passed(step.before, step.after)) for step in steps]

    def passed(self, before: float, after: float) -> float:
        """The seconds between two local times. Where summer time begins or ends these are others
        than the clock says, and of an hour that comes twice the nearest is meant."""
        if self.zone is None:
            return after - before
        befores, afters = (_as_utc(self.zone, time) for time in (before, after))
        return min((a - b for a in afters for b in befores), key=abs)

    def written(self, entry: Entry) -> float | None:
        return self.from_utc(entry.mtime) if self.file_times and not entry.problem else None

    def offset_text(self) -> str:
        minutes = round(self.offset / 60)
        return f"UTC{'-' if minutes < 0 else '+'}{abs(minutes) // 60:02}:{abs(minutes) % 60:02}"


Dated = Sequence[tuple[Entry, Track, float]]  # with the last time of each


def find_clock(
    tracks: Sequence[tuple[Entry, Track]], kernel: bytes, zone: str, near: float
) -> Clock:
    """From what this capture recorded itself; `kernel` is some of the kernel log."""
    ended = [(e, t, t.last) for e, t in tracks if t.last is not None]
    dated = [(e, t, last) for e, t, last in ended if not t.format.relative and not t.format.utc]
    clock = _named_zone(zone, near) or _offset(ended, dated, near)
    agree = sum(abs(last - clock.from_utc(e.mtime)) <= AT_ONCE for e, _, last in dated)
    clock = replace(clock, file_times=agree > 0 or not dated)
    return _with_boot(clock, [one for one in ended if one[1].format.relative], kernel, near)


def _named_zone(name: str, near: float) -> Clock | None:
    try:
        zone = ZoneInfo(name)
    except (LookupError, ValueError, OSError):
        return None
    return Clock(near - _as_utc(zone, near)[0], f"persist.sys.timezone is {name}", zone)


def _offset(ended: Dated, dated: Dated, near: float) -> Clock:
    aheads = [last - entry.mtime for entry, _, last in dated]
    offsets = [
        offset
        for ahead in aheads  # of a log that nobody has written for a while it says nothing
        if abs(ahead - (offset := _nearest_zone(ahead))) <= AT_ONCE and abs(offset) <= WIDEST
    ]
    if offsets:
        offset = Counter(offsets).most_common(1)[0][0]
        return Clock(offset, "the logs’ last lines against the times of their files")
    packets = [last for _, track, last in ended if track.format.utc]
    if packets and dated:
        offset = _nearest_zone(max(last for _, _, last in dated) - max(packets))
        if abs(offset) <= WIDEST:
            return Clock(offset, "the logs’ last lines against the last packet")
    here = float(time.localtime(near).tm_gmtoff)
    return Clock(here, "this computer’s; the capture does not tell")


def _offset_at(zone: ZoneInfo, utc: float) -> float:
    """In seconds."""
    offset = datetime.fromtimestamp(min(max(utc, EARLIEST), LATEST), zone).utcoffset()
    return offset.total_seconds() if offset else 0.0


def _as_utc(zone: ZoneInfo, local: float) -> list[float]:
    """All that a local time may be: the hour that summer time ends in comes twice."""
    naive = datetime.fromtimestamp(min(max(local, EARLIEST), LATEST), timezone.utc)
    offsets = (naive.replace(tzinfo=zone, fold=fold).utcoffset() for fold in (0, 1))
    return [local - offset.total_seconds() for offset in offsets if offset is not None]


def _nearest_zone(ahead: float) -> float:
    return float(round(ahead / QUARTER) * QUARTER)


def _with_boot(clock: Clock, counted: Dated, kernel: bytes, near: float) -> Clock:
    first = min((track.first for _, track, _ in counted), default=0.0)
    last = max((last for _, _, last in counted), default=0.0)
    told = [
        boot
        for match in KERNEL_TIME.finditer(kernel)
        if (boot := _told_boot(match)) is not None
        # Kernels tell of 1970, too, before the clock is set.
        and clock.from_utc(boot + first) - DAY <= near <= clock.from_utc(boot + last) + DAY
    ]
    if told:  # the last: the clock since boot stands still while the device sleeps
        return replace(clock, boot=told[-1], boot_source="a kernel line that tells the time")
    if not counted or not clock.file_times:
        return clock
    entry, _, last = max(counted, key=lambda one: one[0].mtime)
    source = f"the last line of {entry.name} against the time of the file"
    return replace(clock, boot=entry.mtime - last, boot_source=source)


def told_boot(line: bytes) -> float | None:
    """By one line of a kernel's log. Before the clock is set a kernel tells of 1970."""
    match = KERNEL_TIME.match(line)
    boot = _told_boot(match) if match else None
    return boot if boot is not None and boot > SET else None


def _told_boot(match: "re.Match[bytes]") -> float | None:
    uptime = float(match["s"]) if match["s"] else int(match["us"]) / 1e6
    try:
        utc = datetime.fromisoformat(f"{match[3].decode()}T{match[4].decode()}+00:00")
    except ValueError:
        return None
    return utc.timestamp() - uptime
