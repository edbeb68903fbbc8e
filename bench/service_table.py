#!/usr/bin/env python3
"""service_table.py RUN.json... [against RUN.json...]: prints the pooled results of service_bench with
their limits, and their ratios to the runs of an older build after `against`."""

import itertools
import statistics
import sys

import table


class Runs:
    """The pooled runs of one build."""

    def __init__(self, paths):
        self.found = {}
        for path in paths:
            for name, runs in table.times(path).items():
                self.found.setdefault(name.replace("/real_time", ""), []).extend(runs.values())

    def all(self, name, field="real_time"):
        """Nanoseconds for one iteration, of each repetition."""
        scale = {"ns": 1, "us": 1e3, "ms": 1e6}
        return [run[field] * scale[run["time_unit"]] for run in self.found[name]]

    def time(self, name):
        return statistics.median(self.all(name))


def table_of(title, rows, judged=True, unit="ratio"):
    """Prints rows of a name, a value and its limit, which is like "≤ 2", or empty."""
    print(f"| {title} | {unit} | limit |\n|---|---|---|")
    miss = " **missed**" if judged else " (not compared: the processors are not independent)"
    for name, ratio, limit in rows:
        holds = True
        if limit:
            bound = float(limit[2:])
            holds = ratio <= bound if limit[0] == "≤" else ratio >= bound
        print(f"| {name} | {ratio:.2f}{'' if holds else miss} | {limit} |")
    print()


SERVICE = "roundTrip/service/threads:"


def of_one_build(runs):
    time = runs.time
    alone, echo, service = time("inProcess/threads:1"), time("roundTrip/echo"), time(SERVICE + "1")
    one, two = time("pipelined/service/64"), time("pipelined/two/64/threads:2")
    processors = alone / time("inProcess/threads:2")  # rate of two threads / rate of one
    # Below 1.8, one processor slows down while the other one works, also client and service.
    table_of("through the service", [
        ("round trip / (echo + unpacking)", service / (echo + alone), "≤ 1.15"),
        ("rejected / accepted, round trip", time("refused") / service, "≤ 2"),
        ("pipelined rate / rate in process", alone / one, "≥ 0.4"),
        ("pipelined rate / that of the echo", time("pipelined/echo/64") / one, ""),
        ("pipelined rate, two client threads / one", one / two, ""),
        ("rate of two calling threads / one", service / time(SERVICE + "2"), ""),
        ("rate of four calling threads / one", service / time(SERVICE + "4"), ""),
        ("rate in process, two threads / one", processors, ""),
        ("pipelined rate / rate in process of one thread of two", 2 * alone / one / processors, ""),
    ], processors >= 1.8)

    if "rpc/service" in runs.found:
        table_of("round trip / that of another way to parse in a process of its own", [
            (f"{name}, without a sandbox", time("rpc/service") / time(f"rpc/{peer}"), "≤ 1")
            for name, peer in [("protobuf over pipes", "protobufOverPipes"),
                               ("gRPC over a Unix socket", "grpcOverUnixSocket")]])

    # Means, because waits beside other processes are rare and long.
    waits = []
    for busy in (0, 1, 2, 4):
        trips = runs.all(f"neighbours/service/{busy}")
        blocking = statistics.mean(runs.all(f"neighbours/blocking/{busy}"))
        beside = f"{busy} busy process{'es' * (busy != 1)}"
        waits += [(f"mean, {beside}", statistics.mean(trips) / blocking, "≤ 5"),
                  (f"largest mean of a repetition, {beside}", max(trips) / blocking, "")]
    table_of("round trip / that of a blocking echo, beside busy processes", waits)

    idle = [max(runs.all("idle/iterations:1/repeats:1", field)) / 1e6
            for field in ("at_rest", "going_to_rest")]
    table_of("processor time of client and services", [
        ("in 10 s with nothing in flight", idle[0], "≤ 1"),
        ("once, a second after the last reply, to clear memory", idle[1], "")], unit="ms")

    print("| wall time | |\n|---|---|")
    for name, value in [
        ("unpacking, in process", alone), ("round trip, echo", echo), ("round trip, service", service),
        *((f"per message, {n} calling threads", time(f"{SERVICE}{n}")) for n in (2, 4)),
        *((f"round trip, {n} MiB", time(f"large/{n}")) for n in (1, 16)),
        ("per message, 64 in flight, echo", time("pipelined/echo/64")),
        ("per message, 64 in flight, service", one),
        ("per message, 256 in flight, service", time("pipelined/service/256")),
        ("per message, 64 in flight for each of two client threads", two),
        ("spawn a process of the service's size and wait until it has ended", time("spawnAndWait")),
        ("start to first reply, echo", time("startToFirstReply/echo")),
        ("start to first reply, service", time("startToFirstReply/service")),
    ]:
        print(f"| {name} | {table.human(value)} |")


def beside_another(ours, theirs):
    def ratio(name):
        return ours.time(name) / theirs.time(name)

    print()
    table_of("this build / the older one", [
        ("round trip of one thread", ratio(SERVICE + "1"), "≤ 1"),
        ("rate of two calling threads", 1 / ratio(SERVICE + "2"), "≥ 1.3"),
        ("rate of four calling threads", 1 / ratio(SERVICE + "4"), "≥ 1.3"),
        ("pipelined, 64 in flight, time per message", ratio("pipelined/service/64"), "≤ 1"),
        ("pipelined, 256 in flight, time per message", ratio("pipelined/service/256"), "≤ 1"),
        ("round trip of 1 MiB", ratio("large/1"), "≤ 1"),
        ("round trip of 16 MiB", ratio("large/16"), "≤ 1"),
        ("start to first reply", ratio("startToFirstReply/service"), "≤ 1"),
        ("rejected message, round trip", ratio("refused"), ""),
        ("unpacking, in process (1 if both ran under the same conditions)", ratio("inProcess/threads:1"), ""),
    ])
    print("| wall time | this build | the older one |\n|---|---|---|")
    for name in sorted(name for name in ours.found if not name.startswith("idle")):
        print(f"| {name} | {table.human(ours.time(name))} | {table.human(theirs.time(name))} |")


def main():
    paths = iter(sys.argv[1:])
    ours = Runs(itertools.takewhile(lambda path: path != "against", paths))
    theirs = Runs(paths)
    of_one_build(ours)
    if theirs.found:
        beside_another(ours, theirs)


if __name__ == "__main__":
    main()
