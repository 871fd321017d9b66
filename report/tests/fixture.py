#!/usr/bin/python3
"""fixture.py DIRECTORY [MIB]: makes a log directory like one of a phone's, healthy, of ten minutes.

With MIB, the Android log and the packets are written out to about that many MiB, as is done to
measure how long a report of a large capture takes."""

import gzip
import math
import os
import struct
import sys
from collections.abc import Iterable
from datetime import datetime, timezone
from pathlib import Path

AHEAD = 7200  # seconds of local time before UTC
BEGUN = datetime(2026, 11, 23, 0, 31, 30, tzinfo=timezone.utc).timestamp()  # local, as all here
LENGTH = 600
BOOT = BEGUN - 5000
NAME = "KVBR_2--2026-11-23-00-31-30_current"
RING = ("tcpdump1", "tcpdump2", "tcpdump0")  # from the oldest to the newest
CPU_STEPS = (1190400, 1497600, 1728000, 2265600)
ON = "main system radio event kernel kernel.kmsg tcpdump qsee tz bootloader pre_bootloader".split()
PROPERTIES = {
    **{f"persist.sys.{name}": "yes" for name in ON},
    "persist.sys.assert.panic": "true",
    "log.tag.NFC": "VERBOSE",
    "log.tag.LocSvc_eng": "INFO",
    "ro.build.ota.versionname": "CVX-8.1.0-0142",
    "ro.build.fingerprint": "Corvex/cvx1/cvx1:8.1.0/OPM1/142:userdebug/test-keys",
    "ro.build.version.release": "8.1.0",
    "ro.product.manufacturer": "Corvex",
    "ro.product.model": "CVX-1",
    "gsm.version.baseband": "MPSS.AT.2.0-00142",
}


def stamp(time: float, form: str) -> str:
    return datetime.fromtimestamp(time, timezone.utc).strftime(form)


def put(path: Path, data: bytes, time: float) -> None:
    """Writes a file that was last written at a local time of the device."""
    path.parent.mkdir(parents=True, exist_ok=True)
    path.write_bytes(data)
    os.utime(path, (time - AHEAD, time - AHEAD))


def logcat(first: float, last: float, step: float, tag: str) -> bytes:
    lines = (
        f"{stamp(time, '%m-%d %H:%M:%S')}.{int(time % 1 * 1000):03}   911   930 I {tag}: line {i}\n"
        for i, time in enumerate(spread(first, last, step))
    )
    return "".join(lines).encode()


def spread(first: float, last: float, step: float) -> Iterable[float]:
    count = int((last - first) / step)
    return (first + step * i for i in range(count + 1))


def packets(first: float, last: float, step: float, length: int = 120) -> bytes:
    header = struct.pack("<IHHiIII", 0xA1B2C3D4, 2, 4, 0, 0, 262144, 276)
    content = b"packet".ljust(length, b".")
    return header + b"".join(
        struct.pack("<IIII", int(t), int(t % 1 * 10**6), length, length) + content
        for t in (time - AHEAD for time in spread(first, last, step))
    )


def kernel(last: float) -> bytes:
    lines = ["5,0,0,-;Linux version 4.9.65-cvx (build@corvex) #1 SMP PREEMPT"]
    lines += [f"6,{i},{i * 9000},-;device {i} found\n DEVICE=+platform:{i}" for i in range(1, 90)]
    times = spread(BEGUN - 30, last, 1.5)
    lines += [f"6,{i},{int((t - BOOT) * 1e6)},-;text {i}" for i, t in enumerate(times, 90)]
    return "".join(line + "\n" for line in lines).encode()


def firmware(name: str, last: float) -> bytes:
    times = spread(BEGUN - 5, last, 1)
    return "".join(f"[{time - BOOT:10.2f}] {name}: event\n" for time in times).encode()


