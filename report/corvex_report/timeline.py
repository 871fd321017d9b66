"""Rows of bars and marks: what was recorded when, and what was collected."""

from collections.abc import Iterator
from dataclasses import dataclass, field

from .artefacts import OTHER, Item, Kind
from .capture import Capture, Series
from .incidents import Incident
from .scales import TimeScale, time_scale
from .text import clock_text, counted, shown, size_text, span_text
from .thermal import Record
from .tracks import Step

MARKS = 300  # of one row
LATE = 60.0  # seconds after which a log has lost its beginning
NARROWEST = 0.5  # percent; a silence that can be seen


@dataclass(frozen=True)
class Bar:
    at: float  # percent
    width: float
    title: str


@dataclass
class Row:
    name: str
    title: str
    size: int
    files: int
    when: str = ""
    notes: list[str] = field(default_factory=list)
    bars: list[Bar] = field(default_factory=list)
    silences: list[Bar] = field(default_factory=list)
    marks: list[Bar] = field(default_factory=list)
    earlier: bool = False  # begins before what the scale shows
    later: bool = False
    id: str = ""


@dataclass(frozen=True)
class Timeline:
    scale: TimeScale
    begun: float | None  # percent
    wrong: list[Row]
    recorded: list[Row]
    collected: list[Row]


def build(capture: Capture, incidents: list[Incident]) -> Timeline | None:
    times = [time for series in capture.series for time in (series.first, series.last) if time]
    times += [item.first for kind in capture.kinds for item in kind.items if item.first]
    times += [time for record in capture.records for time in record.times[-1:]]
    times += [time for incident in incidents for time in incident.times]
    if not times:
        return None
    if capture.begun is not None:
        begin = capture.begun
    else:  # artefacts may be older than the capture by far
        firsts = [first for series in capture.series if (first := series.first) is not None]
        begin = min(firsts or times)
    end = max(capture.end or begin, begin)
    # Artefacts may arrive later, but one name from a far future shall not crush everything else.
    reach = end + max(end - begin, 60.0)
    end = max([end] + [time for time in times if time <= reach])
    scale = time_scale(begin, max(end, begin + 1))
    recorded = [_series_row(capture, s, scale) for s in capture.series if s.files]
    recorded += [_record_row(capture, record, scale) for record in capture.records]
    collected = [_kind_row(capture, k, scale) for k in capture.kinds if k.title != OTHER]
    for number, row in enumerate(recorded):
        row.id = f"row-{number}"
    at = None if capture.begun is None else scale.at(capture.begun)
    return Timeline(scale, at, _wrong_rows(capture, incidents, scale), recorded, collected)


def _bar(row: Row, scale: TimeScale, first: float, last: float, title: str) -> None:
    row.earlier |= first < scale.first
    row.later |= last > scale.last
    if last < scale.first or first > scale.last:
        return
    left = scale.at(first)
    row.bars.append(Bar(left, max(0.0, scale.at(last) - left), title))


def _wrong_rows(capture: Capture, incidents: list[Incident], scale: TimeScale) -> list[Row]:
    """A row for each kind of incident, with a mark for each occurrence."""
    rows: dict[str, Row] = {}
    for incident in incidents:
        row = rows.setdefault(incident.kind, Row(kind_title(incident.kind), "Incidents", 0, 0))
        row.files += incident.count
        for time in incident.times:
            if len(row.marks) < MARKS:
                what = shown(incident.process or incident.reason)[:80]
                _mark(row, scale, time, f"{what}: {clock_text(time, capture.begun)}")
    return list(rows.values())


def kind_title(kind: str) -> str:
    return "ANR" if kind == "anr" else kind.replace("-", " ").capitalize()


def _series_row(capture: Capture, series: Series, scale: TimeScale) -> Row:
    recorder = series.recorder
    row = Row(recorder.name, recorder.title, series.size, len(series.files))
    if series.first is not None and series.last is not None:
        row.when = span_text(series.first, series.last, capture.begun)
    row.notes = list(_notes(capture, series))
    for file in series.files:
        if file.first is None:
            continue
        last = file.first if file.last is None else file.last
        if last == file.first and file.time_source:
            what = "begins" if file.last is None else "written"
            title = f"{shown(file.entry.path)}, {what} {clock_text(last, capture.begun)}"
            _mark(row, scale, last, title)
        else:
            span = span_text(file.first, last, capture.begun)
            title = f"{shown(file.entry.path)}: {span}, {size_text(file.entry.size)}"
            _bar(row, scale, min(file.first, last), max(file.first, last), title)
    for step in series.steps:
        if step.length > 0:
            _silence(row, scale, step, capture.begun)
    return row


def _silence(row: Row, scale: TimeScale, step: Step, begun: float | None) -> None:
    left, width = scale.at(step.before), scale.at(step.after) - scale.at(step.before)
    if width >= NARROWEST:
        title = f"Silent: {span_text(step.before, step.after, begun)}"
        row.silences.append(Bar(left, round(width, 3), title))


def _notes(capture: Capture, series: Series) -> Iterator[str]:
    if series.switched_on is False:
        yield "switched off when the properties were written down"
    if _beheaded(capture, series):
        yield "begins after the capture: older lines are gone"
    tracks = [file.track for file in series.files if file.track]
    if any(file.first is not None for file in series.files):
        return
    if tracks and tracks[0].format.relative:
        first, last = tracks[0].first, tracks[-1].last
        seconds = f"from {first:.0f} on" if last is None else f"{first:.0f} to {last:.0f}"
        yield (
            f"counts seconds since the device’s start ({seconds}), which is not known in time of day"
        )
    else:
        yield "bears no times"


def _beheaded(capture: Capture, series: Series) -> bool:
    """logcat begins with what the device still holds from before, and drops its oldest file."""
    track = series.files[0].track
    if capture.begun is None or len(series.files) < 2 or track is None:
        return False
    dated = not (track.format.relative or track.format.utc)
    return dated and track.first > capture.begun + LATE


def _record_row(capture: Capture, record: Record, scale: TimeScale) -> Row:
    row = Row(record.entry.path, "Thermal record", record.entry.size, 1)
    if record.times:
        first, last = record.times[0], record.times[-1]
        row.when = span_text(first, last, capture.begun)
        title = f"{shown(record.entry.path)}: {row.when}, {counted(len(record.times), 'sample')}"
        _bar(row, scale, min(first, last), max(first, last), title)
    return row


def _kind_row(capture: Capture, kind: Kind, scale: TimeScale) -> Row:
    count = sum(len(item.entries) for item in kind.items)
    row = Row(kind.title, kind.title, kind.size, count)
    times = [(item.first, item.last) for item in kind.items if item.first and item.last]
    if times:
        first, last = min(t[0] for t in times), max(t[1] for t in times)
        row.when = span_text(first, last, capture.begun)
    for item in kind.items[:MARKS]:
        if item.first is None or item.last is None:
            continue
        title = f"{shown(item.name)}: {item_when(item, capture.begun)}"
        if item.last > item.first:
            _bar(row, scale, item.first, item.last, title)
        else:
            _mark(row, scale, item.first, title)
    return row


def _mark(row: Row, scale: TimeScale, time: float, title: str) -> None:
    row.earlier |= time < scale.first
    row.later |= time > scale.last
    if scale.first <= time <= scale.last:
        row.marks.append(Bar(scale.at(time), 0.0, title))


def item_when(item: Item, begun: float | None) -> str:
    if item.first is None or item.last is None:
        return ""
    return span_text(item.first, item.last, begun)
