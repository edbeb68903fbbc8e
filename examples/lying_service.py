#!/usr/bin/python3
"""A service that answers each request with its message as status and body. Its hello is valid."""

import struct
import sys


def read(size):
    return sys.stdin.buffer.read(size) if size else b""


hello = b"IRONMOAT" + struct.pack("<HIQQQQI", 1, 0x3FF, 16 << 20, 64 << 20, 64 << 20, 144 << 20, 512)
reply = hello
while True:
    sys.stdout.buffer.write(struct.pack("<I", len(reply)) + reply)
    sys.stdout.buffer.flush()
    head = read(4)
    if len(head) < 4:
        break
    request = read(int.from_bytes(head, "little"))
    reply = request[:8] + request[9 + request[8]:]
