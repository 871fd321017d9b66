"""corvex-report DIRECTORY [-o FILE]"""

import argparse
import os
import sys
import time

from .page import render
from .reading import NAME, read_capture
from .text import shown

PATIENCE = 1.0  # seconds before a terminal is told what goes on


class Progress:
    """Names the file that is being read, on a terminal, once it has taken a while."""

    def __init__(self) -> None:
        self._start = time.monotonic()
        self._told = False

    def __call__(self, path: str) -> None:
        if sys.stderr.isatty() and time.monotonic() - self._start > PATIENCE:
            self._told = True
            print(f"\r\033[Kreading {shown(path)[:60]}", end="", file=sys.stderr, flush=True)

    def end(self) -> None:
        if self._told:
            print("\r\033[K", end="", file=sys.stderr, flush=True)


def complain(text: str) -> None:
    print(f"corvex-report: {text}", file=sys.stderr)


def main() -> int:
    parser = argparse.ArgumentParser(
        prog="corvex-report",
        description="Makes one HTML page of a log directory: what is in it, and what is odd.",
    )
    parser.add_argument("directory", metavar="DIRECTORY", help="as pulled from the device")
    parser.add_argument("-o", metavar="FILE", dest="output", help="default: ./DIRECTORY.html")
    arguments = parser.parse_args()
    name = os.path.basename(os.path.realpath(arguments.directory))
    output = arguments.output or f"{name}.html"
    progress = Progress()
    try:
        capture = read_capture(arguments.directory, progress)
    except OSError as error:
        complain(f"{shown(arguments.directory)}: {error.strerror}")
        return 1
    progress.end()
    page = render(capture)
    try:
        with open(output, "w", encoding="utf-8") as file:
            file.write(page)
    except OSError as error:
        complain(f"{shown(output)}: {error.strerror}")
        return 1
    if not NAME.fullmatch(name):
        complain(f"note: {shown(name)} does not look like a log directory (KVBR_1--<time>)")
    sys.stdout.buffer.write(os.fsencode(output) + b"\n")
    return 0
