"""When a log says nothing. A device that sleeps is silent in all its logs: a log is to blame for a
silence only where another one went on."""

from collections.abc import Iterator
from dataclasses import replace

from .capture import Capture
from .clock import Clock
from .line_formats import DAY
from .text import clock_text, counted, duration_text
from .tracks import Step

SETTLED = 300.0  # seconds of silence that no log is blamed for
TOGETHER = 60.0  # seconds within which logs fall silent, or go on, together


def silences(steps: list[Step], begin: float | None, clock: Clock) -> Iterator[Step]:
    """Those of the capture: what the device still held from before is not its to answer for."""
    for step in steps:
        if not 0 < step.length <= DAY or (begin is not None and step.after <= begin):
            continue
        if begin is not None and step.before < begin:
            step = replace(step, before=begin, length=clock.passed(begin, step.after))
        yield step


def others_went_on(capture: Capture, name: str, silence: Step) -> bool:
    """Logs that count from the device's start cannot tell: that clock stands still in its sleep.
    Nor can those that were read in part. Where there is no other, the log is to blame."""
    begin, end = silence.before + TOGETHER, silence.after - TOGETHER
    others = [
        (series.first, series.last, series.steps, series.sampled)
        for series in capture.series
        if series.recorder.name != name and series.dated
    ]
    others += [
        (record.times[0], record.times[-1], record.steps, record.unread > 0)
        for record in capture.records
        if record.entry.path != name and record.times
    ]
    return not others or any(
        not partly
        and first is not None
        and last is not None
        and first < end
        and last > begin
        and not any(step.before <= begin and step.after >= end for step in steps)
        for first, last, steps, partly in others
    )


def summary(steps: list[Step], limit: float, near: float | None) -> str:
    """ "for 19 min, from 03:00:00 to 03:19:00", of the longest of several."""
    longest = max(steps, key=lambda step: step.length)
    length = duration_text(longest.length)
    span = f"from {clock_text(longest.before, near)} to {clock_text(longest.after, near)}"
    if len(steps) == 1:
        return f"for {length}, {span}"
    times = counted(len(steps), "time")
    return f"{times} for more than {duration_text(limit)}, the longest {length} {span}"
