#!/usr/bin/env python3
"""service_table.py SERVICE.json: one run of service_bench, against what it is held to."""

import statistics
import sys

import table


def main():
    found = table.times(sys.argv[1])

    def time(name, field="real_time"):
        """Median nanoseconds of an iteration."""
        runs = found[f"{name}/real_time"] if f"{name}/real_time" in found else found[name]
        scale = {"ns": 1, "us": 1e3, "ms": 1e6}
        return statistics.median(run[field] * scale[run["time_unit"]] for run in runs.values())

    alone, echo, service = time("inProcess"), time("roundTrip/echo"), time("roundTrip/service")
    one, two = time("pipelined/service"), time("pipelined/service/real_time/threads:2")
    trip = service / (echo + alone)
    refused = time("roundTrip/refused") / service
    rate = alone / one
    processors = alone / time("inProcess/real_time/threads:2")  # what two do, by what one does
    rows = [
        ("round trip / (echo + unpacking)", trip, "≤ 1.15", trip <= 1.15),
        ("refused / accepted, round trip", refused, "≤ 2", refused <= 2),
        ("pipelined rate / rate in process", rate, "≥ 0.4", rate >= 0.4),
        ("pipelined rate / that of the echo", time("pipelined/echo") / one, "", True),
        ("pipelined rate, two client threads / one", one / two, "", True),
        ("rate in process, two threads / one", processors, "", True),
        ("pipelined rate / rate in process of one thread of two", 2 * rate / processors, "", True),
    ]
    judged = processors >= 1.8  # or the two sides waited for each other's
    miss = " **missed**" if judged else " (not judged: the processors were shared)"
    print("| through the service | ratio | to be |\n|---|---|---|")
    for name, ratio, limit, holds in rows:
        mark = "" if holds and (judged or not limit) else miss
        print(f"| {name} | {ratio:.2f}{mark} | {limit} |")
    print("\n| wall time | |\n|---|---|")
    for name, value in [
        ("unpacking, in process", alone), ("round trip, echo", echo), ("round trip, service", service),
        ("per message, 64 in flight, echo", time("pipelined/echo")),
        ("per message, 64 in flight, service", one),
        ("the same, two client threads", two),
        ("spawn of a process of the service's size until it is gone", time("spawnAndWait")),
        ("start to first reply, echo", time("startToFirstReply/echo")),
        ("start to first reply, service", time("startToFirstReply/service")),
    ]:
        print(f"| {name} | {table.human(value)} |")


if __name__ == "__main__":
    main()
