"""Packet files: the times of their packets, from any place in the file."""

import re
import struct
from dataclasses import dataclass

from .line_formats import DAY, Calendar

FILE_HEADER = 24
PACKET_HEADER = 16
LONGEST = 262144  # bytes of a packet that the recorder keeps
CHAIN = 4  # packets in a row that make sense are no accident

# First four bytes of the file: byte order, and the parts that a second is divided into.
MAGICS = {
    b"\xd4\xc3\xb2\xa1": ("<", 10**6),
    b"\xa1\xb2\xc3\xd4": (">", 10**6),
    b"\x4d\x3c\xb2\xa1": ("<", 10**9),
    b"\xa1\xb2\x3c\x4d": (">", 10**9),
}


@dataclass(frozen=True)
class PcapFormat:
    order: str
    parts: int
    era: "re.Pattern[bytes]"
    name: str = "packets"
    relative: bool = False
    utc: bool = True
    block: int = 2 * LONGEST

    def times(self, data: bytes, _: Calendar, at_start: bool) -> list[float]:
        return self.walk(data, FILE_HEADER if at_start else self._first_packet(data))[0]

    def walk(self, data: bytes, offset: int) -> tuple[list[float], int]:
        """The times of the packets from there on, and the bytes of a packet cut off at the end."""
        header = struct.Struct(self.order + "IIII")
        times = []
        while offset + PACKET_HEADER <= len(data):
            seconds, fraction, kept, _ = header.unpack_from(data, offset)
            if kept > LONGEST or offset + PACKET_HEADER + kept > len(data):
                break
            times.append(seconds + fraction / self.parts)
            offset += PACKET_HEADER + kept
        return times, max(0, len(data) - offset)

    def cut_off(self, tail: bytes, at_start: bool) -> int:
        return self.walk(tail, FILE_HEADER if at_start else self._first_packet(tail))[1]

    def _first_packet(self, data: bytes) -> int:
        """Where a packet begins in a piece from the middle of a file."""
        for match in self.era.finditer(data, 0, LONGEST + PACKET_HEADER):
            offset = match.start() - (2 if self.order == "<" else 0)
            if offset >= 0 and self._plausible(data, offset):
                return offset
        return len(data)

    def _plausible(self, data: bytes, offset: int) -> bool:
        header = struct.Struct(self.order + "IIII")
        for number in range(CHAIN):
            if offset + PACKET_HEADER > len(data):
                return offset == len(data) and number > 0
            _, fraction, kept, length = header.unpack_from(data, offset)
            if not 0 < kept <= min(length, LONGEST) or length > LONGEST or fraction >= self.parts:
                return False
            offset += PACKET_HEADER + kept
        return True


def _era(order: str, head: bytes, written: float) -> "re.Pattern[bytes]":
    """The upper halves of the seconds from the first packet to the file's last writing, some days at
    least and a year at most. Searching for them is how a packet is found in no time where there is
    none."""
    (seconds,) = struct.unpack_from(order + "I", head.ljust(FILE_HEADER + 4, b"\0"), FILE_HEADER)
    span = min(max(written - seconds, 5 * DAY), 366 * DAY)
    lows: dict[int, list[int]] = {}
    for half in range(seconds // 65536, int(seconds + span) // 65536 + 2):
        lows.setdefault(half // 256 % 256, []).append(half % 256)
    parts = []
    for high, low in lows.items():
        byte, any_of = re.escape(bytes([high])), b"[" + re.escape(bytes(low)) + b"]"
        parts.append(any_of + byte if order == "<" else byte + any_of)
    return re.compile(b"(?=" + b"|".join(parts) + b")", re.DOTALL)


def pcap_format(head: bytes, written: float) -> PcapFormat | None:
    magic = MAGICS.get(head[:4])
    if magic is None or len(head) < FILE_HEADER:
        return None
    return PcapFormat(*magic, _era(magic[0], head, written))