def sample(time: float, without: tuple[str, ...] = ()) -> str:
    now = datetime.fromtimestamp(time, timezone.utc)
    parts = [f"datetime={now.year}{now.month}{now.day}_{now.hour}:{now.minute}:{now.second}"]
    passed = time - BEGUN
    for cpu in range(4):
        speed = CPU_STEPS[int(passed // 9 * (2 * cpu + 1) + passed % 5 * cpu) % 4]
        parts.append(f"cpu{cpu}_freq={'' if f'cpu{cpu}' in without else speed}")
    names = [f"tz_sensor{i}" for i in range(11)]
    names += ["pm8841_tz", "pm8941_tz", "pa_therm0", "pa_therm1", "emmc_therm", "msm_therm"]
    for zone, name in enumerate(names):
        heat = 33 + zone * 0.4 + (4 + zone * 0.6) * (1 - math.exp(-max(passed, 0) / 240))
        value = f"{int(1000 * (heat + math.sin(passed / 37 + zone)))}"
        parts.append(f"{name}=" + (" " * 8 if zone in (7, 12) or name in without else value))
    return ", ".join(parts) + "\n"


def make_capture(parent: Path) -> Path:
    capture = parent / NAME
    end = BEGUN + LENGTH
    (capture / "boot_log").mkdir(parents=True)
    version = PROPERTIES["ro.build.ota.versionname"].encode()
    put(capture / "versionNumber", version.ljust(92, b"\0"), BEGUN)
    put_properties(capture, PROPERTIES)
    cuts = [BEGUN - 20, BEGUN + 200, BEGUN + 400, end]
    for name, first, last in zip(
        ("android.log.02", "android.log.01", "android.log"), cuts, cuts[1:]
    ):
        begin = b"--------- beginning of main\n" if name.endswith("2") else b""
        put(capture / name, begin + logcat(first, last - 0.25, 0.25, "ActivityManager"), last)
    put(capture / "radio.log", logcat(BEGUN - 60, end - 100, 5, "RILJ"), end - 100)
    put(capture / "event.log", logcat(BEGUN - 60, end - 9, 3, "am_pause"), end - 9)
    put(capture / "kernel.log", kernel(end), end)
    for name, first in zip(RING, (BEGUN + 90, BEGUN + 260, BEGUN + 430)):
        put(capture / name, packets(first, first + 165, 0.3), first + 165)
    put(capture / "qsee.log", firmware("qsee", end), end)
    put(capture / "tz.log", firmware("tz", end), end)
    line = b"B -      7758 - pbl, started\n"
    put(capture / "bootloader.log", line * 60, BEGUN + 1)
    put(capture / "pre_bootloader.log", (line * 900)[:20480], BEGUN + 1)
    record = "".join(sample(time) for time in spread(BEGUN + 10, end - 20, 3))
    put(capture / "kv_tsen_data/20261123_03140", record.encode(), end - 20)
    put_artefacts(capture)
    return capture


def put_properties(capture: Path, properties: dict[str, str]) -> None:
    text = "".join(f"[{key}]: [{value}]\n" for key, value in sorted(properties.items()))
    put(capture / "getprop.txt", text.encode("utf-8", "surrogateescape"), BEGUN)


def put_dropbox(
    capture: Path, tag: str, time: float, text: str, *, folder: str = "dropbox"
) -> None:
    entry = f"{tag}@{int((time - AHEAD) * 1000)}.txt.gz"
    put(capture / folder / entry, gzip.compress(text.encode()), time)


def put_artefacts(capture: Path) -> None:
    crash = "pid: 2718, tid: 2731, name: RenderThread  >>> com.example.{} <<<\nsignal {}, code 1\n"
    signals = (("gallery", "11 (SIGSEGV)"), ("camera", "6 (SIGABRT)"))
    for index, (name, signal) in enumerate(signals):
        time = BEGUN + 140 + 210 * index
        path = capture / "tombstones" / stamp(time, "%Y-%m-%d-%H-%M-%S") / f"tombstone_0{index}"
        text = crash.format(name, signal).encode()
        put(path, text, time)
        put_dropbox(capture, "data_app_crash", time, text.decode())
    time = BEGUN + 262
    name = stamp(time, "%Y-%m-%d-%H-%M-%S")
    trace = b"----- pid 2718 -----\nCmd line: com.example.gallery\n"
    put(capture / "anr" / name / f"anr_{name}", trace, time)
    for state in ("state", "transactions", "transaction_log", "dumpsys_input"):
        put(capture / "anr" / name / state, b"state\n", time)
    put(capture / "Screenshots" / f"Screenshot_{name}.png", b"\x89PNG", time)
    initial = capture / "log_before_initial"
    put(initial / "android_initial.log", logcat(BOOT + 10, BEGUN - 1, 20, "init"), BEGUN - 1)
    put(initial / "event_initial.log", b"", BEGUN)
    put(capture / "recovery/last_log", b"recovery\n", BEGUN)
    end = stamp(BEGUN + LENGTH, "%Y-%m-%d-%H-%M-%S")
    put(capture / f"{end}-BUGREPORT.log", b"== bugreport\n", BEGUN + LENGTH)


def enlarge(capture: Path, mib: int) -> None:
    """Four fifths in the Android log's rotated files, the rest in packets."""
    count = max(1, mib * 4 // 5 // 20)
    long = 6 * 3600 / count
    for path in capture.glob("android.log*"):
        path.unlink()
    for index in range(count + 1):
        first = BEGUN + index * long
        name = f"android.log.{count - index:02}" if index < count else "android.log"
        lines = logcat(first, first + long, long / 360000, "ActivityManager")
        put(capture / name, lines, first + long)
    length = (count + 1) * long
    for index, name in enumerate(RING):
        first = BEGUN + index * length / 3
        last = first + length / 3
        size = mib * 1024 * 1024 // 15
        put(capture / name, packets(first, last, (last - first) / (size / 600), 584), last)


if __name__ == "__main__":
    made = make_capture(Path(sys.argv[1]))
    if len(sys.argv) > 2:
        enlarge(made, int(sys.argv[2]))
    print(made)
