"""What the times in one file say: from when to when, where it is silent, where the clock steps.

A small log and most packet files are read whole. Of a large log the head, the tail and a few places
between are read, and where the most time passes between two of those, it is looked at more closely.
"""

from dataclasses import dataclass, field

from .files import Reader
from .line_formats import LINE_FORMATS, Calendar, LineFormat
from .pcap import WALKED, PcapFormat, pcap_format

WHOLE = 512 * 1024  # bytes
HEAD = 65536
PLACES = 16
SILENCE = 30.0  # seconds without a line that are remembered
STEP_BACK = 60.0  # seconds; buffers that are merged may be out of order by a little

Format = LineFormat | PcapFormat


@dataclass(frozen=True)
class Step:
    """Two times that follow each other in a log, and the seconds that passed between them."""

    before: float
    after: float
    length: float


@dataclass
class Track:
    format: Format
    first: float
    last: float | None  # None: the tail of a large file holds none
    steps: list[Step] = field(default_factory=list)  # long ones, and those back
    sampled: bool = False


def notable(step: Step) -> bool:
    return step.length > SILENCE or step.length < -STEP_BACK


def steps_between(times: list[float]) -> list[Step]:
    steps = (Step(before, after, after - before) for before, after in zip(times, times[1:]))
    return [step for step in steps if notable(step)]


def find_line_format(head: bytes, calendar: Calendar) -> LineFormat | None:
    counts = [(len(line.times(head, calendar, True)), line) for line in LINE_FORMATS]
    count, best = max(counts, key=lambda pair: pair[0])
    return best if count else None


def read_track(reader: Reader, calendar: Calendar, gaps: bool) -> tuple[Track | None, str]:
    """With what is wrong with the end of the file, as a half sentence; usually nothing."""
    head = reader.read(0, HEAD)
    packets = pcap_format(head)
    if packets:
        return _packets(reader, packets, WALKED if gaps else WHOLE)
    track, found = None, find_line_format(head, calendar)
    if found and reader.size > WHOLE:
        track = _sample(reader, found, calendar, gaps)
    elif found:
        times = found.times(reader.read(0, reader.size), calendar, True)
        track = Track(found, times[0], times[-1], steps_between(times)) if times else None
    return track, _last_line_problem(reader)


def _packets(reader: Reader, found: PcapFormat, most: int) -> tuple[Track | None, str]:
    whole = reader.size <= most
    times, cut = found.walk(reader.read(0, reader.size if whole else WHOLE))
    if not times:
        return None, ""
    if not whole:
        return Track(found, times[0], None, sampled=True), ""
    ending = f"ends {cut} bytes into a packet that is not whole" if cut else ""
    return Track(found, times[0], times[-1], steps_between(times)), ending


def _sample(reader: Reader, found: LineFormat, calendar: Calendar, gaps: bool) -> Track | None:
    def times_at(offset: int, length: int) -> list[float]:
        return found.times(reader.read(offset, length), calendar, offset == 0)

    low, high = 0, reader.size - found.block
    tail = times_at(high, found.block)
    head = times_at(low, max(HEAD, found.block))
    if not head:
        return None
    track = Track(found, head[0], tail[-1] if tail else None, sampled=True)
    if not gaps:
        return track
    while high - low > WHOLE:
        places = [low + (high - low) * i // PLACES for i in range(PLACES + 1)]
        points = [(place, times_at(place, found.block)) for place in places]
        known = [(place, times[0]) for place, times in points if times]
        pairs = list(zip(known, known[1:]))
        if len(pairs) < 2:
            return track  # there are too few times in it to look between
        # The way back first: a clock that was set explains a silence, not the other way round.
        back = [pair for pair in pairs if pair[1][1] - pair[0][1] < -STEP_BACK]
        (low, _), (high, _) = (back or [max(pairs, key=lambda pair: pair[1][1] - pair[0][1])])[0]
    track.steps = steps_between(times_at(low, high - low + found.block))[:8]
    return track


def _last_line_problem(reader: Reader) -> str:
    tail = reader.read(max(0, reader.size - HEAD), HEAD)
    zeros = len(tail) - len(tail.rstrip(b"\0"))
    if zeros:
        return f"ends in {'at least ' * (zeros == HEAD)}{zeros} zero bytes, as after a power cut"
    if tail and not tail.endswith(b"\n"):
        return "ends in the middle of a line"
    return ""
