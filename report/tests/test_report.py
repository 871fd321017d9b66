"""What the report says of captures that are healthy, odd, hostile and large."""

import gzip
import os
import random
import resource
import shutil
import time
import unittest
import zlib
from collections.abc import Callable
from pathlib import Path

from fixture import (
    AHEAD,
    BEGUN,
    LENGTH,
    PROPERTIES,
    logcat,
    packets,
    put,
    put_properties,
    sample,
    stamp,
)
from fixture import RING, kernel, spread
from reporting import Page, ReportTest, run

END = BEGUN + LENGTH
DAY = 86400
RECORD = "kv_tsen_data/20261123_03140"


class HealthyTest(ReportTest):
    def test_nothing_odd_and_every_recording_in_its_time(self) -> None:
        page = self.report()
        self.assertEqual(page.odd, [])
        expected = (
            # The oldest of the rotated files comes first, .02; the ring of packets begins with 1.
            ("android.log", "00:31:10 – 00:41:29", "3"),
            ("tcpdump", "00:33:00 – 00:41:25", "3"),
            ("radio.log", "00:30:30 – 00:39:50", "1"),
            # Counted from the device's start, at 00:08:10 before midnight less 5000 seconds.
            ("kernel.log", "11-22 23:08:10 – 00:41:30", "1"),
            ("bootloader.log", "00:31:31", "1"),
            (RECORD, "00:31:40 – 00:41:10", "1"),
            ("Tombstones", "00:33:50 – 00:37:20", "2"),
            ("Dropbox entries", "00:33:50 – 00:37:20", "2"),
            ("Initial phase", "11-22 23:08:20 – 00:31:20", "2"),
        )
        for row in expected:
            self.assertEqual(tuple(page.row(row[0])[:3]), row)
        told = "UTC+02:00; com.example.gallery, SIGSEGV; Corvex CVX-1; CVX-8.1.0-0142; 4.9.65-cvx; "
        told += "MPSS.AT.2.0-00142; 1 tag: NFC; msm_therm is the hottest; "
        told += "tz_sensor7 (zone 7), pm8941_tz (zone 12)"
        self.assert_says(page, *told.split("; "))

    def test_what_captures_lack_for_good_reasons(self) -> None:
        """A second capture since the device's start, with fewer recorders, of a quiet device. A core
        is off for a while, and the thermal record goes on after the capture."""
        put(self.capture / "pre_bootloader.log", b"", BEGUN)
        (self.capture / "radio.log").unlink()
        put_properties(self.capture, PROPERTIES | {"persist.sys.radio": "no"})
        lines = [sample(BEGUN + 3 * i, ("cpu1",) if i < 9 else ()) for i in range(LENGTH)]
        put(self.capture / RECORD, "".join(lines).encode(), BEGUN + 3 * LENGTH)
        put(self.capture / "fileAfter911", b"", BEGUN)
        (self.parent / "KVBR_1--2026-11-22-10-00-00").mkdir()
        (self.parent / "some_current_file").touch()
        for empty in ("dropbox/a@1.txt.lost", "anr/a@1.txt.lost", "anr/2026-11-23-00-35-52/state"):
            put(self.capture / empty, b"", BEGUN)
        for early in ("traces.txt", f"data_app_anr@{int(BEGUN - 7260)}000.txt.gz"):
            text = gzip.compress(b"text") if early.endswith(".gz") else b"text"
            put(self.capture / "anr" / early, text, BEGUN + 5)
        unset = b"6,9,9000,-;rtc: setting system clock to 1970-01-01 00:00:07 UTC (7)\n"
        put(self.capture / "kernel.log", unset + kernel(END), END)
        put(self.capture / "kmsg/last_kmsg", b"[ 99999.0] other start\n", END + 5)
        page = self.report()
        self.assertEqual(page.odd, [])
        self.assertEqual(page.row("From before the capture")[1], "00:30:30")
        self.assertEqual(page.row("Kernel logs of earlier boots")[1], "")
        self.assertEqual(page.row("kernel.log")[1], "11-22 23:08:10 – 00:41:30")
        self.assert_says(page, "Switched off: radio.log.")
        self.assertEqual(page.row(RECORD)[1], "00:31:30 – 01:01:27")

    def test_clocks(self) -> None:
        """Files that have lost their times; a named zone; a kernel that tells the time; no anchor."""
        for path in self.capture.rglob("*"):
            os.utime(path, (1.8e9, 1.8e9))
        page = self.report()
        self.assertEqual(page.odd, [])
        relative = "counts seconds since the device’s start (0 to 5600)"
        self.assert_says(page, "were not used", relative)
        whole = (self.capture / "tz.log").read_bytes()
        put(self.capture / "tz.log", whole + bytes(600000), 1.8e9)
        self.assert_says(self.report(), " on), which is not known in time of day")
        put(self.capture / "tz.log", whole, 1.8e9)
        put_properties(self.capture, PROPERTIES | {"persist.sys.timezone": "Europe/Helsinki"})
        line = "6,999,5600000000,-;PM: suspend exit 2026-11-22 22:41:30.000000000 UTC\n"
        put(self.capture / "kernel.log", kernel(END) + line.encode(), 1.8e9)
        page = self.report()
        self.assert_says(page, "persist.sys.timezone is Europe/Helsinki")
        self.assertEqual(page.row("kernel.log")[1], "11-22 23:08:10 – 00:41:30")

    def test_a_stale_log_and_a_piece_without_packets(self) -> None:
        """Neither says anything of when it is, or how far ahead of UTC."""
        os.utime(self.capture / "radio.log", (END - AHEAD - 361,) * 2)
        (self.capture / "event.log").unlink()
        for old in self.capture.glob("android.log.0?"):
            old.unlink()
        put(self.capture / "tcpdump1", packets(0, -1, 1), BEGUN - DAY)
        page = self.report()
        self.assert_says(page, "UTC+02:00 (the logs’ last lines against the times of their files)")
        self.assertEqual(page.row("tcpdump")[1], "00:35:50 – 00:41:25")

    def test_new_year_and_summer_time(self) -> None:
        """Lines without a year belong to the years around the capture; an hour may come twice, or
        never, while the packets tell of what did pass."""
        new_year, autumn, spring = BEGUN + 39 * DAY - 1890, BEGUN - 29 * DAY, BEGUN - 239 * DAY
        for midnight, parts, ahead in (
            (new_year, [(-300, 300)], 7200),
            (autumn, [(9000, 12509), (8910, 9600)], 7200),
            (spring, [(7800, 8909), (12510, 13110)], 10800),
        ):
            spans = [(midnight + first, midnight + last) for first, last in parts]
            end = spans[-1][1]
            passed = sum(last - first for first, last in spans) + len(spans) - 1
            times = [time for span in spans for time in spread(*span, 3)]
            utc = end - ahead - passed, end - ahead
            files = {
                "android.log": b"".join(logcat(*span, 1, "init") for span in spans),
                "kv_tsen_data/x": "".join(map(sample, times)).encode(),
                "tcpdump0": packets(utc[0] + 7200, utc[1] + 7200, 1),
            }
            page = self.bare(spans[0][0], end - ahead + 7200, files)
            self.assertEqual(page.odd, [])
            self.assertEqual(page.row("android.log")[1], page.row("tcpdump")[1])

    def test_a_device_that_sleeps(self) -> None:
        """Nine hours, awake in one minute of twenty: no log is blamed for what all of them miss."""
        awake = [BEGUN + 1200 * i for i in range(28)]
        end = awake[-1] + 60

        def written(form: Callable[[float, float], bytes], missed: tuple[int, ...] = ()) -> bytes:
            return b"".join(form(t, t + 60) for i, t in enumerate(awake) if i not in missed)

        def lines(first: float, last: float) -> bytes:
            return logcat(first, last, 5, "init")

        def samples(first: float, last: float) -> bytes:
            return "".join(map(sample, spread(first, last, 3))).encode()

        files = {
            "android.log": written(lines),
            "event.log": written(lines),
            "radio.log": written(lines, tuple(range(1, 27, 2))),
            "kernel.log": kernel(BEGUN + 28 * 60),
            "kv_tsen_data/x": written(samples),
        }
        page = self.bare(BEGUN, end, files)
        self.assertEqual(page.odd, [])
        files |= {"android.log": written(lines, (5, 9)), "kv_tsen_data/x": written(samples, (7,))}
        times = "for more than 5 min, the longest 39 min from 01:52:30 to 02:31:30"
        odd = [
            f"android.log is silent 2 times {times}.",
            "The thermal record x pauses for 39 min, from 02:32:30 to 03:11:30.",
        ]
        self.assertEqual(self.bare(BEGUN, end, files).odd, odd)


