"""The thermal record as lines. A chart is a thousand units wide and a hundred high."""

from dataclasses import dataclass

from .incidents import Incident
from .scales import Tick, TimeScale, ValueScale, value_scale
from .text import clock_text
from .thermal import Record, Source
from .timeline import MARKS, kind_title

COLUMNS = 240  # of a chart in which the least and the greatest value are kept
STEADY = 2.0  # degrees within which a zone is steady


@dataclass(frozen=True)
class Line:
    name: str
    where: str
    unit: str
    path: str
    low: str
    high: str
    last: str
    title: str


@dataclass(frozen=True)
class Chart:
    title: str
    paths: list[str]  # of the zones
    hottest_path: str
    hottest: str
    value_ticks: list[Tick]
    time_ticks: list[Tick]
    lines: list[Line]  # one for each CPU and zone
    absent: list[str]  # that were never read
    samples: int
    begun: str
    period: str
    incidents: list[Tick]


def chart(record: Record, begun: float | None, incidents: list[Incident]) -> Chart | None:
    times = record.times
    if not times or max(times) == min(times):
        return None
    time = TimeScale(min(times), max(times))
    known = [value for zone in record.zones for value in zone.known]
    scale = value_scale(known, STEADY)
    hottest = max((z for z in record.zones if z.known), key=lambda z: max(z.known), default=None)
    speeds = value_scale([0.0, *(value for cpu in record.cpus for value in cpu.known)], 100.0)
    lines = [_line(cpu, times, time, speeds, "MHz") for cpu in record.cpus if cpu.known]
    for zone in record.zones:
        if zone.known:
            lines.append(_line(zone, times, time, value_scale(zone.known, STEADY), "°C"))
    return Chart(
        title=f"Temperatures of {sum(1 for zone in record.zones if zone.known)} zones",
        paths=[_path(z, times, time, scale) for z in record.zones if z.known and z is not hottest],
        hottest_path=_path(hottest, times, time, scale) if hottest else "",
        hottest=_peak(hottest, times, begun) if hottest else "",
        value_ticks=scale.ticks(),
        time_ticks=time.ticks(),
        lines=lines,
        absent=[_described(source) for source in record.sources if not source.known],
        samples=len(times),
        begun=clock_text(times[0], begun),
        period=clock_text(times[-1], begun),
        incidents=[
            Tick(time.at(at), f"{kind_title(one.kind)}, {clock_text(at, begun)}")
            for one in incidents
            for at in one.times[:MARKS]
            if time.first <= at <= time.last
        ],
    )


def _described(source: Source) -> str:
    return source.name if source.zone is None else f"{source.name} (zone {source.zone})"


def _peak(zone: Source, times: list[float], begun: float | None) -> str:
    high = max(zone.known)
    time = times[zone.values.index(high)]
    return f"{zone.name} is the hottest: {high:.1f} °C at {clock_text(time, begun)}"


def _line(
    source: Source, times: list[float], time: TimeScale, scale: ValueScale, unit: str
) -> Line:
    places = 0 if unit == "MHz" else 1
    low, high, last = (
        f"{value:.{places}f}" for value in (min(source.known), max(source.known), source.known[-1])
    )
    return Line(
        source.name,
        "" if source.zone is None else f"zone {source.zone}",
        unit,
        _path(source, times, time, scale, steps=source.zone is None),
        low,
        high,
        last,
        f"{source.name}: {low} to {high} {unit}, last {last}",
    )


def _path(
    source: Source, times: list[float], time: TimeScale, scale: ValueScale, steps: bool = False
) -> str:
    """An SVG path through the values, broken where one is missing."""
    path, pen = [], "M"
    for at, value in _thinned(times, source.values):
        if value is None:
            pen = "M"
            continue
        x, y = f"{10 * time.at(at):.5g}", f"{scale.at(value):.4g}"
        path.append(f"H{x}V{y}" if steps and pen == "L" else f"{pen}{x} {y}")
        pen = "L"
    return "".join(path)


def _thinned(times: list[float], values: list[float | None]) -> list[tuple[float, float | None]]:
    """At most the least and the greatest value of each column, in their order."""
    points = list(zip(times, values))
    width = -(-len(points) // COLUMNS)
    if width <= 2:
        return points
    thin: list[tuple[float, float | None]] = []
    for start in range(0, len(points), width):
        column = points[start : start + width]
        known = [(value, index) for index, (_, value) in enumerate(column) if value is not None]
        kept = {min(known)[1], max(known)[1]} if known else {0}
        thin += [column[index] for index in sorted(kept)]
    return thin
