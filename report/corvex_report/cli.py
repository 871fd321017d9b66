"""corvex-report [--json | --ndjson | --merged] DIRECTORY [-o FILE]"""

import argparse
import os
import sys
import time
from collections.abc import Iterable

from . import machine, merged, several
from .find_incidents import find_incidents
from .page import render
from .reading import NAME, read_capture
from .text import shown

PATIENCE = 1.0  # seconds before a terminal is told what goes on
EVERY = 0.1


class Progress:
    """Names the file that is being read, on a terminal, once it has taken a while."""

    def __init__(self) -> None:
        self._next = time.monotonic() + PATIENCE
        self._told = False

    def __call__(self, path: str) -> None:
        if time.monotonic() > self._next and sys.stderr.isatty():
            self._next = time.monotonic() + EVERY
            self._told = True
            print(f"\r\033[Kreading {shown(path)[:60]}", end="", file=sys.stderr, flush=True)

    def end(self) -> None:
        if self._told:
            print("\r\033[K", end="", file=sys.stderr, flush=True)


def complain(text: str) -> None:
    print(f"corvex-report: {text}", file=sys.stderr)


def parse_arguments() -> argparse.Namespace:
    parser = argparse.ArgumentParser(
        prog="corvex-report",
        description="Tells what went wrong while a log directory was captured, on one HTML page.",
    )
    parser.add_argument(
        "directory", metavar="DIRECTORY", help="as pulled from the device, or one of several such"
    )
    parser.add_argument("-o", metavar="FILE", dest="output", help="default: ./DIRECTORY.html")
    forms = parser.add_mutually_exclusive_group()
    forms.add_argument("--json", action="store_true", help="print it as a JSON document instead")
    forms.add_argument("--ndjson", action="store_true", help="print a JSON object an incident")
    forms.add_argument("--merged", action="store_true", help="print all logs as one, by time")
    arguments = parser.parse_args()
    if arguments.output and (arguments.json or arguments.ndjson or arguments.merged):
        parser.error("-o names a page; --json, --ndjson and --merged print")
    return arguments


def write(lines: Iterable[bytes]) -> int:
    """A reader that has seen enough, as head does, is no mishap."""
    try:
        for line in lines:
            sys.stdout.buffer.write(line + b"\n")
        sys.stdout.buffer.flush()
    except BrokenPipeError:
        os.dup2(os.open(os.devnull, os.O_WRONLY), sys.stdout.fileno())
    return 0


def tell(arguments: argparse.Namespace, progress: Progress) -> int:
    """Raises OSError."""
    directory = arguments.directory
    names = several.captures_in(directory)
    if names:
        return tell_several(arguments, names, progress)
    capture = read_capture(directory, progress, gaps=not arguments.merged)
    if arguments.merged:
        progress.end()
        return write(merged.merged(capture))
    found = find_incidents(capture, progress)
    progress.end()
    if arguments.json:
        return write([machine.dump(machine.document(capture, found), 2)])
    if arguments.ndjson:
        return write(map(machine.dump, machine.flat(capture, found)))
    output = output_of(arguments)
    page = render(capture, found, output)
    with open(output, "w", encoding="utf-8") as file:
        file.write(page)
    if not NAME.fullmatch(capture.name):
        complain(f"note: {shown(capture.name)} does not look like a log directory (KVBR_1--<time>)")
    return write([os.fsencode(output)])


def tell_several(arguments: argparse.Namespace, names: list[str], progress: Progress) -> int:
    directory = arguments.directory
    if arguments.merged:
        complain(f"{shown(directory)} holds several captures; name one of them")
        return 1
    if arguments.json:
        documents = several.documents(directory, names, progress)
        progress.end()
        return write([machine.dump(documents, 2)])
    if arguments.ndjson:
        rows = several.flat(directory, names, progress)
        return write(map(machine.dump, rows))
    output = output_of(arguments)
    several.write_pages(directory, names, output, progress)
    progress.end()
    return write([os.fsencode(output)])


def output_of(arguments: argparse.Namespace) -> str:
    name = os.path.basename(os.path.realpath(arguments.directory))
    return arguments.output or f"{name}.html"


def main() -> int:
    arguments = parse_arguments()
    progress = Progress()
    try:
        return tell(arguments, progress)
    except OSError as error:
        progress.end()
        complain(f"{shown(os.fsdecode(error.filename or arguments.directory))}: {error.strerror}")
        return 1
