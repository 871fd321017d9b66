"""What is found to have gone wrong, and what is not."""

import json
import os
import shutil
from typing import Any

from fixture import BEGUN, BOOT, LENGTH, PROPERTIES, logcat, put, put_dropbox, put_properties, stamp
from reporting import ReportTest, run
from trouble import ABORTED, BARK, DROPPED, HUNG, JAVA, NATIVE, OOPS, PANIC, TRACE
from trouble import dmesg, kmsg, lines, logged, put_log, trouble

END = BEGUN + LENGTH
NULL = "Unable to handle kernel NULL pointer dereference at virtual address 00000008"


def brief(incident: dict[str, Any]) -> tuple[Any, ...]:
    return tuple(incident[name] for name in ("kind", "process", "where", "count"))


class IncidentTest(ReportTest):
    def setUp(self) -> None:
        super().setUp()
        self.calm()

    def found(self) -> list[tuple[Any, ...]]:
        return [brief(incident) for incident in self.incidents()]

    def android(self, *parts: bytes) -> None:
        put_log(self.capture / "android.log", *parts)

    def kernel(self, *parts: bytes) -> None:
        put(self.capture / "kernel.log", b"".join(parts) + kmsg(END - BOOT, "text"), END)


class KindsTest(IncidentTest):
    def test_each_kind_once_however_many_tell_of_it(self) -> None:
        trouble(self.capture)
        found = self.incidents()
        hwui = "/system/lib64/libhwui.so (gallery::Layer::draw()+24)"
        stuck = "com.android.server.am.Stuck.hold(Stuck.java:7)"
        expected = [
            ("kernel-panic", "kworker/2:1", "cvx_panel_off", 1),
            ("system-restart", "system_server", stuck, 1),
            ("hung-task", "mmcqd/0", "mmc_wait_for_req", 1),
            ("lockup", None, None, 1),
            ("native-crash", "com.example.gallery", hwui, 1),
            ("java-crash", "com.example.mail", "com.example.mail.Inbox.open(Inbox.java:42)", 1),
            ("anr", "com.example.maps", "com.example.maps.Tiles.get(Tiles.java:88)", 1),
            ("overheating", None, "tz_sensor3", 1),
            ("out-of-memory", "m.example.home", None, 1),
            ("out-of-memory", "big", None, 1),
            ("abnormal-boot", None, None, 1),
        ]
        self.assertEqual([brief(one) for one in found], expected)
        reasons = {one["kind"]: one["reason"] for one in found}
        self.assertEqual(reasons["kernel-panic"], f"Fatal exception ({NULL})")
        self.assertIn("tz_sensor3 reached 101.5 °C, over its limit of 95 °C", reasons.values())
        crash = found[4]
        self.assertEqual((crash["first"], crash["last"]), ("2026-11-23T00:32:20",) * 2)
        self.assertEqual(len(crash["files"]), 2)
        for mention in crash["lines"]:
            text = (self.capture / mention["file"]).read_text().split("\n")[mention["line"] - 1]
            self.assertRegex(text, "Fatal signal|>>> com.example.gallery|am_crash")
        self.assertEqual(len(crash["lines"]), 3)
        self.assertIsNone(found[-1]["first"])

    def test_the_same_again_and_something_else(self) -> None:
        """Numbers in a reason make no difference; ten seconds, a process and a place do."""

        def crash(time: float, pid: int, text: str = NATIVE) -> bytes:
            return lines(time, 9000, "F DEBUG", text.replace("2718", str(pid)))

        other = NATIVE.replace("com.example.gallery", "com.example.maps")
        self.android(
            crash(BEGUN + 1, 11),
            crash(BEGUN + 8, 11),
            crash(BEGUN + 9, 12, NATIVE.replace("0x18", "0x7f20")),
            crash(BEGUN + 40, 13),
            crash(BEGUN + 41, 14, other),
            crash(BEGUN + 42, 15, NATIVE.replace("draw", "hide")),
        )
        found = self.incidents()
        self.assertEqual([one["count"] for one in found], [3, 1, 1])
        times = ("2026-11-23T00:31:31", "2026-11-23T00:32:10")
        self.assertEqual((found[0]["first"], found[0]["last"]), times)

    def test_what_is_none(self) -> None:
        put(self.capture / "tombstones/2026-11-23-00-33-00/tombstone_00", b"", BEGUN)
        put(self.capture / "dropbox/data_app_crash@1795386690000.txt.lost", b"", 0)
        dumps = {name: TRACE.encode() for name in ("state", "transactions", "dumpsys_input")}
        for name, text in dumps.items():
            put(self.capture / "anr/2026-11-23-00-33-00" / name, text, BEGUN)
        put_dropbox(self.capture, "data_app_wtf", BEGUN, JAVA)
        quotes = logged("quotes.txt")
        put(self.capture / "2026-11-23-00-41-30-BUGREPORT.log", quotes + NATIVE.encode(), END)
        put_properties(self.capture, PROPERTIES | {"debug.x": "Kernel panic - not syncing: x"})
        self.android(quotes, lines(BEGUN, 1, "I lowmemorykiller", "Killing 'x' (7), adj 900"))
        died = lines(BEGUN, 911, "I am_proc_died", "[0,1,x,0,2]")
        put_log(self.capture / "event.log", died, lines(BEGUN, 911, "I am_kill", "[0,1,x,0,y]"))
        quoted = b"14,1,9000000,-;Kernel panic - not syncing: an application wrote it\n"
        quoted += kmsg(10, "Kernel command line: panic=5 Kernel panic - not syncing: x")
        self.kernel(quoted, kmsg(11, "init: starting BUG: soft lockup"))
        self.assertEqual(self.incidents(), [])
        self.assertIn("Nothing went wrong", self.report().text)


