"""What the Android logs tell of: by tag, by level and by the beginning of a message. Anybody may
quote such a message; only its own writer begins a line of its tag with it."""

import re
from collections.abc import Callable, Iterator, Sequence
from dataclasses import dataclass

from .crash_texts import FATAL, Crash, java_crash, native_crash, signal_reason
from .frames import JAVA
from .occurrences import SYSTEM, Telling
from .records import Record


@dataclass(frozen=True)
class Mention:
    """A line that was found, and those of its writer behind it."""

    record: Record
    file: str
    line: int
    offset: int
    time: float | None
    following: Callable[[], Sequence[str]]

    def telling(self, kind: str, rank: int, crash: Crash) -> Telling:
        uptime = self.record.time if self.time is None else None
        place = {"line": self.line, "offset": self.offset}
        return Telling.of(crash, kind, self.time, self.file, rank, uptime=uptime, **place)


Match = re.Match[str]


def _fatal_signal(mention: Mention, match: Match) -> Telling:
    main = match[5] if match[4] and int(match[4]) == mention.record.pid else None
    thread = match[7] or main
    crash = Crash(
        SYSTEM if thread == SYSTEM else None,
        int(match[6]) if match[6] else mention.record.pid,
        signal_reason(match[1], match[2], match[3]),
        thread=thread,
    )
    return mention.telling("native-crash", 6, crash)


def _dumped(mention: Mention, _: Match) -> Telling | None:
    crash = native_crash([mention.record.text, *mention.following()])
    return mention.telling("native-crash", 2, crash) if crash else None


def _exception(mention: Mention, match: Match) -> Telling:
    crash = java_crash(mention.following())
    crash.process = SYSTEM if match[1] else crash.process
    crash.pid = crash.pid or mention.record.pid
    return mention.telling("java-crash", 2, crash)


def _not_responding(mention: Mention, match: Match) -> Telling:
    said: dict[str, str] = {}
    for text in list(mention.following())[:12]:
        name, _, value = text.partition(": ")
        said.setdefault(name, value.strip())
    pid = said.get("PID", "")
    crash = Crash(match[1], int(pid) if pid.isdecimal() else None, said.get("Reason", ""))
    return mention.telling("anr", 2, crash)


def _watchdog(mention: Mention, match: Match) -> Telling:
    frames = (frame[1] for text in mention.following() if (frame := JAVA.match(text)))
    return mention.telling("system-restart", 2, Crash(SYSTEM, None, match[1], next(frames, None)))


def _zygote(mention: Mention, match: Match) -> Telling:
    crash = Crash(SYSTEM, int(match[1]), "system server has terminated")
    return mention.telling("system-restart", 9, crash)


def _am_crash(mention: Mention, match: Match) -> Telling:
    kind = "native-crash" if match[4].startswith("Native crash") else "java-crash"
    where = f"{match[6]}:{match[7]}" if match[6] not in ("", "unknown", "null") else None
    reason = match[4] + (f": {match[5]}" if match[5] and match[5] != "null" else "")
    return mention.telling(kind, 8, Crash(match[3], _pid(match), reason, where))


def _am_anr(mention: Mention, match: Match) -> Telling:
    return mention.telling("anr", 8, Crash(match[3], _pid(match), match[4].strip()))


def _pid(match: Match) -> int:
    """The event has a user's number, too, before it or behind it."""
    return max(int(match[1]), int(match[2]))


def low_memory(mention: Mention, match: Match) -> Telling | None:
    """Only the loss of what the user looks at, or of what the system is, went wrong."""
    if int(match[3]) > 0:
        return None
    crash = Crash(match[1], int(match[2]), f"low memory, adj {match[3]}")
    return mention.telling("out-of-memory", 4, crash)


LOW_MEMORY = re.compile(r"Kill(?:ing)? '(.{1,100}?)' \((\d+)\).*?(?:oom_(?:score_)?)?adj (-?\d+)")
# Tag, levels, beginning of the message, and what it tells.
Rule = tuple[str, str, re.Pattern[str], Callable[[Mention, Match], Telling | None]]
MAIN_RULES: tuple[Rule, ...] = (
    ("libc", "F", FATAL, _fatal_signal),
    ("DEBUG", "FE", re.compile(r"pid: \d+, tid: \d+, name: "), _dumped),
    (
        "AndroidRuntime",
        "EF",
        re.compile(r"(?:FATAL EXCEPTION: |(\*\*\* FATAL EXCEPTION IN SYSTEM PROCESS: ))"),
        _exception,
    ),
    ("ActivityManager", "EF", re.compile(r"ANR in (\S{1,200})"), _not_responding),
    (
        "Watchdog",
        "WEF",
        re.compile(r"\*\*\* WATCHDOG KILLING SYSTEM PROCESS: (.*)"),
        _watchdog,
    ),
    (
        "Zygote",
        "EF",
        re.compile(r"Exit zygote because system server \((?:pid )?(\d{1,9})\) has "),
        _zygote,
    ),
    ("lowmemorykiller", "VDIWEF", LOW_MEMORY, low_memory),
)
EVENT_RULES: tuple[Rule, ...] = (
    (
        "am_crash",
        "IWE",
        re.compile(r"\[(\d{1,9}),(\d{1,9}),([^,]*),-?\d+,([^,]*),(.*),([^,]*),(-?\d+)\]"),
        _am_crash,
    ),
    ("am_anr", "IWE", re.compile(r"\[(\d{1,9}),(\d{1,9}),([^,]*),-?\d+,(.*)\]"), _am_anr),
    ("watchdog", "IWE", re.compile(r"(Blocked in .*)"), _watchdog),
)


def told(mention: Mention, rules: tuple[Rule, ...]) -> Iterator[Telling]:
    record = mention.record
    for tag, levels, beginning, tell in rules:
        if record.tag != tag or record.level not in levels:
            continue
        match = beginning.match(record.text)
        telling = tell(mention, match) if match else None
        if telling:
            yield telling
