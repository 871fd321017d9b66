"""What the report says of captures that are healthy, odd, hostile and large."""

import os
import random
import shutil
import time
import unittest
from collections.abc import Callable
from pathlib import Path

from fixture import BEGUN, LENGTH, PROPERTIES, logcat, packets, put, put_properties, sample, stamp
from fixture import kernel, spread
from reporting import ReportTest, run

END = BEGUN + LENGTH
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
            ("qsee.log", "00:31:25 – 00:41:30", "1"),
            ("bootloader.log", "00:31:31", "1"),
            (RECORD, "00:31:40 – 00:41:10", "1"),
            ("Tombstones", "00:33:50 – 00:37:20", "2"),
            ("Dropbox entries", "00:33:50 – 00:37:20", "2"),
            ("Initial phase", "11-22 23:08:20 – 00:31:20", "2"),
        )
        for row in expected:
            self.assertEqual(tuple(page.row(row[0])[:3]), row)
        self.assert_says(
            page,
            "UTC+02:00",
            "com.example.gallery, SIGSEGV",
            "Corvex CVX-1",
            "CVX-8.1.0-0142",
            "4.9.65-cvx",
            "MPSS.AT.2.0-00142",
            "1 tag: NFC",
            "msm_therm is the hottest",
            "tz_sensor7 (zone 7), pm8941_tz (zone 12)",
        )

    def test_what_captures_lack_for_good_reasons(self) -> None:
        """A second capture since the device's start, with fewer recorders, of a quiet device."""
        put(self.capture / "pre_bootloader.log", b"", BEGUN)
        (self.capture / "radio.log").unlink()
        put_properties(self.capture, PROPERTIES | {"persist.sys.radio": "no"})
        shutil.rmtree(self.capture / "kv_tsen_data")
        put(self.capture / "fileAfter911", b"", BEGUN)
        (self.parent / "KVBR_1--2026-11-22-10-00-00").mkdir()
        (self.parent / "some_current_file").touch()
        page = self.report()
        self.assertEqual(page.odd, [])
        self.assert_says(page, "Switched off: radio.log.")
        self.assert_says(page, "No thermal record")

    def test_a_thermal_record_goes_on_after_the_capture(self) -> None:
        lines = "".join(sample(time) for time in spread(BEGUN, BEGUN + 3 * LENGTH, 3))
        put(self.capture / RECORD, lines.encode(), BEGUN + 3 * LENGTH)
        page = self.report()
        self.assertEqual(page.odd, [])
        self.assertEqual(page.row(RECORD)[1], "00:31:30 – 01:01:30")

    def test_clocks(self) -> None:
        """Files that have lost their times; a named zone; a kernel that tells the time; no anchor."""
        for path in self.capture.rglob("*"):
            os.utime(path, (1.8e9, 1.8e9))
        page = self.report()
        self.assertEqual(page.odd, [])
        self.assert_says(page, "were not used")
        self.assert_says(page, "counts seconds since the device’s start (0 to 5600)")
        put_properties(self.capture, PROPERTIES | {"persist.sys.timezone": "Europe/Helsinki"})
        line = "6,999,5600000000,-;PM: suspend exit 2026-11-22 22:41:30.000000000 UTC\n"
        put(self.capture / "kernel.log", kernel(END) + line.encode(), 1.8e9)
        page = self.report()
        self.assert_says(page, "persist.sys.timezone is Europe/Helsinki")
        self.assertEqual(page.row("kernel.log")[1], "11-22 23:08:10 – 00:41:30")

    def test_new_year(self) -> None:
        """Lines without a year before and after it belong to the years around the capture."""
        self.capture = self.capture.rename(self.parent / "KVBR_2--2026-12-31-23-55-00_current")
        new_year = BEGUN + 39 * 86400 - 1890
        for path in (
            p for p in self.capture.iterdir() if p.name not in ("getprop.txt", "versionNumber")
        ):
            shutil.rmtree(path) if path.is_dir() else path.unlink()
        put_properties(
            self.capture, {"ro.build.ota.versionname": PROPERTIES["ro.build.ota.versionname"]}
        )
        put(
            self.capture / "android.log",
            logcat(new_year - 300, new_year + 300, 1, "init"),
            new_year + 300,
        )
        record = "".join(sample(time) for time in spread(new_year - 300, new_year + 300, 3))
        put(self.capture / "kv_tsen_data/x", record.encode(), new_year + 300)
        page = self.report()
        self.assertEqual(page.odd, [])
        self.assertEqual(page.row("android.log")[1], "23:55:00 – 01-01 00:05:00")
        self.assertEqual(page.row("kv_tsen_data/x")[1], "23:55:00 – 01-01 00:05:00")


