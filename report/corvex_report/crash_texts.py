"""What crash texts say, wherever they stand: in an artefact, or line by line in a log."""

import re
from collections.abc import Sequence
from dataclasses import dataclass

from .frames import JAVA, NATIVE, java_place, native_place

PROCESS = re.compile(r"pid: (\d+), tid: (\d+), name: (.{0,100}?) +>>> (.{1,200}?) <<<")
SIGNAL = re.compile(r"signal (\d+) \((\w+)\), code -?\d+(?: \((\w+)\))?(?:, fault addr (\w+))?")
FATAL = re.compile(
    r"Fatal signal \d+ \((\w+)\)(?:, code -?\d+(?: \((\w+)\))?)?(?:, fault addr (\w+))?"
    r"(?:.{0,40}? in tid (\d+) \((.*?)\))?(?:, pid (\d+) \((.*?)\))?"
)
ABORT = re.compile(r"Abort message: '?(.*?)'?$")
HEAD = re.compile(r"(Process|PID|Subject|Package|Cmd line): (.{1,500})")
PIECE = re.compile(r"----- pid (\d{1,9})(?: at (\d{4}-\d\d-\d\d \d\d:\d\d:\d\d))?")
CMD_LINE = "Cmd line: "
MAIN = '"main" '


@dataclass
class Crash:
    """What one text says of one occurrence."""

    process: str | None = None
    pid: int | None = None
    reason: str = ""
    where: str | None = None
    time: str = ""  # as a trace has it
    thread: str | None = None  # what the process is called by who does not know its name
    identity: str = ""  # of what is no process


def signal_reason(signal: str, code: str | None, address: str | None) -> str:
    parts = [signal, code or "", f"fault addr {address}" if address else ""]
    return ", ".join(part for part in parts if part)


def native_crash(lines: Sequence[str]) -> Crash | None:
    """Of a tombstone, or of what the dumper logs of it."""
    crash = None
    abort = ""
    for line in lines:
        if crash is None:
            match = PROCESS.search(line)
            if match:
                crash = Crash(match[4], int(match[1]))
        elif PROCESS.search(line):
            break  # another, appended
        elif not crash.reason and (signal := SIGNAL.match(line)):
            crash.reason = signal_reason(signal[2], signal[3], signal[4])
        elif not abort and (message := ABORT.match(line)):
            abort = message[1]
    if crash is None:
        return None
    if abort:
        crash.reason = f"{crash.reason.split(',')[0]}: {abort}"
    crash.where = native_place(lines)
    return crash


def java_crash(lines: Sequence[str]) -> Crash:
    reason, where = java_place(lines)
    heads = _heads(lines)
    pid = heads.get("PID", "").strip()
    return Crash(_name(heads), int(pid) if pid.isdecimal() else None, reason, where)


def not_responding(lines: Sequence[str]) -> Crash | None:
    """Of the stacks that are written when a process does not respond: the first is its own."""
    crash = Crash()
    heads = _heads(lines)
    crash.reason = heads.get("Subject", "").strip()
    begin = 0
    for number, line in enumerate(lines):
        piece = PIECE.match(line)
        if piece:
            crash.pid, crash.time, begin = int(piece[1]), piece[2] or "", number + 1
            break
    for line in lines[begin:]:
        if line.startswith("----- "):
            break
        if line.startswith(CMD_LINE):
            crash.process = line.removeprefix(CMD_LINE).strip()
            break
    crash.process = crash.process or _name(heads)
    crash.where = main_place(lines[begin:])
    return crash if crash.process else None


def main_place(lines: Sequence[str]) -> str | None:
    """The first frame of the main thread, in Java if it is there."""
    native = None
    inside = False
    for line in lines:
        if line.startswith(MAIN):
            inside = True
        elif inside and (not line.strip() or line.startswith(("----- ", '"'))):
            break
        elif inside and (frame := JAVA.match(line)):
            return frame[1]
        elif inside and native is None:
            stripped = line.strip().removeprefix("native: ")
            native = native_place([stripped]) if NATIVE.match(stripped) else None
    return native


def _heads(lines: Sequence[str]) -> dict[str, str]:
    """The named values at the beginning."""
    found: dict[str, str] = {}
    for line in lines[:40]:
        match = HEAD.match(line)
        if match:
            found.setdefault(match[1], match[2].strip())
    return found


def _name(heads: dict[str, str]) -> str | None:
    return heads.get("Process", "").split(", PID: ")[0] or heads.get("Cmd line") or None
