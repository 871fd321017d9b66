"""What is odd about a capture, each in one plain sentence. What every capture has is not odd."""

from collections.abc import Iterable, Iterator

from .artefacts import KINDS, LOGS, MARKERS, OWN
from .capture import Capture, LogFile, Series
from .line_formats import DAY
from .properties import VERSION_FIELD, version_text
from .sleep import SETTLED, Sleep, silences, summary
from .text import clock_text, counted, duration_text, shown
from .thermal import Record
from .tracks import SILENCE, STEP_BACK, Step

# What a kernel may have nothing to say in, beside each ANR.
BINDER_STATE = ("transactions", "transaction_log", "state")
MANY = 20  # findings of one sort


def findings(capture: Capture, sleep: Sleep) -> list[str]:
    sorts: Iterable[Iterator[str]] = (
        _unreadable(capture),
        _marks(capture),
        _identity(capture),
        *(_series(capture, series, sleep) for series in capture.series),
        *(_thermal(capture, record, sleep) for record in capture.records),
        _empty(capture),
    )
    return [finding for sort in sorts for finding in _some(list(sort))]


def _some(found: list[str]) -> list[str]:
    if len(found) <= MANY:
        return found
    rest = found[MANY:]
    return found[:MANY] + [f"And {len(rest)} more of the same sort."]


def _unreadable(capture: Capture) -> Iterator[str]:
    for path, problem in capture.unreadable:
        yield f"{shown(path)} {problem}."


def _marks(capture: Capture) -> Iterator[str]:
    for name in capture.neighbours:
        yield f"{shown(name)} beside it is marked as current, too: only the newest should be."
    if capture.begun is None and capture.number is not None:
        yield "Its name is of 1970: the clock had not been set when it was begun."
    elif capture.begun is None:
        yield "Its name is not that of a log directory, so it is not known when it was begun."


def _identity(capture: Capture) -> Iterator[str]:
    if not capture.properties:
        yield "There are no properties in getprop.txt, so nothing is known of the switches."
    if capture.version is None:
        yield "versionNumber is missing."
        return
    version = version_text(capture.version)
    told = capture.properties.get("ro.build.ota.versionname", "")
    if len(capture.version) != VERSION_FIELD:
        size = counted(len(capture.version), "byte")
        yield f"versionNumber has {size} instead of {VERSION_FIELD}."
    elif capture.properties and version != told:
        yield (
            f"versionNumber says “{shown(version)}”, the property ro.build.ota.versionname "
            f"“{shown(told)}”."
        )


def _series(capture: Capture, series: Series, sleep: Sleep) -> Iterator[str]:
    name = series.recorder.name
    if series.switched_on and not series.files:
        switch = next(s for s in series.recorder.switches if capture.properties.get(s) == "yes")
        yield f"{name} does not exist although {switch} is yes."
    unread = any(file.entry.problem for file in series.files)
    if series.files and not (series.size or unread or series.recorder.may_be_empty):
        yield f"{name} is empty: its recorder wrote nothing."
    if series.missing:
        names = ", ".join(series.missing[:4])
        more = f" and {len(series.missing) - 4} more" if len(series.missing) > 4 else ""
        verb = "is" if len(series.missing) == 1 else "are"
        yield f"{names}{more} {verb} missing from the series of {name}."
    for file in series.files:
        problem = _file_problem(series, file)
        if problem:
            yield f"{shown(file.entry.path)} {problem}."
    yield from _times(capture, series, sleep)


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


def _times(capture: Capture, series: Series, sleep: Sleep) -> Iterator[str]:
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
            yield f"{name}: the clock goes back by {duration_text(-step.length)}, {times}."
        elif step.length > DAY:
            yield f"{name}: the clock jumps, {times}."
    odd = [
        silence
        for silence in silences(series.steps, begin, capture.clock)
        if silence.length > limit and not sleep.explains(name, silence)
    ]
    if odd:
        yield f"{name} is silent {summary(odd, limit, capture.begun)}."
    last, passed = series.last, capture.clock.passed
    # An empty file is told of already, and its time is that of its making.
    if last is None or _holds_nothing(series, series.files[-1]):
        return
    if passed(max(last, begin), end) > limit:
        time, before = clock_text(last, capture.begun), duration_text(passed(last, end))
        yield f"{name} ends at {time}, {before} before the last of the other recordings."


def _holds_nothing(series: Series, file: LogFile) -> bool:
    return file.entry.size == 0 or (series.recorder.ring and file.track is None)


def _span(capture: Capture, step: Step) -> str:
    before, after = (clock_text(time, capture.begun) for time in (step.before, step.after))
    return f"from {before} to {after}"


def _thermal(capture: Capture, record: Record, sleep: Sleep) -> Iterator[str]:
    name = f"The thermal record {shown(record.entry.name)}"
    samples = len(record.times)
    if record.ending:
        yield f"{name} {record.ending}."
    if record.spoiled:
        yield f"{name} holds {counted(record.spoiled, 'line')} that no sampler wrote."
    for zone in record.zones:  # a core that is off has no frequency
        if 0 < zone.missing < samples:
            yield f"{name} lacks {zone.name} in {zone.missing} of {samples} samples."
    for step in record.steps:
        if step.length < 0:
            yield f"{name} goes back by {duration_text(-step.length)}, {_span(capture, step)}."
    pauses = [
        step
        for step in record.steps
        if step.length > 0 and not sleep.explains(record.entry.path, step)
    ]
    if pauses:
        yield f"{name} pauses {summary(pauses, SILENCE, capture.begun)}."


def _empty(capture: Capture) -> Iterator[str]:
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
            yield f"{shown(entry.path)} is empty{why}."
