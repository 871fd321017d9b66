#!/usr/bin/env python3
"""cost.py BUILD_DIR: what each of the daemon's jobs asks of the system for one more block, file,
connection and so on, counted. Ends with status 0 only if that is as many system calls as its floor
makes, call by call, and as many allocations. Each job runs with some and with three times as many,
and only the difference counts: what a program does once, at its start, is not what is measured."""

import os
import signal
import subprocess
import sys
import tempfile
import time
from collections import Counter
from collections.abc import Callable
from contextlib import contextmanager
from dataclasses import dataclass
from pathlib import Path
from typing import Iterator

PROGRAMS = Path(sys.argv[1], "tools", "bench").resolve()
FLOOR = str(PROGRAMS / "bench_floor")
ALLOCATION = "getsid"  # the call that the preloaded library makes for each one
PATIENCE = 30  # seconds

# When the C library's heap grows and shrinks is a matter of what lies in it, not of the job.
LEFT_OUT = {"brk"}

# The log lines are left out as well: the daemon writes each to the log with one call, but
# bench_driver to nobody, and the floor has none. Which ones there are is not for the job to choose.


class Traced:
    """A program that runs under strace, which counts its calls and allocations."""

    def __init__(self, *command: str) -> None:
        preload = f"LD_PRELOAD={PROGRAMS / 'libbench_allocations.so'}"
        tracer = ["strace", "-f", "-c", "-U", "name,calls", "-o", "calls", "-E", preload]
        # Where the zone is not told, the C library looks for it anew whenever the time is asked.
        tracer += ["-E", "TZ=UTC0"]
        self.process = subprocess.Popen([*tracer, *command], stdout=subprocess.PIPE)

    def wait(self, status: int = 0) -> None:
        self.process.communicate(timeout=PATIENCE)
        if self.process.returncode != status:
            sys.exit(f"{self.process.args!r} ended with {self.process.returncode}")


@dataclass
class Server:
    pid: int

    def settle(self) -> None:
        """Until it waits for what comes next: all calls for what was before have been made."""
        wait_until(lambda: Path(f"/proc/{self.pid}/stat").read_text().rpartition(")")[2][1] == "S")


def wait_until(condition: Callable[[], bool]) -> None:
    deadline = time.monotonic() + PATIENCE
    while not condition():
        if time.monotonic() > deadline:
            sys.exit("waited in vain")
        time.sleep(0.001)


@contextmanager
def serving(*command: str) -> Iterator[Server]:
    traced = Traced(*command)
    assert traced.process.stdout is not None
    if traced.process.stdout.readline() != b"ready\n":
        sys.exit(f"{command} does not serve")
    tracer = traced.process.pid
    server = Server(int(Path(f"/proc/{tracer}/task/{tracer}/children").read_text()))
    try:
        yield server
        server.settle()
    finally:
        os.kill(server.pid, signal.SIGTERM)
    traced.wait(-signal.SIGTERM)


def make_files(directory: str, count: int, size: int) -> None:
    os.makedirs(directory)
    for i in range(count):
        Path(directory, f"file_{i:03}").write_bytes(bytes(size))


def run_reader(program: str, count: int, rotation_size: int = 1 << 40) -> None:
    Path("source").write_bytes(bytes(count * 1024))
    Traced(program, "reader", "source", f"{os.getcwd()}/log", str(rotation_size)).wait()


def run_node_reader(program: str, count: int) -> None:
    os.mkfifo("node")
    with subprocess.Popen([FLOOR, "records", "node", str(count)]) as writer:
        try:
            Traced(program, "reader", "node", f"{os.getcwd()}/log", str(1 << 40)).wait()
        finally:
            writer.kill()  # without a reader it waits for one


def run_rotation(program: str, count: int) -> None:
    run_reader(program, count, 1024)


def run_copy_file(program: str, count: int) -> None:
    Path("source").write_bytes(bytes(count * 1024))
    Traced(program, "copy_file", "source", "copy").wait()


def run_copy_folder(program: str, count: int) -> None:
    make_files("source", count, 4096)
    os.makedirs("log/copy")
    Traced(program, "copy_folder", "source", "log/copy").wait()


