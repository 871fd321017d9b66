"""Numbers, times and foreign names as people read them."""

from datetime import datetime, timezone

DAY = 86400
EARLIEST, LATEST = -6e10, 2.5e11  # seconds; a calendar has no others


def shown(name: str) -> str:
    """A text from a device, with every byte that would not print, or would fool the eye, escaped."""
    return "".join(c if c.isprintable() else _escaped(c) for c in name)


def _escaped(char: str) -> str:
    code = ord(char)
    if 0xDC80 <= code <= 0xDCFF:  # a byte that is no UTF-8
        return f"\\x{code - 0xDC00:02x}"
    return f"\\x{code:02x}" if code < 0x100 else f"\\u{code:04x}"


def size_text(size: int) -> str:
    if size < 1024:
        return f"{size} B"
    value = float(size)
    for unit in ("KiB", "MiB", "GiB"):
        value /= 1024
        if value < 1023.5 or unit == "GiB":
            break
    return f"{value:.1f} {unit}" if value < 99.5 else f"{value:.0f} {unit}"


def duration_text(seconds: float) -> str:
    """With the two largest units that say something: "2 h 5 min", "12 s"."""
    rest = round(seconds)
    parts: list[str] = []
    for unit, length in (("d", DAY), ("h", 3600), ("min", 60), ("s", 1)):
        count, rest = divmod(rest, length)
        if count or (unit == "s" and not parts):
            parts.append(f"{count} {unit}")
        elif parts:
            break
    return " ".join(parts[:2])


def date_time(time: float) -> str:
    """Local time of the device, which this program counts as seconds since 1970, too."""
    time = min(max(time, EARLIEST), LATEST)
    return datetime.fromtimestamp(time, timezone.utc).strftime("%Y-%m-%d %H:%M:%S")


def clock_text(time: float, near: float | None) -> str:
    """The time of day, with its date where that is not the one everybody has in mind."""
    text = date_time(time)
    return text[11:] if near is not None and int(time // DAY) == int(near // DAY) else text[5:]


def span_text(first: float, last: float, near: float | None) -> str:
    begin, end = clock_text(first, near), clock_text(last, near)
    return begin if begin == end else f"{begin} – {end}"


def counted(count: int, one: str, many: str = "") -> str:
    return f"{count} {one if count == 1 else many or one + 's'}"


def plain(text: str) -> str:
    """Valid UTF-8, whatever bytes a device had."""
    return text.encode("utf-8", "surrogateescape").decode("utf-8", "replace")
