#!/usr/bin/env python3
"""table.py UNPACK.json: the ratios of one run of unpack_bench, as the table of doc/performance.md.

Each figure is the median over the run's repetitions of one time divided by another's. CPU time, not
wall time: it moves less on a machine that does other things as well.
"""

import json
import statistics
import sys

MESSAGES = ["min", "typical", "full", "fanout", "blob", "unicode"]

# column: (measured, against, the most it may be, message by message)
COLUMNS = {
    "binary / protobuf arena": ("binary/unpack", "protobuf_arena", [1.5, 1.0, 0.85, 0.8, 1.1, 1.3]),
    "XML / expat events": ("xml/unpack", "expat", [0.15, 0.25, 0.25, 0.33, 0.2, 0.3]),
    "XML / pugixml DOM": ("xml/unpack", "pugixml", [1.4, 1.4, 1.5, 1.5, 0.8, 1.6]),
    "wrong field / accepted: binary": ("binary/wrong", "binary/unpack", [2.0] * 6),
    "wrong field: XML": ("xml/wrong", "xml/unpack", [2.0] * 6),
    "broken / accepted: binary": ("binary/broken", "binary/unpack", [2.0] * 6),
    "broken: XML": ("xml/broken", "xml/unpack", [2.0] * 6),
    "with the copy: binary / protobuf arena": ("binary/copy_and_unpack", "protobuf_arena", None),
    "XML / pugixml": ("xml/copy_and_unpack", "pugixml", None),
    "binary / protobuf": ("binary/unpack", "protobuf", None),
    "binary / protobuf warm arena": ("binary/unpack", "protobuf_warm_arena", None),
}


def times(path):
    """Benchmark name to CPU nanoseconds, one for each repetition."""
    found = {}
    with open(path, encoding="utf-8") as file:
        for run in json.load(file)["benchmarks"]:
            if run["run_type"] == "iteration":
                found.setdefault(run["run_name"], {})[run["repetition_index"]] = run
    return found


def median(runs):
    return statistics.median(run["cpu_time"] for run in runs.values())


def human(nanoseconds):
    for unit, size in (("ms", 1e6), ("µs", 1e3)):
        if nanoseconds >= size:
            return f"{nanoseconds / size:.3g} {unit}"
    return f"{nanoseconds:.3g} ns"


def main():
    found = times(sys.argv[1])
    over = 0
    print("| message | " + " | ".join(COLUMNS) + " |")
    print("|---" * (len(COLUMNS) + 1) + "|")
    for place, message in enumerate(MESSAGES):
        cells = []
        for measured, against, limits in COLUMNS.values():
            ratio = median(found[f"{message}/{measured}"]) / median(found[f"{message}/{against}"])
            if limits is None:
                cells.append(f"{ratio:.2f}")
                continue
            over += ratio > limits[place]
            mark = " **over**" if ratio > limits[place] else ""
            cells.append(f"{ratio:.2f} (≤ {limits[place]}){mark}")
        print(f"| {message} | " + " | ".join(cells) + " |")

    kinds = ["binary/unpack", "binary/copy_and_unpack", "xml/unpack", "xml/copy_and_unpack",
             "protobuf_arena", "protobuf_warm_arena", "protobuf", "expat", "pugixml",
             "binary/memcpy", "xml/memcpy"]
    print("\n| message | bytes: binary, XML, protobuf | " + " | ".join(kinds) + " |")
    print("|---" * (len(kinds) + 2) + "|")
    for message in MESSAGES:
        sizes = [int(found[f"{message}/{kind}"][0]["bytes"])
                 for kind in ("binary/unpack", "xml/unpack", "protobuf")]
        cells = [human(median(found[f"{message}/{kind}"])) for kind in kinds]
        print(f"| {message} | {', '.join(f'{size:,}' for size in sizes)} | {' | '.join(cells)} |")
    with_limit = sum(limits is not None for _, _, limits in COLUMNS.values()) * len(MESSAGES)
    print(f"\n{over} of the {with_limit} ratios with a limit are over it.")


if __name__ == "__main__":
    main()