class OddTest(ReportTest):
    """Each oddity alone in a capture: it is told, and nothing else is."""

    def odd(self, expected: str, spoil: Callable[..., object], *arguments: object) -> None:
        with self.subTest(expected=expected):
            shutil.rmtree(self.parent)
            self.setUp()
            spoil(*arguments)
            self.assertEqual("\n".join(self.report().odd), expected)

    def write(self, name: str, data: bytes, time: float = END) -> None:
        put(self.capture / name, data, time)

    def remove(self, name: str) -> None:
        (self.capture / name).unlink()

    def rename(self, name: str) -> None:
        self.capture = self.capture.rename(self.parent / name)

    def cut(self, name: str, length: int) -> None:
        path = self.capture / name
        self.write(name, path.read_bytes()[:-length], path.stat().st_mtime + 7200)

    def hide(self, name: str) -> None:
        (self.capture / name).chmod(0)

    def test_recorders_and_endings(self) -> None:
        def no_packets() -> None:
            for name in RING:
                self.write(name, packets(0, -1, 1), BEGUN)

        self.odd("\n".join(f"tcpdump{i} holds no packet." for i in range(3)), no_packets)
        self.odd("tz.log is empty: its recorder wrote nothing.", self.write, "tz.log", b"", BEGUN)
        self.odd("tz.log does not exist although persist.sys.tz is yes.", self.remove, "tz.log")
        self.odd("tcpdump0 is missing from the series of tcpdump.", self.remove, "tcpdump0")
        series = "kernel.log.1, kernel.log.2 are missing from the series of kernel.log."
        self.odd(series, self.write, "kernel.log.3", kernel(END - 9))
        zeros = "kernel.log ends in 512 zero bytes, as after a power cut."
        self.odd(zeros, self.write, "kernel.log", kernel(END) + bytes(512))
        self.odd("radio.log ends in the middle of a line.", self.cut, "radio.log", 5)
        packet = "tcpdump0 ends 86 bytes into a packet that is not whole."
        self.odd(packet, self.cut, "tcpdump0", 50)
        sample = "The thermal record 20261123_03140 ends in the middle of a line."
        self.odd(sample, self.cut, RECORD, 9)

    def test_silences_and_steps_of_the_clock(self) -> None:
        def android(*spans: tuple[float, float]) -> None:
            lines = [logcat(BEGUN + first, BEGUN + last, 1, "init") for first, last in spans]
            self.write("android.log", b"".join(lines))
            for name in ("android.log.01", "android.log.02"):
                self.remove(name)

        silent = "android.log is silent for 5 min 1 s, from 00:33:10 to 00:38:11."
        self.odd(silent, android, (0, 100), (401, 600))
        early = "ends at 00:36:29, 5 min 1 s before the last of the other recordings."
        self.odd(f"android.log {early}", android, (0, 299))
        back = "android.log: the clock goes back by 4 min 10 s, from 00:38:10 to 00:34:00."
        self.odd(back, android, (0, 400), (150, 600))
        self.odd("", android, (-DAY * 40, -DAY * 40 + 9), (0, 600))  # a clock that was set before

    def test_the_thermal_record(self) -> None:
        def record(without: int, pause: float = 3) -> None:
            times = [BEGUN + 10 + 3 * i for i in range(60)]
            times += [times[-1] + pause + 3 * i for i in range(60)]
            lines = [sample(t, ("pa_therm0",) if i < without else ()) for i, t in enumerate(times)]
            self.write(RECORD, "".join(lines).encode(), times[-1])

        name = "The thermal record 20261123_03140"
        self.odd(f"{name} lacks pa_therm0 in 2 of 120 samples.", record, 2)
        self.odd(f"{name} pauses for 45 s, from 00:34:37 to 00:35:22.", record, 0, 45)

    def test_files_and_marks(self) -> None:
        def no_files() -> None:
            (self.capture / "anr/passwd").symlink_to("/etc/passwd")
            os.mkfifo(self.capture / "qsee.log.1")

        link = "anr/passwd is a link and was not looked into."
        self.odd(f"{link}\nqsee.log.1 is no regular file and was not looked into.", no_files)
        self.odd("tz.log may not be read.", self.hide, "tz.log")
        marked = "KVBR_1--2026-11-22-10-00-00_current"
        second = f"{marked} beside it is marked as current, too: only the newest should be."
        self.odd(second, lambda: (self.parent / marked).mkdir())
        empty = "dropbox/x is empty: its source was empty, or gone when it was copied."
        self.odd(empty, self.write, "dropbox/x", b"")
        nothing = "There are no properties in getprop.txt, so nothing is known of the switches."
        self.odd(nothing, self.remove, "getprop.txt")
        versions = "versionNumber says “1”, the property ro.build.ota.versionname “CVX-8.1.0-0142”."
        self.odd(versions, self.write, "versionNumber", b"1".ljust(92, b"\0"))
        unset = "Its name is of 1970: the clock had not been set when it was begun."
        self.odd(unset, self.rename, "KVBR_2--1970-01-01-00-00-30_current")


