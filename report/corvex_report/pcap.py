"""Packet files: the times of their packets."""

import struct
from dataclasses import dataclass

from .line_formats import Calendar

FILE_HEADER = 24
PACKET_HEADER = 16
LONGEST = 262144  # bytes of a packet that the recorder keeps
WALKED = 32 * 1024 * 1024  # bytes; of a larger file only the head is read

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
    name: str = "packets"
    relative: bool = False
    utc: bool = True

    def times(self, data: bytes, _: Calendar, at_start: bool) -> list[float]:
        return self.walk(data)[0]

    def walk(self, data: bytes) -> tuple[list[float], int]:
        """The times of the packets, and the bytes of a packet cut off at the end."""
        unpack, offset = struct.Struct(self.order + "III").unpack_from, FILE_HEADER
        times = []
        while offset + PACKET_HEADER <= len(data):
            seconds, fraction, kept = unpack(data, offset)
            if kept > LONGEST or offset + PACKET_HEADER + kept > len(data):
                break
            times.append(seconds + fraction / self.parts)
            offset += PACKET_HEADER + kept
        return times, max(0, len(data) - offset)


def pcap_format(head: bytes) -> PcapFormat | None:
    magic = MAGICS.get(head[:4])
    return PcapFormat(*magic) if magic and len(head) >= FILE_HEADER else None
