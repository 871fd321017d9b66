"""One line of a log, taken apart."""

import re
from collections.abc import Callable
from dataclasses import dataclass

from .line_formats import Calendar
from .text import date_time

# What logcat writes with -v threadtime, and with -v time; both may have a year and a zone.
LOGCAT = re.compile(
    rb"(?P<date>(?:\d{4}-)?\d\d-\d\d) (?P<hour>\d\d):(?P<minute>\d\d):(?P<second>\d\d\.\d{3,9})"
    rb"(?: [+-]\d{4})? +(?:(?:[\w.]{1,20} +)??(?P<pid>\d{1,7}) +(?P<tid>\d{1,7}) (?P<level>[VDIWEFA])"
    rb" (?P<tag>[^\n]{0,100}?) *: |(?P<level2>[VDIWEFA])/(?P<tag2>[^\n]{0,100}?) *"
    rb"\( *(?P<pid2>\d{1,7})(?:: *\d{1,7})?\): )(?P<text>[^\n]*)"
)
# A record of /dev/kmsg; of its number, all but the lowest three bits say who wrote it.
KMSG = re.compile(rb"(?P<who>\d{1,6}),\d{1,20},(?P<us>\d{1,17}),[^;\n]{0,200};(?P<text>[^\n]*)")
UPTIME = re.compile(
    rb"(?:<(?P<who>\d{1,6})>)?\[ *(?P<uptime>\d{1,10}\.\d{1,9})\](?:\[[^]\n]{0,40}\])? ?"
    rb"(?P<text>[^\n]*)"
)
VENDOR = re.compile(
    r"^(?:<\d{1,6}>)?(?:\[ *\d{1,10}\.\d{1,9}\] ?)?"
    r"(?:c\d{1,2} +\d{1,7} |\(\d\)\[\d{1,7}:[^]]{0,40}\] ?)?"
)
LEVELS = "FFFEWIID"  # of the kernel's eight
INFO = 6
KERNEL = 8  # a number below it is of the kernel itself


@dataclass(frozen=True)
class Record:
    time: float  # as the line has it
    relative: bool  # counts from the device's start
    text: str
    pid: int | None = None
    tid: int | None = None
    level: str = ""
    tag: str = ""
    foreign: bool = False  # put into the kernel's log by a process

    @property
    def kernel_text(self) -> str:
        """logcat takes the beginning of a kernel's line for a tag; vendors put more before it."""
        named = self.tag not in ("", "kernel", "-")
        return VENDOR.sub("", f"{self.tag}: {self.text}" if named else self.text, 1)


Parse = Callable[[bytes], Record | None]


def record_parser(calendar: Calendar) -> Parse:
    def parse(line: bytes) -> Record | None:
        match = LOGCAT.match(line)
        if match:
            midnight = calendar.month_day(match["date"])
            if midnight is None:
                return None
            hours = int(match["hour"]) * 3600 + int(match["minute"]) * 60
            return Record(
                midnight + hours + float(match["second"]),
                False,
                text_of(match["text"]),
                int(match["pid"] or match["pid2"]),
                int(match["tid"]) if match["tid"] else None,
                (match["level"] or match["level2"]).decode(),
                text_of(match["tag"] or match["tag2"] or b"").strip(),
            )
        match = KMSG.match(line)
        if match:
            return _of_kernel(int(match["us"]) / 1e6, int(match["who"]), match["text"])
        match = UPTIME.match(line)
        if match:
            return _of_kernel(float(match["uptime"]), int(match["who"] or INFO), match["text"])
        return None

    return parse


def _of_kernel(uptime: float, who: int, text: bytes) -> Record:
    level = LEVELS[who % KERNEL]
    return Record(uptime, True, text_of(text), level=level, foreign=who >= KERNEL)


def threadtime(record: Record, time: float, tag: str) -> bytes:
    """As logcat -v threadtime has it."""
    stamp = f"{date_time(time)[5:]}.{int(time % 1 * 1000):03}"
    pid, tid = record.pid or 0, record.tid or record.pid or 0
    text = f"{stamp} {pid:5} {tid:5} {record.level} {tag:<8}: {record.text}"
    return text.encode("utf-8", "replace")


def text_of(data: bytes) -> str:
    return data.decode("utf-8", "replace").rstrip("\r")