class HostileTest(ReportTest):
    def test_names_and_texts_do_no_harm(self) -> None:
        evil = '"><script>alert(1)</script><img src=x>&'
        names = ["a\nb", "\u202egnp.exe", os.fsdecode(b"\xff\xfe"), "x" * 250]
        for name in (evil.replace("/", "|"), *names):
            put(self.capture / "tombstones" / name / name, f">>> {evil} <<<\n".encode(), BEGUN)
        bad = {"ro.product.model": "</style><script>", "persist.sys.timezone": "../../etc"}
        put_properties(self.capture, PROPERTIES | bad | {"debug.\udcff": evil})
        page = self.report()
        self.assertNotIn("script", page.tags)
        self.assertNotIn("img", page.tags)
        self.assertNotIn("\u202e", page.html)
        for text in (evil, "a\\x0ab", "\\u202egnp.exe", "\\xff\\xfe", "Corvex </style><script>"):
            self.assert_says(page, text)

    def test_what_could_take_for_ever(self) -> None:
        """What a search that knows no limits would get lost in."""
        noise = random.Random(8)
        put(self.capture / "kernel.log", b"[    1.0] " + b"suspend 2026-11-23 " * 30000, END)
        put(self.capture / "tz.log", b"1" * 2**21 + b"\n" + b"[" * 2**21, END)
        lines = logcat(BEGUN, BEGUN + 9, 1, "init") + b"x" * 2**21 + logcat(END, END, 1, "init")
        put(self.capture / "android.log", lines, END)
        put(self.capture / "qsee.log", b"[1.5] x\n" + b"[9999999999.5] x\n", 2**40)
        put(self.capture / "getprop.txt", b"[" + b"]: [" * 2**19, BEGUN)
        put(self.capture / "tcpdump0", packets(BEGUN, BEGUN + 9, 1) + noise.randbytes(2**24), END)
        put(self.capture / "tombstones/x", b">>> " * 2**20, END)
        packer = zlib.compressobj(wbits=31)
        bomb = b"".join(packer.compress(bytes(2**20)) for _ in range(1024)) + packer.flush()
        for name in ("dropbox/data_app_crash@1.txt.gz", "dropbox/SYSTEM_LAST_KMSG@1.txt.gz"):
            put(self.capture / name, bomb, END)
        put(self.capture / "event.log", b"x am_crash: [" * 9999 + b"x" * 50 * 2**20, END)
        os.mkfifo(self.capture / "anr/traces.txt")
        start = time.monotonic()
        page = self.report()
        self.assertIn("anr/traces.txt is no regular file and was not looked into.", page.odd)
        self.assertLess(time.monotonic() - start, 15)
        most = resource.getrusage(resource.RUSAGE_CHILDREN).ru_maxrss
        self.assertLess(most, 200 * 1024)

    def test_any_bytes_in_any_file(self) -> None:
        noise = random.Random(8)
        paths = [path for path in self.capture.rglob("*") if path.is_file()]
        for _ in range(12):
            for path in paths:
                data = bytearray(path.read_bytes()[:20000])
                for _ in range(len(data) // 200):
                    data[noise.randrange(len(data))] = noise.randrange(256)
                put(path, bytes(data), BEGUN + noise.randrange(LENGTH))
            self.report()
        for path in paths:
            put(path, noise.randbytes(3000), BEGUN)
        self.assertIn("android.log ends in the middle of a line.", self.report().odd)


class LargeTest(ReportTest):
    def test_a_file_read_in_part_shows_its_silence_and_its_end(self) -> None:
        for name in ("android.log.01", "android.log.02"):
            (self.capture / name).unlink()
        lines = logcat(BEGUN, BEGUN + 200, 0.004, "init") + logcat(BEGUN + 520, END, 0.004, "init")
        put(self.capture / "android.log", lines, END)
        put(self.capture / "tcpdump1", packets(BEGUN + 90, BEGUN + 255, 0.02, 900)[:-1], END)
        lines = logcat(BEGUN, END - 200, 0.02, "am_pause") + bytes(20000)
        put(self.capture / "event.log", lines, END)
        page = self.report()
        odd = [
            "android.log is silent for 5 min 20 s, from 00:34:50 to 00:40:10.",
            "event.log ends in 20000 zero bytes, as after a power cut.",
            "tcpdump1 ends 915 bytes into a packet that is not whole.",
        ]
        self.assertEqual(page.odd, odd)
        self.assertEqual(page.row("event.log")[1], "00:31:30 – 00:41:30")
        self.assert_says(page, "2 large files were read in part")
        lines = packets(BEGUN, BEGUN + 8 * DAY, 300, 900)
        page = self.bare(BEGUN, BEGUN + 8 * DAY, {"tcpdump0": lines})
        self.assertEqual(page.odd, [])
        self.assertEqual(page.row("tcpdump")[1], "00:31:30 – 12-01 00:31:30")


class CommandLineTest(ReportTest):
    def test_outputs_and_errors(self) -> None:
        done = run(self.capture, cwd=self.directory)
        self.assertEqual(
            (done.returncode, done.stdout, done.stderr), (0, self.capture.name + ".html\n", "")
        )
        self.assertIn("<title>KVBR_2--", (self.directory / done.stdout.strip()).read_text())
        other = self.capture.rename(self.parent / "capture of tuesday")
        done = run(other, "-o", self.directory / "page")
        self.assertEqual(done.returncode, 0)
        self.assertIn("does not look like a log directory", done.stderr)
        for status, text, *arguments in (
            (1, "No such file or directory", self.directory / "none"),
            (1, "Not a directory", other / "getprop.txt"),
            (1, "No such file or directory", other, "-o", self.directory / "none/page"),
            (2, "usage: corvex-report"),
            (2, "unrecognized arguments", other, "-x"),
        ):
            done = run(*(str(argument) for argument in arguments))
            self.assertEqual((done.returncode, done.stdout), (status, ""))
            self.assertIn(text, done.stderr)
            self.assertTrue(status == 2 or done.stderr.count("\n") == 1, done.stderr)
