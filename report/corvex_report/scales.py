"""Scales for time and values: where a thing lies, in percent, and where the ticks are."""

from dataclasses import dataclass

from .text import date_time

STEPS = (
    *(1, 2, 5, 10, 15, 30),
    *(60, 120, 300, 600, 900, 1800),
    *(3600, 7200, 10800, 21600, 43200),
    *(86400 * n for n in (1, 2, 5, 10, 30, 90, 365)),
)
TICKS = 7


@dataclass(frozen=True)
class Tick:
    at: float  # percent
    label: str


@dataclass(frozen=True)
class TimeScale:
    first: float
    last: float

    def at(self, time: float) -> float:
        """In percent; what lies outside lies at the edge."""
        share = (time - self.first) / (self.last - self.first)
        return round(100 * min(1.0, max(0.0, share)), 3)

    def ticks(self) -> list[Tick]:
        length = self.last - self.first
        step = next((s for s in STEPS if length / s <= TICKS), STEPS[-1])
        time = self.first - self.first % step + step
        ticks: list[Tick] = []
        while time < self.last and len(ticks) <= TICKS:
            text = date_time(time)
            label = text[5:10] if step >= 86400 else text[11:19] if step < 60 else text[11:16]
            ticks.append(Tick(self.at(time), label))
            time += step
        # A label at the edge would not fit.
        return [tick for tick in ticks if 4 < tick.at < 96]


def time_scale(first: float, last: float) -> TimeScale:
    """With a little room on both sides."""
    room = max((last - first) * 0.03, 0.5)
    return TimeScale(first - room, last + room)


@dataclass(frozen=True)
class ValueScale:
    low: float
    high: float

    def at(self, value: float) -> float:
        """From the top, in percent."""
        return round(100 * (self.high - value) / (self.high - self.low), 2)

    def ticks(self) -> list[Tick]:
        step = _round_step((self.high - self.low) / 4)
        value = self.low - self.low % step + step
        ticks = []
        while value < self.high:
            ticks.append(Tick(self.at(value), f"{value:g}"))
            value = round(value + step, 6)
        return [tick for tick in ticks if 6 < tick.at < 94]


def value_scale(values: list[float], least: float) -> ValueScale:
    """Holds all values, and spans at least so much, lest noise look like news."""
    low, high = min(values, default=0.0), max(values, default=0.0)
    room = max((high - low) * 0.06, (least - (high - low)) / 2)
    return ValueScale(low - room, high + room)


def _round_step(step: float) -> float:
    for exponent in range(-3, 12):
        for digit in (1, 2, 5):
            if digit * 10.0**exponent >= step:
                return digit * 10.0**exponent
    return 10.0**12
