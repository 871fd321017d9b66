"""What is odd about a capture, each in one plain sentence. What every capture has is not odd."""

from collections.abc import Iterable, Iterator
from dataclasses import dataclass

from .artefacts import BINDER_STATE, KINDS, LOGS, MARKERS, OWN
from .capture import Capture, LogFile, Series
from .line_formats import DAY
from .properties import VERSION_FIELD, version_text
from .silences import SETTLED, others_went_on, silences, summary
from .text import clock_text, counted, duration_text, shown
from .thermal import Record
from .tracks import SILENCE, STEP_BACK, Step

MANY = 20  # findings of one sort


@dataclass(frozen=True)
class Finding:
    text: str
    about: str = ""  # the recorder or the path whose row tells more


Found = Iterator[Finding]


def findings(capture: Capture) -> list[Finding]:
    sorts: Iterable[Found] = (
        _nothing_on(capture),
        _unreadable(capture),
        _marks(capture),
        _identity(capture),
        *(_series(capture, series) for series in capture.series),
        *(_thermal(capture, record) for record in capture.records),
        _empty(capture),
    )
    return [finding for sort in sorts for finding in _some(list(sort))]


def nothing_on(capture: Capture) -> bool:
    """Whether no recorder was switched on, and none has left anything."""
    return all(series.switched_on is False and not series.files for series in capture.series)


def _some(found: list[Finding]) -> list[Finding]:
    if len(found) <= MANY:
        return found
    rest = found[MANY:]
    return found[:MANY] + [Finding(f"And {len(rest)} more of the same sort.")]


def _nothing_on(capture: Capture) -> Found:
    if nothing_on(capture):
        yield Finding("Nothing was switched on: no recorder was to record.", "getprop.txt")


def _unreadable(capture: Capture) -> Found:
    for path, problem in capture.unreadable:
        yield Finding(f"{shown(path)} {problem}.", path)


def _marks(capture: Capture) -> Found:
    for name in capture.neighbours:
        text = f"{shown(name)} beside it is marked as current, too: only the newest should be."
        yield Finding(text)
    if capture.begun is None and capture.number is not None:
        yield Finding("Its name is of 1970: the clock had not been set when it was begun.")
    elif capture.begun is None:
        text = "Its name is not that of a log directory, so it is not known when it was begun."
        yield Finding(text)


def _identity(capture: Capture) -> Found:
    if not capture.properties:
        text = "There are no properties in getprop.txt, so nothing is known of the switches."
        yield Finding(text, "getprop.txt")
    if capture.version is None:
        yield Finding("versionNumber is missing.")
        return
    version = version_text(capture.version)
    told = capture.properties.get("ro.build.ota.versionname", "")
    if len(capture.version) != VERSION_FIELD:
        size = counted(len(capture.version), "byte")
        yield Finding(f"versionNumber has {size} instead of {VERSION_FIELD}.", "versionNumber")
    elif capture.properties and version != told:
        text = f"versionNumber says “{shown(version)}”, the property ro.build.ota.versionname "
        yield Finding(f"{text}“{shown(told)}”.", "versionNumber")


def _series(capture: Capture, series: Series) -> Found:
    name = series.recorder.name
    if series.switched_on and not series.files:
        switch = next(s for s in series.recorder.switches if capture.properties.get(s) == "yes")
        yield Finding(f"{name} does not exist although {switch} is yes.", "getprop.txt")
    unread = any(file.entry.problem for file in series.files)
    if series.files and not (series.size or unread or series.recorder.may_be_empty):
        yield Finding(f"{name} is empty: its recorder wrote nothing.", name)
    if series.missing:
        names = ", ".join(series.missing[:4])
        more = f" and {len(series.missing) - 4} more" if len(series.missing) > 4 else ""
        verb = "is" if len(series.missing) == 1 else "are"
        yield Finding(f"{names}{more} {verb} missing from the series of {name}.", name)
    for file in series.files:
        problem = _file_problem(series, file)
        if problem:
            yield Finding(f"{shown(file.entry.path)} {problem}.", name)
    yield from _times(capture, series)


