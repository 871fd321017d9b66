"""What the kernel's logs tell of, by the beginning of a message."""

import re
from collections.abc import Iterator

from .android_tellings import LOW_MEMORY, Mention, low_memory
from .crash_texts import Crash
from .frames import kernel_place
from .occurrences import Telling

DRIVER = r"(?:[\w.,@-]{1,60}(?: [\w.,@-]{1,60})?: )?"
KERNEL = "kernel"  # there is one, whatever process it was in
# Kind, and the beginning of the message; its group is the reason.
RULES = (
    ("kernel-panic", r"Kernel panic - not syncing: ?(.*)"),
    ("kernel-oops", r"(Unable to handle kernel .*)"),
    ("kernel-oops", r"((?:Internal error: |kernel BUG at ).*)"),
    ("kernel-oops", r"((?:BUG *: unable to handle|Unhandled fault: |Bad mode in ).*)"),
    ("kernel-oops", r"(general protection fault: .*)"),
    ("lockup", DRIVER + r"(BUG *: (?:soft lockup|spinlock lockup).*)"),
    ("lockup", DRIVER + r"(Watchdog detected hard LOCKUP.*)"),
    ("lockup", DRIVER + r"((?:INFO *: )?\w+ (?:self-)?detected stalls? on .*)"),
    ("lockup", DRIVER + r"((?:Causing a )?[Ww]atchdog [Bb](?:ark|ite)\b(?! (?:time|irq)).*)"),
)
PATTERNS = [(kind, re.compile(pattern)) for kind, pattern in RULES]
HUNG = re.compile(r"INFO *: (task (.{1,60}?):\d+ blocked for more than \d+ seconds)")
OUT_OF_MEMORY = re.compile(
    r"(?:Memory cgroup out|Out) of memory: Kill(?:ed)? process (\d+) \((.{1,100}?)\)"
)
KILLED = re.compile(r"Killed process (\d+) \((.{1,100}?)\)")
COMM = re.compile(r"(?:CPU: \d+ PID: \d+ Comm: (\S+)|Process (\S+) \(pid: \d+)")
STUCK = re.compile(r"stuck for \d+s! \[(.{1,40}?):\d+\]")
BEGINNING = re.compile("|".join(f"(?:{pattern})" for _, pattern in RULES) + "|" + HUNG.pattern)


def told(mention: Mention) -> Iterator[Telling]:
    if mention.record.foreign:
        return
    text = mention.record.kernel_text
    for kind, pattern in PATTERNS:
        match = pattern.match(text)
        if match:
            yield _of_kernel(mention, kind, match[1].strip())
            return
    hung = HUNG.match(text)
    if hung:
        where = kernel_place(_until_next(list(mention.following())))
        yield mention.telling("hung-task", 0, Crash(hung[2], None, hung[1], where))
    killed = OUT_OF_MEMORY.match(text) or KILLED.match(text)
    if killed:
        crash = Crash(killed[2], int(killed[1]), "out of memory")
        yield mention.telling("out-of-memory", 3, crash)
    tag, _, rest = text.partition(": ")
    low = LOW_MEMORY.match(rest) if tag == "lowmemorykiller" else None
    if low and (telling := low_memory(mention, low)):
        yield telling


def _of_kernel(mention: Mention, kind: str, reason: str) -> Telling:
    following = list(mention.following())
    # An oops tells its reason twice before it tells its place.
    own = following if kind == "kernel-oops" else _until_next(following)
    running = next((comm for line in own[:60] if (comm := COMM.search(line))), None)
    stuck = STUCK.search(reason)
    process = (running[1] or running[2]) if running else (stuck[1] if stuck else None)
    crash = Crash(process, None, reason, kernel_place(own), identity=KERNEL)
    return mention.telling(kind, 0 if kind == "kernel-oops" else 1, crash)


def _until_next(lines: list[str]) -> list[str]:
    end = next((i for i, line in enumerate(lines) if BEGINNING.match(line)), len(lines))
    return lines[:end]