class SourcesTest(IncidentTest):
    def test_places(self) -> None:
        """Past the machinery of dying, into the root cause; a text is judged by what it holds."""
        where = "/vendor/lib64/libqueue.so (Queue::push(int)+112)"
        put(self.capture / "tombstones/2026-11-23-00-33-00/tombstone_01", ABORTED.encode(), END)
        put_dropbox(self.capture, "data_app_crash", END, NATIVE)
        bare = NATIVE.replace(" (gallery::Layer::draw()+24)", "").replace("gallery", "bare")
        put_dropbox(self.capture, "SYSTEM_TOMBSTONE", END, bare)
        server = DROPPED.replace("com.example.mail", "system_server", 1)
        put_dropbox(self.capture, "system_server_crash", END, server)
        inbox = "com.example.mail.Inbox.open(Inbox.java:42)"
        gallery = "/system/lib64/libhwui.so (gallery::Layer::draw()+24)"
        expected = [
            ("system-restart", "system_server", inbox, 1),
            ("native-crash", "/vendor/bin/camera", where, 1),
            ("native-crash", "com.example.bare", "/system/lib64/libhwui.so+0x4a1c8", 1),
            ("native-crash", "com.example.gallery", gallery, 1),
        ]
        found = self.incidents()
        self.assertEqual(sorted(map(brief, found), key=str), sorted(expected, key=str))
        abort = next(one for one in found if one["process"] == "/vendor/bin/camera")
        self.assertEqual(abort["reason"], "SIGABRT: queue of 7 buffers at 0x7f12 is full")

    def test_forms_of_the_kernel_log(self) -> None:
        """logcat takes the beginning of a line for a tag, and has no process for it."""
        texts = (HUNG + OOPS).splitlines() + ["BUG: soft lockup - CPU#1 stuck for 22s! [x:9]"]
        log = b"".join(lines(BEGUN + i / 100, 0, "I -", text) for i, text in enumerate(texts))
        log = log.replace(b"I -       : INFO: ", b"I INFO    : ")
        log = log.replace(b"I -       : BUG: ", b"I BUG     : ")
        put(self.capture / "kernel.log", log.replace(b"I -       :", b"I         :"), END)
        expected = [
            ("hung-task", "mmcqd/0", "mmc_wait_for_req", 1),
            ("kernel-oops", "kworker/2:1", "cvx_panel_off", 1),
            ("lockup", "x", None, 1),
        ]
        self.assertEqual(self.found(), expected)

    def test_the_system_server_and_other_forms_of_lines(self) -> None:
        """logcat -v time has no thread; vendors put more before a kernel's message."""
        at = stamp(BEGUN + 30, "%m-%d %H:%M:%S.000")
        signal = "Fatal signal 6 (SIGABRT), code -6 in tid 930 (android.bg)"
        server = ABORTED.replace("/vendor/bin/camera", "system_server").replace("3001", "911")
        exit = "Exit zygote because system server (911) has terminated"
        dumped = "".join(f"{at} F/DEBUG   ( 9000): {line}\n" for line in server.splitlines())
        self.android(
            f"{at} F/libc    (  911): {signal}\n{dumped}".encode(),
            lines(BEGUN + 33, 498, "E Zygote", exit),
        )
        log = lines(BEGUN + 60, 0, "I -", f"<0>[ 5123.456] (2)[9:x]{PANIC.replace('Fatal', 'Bad')}")
        put(self.capture / "boot_log/kernel_boot.log", log, END)
        queue = "/vendor/lib64/libqueue.so (Queue::push(int)+112)"
        expected = [("kernel-panic", None, None, 1), ("system-restart", "system_server", queue, 1)]
        self.assertEqual(self.found(), expected)

    def test_earlier_boots_have_their_own_times_or_none(self) -> None:
        told = "rtc: setting system clock to 2026-11-20 10:00:00 UTC (1795168800)\n"
        put(self.capture / "recovery/last_kmsg", dmesg(8, told) + dmesg(70, OOPS + PANIC), END)
        put(self.capture / "kmsg/console", dmesg(900, BARK) + dmesg(910, "x\n"), END)
        put(self.capture / "recovery/console", dmesg(900, BARK) + dmesg(910, "x\n"), END)
        crash = lines(BEGUN - 86400, 9, "F DEBUG", NATIVE)
        put(self.capture / "boot_log/android_boot.log.pre", crash, END)
        put(self.capture / "anr/traces.txt", TRACE.format(time="2026-11-19 08:09:10").encode(), END)
        put_dropbox(self.capture, "data_app_crash", BEGUN - 3600, DROPPED, folder="anr")
        put(self.capture / "anr/SYSTEM_LAST_KMSG@1795386000000.txt", dmesg(5, HUNG), END)
        times = [(one["kind"], one["count"], one["first"]) for one in self.incidents()]
        expected = [
            ("kernel-panic", 1, "2026-11-20T12:01:02"),
            ("lockup", 1, None),
            ("hung-task", 1, None),
            ("native-crash", 1, "2026-11-22T00:31:30"),
            ("java-crash", 1, "2026-11-22T23:31:30"),
            ("anr", 1, "2026-11-19T08:09:10"),
        ]
        self.assertEqual(sorted(times, key=str), sorted(expected, key=str))


