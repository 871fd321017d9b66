"""The incidents as the page shows them: with what artefacts and logs say of them."""

import os
from dataclasses import dataclass
from itertools import islice
from urllib.parse import quote

from .capture import Capture
from .context import WIDTH, Context, Said
from .files import open_text
from .incidents import Incident
from .occurrences import RANKS
from .records import text_of
from .text import clock_text, span_text
from .timeline import kind_title

SHOWN = 200  # incidents
ARTEFACTS = 8  # of an incident
EXCERPTS = 6
ALL_EXCERPTS = 200  # of a page
FIRST_LINES = 16
PIECE = 8192  # bytes of an artefact


@dataclass(frozen=True)
class Link:
    path: str
    href: str
    lines: list[str]


@dataclass(frozen=True)
class Excerpt:
    files: list[Link]
    lines: list[Said]
    width: int  # of the longest name of a file


@dataclass(frozen=True)
class View:
    id: str
    level: str
    kind: str
    process: str | None
    reason: str
    where: str | None
    count: int
    when: str
    artefacts: list[Link]
    artefacts_more: int
    excerpts: list[Excerpt]
    mentions_more: int


class Views:
    def __init__(self, capture: Capture, output: str) -> None:
        self._capture = capture
        self._context = Context(capture)
        self._entries = {entry.path: entry for entry in capture.entries}
        here = os.path.dirname(os.path.abspath(output))
        self._base = os.path.relpath(os.path.abspath(capture.directory), here)
        self._left = ALL_EXCERPTS

    def view(self, number: int, incident: Incident) -> View:
        excerpts, untold = self._excerpts(incident)
        files = incident.files
        return View(
            f"incident-{number}",
            "worst" if RANKS[incident.kind] <= RANKS["lockup"] else "",
            kind_title(incident.kind),
            incident.process,
            incident.reason[:WIDTH],
            incident.where and incident.where[:WIDTH],
            incident.count,
            self._when(incident),
            [self._link(path, self._first_lines(path)) for path in files[:ARTEFACTS]],
            max(0, len(files) - ARTEFACTS),
            excerpts,
            untold,
        )

    def _when(self, incident: Incident) -> str:
        first, last = incident.first, incident.last
        if first is None or last is None:
            return "at a time that is not known"
        if incident.count == 1:
            return clock_text(first, self._capture.begun)
        return span_text(first, last, self._capture.begun)

    def _link(self, path: str, lines: list[str]) -> Link:
        return Link(path, quote(os.fsencode(os.path.join(self._base, path))), lines)

    def _first_lines(self, path: str) -> list[str]:
        try:
            with open_text(self._capture.directory, self._entries[path]) as reader:
                lines = text_of(reader.read(0, PIECE)).split("\n")
        except OSError:
            return []
        return [line[:WIDTH] for line in lines[:FIRST_LINES]]

    def _excerpts(self, incident: Incident) -> tuple[list[Excerpt], int]:
        """A mention that stands in the excerpt of another needs none of its own."""
        found: list[Excerpt] = []
        seen: set[tuple[str, int]] = set()
        mentions = {(one.file, one.offset): one for one in incident.lines}
        for place, telling in mentions.items():
            if place in seen:
                continue
            if len(found) >= EXCERPTS or not self._left:
                break
            said = self._context.round(telling)
            if not said:
                continue
            self._left -= 1
            lines = [
                Said(s.time, s.file, s.offset, s.text, (s.file, s.offset) in mentions) for s in said
            ]
            seen.update((line.file, line.offset) for line in lines)
            files = dict.fromkeys(line.file for line in lines)
            found.append(
                Excerpt([self._link(file, []) for file in files], lines, max(map(len, files)))
            )
        return found, len(mentions.keys() - seen)


def views(capture: Capture, incidents: list[Incident], output: str) -> list[View]:
    made = Views(capture, output)
    return [made.view(number, one) for number, one in enumerate(islice(incidents, SHOWN))]
