"""What a device leaves of its troubles: logs and artefacts with one of each kind.

Their texts lie in samples/. Those of logs begin with the second of the capture; logcat's tell the
process and the tag, too. "<name>" stands for another sample."""

import re
from pathlib import Path

from fixture import BEGUN, BOOT, LENGTH, PROPERTIES, logcat, put, put_dropbox, put_properties
from fixture import sample, spread, stamp

END = BEGUN + LENGTH


def read(name: str) -> str:
    return (Path(__file__).parent / "samples" / name).read_text()


NATIVE, ABORTED, JAVA, TRACE = map(read, ("native.txt", "aborted.txt", "java.txt", "trace.txt"))
OOPS, HUNG = map(read, ("oops.txt", "hung.txt"))
DROPPED = (
    f"Process: com.example.mail\nPID: 4100\nFlags: 0x3\nPackage: com.example.mail v7\n\n{JAVA}"
)
PANIC = "Kernel panic - not syncing: Fatal exception\n"
BARK = "msm_watchdog 17817000.qcom,wdt: Watchdog bark! Now = 5123.456789\n"


def lines(time: float, pid: int, tag: str, text: str) -> bytes:
    """As logcat writes them; the tag begins with the level."""
    level, name = tag.split()
    head = f"{stamp(time, '%m-%d %H:%M:%S')}.{int(time % 1 * 1000):03} {pid:5} {pid:5} {level} "
    return "".join(f"{head}{name:<8}: {line}\n" for line in text.splitlines()).encode()


def kmsg(uptime: float, text: str) -> bytes:
    """Records of /dev/kmsg, a millisecond apart."""
    rows = enumerate(text.splitlines())
    times = ((i, int(uptime * 1e6) + 1000 * i, line) for i, line in rows)
    return "".join(f"4,{i},{microseconds},-;{line}\n" for i, microseconds, line in times).encode()


def dmesg(uptime: float, text: str) -> bytes:
    records = enumerate(text.splitlines())
    return "".join(f"<4>[{uptime + i / 1000:12.6f}] {line}\n" for i, line in records).encode()


def told(text: str) -> str:
    return read(text[1:-1]) if re.fullmatch("<.*>", text) else text


def logged(name: str) -> bytes:
    """The lines of a sample of logcat's."""
    rows = re.findall("(.+?) (.+?) (. .+?): (.*)\n", read(name))
    return b"".join(
        lines(BEGUN + float(s), int(pid), tag, told(text)) for s, pid, tag, text in rows
    )


def put_log(path: Path, *parts: bytes) -> None:
    """Among lines of no interest, a second apart."""
    log = logcat(BEGUN - 20, END, 1, "init") + b"".join(parts)
    rows = sorted(log.splitlines(keepends=True), key=lambda row: row[:18])
    put(path, b"".join(rows), END)


def trouble(capture: Path) -> None:
    """One of each kind, told by all that tell of it."""
    put(capture / "tombstones/2026-11-23-00-32-22/tombstone_03", NATIVE.encode(), BEGUN + 52)
    put_dropbox(capture, "SYSTEM_TOMBSTONE", BEGUN + 53, NATIVE)
    put_dropbox(capture, "data_app_crash", BEGUN + 101, DROPPED)
    put_log(capture / "android.log", logged("android.txt"), logged("quotes.txt"))
    put_log(capture / "event.log", logged("events.txt"))
    trace = TRACE.format(time="2026-11-23 00:34:00")
    put(capture / "anr/2026-11-23-00-34-02/anr_2026-11-23-00-34-02", trace.encode(), END)
    rows = (row.split(" ", 1) for row in read("kernel.txt").splitlines())
    kernel = b"".join(kmsg(BEGUN - BOOT + float(second), told(text)) for second, text in rows)
    put(capture / "kernel.log", kernel, END)
    samples = map(sample, spread(BEGUN, END, 3))
    hot = "tz_sensor3=101500"
    record = [
        re.sub("tz_sensor3=[0-9]+", hot, line) if 90 < i < 99 else line
        for i, line in enumerate(samples)
    ]
    put(capture / "kv_tsen_data/20261123_03140", "".join(record).encode(), END)
    put_properties(capture, PROPERTIES | {"ro.boot.bootreason": "kernel_panic"})
