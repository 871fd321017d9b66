"""What went wrong: occurrences that are alike are one incident."""

import re
from collections.abc import Iterable
from dataclasses import dataclass, field

from .occurrences import RANKS, Occurrence, Telling, occurrences

NUMBERS = re.compile(r"0[xX][0-9a-fA-F]+|\b(?=[a-fA-F]*\d)[0-9a-fA-F]{7,16}\b|\d+")


@dataclass
class Incident:
    kind: str
    process: str | None
    reason: str
    where: str | None
    occurrences: list[Occurrence] = field(default_factory=list)

    @property
    def times(self) -> list[float]:
        return [o.time for o in self.occurrences if o.time is not None]

    @property
    def first(self) -> float | None:
        return min(self.times, default=None)

    @property
    def last(self) -> float | None:
        return max(self.times, default=None)

    @property
    def count(self) -> int:
        return len(self.occurrences)

    @property
    def tellings(self) -> list[Telling]:
        return [telling for occurrence in self.occurrences for telling in occurrence.tellings]

    @property
    def files(self) -> list[str]:
        return list(dict.fromkeys(t.file for t in self.tellings if not t.line))

    @property
    def lines(self) -> list[Telling]:
        return [telling for telling in self.tellings if telling.line]


def set_aside(reason: str) -> str:
    return NUMBERS.sub("#", reason)


def key(incident: Incident) -> tuple[str, str | None, str, str | None]:
    """The same of incidents that are alike."""
    return incident.kind, incident.process, set_aside(incident.reason), incident.where


def incidents(tellings: Iterable[Telling]) -> list[Incident]:
    """The most serious first, and what is as serious by its time."""
    found: dict[tuple[str, str | None, str, str | None], Incident] = {}
    for occurrence in occurrences(list(tellings)):
        one = Incident(*occurrence.summary())
        incident = found.setdefault(key(one), one)
        incident.occurrences.append(occurrence)
    return sorted(
        found.values(), key=lambda i: (RANKS[i.kind], i.first is None, i.first or 0.0, i.reason)
    )
