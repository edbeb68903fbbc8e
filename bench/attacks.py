"""Attacks the service as a process, and prints the outcome of each attack.

    attacks.py SERVICE [--size BYTES] [--seconds S] [--mebibytes M] [--rejected N] [--table]

Each attack of attack_messages.py has a service of its own and sends one message at a time. The
service must answer each within S seconds of processor time, and its memory must stay below M
mebibytes (0: no limit). Then the heaviest messages are sent at once, several times, and again with
less address space: each must have the outcome that it had alone, or a rejection for lack of memory.
Last, N rejected messages must leave no memory behind. --table prints the rows of doc/attacks.md.
(S1, S3, S4, S5, S6)
"""

import argparse
import collections
import concurrent.futures
import math
import os
import resource
import socket
import struct
import subprocess
import sys
import threading
import time

import attack_messages

KINDS = ["malformed", "limitExceeded", "typeMismatch", "outOfRange", "keyNotFound",
         "rejectedByHost", "notEnoughMemory"]
OUTPUT_TYPE = b"DrelUserPayload"


class Service:
    def __init__(self, program, address_space=None):
        def limit():
            resource.setrlimit(resource.RLIMIT_AS, (address_space, address_space))
        ours, theirs = socket.socketpair()
        self.process = subprocess.Popen([program], stdin=theirs, stdout=theirs,
                                        preexec_fn=limit if address_space else None)
        theirs.close()
        self.socket, self.stream = ours, ours.makefile("rb")
        self.frame()  # the hello

    def receive(self, count):
        received = self.stream.read(count)
        if len(received) < count:
            raise EOFError("the service closed its connection")
        return received

    def frame(self):
        return self.receive(struct.unpack("<I", self.receive(4))[0])

    def send(self, number, message):
        start = struct.pack("<QB", number, len(OUTPUT_TYPE)) + OUTPUT_TYPE
        self.socket.sendall(struct.pack("<I", len(start) + len(message)) + start)
        self.socket.sendall(message)

    def ask(self, message):
        """The verdict, and its seconds of processor time and of wall-clock time."""
        begun, worked = time.monotonic(), self.worked()
        sender = threading.Thread(target=self.send, args=(1, message))
        sender.start()
        reply = self.frame()
        seconds = time.monotonic() - begun
        sender.join()
        return verdict(reply), self.worked() - worked, seconds

    def worked(self):
        with open(f"/proc/{self.process.pid}/stat", encoding="ascii") as stat:
            times = stat.read().rpartition(")")[2].split()[11:13]
        return sum(map(int, times)) / os.sysconf("SC_CLK_TCK")

    def memory(self, what):
        """VmHWM (peak) or VmRSS (now), in MiB."""
        with open(f"/proc/{self.process.pid}/status", encoding="ascii") as status:
            for line in status:
                if line.startswith(what):
                    return int(line.split()[1]) / 1024
        raise EOFError("the service has ended")

    def end(self):
        self.socket.shutdown(socket.SHUT_WR)
        status = self.process.wait(timeout=60)
        self.socket.close()
        if status != 0:
            raise EOFError(f"the service ended with {status}")


def verdict(reply):
    status = reply[8]
    if status == 0:
        return "record"
    if status != 1:
        return f"status {status}"
    path = struct.unpack("<H", reply[18:20])[0]
    return KINDS[reply[9]] + ": " + reply[20 + path:].decode()


def short(verdicts):
    """The outcomes, with their numbers if there are several messages."""
    counts = collections.Counter(verdict.partition(":")[0] for verdict in verdicts)
    return "; ".join(f"{count} × {kind}" if len(verdicts) > 1 else kind
                     for kind, count in counts.most_common())


