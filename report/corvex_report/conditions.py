"""What was wrong with the device rather than with a process: why it started, and how hot it got."""

import re
from collections.abc import Iterator

from .occurrences import Telling
from .thermal import Record

# Degrees beyond which a zone is too hot: those on the chip bear more than those on the board.
LIMITS = (("tz_sensor", 95.0), ("pm", 95.0), ("", 70.0))
LIMITS_TEXT = [(f"{names}*" if names else "others", f"{most:.0f}") for names, most in LIMITS]
REASONS = ("sys.boot.reason", "ro.boot.bootreason", "ro.boot.boot_reason")
ABNORMAL = re.compile(
    r"panic|oops|watchdog|wdog|wdt|dog_bi|bark|bite|thermal|temperature|overheat|crash|fault|error"
    r"|fatal|abort|exception|lockup|hang|hard|sudden|brown|uvlo|undervolt|smpl|modem",
    re.IGNORECASE,
)


def limit(zone: str) -> float:
    return next(degrees for prefix, degrees in LIMITS if zone.startswith(prefix))


def boot_reason(properties: dict[str, str]) -> Iterator[Telling]:
    for name in REASONS:
        value = properties.get(name, "")
        if ABNORMAL.search(value):
            yield Telling("abnormal-boot", None, "getprop.txt", reason=f"{name} is {value}")
            return


def overheating(records: list[Record]) -> Iterator[Telling]:
    """Each stretch beyond the limit is an occurrence."""
    for record in records:
        for zone in record.zones:
            most = limit(zone.name)
            peak = max(zone.known, default=0.0)
            reason = f"{zone.name} reached {peak:.1f} °C, over its limit of {most:.0f} °C"
            hot = False
            for time, value in zip(record.times, zone.values):
                if value is None:
                    continue
                if value > most and not hot:
                    told = Telling("overheating", time, record.entry.path, reason=reason)
                    told.where = zone.name
                    told.identity = f"{zone.name} {time}"
                    yield told
                hot = value > most