class OddTest(ReportTest):
    """Each oddity alone in a capture: it is told, and nothing else is."""

    def odd(self, spoil: Callable[[], object], *expected: str, as_user: bool = False) -> None:
        with self.subTest(expected=expected):
            shutil.rmtree(self.parent)
            self.setUp()
            spoil()
            self.assertEqual(self.report(as_user).odd, list(expected))

    def write(self, name: str, data: bytes, time: float = END) -> None:
        put(self.capture / name, data, time)

    def write_android(self, spans: tuple[tuple[float, float], ...]) -> None:
        lines = [logcat(BEGUN + first, BEGUN + last, 1, "init") for first, last in spans]
        self.write("android.log", b"".join(lines))
        for name in ("android.log.01", "android.log.02"):
            (self.capture / name).unlink()

    def cut(self, name: str, length: int) -> None:
        path = self.capture / name
        self.write(name, path.read_bytes()[:-length], path.stat().st_mtime + 7200)

    def test_recorders(self) -> None:
        self.odd(
            lambda: (self.capture / "event.log").unlink(),
            "event.log does not exist although persist.sys.event is yes.",
        )
        self.odd(
            lambda: self.write("radio.log", b""), "radio.log is empty: its recorder wrote nothing."
        )
        self.odd(lambda: self.write("tcpdump2", packets(0, -1, 1)), "tcpdump2 holds no packet.")
        self.odd(
            lambda: (self.capture / "android.log.01").unlink(),
            "android.log.01 is missing from the series of android.log.",
        )
        self.odd(
            lambda: (self.capture / "tcpdump0").unlink(),
            "tcpdump0 is missing from the series of tcpdump.",
        )
        self.odd(
            lambda: self.write("kernel.log.3", kernel(END - 9)),
            "kernel.log.1, kernel.log.2 are missing from the series of kernel.log.",
        )

    def test_endings(self) -> None:
        self.odd(lambda: self.cut("android.log", 5), "android.log ends in the middle of a line.")
        self.odd(
            lambda: self.cut("tcpdump0", 50),
            "tcpdump0 ends 86 bytes into a packet that is not whole.",
        )
        self.odd(
            lambda: self.write("kernel.log", kernel(END) + bytes(512)),
            "kernel.log ends in 512 zero bytes, as after a power cut.",
        )
        self.odd(
            lambda: self.cut(RECORD, 9),
            "The thermal record 20261123_03140 ends in the middle of a line.",
        )

    def test_silences_and_steps_of_the_clock(self) -> None:
        def android(*spans: tuple[float, float]) -> Callable[[], None]:
            return lambda: self.write_android(spans)

        self.odd(
            android((0, 100), (401, 600)),
            "android.log is silent for 5 min 1 s, from 00:33:10 to 00:38:11.",
        )
        self.odd(
            android((0, 299)),
            "android.log ends at 00:36:29, 5 min 1 s before the last of the other recordings.",
        )
        self.odd(
            android((0, 400), (150, 600)),
            "android.log: the clock goes back by 4 min 10 s, from 00:38:10 to 00:34:00.",
        )
        self.odd(android((-86400 * 40, -86400 * 40 + 9), (0, 600)))  # a clock that was set before

    def test_the_thermal_record(self) -> None:
        def record(without: int, pause: float = 3) -> Callable[[], object]:
            times = [BEGUN + 10 + 3 * i for i in range(60)]
            times += [times[-1] + pause + 3 * i for i in range(60)]
            lines = [sample(t, ("pa_therm0",) if i < without else ()) for i, t in enumerate(times)]
            return lambda: self.write(RECORD, "".join(lines).encode(), times[-1])

        name = "The thermal record 20261123_03140"
        self.odd(record(0))
        self.odd(record(2), f"{name} lacks pa_therm0 in 2 of 120 samples.")
        self.odd(record(0, 45), f"{name} pauses for 45 s, from 00:34:37 to 00:35:22.")

    def test_files_and_marks(self) -> None:
        marked = "KVBR_1--2026-11-22-10-00-00_current"
        self.odd(
            lambda: (self.parent / marked).mkdir(),
            f"{marked} beside it is marked as current, too: only the newest should be.",
        )
        self.odd(
            lambda: (self.capture / "anr/passwd").symlink_to("/etc/passwd"),
            "anr/passwd is a link and was not looked into.",
        )
        self.odd(
            lambda: os.mkfifo(self.capture / "qsee.log.1"),
            "qsee.log.1 is no regular file and was not looked into.",
        )
        self.odd(
            lambda: self.write("dropbox/x", b""),
            "dropbox/x is empty: its source was empty, or gone when it was copied.",
        )
        self.odd(
            lambda: (self.capture / "getprop.txt").unlink(),
            "There are no properties in getprop.txt, so nothing is known of the switches.",
        )
        version = b"CVX-8.1.0-0141".ljust(92, b"\0")
        self.odd(
            lambda: self.write("versionNumber", version),
            "versionNumber says “CVX-8.1.0-0141”, the property ro.build.ota.versionname “CVX-8.1.0-0142”.",
        )
        self.odd(
            lambda: (self.capture / "tz.log").chmod(0), "tz.log may not be read.", as_user=True
        )


class HostileTest(ReportTest):
    def test_names_and_texts_do_no_harm(self) -> None:
        evil = '"><script>alert(1)</script><img src=x>&'
        names = [
            evil.replace("/", "|"),
            "a\nb",
            "\u202egnp.exe",
            os.fsdecode(b"\xff\xfe"),
            "x" * 250,
        ]
        for name in names:
            put(self.capture / "tombstones" / name / name, f">>> {evil} <<<\n".encode(), BEGUN)
        put_properties(
            self.capture,
            PROPERTIES
            | {
                "ro.product.model": "</style><script>",
                "debug.\udcff": evil,
                "persist.sys.timezone": "../../etc",
            },
        )
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
        start = time.monotonic()
        self.report()
        self.assertLess(time.monotonic() - start, 10)

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
        page = self.report()
        self.assertEqual(
            page.odd,
            [
                "android.log is silent for 5 min 20 s, from 00:34:50 to 00:40:10.",
                "tcpdump1 ends 915 bytes into a packet that is not whole.",
            ],
        )
        self.assert_says(page, "2 large files were read in part")


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
