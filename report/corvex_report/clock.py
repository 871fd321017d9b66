"""The device's clock. All times of a report are local times of the device, as its logs have them;
what counts otherwise, in UTC or from the device's start, is converted when it is known how."""

import re
import time
from collections import Counter
from collections.abc import Sequence
from dataclasses import dataclass
from datetime import datetime, timezone
from zoneinfo import ZoneInfo

from .files import Entry
from .tracks import Track

QUARTER = 900  # seconds; every zone is off by a multiple of it
AT_ONCE = 5.0  # seconds within which a line is written after the time that it bears
ENOUGH = 2  # logs that agree; one alone may do so by chance
WIDEST = 14 * 3600

# Lines in which a kernel tells the time of day beside its own.
KERNEL_TIME = re.compile(
    rb"^(?:\d+,\d+,(?P<us>\d{1,17}),[^;\n]*;|(?:<\d+>)?\[ *(?P<s>\d{1,10}\.\d{1,9})\] )"
    rb"[^\n]{0,80}?(?:suspend|setting system clock)"
    rb"[^\n]{0,80}?(\d{4}-\d\d-\d\d)[ T](\d\d:\d\d:\d\d)",
    re.MULTILINE,
)


@dataclass(frozen=True)
class Clock:
    offset: float  # of local time from UTC
    offset_source: str
    file_times: bool  # whether the files still have the times of the device
    boot: float | None = None
    boot_source: str = ""

    def local(self, track: Track, value: float) -> float | None:
        """A time that a track holds."""
        if track.format.relative:
            return None if self.boot is None else self.boot + value
        return value + self.offset if track.format.utc else value

    def written(self, entry: Entry) -> float | None:
        return entry.mtime + self.offset if self.file_times and not entry.problem else None

    def zone(self) -> str:
        minutes = round(self.offset / 60)
        return f"UTC{'-' if minutes < 0 else '+'}{abs(minutes) // 60:02}:{abs(minutes) % 60:02}"


Dated = Sequence[tuple[Entry, Track]]


def find_clock(tracks: Dated, kernel: bytes, zone: str, near: float) -> Clock:
    """`kernel` is some of the kernel log."""
    dated = [(e, t) for e, t in tracks if not t.format.relative and not t.format.utc]
    offset, source = _offset(tracks, dated, zone, near)
    agree = sum(abs(t.last - e.mtime - offset) <= AT_ONCE for e, t in dated)
    clock = Clock(offset, source, agree >= min(ENOUGH, len(dated)))
    return _with_boot(clock, tracks, kernel)


def _offset(tracks: Dated, dated: Dated, zone: str, near: float) -> tuple[float, str]:
    named = _named_offset(zone, near)
    if named is not None:
        return named, f"persist.sys.timezone is {zone}"
    votes: Counter[float] = Counter()
    for entry, track in dated:
        ahead = track.last - entry.mtime
        offset = _nearest_zone(ahead)
        if abs(ahead - offset) <= AT_ONCE and abs(offset) <= WIDEST:
            votes[offset] += 1
    if votes and votes.most_common(1)[0][1] >= min(ENOUGH, len(dated)):
        return votes.most_common(1)[0][0], "the logs’ last lines against the times of their files"
    packets = [track.last for _, track in tracks if track.format.utc]
    offset = _nearest_zone(max(t.last for _, t in dated) - max(packets)) if packets and dated else 0
    if packets and dated and abs(offset) <= WIDEST:
        return offset, "the logs’ last lines against the last packet"
    return float(time.localtime(near).tm_gmtoff), "this computer’s; the capture does not tell"


def _named_offset(zone: str, near: float) -> float | None:
    try:
        local = datetime.fromtimestamp(near, timezone.utc).replace(tzinfo=ZoneInfo(zone))
    except (LookupError, ValueError, OSError):
        return None
    offset = local.utcoffset()
    return None if offset is None else offset.total_seconds()


def _nearest_zone(ahead: float) -> float:
    return float(round(ahead / QUARTER) * QUARTER)


def _with_boot(clock: Clock, tracks: Dated, kernel: bytes) -> Clock:
    told = [boot for match in KERNEL_TIME.finditer(kernel) if (boot := _told_boot(match))]
    if told:  # the last: the clock since boot stands still while the device sleeps
        return _started(clock, told[-1] + clock.offset, "a kernel line that tells the time")
    counted = [(e, t) for e, t in tracks if t.format.relative]
    if not counted or not clock.file_times:
        return clock
    entry, track = max(counted, key=lambda pair: pair[0].mtime)
    source = f"the last line of {entry.name} against the time of the file"
    return _started(clock, entry.mtime + clock.offset - track.last, source)


def _told_boot(match: "re.Match[bytes]") -> float | None:
    uptime = float(match["s"]) if match["s"] else int(match["us"]) / 1e6
    try:
        utc = datetime.fromisoformat(f"{match[3].decode()}T{match[4].decode()}+00:00")
    except ValueError:
        return None
    return utc.timestamp() - uptime


def _started(clock: Clock, boot: float, source: str) -> Clock:
    return Clock(clock.offset, clock.offset_source, clock.file_times, boot, source)
