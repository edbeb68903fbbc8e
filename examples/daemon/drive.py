#!/usr/bin/env python3
"""drive.py SOCKET COMMAND...: starts an example daemon as COMMAND (which has to name SOCKET in its own
way), sends it good, bad and poisonous messages, and checks what it makes of each."""

import collections
import pathlib
import random
import signal
import socket
import subprocess
import sys
import time

EXAMPLES = pathlib.Path(__file__).parent.parent / "payload"
GOOD = (EXAMPLES / "push.plist").read_bytes()
DELIVERED = "deliver: command 100, id 2f6d9a10-51c7, from tel:+15550100, 96 bytes"


def xml(entries: str) -> bytes:
    return f"<plist><dict>{entries}</dict></plist>".encode()


def binary(*objects: bytes) -> bytes:
    """A binary list of fewer than 256 objects, of which the first is the top one."""
    offsets, body = [], b"bplist00"
    for one in objects:
        offsets.append(len(body))
        body += one
    table = b"".join(offset.to_bytes(2, "big") for offset in offsets)
    trailer = bytes([0] * 6 + [2, 1]) + b"".join(
        number.to_bytes(8, "big") for number in (len(objects), 0, len(body)))
    return body + table + trailer


COMMAND = "<key>c</key><integer>7</integer>"
# What is sent, and how the line begins that comes of it.
MESSAGES = [
    # good
    (GOOD, DELIVERED),
    ((EXAMPLES / "push.bplist").read_bytes(), DELIVERED),
    (xml(COMMAND + "<key>never heard of</key><real>1.5</real>"), "deliver: command 7"),
    (xml(COMMAND + "<key>i</key><string>a\nrefused: \u202e\\</string>"),
     r"deliver: command 7, id a\x0arefused: \xe2\x80\xae\x5c"),
    (binary(b"\xd2\x01\x02\x03\x04", b"\x51c", b"\x51i", b"\x10\x08", b"\x55\x1b[2J\x07"),
     r"deliver: command 8, id \x1b[2J\x07"),
    # bad
    (b"", "refused: malformed at ''"),
    (b"hello", "refused: malformed at ''"),
    (GOOD[:-9], "refused: malformed at ''"),
    (xml(""), "refused: keyNotFound at 'c'"),
    (xml("<key>c</key><string>7</string>"), "refused: typeMismatch at 'c'"),
    (xml("<key>c</key><integer>9223372036854775808</integer>"), "refused: outOfRange at 'c'"),
    # poisonous
    (random.Random(7).randbytes(200_000), "refused: malformed at ''"),
    (b"bplist00" + random.Random(8).randbytes(200_000), "refused: malformed at ''"),
    (b'<!DOCTYPE plist [<!ENTITY a "aaaa"><!ENTITY b "&a;&a;">]>' + xml(COMMAND),
     "refused: malformed at ''"),
    (xml(COMMAND + "<key>x</key>" + "<array>" * 9000 + "</array>" * 9000), "refused: limitExceeded"),
    # An array of 160,000 empty payloads.
    (binary(b"\xd2\1\2\3\5", b"\x51c", b"\x53mml", b"\x10\7", b"\xd0",
            b"\xaf\x12" + (160_000).to_bytes(4, "big") + b"\4" * 160_000),
     "refused: limitExceeded at 'mml'"),
    (binary(b"\xd1\x01\x02", b"\x51x", b"\xa1\x00"), "refused: malformed at ''"),
    (bytes(300_000), "refused: a datagram of 300000 bytes"),
    (GOOD, DELIVERED),
]


class Daemon:
    def __init__(self, path: str, command: list[str]):
        self.process = subprocess.Popen(command, stdout=subprocess.PIPE, text=True)
        self.expect("ready")
        self.socket = socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM)
        # Larger ones than the system's usual limit are for the privileged to send.
        try:
            self.socket.setsockopt(socket.SOL_SOCKET, getattr(socket, "SO_SNDBUFFORCE", 32), 1 << 20)
        except PermissionError:
            pass
        self.socket.connect(path)

    def expect(self, beginning: str):
        line = self.process.stdout.readline()
        if not line.startswith(beginning):
            sys.exit(f"expected: {beginning}\ncame:     {line}")

    def send(self, message: bytes) -> bool:
        try:
            self.socket.send(message)
        except OSError:
            if len(message) < 1 << 18:
                raise
            return False  # more than this user may send
        return True

    def service(self) -> int:
        tasks = pathlib.Path(f"/proc/{self.process.pid}/task").glob("*/children")
        return int("".join(task.read_text() for task in tasks))


def drive(daemon: Daemon):
    tried = sum(1 for message, line in MESSAGES
                if daemon.send(message) and daemon.expect(line) is None)
    print(f"each of {tried} messages, good, bad and poisonous, had the line it is to have")

    before = daemon.service()
    subprocess.run(["kill", "-KILL", str(before)], check=True)
    daemon.send(GOOD)
    daemon.expect(DELIVERED)
    after = daemon.service()
    assert after != before
    print("a service that was killed was replaced")

    burst = [MESSAGES[n % 17] for n in range(500)]
    for message, _ in burst:
        daemon.send(message)
    lines = collections.Counter(daemon.process.stdout.readline().rstrip("\n") for _ in burst)
    for line, count in collections.Counter(line for _, line in burst).items():
        came = sum(n for text, n in lines.items() if text.startswith(line))
        # One beginning may be that of another.
        assert came >= count, f"{came} lines instead of {count}: {line}"
    assert sum(lines.values()) == len(burst)
    print(f"{len(burst)} at once had as many lines, each the right one")

    for message, _ in burst[:20]:
        daemon.send(message)
    daemon.process.send_signal(signal.SIGTERM)
    assert daemon.process.wait(10) == 0
    time.sleep(0.1)
    assert not pathlib.Path(f"/proc/{after}").exists(), "the service outlived its daemon"
    print("it ended when told, and the service with it")


if __name__ == "__main__":
    if len(sys.argv) < 3:
        sys.exit(__doc__)
    daemon = Daemon(sys.argv[1], sys.argv[2:])
    try:
        drive(daemon)
    finally:
        daemon.process.kill()
