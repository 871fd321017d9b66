"""The first pass over the bytes of a log: grep finds the lines that are worth a look."""

import errno
import os
import subprocess
from collections.abc import Iterator
from dataclasses import dataclass

from .clock import told_boot
from .files import Reader

# What the first line of a mention holds. What it means is decided when it has been taken apart.
PATTERNS = (
    "Fatal signal [0-9]",
    ", name: [^>]{1,80} >>> ",
    "FATAL EXCEPTION",
    "ANR in ",
    "WATCHDOG KILLING SYSTEM PROCESS",
    "Exit zygote because system server",
    " am_crash *[(:]",
    " am_anr *[(:]",
    "Kill(ed)? process [0-9]",
    "Kill(ing)? '.{1,140}adj (0|-)",
    "Kernel panic - not syncing",
    "Unable to handle kernel",
    "Internal error: ",
    "kernel BUG at ",
    "BUG *: (unable to handle|soft lockup|spinlock lockup)",
    "Unhandled fault: ",
    "Bad mode in ",
    "general protection fault: ",
    "hard LOCKUP",
    "detected stall",
    "INFO *: task .{1,60} blocked for more than",
    "[Ww]atchdog [Bb](ark|ite)",
    " watchdog *[(:].{0,16}Blocked in ",
)
# Lines in which a kernel tells the time of day.
CLOCK = ("setting system clock", "PM: suspend (entry|exit)")
GREP = ["grep", "-a", "-b", "-n", "-o", "-E"]
MOST = 5000  # lines of one file
LINE = 4096  # bytes of a line that are read
BEFORE = 512  # bytes of a line before the text that was found


@dataclass(frozen=True)
class Hit:
    number: int  # of the line, from 1
    offset: int  # of the line


def start_of_device(reader: Reader) -> float | None:
    """Of the one whose kernel wrote this, in UTC, if it says so. Raises OSError."""
    lines = (reader.read(hit.offset, LINE).split(b"\n")[0] for hit in search(reader, CLOCK))
    told = [boot for line in lines if (boot := told_boot(line)) is not None]
    return told[-1] if told else None


def search(reader: Reader, patterns: tuple[str, ...] = PATTERNS) -> Iterator[Hit]:
    """Raises OSError. What is found too far from its line's beginning begins no record."""
    os.lseek(reader.fileno(), 0, os.SEEK_SET)
    grep = subprocess.Popen(
        [*GREP, "|".join(patterns), f"--max-count={MOST}"],
        stdin=reader.fileno(),
        stdout=subprocess.PIPE,
        stderr=subprocess.DEVNULL,
        env={**os.environ, "LC_ALL": "C"},
    )
    assert grep.stdout is not None
    last = 0
    with grep, grep.stdout:
        for found in grep.stdout:
            number, offset, _ = found.split(b":", 2)
            if int(number) == last:
                continue
            last = int(number)
            start = max(0, int(offset) - BEFORE)
            before = reader.read(start, int(offset) - start)
            end = before.rfind(b"\n")
            if end >= 0 or start == 0:
                yield Hit(last, start + end + 1)
    if grep.returncode > 1:
        raise OSError(errno.EIO, "grep could not read it")
