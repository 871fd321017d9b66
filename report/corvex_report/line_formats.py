"""Log lines that begin with a time."""

import calendar
import re
from collections.abc import Callable
from dataclasses import dataclass

DAY = 86400


class Calendar:
    """Finds the dates that the device writes without a year, or without leading zeros: of all that
    a text may mean, the one nearest to the time of the capture."""

    def __init__(self, near: float) -> None:
        self._near = near
        self._year = int(1970 + near / (365.2425 * DAY))
        self._known: dict[bytes, float | None] = {}

    def month_day(self, text: bytes) -> float | None:
        """Midnight of "11-23", or of "2026-11-23"."""
        if text not in self._known:
            *year, month, day = (int(part) for part in text.split(b"-"))
            years = year or range(self._year - 1, self._year + 2)
            self._known[text] = self._nearest([(y, month, day) for y in years])
        return self._known[text]

    def run_together(self, text: bytes) -> float | None:
        """Midnight of "20261123"; "2026111" is the 11th of January or the 1st of November."""
        if text not in self._known:
            year, rest = int(text[:4]), text[4:]
            cuts = range(max(1, len(rest) - 2), min(3, len(rest)))
            self._known[text] = self._nearest(
                [(year, int(rest[:cut]), int(rest[cut:])) for cut in cuts]
            )
        return self._known[text]

    def _nearest(self, dates: list[tuple[int, int, int]]) -> float | None:
        midnights = [
            float(calendar.timegm((*date, 0, 0, 0)))
            for date in dates
            if 1970 <= date[0] <= 2200
            and 1 <= date[1] <= 12
            and 1 <= date[2] <= calendar.monthrange(*date[:2])[1]
        ]
        return min(midnights, key=lambda time: abs(time - self._near)) if midnights else None


Convert = Callable[["re.Match[bytes]", Calendar], "float | None"]


@dataclass(frozen=True)
class LineFormat:
    name: str
    pattern: "re.Pattern[bytes]"
    convert: Convert
    relative: bool = False  # counts from the start of the device
    utc: bool = False
    block: int = 16384  # holds several lines

    def times(self, data: bytes, calendar: Calendar, at_start: bool) -> list[float]:
        start = 0 if at_start else data.find(b"\n") + 1
        found = (self.convert(match, calendar) for match in self.pattern.finditer(data, start))
        return [time for time in found if time is not None]


def _clock(hours: bytes, minutes: bytes, seconds: bytes) -> float:
    return int(hours) * 3600 + int(minutes) * 60 + float(seconds)


def _logcat(match: "re.Match[bytes]", calendar: Calendar) -> float | None:
    midnight = calendar.month_day(match[1])
    return None if midnight is None else midnight + _clock(match[2], match[3], match[4])


def _thermal(match: "re.Match[bytes]", calendar: Calendar) -> float | None:
    midnight = calendar.run_together(match[1])
    return None if midnight is None else midnight + _clock(match[2], match[3], match[4])


def _line(pattern: bytes) -> "re.Pattern[bytes]":
    return re.compile(b"^" + pattern, re.MULTILINE)


THERMAL = LineFormat(
    "thermal record",
    _line(rb"datetime=(\d{6,8})_(\d{1,2}):(\d{1,2}):(\d{1,2}),"),
    _thermal,
)
LINE_FORMATS = (
    LineFormat(
        "logcat",
        _line(rb"((?:\d{4}-)?\d\d-\d\d) (\d\d):(\d\d):(\d\d\.\d{3})"),
        _logcat,
    ),
    LineFormat(
        "kernel records",
        _line(rb"\d+,\d+,(\d{1,17}),[^;\n]*;"),
        lambda match, _: int(match[1]) / 1e6,
        relative=True,
    ),
    LineFormat(
        "seconds since boot",
        _line(rb"(?:<\d+>)?\[ *(\d{1,10}\.\d{1,9})\]"),
        lambda match, _: float(match[1]),
        relative=True,
    ),
    THERMAL,
)
