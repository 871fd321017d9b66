"""A directory of captures: the page of each, and an index that shows what happened in several."""

import os
from collections import Counter
from collections.abc import Callable, Iterator
from dataclasses import dataclass
from typing import Any
from urllib.parse import quote

from . import machine
from .capture import Capture
from .find_incidents import find_incidents
from .incidents import Incident, key
from .occurrences import RANKS
from .page import environment, render
from .properties import version_text
from .reading import NAME, read_capture
from .text import date_time, duration_text
from .timeline import kind_title

OF_A_CAPTURE = ("getprop.txt", "versionNumber")
Progress = Callable[[str], None]


def captures_in(directory: str) -> list[str]:
    """Their names, the first first; none of a directory that is a capture itself."""
    if NAME.fullmatch(os.path.basename(os.path.realpath(directory))):
        return []
    with os.scandir(directory) as listing:
        entries = list(listing)
    if any(entry.name in OF_A_CAPTURE for entry in entries):
        return []
    names = [e.name for e in entries if NAME.fullmatch(e.name) and e.is_dir(follow_symlinks=False)]
    return sorted(
        names, key=lambda name: (match["time"] if (match := NAME.fullmatch(name)) else "")
    )


@dataclass(frozen=True)
class Row:
    """What the index says of a capture."""

    name: str
    href: str
    number: int | None
    begun: str
    lasted: str
    build: str
    kinds: list[str]
    problem: str = ""


@dataclass(frozen=True)
class Shared:
    kind: str
    incident: Incident
    count: int
    captures: list[Row]


Read = tuple[Capture, list[Incident]]


def _each(directory: str, names: list[str], progress: Progress) -> Iterator[tuple[str, Read | str]]:
    for name in names:
        try:
            capture = read_capture(os.path.join(directory, name), progress)
            yield name, (capture, find_incidents(capture, progress))
        except OSError as error:
            yield name, f"cannot be read: {error.strerror}"


def documents(directory: str, names: list[str], progress: Progress) -> list[dict[str, Any]]:
    return [
        machine.unread(name, read) if isinstance(read, str) else machine.document(*read)
        for name, read in _each(directory, names, progress)
    ]


def flat(directory: str, names: list[str], progress: Progress) -> Iterator[dict[str, Any]]:
    for _, read in _each(directory, names, progress):
        if not isinstance(read, str):
            yield from machine.flat(*read)


def write_pages(directory: str, names: list[str], output: str, progress: Progress) -> None:
    """The pages of the captures lie beside the index. Raises OSError."""
    rows: list[Row] = []
    alike: dict[object, list[tuple[Incident, Row]]] = {}
    for name, read in _each(directory, names, progress):
        if isinstance(read, str):
            rows.append(Row(name, "", None, "", "", "", [], read))
            continue
        capture, incidents = read
        page = os.path.join(os.path.dirname(output), f"{name}.html")
        _write(page, render(capture, incidents, page))
        rows.append(_row(capture, incidents))
        for incident in incidents:
            alike.setdefault(key(incident), []).append((incident, rows[-1]))
    shared = [_shared(found) for found in alike.values() if len(found) > 1]
    shared.sort(key=lambda one: (RANKS[one.incident.kind], -len(one.captures)))
    title = os.path.basename(os.path.realpath(directory))
    page = environment().get_template("index.html").render(title=title, rows=rows, shared=shared)
    _write(output, page)


def _shared(found: list[tuple[Incident, Row]]) -> Shared:
    incident = found[0][0]
    count = sum(one.count for one, _ in found)
    return Shared(kind_title(incident.kind), incident, count, [row for _, row in found])


def _row(capture: Capture, incidents: list[Incident]) -> Row:
    kinds: Counter[str] = Counter()
    for incident in incidents:
        kinds[incident.kind] += incident.count
    lasted = ""
    if capture.begun is not None and capture.end is not None and capture.end >= capture.begun:
        lasted = duration_text(capture.end - capture.begun)
    build = version_text(capture.version or b"")
    return Row(
        capture.name,
        quote(os.fsencode(f"{capture.name}.html")),
        capture.number,
        "" if capture.begun is None else date_time(capture.begun),
        lasted,
        build or capture.properties.get(machine.BUILD, ""),
        [f"{kind_title(kind)} × {count}" for kind, count in kinds.items()],
    )


def _write(path: str, page: str) -> None:
    with open(path, "w", encoding="utf-8", errors="backslashreplace") as file:
        file.write(page)
