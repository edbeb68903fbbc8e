"""A client of VeskIronmoatService in plain Python; doc/protocol.md is all that one needs to know.

    ironmoat.py PROGRAM RECORDS.JSON OUTPUT_TYPE FILE...

starts the service PROGRAM and prints a line of JSON for each message, data in hexadecimal."""

import json
import select
import socket
import struct
import subprocess
import sys
import time

KINDS = ["malformed", "limitExceeded", "typeMismatch", "outOfRange", "keyNotFound",
         "rejectedByHost", "notEnoughMemory"]
SANDBOXED = 0b110_1111_1111  # the bits that a client insists on
LIMITS = ["message", "memory", "delivered", "reply", "nesting"]  # in bytes, but for the last


class Refused(Exception):
    """The message is bad and always will be."""

    def __init__(self, kind, path, sentence, offset=None):
        super().__init__(sentence)
        self.kind, self.path, self.offset = kind, path, offset


class NoAnswer(Exception):
    """Nothing is known of the message: no service, or one that died, is too slow, lies, refuses."""


def require(condition, problem):
    if not condition:
        raise NoAnswer(problem)


class Reply:
    """Takes a reply apart, every byte of which may be a lie."""

    def __init__(self, body, records, limits):
        self.rest, self.records, self.nesting = memoryview(body), records, limits["nesting"]
        self.memory, self.delivered = limits["memory"], limits["delivered"]

    def outcome(self, output_type):
        _, status = self.numbers("<QB")
        require(status <= 3, "an unknown status")
        if status == 0:
            record = self.record(output_type, 1)
            require(not self.rest, "a record ends before its frame")
            return record
        if status > 1:
            return NoAnswer(self.frame_text(len(self.rest)))
        kind, offset, size = self.numbers("<BQH")
        require(kind < len(KINDS), "an unknown kind of refusal")
        path, sentence = self.frame_text(size), self.frame_text(len(self.rest))
        return Refused(KINDS[kind], path, sentence, offset if offset != 2**64 - 1 else None)

    def record(self, name, depth):
        """Calls itself once for each level; 512 are within Python's own limit."""
        require(depth <= self.nesting, "records are nested too deep")
        fields = self.records[name]["fields"]
        presence = int.from_bytes(self.take((len(fields) + 7) // 8), "little")
        require(presence >> len(fields) == 0, "a presence bit without a field")
        record = {}
        for place, field in enumerate(fields):
            if not presence >> place & 1:
                require(field["optional"], "a field is missing")
                continue
            kind, count, values = field["type"], 1, []
            if is_list := kind.startswith("List<"):
                kind, (count,) = kind[5:-1], self.numbers("<I")
                self.memory -= count * self.records.get(kind, {"bytes": 16})["bytes"]
                # An element takes a byte at least, so that what is here bounds the work ahead.
                require(count <= len(self.rest) and self.memory >= 0, "a list is too long")
            for _ in range(count):
                nested = kind in self.records
                values.append(self.record(kind, depth + 1) if nested else self.value(kind))
            record[field["name"]] = values if is_list else values[0]
        return record

    def value(self, kind):
        if kind in ("Int", "Int64"):
            return self.numbers("<q")[0]
        if kind == "Bool":
            require(self.rest[:1] in (b"\0", b"\1"), "a Bool is neither 0 nor 1")
            return self.take(1) == b"\1"
        size, = self.numbers("<I")
        self.delivered -= size
        require(self.delivered >= 0, "too much text and data")
        return self.take(size).decode() if kind == "String" else self.take(size)

    def take(self, size):
        require(size <= len(self.rest), "a frame ends early")
        taken, self.rest = bytes(self.rest[:size]), self.rest[size:]
        return taken

    def numbers(self, form):
        return struct.unpack(form, self.take(struct.calcsize(form)))

    def frame_text(self, size):
        text = self.take(size)
        require(size <= 65535 and b"\0" not in text, "a text is too long or has a zero byte")
        return text.decode()


class Client:
    """Keeps a service process, which ends with the thread that first needs it. `patience`: seconds
    from one reply to the next."""

    def __init__(self, program, records, patience=2.0, sandboxed=SANDBOXED):
        self.program, self.records, self.process = program, records, None
        self.patience, self.sandboxed = patience, sandboxed

    def unpack(self, requests):
        """The outcomes of the requests, (output type, message), in their order: a record as a dict,
        or one of the exceptions above. When the service breaks, those without outcome are tried
        one at a time, so that only the one at fault has no answer."""
        requests, outcomes = dict(enumerate(requests, 1)), {}
        for attempt in [requests] + [{number: request} for number, request in requests.items()]:
            try:
                if not attempt.keys() <= outcomes.keys():
                    self.exchange(attempt, outcomes)
            except (NoAnswer, OSError, UnicodeDecodeError) as error:
                self.close()
                if attempt is not requests:
                    outcomes.update(dict.fromkeys(attempt, NoAnswer(str(error))))
        return list(map(outcomes.get, requests))

    def close(self):
        if self.process:
            self.process.kill()
            self.process.wait()
            self.socket.close()
        self.process = None

    def start(self):
        self.socket, theirs = socket.socketpair()
        with theirs:
            self.process = subprocess.Popen([self.program], stdin=theirs, stdout=theirs, env={})
        self.socket.setblocking(False)
        self.received, deadline = bytearray(), time.monotonic() + self.patience
        while (hello := self.frame(50)) is None:
            self.move(b"", deadline)
        require(len(hello) == 50 and hello[:10] == b"IRONMOAT\1\0", "not a service of version 1")
        in_force, *limits = struct.unpack("<IQQQQI", hello[10:])
        require(in_force & self.sandboxed == self.sandboxed, f"not sandboxed: {in_force:#x}")
        self.limits = dict(zip(LIMITS, limits))

    def exchange(self, requests, outcomes):
        """Fills outcomes, {id: outcome}, while it sends requests, {id: request}: otherwise each
        side could wait for the other to read."""
        if not self.process:
            self.start()
        unsent, waiting, sending = iter(requests), set(requests), b""
        deadline = time.monotonic() + self.patience
        while waiting:
            if not sending and (number := next(unsent, None)) is not None:
                name, message = requests[number]
                message = message[:self.limits["message"] + 1]  # is refused as all of it would be
                body = struct.pack("<QB", number, len(name)) + name.encode() + message
                sending = memoryview(struct.pack("<I", len(body)) + body)
            sending = sending[self.move(sending, deadline):]
            while (body := self.frame(9 + self.limits["reply"])) is not None:
                number = int.from_bytes(body[:8], "little")
                require(number in waiting, "a reply to what was not asked")
                reply = Reply(body, self.records, self.limits)
                outcomes[number] = reply.outcome(requests[number][0])
                waiting.remove(number)
                deadline = time.monotonic() + self.patience

    def frame(self, most):
        """The body of the next frame, once all of it is here."""
        end = 4 + int.from_bytes(self.received[:4], "little")
        require(end - 4 <= most, "a frame is too long")
        if len(self.received) < end:
            return None
        body = bytes(self.received[4:end])
        del self.received[:end]
        return body

    def move(self, sending, deadline):
        """Waits until bytes can move either way; returns how many were sent."""
        left, ours = deadline - time.monotonic(), [self.socket]
        read, write, _ = select.select(ours, ours[:len(sending)], [], max(left, 0))
        require(left > 0 and (read or write), "no reply in time")
        if read:
            self.received += (new := self.socket.recv(1 << 18))
            require(new, "the service ended")
        return self.socket.send(sending) if write else 0


if __name__ == "__main__":
    program, records, output_type, *files = sys.argv[1:]
    messages = [(output_type, open(file, "rb").read()) for file in files]
    client = Client(program, json.load(open(records))["records"])
    for file, outcome in zip(files, client.unpack(messages)):
        if not isinstance(outcome, dict):
            outcome = {"error": type(outcome).__name__, "message": str(outcome)} | vars(outcome)
        print(json.dumps({file: outcome}, default=bytes.hex))
