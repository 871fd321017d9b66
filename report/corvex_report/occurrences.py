"""What happened once. A telling is what one source says of one occurrence; tellings of the same
occurrence are put together."""

from dataclasses import dataclass

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