class Run:
    def __init__(self, options):
        self.options = options
        self.wrong = []
        self.heaviest = []  # (mebibytes, verdict, message)
        self.group = ""  # of the last row

    def check(self, holds, what):
        if not holds:
            self.wrong.append(what)
            print("WRONG:", what, flush=True)

    def attack(self, attack):
        group, name, messages = attack
        service, outcomes = Service(self.options.service), []
        try:
            for message in messages:
                outcomes.append(service.ask(message))
            peak = service.memory("VmHWM")
            service.end()
        except (EOFError, OSError) as error:
            service.process.kill()
            return self.check(False, f"{group}, {name}: {error} at message {len(outcomes)}")
        verdicts, seconds, waits = zip(*outcomes)
        self.check(not any(v.startswith("status") for v in verdicts), f"{name}: {short(verdicts)}")
        self.check(max(seconds) < self.options.seconds, f"{name}: {max(seconds):.2f} s")
        self.check(peak < self.options.mebibytes, f"{name}: {peak:.0f} MiB")
        largest = max(range(len(messages)), key=lambda i: len(messages[i]))
        self.heaviest.append((peak, verdicts[largest], messages[largest]))
        self.heaviest = sorted(self.heaviest, key=lambda heavy: -heavy[0])[:6]
        shown = "" if self.options.table and group == self.group else group + " "
        self.group = group
        row = (shown, name, f"{len(messages[largest]):,}", short(verdicts),
               f"{max(seconds) * 1000:.0f}", f"{max(waits) * 1000:.0f}", f"{peak:.0f}")
        print(("| {}| {} | {} | {} | {} | {} | {} |" if self.options.table else
               "{}- {}: {} bytes: {}; {} ms of CPU time, answered in {} ms, peak {} MiB").format(*row),
              flush=True)

    def attacks(self):
        catalogue = (attack for attack in attack_messages.catalogue(self.options.size)
                     if self.options.only in ": ".join(attack[:2]))
        lock = threading.Lock()

        def work():
            while True:
                with lock:
                    attack = next(catalogue, None)
                if not attack:
                    return
                self.attack(attack)
        with concurrent.futures.ThreadPoolExecutor(2) as pool:
            for worker in [pool.submit(work) for _ in range(1 if self.options.table else 2)]:
                worker.result()

    def pipelined(self, service, messages):
        """Numbers and verdicts, in the order of the replies, of messages sent without waiting."""
        def send():
            for number, message in enumerate(messages):
                service.send(number, message)
        threading.Thread(target=send, daemon=True).start()
        for _ in messages:
            reply = service.frame()
            yield struct.unpack("<Q", reply[:8])[0], verdict(reply)

    def all_at_once(self, address_space=None):
        service = Service(self.options.service, address_space)
        asked, counts = self.heaviest * self.options.rounds, collections.Counter()
        for number, outcome in self.pipelined(service, [message for _, _, message in asked]):
            no_memory = outcome.startswith("notEnoughMemory: ")
            counts["notEnoughMemory" if no_memory else outcome.partition(":")[0]] += 1
            self.check(no_memory or outcome == asked[number][1],
                       f"outcome at once: {outcome}; alone: {asked[number][1]}")
        peak, patience = service.memory("VmHWM"), time.monotonic() + 10
        idle = 16 if self.options.mebibytes < math.inf else math.inf
        while (rest := service.memory("VmRSS")) >= idle and time.monotonic() < patience:
            time.sleep(0.1)
        service.end()
        self.check(rest < idle, f"an idle service keeps {rest:.0f} MiB")
        limit = f" in {address_space >> 20} MiB of address space" if address_space else ""
        print(f"the heaviest, {len(asked)} at once{limit}: {dict(counts)}, {peak:.0f} MiB, "
              f"{rest:.0f} MiB idle", flush=True)
        return counts["notEnoughMemory"]

    def rejections_leave_no_memory(self, count):
        """All rejected attacks of 64 KiB, again and again."""
        service = Service(self.options.service)
        messages = [attack for _, _, attacks in attack_messages.catalogue(1 << 16)
                    for attack in attacks if service.ask(attack)[0] != "record"]

        def memory_after(count):
            asked = (messages * (count // len(messages) + 1))[:count]
            for _, outcome in self.pipelined(service, asked):
                self.check(outcome != "record", "a message that was rejected before gives a record")
            return service.memory("VmRSS")
        # The memory that malloc keeps depends on the order of the messages: let it settle first.
        before = memory_after(max(count // 5, 3 * len(messages)))
        grown = memory_after(count) - before
        service.end()
        print(f"{count} rejected messages, of {len(messages)} kinds: {before:.1f} MiB before, "
              f"{grown:+.1f} MiB after", flush=True)
        self.check(grown < 4 or self.options.mebibytes == math.inf, f"rejections leave {grown:.1f} MiB in use")


def main():
    parser = argparse.ArgumentParser(description=__doc__.split("\n\n", maxsplit=1)[0])
    parser.add_argument("service")
    parser.add_argument("--size", type=int, default=16 << 20)
    parser.add_argument("--seconds", type=float, default=1)
    parser.add_argument("--mebibytes", type=float, default=320)
    parser.add_argument("--rounds", type=int, default=6)
    parser.add_argument("--rejected", type=int, default=100_000)
    parser.add_argument("--only", default="", help="attacks with this in their group or name")
    parser.add_argument("--table", action="store_true")
    options = parser.parse_args()
    limited = options.mebibytes > 0  # not where a sanitizer maps terabytes
    options.mebibytes = options.mebibytes or math.inf
    run = Run(options)
    run.attacks()
    run.all_at_once()
    if limited:
        without = [run.all_at_once(mebibytes << 20) for mebibytes in (150, 250)]
        run.check(options.only or sum(without) > 0, "nothing exceeded the memory")
    if options.rejected:
        run.rejections_leave_no_memory(options.rejected)
    return 1 if run.wrong else 0


if __name__ == "__main__":
    sys.exit(main())