def _file_problem(series: Series, file: LogFile) -> str:
    if file.entry.problem:
        return ""
    if file.entry.size == 0:
        return "is empty" if series.size else ""
    if series.recorder.ring:
        return file.ending if file.track else "holds no packet"
    # The daemon's own readers end a file wherever its size is reached, so the newest counts.
    newest = file is series.files[-1]
    return file.ending if newest and not series.recorder.once else ""


def _times(capture: Capture, series: Series) -> Found:
    begin, end = capture.since, capture.end
    if begin is None or end is None or series.recorder.once:
        return
    limit = series.recorder.quiet or max(SETTLED, (end - begin) / 2)
    name = series.recorder.name
    for step in series.steps:
        if step.after <= begin:
            continue
        times = _span(capture, step)
        if step.length < -STEP_BACK:
            back = duration_text(-step.length)
            yield Finding(f"{name}: the clock goes back by {back}, {times}.", name)
        elif step.length > DAY:
            yield Finding(f"{name}: the clock jumps, {times}.", name)
    odd = [
        silence
        for silence in silences(series.steps, begin, capture.clock)
        if silence.length > limit and others_went_on(capture, name, silence)
    ]
    if odd:
        yield Finding(f"{name} is silent {summary(odd, limit, capture.begun)}.", name)
    last, passed = series.last, capture.clock.passed
    # An empty file is told of already, and its time is that of its making.
    if last is None or _holds_nothing(series, series.files[-1]):
        return
    if passed(max(last, begin), end) > limit:
        time, before = clock_text(last, capture.begun), duration_text(passed(last, end))
        text = f"{name} ends at {time}, {before} before the last of the other recordings."
        yield Finding(text, name)


def _holds_nothing(series: Series, file: LogFile) -> bool:
    return file.entry.size == 0 or (series.recorder.ring and file.track is None)


def _span(capture: Capture, step: Step) -> str:
    before, after = (clock_text(time, capture.begun) for time in (step.before, step.after))
    return f"from {before} to {after}"


def _thermal(capture: Capture, record: Record) -> Found:
    name = f"The thermal record {shown(record.entry.name)}"
    path = record.entry.path
    samples = len(record.times)
    if record.ending:
        yield Finding(f"{name} {record.ending}.", path)
    if record.spoiled:
        lines = counted(record.spoiled, "line")
        yield Finding(f"{name} holds {lines} that no sampler wrote.", path)
    for zone in record.zones:  # a core that is off has no frequency
        if 0 < zone.missing < samples:
            text = f"{name} lacks {zone.name} in {zone.missing} of {samples} samples."
            yield Finding(text, path)
    for step in record.steps:
        if step.length < 0:
            text = f"{name} goes back by {duration_text(-step.length)}, {_span(capture, step)}."
            yield Finding(text, path)
    pauses = [
        step for step in record.steps if step.length > 0 and others_went_on(capture, path, step)
    ]
    if pauses:
        yield Finding(f"{name} pauses {summary(pauses, SILENCE, capture.begun)}.", path)


def _empty(capture: Capture) -> Found:
    known = {file.entry.path for series in capture.series for file in series.files}
    known.update(MARKERS, OWN)
    for entry in capture.entries:
        if entry.size or entry.problem or entry.path in known:
            continue
        top = entry.path.split("/")[0]
        # A lost entry of the dropbox is a name and nothing else.
        if top in ("dropbox", "anr") and entry.name.endswith(".lost"):
            continue
        if top == "anr" and entry.name in BINDER_STATE:
            continue
        # Nothing may have been in a log of the past when it was copied.
        if top not in LOGS:
            why = ": its source was empty, or gone when it was copied" if top in dict(KINDS) else ""
            yield Finding(f"{shown(entry.path)} is empty{why}.", entry.path)