def on_files(job: str) -> Callable[[str, int], None]:
    def run(program: str, count: int) -> None:
        make_files("tree/one", count, 1)
        Traced(program, job, "tree").wait()

    return run


def on_directories(job: str) -> Callable[[str, int], None]:
    def run(program: str, count: int) -> None:
        for i in range(count):
            make_files(f"tree/{i:03}", 1, 1)
        Traced(program, job, "tree").wait()

    return run


def run_fstab(program: str, count: int) -> None:
    line = "/dev/block/by-name/p /mnt/p ext4 ro,noatime,barrier=1 wait,check,formattable\n"
    Path("fstab").write_text(line * count)
    Traced(program, "fstab", "fstab", "1").wait()


def run_watch(program: str, count: int) -> None:
    make_files("staged", count, 4096)
    os.mkdir("watched")
    os.makedirs("root/1_current")
    with serving(program, "watch", "watched", f"{os.getcwd()}/root") as server:
        # One by one, as it depends on the moment how many events a read gives.
        for file in Path("staged").iterdir():
            server.settle()
            file.rename(Path("watched", file.name))
            wait_until(Path("root/1_current", file.name).exists)


def run_socket(program: str, count: int) -> None:
    socket = f"{os.getcwd()}/socket"
    with serving(program, "socket", socket):
        subprocess.run([FLOOR, "client", socket, str(count)], check=True)


@dataclass
class Job:
    name: str
    run: Callable[[str, int], None]
    count: int
    kept: int = 0  # allocations for what one unit leaves behind, and that its floor does not keep


JOBS = [
    Job("reader, a block", run_reader, 100),
    Job("reader, a record of a node", run_node_reader, 100),
    Job("reader, a rotation", run_rotation, 5),
    Job("copy_file, a block", run_copy_file, 100),
    Job("copy_folder, a file of 4 KiB", run_copy_folder, 50),
    Job("dirsize, a file", on_files("dirsize"), 50),
    Job("dirsize, a directory of one file", on_directories("dirsize"), 50),
    Job("delete, a file", on_files("delete"), 50),
    Job("delete, a directory of one file", on_directories("delete"), 50),
    Job("fstab, a line", run_fstab, 100, kept=4),  # the entry's four texts
    Job("watch, an artefact of 4 KiB", run_watch, 10),
    Job("socket, a connection of ten commands", run_socket, 10),
]


def count_calls(job: Job, program: str, count: int) -> Counter[str]:
    with tempfile.TemporaryDirectory(prefix="corvex-cost-", dir="/dev/shm") as work:
        os.chdir(work)
        job.run(program, count)
        rows = [line.split() for line in Path("calls").read_text().splitlines()]
        os.chdir("/")
    calls = {row[0]: int(row[1]) for row in rows if len(row) == 2 and row[1].isdigit()}
    del calls["total"]
    return Counter(calls)


def per_unit(job: Job, program: str) -> dict[str, float]:
    some, more = count_calls(job, program, job.count), count_calls(job, program, 3 * job.count)
    more.subtract(some)
    return {
        name: calls / (2 * job.count)
        for name, calls in sorted(more.items())
        if calls != 0 and name not in LEFT_OUT
    }


def text(calls: dict[str, float], form: str) -> str:
    return ", ".join(f"{name} {number:{form}}" for name, number in calls.items()) or "none"


def judge(job: Job) -> bool:
    ours = per_unit(job, str(PROGRAMS / "bench_driver"))
    floor = per_unit(job, FLOOR)
    allocations = ours.pop(ALLOCATION, 0)
    beyond = {
        name: ours.get(name, 0) - floor.get(name, 0)
        for name in sorted({*ours, *floor} - {ALLOCATION})
        if ours.get(name, 0) != floor.get(name, 0)
    }
    too_many = allocations - floor.get(ALLOCATION, 0) - job.kept
    if too_many != 0:
        beyond["allocations"] = too_many
    verdict = f"DIFFERS from its floor: {text(beyond, '+g')}" if beyond else "same as its floor"
    print(f"{job.name}: {text(ours, 'g')}; allocations {allocations:g}: {verdict}", flush=True)
    return not beyond


def main() -> int:
    verdicts = [judge(job) for job in JOBS]
    return 0 if all(verdicts) else 1


if __name__ == "__main__":
    sys.exit(main())