class FormsTest(IncidentTest):
    def test_one_json_line_for_each(self) -> None:
        trouble(self.capture)
        done = run("--ndjson", self.capture)
        rows = [json.loads(line) for line in done.stdout.splitlines()]
        self.assertEqual(len(rows), 11)
        names = "capture begin build kind process reason where count first last".split()
        self.assertEqual(list(rows[0]), names)
        self.assertEqual(rows[0]["build"], PROPERTIES["ro.build.fingerprint"])
        self.assertEqual(rows[0]["begin"], "2026-11-23T00:31:30")

    def test_several_captures(self) -> None:
        trouble(self.capture)
        other = self.parent / "KVBR_1--2026-11-22-10-00-00"
        shutil.copytree(self.capture, other)
        (other / "getprop.txt").unlink()
        hidden = self.parent / "KVBR_3--2026-11-24-10-00-00"
        hidden.mkdir(mode=0)
        documents = json.loads(run("--json", self.parent).stdout)
        self.assertEqual([len(one["incidents"]) for one in documents], [10, 11, 0])
        self.assertIn("cannot be read", documents[2]["completeness"][0])
        index = self.directory / "index.html"
        done = run(self.parent, "-o", index)
        self.assertEqual((done.returncode, done.stderr), (0, ""))
        text = index.read_text()
        for name in (self.capture.name, other.name):
            self.assertIn(f'href="{name}.html"', text)
            self.assertTrue((self.directory / f"{name}.html").is_file())
        shared = text[text.index("In several captures") :]
        self.assertEqual(shared.count('class="incident"'), 10)
        os.chmod(hidden, 0o700)

    def test_merged(self) -> None:
        """By time, one line a record; the kernel's and the firmware's records as logcat's."""
        trouble(self.capture)
        for old in self.capture.glob("android.log.0?"):
            old.unlink()
        put(self.capture / "radio.log", logcat(BEGUN, END, 5, "RILJ") + b"\x1b[2J\xff\n", END)
        done = run("--merged", self.capture)
        rows = done.stdout.splitlines()
        panic = next(row for row in rows if "kernel  : Kernel panic - not syncing" in row)
        self.assertTrue(panic.startswith("kernel.log: 11-23 00:35:40.00"), panic)
        live = [row.split(": ", 1)[1] for row in rows if "/" not in row.split(": ")[0]]
        times = [one[:18] for one in live if one[:3] in ("11-", "12-")]
        self.assertGreater(len(times), 1400)
        self.assertEqual(times, sorted(times))
        self.assertIn("radio.log: ?[2J\udcff", rows)
        self.assertEqual(sum("Fatal signal" in row for row in rows), 2)

    def test_nothing_switched_on(self) -> None:
        for path in self.capture.iterdir():
            if path.is_file() and path.name not in ("getprop.txt", "versionNumber"):
                path.unlink()
        put_properties(self.capture, {"ro.build.ota.versionname": "CVX-8.1.0-0142"})
        page = self.report()
        self.assertIn("Nothing was switched on", page.text[: page.text.index("Nothing went wrong")])
