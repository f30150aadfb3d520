"""Films of gray pictures in MPEG-1, in the two ways that it is packed: as a program and as a transport stream."""

import struct

RATE = 25
VIDEO_PID, TABLE_PID = 0x100, 0x1000


class Bits:
    def __init__(self):
        self.text = ""

    def add(self, *pairs):
        self.text += "".join(format(value, f"0{width}b") for value, width in pairs)
        return self

    def bytes(self):
        text = self.text + "0" * (-len(self.text) % 8)
        return int(text, 2).to_bytes(len(text) // 8, "big")


def code(number, bits):
    return b"\0\0\1" + bytes([number]) + bits.bytes()


def picture(width, height, number):
    """Each block differs from the one before it by nothing."""
    blocks = "11" + "10010" * 4 + "0010" * 2
    out = code(0, Bits().add((number % 1024, 10), (1, 3), (0xFFFF, 16), (0, 1)))
    for row in range((height + 15) // 16):
        piece = Bits().add((8, 5), (0, 1))
        piece.text += blocks * ((width + 15) // 16)
        out += code(row + 1, piece)
    return out


def pictures(width, height, count):
    """The video, in as many pieces as it has pictures."""
    head = Bits().add((width, 12), (height, 12), (1, 4), (3, 4), (1000, 18), (1, 1), (20, 10), (0, 3))
    group = Bits().add((0, 12), (1, 1), (0, 12), (1, 1), (0, 1))
    start = code(0xB3, head) + code(0xB8, group)
    return [(start if i == 0 else b"") + picture(width, height, i) for i in range(count)]


def clock(mark, time):
    """A time in the five bytes that packets have for it."""
    return Bits().add((mark, 4), (time >> 30 & 7, 3), (1, 1), (time >> 15 & 0x7FFF, 15), (1, 1), (time & 0x7FFF, 15),
                      (1, 1)).bytes()


def program_stream(width, height, seconds):
    out = b""
    for i, data in enumerate(pictures(width, height, seconds * RATE)):
        time = 90000 + i * 90000 // RATE
        out += b"\0\0\1\xba" + clock(2, time) + Bits().add((1, 1), (5000, 22), (1, 1)).bytes()
        out += b"\0\0\1\xe0" + struct.pack(">H", len(data) + 5) + clock(2, time) + data
    return out + b"\0\0\1\xb9"


def check(data):
    value = 0xFFFFFFFF
    for byte in data:
        value ^= byte << 24
        for _ in range(8):
            value = (value << 1 ^ (0x04C11DB7 if value & 0x80000000 else 0)) & 0xFFFFFFFF
    return struct.pack(">I", value)


def table(number, ident, content):
    body = struct.pack(">BHHBBB", number, 0xB000 | len(content) + 9, ident, 0xC1, 0, 0) + content
    return b"\0" + body + check(body)


def transport_stream(width, height, seconds, times=False):
    """With a time before each packet, as cameras and discs have it, or without."""
    packets, counts = [], {}

    def send(pid, data, stuffing):
        first = True
        while data:
            room = 184
            piece, data = data[:room], data[room:]
            missing = room - len(piece)
            counts[pid] = (counts.get(pid, -1) + 1) % 16
            head = struct.pack(">BHB", 0x47, pid | (0x4000 if first else 0), 0x10 | counts[pid])
            if missing and stuffing:
                head = head[:3] + bytes([head[3] | 0x20, missing - 1])
                head += (b"\0" + b"\xff" * (missing - 2)) if missing > 1 else b""
                packets.append(head + piece)
            else:
                packets.append(head + piece + b"\xff" * missing)
            first = False
    for i, data in enumerate(pictures(width, height, seconds * RATE)):
        if i % 10 == 0:
            send(0, table(0, 1, struct.pack(">HH", 1, 0xE000 | TABLE_PID)), False)
            streams = struct.pack(">HHBHH", 0xE000 | VIDEO_PID, 0xF000, 1, 0xE000 | VIDEO_PID, 0xF000)
            send(TABLE_PID, table(2, 1, streams), False)
        send(VIDEO_PID, b"\0\0\1\xe0\0\0\x80\x80\5" + clock(2, 90000 + i * 90000 // RATE) + data, True)
    return b"".join((struct.pack(">I", i * 1000) if times else b"") + packet for i, packet in enumerate(packets))
