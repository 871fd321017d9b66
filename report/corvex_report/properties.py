"""getprop.txt, and what of it is worth knowing about a capture."""

import re
from dataclasses import dataclass

from .text import counted

LINE = re.compile(r"^\[([^\]\n]+)\]: \[([^\n]*)\]\r?$", re.MULTILINE)
VERSION_FIELD = 92  # bytes of versionNumber

# Heading, and the properties below it; a name that ends in "." stands for all that begin with it.
GROUPS = (
    (
        "Device and build",
        (
            "ro.product.manufacturer ro.product.model ro.product.device ro.hardware"
            " ro.build.ota.versionname ro.build.fingerprint ro.build.display.id ro.build.type"
            " ro.build.version.release ro.build.version.sdk ro.build.version.security_patch"
            " ro.build.date gsm.version.baseband ro.bootloader ro.bootmode ro.boot.bootreason"
            " sys.boot.reason ro.kernel.version ro.crypto.state ro.serialno"
        ),
    ),
    (
        "Capture",
        (
            "persist.sys.main persist.sys.system persist.sys.radio persist.sys.event"
            " persist.sys.kernel persist.sys.kernel.kmsg persist.sys.tcpdump persist.sys.qsee"
            " persist.sys.tz persist.sys.bootloader persist.sys.pre_bootloader"
            " persist.sys.assert.panic persist.sys.corvex.path sys.debug.watchdog"
            " persist.sys.lograw persist.sys.loglevel persist.sys.maskothers"
            " persist.sys.android. persist.sys.event. persist.sys.kernel. persist.sys.radio."
            " persist.sys.tcpdump. persist.sys.qxdm persist.sys.cpuandthermal"
        ),
    ),
    (
        "Debugging and log",
        (
            "persist.oem. debug. persist.log.tag log.tag persist.logd. logd. ro.logd."
            " ro.debuggable ro.secure sys.boot_completed persist.sys.timezone oem.after.clear"
        ),
    ),
)


@dataclass(frozen=True)
class Group:
    title: str
    rows: list[tuple[str, str]]


def parse_properties(data: bytes) -> dict[str, str]:
    return dict(LINE.findall(data.decode("utf-8", "surrogateescape")))


def groups(properties: dict[str, str], kernel: str) -> list[Group]:
    found = []
    for title, names in GROUPS:
        rows: dict[str, str] = {}
        for name in names.split():
            prefix = name.endswith(".")
            rows |= {
                key: value
                for key, value in properties.items()
                if value and (key.startswith(name) if prefix else key == name)
            }
        found.append(Group(title, list(rows.items())))
    if kernel:
        found[0].rows.append(("kernel", kernel))
    found[-1].rows.extend(tag_levels(properties))
    return [group for group in found if group.rows]


def tag_levels(properties: dict[str, str]) -> list[tuple[str, str]]:
    """How many log tags have a level of their own: the daemon alone sets nearly ninety."""
    tags: dict[str, list[str]] = {}
    for key, value in properties.items():
        if key.startswith("log.tag."):
            tags.setdefault(value, []).append(key.removeprefix("log.tag."))
    rows = []
    for level, names in sorted(tags.items()):
        text = counted(len(names), "tag")
        if level not in ("INFO", "") or len(names) <= 3:
            text += ": " + ", ".join(names)
        rows.append((f"log.tag.* = {level}", text))
    return rows


def version_text(data: bytes) -> str:
    return data[:VERSION_FIELD].split(b"\0")[0].decode("utf-8", "surrogateescape").strip()
