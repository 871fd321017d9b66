"""What a device leaves of its troubles, by hand: logs and artefacts with one of each kind."""

import gzip
import re
from pathlib import Path

from fixture import AHEAD, BEGUN, BOOT, LENGTH, PROPERTIES, logcat, put, put_properties, sample
from fixture import spread, stamp

END = BEGUN + LENGTH
NATIVE = """pid: 2718, tid: 2731, name: RenderThread  >>> com.example.gallery <<<
signal 11 (SIGSEGV), code 1 (SEGV_MAPERR), fault addr 0x18
    x0   0000000000000000  x1   0000000000000018
backtrace:
    #00 pc 000000000004a1c8  /system/lib64/libhwui.so (gallery::Layer::draw()+24)
    #01 pc 0000000000066f3c  /system/lib64/libc.so (__pthread_start(void*)+36)
"""
ABORTED = """*** *** *** *** *** *** *** *** *** *** *** *** *** *** *** ***
pid: 3001, tid: 3001, name: camera  >>> /vendor/bin/camera <<<
signal 6 (SIGABRT), code -6 (SI_TKILL), fault addr --------
Abort message: 'queue of 7 buffers at 0x7f12 is full'
backtrace:
    #00 pc 0000000000069e1c  /system/lib64/libc.so (tgkill+8)
    #01 pc 000000000001d9a4  /system/lib64/libc.so (abort+80)
    #02 pc 0000000000007f44  /system/lib64/liblog.so (__android_log_assert+296)
    #03 pc 000000000001c0de  /vendor/lib64/libqueue.so (Queue::push(int)+112)
--- --- ---
pid: 3001, tid: 3009, name: worker  >>> /vendor/bin/camera <<<
    #00 pc 0000000000000001  /vendor/lib64/libother.so (idle+4)
"""
JAVA = """java.lang.RuntimeException: Unable to start activity ComponentInfo{com.example.mail/.Inbox}
\tat android.app.ActivityThread.performLaunchActivity(ActivityThread.java:2778)
\tat com.android.internal.os.ZygoteInit.main(ZygoteInit.java:767)
Caused by: java.lang.NullPointerException: Attempt to read from null, at 5
\tat com.example.mail.Inbox.open(Inbox.java:42)
\tat android.app.Activity.performCreate(Activity.java:6975)
\t... 9 more
"""
DROPPED = (
    "Process: com.example.mail\nPID: 4100\nFlags: 0x3\nPackage: com.example.mail v7\n\n" + JAVA
)
TRACE = """----- pid 5200 at {time} -----
Cmd line: com.example.maps
ABI: 'arm64'

DALVIK THREADS (12):
"Signal Catcher" daemon prio=5 tid=3 Runnable
  at com.example.Wrong.thread(Wrong.java:1)

"main" prio=5 tid=1 Blocked
  | group="main" sCount=1 dsCount=0 obj=0x75 self=0x7f
  at com.example.maps.Tiles.get(Tiles.java:88)
  - waiting to lock <0x0a1b> (a java.lang.Object) held by thread 9
  at com.example.maps.Map.draw(Map.java:12)

----- end 5200 -----
----- pid 911 at {time} -----
Cmd line: system_server
"main" prio=5 tid=1 Native
  at android.os.MessageQueue.nativePollOnce(Native method)
----- end 911 -----
"""
OOPS = """Unable to handle kernel NULL pointer dereference at virtual address 00000008
pgd = ffffffc0a1b2c000
Internal error: Oops: 96000005 [#1] PREEMPT SMP
CPU: 2 PID: 321 Comm: kworker/2:1 Tainted: G        W       4.9.65-cvx #1
PC is at cvx_panel_off+0x34/0x90
LR is at cvx_panel_on+0x10/0x40
Call trace:
[<ffffff8008a1b2c4>] cvx_panel_off+0x34/0x90
[<ffffff80080c1d2e>] process_one_work+0x1a0/0x3f8
"""
PANIC = "Kernel panic - not syncing: Fatal exception\n"
HUNG = """INFO: task mmcqd/0:199 blocked for more than 120 seconds.
      Tainted: G        W       4.9.65-cvx #1
Call trace:
[<ffffff8008085b14>] __switch_to+0x9c/0xd0
[<ffffff80090c1d2e>] schedule+0x40/0xa8
[<ffffff8008791b2c>] mmc_wait_for_req+0x54/0x160
"""
BARK = "msm_watchdog 17817000.qcom,wdt: Watchdog bark! Now = 5123.456789\n"
QUOTES = """I Notes   : FATAL EXCEPTION: main
E Notes   : Fatal signal 11 (SIGSEGV), code 1, fault addr 0x0 in tid 7 (x)
E Notes   : pid: 1, tid: 1, name: x  >>> com.example.notes <<<
E AndroidRuntime: he said: FATAL EXCEPTION: main
I Notes   : ANR in com.example.notes
W Notes   : Kernel panic - not syncing: not me
I Notes   : *** WATCHDOG KILLING SYSTEM PROCESS: no
I am_crash: [1,0,com.example.notes,0,java.lang.Error,x,X.java,1]
"""


def lines(time: float, pid: int, tag: str, text: str) -> bytes:
    """As logcat writes them; the tag begins with the level."""
    level, name = tag.split()
    head = f"{stamp(time, '%m-%d %H:%M:%S')}.{int(time % 1 * 1000):03} {pid:5} {pid:5} {level} "
    return "".join(f"{head}{name:<8}: {line}\n" for line in text.splitlines()).encode()


