"""What went wrong, for programs: one JSON document, or one object a line."""

import json
from collections.abc import Iterator
from typing import Any

from .capture import Capture
from .findings import findings
from .incidents import Incident
from .text import date_time, plain

LONGEST = 4000  # characters of a text
BUILD = "ro.build.fingerprint"


def document(capture: Capture, incidents: list[Incident]) -> dict[str, Any]:
    return {
        "capture": text(capture.name),
        "incidents": [_incident(incident) for incident in incidents],
        "completeness": [text(finding.text) for finding in findings(capture)],
    }


def unread(name: str, problem: str) -> dict[str, Any]:
    return {"capture": text(name), "incidents": [], "completeness": [text(problem)]}


def flat(capture: Capture, incidents: list[Incident]) -> Iterator[dict[str, Any]]:
    """One object for each incident, without lists."""
    head = {
        "capture": text(capture.name),
        "begin": time_text(capture.begun),
        "build": text(capture.properties[BUILD]) if capture.properties.get(BUILD) else None,
    }
    for incident in incidents:
        yield head | _summary(incident)


def dump(value: object, indent: int | None = None) -> bytes:
    return json.dumps(value, ensure_ascii=False, indent=indent).encode()


def time_text(time: float | None) -> str | None:
    return None if time is None else date_time(time).replace(" ", "T")


def text(value: str) -> str:
    """What is no text in a name or a line becomes a sign that says so."""
    return plain(value)[:LONGEST]


def _summary(incident: Incident) -> dict[str, Any]:
    return {
        "kind": incident.kind,
        "process": None if incident.process is None else text(incident.process),
        "reason": text(incident.reason) if incident.reason else None,
        "where": None if incident.where is None else text(incident.where),
        "count": incident.count,
        "first": time_text(incident.first),
        "last": time_text(incident.last),
    }


def _incident(incident: Incident) -> dict[str, Any]:
    return _summary(incident) | {
        "files": [text(file) for file in incident.files],
        "lines": [{"file": text(one.file), "line": one.line} for one in incident.lines],
    }
