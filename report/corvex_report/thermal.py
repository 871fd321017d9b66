"""The thermal record: a line of CPU frequencies and temperatures every three seconds."""

import re
from dataclasses import dataclass, field

from .files import Entry, read_piece
from .line_formats import THERMAL, Calendar
from .tracks import Step

DIRECTORY = "kv_tsen_data"
LARGEST = 8 * 1024 * 1024  # bytes that are read of a record: some 17 hours

CPUS = tuple(f"cpu{i}_freq" for i in range(4))
# In the order of the thermal zones 0 to 16.
ZONES = (
    *(f"tz_sensor{i}" for i in range(11)),
    *("pm8841_tz", "pm8941_tz", "pa_therm0", "pa_therm1", "emmc_therm", "msm_therm"),
)


@dataclass
class Source:
    name: str
    zone: int | None  # None: a CPU
    values: list[float | None] = field(default_factory=list)

    @property
    def known(self) -> list[float]:
        return [value for value in self.values if value is not None]

    @property
    def missing(self) -> int:
        return self.values.count(None)


@dataclass
class Record:
    entry: Entry
    times: list[float]
    cpus: list[Source]
    zones: list[Source]
    steps: list[Step] = field(default_factory=list)  # pauses and steps of the clock
    unread: int = 0  # bytes
    spoiled: int = 0  # lines that are no samples
    ending: str = ""  # what is wrong with its end

    @property
    def sources(self) -> list[Source]:
        return self.cpus + self.zones


LINE = re.compile(
    rb"^datetime=[\d_:]+, "
    + b", ".join(name.encode() + rb"=([^,\n]{0,19})" for name in CPUS + ZONES)
    + rb"\n",
    re.MULTILINE,
)


def read_record(directory: str, entry: Entry, calendar: Calendar) -> Record:
    data = read_piece(directory, entry, LARGEST)
    record = Record(entry, [], [Source(name, None) for name in CPUS], [])
    record.unread = entry.size - len(data)
    record.zones = [Source(name, number) for number, name in enumerate(ZONES)]
    for match in LINE.finditer(data):
        time = THERMAL.times(match[0], calendar, True)
        if time:
            record.times += time
            for source, text in zip(record.sources, match.groups()):
                source.values.append(_number(text))
    record.spoiled = data.count(b"\n") - len(record.times)
    _scale(record)
    return record


def _number(text: bytes) -> float | None:
    digits = text.strip()
    return float(digits) if digits.removeprefix(b"-").isdigit() else None


def _scale(record: Record) -> None:
    """Frequencies become MHz. Kernels tell temperatures in thousandths of a degree, or in degrees."""
    for cpu in record.cpus:
        cpu.values = [None if value is None else value / 1000 for value in cpu.values]
    if max((abs(value) for zone in record.zones for value in zone.known), default=0.0) < 1000:
        return
    for zone in record.zones:
        zone.values = [None if value is None else value / 1000 for value in zone.values]
