"""Reads pcapng files block by block, and writes them, sharing nothing with the library."""
import struct

SECTION, INTERFACE, STATISTICS, PACKET = 0x0A0D0D0A, 1, 5, 6


class Packet:
    def __init__(self, body):
        self.interface, high, low, size, _ = struct.unpack_from("<5I", body)
        self.microseconds = high << 32 | low
        self.data = body[20:20 + size]
        options = read_options(body, 20 + (size + 3) // 4 * 4)
        self.flags = struct.unpack("<I", options[2])[0]
        self.comment = options.get(1, b"").decode()
        self.sent = self.flags & 3 == 2


def read_options(body, at):
    options = {}
    while at + 4 <= len(body):
        code, size = struct.unpack_from("<2H", body, at)
        if code == 0:
            break
        options[code] = body[at + 4:at + 4 + size]
        at += 4 + (size + 3) // 4 * 4
    return options


def blocks(content):
    """Type and body of each block; ValueError for a file that does not end behind one."""
    at = 0
    while at < len(content):
        kind, size = struct.unpack_from("<2I", content, at)
        if size % 4 or at + size > len(content) or struct.unpack_from("<I", content, at + size - 4)[0] != size:
            raise ValueError(f"no whole block at {at}")
        yield kind, content[at + 8:at + size - 4]
        at += size


def packets(content):
    return [Packet(body) for kind, body in blocks(content) if kind == PACKET]


def block(kind, body):
    size = len(body) + 12
    return struct.pack("<2I", kind, size) + body + struct.pack("<I", size)


def packet_block(packet, data):
    body = struct.pack("<5I", packet.interface, packet.microseconds >> 32, packet.microseconds & 0xFFFFFFFF, len(data),
                       len(data))
    return block(PACKET, body + data + bytes(-len(data) % 4) + struct.pack("<2HI", 2, 4, packet.flags) + bytes(4))
