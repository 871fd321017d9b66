"""What went wrong. A telling is what one source says of one occurrence; tellings of the same
occurrence are put together, and occurrences that are alike are one incident."""

import re
from collections.abc import Iterable
from dataclasses import dataclass, field

from .crash_texts import Crash

# From the most serious on.
RANKS = {
    "kernel-panic": 0,
    "system-restart": 1,
    "lockup": 2,
    "kernel-oops": 2,
    "hung-task": 2,
    "native-crash": 3,
    "java-crash": 3,
    "anr": 4,
    "out-of-memory": 5,
    "abnormal-boot": 5,
    "overheating": 5,
}
# Kinds of which one may be a part of another.
FAMILIES = {"kernel-oops": "kernel-panic"}
SYSTEM = "system_server"
WITHIN = 10.0  # seconds within which the same process has come to grief once
NUMBERS = re.compile(r"0[xX][0-9a-fA-F]+|\b[0-9a-fA-F]{7,16}\b|\d+")


@dataclass
class Telling:
    kind: str
    time: float | None  # local
    file: str
    line: int = 0  # of a log; 0: the file is an artefact
    process: str | None = None
    pid: int | None = None
    reason: str = ""
    where: str | None = None
    rank: int = 0  # of the source; the lowest says most
    identity: str = ""  # of what is no process
    thread: str | None = None  # what the process is called by who does not know its name
    uptime: float | None = None  # where there is no time of day
    offset: int = 0  # of the line

    @classmethod
    def of(
        cls,
        crash: Crash,
        kind: str,
        time: float | None,
        file: str,
        rank: int,
        line: int = 0,
        offset: int = 0,
        uptime: float | None = None,
    ) -> "Telling":
        told = cls(kind, time, file, line, crash.process, crash.pid, crash.reason, crash.where)
        told.rank, told.identity, told.thread = rank, crash.identity, crash.thread
        told.uptime, told.offset = uptime, offset
        return told

    def __post_init__(self) -> None:
        self.know(self.process)

    def know(self, process: str | None) -> None:
        self.process = process
        if self.process == SYSTEM and self.kind in ("native-crash", "java-crash"):
            self.kind = "system-restart"

    @property
    def family(self) -> str:
        if self.process == SYSTEM and self.kind == "anr":  # its stacks, before it is killed
            return "system-restart"
        return FAMILIES.get(self.kind, self.kind)


@dataclass
class Occurrence:
    tellings: list[Telling]

    @property
    def pid(self) -> int | None:
        return next((t.pid for t in self.tellings if t.pid is not None), None)

    def may_be_of(self, telling: Telling) -> bool:
        """Nothing that both know is another."""
        process = next((t.process for t in self.tellings if t.process), None)
        return (
            telling.identity != ""
            or (self.pid is None or telling.pid is None or self.pid == telling.pid)
            and (process is None or telling.process is None or process == telling.process)
        )

    def summary(self) -> tuple[str, str | None, str, str | None]:
        """Kind, process, reason and place, each from the source that says most."""
        kind = min((t.kind for t in self.tellings), key=lambda kind: RANKS[kind])
        ranked = sorted(self.tellings, key=lambda t: t.rank)
        process = next((t.process for t in ranked if t.process), None)
        reason = next((t.reason for t in ranked if t.reason and t.kind == kind), "")
        where = next((t.where for t in ranked if t.where), None)
        oops = next((t for t in ranked if t.kind == "kernel-oops"), None)
        if oops and kind == "kernel-panic":
            reason, where = f"{reason} ({oops.reason})", oops.where or where
        process = process or next((t.thread for t in ranked if t.thread), None)
        return kind, process, reason or next((t.reason for t in ranked if t.reason), ""), where

    @property
    def time(self) -> float | None:
        return min((t.time for t in self.tellings if t.time is not None), default=None)


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


def occurrences(tellings: list[Telling]) -> list[Occurrence]:
    dated = sorted((t for t in tellings if t.time is not None), key=lambda t: t.time or 0.0)
    _name(dated)
    found = _together([(t.time or 0.0, "", t) for t in dated])
    by_uptime = [(t.uptime, t.file, t) for t in tellings if t.time is None and t.uptime is not None]
    found += _copies(_together(sorted(by_uptime, key=lambda one: (one[1], one[0]))))
    return found + [Occurrence([t]) for t in tellings if t.time is None and t.uptime is None]


def _name(dated: list[Telling]) -> None:
    """Who knows only a number learns the name from who knows both."""
    names = {
        (t.pid, (t.time or 0.0) // WITHIN): t.process
        for t in dated
        if t.process and t.pid is not None
    }
    for telling in dated:
        if telling.process is None and telling.pid is not None:
            about = (telling.time or 0.0) // WITHIN
            near = (names.get((telling.pid, about + step)) for step in (0, 1, -1))
            telling.know(next((name for name in near if name), None))


def _together(tellings: list[tuple[float, str, Telling]]) -> list[Occurrence]:
    """Of tellings with a time and the clock that it is of, by time."""
    found = []
    latest: dict[tuple[str, object], tuple[float, str, Occurrence]] = {}
    for time, clock, telling in tellings:
        name = telling.identity or telling.process
        keys: list[tuple[str, object]] = []
        if telling.pid is not None:
            keys.append((telling.family, telling.pid))
        if name is not None:
            keys.append((telling.family, name))
        match = None
        for key in keys:
            begun, of, known = latest.get(key, (0.0, "", None))
            if known is None or of != clock or time - begun > WITHIN:
                continue
            if known.may_be_of(telling):
                match = begun, clock, known
                break
        if match is None:
            match = time, clock, Occurrence([])
            found.append(match[2])
        match[2].tellings.append(telling)
        latest.update(dict.fromkeys(keys, match))
    return found


def _copies(found: list[Occurrence]) -> list[Occurrence]:
    """Several copies of the same record tell the same of the same moment."""
    kept: dict[object, Occurrence] = {}
    for occurrence in found:
        first = occurrence.tellings[0]
        one = kept.setdefault((first.uptime, first.kind, first.reason), occurrence)
        if one is not occurrence:
            one.tellings += occurrence.tellings
    return list(kept.values())