def kmsg(uptime: float, text: str) -> bytes:
    """Records of /dev/kmsg, a millisecond apart."""
    records = enumerate(text.splitlines())
    return "".join(
        f"4,{i},{int(uptime * 1e6) + 1000 * i},-;{line}\n" for i, line in records
    ).encode()


def dmesg(uptime: float, text: str) -> bytes:
    records = enumerate(text.splitlines())
    return "".join(f"<4>[{uptime + i / 1000:12.6f}] {line}\n" for i, line in records).encode()


def quotes(time: float) -> bytes:
    texts = (line.split(": ", 1) for line in QUOTES.splitlines())
    return b"".join(lines(time, 700, tag, text) for tag, text in texts)


def put_log(path: Path, *parts: bytes) -> None:
    """Among lines of no interest, a second apart."""
    log = logcat(BEGUN - 20, END, 1, "init") + b"".join(parts)
    rows = sorted(log.splitlines(keepends=True), key=lambda row: row[:18])
    put(path, b"".join(rows), END)


def dropbox(tag: str, time: float) -> str:
    return f"{tag}@{int((time - AHEAD) * 1000)}.txt.gz"


def trouble(capture: Path) -> None:
    """One of each kind, told by all that tell of it."""
    at = {
        name: BEGUN + 50 * i for i, name in enumerate("gallery mail maps system kernel".split(), 1)
    }
    time = at["gallery"]
    name = stamp(time + 2, "%Y-%m-%d-%H-%M-%S")
    put(capture / "tombstones" / name / "tombstone_03", NATIVE.encode(), time + 2)
    put(
        capture / "dropbox" / dropbox("SYSTEM_TOMBSTONE", time + 3),
        gzip.compress(NATIVE.encode()),
        time,
    )
    signal = "Fatal signal 11 (SIGSEGV), code 1, fault addr 0x18 in tid 2731 (RenderThread)"
    put_log(
        capture / "android.log",
        lines(time, 2718, "F libc", signal),
        lines(time + 1, 2801, "F DEBUG", NATIVE),
        quotes(time + 5),
        lines(
            at["mail"],
            4100,
            "E AndroidRuntime",
            "FATAL EXCEPTION: main\nProcess: com.example.mail, PID: 4100\n" + JAVA,
        ),
        lines(
            at["maps"] + 4,
            911,
            "E ActivityManager",
            "ANR in com.example.maps (com.example.maps/.Map)\nPID: 5200\nReason: Input dispatching timed out (5008.2ms)",
        ),
        lines(
            at["system"],
            911,
            "W Watchdog",
            "*** WATCHDOG KILLING SYSTEM PROCESS: Blocked in handler on main thread (main)\nmain thread stack trace:\n    at com.android.server.am.Stuck.hold(Stuck.java:7)\n*** GOODBYE!",
        ),
        lines(
            at["system"] + 1,
            498,
            "E Zygote",
            "Exit zygote because system server (911) has terminated",
        ),
    )
    put_log(
        capture / "event.log",
        lines(
            time + 1,
            911,
            "I am_crash",
            "[2718,0,com.example.gallery,545832517,Native crash,Segmentation fault,unknown,0]",
        ),
        lines(
            at["mail"],
            911,
            "I am_crash",
            "[4100,0,com.example.mail,545832517,java.lang.NullPointerException,Attempt to read from null, at 5,Inbox.java,42]",
        ),
        lines(
            at["maps"],
            911,
            "I am_anr",
            "[0,5200,com.example.maps,545832517,Input dispatching timed out (5008.2ms)]",
        ),
        lines(at["maps"] + 9, 911, "I am_proc_died", "[0,5200,com.example.maps,0,2]"),
        lines(at["maps"] + 9, 911, "I am_kill", "[0,5200,com.example.maps,0,empty]"),
    )
    put(
        capture / "dropbox" / dropbox("data_app_crash", at["mail"] + 1),
        gzip.compress(DROPPED.encode()),
        END,
    )
    trace = TRACE.format(time=stamp(at["maps"], "%Y-%m-%d %H:%M:%S"))
    put(capture / "anr/2026-11-23-00-34-02/anr_2026-11-23-00-34-02", trace.encode(), END)
    uptime = at["kernel"] - BOOT
    put(
        capture / "kernel.log",
        kmsg(uptime - 300, "Kernel command line: quiet panic=5 x=Kernel panic - not syncing: y")
        + kmsg(uptime - 40, HUNG + BARK)
        + kmsg(uptime, OOPS + PANIC)
        + kmsg(
            uptime + 60,
            "lowmemorykiller: Killing 'm.example.home' (611), adj 0,\nlowmemorykiller: Killing 'cached' (612), adj 906,",
        )
        + kmsg(
            uptime + 80,
            "Out of memory: Kill process 613 (big) score 900 or sacrifice child\nKilled process 613 (big) total-vm:9kB",
        )
        + kmsg(END - BOOT, "text"),
        END,
    )
    hot = [
        re.sub("tz_sensor3=[0-9]+", "tz_sensor3=101500", sample(t)) if 90 < i < 99 else sample(t)
        for i, t in enumerate(spread(BEGUN, END, 3))
    ]
    put(capture / "kv_tsen_data/20261123_03140", "".join(hot).encode(), END)
    put_properties(capture, PROPERTIES | {"ro.boot.bootreason": "kernel_panic"})
