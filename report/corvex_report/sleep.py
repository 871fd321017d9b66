"""Whether the device slept: then all that bears the time of day falls silent and goes on together.
Logs that count from the device's start cannot tell, as that clock stands still meanwhile."""

from collections.abc import Iterator
from dataclasses import dataclass, replace

from .capture import Capture, Series
from .clock import Clock
from .line_formats import DAY
from .text import clock_text, counted, duration_text
from .tracks import Step

SETTLED = 300.0  # seconds of silence that no log is blamed for
TOGETHER = 60.0  # seconds within which logs fall silent, or go on, together


@dataclass(frozen=True)
class Witness:
    name: str
    first: float
    last: float
    silences: list[Step]
    partly: bool  # was read in part, so that it has silences that are not known

    def silent_with(self, silence: Step) -> bool:
        return any(
            abs(mine.before - silence.before) <= TOGETHER
            and abs(mine.after - silence.after) <= TOGETHER
            for mine in self.silences
        )

    def went_on(self, silence: Step) -> bool:
        begin, end = silence.before + TOGETHER, silence.after - TOGETHER
        if self.partly or self.last <= begin or self.first >= end:
            return False
        return not any(mine.before <= begin and mine.after >= end for mine in self.silences)


class Sleep:
    def __init__(self, capture: Capture) -> None:
        begin, clock = capture.since, capture.clock
        self._witnesses = [
            Witness(
                series.recorder.name,
                series.first,
                series.last,
                list(silences(series.steps, begin, clock)),
                series.sampled,
            )
            for series in capture.series
            if series.first is not None and series.last is not None and _bears_time_of_day(series)
        ]
        self._witnesses += [
            Witness(
                record.entry.path,
                record.times[0],
                record.times[-1],
                list(silences(record.steps, begin, clock)),
                record.unread > 0,
            )
            for record in capture.records
            if record.times
        ]
        self._begin = begin

    def explains(self, name: str, silence: Step) -> bool:
        """Whether all others are silent with the one of that name."""
        others = [witness for witness in self._witnesses if witness.name != name]
        return any(witness.silent_with(silence) for witness in others) and not any(
            witness.went_on(silence) for witness in others
        )

    def remark(self) -> str:
        """What there is to say of it, in a sentence, if anything."""
        slept: list[Step] = []
        for one in self._witnesses:
            known = [s for s in one.silences if s.length > SETTLED and self.explains(one.name, s)]
            slept = max(slept, known, key=len)
        if not slept:
            return ""
        silence = summary(slept, SETTLED, self._begin)
        return f"The device seems to have slept: all logs are silent together {silence}."


def _bears_time_of_day(series: Series) -> bool:
    tracks = [file.track for file in series.files if file.track]
    return bool(tracks) and not series.recorder.once and not tracks[0].format.relative


def silences(steps: list[Step], begin: float | None, clock: Clock) -> Iterator[Step]:
    """Those of the capture: what the device still held from before is not its to answer for."""
    for step in steps:
        if not 0 < step.length <= DAY or (begin is not None and step.after <= begin):
            continue
        if begin is not None and step.before < begin:
            step = replace(step, before=begin, length=clock.passed(begin, step.after))
        yield step


def summary(steps: list[Step], limit: float, near: float | None) -> str:
    """ "for 19 min, from 03:00:00 to 03:19:00", of the longest of several."""
    longest = max(steps, key=lambda step: step.length)
    length = duration_text(longest.length)
    span = f"from {clock_text(longest.before, near)} to {clock_text(longest.after, near)}"
    if len(steps) == 1:
        return f"for {length}, {span}"
    times = counted(len(steps), "time")
    return f"{times} for more than {duration_text(limit)}, the longest {length} {span}"
