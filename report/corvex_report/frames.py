"""Where something happened: the first frame of a stack that is not the machinery of dying."""

import re
from collections.abc import Iterable

# What stands between a fault and the frame that is to blame for it.
NATIVE_MACHINERY = re.compile(
    r"_*(libc_)?(android_)?abort(_message)?|raise|tgkill|tkill|pthread_kill|syscall|gsignal"
    r"|__(libc_)?fatal\w*|__assert\w*|__android_log_assert|__stack_chk_fail|__fortify\w*"
    r"|__cxa_\w+|__cfi_\w+|_Unwind_\w+|demangling_terminate_handler|art::Runtime::Abort\b.*"
    r"|android::base::(DefaultAborter|LogMessage::~LogMessage)\b.*"
    r"|std::(__\w+::)?(terminate|__terminate)\b.*"
)
KERNEL_MACHINERY = re.compile(
    r"panic|nmi_panic|dump_backtrace|show_stack|dump_stack|show_regs|die\w*|oops_\w+|bug_handler"
    r"|brk_handler|report_bug|__do_kernel_fault\w*|do_\w+_(fault|abort)|do_debug_exception"
    r"|el[01]_\w+|(__)?schedule|schedule_\w+|io_schedule\w*|__switch_to|watchdog|watchdog_timer_fn"
    r"|hrtimer_interrupt|__hrtimer_\w+|__warn|warn_slowpath_\w+|trigger_\w+|rcu_\w+"
    r"|print_\w+stall\w*|check_hung_\w+"
)
NATIVE = re.compile(r"\s*#\d+ +pc +([0-9a-fA-F]+) +(\S+)(?: \(offset 0x[0-9a-f]+\))?(?: \((.+)\))?")
JAVA = re.compile(r"\s*at ([\w.$<>/\-]+\([^)\n]{0,200}\))")
EXCEPTION = re.compile(r"(?:Caused by: )?((?:[\w$]+\.)+[\w$]+)(?:: (.*))?$")
PROGRAM_COUNTER = re.compile(
    r"(?:PC is at|pc :|RIP: \w+:|EIP is at) *(?:\[<\w+>\] *)*([A-Za-z_][\w.$]*)\+0x"
)
KERNEL_FRAME = re.compile(
    r" *(?:\[<[0-9a-fA-F]+>\] )?\(?(?:\? )?([A-Za-z_][\w.$]*)\+0x[0-9a-f]+/0x"
)


def native_place(lines: Iterable[str]) -> str | None:
    """Of the first backtrace."""
    first = None
    before = -1
    for line in lines:
        match = NATIVE.match(line)
        if not match:
            continue
        number = int(line.split("#")[1].split()[0])
        if number <= before:  # the stack of another thread
            break
        before = number
        symbol = match[3] or ""
        if symbol.startswith("BuildId"):
            symbol = ""
        name = symbol.split(" (BuildId")[0]
        place = f"{match[2]} ({name})" if name else f"{match[2]}+0x{int(match[1], 16):x}"
        first = first or place
        # What has no name in the C library is its part of aborting, or was called with nonsense.
        nameless = not name and match[2].endswith("/libc.so")
        bare = re.sub(r"(\(.*)?(\+\d+)?$", "", name)
        if not nameless and not NATIVE_MACHINERY.fullmatch(bare):
            return place
    return first


def java_place(lines: Iterable[str]) -> tuple[str, str | None]:
    """The root cause of an exception, and the first frame of its stack."""
    reason, place, waiting = "", None, False
    for line in lines:
        exception = EXCEPTION.match(line)
        if exception and (not reason or line.startswith("Caused by: ")):
            reason = line.removeprefix("Caused by: ").strip()
            waiting = True
        elif waiting and (frame := JAVA.match(line)):
            place, waiting = frame[1], False
    return reason, place


def kernel_place(lines: Iterable[str]) -> str | None:
    """The program counter where one is told, and else the first frame of the call trace."""
    first = None
    for line in lines:
        counter = PROGRAM_COUNTER.match(line)
        if counter:
            return counter[1]
        frame = KERNEL_FRAME.match(line)
        if frame and first is None and not KERNEL_MACHINERY.fullmatch(frame[1]):
            first = frame[1]
    return first
