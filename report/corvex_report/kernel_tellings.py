"""What the kernel's logs tell of, by the beginning of a message."""

import re
from collections.abc import Iterator

from .android_tellings import LOW_MEMORY, Mention, low_memory
from .frames import kernel_place
from .incidents import Telling

DRIVER = r"(?:[\w.,@-]{1,60}(?: [\w.,@-]{1,60})?: )?"
KERNEL = "kernel"  # there is one, whatever process it was in
# Kind, the beginning of the message (its group, if any, is the reason), and the identity.
RULES = (
    ("kernel-panic", r"Kernel panic - not syncing: ?(.*)", KERNEL),
    ("kernel-oops", r"(Unable to handle kernel .*)", KERNEL),
    ("kernel-oops", r"((?:Internal error: |kernel BUG at ).*)", KERNEL),
    ("kernel-oops", r"((?:BUG *: unable to handle|Unhandled fault: |Bad mode in ).*)", KERNEL),
    ("kernel-oops", r"(general protection fault: .*)", KERNEL),
    ("lockup", DRIVER + r"(BUG *: (?:soft lockup|spinlock).*)", KERNEL),
    ("lockup", DRIVER + r"(Watchdog detected hard LOCKUP.*)", KERNEL),
    ("lockup", DRIVER + r"((?:INFO *: )?\w+ (?:self-)?detected stalls? on .*)", KERNEL),
    (
        "lockup",
        DRIVER + r"((?:Causing a )?[Ww]atchdog [Bb](?:ark|ite)\b(?! (?:time|irq)).*)",
        KERNEL,
    ),
)
PATTERNS = [(kind, re.compile(pattern), identity) for kind, pattern, identity in RULES]
HUNG = re.compile(r"INFO *: (task (.{1,60}?):\d+ blocked for more than \d+ seconds)")
OUT_OF_MEMORY = re.compile(
    r"(?:Memory cgroup out|Out) of memory: Kill(?:ed)? process (\d+) \((.{1,100}?)\)"
)
KILLED = re.compile(r"Killed process (\d+) \((.{1,100}?)\)")
COMM = re.compile(r"(?:CPU: \d+ PID: (\d+) Comm: (\S+)|Process (\S+) \(pid: (\d+))")
STUCK = re.compile(r"stuck for \d+s! \[(.{1,40}?):\d+\]")
BEGINNING = re.compile("|".join(f"(?:{pattern})" for _, pattern, _ in RULES) + "|" + HUNG.pattern)


def told(mention: Mention) -> Iterator[Telling]:
    if mention.record.foreign:
        return
    text = mention.record.kernel_text
    for kind, pattern, identity in PATTERNS:
        match = pattern.match(text)
        if match:
            yield _of_kernel(mention, kind, match[1].strip(), identity)
            return
    hung = HUNG.match(text)
    if hung:
        where = kernel_place(_until_next(list(mention.following())))
        known = {"process": hung[2], "reason": hung[1], "where": where}
        yield mention.telling("hung-task", 0, **known)
    killed = OUT_OF_MEMORY.match(text) or KILLED.match(text)
    if killed:
        known = {"process": killed[2], "pid": int(killed[1]), "reason": "out of memory"}
        yield mention.telling("out-of-memory", 3, **known)
    low = re.match(r"lowmemorykiller: ", text)
    match = LOW_MEMORY.match(text, low.end()) if low else None
    if match and (telling := low_memory(mention, match)):
        yield telling


def _of_kernel(mention: Mention, kind: str, reason: str, identity: str) -> Telling:
    following = list(mention.following())
    # An oops tells its reason twice before it tells its place.
    own = following if kind == "kernel-oops" else _until_next(following)
    process = None
    for line in own[:60]:
        comm = COMM.search(line)
        if comm:
            process = comm[2] or comm[3]
            break
    stuck = STUCK.search(reason)
    process = process or (stuck[1] if stuck else None)
    known = {"where": kernel_place(own), "process": process, "identity": identity}
    return mention.telling(kind, 0 if kind == "kernel-oops" else 1, reason=reason, **known)


def _until_next(lines: list[str]) -> list[str]:
    end = next((i for i, line in enumerate(lines) if BEGINNING.match(line)), len(lines))
    return lines[:end]
