"""What the Android logs tell of: by tag, by level and by the beginning of a message. Anybody may
quote such a message; only its own writer begins a line of its tag with it."""

import re
from collections.abc import Callable, Iterator, Sequence
from dataclasses import dataclass

from .crash_texts import FATAL, java_crash, native_crash, signal_reason
from .frames import JAVA
from .incidents import SYSTEM, Telling
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

    def telling(self, kind: str, rank: int, **known: object) -> Telling:
        uptime = self.record.time if self.time is None else None
        told = Telling(kind, self.time, self.file, self.line, rank=rank, uptime=uptime)
        told.offset = self.offset
        for name, value in known.items():
            setattr(told, name, value)
        told.__post_init__()
        return told


Match = re.Match[str]


def _fatal_signal(mention: Mention, match: Match) -> Telling:
    main = match[5] if match[4] and int(match[4]) == mention.record.pid else None
    thread = match[7] or main
    return mention.telling(
        "native-crash",
        6,
        pid=int(match[6]) if match[6] else mention.record.pid,
        reason=signal_reason(match[1], match[2], match[3]),
        process=SYSTEM if thread == SYSTEM else None,
        thread=thread,
    )


def _dumped(mention: Mention, _: Match) -> Telling | None:
    crash = native_crash([mention.record.text, *mention.following()])
    if crash is None:
        return None
    known = {"process": crash.process, "pid": crash.pid, "reason": crash.reason}
    return mention.telling("native-crash", 2, where=crash.where, **known)


def _exception(mention: Mention, match: Match) -> Telling:
    crash = java_crash(mention.following())
    process = SYSTEM if match[1] else crash.process
    known = {"process": process, "pid": crash.pid or mention.record.pid}
    return mention.telling("java-crash", 2, reason=crash.reason, where=crash.where, **known)


def _not_responding(mention: Mention, match: Match) -> Telling:
    texts = list(mention.following())[:12]
    reason = next((t.removeprefix("Reason: ") for t in texts if t.startswith("Reason: ")), "")
    pid = next((t.removeprefix("PID: ").strip() for t in texts if t.startswith("PID: ")), "")
    known = {"process": match[1], "pid": int(pid) if pid.isdecimal() else None}
    return mention.telling("anr", 2, reason=reason.strip(), **known)


def _watchdog(mention: Mention, match: Match) -> Telling:
    frames = (frame[1] for text in mention.following() if (frame := JAVA.match(text)))
    known = {"reason": match[1], "where": next(frames, None), "process": SYSTEM}
    return mention.telling("system-restart", 2, **known)


def _zygote(mention: Mention, match: Match) -> Telling:
    known = {"process": SYSTEM, "pid": int(match[1]), "reason": "system server has terminated"}
    return mention.telling("system-restart", 9, **known)


def _am_crash(mention: Mention, match: Match) -> Telling:
    native = match[4].startswith("Native crash")
    known = {"process": match[3], "pid": max(int(match[1]), int(match[2]))}
    where = f"{match[6]}:{match[7]}" if match[6] not in ("", "unknown", "null") else None
    reason = match[4] + (f": {match[5]}" if match[5] and match[5] != "null" else "")
    kind = "native-crash" if native else "java-crash"
    return mention.telling(kind, 8, reason=reason, where=where, **known)


def _am_anr(mention: Mention, match: Match) -> Telling:
    known = {"process": match[3], "pid": max(int(match[1]), int(match[2]))}
    return mention.telling("anr", 8, reason=match[4].strip(), **known)


def _killed(mention: Mention, match: Match) -> Telling | None:
    return low_memory(mention, match)


def low_memory(mention: Mention, match: Match) -> Telling | None:
    """Only the loss of what the user looks at, or of what the system is, went wrong."""
    if int(match[3]) > 0:
        return None
    known = {"process": match[1], "pid": int(match[2]), "reason": f"low memory, adj {match[3]}"}
    return mention.telling("out-of-memory", 4, **known)


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
    ("lowmemorykiller", "VDIWEF", LOW_MEMORY, _killed),
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
