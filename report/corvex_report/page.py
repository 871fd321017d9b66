"""Renders the page: one file that needs nothing else."""

from dataclasses import dataclass
from pathlib import Path

from jinja2 import Environment, FileSystemLoader, StrictUndefined

from . import charts, timeline, wrong
from .artefacts import OTHER
from .capture import Capture, LogFile
from .conditions import LIMITS_TEXT
from .findings import Finding, findings, nothing_on
from .incidents import Incident
from .properties import groups, version_text
from .text import clock_text, counted, date_time, duration_text, shown, size_text, span_text

TEMPLATES = Path(__file__).parent / "templates"
LISTED = 1000  # rows of one table
AT_ONCE = 8  # rows of a kind before the others are folded away


@dataclass(frozen=True)
class FileRow:
    path: str
    size: int
    when: str
    id: str


def environment() -> Environment:
    made = Environment(
        loader=FileSystemLoader(TEMPLATES),
        autoescape=True,
        trim_blocks=True,
        lstrip_blocks=True,
        undefined=StrictUndefined,
    )
    made.filters.update(shown=shown, size=size_text, counted=counted)
    return made


def render(capture: Capture, incidents: list[Incident], output: str) -> str:
    line = timeline.build(capture, incidents)
    page = (
        environment()
        .get_template("page.html")
        .render(
            capture=capture,
            facts=_facts(capture),
            nothing_on=nothing_on(capture),
            wrong=wrong.views(capture, incidents, output),
            wrong_count=len(incidents),
            wrong_more=max(0, len(incidents) - wrong.SHOWN),
            findings=_leading(capture, findings(capture), line),
            timeline=line,
            when=lambda item: timeline.item_when(item, capture.begun),
            charts=[
                (record, charts.chart(record, capture.begun, incidents))
                for record in capture.records
            ],
            groups=groups(capture.properties, capture.kernel_version),
            files=_files(capture),
            more_files=max(0, len(capture.entries) - LISTED),
            sampled=[file.entry.path for s in capture.series for file in s.files if _sampled(file)],
            boot=_boot(capture),
            at_once=AT_ONCE,
            listed=LISTED,
            other=OTHER,
            limits=LIMITS_TEXT,
        )
    )
    # A name may hold a byte that is no text; it has been escaped where it is shown.
    return page.encode("utf-8", "backslashreplace").decode()


def _leading(
    capture: Capture, found: list[Finding], line: timeline.Timeline | None
) -> list[tuple[str, str]]:
    """Each finding with the row that it is about."""
    rows = {entry.path: f"file-{i}" for i, entry in enumerate(capture.entries[:LISTED])}
    if line:
        rows |= {row.name: row.id for row in line.recorded}
    return [(finding.text, rows.get(finding.about, "files")) for finding in found]


def _facts(capture: Capture) -> list[tuple[str, str]]:
    """The head of the page."""
    properties = capture.properties
    maker = properties.get("ro.product.manufacturer", "")
    model = properties.get("ro.product.model", "")
    build = version_text(capture.version or b"") or properties.get("ro.build.ota.versionname", "")
    release = properties.get("ro.build.version.release", "")
    facts = [
        ("Begun", date_time(capture.begun) if capture.begun is not None else ""),
        ("Recorded", _recorded(capture)),
        ("Device", " ".join(part for part in (maker, model) if part)),
        ("Build", " · ".join([build] * bool(build) + [f"Android {release}"] * bool(release))),
        ("Size", f"{size_text(capture.size)} in {counted(len(capture.entries), 'file')}"),
    ]
    return [(name, shown(value)) for name, value in facts if value]


def _boot(capture: Capture) -> str:
    clock = capture.clock
    return "" if clock.boot is None else date_time(clock.from_utc(clock.boot))


def _recorded(capture: Capture) -> str:
    if capture.begun is None or capture.end is None or capture.end < capture.begun:
        return ""
    return (
        f"{duration_text(capture.end - capture.begun)}, to {clock_text(capture.end, capture.begun)}"
    )


def _sampled(file: LogFile) -> bool:
    return file.track is not None and file.track.sampled


def _files(capture: Capture) -> list[FileRow]:
    """Every file, with the times that are known of it."""
    times: dict[str, str] = {}
    for series in capture.series:
        for file in series.files:
            if file.first is not None and file.last is not None:
                times[file.entry.path] = span_text(file.first, file.last, capture.begun)
    for kind in capture.kinds:
        for item in kind.items:
            times |= {entry.path: timeline.item_when(item, capture.begun) for entry in item.entries}
    return [
        FileRow(shown(entry.path), entry.size, times.get(entry.path, ""), f"file-{number}")
        for number, entry in enumerate(capture.entries[:LISTED])
    ]
